#include "OrderingWindow.h"

#include "mvxcore/config/Error.h"

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
using Window = vrender::OrderingWindow<std::string>;

class OrderingWindowTest : public ::testing::Test
{
};

TEST_F(OrderingWindowTest, OutOfOrderDeliveriesComeOutInOrder)
{
    Window window(10);
    window.Deliver(12, "twelve");
    window.Deliver(11, "eleven");
    EXPECT_FALSE(window.TakeNext(0ms)) << "10 has not arrived";
    EXPECT_EQ(window.GetWaitingCount(), 2u);
    window.Deliver(10, "ten");
    EXPECT_EQ(window.TakeNext(0ms), "ten");
    EXPECT_EQ(window.TakeNext(0ms), "eleven");
    EXPECT_EQ(window.TakeNext(0ms), "twelve");
    EXPECT_EQ(window.GetNextIndex(), 13);
    EXPECT_FALSE(window.TakeNext(0ms));
}

TEST_F(OrderingWindowTest, TakenOrDuplicateIndicesBreakTheContract)
{
    Window window(0);
    window.Deliver(0, "a");
    EXPECT_THROW(window.Deliver(0, "again"), mvxcore::config::Error);
    ASSERT_EQ(window.TakeNext(0ms), "a");
    EXPECT_THROW(window.Deliver(0, "late"), mvxcore::config::Error);
    EXPECT_EQ(window.GetWaitingCount(), 0u);
}

TEST_F(OrderingWindowTest, TakeAllWaitingEmptiesTheWindowInOrder)
{
    Window window(0);
    window.Deliver(5, "five");
    window.Deliver(2, "two");
    EXPECT_EQ(window.TakeAllWaiting(), (std::vector<std::string>{"two", "five"}));
    EXPECT_EQ(window.GetWaitingCount(), 0u);
    EXPECT_EQ(window.GetNextIndex(), 0);
}

TEST_F(OrderingWindowTest, WaitsForADeliveryFromAnotherThread)
{
    Window window(0);
    std::thread producer(
        [&window]
        {
            std::this_thread::sleep_for(20ms);
            window.Deliver(0, "zero");
        });
    const auto start = std::chrono::steady_clock::now();
    const std::optional<std::string> item = window.TakeNext(10s);
    producer.join();
    EXPECT_EQ(item, "zero");
    EXPECT_GE(std::chrono::steady_clock::now() - start, 20ms) << "answered before the delivery";
}

TEST_F(OrderingWindowTest, ManyProducersInRandomOrder)
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
