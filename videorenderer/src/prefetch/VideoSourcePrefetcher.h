#pragma once

// The video source prefetcher: reads frames of back-end video sources ahead of
// rendering on the shared prefetch executors, so that the render threads later
// find them in the shared video frame cache.
//
// A set of free functions over one module-wide table of pending reads, keyed by
// source (object identity) and kept per source as a heap with the earliest
// frame time on top. Every enqueue posts one task to ML::sImageSourcePrefetcherQueue
// (image sources) or ML::sVideoSourcePrefetcherQueue (all others); a task runs
// whichever read of its source is earliest when it starts, so reads of one
// source run earliest time first whatever the order they were queued in.
//
// Callers: the media node prefetcher (any thread that starts or polls a
// prefetch handle), the clip render suite, and module shutdown. All three
// functions may be called from any thread at once. The table lock is held only
// while the table changes: never across a frame read, a cache insertion or a
// callback. Completion callbacks run on an executor thread (a finished read) or
// on the cancelling thread (a cancelled read), exactly once per job unless the
// job is flushed.

#include "BE/ColorProfile.h"
#include "BE/IVideoSource.h"
#include "BE/VideoFrameRequest.h"
#include "MF/BinaryData.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxcore/utility/Guid.h"
#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <cstdint>

#include <boost/function.hpp>

namespace ML
{

// Called once with the read's status: 0 (or another non-negative status) when
// the frame was read, the source's negative status when the read failed,
// kResult_Cancelled when the read was cancelled before it ran.
using VideoSourcePrefetchCallback = boost::function<void(QRT::Result)>;

// Queues a read of the frame at inTime of inSource (the source's frame request
// with kFrameRequestFlag_Read). A frame read successfully goes into the shared
// video frame cache under inFrameKey with inCachePriority (VF::kCachePriority_High
// for reads that playback and scrubbing come back to, VF::kCachePriority_Low
// for one-pass renders), unless inFrameKey is the null Guid; then inCallback
// (may be empty) is called with the status.
// Input contracts: "sVideoSourcePrefetcherQueue != NULL && sImageSourcePrefetcherQueue != NULL",
// "inSource != nullptr".
void EnqueueVideoSourcePrefetch(
    mvxmediatypes::TickTime inTime, const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
    const BE::VideoFrameRequest& inRequest, const MF::BinaryData& inBinaryData,
    const BE::ColorProfile& inColorProfile, const mvxcore::utility::Guid& inFrameKey,
    std::int32_t inCachePriority, VideoSourcePrefetchCallback inCallback);

// Removes the queued read of inSource whose frame key is inFrameKey, if it has
// not started yet, and calls its callback with kResult_Cancelled on the calling
// thread. Does nothing when the key is null, when either executor is missing,
// or when no such read is queued (it is running or over already).
void CancelVideoSourcePrefetch(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                               const mvxcore::utility::Guid& inFrameKey);

// Module shutdown: destroys every queued read without calling its callback,
// then shuts down ML::sVideoSourcePrefetcherQueue and then
// ML::sImageSourcePrefetcherQueue: neither runs a queued task any more, and
// each is waited for until its read in flight, if any, is over. The executor
// pointers are left as they are; ML::Foundation::StartUp replaces executors
// that were shut down.
void FlushVideoSourcePrefetcher();

// The number of reads queued and not yet taken by a task (all sources).
// Diagnostics and tests.
size_t GetQueuedVideoSourcePrefetchCount();

} // namespace ML
