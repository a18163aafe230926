#pragma once

// The media node prefetcher: prefetch handles (ML::IRenderableNodePrefetch) over
// one frame of a back-end video source, which render requests start, poll and
// cancel (see ML/IRenderableNodePrefetch.h).
//
// Handles that want the same frame (equal frame keys from the source's frame-key
// query) share one read: a module-wide table counts the handles per key and only
// the first one starts the read. A handle whose key is null starts nothing and
// is not registered: it keeps nobody waiting, and asked for its frame it asks
// the source for what the source holds. Sources that answer the asynchronous-read
// interface and report it enabled are asked to start, wait for and cancel the
// read themselves; all others are read through the video source prefetcher
// (VideoSourcePrefetcher.h). Frames travel through the shared video frame
// cache, on which a handle holds a dependency on its key while it lives.
// A handle carries the cache priority of the render that made it: the frame
// it reads goes into the cache at that priority (the read shared by several
// handles at the priority of the handle that started it), and a handle that
// takes a frame cached at a lower priority than its own puts it back at its
// own, so that frames an export read keep for the playback that wants them.
//
// Threads: handles may be created, started, polled and cancelled from any
// thread; one module-wide lock serialises the key table and the start and
// cancel decisions. That lock is held while a read is queued on the video
// source prefetcher (which then takes its own lock), never the other way
// round, and never while a frame is read or inserted into the cache.

#include "BE/ColorProfile.h"
#include "BE/IVideoSource.h"
#include "BE/VideoFrameRequest.h"
#include "MF/BinaryData.h"
#include "ML/IRenderableNodePrefetch.h"
#include "QRT/InterfaceRef.h"
#include "mvxcore/utility/Guid.h"
#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <cstdint>

namespace ML
{

// A prefetch handle for the frame of inSource at inTime as inRequest asks for
// it (with the clip's binary data and colour profile), or an empty reference
// when no prefetch is needed: the source neither wants the time prefetched
// (IsPrefetchWanted) nor answers an enabled asynchronous-read interface. The
// handle is not started; the caller calls InitiatePrefetch. inCachePriority
// is the shared frame cache's priority for the frame (CutlistRenderParams::
// mCachePriority of the render).
// Input contract: "inSource != nullptr".
QRT::InterfaceRef<IRenderableNodePrefetch>
CreateMediaNodePrefetcher(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                          mvxmediatypes::TickTime inTime, const BE::VideoFrameRequest& inRequest,
                          const MF::BinaryData& inBinaryData,
                          const BE::ColorProfile& inColorProfile, std::int32_t inCachePriority);

// Module shutdown: under the key table's lock, drops every key reference and
// empties the table. Handles alive at that point stay usable: their later
// release of a key that is gone is a no-op and starts or cancels nothing.
void FlushMediaNodePrefetchRegistry();

// The number of live handles holding a reference on inKey in the key table
// (0 when absent). Diagnostics and tests.
uint32_t GetMediaNodePrefetchReferenceCount(const mvxcore::utility::Guid& inKey);

// Silences (true) or re-enables (false) the debug assertion raised when an
// asynchronous source's read times out. Not silenced at start-up.
void SilenceMediaNodePrefetchTimeoutAssertion(bool inSilenced);

} // namespace ML
