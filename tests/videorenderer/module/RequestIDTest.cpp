#include "ML/VideoRenderer.h"
#include "module/ModuleInternals.h"

#include <algorithm>
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

class RequestIDTest : public ::testing::Test
{
};

TEST_F(RequestIDTest, FirstIdentifiersAfterLoadAreTwoThenThree)
{
    EXPECT_EQ(kFirstIDAfterLoad, 2u);
    EXPECT_EQ(kSecondIDAfterLoad, 3u);
}

TEST_F(RequestIDTest, EachCallAnswersTheNextIdentifierAndTheWrapSkipsZero)
{
    // 0 means "no request": past the top the counter goes on at 1, also from
    // a counter left at the top.
    const struct
    {
        unsigned int mLast;
        std::vector<unsigned int> mExpected;
    } cases[] = {
        {1000, {1001, 1002, 1003}},
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

TEST_F(RequestIDTest, ConcurrentCallersGetDistinctNonZeroIdentifiersAcrossTheWrap)
{
    constexpr int kThreads = 4;
    constexpr int kPerThread = 5000;
    // The wrap falls in the middle of the run.
    ML::ModuleInternals::SetLastRequestID(0xFFFFFFFFu - kThreads * kPerThread / 2);
    std::vector<std::vector<unsigned int>> taken(kThreads);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&taken, t]
            {
                for (int i = 0; i < kPerThread; ++i)
                    taken[t].push_back(ML::GetNextRequestID());
            });
    }
    for (std::thread& thread : threads)
        thread.join();

    std::set<unsigned int> all;
    for (const auto& ids : taken)
    {
        // One thread's identifiers only grow, apart from the one step over the wrap.
        int descents = 0;
        for (std::size_t i = 1; i < ids.size(); ++i)
            descents += ids[i] < ids[i - 1] ? 1 : 0;
        EXPECT_LE(descents, 1);
        all.insert(ids.begin(), ids.end());
    }
    EXPECT_EQ(all.size(), static_cast<std::size_t>(kThreads * kPerThread));
    EXPECT_EQ(all.count(0u), 0u);
    EXPECT_EQ(all.count(0xFFFFFFFFu), 1u);
    EXPECT_EQ(all.count(1u), 1u);
    // The identifiers handed out are exactly the ones on both sides of the wrap.
    EXPECT_EQ(*all.rbegin(), 0xFFFFFFFFu);
    EXPECT_EQ(*all.begin(), 1u);
    EXPECT_EQ(ML::GetNextRequestID(), static_cast<unsigned int>(kThreads * kPerThread / 2 + 1));
}

class AcceleratedRendererIDTest : public ::testing::Test
{
};

TEST_F(AcceleratedRendererIDTest, NilUntilSetThenTheLastValueSet)
{
    // The only case of the program that sets the identifier.
    EXPECT_TRUE(ML::GetCurrentAcceleratedSequenceRendererID().IsNil());
    const mvxcore::utility::Guid first("{1b5bc335-92e5-4479-bd38-d18bedec69b2}");
    const mvxcore::utility::Guid second("{0c9a8f5e-7d41-4a8b-9c2e-3f6a1d2b4e5f}");
    ML::SetCurrentAcceleratedSequenceRendererID(first);
    EXPECT_EQ(ML::GetCurrentAcceleratedSequenceRendererID(), first);
    ML::SetCurrentAcceleratedSequenceRendererID(second);
    EXPECT_EQ(ML::GetCurrentAcceleratedSequenceRendererID(), second);

    // Readers on other threads only ever see one of the written identifiers
    // whole, never a mixture of two.
    std::atomic<bool> stop{false};
    std::atomic<int> torn{0};
    std::vector<std::thread> readers;
    for (int t = 0; t < 3; ++t)
    {
        readers.emplace_back(
            [&]
            {
                while (!stop.load())
                {
                    const mvxcore::utility::Guid seen =
                        ML::GetCurrentAcceleratedSequenceRendererID();
                    if (seen != first && seen != second)
                        torn.fetch_add(1);
                }
            });
    }
    for (int i = 0; i < 20000; ++i)
        ML::SetCurrentAcceleratedSequenceRendererID(i % 2 == 0 ? first : second);
    stop.store(true);
    for (std::thread& reader : readers)
        reader.join();
    EXPECT_EQ(torn.load(), 0);
    EXPECT_EQ(ML::GetCurrentAcceleratedSequenceRendererID(), second);
    ML::SetCurrentAcceleratedSequenceRendererID(mvxcore::utility::Guid());
}

} // namespace
