// Requests into the render queue and out of it again: adding a request (on
// the calling thread when it cannot be handed on), cancelling one or all of
// a caller's, and the pending step that computes keys and starts prefetches
// before a request joins the prefetch wait list.

#include "ML/RenderExecutors.h"
#include "ML/RenderStatus.h"
#include "pipeline/RenderFrameQueueImpl.h"
#include "pipeline/RenderNotifications.h"

#include <algorithm>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

namespace ML::RenderQueueInternals
{

void RenderFrameQueueImpl::AddRenderRequest(const RenderFrameRequest& inRequest)
{
    QueueEntry entry{inRequest, mNextSerial.fetch_add(1), {}};

    if (entry.mRequest.mAcceleratedRenderer && !OfferToAcceleratedRenderer(entry))
        return;

    if (MustRenderOnCallingThread())
    {
        Render(entry, false);
        return;
    }

    {
        std::lock_guard<std::mutex> lock(mIncomingMutex);
        mIncoming.push_back(std::move(entry));
    }
    SchedulePendingRequests();
}

void RenderFrameQueueImpl::CancelOne(RenderRequestID inRequestID)
{
    std::optional<QueueEntry> found;
    {
        QRT::CriticalSectionLock lock(mAcceleratedLock,
                                      "RenderFrameQueue::CancelOne - Accelerated");
        found = TakeByID(mAccelerated, inRequestID);
    }
    if (found)
    {
        // Tells the accelerated renderer to cancel; an answer that still
        // arrives finds no entry and is ignored.
        DeliverCancellation(found->mRequest);
        return;
    }

    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::CancelOne");
        bool incomingLeft = false;
        {
            std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
            const auto it = std::find_if(mIncoming.begin(), mIncoming.end(),
                                         [inRequestID](const QueueEntry& inEntry)
                                         { return inEntry.mRequest.mRequestID == inRequestID; });
            if (it != mIncoming.end())
            {
                found = std::move(*it);
                mIncoming.erase(it);
            }
            incomingLeft = !mIncoming.empty();
        }
        if (incomingLeft)
            SchedulePendingRequests();

        // A registered request is being processed outside the lock: the
        // processing step delivers the cancellation when it finds the
        // registration gone.
        if (!found && (EraseRegistrationByID(mPendingRegistry, inRequestID) ||
                       EraseRegistrationByID(mPrefetchRegistry, inRequestID)))
            return;
        if (!found)
            found = TakeByID(mNormalReady, inRequestID);
        if (!found)
            found = TakeByID(mLowReady, inRequestID);
        if (!found)
        {
            const auto it = std::find_if(mPrefetchWait.begin(), mPrefetchWait.end(),
                                         [inRequestID](const QueueEntry& inEntry)
                                         { return inEntry.mRequest.mRequestID == inRequestID; });
            if (it != mPrefetchWait.end())
            {
                found = std::move(*it);
                mPrefetchWait.erase(it);
            }
        }
    }
    if (found)
        DeliverCancellation(found->mRequest);
}

void RenderFrameQueueImpl::CancelCallersRequests(const void* inCaller)
{
    std::vector<QueueEntry> cancelled;
    const auto ofCaller = [inCaller](const QueueEntry& inEntry)
    { return inEntry.mRequest.mCaller == inCaller; };
    {
        QRT::CriticalSectionLock lock(mAcceleratedLock,
                                      "RenderFrameQueue::CancelCallersRequests - Accelerated");
        TakeMatching(mAccelerated, ofCaller, cancelled);
    }
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::CancelCallersRequests");
        bool incomingLeft = false;
        {
            std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
            TakeMatching(mIncoming, ofCaller, cancelled);
            incomingLeft = !mIncoming.empty();
        }
        if (incomingLeft)
            SchedulePendingRequests();
        EraseRegistrationsOfCaller(mPendingRegistry, inCaller);
        EraseRegistrationsOfCaller(mPrefetchRegistry, inCaller);
        TakeMatching(mPrefetchWait, ofCaller, cancelled);
        TakeMatching(mNormalReady, ofCaller, cancelled);
        TakeMatching(mLowReady, ofCaller, cancelled);
    }
    SortByIdentifier(cancelled);
    DeliveryBatch batch;
    for (const QueueEntry& entry : cancelled)
        batch.Run([&entry] { DeliverCancellation(entry.mRequest); });
    batch.RethrowFirst();
}

