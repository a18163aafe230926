#include "MF/BinaryData.h"

#include "ContractExpect.h"

#include <array>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

class BinaryDataTest : public ::testing::Test
{
};

TEST_F(BinaryDataTest, EmptyBlockHasNoBytes)
{
    const MF::BinaryData empty;
    EXPECT_EQ(empty.GetData(), nullptr);
    EXPECT_EQ(empty.GetSize(), 0u);
    EXPECT_TRUE(empty.IsEmpty());
    EXPECT_EQ(MF::BinaryData(nullptr, 0), empty);
    EXPECT_EQ(MF::BinaryData(std::vector<std::uint8_t>{}), empty);
}

TEST_F(BinaryDataTest, BlockCopiesTheCallersBytes)
{
    std::array<std::uint8_t, 4> bytes{1, 2, 0, 255};
    const MF::BinaryData block(bytes.data(), bytes.size());
    bytes[0] = 9;
    ASSERT_EQ(block.GetSize(), 4u);
    EXPECT_NE(block.GetData(), bytes.data());
    EXPECT_EQ(block.GetData()[0], 1);
    EXPECT_EQ(block.GetData()[2], 0);
    EXPECT_EQ(block.GetData()[3], 255);
}

TEST_F(BinaryDataTest, CopiesShareTheBytes)
{
    const MF::BinaryData block = MF::BinaryData::FromText("opaque");
    const MF::BinaryData copy = block;
    EXPECT_EQ(copy.GetData(), block.GetData());
    EXPECT_EQ(copy.GetSize(), 6u);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(copy.GetData()), copy.GetSize()), "opaque");
}

TEST_F(BinaryDataTest, EqualityComparesBytesNotStorage)
{
    const std::array<std::uint8_t, 3> bytes{7, 8, 9};
    const MF::BinaryData left(bytes.data(), bytes.size());
    const MF::BinaryData right{std::span<const std::uint8_t>(bytes)};
    EXPECT_NE(left.GetData(), right.GetData());
    EXPECT_EQ(left, right);
    EXPECT_NE(left, MF::BinaryData(bytes.data(), 2));
    EXPECT_NE(left, MF::BinaryData());
    const std::array<std::uint8_t, 3> other{7, 8, 10};
    EXPECT_NE(left, MF::BinaryData(other.data(), other.size()));
}

TEST_F(BinaryDataTest, MovedVectorIsTakenOverWithoutCopy)
{
    std::vector<std::uint8_t> bytes(1000, 0x5a);
    const std::uint8_t* storage = bytes.data();
    const MF::BinaryData block(std::move(bytes));
    EXPECT_EQ(block.GetData(), storage);
    EXPECT_EQ(block.GetSize(), 1000u);
}

TEST_F(BinaryDataTest, NullDataWithSizeBreaksContract)
{
    EXPECT_INPUT_CONTRACT(MF::BinaryData(nullptr, 3), "inData != nullptr || inSize == 0");
}

TEST_F(BinaryDataTest, CopiesLiveOnInOtherThreads)
{
    std::vector<std::thread> threads;
    std::vector<std::size_t> sums(4, 0);
    {
        const MF::BinaryData block(std::vector<std::uint8_t>(4096, 3));
        for (std::size_t index = 0; index < sums.size(); ++index)
            threads.emplace_back(
                [copy = block, &sum = sums[index]]
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
