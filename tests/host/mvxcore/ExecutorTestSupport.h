#pragma once

// Helpers for the executor suites. Waits have a long deadline only so that a
// broken executor fails the suite instead of hanging it; no assertion depends
// on how fast anything runs.

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>

namespace mvxcore::testing
{

inline constexpr std::chrono::seconds kHangGuard{30};

// Counts notifications; waiters block until the count reaches a value. With
// one Notify it is a gate that tasks wait at; n tasks that each Notify and
// then wait for n meet only when the executor runs n of them at once.
class CountingSignal
{
public:
    void Notify()
    {
        // Notified under the lock: a waiter may destroy the signal as soon as
        // it sees the count.
        std::lock_guard lock(mMutex);
        ++mCount;
        mCondition.notify_all();
    }

    // False when the count did not reach inCount before the hang guard.
    bool WaitFor(int inCount = 1)
    {
        std::unique_lock lock(mMutex);
        return mCondition.wait_for(lock, kHangGuard, [&] { return mCount >= inCount; });
    }

    // Notify, then wait until inCount notifications arrived.
    bool Meet(int inCount)
    {
        Notify();
        return WaitFor(inCount);
    }

private:
    std::mutex mMutex; // guards mCount
    std::condition_variable mCondition;
    int mCount = 0;
};

// A capture whose destruction is counted: inLive is raised now and lowered
// when the last copy of the answer goes.
inline std::shared_ptr<int> Tracked(std::atomic<int>& inLive)
{
    ++inLive;
    return std::shared_ptr<int>(new int(0),
                                [&inLive](int* inValue)
                                {
                                    delete inValue;
                                    --inLive;
                                });
}

} // namespace mvxcore::testing
