#include "QRT/UIThread.h"

#include "Station.h"
#include "mvxcore/debug/Contract.h"

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <mutex>
#include <thread>

namespace QRT
{
namespace
{

struct QueuedMessage
{
    std::shared_ptr<detail::Station> mStation;
    MessagePtr mMessage;
    bool mCoalesce = false;
};

// Nesting depth of deliveries on this thread; above zero means this thread
// is the user-interface thread right now.
thread_local int tDeliveryDepth = 0;

struct DeliveryDepth
{
    DeliveryDepth() noexcept { ++tDeliveryDepth; }
    ~DeliveryDepth() { --tDeliveryDepth; }
    DeliveryDepth(const DeliveryDepth&) = delete;
    DeliveryDepth& operator=(const DeliveryDepth&) = delete;
};

class Dispatcher
{
public:
    static Dispatcher& Get()
    {
        // Never destroyed: a dispatcher thread may still run at exit and
        // messages may be posted by static destructors.
        static Dispatcher* sDispatcher = new Dispatcher();
        return *sDispatcher;
    }

    void Enqueue(std::shared_ptr<detail::Station> inStation, MessagePtr inMessage, bool inCoalesce)
    {
        MessagePtr replaced;
        {
            std::lock_guard lock(mQueueMutex);
            if (inCoalesce)
            {
                for (QueuedMessage& queued : mQueue)
                {
                    if (queued.mCoalesce && queued.mStation == inStation &&
                        queued.mMessage->GetMessageID() == inMessage->GetMessageID())
                    {
                        replaced = std::exchange(queued.mMessage, std::move(inMessage));
                        break;
                    }
                }
            }
            if (inMessage)
                mQueue.push_back(
                    QueuedMessage{std::move(inStation), std::move(inMessage), inCoalesce});
        }
        mQueueCondition.notify_all();
        // replaced (and its payload's references) is destroyed outside the lock.
    }

    bool Start()
    {
        std::lock_guard control(mControlMutex);
        if (mThread.joinable())
            return false;
        {
            std::lock_guard lock(mQueueMutex);
            mStopRequested = false;
        }
        mThread = std::thread([this] { Run(); });
        mThreadID.store(mThread.get_id());
        return true;
    }

    bool Stop()
    {
        MVX_INPUT_CONTRACT(mThreadID.load() != std::this_thread::get_id());
        std::lock_guard control(mControlMutex);
        if (!mThread.joinable())
            return false;
        {
            std::lock_guard lock(mQueueMutex);
            mStopRequested = true;
        }
        mQueueCondition.notify_all();
        mThread.join();
        mThreadID.store(std::thread::id());
        return true;
    }

    bool IsRunning() const { return mThreadID.load() != std::thread::id(); }

    size_t Pump(std::chrono::steady_clock::time_point inDeadline, bool inWaitForMore)
    {
        const std::thread::id dispatcher = mThreadID.load();
        MVX_INPUT_CONTRACT(dispatcher == std::thread::id() ||
                           dispatcher == std::this_thread::get_id());
        size_t budget = inWaitForMore ? SIZE_MAX : GetPendingCount();
        size_t handled = 0;
        while (budget > 0)
        {
            if (inWaitForMore)
            {
                std::unique_lock lock(mQueueMutex);
                if (!mQueueCondition.wait_until(lock, inDeadline,
                                                [this] { return !mQueue.empty(); }))
                    break;
            }
            if (!DeliverNext())
            {
                if (!inWaitForMore)
                    break;
                // Another pumping thread took the message; wait for the next.
                continue;
            }
            ++handled;
            --budget;
            if (inWaitForMore && std::chrono::steady_clock::now() >= inDeadline)
                break;
        }
        return handled;
    }

    size_t GetPendingCount()
    {
        std::lock_guard lock(mQueueMutex);
        return mQueue.size();
    }

    bool IsDispatcherThread() const { return mThreadID.load() == std::this_thread::get_id(); }

private:
    void Run()
    {
        for (;;)
        {
            {
                std::unique_lock lock(mQueueMutex);
                mQueueCondition.wait(lock, [this] { return mStopRequested || !mQueue.empty(); });
                if (mStopRequested)
                    return;
            }
            DeliverNext();
        }
    }

    // Takes the oldest message and delivers it; false when the queue is empty.
    bool DeliverNext()
    {
        QueuedMessage next;
        {
            // One deliverer at a time, taking messages only while it holds the
            // delivery lock, keeps queue order across pumping threads. The lock
            // is recursive so that a receiver may pump.
            std::lock_guard deliver(mDeliveryMutex);
            {
                std::lock_guard lock(mQueueMutex);
                if (mQueue.empty())
                    return false;
                next = std::move(mQueue.front());
                mQueue.pop_front();
            }
            DeliveryDepth depth;
            next.mStation->Deliver(*next.mMessage);
        }
        // next (the clone and its references) is destroyed here, after the
        // delivery lock is left.
        return true;
    }

    // Guards Start and Stop (mThread).
    std::mutex mControlMutex;
    std::thread mThread;
    std::atomic<std::thread::id> mThreadID{};

    // Guards mQueue and mStopRequested.
    std::mutex mQueueMutex;
    std::condition_variable mQueueCondition;
    std::deque<QueuedMessage> mQueue;
    bool mStopRequested = false;

    // Held by the thread delivering a message.
    std::recursive_mutex mDeliveryMutex;
};

} // namespace

namespace detail
{
void EnqueueForUIThread(std::shared_ptr<Station> inStation, MessagePtr inMessage, bool inCoalesce)
{
    Dispatcher::Get().Enqueue(std::move(inStation), std::move(inMessage), inCoalesce);
}
} // namespace detail

bool UIThread::Start()
{
    return Dispatcher::Get().Start();
}

bool UIThread::Stop()
{
    return Dispatcher::Get().Stop();
}

bool UIThread::IsRunning()
{
    return Dispatcher::Get().IsRunning();
}

size_t UIThread::PumpMessages()
{
    return Dispatcher::Get().Pump(std::chrono::steady_clock::time_point::max(), false);
}

size_t UIThread::PumpMessagesFor(std::chrono::milliseconds inDuration)
{
    MVX_INPUT_CONTRACT(inDuration.count() >= 0);
    return Dispatcher::Get().Pump(std::chrono::steady_clock::now() + inDuration, true);
}

bool UIThread::IsUIThread()
{
    return tDeliveryDepth > 0 || Dispatcher::Get().IsDispatcherThread();
}

size_t UIThread::GetPendingMessageCount()
{
    return Dispatcher::Get().GetPendingCount();
}

} // namespace QRT
