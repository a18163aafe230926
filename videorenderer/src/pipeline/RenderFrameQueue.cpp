#include "ML/RenderFrameQueue.h"

#include "MF/RenderableCutlist.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderStatus.h"
#include "QRT/CriticalSection.h"
#include "QRT/Exception.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "pipeline/RenderNotifications.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <exception>
#include <map>
#include <mutex>
#include <new>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include <boost/smart_ptr/shared_ptr.hpp>

namespace ML
{

namespace
{

using ExecutorPtr = boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor>;

// Set by Shutdown; cleared only when a fresh queue is constructed.
std::atomic<bool> sShuttingDown{false};

// The stopwatch clock; replaced by tests.
std::mutex sClockMutex;
std::shared_ptr<const RenderQueueClock> sClock;

std::chrono::steady_clock::time_point Now()
{
    std::shared_ptr<const RenderQueueClock> clock;
    {
        std::lock_guard<std::mutex> lock(sClockMutex);
        clock = sClock;
    }
    return clock ? (*clock)() : std::chrono::steady_clock::now();
}

// Measures the time since it was started; never negative.
class Stopwatch
{
public:
    void Start() { mStart = Now(); }
    double GetElapsedSeconds() const
    {
        const double seconds = std::chrono::duration<double>(Now() - mStart).count();
        return seconds < 0.0 ? 0.0 : seconds;
    }

private:
    std::chrono::steady_clock::time_point mStart = Now();
};

// A request as the queue keeps it: the request, a serial number that tells
// copies of requests with equal identifiers apart, and the stopwatch started
// when its prefetch wait began.
struct QueueEntry
{
    RenderFrameRequest mRequest;
    std::uint64_t mSerial = 0;
    Stopwatch mStopwatch;
};

// Ready sets are ordered by request identifier, then by arrival.
using OrderKey = std::pair<RenderRequestID, std::uint64_t>;
using OrderedEntries = std::map<OrderKey, QueueEntry>;

OrderKey KeyOf(const QueueEntry& inEntry)
{
    return OrderKey(inEntry.mRequest.mRequestID, inEntry.mSerial);
}

void SortByIdentifier(std::vector<QueueEntry>& ioEntries)
{
    std::sort(ioEntries.begin(), ioEntries.end(),
              [](const QueueEntry& inLeft, const QueueEntry& inRight)
              { return KeyOf(inLeft) < KeyOf(inRight); });
}

// Identifier and caller of a request that is being processed outside the
// main lock; a cancel removes the registration to tell the processing step.
struct Registration
{
    RenderRequestID mRequestID = 0;
    const void* mCaller = nullptr;
};
using Registry = std::map<std::uint64_t, Registration>;

// Removes the first registration of inRequestID; true when there was one.
bool EraseRegistrationByID(Registry& ioRegistry, RenderRequestID inRequestID)
{
    for (auto it = ioRegistry.begin(); it != ioRegistry.end(); ++it)
    {
        if (it->second.mRequestID == inRequestID)
        {
            ioRegistry.erase(it);
            return true;
        }
    }
    return false;
}

void EraseRegistrationsOfCaller(Registry& ioRegistry, const void* inCaller)
{
    std::erase_if(ioRegistry,
                  [inCaller](const auto& inItem) { return inItem.second.mCaller == inCaller; });
}

// An entry of the redundant-request map: the request being rendered (only its
// serial is kept) or a request waiting for that render (kept whole).
struct RedundantEntry
{
    std::uint64_t mSerial = 0;
    std::optional<QueueEntry> mWaiting;
};

// Runs deliveries one after another; an exception of one does not stop the
// others and is rethrown once all have run.
class DeliveryBatch
{
public:
    template <class F>
    void Run(F&& inDelivery)
    {
        try
        {
            inDelivery();
        }
        catch (...)
        {
            if (!mFirstFailure)
                mFirstFailure = std::current_exception();
        }
    }

