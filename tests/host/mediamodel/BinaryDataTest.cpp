#include "MF/BinaryData.h"

#include "ContractExpect.h"

#include <array>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using BinaryDataTest = ::testing::Test;

TEST_F(BinaryDataTest, BlockCopiesTheCallersBytesAndComparesBytesNotStorage)
{
    const MF::BinaryData empty;
    EXPECT_EQ(empty.GetData(), nullptr);
    EXPECT_EQ(MF::BinaryData(nullptr, 0), empty);
    EXPECT_EQ(MF::BinaryData(std::vector<std::uint8_t>{}), empty);
    EXPECT_INPUT_CONTRACT(MF::BinaryData(nullptr, 3), "inData != nullptr || inSize == 0");
    std::array<std::uint8_t, 3> bytes{7, 8, 9};
    const MF::BinaryData block(bytes.data(), bytes.size());
    const MF::BinaryData same{std::span<const std::uint8_t>(bytes)};
    bytes[0] = 1;
    EXPECT_EQ(std::vector(block.GetData(), block.GetData() + block.GetSize()),
              (std::vector<std::uint8_t>{7, 8, 9}));
    EXPECT_NE(block.GetData(), same.GetData());
    EXPECT_EQ(block, same);
    for (const MF::BinaryData& different :
         {MF::BinaryData(bytes.data(), 3), MF::BinaryData(), MF::BinaryData::FromText("\x07\x08")})
        EXPECT_NE(block, different);
    const MF::BinaryData copy = block;
    EXPECT_EQ(copy.GetData(), block.GetData()) << "copies share the bytes";
    // A moved vector is taken over without a copy.
    std::vector<std::uint8_t> large(1000, 0x5a);
    const std::uint8_t* storage = large.data();
    EXPECT_EQ(MF::BinaryData(std::move(large)).GetData(), storage);
}

} // namespace
