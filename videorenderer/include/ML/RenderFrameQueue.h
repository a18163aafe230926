#pragma once

// ML::RenderFrameQueue: the module's single render scheduler.
//
// Every asynchronous frame render of the module passes through it. It takes
// requests from any thread, computes their keys and starts their prefetches
// on its own serial housekeeping executor, waits (by cache notification or a
// timed poll, at most 15 seconds unless a handle asks for more) until the
// prefetches are done, orders ready requests by class (priority 900 and up
// first) and by ascending request identifier, renders them on the shared
// normal and low render executors within a memory budget of 50 units (about
// one 720x480 four-byte frame each), renders identical requests (equal keys)
// once, serves cached frames, offers requests that carry an accelerated
// renderer to it first, and delivers each request's outcome exactly once:
// completion, cancellation or error, always outside every queue lock. A
// request with a waitable object has that object signalled instead, also
// when it is cancelled or dropped at shutdown.
//
// A process-wide singleton reached through Create(); the queue is destroyed
// when its last reference goes and constructed afresh by a later Create.
// Every public operation may be called from any thread.
//
// Locks: the main lock guards the incoming hand-over, the pending and
// prefetch registries, the prefetch wait list and both ready sets; the
// accelerated lock guards the accelerated map; the redundant-request lock
// guards the redundant-request map. The main lock may be held while taking
// the redundant-request lock, never the reverse; the accelerated lock is
// never held together with the main lock.

#include "ML/IRenderFrameClient.h"
#include "ML/RenderFrameRequest.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>

namespace ML
{

// The clock of the queue's stopwatches (prefetch time-outs and render
// timing). Replaceable so that tests can move time on.
using RenderQueueClock = std::function<std::chrono::steady_clock::time_point()>;

// A snapshot of the queue's lists, for monitoring and tests.
struct RenderFrameQueueStatistics
{
    std::size_t mIncoming = 0;
    std::size_t mPending = 0;
    std::size_t mPrefetchWaiting = 0;
    std::size_t mNormalReady = 0;
    std::size_t mLowReady = 0;
    std::size_t mAccelerated = 0;
    std::size_t mRedundant = 0;
    std::uint32_t mMemoryAvailable = 0;
    std::uint32_t mMemoryCapacity = 0;
};

class RenderFrameQueue : public IRenderFrameClient
{
public:
    QRT_INTERFACE_ID("{41e72d71-6dab-4c6e-ae5c-708ccd909cf1}");
    QRT_INTERFACE_PARENT(IRenderFrameClient);

    // A counted reference to the singleton, constructed on first use.
    static QRT::InterfaceRef<RenderFrameQueue> Create();

    // How many times a queue has been constructed in this process.
    static std::uint64_t GetConstructionCount();

    // Replaces the stopwatch clock (an empty function restores
    // std::chrono::steady_clock::now).
    static void SetClock(RenderQueueClock inClock);

    // The memory cost of rendering inRequest, in budget units (1 to 25).
    static std::uint16_t RequestCost(const RenderFrameRequest& inRequest);

    // The seconds after which a prefetch is given up.
    static constexpr double kPrefetchTimeoutSeconds = 15.0;
    static constexpr std::uint32_t kMemoryCapacity = 50;

    // Queues a copy of inRequest.
    virtual void AddRenderRequest(const RenderFrameRequest& inRequest) = 0;
    // Cancels the request with that identifier when it has not started
    // rendering; otherwise does nothing.
    virtual void CancelOne(RenderRequestID inRequestID) = 0;
    // Cancels every request of inCaller that has not started rendering.
    virtual void CancelCallersRequests(const void* inCaller) = 0;
    // Stops the queue: queued requests are dropped without notification
    // (their waitable objects are signalled), and the render executors and
    // the housekeeping executor are shut down.
    virtual void Shutdown() = 0;
    // The answer of an accelerated renderer.
    virtual void OnAcceleratedRenderCompletion(RenderRequestID inRequestID,
                                               QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                               QRT::Result inStatus,
                                               std::int32_t inRenderMilliseconds) = 0;
    virtual RenderFrameQueueStatistics GetStatistics() = 0;

protected:
    ~RenderFrameQueue() = default;
};

// True once the render queue has been shut down (until a fresh queue is
// constructed): renders are refused, no keys or prefetches are started.
bool IsRenderModuleShuttingDown() noexcept;

} // namespace ML
