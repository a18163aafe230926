// The ordering window: deliveries in any order come out in index order.

#include "OrderingWindow.h"

#include "ContractExpect.h"

#include <string>
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

} // namespace