    void RethrowFirst()
    {
        if (mFirstFailure)
            std::rethrow_exception(std::exchange(mFirstFailure, nullptr));
    }

private:
    std::exception_ptr mFirstFailure;
};

QRT::Result StatusOfCurrentException()
{
    try
    {
        throw;
    }
    catch (const RenderRequestException& inError)
    {
        return inError.GetStatus();
    }
    catch (const QRT::Exception&)
    {
        return kResult_RenderFailed;
    }
    catch (const std::bad_alloc&)
    {
        return kResult_OutOfMemory;
    }
    catch (...)
    {
        return kResult_RenderFailed;
    }
}

ExecutorPtr LoadExecutor(const ExecutorPtr& inShared)
{
    return boost::atomic_load(&inShared);
}

// Spins 1, 2, 4, 8, 16 rounds, then sleeps a millisecond and starts again.
class Backoff
{
public:
    void Pause()
    {
        if (mRounds > 16)
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            mRounds = 1;
            return;
        }
        for (unsigned i = 0; i < mRounds; ++i)
            std::this_thread::yield();
        mRounds *= 2;
    }

private:
    unsigned mRounds = 1;
};

constexpr std::int32_t kConstructionBias = 10'000'000;
constexpr std::uint32_t kLargeFramePixels = 414720;
constexpr std::uint32_t kPixelsPerUnit = 345600;
constexpr int kTimedPollScheduling = mvxcore::threads::kPollingDelayMilliseconds;

class RenderFrameQueueImpl;

RenderFrameQueueImpl* GetQueueStorage() noexcept;
QRT::CriticalSection& GetStaticLock();
QRT::InterfaceRef<RenderFrameQueueImpl> TryGetExistingQueue() noexcept;

std::atomic<std::int32_t> sRefCount{-kConstructionBias};
std::atomic<std::uint64_t> sConstructionCount{0};

class RenderFrameQueueImpl final : public QRT::Implements<RenderFrameQueue>
{
public:
    RenderFrameQueueImpl()
        : mHousekeeping(
              mvxcore::threads::CreateSubExecutor(mvxcore::threads::CreateCPUBoundExecutor(), 1))
    {
        sShuttingDown.store(false);
        VF::SharedVideoFrameCache::SetNotificationFunction(&OnFrameCached);
    }

    ~RenderFrameQueueImpl()
    {
        VF::SharedVideoFrameCache::SetNotificationFunction({});
        // Whatever is still queued can no longer be delivered; a thread that
        // waits for it is woken.
        std::vector<QueueEntry> left = TakeEverythingQueued();
        for (const QueueEntry& entry : left)
            WakeWaiter(entry.mRequest);
        for (auto& [key, entry] : mRedundant)
            if (entry.mWaiting)
                WakeWaiter(entry.mWaiting->mRequest);
    }

    // --- QRTUnknown: the singleton's count -------------------------------------

    std::uint32_t AddRef() noexcept override
    {
        return static_cast<std::uint32_t>(sRefCount.fetch_add(1) + 1);
    }

    std::uint32_t Release() noexcept override
    {
        const std::int32_t count = sRefCount.fetch_sub(1) - 1;
        if (count == 0)
            Destroy();
        return static_cast<std::uint32_t>(count);
    }

    // Destroys the queue in place when nobody took a new reference meanwhile,
    // and clears its storage so that a later Create constructs it afresh.
    void Destroy() noexcept override
    {
        QRT::CriticalSectionLock lock(GetStaticLock(), "RenderFrameQueue::Destroy");
        std::int32_t expected = 0;
        if (!sRefCount.compare_exchange_strong(expected, -kConstructionBias))
            return;
        this->~RenderFrameQueueImpl();
        std::memset(static_cast<void*>(this), 0, sizeof(RenderFrameQueueImpl));
    }

    // --- IRenderFrameClient: answers of accelerated renderers -------------------

    void OnRenderFrameComplete(std::intptr_t /*inContext*/, std::uint32_t inRequestID,
                               mvxmediatypes::TickTime /*inTime*/,
                               QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                               std::int32_t inRenderMilliseconds) override
    {
        OnAcceleratedRenderCompletion(inRequestID, std::move(inFrame), QRT::kResult_Success,
                                      inRenderMilliseconds);
    }

    void OnRenderFrameCancelled(std::intptr_t, std::uint32_t, mvxmediatypes::TickTime) override {}

    void OnRenderFrameError(std::intptr_t /*inContext*/, std::uint32_t inRequestID,
                            mvxmediatypes::TickTime /*inTime*/, QRT::Result inStatus) override
    {
        OnAcceleratedRenderCompletion(inRequestID, {}, inStatus, 0);
    }

    // --- RenderFrameQueue ----------------------------------------------------------

    void AddRenderRequest(const RenderFrameRequest& inRequest) override
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

