#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "threads/CoreExecutor.h"
#include "threads/RunningTasks.h"

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <mutex>

#include <boost/make_shared.hpp>

namespace mvxcore::threads
{
namespace
{

class SubCore;

// What a sub-executor posts to its parent: either a run slot (run the next
// ready task) or the expiry of one delayed task. Every copy of the posted
// function shares one ticket; when the last copy goes without the ticket
// having been used, the parent dropped it (refused or discarded at shutdown)
// and the sub-executor learns that it can no longer run anything.
struct ParentTicket
{
    std::shared_ptr<SubCore> core;
    bool isDelayed = false;
    uint64_t delayedId = 0;
    bool used = false;

    ~ParentTicket();
};

struct ParentTask
{
    std::shared_ptr<ParentTicket> ticket;

    void operator()() const;
};

// The state of one sub-executor. Its tasks wait in its own queues; it keeps
// at most mMaxConcurrency run slots posted to the parent, and each slot runs
// one task and then re-posts itself while tasks are ready, so the ready tasks
// start in post order and never more than mMaxConcurrency run at once.
// Delayed tasks stay here too (so discarding them destroys them at once); the
// parent only carries a timed ticket naming them.
class SubCore : public std::enable_shared_from_this<SubCore>
{
public:
    SubCore(boost::shared_ptr<AsyncThreadedExecutor> inParent, unsigned inMaxConcurrency)
        : mParent(std::move(inParent))
        , mMaxConcurrency(inMaxConcurrency)
    {
    }

    bool Post(Task inTask, int inScheduling)
    {
        MVX_INPUT_CONTRACT(!inTask.empty());
        MVX_INPUT_CONTRACT(inScheduling >= 0);
        // A parent that is shutting down would drop the ticket anyway.
        if (mParent->IsShutDown())
            return false;
        bool needSlot = false;
        uint64_t delayedId = 0;
        {
            std::lock_guard lock(mMutex);
            if (mShutDown.load(std::memory_order_relaxed))
                return false;
            if (inScheduling == kRunAsSoonAsPossible)
            {
                mReady.push_back(std::move(inTask));
                needSlot = TakeSlotLocked();
            }
            else
            {
                delayedId = mNextDelayedId++;
                mDelayed.emplace(delayedId, std::move(inTask));
            }
        }
        // The parent is called outside the lock: a refused ticket comes back
        // at once through OnParentDroppedWork, which takes the lock.
        if (inScheduling == kRunAsSoonAsPossible)
            return !needSlot || PostToParent(false, 0, kRunAsSoonAsPossible);
        return PostToParent(true, delayedId, inScheduling);
    }

    bool IsCurrentThread() const { return detail::CountRunningMarks(this) > 0; }

    bool IsShutDown() const
    {
        return mShutDown.load(std::memory_order_acquire) || mParent->IsShutDown();
    }

    void BeginShutdown()
    {
        std::lock_guard lock(mMutex);
        mShutDown.store(true, std::memory_order_release);
    }

    void DiscardPendingTasks()
    {
        std::deque<Task> ready;
        std::map<uint64_t, Task> delayed;
        {
            std::lock_guard lock(mMutex);
            ready.swap(mReady);
            delayed.swap(mDelayed);
        }
        // Destroyed outside the lock; posted slots and timed tickets find
        // nothing when they run.
    }

    void WaitForRunningTasks()
    {
        const unsigned own = detail::CountRunningMarks(this);
        std::unique_lock lock(mMutex);
        mSelfWaiting += own;
        ++mIdleWaiters;
        mIdleCondition.wait(lock, [this] { return mRunning <= mSelfWaiting; });
        --mIdleWaiters;
        mSelfWaiting -= own;
    }

