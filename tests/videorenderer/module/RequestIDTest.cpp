#include "ML/VideoRenderer.h"
#include "module/ModuleInternals.h"

#include <cstdint>
#include <set>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

// Taken while the test program starts, before any test can move the counter:
// the first two identifiers of the loaded module.
const unsigned int kFirstIDAfterLoad = ML::GetNextRequestID();
const unsigned int kSecondIDAfterLoad = ML::GetNextRequestID();

TEST(RequestIDTest, IdentifiersStartAtTwoAndTheWrapSkipsZero)
{
    EXPECT_EQ(kFirstIDAfterLoad, 2u);
    EXPECT_EQ(kSecondIDAfterLoad, 3u);
    // 0 means "no request": past the top the counter goes on at 1, also from
    // a counter left at the top.
    const struct
    {
        unsigned int mLast;
        std::vector<unsigned int> mExpected;
    } cases[] = {
        {0xFFFFFFFEu, {0xFFFFFFFFu, 1, 2}},
        {0xFFFFFFFFu, {1}},
    };
    for (const auto& testCase : cases)
    {
        ML::ModuleInternals::SetLastRequestID(testCase.mLast);
        for (unsigned int expected : testCase.mExpected)
            EXPECT_EQ(ML::GetNextRequestID(), expected) << "after " << testCase.mLast;
    }
}

TEST(RequestIDTest, ConcurrentCallersGetDistinctNonZeroIdentifiersAcrossTheWrap)
{
    constexpr int kThreads = 4;
    constexpr int kPerThread = 5000;
    // The wrap falls in the middle of the run.
    ML::ModuleInternals::SetLastRequestID(0xFFFFFFFFu - kThreads * kPerThread / 2);
    std::vector<unsigned int> taken(kThreads * kPerThread);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&taken, t]
            {
                for (int i = 0; i < kPerThread; ++i)
                    taken[t * kPerThread + i] = ML::GetNextRequestID();
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    const std::set<unsigned int> all(taken.begin(), taken.end());
    // Exactly the identifiers on both sides of the wrap, each once.
    EXPECT_EQ(all.size(), static_cast<std::size_t>(kThreads * kPerThread));
    EXPECT_EQ(*all.begin(), 1u);
    EXPECT_EQ(*all.rbegin(), 0xFFFFFFFFu);
    EXPECT_EQ(ML::GetNextRequestID(), static_cast<unsigned int>(kThreads * kPerThread / 2 + 1));
}

TEST(AcceleratedRendererIDTest, NilUntilSetThenTheLastValueSet)
{
    // The only case of the program that sets the identifier.
    EXPECT_TRUE(ML::GetCurrentAcceleratedSequenceRendererID().IsNil());
    const mvxcore::utility::Guid id("{1b5bc335-92e5-4479-bd38-d18bedec69b2}");
    ML::SetCurrentAcceleratedSequenceRendererID(id);
    EXPECT_EQ(ML::GetCurrentAcceleratedSequenceRendererID(), id);
    ML::SetCurrentAcceleratedSequenceRendererID(mvxcore::utility::Guid());
}

} // namespace
