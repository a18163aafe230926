#include "QRT/WaitableObject.h"

#include "QRT/Allocator.h"

#include <atomic>
#include <chrono>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace std::chrono_literals;

class WaitableObjectTest : public ::testing::Test
{
protected:
    void SetUp() override { mBlocksBefore = QRT::Allocator::GetLiveBlockCount(); }
    void TearDown() override { EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore); }
    int64_t mBlocksBefore = 0;
};

TEST_F(WaitableObjectTest, StaysSignalledUntilResetAndReleasesEveryWaiterAtOnce)
{
    const QRT::InterfaceRef<QRT::WaitableObject> waitable = QRT::WaitableObject::Create();
    EXPECT_FALSE(waitable->WaitForSignal(5ms));

    // A signal given before the wait is not lost, and later waits pass too.
    std::thread([&] { waitable->Signal(); }).join();
    waitable->WaitForSignal();
    EXPECT_TRUE(waitable->WaitForSignal(0ms));

    waitable->Reset();
    EXPECT_FALSE(waitable->IsSignalled());

    // One signal releases every waiter, and none is released before it.
    std::atomic<bool> signalled{false};
    std::atomic<int> released{0};
    std::vector<std::thread> waiters;
    for (int i = 0; i < 6; ++i)
    {
        waiters.emplace_back(
            [&, i]
            {
                if (i % 2 == 0)
                    waitable->WaitForSignal();
                else
                    EXPECT_TRUE(waitable->WaitForSignal(60000ms));
                // Counted only when released after the signal.
                released += signalled.load();
            });
    }
    std::this_thread::sleep_for(20ms);
    EXPECT_EQ(released.load(), 0);
    signalled = true;
    waitable->Signal();
    for (std::thread& waiter : waiters)
        waiter.join();
    EXPECT_EQ(released.load(), 6);
}

} // namespace
