#pragma once

// Helpers for the executor suites: a counting signal to wait for tasks, a
// gate that holds tasks back, and an object that counts its live copies so
// the suites can see when a task's captures are destroyed. Waits have a long
// deadline only so that a broken executor fails the suite instead of hanging
// it; no assertion depends on how fast anything runs.

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>

namespace mvxcore::testing
{

inline constexpr std::chrono::seconds kHangGuard{30};

// Counts notifications; waiters block until the count reaches a value.
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

    int Count()
    {
        std::lock_guard lock(mMutex);
        return mCount;
    }

private:
    std::mutex mMutex; // guards mCount
    std::condition_variable mCondition;
    int mCount = 0;
};

// Closed until Open; tasks that Pass wait for it.
class Gate
{
public:
    void Open()
    {
        std::lock_guard lock(mMutex);
        mOpen = true;
        mCondition.notify_all();
    }

    bool Pass()
    {
        std::unique_lock lock(mMutex);
        return mCondition.wait_for(lock, kHangGuard, [&] { return mOpen; });
    }

private:
    std::mutex mMutex; // guards mOpen
    std::condition_variable mCondition;
    bool mOpen = false;
};

// A capture whose destruction is counted: Tracked::Make() hands out a shared
// object that lowers the live count when its last copy goes.
class Tracked
{
public:
    explicit Tracked(std::atomic<int>& inLive)
        : mLive(inLive)
    {
        ++mLive;
    }
    ~Tracked() { --mLive; }
    Tracked(const Tracked&) = delete;
    Tracked& operator=(const Tracked&) = delete;

    static std::shared_ptr<Tracked> Make(std::atomic<int>& inLive)
    {
        return std::make_shared<Tracked>(inLive);
    }

private:
    std::atomic<int>& mLive;
};

// n tasks that each wait until all n have arrived: they can only all pass
// when the executor runs n of them at once.
class Rendezvous
{
public:
    explicit Rendezvous(int inCount)
        : mExpected(inCount)
    {
    }

    bool Arrive()
    {
        std::unique_lock lock(mMutex);
        ++mArrived;
        mCondition.notify_all();
        return mCondition.wait_for(lock, kHangGuard, [&] { return mArrived >= mExpected; });
    }

private:
    std::mutex mMutex; // guards mArrived
    std::condition_variable mCondition;
    const int mExpected;
    int mArrived = 0;
};

} // namespace mvxcore::testing
