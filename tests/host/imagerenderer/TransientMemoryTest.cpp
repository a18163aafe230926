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
    // A block freed twice is refused.
    EXPECT_INPUT_CONTRACT(IR_FreeTransientMemoryBlock(b), "header->guard == kGuardLive");
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

} // namespace