void RenderFrameQueueImpl::SchedulePendingRequests()
{
    std::uint32_t expected = 0;
    if (!mPendingScheduled.compare_exchange_strong(expected, 1))
        return;
    QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
    if (!mHousekeeping->Post([self] { self->ProcessPendingRequests(true); }))
        mPendingScheduled.store(0);
}

bool RenderFrameQueueImpl::MustRenderOnCallingThread() const
{
    for (const ExecutorPtr& executor :
         {LoadExecutor(sNormalPriorityRenderQueue), LoadExecutor(sLowPriorityRenderQueue),
          mHousekeeping, LoadExecutor(sVideoSourcePrefetcherQueue),
          LoadExecutor(sImageSourcePrefetcherQueue)})
    {
        if (!executor || executor->IsCurrentThreadOrShutDown())
            return true;
    }
    return false;
}

void RenderFrameQueueImpl::ProcessPendingRequests(bool inResetFlag)
{
    if (inResetFlag)
        mPendingScheduled.store(0);

    std::vector<QueueEntry> taken;
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::ProcessPendingRequests1");
        {
            std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
            taken.swap(mIncoming);
        }
        for (const QueueEntry& entry : taken)
            mPendingRegistry.emplace(
                entry.mSerial, Registration{entry.mRequest.mRequestID, entry.mRequest.mCaller});
    }
    SortByIdentifier(taken);

    // Failures of key computation or prefetch collection end the request
    // with an error instead of escaping into the executor.
    std::vector<QRT::Result> statuses(taken.size(), QRT::kResult_Success);
    if (!sShuttingDown.load())
    {
        for (std::size_t i = 0; i < taken.size(); ++i)
        {
            RenderFrameRequest& request = taken[i].mRequest;
            try
            {
                if (request.mKey.IsNil())
                    request.ComputeKey(true);
                request.StartPrefetches();
            }
            catch (...)
            {
                statuses[i] = StatusOfCurrentException();
                if (QRT::Succeeded(statuses[i]))
                    statuses[i] = kResult_RenderFailed;
            }
        }
    }

    std::vector<QueueEntry> cancelled;
    std::vector<std::pair<QueueEntry, QRT::Result>> failed;
    std::vector<QueueEntry> dropped;
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::ProcessPendingRequests2");
        const bool shuttingDown = sShuttingDown.load();
        for (std::size_t i = 0; i < taken.size(); ++i)
        {
            QueueEntry& entry = taken[i];
            if (mPendingRegistry.erase(entry.mSerial) == 0)
                cancelled.push_back(std::move(entry));
            else if (shuttingDown)
                dropped.push_back(std::move(entry));
            else if (QRT::Failed(statuses[i]))
                failed.emplace_back(std::move(entry), statuses[i]);
            else
            {
                entry.mStopwatch.Start();
                mPrefetchWait.push_back(std::move(entry));
            }
        }
    }

    DeliveryBatch batch;
    for (const QueueEntry& entry : cancelled)
        batch.Run([&entry] { DeliverCancellation(entry.mRequest); });
    for (const auto& failure : failed)
        batch.Run([&failure] { Finish(failure.first.mRequest, {}, failure.second, 0); });
    for (const QueueEntry& entry : dropped)
        WakeWaiter(entry.mRequest);
    batch.Run([this] { ProcessPrefetchRequests(false); });
    batch.RethrowFirst();
}

} // namespace ML::RenderQueueInternals
