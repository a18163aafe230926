#pragma once

// Waiting helpers of the threaded suites: a bounded wait for a condition (so
// that a fault shows as a failure instead of a hang) and a gate that test
// doubles wait at until the test opens it.

#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <thread>

namespace vrtest
{

inline bool WaitUntil(const std::function<bool()>& inCondition,
                      std::chrono::milliseconds inLimit = std::chrono::seconds(20))
{
    const auto end = std::chrono::steady_clock::now() + inLimit;
    while (!inCondition())
    {
        if (std::chrono::steady_clock::now() > end)
            return false;
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
    return true;
}

class Gate
{
public:
    void Open()
    {
        std::lock_guard lock(mMutex);
        mOpen = true;
        mCondition.notify_all();
    }
    void Wait()
    {
        std::unique_lock lock(mMutex);
        mCondition.wait(lock, [this] { return mOpen; });
    }

private:
    // Guards mOpen.
    std::mutex mMutex;
    std::condition_variable mCondition;
    bool mOpen = false;
};

} // namespace vrtest
