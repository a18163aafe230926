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
// The request is withdrawn with ML::CancelRender(inRequestID). inDone is
// called exactly once, on a thread of inExecutor (on the delivering thread
// when the executor refuses tasks), with the frame, the cancelled flag and the
// status of the queue's answer, and the exception the render threw, if any.
// The frame is empty when the request was cancelled or failed (the source is
// then not rendered), when the source threw ML::RenderRequestException (a
// render that cannot be done) or another exception, or when it rendered
// nothing. The prefetch handles, and with them the frames they hold in the
// cache and in the source, are kept until the render has returned and are
// let go before inDone is called.

#include "MF/FrameTime.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <exception>
#include <functional>

#include <boost/shared_ptr.hpp>

namespace vrender
{

using PrefetchedRenderDone =
    std::function<void(QRT::InterfaceRef<MF::IVideoFrame> inFrame, bool inCancelled, int inStatus,
                       std::exception_ptr inFailure)>;

void InitiatePrefetchedRender(const QRT::InterfaceRef<ML::IRenderableSource>& inSource,
                              const MF::FrameTime& inFrameTime,
                              const ML::CutlistRenderParams& inParams, unsigned int inRequestID,
                              boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                              PrefetchedRenderDone inDone);

} // namespace vrender
