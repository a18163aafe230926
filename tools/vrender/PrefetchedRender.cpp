#include "PrefetchedRender.h"

#include "ML/IRenderableNodePrefetch.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderFrameRequest.h"

#include <memory>
#include <utility>

namespace vrender
{

void InitiatePrefetchedRender(const QRT::InterfaceRef<ML::IRenderableSource>& inSource,
                              const MF::FrameTime& inFrameTime,
                              const ML::CutlistRenderParams& inParams, unsigned int inRequestID,
                              boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                              PrefetchedRenderTask inTask)
{
    ML::RenderableNodePrefetchList prefetches;
    inSource->CollectPrefetches(inFrameTime, inParams, prefetches);
    // The queue drops its request, and with it the handles, once it has
    // delivered; this copy keeps them until the render has read their frames.
    auto held = std::make_shared<const ML::RenderableNodePrefetchList>(prefetches);

    // A prefetch-only request: the queue renders nothing for it and
    // completes it when its prefetches have completed.
    ML::RenderFrameRequest request(inFrameTime.GetTime(), std::move(prefetches), inRequestID);
    request.mCompletion = [executor = std::move(inExecutor), task = std::move(inTask),
                           held = std::move(held)](const QRT::InterfaceRef<MF::IVideoFrame>&,
                                                   bool inCancelled, int inStatus)
    {
        auto run = [task, held, inCancelled, inStatus] { task(inCancelled, inStatus); };
        if (!executor->Post(run))
            run();
    };
    ML::RenderFrameQueue::Create()->AddRenderRequest(request);
}

} // namespace vrender
