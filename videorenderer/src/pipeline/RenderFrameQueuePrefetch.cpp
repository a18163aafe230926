// The render queue's prefetch wait list: polls (timed, and on the frame
// cache's notification) that move requests whose prefetches are done, or
// given up, to a ready set, and deliver prefetch-only requests.

#include "ML/RenderStatus.h"
#include "mvxcore/debug/Contract.h"
#include "pipeline/RenderFrameQueueImpl.h"
#include "pipeline/RenderNotifications.h"

#include <utility>
#include <vector>

namespace ML::RenderQueueInternals
{

namespace
{

constexpr int kTimedPollScheduling = mvxcore::threads::kPollingDelayMilliseconds;

struct PrefetchOutcome
{
    QueueEntry mEntry;
    bool mComplete = false;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
};

} // namespace

void RenderFrameQueueImpl::SchedulePrefetchPoll(bool inTimedKind)
{
    std::atomic<std::uint32_t>& flag =
        inTimedKind ? mTimedPollScheduled : mNotificationPollScheduled;
    std::uint32_t expected = 0;
    if (!flag.compare_exchange_strong(expected, 1))
        return;
    QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
    if (!mHousekeeping->Post([self, inTimedKind] { self->ProcessPrefetchRequests(inTimedKind); },
                             inTimedKind ? kTimedPollScheduling
                                         : mvxcore::threads::kRunAsSoonAsPossible))
        flag.store(0);
}

void RenderFrameQueueImpl::OnFrameCached(const mvxcore::utility::Guid& /*inKey*/)
{
    if (sShuttingDown.load())
        return;
    if (const auto queue = TryGetExistingQueue())
        queue->SchedulePrefetchPoll(false);
}

void RenderFrameQueueImpl::ProcessPrefetchRequests(bool inTimedKind)
{
    (inTimedKind ? mTimedPollScheduled : mNotificationPollScheduled).store(0);

    std::vector<QueueEntry> local;
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::ProcessPrefetchRequests1");
        local.swap(mPrefetchWait);
        for (const QueueEntry& entry : local)
            mPrefetchRegistry.emplace(
                entry.mSerial, Registration{entry.mRequest.mRequestID, entry.mRequest.mCaller});
    }

    std::vector<PrefetchOutcome> completions;
    std::vector<QueueEntry> ready;
    std::vector<QueueEntry> waiting;
    for (QueueEntry& entry : local)
    {
        bool complete = true;
        bool timedOut = false;
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        try
        {
            complete = entry.mRequest.PrefetchesComplete();
            if (!complete)
            {
                const double elapsed = entry.mStopwatch.GetElapsedSeconds();
                timedOut = elapsed > kPrefetchTimeoutSeconds &&
                           !entry.mRequest.PrefetchesWantMoreTime(elapsed);
                // A handle may finish between the two questions: one that
                // declines more time because it is done has not timed out.
                if (timedOut && entry.mRequest.PrefetchesComplete())
                {
                    complete = true;
                    timedOut = false;
                }
            }
            if (complete && entry.mRequest.mPrefetchOnly)
                entry.mRequest.GetPrefetchResult(frame);
        }
        catch (...)
        {
            // A handle that fails to answer counts as done without a
            // frame: the render reads what it needs itself.
            complete = true;
            frame.Reset();
        }
        if (timedOut)
            mvxcore::debug::BreakAfterAssertDialog(
                "prefetchCompleted || !prefetchTimeout",
                "We should pretty much never timeout on a prefetch request.", "RenderFrameQueue",
                __LINE__, "ML::RenderFrameQueue::ProcessPrefetchRequests");
        if (!complete && !timedOut)
            waiting.push_back(std::move(entry));
        else if (entry.mRequest.mPrefetchOnly)
            completions.push_back(PrefetchOutcome{std::move(entry), complete, std::move(frame)});
        else
            ready.push_back(std::move(entry));
    }

    std::vector<QueueEntry> cancelled;
    std::vector<QueueEntry> dropped;
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::ProcessPrefetchRequests2");
        const bool shuttingDown = sShuttingDown.load();
        // A cancel that removed the registration meanwhile wins: it was
        // accepted while the request was still queued.
        std::erase_if(completions,
                      [&](PrefetchOutcome& ioOutcome)
                      {
                          if (mPrefetchRegistry.erase(ioOutcome.mEntry.mSerial) != 0)
                              return false;
                          cancelled.push_back(std::move(ioOutcome.mEntry));
                          return true;
                      });
        for (QueueEntry& entry : ready)
        {
            if (mPrefetchRegistry.erase(entry.mSerial) == 0)
                cancelled.push_back(std::move(entry));
            else if (shuttingDown)
                dropped.push_back(std::move(entry));
            else
            {
                OrderedEntries& set = entry.mRequest.IsNormalPriority() ? mNormalReady : mLowReady;
                const OrderKey key = KeyOf(entry);
                set.emplace(key, std::move(entry));
            }
        }
        for (QueueEntry& entry : waiting)
        {
            if (mPrefetchRegistry.erase(entry.mSerial) == 0)
                cancelled.push_back(std::move(entry));
            else if (shuttingDown)
                dropped.push_back(std::move(entry));
            else
                mPrefetchWait.push_back(std::move(entry));
        }
        if (!mPrefetchWait.empty())
            SchedulePrefetchPoll(true);
        ScheduleRenderTasksLocked();
    }

    SortByIdentifier(cancelled);
    DeliveryBatch batch;
    for (const QueueEntry& entry : cancelled)
        batch.Run([&entry] { DeliverCancellation(entry.mRequest); });
    for (const QueueEntry& entry : dropped)
        WakeWaiter(entry.mRequest);
    for (const PrefetchOutcome& outcome : completions)
    {
        batch.Run(
            [&outcome]
            {
                const RenderFrameRequest& request = outcome.mEntry.mRequest;
                if (!outcome.mComplete)
                {
                    Finish(request, {}, kResult_PrefetchIncomplete, 0);
                    return;
                }
                request.StoreResult(outcome.mFrame);
                if (request.mWaitable)
                    request.mWaitable->Signal();
                else if (outcome.mFrame)
                    DeliverCompletion(request, outcome.mFrame, 0);
                else
                    DeliverError(request, QRT::kResult_Success);
            });
    }
    batch.RethrowFirst();
}

} // namespace ML::RenderQueueInternals
