#pragma once

// vrender::InitiatePrefetchedRender: renders one frame of a renderable source
// as ML::InitiateRender does (the source's prefetches go through the module's
// render queue, then the source renders the frame), except that the render
// runs as a task of the caller's executor instead of on the queue's
// delivering thread. That thread is the queue's single housekeeping thread:
// renders made there (frame blending, scaling, compositing) run one after
// another however many cores there are, and hold up the queue's own
// scheduling meanwhile.
//
// The request is withdrawn with ML::CancelRender(inRequestID). inTask is
// called exactly once, on a thread of inExecutor (on the delivering thread
// when the executor refuses tasks), with the cancelled flag and status of the
// queue's answer; it renders the frame itself (IRenderableSource::RenderFrame)
// unless the request was cancelled or failed, so that it can report the
// render's exceptions as it reports its own. The prefetch handles, and the
// frames they hold in the cache and in the source, stay alive until inTask
// has returned.

#include "MF/FrameTime.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <functional>

#include <boost/shared_ptr.hpp>

namespace vrender
{

using PrefetchedRenderTask = std::function<void(bool inCancelled, int inStatus)>;

void InitiatePrefetchedRender(const QRT::InterfaceRef<ML::IRenderableSource>& inSource,
                              const MF::FrameTime& inFrameTime,
                              const ML::CutlistRenderParams& inParams, unsigned int inRequestID,
                              boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                              PrefetchedRenderTask inTask);

} // namespace vrender
