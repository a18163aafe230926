// The transient memory pool: alignment, reuse, guards and use from several threads.

#include "ContractExpect.h"
#include "ImageTestSupport.h"

#include <thread>

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

using TransientMemoryTest = ::testing::Test;

TEST_F(TransientMemoryTest, BlocksAreAlignedAndReusedBySizeClass)
{
    void* a = IR_AllocateTransientMemoryBlock(1000000);
    ASSERT_NE(a, nullptr);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(a) % 64, 0u);
    std::memset(a, 0xAB, 1000000);
    const std::size_t before = IR_TransientMemoryCachedBytes();
    IR_FreeTransientMemoryBlock(a);
    EXPECT_GE(IR_TransientMemoryCachedBytes(), before + 1000000);
    // A slightly different size of the same class gets the same block back.
    void* b = IR_AllocateTransientMemoryBlock(999000);
    EXPECT_EQ(b, a);
    IR_FreeTransientMemoryBlock(b);
    IR_FreeTransientMemoryBlock(nullptr);
    EXPECT_INPUT_CONTRACT(IR_AllocateTransientMemoryBlock(0), "inSize > 0");
}

TEST_F(TransientMemoryTest, ForeignAndDoubleFreedBlocksAreRefused)
{
    std::vector<std::uint8_t> foreign(256, 0);
    EXPECT_INPUT_CONTRACT(IR_FreeTransientMemoryBlock(foreign.data() + 128),
                          "header->guard == kGuardLive");
    void* block = IR_AllocateTransientMemoryBlock(4096);
    IR_FreeTransientMemoryBlock(block);
    EXPECT_INPUT_CONTRACT(IR_FreeTransientMemoryBlock(block), "header->guard == kGuardLive");
}

TEST_F(TransientMemoryTest, ConcurrentThreadsNeverShareABlock)
{
    constexpr int kThreads = 4;
    std::vector<std::thread> threads;
    std::vector<int> failures(kThreads, 0);
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [t, &failures]
            {
                for (int i = 0; i < 2000; ++i)
                {
                    const std::size_t size = 64 + static_cast<std::size_t>((i * 37 + t) % 5) * 3000;
                    auto* block = static_cast<std::uint8_t*>(IR_AllocateTransientMemoryBlock(size));
                    std::memset(block, t + 1, size);
                    std::this_thread::yield();
                    for (std::size_t k = 0; k < size; k += 97)
                        failures[t] += block[k] != t + 1;
                    IR_FreeTransientMemoryBlock(block);
                }
            });
    for (auto& thread : threads)
        thread.join();
    EXPECT_EQ(failures, std::vector<int>(kThreads, 0));
}

TEST_F(TransientMemoryTest, ConcurrentCompositesOnSeparateFramesAgree)
{
    // Quality 5 takes scratch rows from the pool; run it on several threads at once.
    std::mt19937 random(9);
    Image src(kBGRA8, 64, 16), base(kBGRA8, 64, 16);
    src.Randomise(random);
    base.Randomise(random);
    auto composite = [&](Image& ioDst)
    {
        IR_Composite(src.Data(), src.RowBytes(), ioDst.Data(), ioDst.RowBytes(), src.Format(), 64,
                     16, 1.0f, 5);
    };
    Image expected = Copy(base, 0);
    composite(expected);
    std::vector<Image> outputs(4, Copy(base, 0));
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < 20; ++i)
                {
                    Image work = Copy(base, t);
                    composite(work);
                    if (i == 19)
                        outputs[t] = std::move(work);
                }
            });
    for (auto& thread : threads)
        thread.join();
    for (const Image& out : outputs)
        EXPECT_EQ(MaxDifference(out, expected), 0);
}

} // namespace
