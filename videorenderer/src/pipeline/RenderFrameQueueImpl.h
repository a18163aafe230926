#pragma once

// The render queue's implementation, shared by its source files:
//
// - RenderFrameQueue.cpp: the singleton (its storage, count, construction and
//   destruction), the stopwatch clock, shutdown and statistics;
// - RenderFrameQueueEntries.cpp: queue entries, registries and the helpers
//   that move entries between lists;
// - RenderFrameQueueIntake.cpp: adding and cancelling requests, the pending
//   step (keys and prefetches);
// - RenderFrameQueuePrefetch.cpp: the prefetch wait list and its polls;
// - RenderFrameQueueScheduling.cpp: the ready sets, the memory budget, the
//   render tasks and the render of one request with its identical requests;
// - RenderFrameQueueAccelerated.cpp: requests offered to an accelerated
//   renderer and that renderer's answers.
//
// Locks are those of ML/RenderFrameQueue.h. Functions that end in Locked
// expect the main lock to be held.

#include "ML/RenderFrameQueue.h"
#include "QRT/CriticalSection.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxcore/threads/AsyncThreadedExecutor.h"
#include "mvxcore/utility/Guid.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <exception>
#include <map>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include <boost/smart_ptr/shared_ptr.hpp>

namespace ML::RenderQueueInternals
{

using ExecutorPtr = boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor>;

// Set by Shutdown; cleared only when a fresh queue is constructed.
extern std::atomic<bool> sShuttingDown;

// The stopwatch clock's time (RenderFrameQueue::SetClock).
std::chrono::steady_clock::time_point Now();

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

OrderKey KeyOf(const QueueEntry& inEntry);

void SortByIdentifier(std::vector<QueueEntry>& ioEntries);

// Identifier and caller of a request that is being processed outside the
// main lock; a cancel removes the registration to tell the processing step.
struct Registration
{
    RenderRequestID mRequestID = 0;
    const void* mCaller = nullptr;
};
using Registry = std::map<std::uint64_t, Registration>;

// Removes the first registration of inRequestID; true when there was one.
bool EraseRegistrationByID(Registry& ioRegistry, RenderRequestID inRequestID);

void EraseRegistrationsOfCaller(Registry& ioRegistry, const void* inCaller);

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

// The status of the exception being handled; called inside a catch block.
QRT::Result StatusOfCurrentException();

ExecutorPtr LoadExecutor(const ExecutorPtr& inShared);

class RenderFrameQueueImpl;

// A reference to the queue when it is constructed and alive, else empty;
// never constructs it.
QRT::InterfaceRef<RenderFrameQueueImpl> TryGetExistingQueue() noexcept;

class RenderFrameQueueImpl final : public QRT::Implements<RenderFrameQueue>
{
public:
    RenderFrameQueueImpl();
    ~RenderFrameQueueImpl();

    // --- QRTUnknown: the singleton's count -------------------------------------

    std::uint32_t AddRef() noexcept override;
    std::uint32_t Release() noexcept override;
    // Destroys the queue in place when nobody took a new reference meanwhile,
    // and clears its storage so that a later Create constructs it afresh.
    void Destroy() noexcept override;

    // --- IRenderFrameClient: answers of accelerated renderers -------------------

    void OnRenderFrameComplete(std::intptr_t inContext, std::uint32_t inRequestID,
                               mvxmediatypes::TickTime inTime,
                               QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                               std::int32_t inRenderMilliseconds) override;
    void OnRenderFrameCancelled(std::intptr_t inContext, std::uint32_t inRequestID,
                                mvxmediatypes::TickTime inTime) override;
    void OnRenderFrameError(std::intptr_t inContext, std::uint32_t inRequestID,
                            mvxmediatypes::TickTime inTime, QRT::Result inStatus) override;

    // --- RenderFrameQueue ----------------------------------------------------------

    void AddRenderRequest(const RenderFrameRequest& inRequest) override;
    void CancelOne(RenderRequestID inRequestID) override;
    void CancelCallersRequests(const void* inCaller) override;
    void Shutdown() override;
    void OnAcceleratedRenderCompletion(RenderRequestID inRequestID,
                                       QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                       QRT::Result inStatus,
                                       std::int32_t inRenderMilliseconds) override;
    RenderFrameQueueStatistics GetStatistics() override;

private:
    // --- Scheduling ------------------------------------------------------------------

    // Posts ProcessPendingRequests to the housekeeping executor unless one is
    // posted and not yet started.
    void SchedulePendingRequests();
    void SchedulePrefetchPoll(bool inTimedKind);
    // The frame cache's notification: a frame arrived, so a waiting prefetch
    // may be complete.
    static void OnFrameCached(const mvxcore::utility::Guid& inKey);
    // True when the request cannot be handed to an executor from this thread:
    // the caller is itself one of the render or prefetch threads (it would
    // wait for itself) or an executor is gone.
    bool MustRenderOnCallingThread() const;
    // Hands a request to its accelerated renderer. False when the renderer
    // took it, or when it was answered or cancelled meanwhile: the queue is
    // then done with it. True when the queue must render it itself.
    bool OfferToAcceleratedRenderer(QueueEntry& ioEntry);
    // Called with the main lock held.
    void ScheduleRenderTasksLocked();
    void PostRenderTask(bool inLowSet);

    // --- Processing steps ------------------------------------------------------------

    void ProcessPendingRequests(bool inResetFlag);
    void ProcessPrefetchRequests(bool inTimedKind);
    // Reserves inCost units of memory; false when they are not available.
    bool ReserveMemory(std::uint16_t inCost);
    void ReturnMemory(std::uint16_t inCost);
    bool GetNextRequestAndAccountForMemory(QueueEntry* outRenderFrameRequest, bool inLowSet,
                                           std::uint16_t& outCost);
    void RenderNextRequest(bool inLowSet);
    // Renders one request (or serves it from the cache) and delivers it and
    // every identical request that waited for it. inRegistered: the request
    // was taken from a ready set and is in the redundant-request map.
    QRT::Result Render(QueueEntry& ioEntry, bool inRegistered);
    static bool ShouldCache(const RenderFrameRequest& inRequest);

    // --- Helpers -----------------------------------------------------------------------

    static std::optional<QueueEntry> TakeByID(OrderedEntries& ioSet, RenderRequestID inRequestID);

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
    std::vector<QueueEntry> TakeEverythingQueuedLocked();
    // The lock labels name the caller (shutdown or destruction).
    std::vector<QueueEntry> TakeEverythingQueued(const char* inMainLabel,
                                                 const char* inAcceleratedLabel);

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

} // namespace ML::RenderQueueInternals