    void CancelOne(RenderRequestID inRequestID) override
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
                                             [inRequestID](const QueueEntry& inEntry) {
                                                 return inEntry.mRequest.mRequestID == inRequestID;
                                             });
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
                                             [inRequestID](const QueueEntry& inEntry) {
                                                 return inEntry.mRequest.mRequestID == inRequestID;
                                             });
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

    void CancelCallersRequests(const void* inCaller) override
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

    void Shutdown() override
    {
        try
        {
            sShuttingDown.store(true);
            std::vector<QueueEntry> dropped;
            {
                QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::Shutdown");
                dropped = TakeEverythingQueuedLocked();
            }
            {
                QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::Shutdown2");
                for (auto& [key, entry] : mAccelerated)
                    dropped.push_back(std::move(entry));
                mAccelerated.clear();
            }
            // Dropped without notification; only a waiting thread is woken.
            for (const QueueEntry& entry : dropped)
                WakeWaiter(entry.mRequest);
            dropped.clear();

            for (const ExecutorPtr& executor :
                 {LoadExecutor(sNormalPriorityRenderQueue), LoadExecutor(sLowPriorityRenderQueue),
                  mHousekeeping})
            {
                if (!executor)
                    continue;
                executor->BeginShutdown();
                executor->DiscardPendingTasks();
                executor->WaitForRunningTasks();
            }
        }
        catch (const std::exception&)
        {
        }
    }

    void OnAcceleratedRenderCompletion(RenderRequestID inRequestID,
                                       QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                       QRT::Result inStatus,
                                       std::int32_t inRenderMilliseconds) override
    {
        std::optional<QueueEntry> found;
        {
            QRT::CriticalSectionLock lock(mAcceleratedLock,
                                          "RenderFrameQueue::OnAcceleratedRenderCompletion");
            found = TakeByID(mAccelerated, inRequestID);
        }
        if (found)
            Finish(found->mRequest, inFrame, inStatus, inRenderMilliseconds);
    }

    RenderFrameQueueStatistics GetStatistics() override
    {
        RenderFrameQueueStatistics statistics;
        {
            QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::GetStatistics");
            {
                std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
                statistics.mIncoming = mIncoming.size();
            }
            statistics.mPending = mPendingRegistry.size();
            statistics.mPrefetchWaiting = mPrefetchWait.size() + mPrefetchRegistry.size();
            statistics.mNormalReady = mNormalReady.size();
            statistics.mLowReady = mLowReady.size();
            QRT::CriticalSectionLock redundantLock(mRedundantLock,
                                                   "RenderFrameQueue::GetStatistics Redundant");
            statistics.mRedundant = mRedundant.size();
        }
        {
            QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::GetStatistics2");
            statistics.mAccelerated = mAccelerated.size();
        }
        statistics.mMemoryAvailable = mMemoryAvailable.load();
        statistics.mMemoryCapacity = mMemoryCapacity;
        return statistics;
    }

