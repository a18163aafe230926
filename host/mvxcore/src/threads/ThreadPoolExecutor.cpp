#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "threads/CoreExecutor.h"
#include "threads/RunningTasks.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <exception>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <boost/make_shared.hpp>

namespace mvxcore::threads
{
namespace
{

using Clock = std::chrono::steady_clock;

struct DelayedTask
{
    Clock::time_point due;
    // Post order, so that tasks due at the same moment keep it.
    uint64_t sequence;
    Task task;
};

// Heap order for std::push_heap: the earliest due (then the earliest posted)
// task ends up at the front.
struct DueLater
{
    bool operator()(const DelayedTask& inLeft, const DelayedTask& inRight) const
    {
        if (inLeft.due != inRight.due)
            return inLeft.due > inRight.due;
        return inLeft.sequence > inRight.sequence;
    }
};

// The state and the workers of one pool. Owned by the ThreadPoolExecutor
// handed out to callers and, through their start function, by the worker
// threads themselves, so that a worker that ends the pool (by dropping the
// last reference inside one of its tasks) can still finish its loop safely.
// Ready tasks run in post order; delayed tasks wait in one heap ordered by due
// time, watched by the idle workers' timed condition waits.
class PoolCore : public std::enable_shared_from_this<PoolCore>
{
public:
    explicit PoolCore(unsigned inMaxThreads)
        : mMaxThreads(inMaxThreads)
    {
    }

    bool Post(Task inTask, int inScheduling)
    {
        MVX_INPUT_CONTRACT(!inTask.empty());
        MVX_INPUT_CONTRACT(inScheduling >= 0);
        {
            std::lock_guard lock(mMutex);
            if (mShutDown.load(std::memory_order_relaxed))
                return false;
            if (inScheduling == kRunAsSoonAsPossible)
            {
                mReady.push_back(std::move(inTask));
            }
            else
            {
                const Clock::time_point due =
                    Clock::now() + std::chrono::milliseconds(inScheduling);
                mDelayed.push_back(DelayedTask{due, mNextSequence++, std::move(inTask)});
                std::push_heap(mDelayed.begin(), mDelayed.end(), DueLater());
            }
            StartWorkersLocked();
        }
        // One idle worker is enough: it takes a ready task, or re-arms its
        // timed wait for the (possibly earlier) first due task.
        mWorkCondition.notify_one();
        return true;
    }

    bool IsCurrentThread() const { return detail::CountRunningMarks(this) > 0; }

    bool IsShutDown() const { return mShutDown.load(std::memory_order_acquire); }

    void BeginShutdown()
    {
        {
            std::lock_guard lock(mMutex);
            mShutDown.store(true, std::memory_order_release);
        }
        mWorkCondition.notify_all();
    }

    void DiscardPendingTasks()
    {
        std::deque<Task> ready;
        std::vector<DelayedTask> delayed;
        {
            std::lock_guard lock(mMutex);
            ready.swap(mReady);
            delayed.swap(mDelayed);
        }
        // The tasks are destroyed here, outside the lock: what they hold may
        // be the last reference to something that posts to this pool.
    }

    void WaitForRunningTasks()
    {
        // A worker asking waits for the others only: the task it is running
        // counts as finished for this wait.
        const unsigned own = IsCurrentThread() ? 1 : 0;
        std::unique_lock lock(mMutex);
        mSelfWaiting += own;
        ++mIdleWaiters;
        mIdleCondition.wait(lock, [this] { return mRunning <= mSelfWaiting; });
        --mIdleWaiters;
        mSelfWaiting -= own;
    }

    // Ends the workers: joins them all, except the calling thread when it is
    // one of them (it leaves its loop once its current task is over).
    void StopWorkers()
    {
        std::vector<std::thread> threads;
        {
            std::lock_guard lock(mMutex);
            mStopping = true;
            threads.swap(mThreads);
        }
        mWorkCondition.notify_all();
        const std::thread::id self = std::this_thread::get_id();
        for (std::thread& thread : threads)
        {
            if (thread.get_id() == self)
                thread.detach();
            else
                thread.join();
        }
    }

private:
    // Starts workers while there is more work than idle or starting workers,
    // up to the pool's size. Called with mMutex held.
    void StartWorkersLocked()
    {
        if (mStopping)
            return;
        const size_t demand = mReady.size() + (mDelayed.empty() ? 0 : 1);
        while (mThreads.size() < mMaxThreads && mIdleWorkers + mStartingWorkers < demand)
        {
            try
            {
                mThreads.emplace_back([core = shared_from_this()] { core->WorkerLoop(); });
                ++mStartingWorkers;
            }
            catch (const std::exception& inError)
            {
                // The workers already running keep serving the queue.
                mvxcore::debug::BreakAfterAssertDialog(
                    "worker thread started",
                    std::string("An executor could not start a worker thread: ") + inError.what(),
                    __FILE__, __LINE__, __func__);
                return;
            }
        }
    }

