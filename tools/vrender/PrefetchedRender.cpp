#include "PrefetchedRender.h"

#include "ML/IRenderableNodePrefetch.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderFrameRequest.h"
#include "ML/RenderRequestException.h"

#include <memory>
#include <utility>

namespace vrender
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using HeldPrefetches = std::shared_ptr<const ML::RenderableNodePrefetchList>;

// One render after its prefetches, on whichever thread runs it.
struct PrefetchedRender
{
    QRT::InterfaceRef<ML::IRenderableSource> mSource;
    ML::CutlistRenderParams mParams;
    PrefetchedRenderDone mDone;
    HeldPrefetches mHeld;

    void Run(bool inCancelled, int inStatus)
    {
        FrameRef frame;
        std::exception_ptr failure;
        if (!inCancelled && inStatus >= 0)
        {
            try
            {
                // The parameters begin with their frame time: they are both.
                mSource->RenderFrame(mParams, mParams, frame);
            }
            catch (const ML::RenderRequestException&)
            {
                frame.Reset();
            }
            catch (...)
            {
                frame.Reset();
                failure = std::current_exception();
            }
        }
        // The render has read the prefetched frames; the source and the cache
        // need not keep them for it any longer.
        mHeld.reset();
        mDone(std::move(frame), inCancelled, inStatus, failure);
    }
};

} // namespace

void InitiatePrefetchedRender(const QRT::InterfaceRef<ML::IRenderableSource>& inSource,
                              const MF::FrameTime& inFrameTime,
                              const ML::CutlistRenderParams& inParams, unsigned int inRequestID,
                              boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
                              PrefetchedRenderDone inDone)
{
    ML::RenderableNodePrefetchList prefetches;
    inSource->CollectPrefetches(inFrameTime, inParams, prefetches);
    // The queue drops its request, and with it the handles, once it has
    // delivered; this copy keeps them until the render has read their frames.
    auto render = std::make_shared<PrefetchedRender>(
        PrefetchedRender{inSource, inParams, std::move(inDone),
                         std::make_shared<const ML::RenderableNodePrefetchList>(prefetches)});

    // A prefetch-only request: the queue renders nothing for it and
    // completes it when its prefetches have completed.
    ML::RenderFrameRequest request(inFrameTime.GetTime(), std::move(prefetches), inRequestID);
    request.mCompletion = [executor = std::move(inExecutor), render = std::move(render)](
                              const FrameRef&, bool inCancelled, int inStatus)
    {
        auto run = [render, inCancelled, inStatus] { render->Run(inCancelled, inStatus); };
        if (!executor->Post(run))
            run();
    };
    ML::RenderFrameQueue::Create()->AddRenderRequest(request);
}

} // namespace vrender
