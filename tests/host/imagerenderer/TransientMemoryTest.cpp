// The transient memory pool: alignment, reuse and guards.

#include "ContractExpect.h"
#include "ImageTestSupport.h"

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

} // namespace