private:
    // --- Scheduling ------------------------------------------------------------------

    // Posts ProcessPendingRequests to the housekeeping executor unless one is
    // posted and not yet started.
    void SchedulePendingRequests()
    {
        std::uint32_t expected = 0;
        if (!mPendingScheduled.compare_exchange_strong(expected, 1))
            return;
        QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
        if (!mHousekeeping->Post([self] { self->ProcessPendingRequests(true); }))
            mPendingScheduled.store(0);
    }

    void SchedulePrefetchPoll(bool inTimedKind)
    {
        std::atomic<std::uint32_t>& flag =
            inTimedKind ? mTimedPollScheduled : mNotificationPollScheduled;
        std::uint32_t expected = 0;
        if (!flag.compare_exchange_strong(expected, 1))
            return;
        QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
        if (!mHousekeeping->Post(
                [self, inTimedKind] { self->ProcessPrefetchRequests(inTimedKind); },
                inTimedKind ? kTimedPollScheduling : mvxcore::threads::kRunAsSoonAsPossible))
            flag.store(0);
    }

    // The frame cache's notification: a frame arrived, so a waiting prefetch
    // may be complete.
    static void OnFrameCached(const mvxcore::utility::Guid& /*inKey*/)
    {
        if (sShuttingDown.load())
            return;
        if (const auto queue = TryGetExistingQueue())
            queue->SchedulePrefetchPoll(false);
    }

    // True when the request cannot be handed to an executor from this thread:
    // the caller is itself one of the render or prefetch threads (it would
    // wait for itself) or an executor is gone.
    bool MustRenderOnCallingThread() const
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

    // Hands a request to its accelerated renderer. False when the renderer
    // took it, or when it was answered or cancelled meanwhile: the queue is
    // then done with it. True when the queue must render it itself.
    bool OfferToAcceleratedRenderer(QueueEntry& ioEntry)
    {
        const OrderKey key = KeyOf(ioEntry);
        {
            QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::AddRenderRequest1");
            mAccelerated.emplace(key, ioEntry);
        }
        const RenderFrameRequest& request = ioEntry.mRequest;
        QRT::Result status = kResult_RenderFailed;
        try
        {
            status = request.mAcceleratedRenderer->InitiateRender(
                request.mTime, static_cast<std::uint32_t>(request.GetOutputWidth()),
                static_cast<std::uint32_t>(request.GetOutputHeight()),
                request.mOutputPixelAspectRatio, request.mRequestedFormats, request.mQuality,
                request.mPrefetchOnly, request.mCompositeOnBlack, !request.mRenderSingleField,
                QRT::InterfaceRef<IRenderFrameClient>(this), 0, request.mRequestID);
        }
        catch (...)
        {
            status = StatusOfCurrentException();
        }
        if (QRT::Succeeded(status))
            return false;

        ioEntry.mRequest.mAcceleratedRenderer.Reset();
        QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::AddRenderRequest2");
        // An entry that is gone was answered or cancelled while the renderer
        // was being asked: it has had its one delivery.
        return mAccelerated.erase(key) != 0;
    }

    // Called with the main lock held.
    void ScheduleRenderTasksLocked()
    {
        const auto available = static_cast<std::uint16_t>(mMemoryAvailable.load());
        if (!mNormalReady.empty())
        {
            const std::uint16_t cost = RequestCost(mNormalReady.begin()->second.mRequest);
            if (cost <= available)
                PostRenderTask(false);
        }
        if (!mLowReady.empty() && mNormalReady.empty())
        {
            const std::uint16_t cost = RequestCost(mLowReady.begin()->second.mRequest);
            if (cost > available)
                return;
            PostRenderTask(true);
        }
    }

    void PostRenderTask(bool inLowSet)
    {
        const ExecutorPtr executor =
            LoadExecutor(inLowSet ? sLowPriorityRenderQueue : sNormalPriorityRenderQueue);
        if (!executor)
            return;
        std::atomic<std::uint32_t>& flag = inLowSet ? mLowTaskScheduled : mNormalTaskScheduled;
        std::uint32_t expected = 0;
        if (!flag.compare_exchange_strong(expected, 1))
            return;
        QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
        if (!executor->Post([self, inLowSet] { self->RenderNextRequest(inLowSet); }))
            flag.store(0);
    }

    // --- Processing steps ------------------------------------------------------------

    void ProcessPendingRequests(bool inResetFlag)
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

    struct PrefetchOutcome
    {
        QueueEntry mEntry;
        bool mComplete = false;
        QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    };

    void ProcessPrefetchRequests(bool inTimedKind)
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
                    "We should pretty much never timeout on a prefetch request.",
                    "RenderFrameQueue", __LINE__);
            if (!complete && !timedOut)
                waiting.push_back(std::move(entry));
            else if (entry.mRequest.mPrefetchOnly)
                completions.push_back(
                    PrefetchOutcome{std::move(entry), complete, std::move(frame)});
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
                    OrderedEntries& set =
                        entry.mRequest.IsNormalPriority() ? mNormalReady : mLowReady;
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

    // Reserves inCost units of memory; false when they are not available.
    bool ReserveMemory(std::uint16_t inCost)
    {
        Backoff backoff;
        for (;;)
        {
            std::uint32_t available = mMemoryAvailable.load();
            if (available < inCost)
                return false;
            if (mMemoryAvailable.compare_exchange_weak(available, available - inCost))
                return true;
            backoff.Pause();
        }
    }

    void ReturnMemory(std::uint16_t inCost)
    {
        Backoff backoff;
        for (;;)
        {
            std::uint32_t available = mMemoryAvailable.load();
            if (mMemoryAvailable.compare_exchange_weak(available, (available + inCost) & 0xFFFFu))
                return;
            backoff.Pause();
        }
    }

    bool GetNextRequestAndAccountForMemory(QueueEntry* outRenderFrameRequest, bool inLowSet,
                                           std::uint16_t& outCost)
    {
        MVX_INPUT_CONTRACT(outRenderFrameRequest);
        QRT::CriticalSectionLock lock(mMainLock,
                                      "RenderFrameQueue::GetNextRequestAndAccountForMemory");
        outCost = 0;
        bool taken = false;
        // Normal requests always go first.
        if (!(inLowSet && !mNormalReady.empty()))
        {
            OrderedEntries& set = inLowSet ? mLowReady : mNormalReady;
            while (!taken && !set.empty())
            {
                const auto first = set.begin();
                const std::uint16_t cost = RequestCost(first->second.mRequest);
                if (!ReserveMemory(cost))
                    break;
                const QRT::Guid key = first->second.mRequest.mKey;
                // A nil key names no frame: such requests are never merged.
                bool identicalRendering = false;
                if (!key.IsNil())
                {
                    QRT::CriticalSectionLock redundantLock(
                        mRedundantLock,
                        "RenderFrameQueue::GetNextRequestAndAccountForMemory RedundantRequestLock");
                    identicalRendering = mRedundant.count(key) != 0;
                    if (identicalRendering)
                        mRedundant.emplace(
                            key, RedundantEntry{first->second.mSerial, std::move(first->second)});
                    else
                        mRedundant.emplace(key, RedundantEntry{first->second.mSerial, {}});
                }
                if (identicalRendering)
                {
                    set.erase(first);
                    ReturnMemory(cost);
                    continue;
                }
                *outRenderFrameRequest = std::move(first->second);
                set.erase(first);
                outCost = cost;
                taken = true;
            }
        }
        ScheduleRenderTasksLocked();
        return taken;
    }

    void RenderNextRequest(bool inLowSet)
    {
        (inLowSet ? mLowTaskScheduled : mNormalTaskScheduled).store(0);
        DeliveryBatch batch;
        batch.Run([this] { ProcessPendingRequests(false); });
        QueueEntry entry;
        std::uint16_t cost = 0;
        bool taken = false;
        batch.Run([&] { taken = GetNextRequestAndAccountForMemory(&entry, inLowSet, cost); });
        if (taken)
        {
            batch.Run([&] { Render(entry, true); });
            ReturnMemory(cost);
        }
        batch.Run([this] { ProcessPendingRequests(false); });
        batch.RethrowFirst();
    }

    // Renders one request (or serves it from the cache) and delivers it and
    // every identical request that waited for it. inRegistered: the request
    // was taken from a ready set and is in the redundant-request map.
    QRT::Result Render(QueueEntry& ioEntry, bool inRegistered)
    {
        RenderFrameRequest& request = ioEntry.mRequest;
        QRT::Result status = kResult_RenderFailed;
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        std::int32_t renderMilliseconds = 0;
        if (!sShuttingDown.load())
        {
            try
            {
                if (!request.mKey.IsNil())
                    frame = VF::SharedVideoFrameCache::RetrieveFromCache(request.mKey);
                if (frame)
                {
                    status = kResult_Rendered;
                }
                else
                {
                    const auto start = Now();
                    const mvxmediatypes::PixelFormat format = request.ChooseRenderPixelFormat();
                    request.Render(frame, format);
                    if (!frame)
                        throw QRT::NullInterfaceException();
                    const double elapsed =
                        std::max(0.0, std::chrono::duration<double>(Now() - start).count());
                    renderMilliseconds = static_cast<std::int32_t>(elapsed * 1000.0);
                    frame->SetRenderTime(static_cast<std::uint32_t>(renderMilliseconds));
                    if (ShouldCache(request))
                        VF::SharedVideoFrameCache::InsertIntoCache(
                            frame, request.mKey,
                            request.mPriority > kRenderPriority_CacheHigh ? VF::kCachePriority_High
                                                                          : VF::kCachePriority_Low);
                    status = kResult_Rendered;
                }
            }
            catch (...)
            {
                status = StatusOfCurrentException();
                frame.Reset();
            }
        }

        std::vector<QueueEntry> duplicates;
        if (inRegistered && !request.mKey.IsNil())
        {
            QRT::CriticalSectionLock lock(mRedundantLock,
                                          "RenderFrameQueue::Render RedundantRequestLock");
            const auto range = mRedundant.equal_range(request.mKey);
            for (auto it = range.first; it != range.second; ++it)
                if (it->second.mSerial != ioEntry.mSerial && it->second.mWaiting)
                    duplicates.push_back(std::move(*it->second.mWaiting));
            mRedundant.erase(range.first, range.second);
        }
        SortByIdentifier(duplicates);

        DeliveryBatch batch;
        batch.Run([&] { Finish(request, frame, status, renderMilliseconds); });
        for (const QueueEntry& duplicate : duplicates)
            batch.Run([&] { Finish(duplicate.mRequest, frame, status, renderMilliseconds); });
        batch.RethrowFirst();
        return status;
    }

    static bool ShouldCache(const RenderFrameRequest& inRequest)
    {
        if (inRequest.mDoNotCache)
            return false;
        if ((inRequest.mRenderFlags & kRenderFlag_AlwaysCache) != 0)
            return true;
        if ((inRequest.mRenderFlags & kRenderFlag_CacheWhenRangeNotEmpty) == 0 ||
            !inRequest.mCutlist)
            return false;
        const auto stillInfo = QRT::QueryRef<MF::IRenderableExtendedStillInfo>(inRequest.mCutlist);
        if (!stillInfo)
            return false;
        MF::TickTimeRange range;
        return QRT::Succeeded(stillInfo->GetStillRange(inRequest.mTime, range)) &&
               range.first != range.second;
    }

    // --- Helpers -----------------------------------------------------------------------

    static std::optional<QueueEntry> TakeByID(OrderedEntries& ioSet, RenderRequestID inRequestID)
    {
        const auto it = ioSet.lower_bound(OrderKey(inRequestID, 0));
        if (it == ioSet.end() || it->first.first != inRequestID)
            return std::nullopt;
        std::optional<QueueEntry> taken(std::move(it->second));
        ioSet.erase(it);
        return taken;
    }

    template <class Predicate>
    static void TakeMatching(OrderedEntries& ioSet, const Predicate& inMatches,
                             std::vector<QueueEntry>& ioTaken)
    {
        for (auto it = ioSet.begin(); it != ioSet.end();)
        {
            if (inMatches(it->second))
            {
                ioTaken.push_back(std::move(it->second));
                it = ioSet.erase(it);
            }
            else
            {
                ++it;
            }
        }
    }

    template <class Predicate>
    static void TakeMatching(std::vector<QueueEntry>& ioList, const Predicate& inMatches,
                             std::vector<QueueEntry>& ioTaken)
    {
        std::vector<QueueEntry> kept;
        for (QueueEntry& entry : ioList)
            (inMatches(entry) ? ioTaken : kept).push_back(std::move(entry));
        ioList.swap(kept);
    }

    // Called with the main lock held.
    std::vector<QueueEntry> TakeEverythingQueuedLocked()
    {
        std::vector<QueueEntry> taken;
        {
            std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
            taken.swap(mIncoming);
        }
        for (QueueEntry& entry : mPrefetchWait)
            taken.push_back(std::move(entry));
        mPrefetchWait.clear();
        for (OrderedEntries* set : {&mNormalReady, &mLowReady})
        {
            for (auto& [key, entry] : *set)
                taken.push_back(std::move(entry));
            set->clear();
        }
        return taken;
    }

    std::vector<QueueEntry> TakeEverythingQueued()
    {
        std::vector<QueueEntry> taken;
        {
            QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::~RenderFrameQueue");
            taken = TakeEverythingQueuedLocked();
        }
        QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::~RenderFrameQueue2");
        for (auto& [key, entry] : mAccelerated)
            taken.push_back(std::move(entry));
        mAccelerated.clear();
        return taken;
    }

    // Guards the incoming list, the registries, the prefetch wait list and
    // both ready sets.
    QRT::CriticalSection mMainLock;
    // Guards mAccelerated.
    QRT::CriticalSection mAcceleratedLock;
    const ExecutorPtr mHousekeeping;

    // Guards mIncoming (the hand-over from adding threads; taken alone, or
    // inside the main lock).
    std::mutex mIncomingMutex;
    std::vector<QueueEntry> mIncoming;
    Registry mPendingRegistry;
    std::atomic<std::uint32_t> mPendingScheduled{0};
    std::vector<QueueEntry> mPrefetchWait;
    Registry mPrefetchRegistry;
    std::atomic<std::uint32_t> mTimedPollScheduled{0};
    std::atomic<std::uint32_t> mNotificationPollScheduled{0};
    // Guards mRedundant.
    QRT::CriticalSection mRedundantLock;
    std::multimap<QRT::Guid, RedundantEntry> mRedundant;
    OrderedEntries mNormalReady;
    std::atomic<std::uint32_t> mNormalTaskScheduled{0};
    OrderedEntries mLowReady;
    std::atomic<std::uint32_t> mLowTaskScheduled{0};
    OrderedEntries mAccelerated;
    const std::uint32_t mMemoryCapacity = RenderFrameQueue::kMemoryCapacity;
    std::atomic<std::uint32_t> mMemoryAvailable{RenderFrameQueue::kMemoryCapacity};
    std::atomic<std::uint64_t> mNextSerial{1};
};

