// The module's render entry points and module-wide identifiers: the current
// accelerated sequence renderer, the request-identifier counter,
// InitiateRender and CancelRender. Every function here may be called from
// any thread; the render calls only touch the render queue singleton.

#include "ML/RenderFrameQueue.h"
#include "ML/RenderFrameRequest.h"
#include "ML/RenderRequestException.h"
#include "ML/VideoRenderer.h"
#include "QRT/CriticalSection.h"
#include "module/ModuleInternals.h"

#include <atomic>
#include <cstdint>
#include <utility>

#include <boost/bind/bind.hpp>

namespace ML
{
namespace
{

// Guards sCurrentRendererID.
QRT::CriticalSection sRendererIDLock;
mvxcore::utility::Guid sCurrentRendererID;

// The last request identifier handed out; 1 at load, so the first is 2.
std::atomic<std::uint32_t> sLastRequestID{1};

// The completion function of an InitiateRender request: the queue calls it
// once, on the thread that delivers, when the request's prefetches are done
// (inFrame the first handle's frame), when it was cancelled, or when it
// failed. The source is rendered here, on the delivering thread, unless the
// request was cancelled or failed. A source that needed no prefetch (its
// reads are cheap) arrives here with no frame and status 0, and is rendered
// all the same: otherwise such a source could never be rendered this way.
void RenderSourceFrame(const QRT::InterfaceRef<IRenderableSource>& inSource,
                       const CutlistRenderParams& inParams, unsigned int inRequestID,
                       const InitiateRenderCallback& inCallback,
                       const QRT::InterfaceRef<MF::IVideoFrame>& /*inFrame*/, bool inCancelled,
                       int inStatus)
{
    QRT::InterfaceRef<MF::IVideoFrame> rendered;
    if (!inCancelled && inStatus >= 0 && inSource)
    {
        try
        {
            // The parameters begin with their frame time: they are both.
            inSource->RenderFrame(inParams, inParams, rendered);
        }
        catch (const RenderRequestException&)
        {
            // A render that cannot be done is answered with no frame.
            rendered.Reset();
        }
        catch (...)
        {
            // The caller hears of the request before the failure goes on to
            // the delivering thread.
            if (inCallback)
                inCallback(QRT::InterfaceRef<MF::IVideoFrame>(), inRequestID, inSource, inCancelled,
                           inStatus);
            throw;
        }
    }
    if (inCallback)
        inCallback(rendered, inRequestID, inSource, inCancelled, inStatus);
}

} // namespace

void SetCurrentAcceleratedSequenceRendererID(mvxcore::utility::Guid inID)
{
    QRT::CriticalSectionLock lock(sRendererIDLock, "SetCurrentAcceleratedSequenceRendererID");
    sCurrentRendererID = inID;
}

mvxcore::utility::Guid GetCurrentAcceleratedSequenceRendererID()
{
    QRT::CriticalSectionLock lock(sRendererIDLock, "GetCurrentAcceleratedSequenceRendererID");
    return sCurrentRendererID;
}

unsigned int GetNextRequestID()
{
    // 0 means "no request" to the queue and the suites: when the counter
    // wraps, the increment that lands on 0 is taken again.
    std::uint32_t id = sLastRequestID.fetch_add(1, std::memory_order_relaxed) + 1;
    while (id == 0)
        id = sLastRequestID.fetch_add(1, std::memory_order_relaxed) + 1;
    return id;
}

void InitiateRender(QRT::InterfaceRef<IRenderableSource> inSource, const MF::FrameTime& inFrameTime,
                    const CutlistRenderParams& inParams, unsigned int inRequestID,
                    const InitiateRenderCallback& inCallback)
{
    if (!inSource)
        return;

    RenderableNodePrefetchList prefetches;
    inSource->CollectPrefetches(inFrameTime, inParams, prefetches);

    // A prefetch-only request: the queue renders nothing for it, it completes
    // when its prefetches have, and the completion function renders.
    RenderFrameRequest request(inFrameTime.GetTime(), std::move(prefetches), inRequestID);
    request.mCompletion =
        boost::bind(&RenderSourceFrame, inSource, inParams, inRequestID, inCallback,
                    boost::placeholders::_1, boost::placeholders::_2, boost::placeholders::_3);

    RenderFrameQueue::Create()->AddRenderRequest(request);
}

void CancelRender(unsigned int inRequestID)
{
    RenderFrameQueue::Create()->CancelOne(inRequestID);
}

namespace ModuleInternals
{

void SetLastRequestID(std::uint32_t inLastID)
{
    sLastRequestID.store(inLastID, std::memory_order_relaxed);
}

} // namespace ModuleInternals
} // namespace ML