    // A run slot: runs the next ready task, then keeps the slot going while
    // tasks are ready.
    void RunNext()
    {
        Task task;
        {
            std::lock_guard lock(mMutex);
            if (mShutDown.load(std::memory_order_relaxed) || mReady.empty())
            {
                --mSlots;
                return;
            }
            task = std::move(mReady.front());
            mReady.pop_front();
            ++mRunning;
        }
        {
            const detail::ScopedRunningMark mark(this);
            detail::RunTaskReportingFailures(task);
            // Still marked and counted: dropping the last reference to this
            // sub-executor here must see this task as its own.
            task.clear();
        }
        bool keepSlot = false;
        {
            std::lock_guard lock(mMutex);
            --mRunning;
            if (mIdleWaiters > 0)
                mIdleCondition.notify_all();
            keepSlot = !mShutDown.load(std::memory_order_relaxed) && !mReady.empty();
            if (!keepSlot)
                --mSlots;
        }
        // Re-posting instead of looping lets the parent's other work in
        // between; the slot stays counted, so the order is kept.
        if (keepSlot)
            PostToParent(false, 0, kRunAsSoonAsPossible);
    }

    // A timed ticket expired: its task becomes ready.
    void PromoteDelayed(uint64_t inDelayedId)
    {
        bool needSlot = false;
        {
            std::lock_guard lock(mMutex);
            const auto found = mDelayed.find(inDelayedId);
            if (found == mDelayed.end() || mShutDown.load(std::memory_order_relaxed))
                return;
            mReady.push_back(std::move(found->second));
            mDelayed.erase(found);
            needSlot = TakeSlotLocked();
        }
        if (needSlot)
            PostToParent(false, 0, kRunAsSoonAsPossible);
    }

    // The parent refused or discarded a ticket: it is shutting down and will
    // run nothing more of ours, so this executor shuts down as well and
    // releases its pending tasks.
    void OnParentDroppedWork(bool inWasSlot)
    {
        std::deque<Task> ready;
        std::map<uint64_t, Task> delayed;
        {
            std::lock_guard lock(mMutex);
            if (inWasSlot)
                --mSlots;
            mShutDown.store(true, std::memory_order_release);
            ready.swap(mReady);
            delayed.swap(mDelayed);
        }
    }

private:
    // Called with mMutex held.
    bool TakeSlotLocked()
    {
        if (mSlots >= mMaxConcurrency)
            return false;
        ++mSlots;
        return true;
    }

    bool PostToParent(bool inDelayed, uint64_t inDelayedId, int inScheduling)
    {
        auto ticket = std::make_shared<ParentTicket>();
        ticket->core = shared_from_this();
        ticket->isDelayed = inDelayed;
        ticket->delayedId = inDelayedId;
        return mParent->Post(ParentTask{std::move(ticket)}, inScheduling);
    }

    const boost::shared_ptr<AsyncThreadedExecutor> mParent;
    const unsigned mMaxConcurrency;
    // Written under mMutex, read without it by IsShutDown.
    std::atomic<bool> mShutDown{false};

    // Guards every member below.
    std::mutex mMutex;
    // WaitForRunningTasks waits here for mRunning to fall.
    std::condition_variable mIdleCondition;
    std::deque<Task> mReady;
    // Delayed tasks by the identifier of their timed ticket.
    std::map<uint64_t, Task> mDelayed;
    uint64_t mNextDelayedId = 0;
    // Run slots posted to the parent and not yet finished.
    unsigned mSlots = 0;
    unsigned mRunning = 0;
    // Tasks that wait in WaitForRunningTasks from inside themselves.
    unsigned mSelfWaiting = 0;
    unsigned mIdleWaiters = 0;
};

ParentTicket::~ParentTicket()
{
    if (!used)
        core->OnParentDroppedWork(!isDelayed);
}

void ParentTask::operator()() const
{
    ticket->used = true;
    if (ticket->isDelayed)
        ticket->core->PromoteDelayed(ticket->delayedId);
    else
        ticket->core->RunNext();
}

} // namespace

boost::shared_ptr<AsyncThreadedExecutor>
CreateSubExecutor(boost::shared_ptr<AsyncThreadedExecutor> inParent, unsigned inMaxConcurrency)
{
    MVX_INPUT_CONTRACT(inParent != nullptr);
    MVX_INPUT_CONTRACT(inMaxConcurrency > 0);
    // The last reference shuts it down; the parent lives on as long as others
    // hold it or tickets of this executor are still queued there.
    return boost::make_shared<CoreExecutor<SubCore>>(
        std::make_shared<SubCore>(std::move(inParent), inMaxConcurrency));
}

} // namespace mvxcore::threads