alignas(RenderFrameQueueImpl) unsigned char sStorage[sizeof(RenderFrameQueueImpl)];
std::atomic<QRT::CriticalSection*> sStaticLock{nullptr};

RenderFrameQueueImpl* GetQueueStorage() noexcept
{
    return std::launder(reinterpret_cast<RenderFrameQueueImpl*>(sStorage));
}

// The lock that serialises construction and destruction of the singleton,
// created on first use and published by compare-and-swap.
QRT::CriticalSection& GetStaticLock()
{
    QRT::CriticalSection* lock = sStaticLock.load();
    if (lock)
        return *lock;
    auto* created = new QRT::CriticalSection();
    if (sStaticLock.compare_exchange_strong(lock, created))
        return *created;
    delete created;
    return *lock;
}

// A reference to the queue when it is constructed and alive, else empty;
// never constructs it.
QRT::InterfaceRef<RenderFrameQueueImpl> TryGetExistingQueue() noexcept
{
    std::int32_t count = sRefCount.load();
    while (count > 0)
    {
        if (sRefCount.compare_exchange_weak(count, count + 1))
            return QRT::InterfaceRef<RenderFrameQueueImpl>::Adopt(GetQueueStorage());
    }
    return {};
}

} // namespace

QRT::InterfaceRef<RenderFrameQueue> RenderFrameQueue::Create()
{
    // A temporary reference first: a negative count means there is no queue.
    const std::int32_t count = sRefCount.fetch_add(1) + 1;
    if (count < 0)
    {
        QRT::CriticalSectionLock lock(GetStaticLock(), "RenderFrameQueue::Create");
        if (sRefCount.load() < 0)
        {
            try
            {
                new (sStorage) RenderFrameQueueImpl();
            }
            catch (...)
            {
                sRefCount.fetch_sub(1);
                throw;
            }
            sConstructionCount.fetch_add(1);
            sRefCount.fetch_add(kConstructionBias);
        }
    }
    RenderFrameQueueImpl* queue = GetQueueStorage();
    QRT::InterfaceRef<RenderFrameQueue> result(static_cast<RenderFrameQueue*>(queue));
    queue->Release();
    return result;
}

