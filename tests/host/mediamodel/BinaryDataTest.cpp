#include "MF/BinaryData.h"

#include "ContractExpect.h"

#include <array>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using BinaryDataTest = ::testing::Test;

TEST_F(BinaryDataTest, EmptyBlockHasNoBytes)
{
    const MF::BinaryData empty;
    EXPECT_EQ(empty.GetData(), nullptr);
    EXPECT_EQ(empty.GetSize(), 0u);
    EXPECT_TRUE(empty.IsEmpty());
    EXPECT_EQ(MF::BinaryData(nullptr, 0), empty);
    EXPECT_EQ(MF::BinaryData(std::vector<std::uint8_t>{}), empty);
    EXPECT_INPUT_CONTRACT(MF::BinaryData(nullptr, 3), "inData != nullptr || inSize == 0");
}

TEST_F(BinaryDataTest, BlockCopiesTheCallersBytesAndCopiesShareThem)
{
    std::array<std::uint8_t, 4> bytes{1, 2, 0, 255};
    const MF::BinaryData block(bytes.data(), bytes.size());
    bytes[0] = 9;
    EXPECT_NE(block.GetData(), bytes.data());
    EXPECT_EQ(std::vector(block.GetData(), block.GetData() + block.GetSize()),
              (std::vector<std::uint8_t>{1, 2, 0, 255}));
    const MF::BinaryData text = MF::BinaryData::FromText("opaque");
    const MF::BinaryData copy = text;
    EXPECT_EQ(copy.GetData(), text.GetData());
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(copy.GetData()), copy.GetSize()), "opaque");
    // A moved vector is taken over without a copy.
    std::vector<std::uint8_t> large(1000, 0x5a);
    const std::uint8_t* storage = large.data();
    const MF::BinaryData taken(std::move(large));
    EXPECT_EQ(taken.GetData(), storage);
    EXPECT_EQ(taken.GetSize(), 1000u);
}

TEST_F(BinaryDataTest, EqualityComparesBytesNotStorage)
{
    const std::array<std::uint8_t, 3> bytes{7, 8, 9};
    const std::array<std::uint8_t, 3> other{7, 8, 10};
    const MF::BinaryData left(bytes.data(), bytes.size());
    const MF::BinaryData right{std::span<const std::uint8_t>(bytes)};
    EXPECT_NE(left.GetData(), right.GetData());
    EXPECT_EQ(left, right);
    for (const MF::BinaryData& different :
         {MF::BinaryData(bytes.data(), 2), MF::BinaryData(), MF::BinaryData(other.data(), 3)})
        EXPECT_NE(left, different);
}

TEST_F(BinaryDataTest, CopiesLiveOnInOtherThreads)
{
    std::vector<std::thread> threads;
    std::vector<std::size_t> sums(4, 0);
    {
        const MF::BinaryData block(std::vector<std::uint8_t>(4096, 3));
        for (std::size_t& sum : sums)
            threads.emplace_back(
                [copy = block, &sum]
                {
                    for (std::uint8_t byte : copy.GetBytes())
                        sum += byte;
                });
    }
    for (std::thread& thread : threads)
        thread.join();
    for (std::size_t sum : sums)
        EXPECT_EQ(sum, 3u * 4096u);
}

} // namespace
