// The ordering window: deliveries in any order come out in index order.

#include "OrderingWindow.h"

#include "ContractExpect.h"

#include <algorithm>
#include <numeric>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace std::chrono_literals;
using OrderingWindowTest = ::testing::Test;

TEST_F(OrderingWindowTest, OutOfOrderDeliveriesComeOutInOrderAndEachIndexOnce)
{
    vrender::OrderingWindow<std::string> window(10);
    window.Deliver(12, "twelve");
    window.Deliver(11, "eleven");
    EXPECT_FALSE(window.TakeNext(0ms)) << "10 has not arrived";
    EXPECT_EQ(window.GetWaitingCount(), 2u);
    window.Deliver(10, "ten");
    for (const char* expected : {"ten", "eleven", "twelve"})
        EXPECT_EQ(window.TakeNext(0ms), expected);
    EXPECT_EQ(window.GetNextIndex(), 13);
    EXPECT_FALSE(window.TakeNext(0ms));

    window.Deliver(16, "sixteen");
    EXPECT_INPUT_CONTRACT(window.Deliver(16, "again"), "!mWaiting.contains(inIndex)");
    EXPECT_INPUT_CONTRACT(window.Deliver(12, "late"), "inIndex >= mNext");
    window.Deliver(14, "fourteen");
    // Taking all that waits empties the window in order, without advancing it.
    EXPECT_EQ(window.TakeAllWaiting(), (std::vector<std::string>{"fourteen", "sixteen"}));
    EXPECT_EQ(window.GetWaitingCount(), 0u);
    EXPECT_EQ(window.GetNextIndex(), 13);
}

TEST_F(OrderingWindowTest, ManyProducersInRandomOrderReachAWaitingConsumerInOrder)
{
    constexpr int kCount = 2000;
    constexpr int kThreads = 4;
    std::vector<int> order(kCount);
    std::iota(order.begin(), order.end(), 0);
    std::shuffle(order.begin(), order.end(), std::mt19937(7));
    vrender::OrderingWindow<int> window(0);
    std::vector<std::thread> producers;
    for (int t = 0; t < kThreads; ++t)
        producers.emplace_back(
            [&, t]
            {
                for (int i = t; i < kCount; i += kThreads)
                    window.Deliver(order[i], order[i] * 3);
            });
    std::vector<int> taken;
    while (static_cast<int>(taken.size()) < kCount)
    {
        const std::optional<int> item = window.TakeNext(10s);
        ASSERT_TRUE(item) << "stalled after " << taken.size();
        taken.push_back(*item);
    }
    for (std::thread& producer : producers)
        producer.join();
    for (int i = 0; i < kCount; ++i)
        ASSERT_EQ(taken[i], i * 3) << i;
    EXPECT_EQ(window.GetWaitingCount(), 0u);
}

} // namespace