std::uint64_t RenderFrameQueue::GetConstructionCount()
{
    return sConstructionCount.load();
}

void RenderFrameQueue::SetClock(RenderQueueClock inClock)
{
    std::shared_ptr<const RenderQueueClock> clock;
    if (inClock)
        clock = std::make_shared<const RenderQueueClock>(std::move(inClock));
    std::lock_guard<std::mutex> lock(sClockMutex);
    sClock = std::move(clock);
}

std::uint16_t RenderFrameQueue::RequestCost(const RenderFrameRequest& inRequest)
{
    // Pixel counts in 32-bit signed arithmetic, as the budget has always
    // been counted.
    const std::int32_t pixels =
        static_cast<std::int32_t>(static_cast<std::uint32_t>(inRequest.mOutputRect.Height()) *
                                  static_cast<std::uint32_t>(inRequest.mOutputRect.Width()));
    std::uint32_t cost = 1;
    if (pixels > static_cast<std::int32_t>(kLargeFramePixels))
        cost = (static_cast<std::uint32_t>(pixels) + kPixelsPerUnit - 1) / kPixelsPerUnit;
    const std::uint32_t bytesPerPixel = inRequest.GetRenderPixelFormat().GetBytesPerPixel();
    if (bytesPerPixel > 4)
        cost *= (bytesPerPixel + 3) / 4;
    return static_cast<std::uint16_t>(std::min<std::uint32_t>(kMemoryCapacity / 2, cost));
}

bool IsRenderModuleShuttingDown() noexcept
{
    return sShuttingDown.load();
}

} // namespace ML