    // Moves every delayed task that is due into the ready queue, in due order.
    // Called with mMutex held.
    void PromoteDueTasksLocked()
    {
        if (mDelayed.empty())
            return;
        const Clock::time_point now = Clock::now();
        while (!mDelayed.empty() && mDelayed.front().due <= now)
        {
            std::pop_heap(mDelayed.begin(), mDelayed.end(), DueLater());
            mReady.push_back(std::move(mDelayed.back().task));
            mDelayed.pop_back();
        }
    }

    void WorkerLoop()
    {
        const detail::ScopedRunningMark mark(this);
        std::unique_lock lock(mMutex);
        --mStartingWorkers;
        while (!mStopping)
        {
            const bool shutDown = mShutDown.load(std::memory_order_relaxed);
            if (!shutDown)
                PromoteDueTasksLocked();
            if (!shutDown && !mReady.empty())
            {
                Task task = std::move(mReady.front());
                mReady.pop_front();
                ++mRunning;
                const bool moreReady = !mReady.empty();
                if (moreReady)
                    StartWorkersLocked();
                lock.unlock();
                if (moreReady)
                    mWorkCondition.notify_one();

                detail::RunTaskReportingFailures(task);
                // Destroyed while still counted as running: releasing what the
                // task holds belongs to the task (it may even end this pool).
                task.clear();

                lock.lock();
                --mRunning;
                if (mIdleWaiters > 0)
                    mIdleCondition.notify_all();
                continue;
            }

            ++mIdleWorkers;
            if (shutDown || mDelayed.empty())
                mWorkCondition.wait(lock);
            else
            {
                // A copy: the heap may change while this worker waits.
                const Clock::time_point firstDue = mDelayed.front().due;
                mWorkCondition.wait_until(lock, firstDue);
            }
            --mIdleWorkers;
        }
    }

    const unsigned mMaxThreads;
    // Written under mMutex, read without it by IsShutDown.
    std::atomic<bool> mShutDown{false};

    // Guards every member below.
    std::mutex mMutex;
    // Idle workers wait here for ready or due tasks, shutdown and stop.
    std::condition_variable mWorkCondition;
    // WaitForRunningTasks waits here for mRunning to fall.
    std::condition_variable mIdleCondition;
    std::deque<Task> mReady;
    // Min-heap by due time (DueLater).
    std::vector<DelayedTask> mDelayed;
    uint64_t mNextSequence = 0;
    std::vector<std::thread> mThreads;
    size_t mIdleWorkers = 0;
    size_t mStartingWorkers = 0;
    unsigned mRunning = 0;
    // Workers that wait in WaitForRunningTasks from inside their own task.
    unsigned mSelfWaiting = 0;
    unsigned mIdleWaiters = 0;
    bool mStopping = false;
};

// The pool as callers hold it: the last reference shuts it down and ends its
// workers.
boost::shared_ptr<AsyncThreadedExecutor> MakePool(unsigned inThreadCount)
{
    return boost::make_shared<CoreExecutor<PoolCore>>(std::make_shared<PoolCore>(inThreadCount));
}

} // namespace

unsigned GetCPUCoreCount()
{
    return std::max(1u, std::thread::hardware_concurrency());
}

boost::shared_ptr<AsyncThreadedExecutor> CreateCPUBoundExecutor()
{
    return MakePool(GetCPUCoreCount());
}

boost::shared_ptr<AsyncThreadedExecutor> CreateThreadPoolExecutor(unsigned inThreadCount)
{
    MVX_INPUT_CONTRACT(inThreadCount > 0);
    return MakePool(inThreadCount);
}

} // namespace mvxcore::threads
