// The layer inputs of effects: the subtree producer provider and the subtree
// renderer.

#include "graph/RenderableNodeSubtreeImpl.h"

#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/RenderStatus.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <utility>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

MF::FrameTime Shifted(const MF::FrameTime& inTime, TickTime inOffset)
{
    return {inTime.GetFirstFieldTime() - inOffset, inTime.GetSecondFieldTime() - inOffset};
}

// Renders one layer input for one request.
class RenderableNodeSubtreeImpl : public QRT::Implements<SubTreeRender>
{
public:
    RenderableNodeSubtreeImpl(QRT::InterfaceRef<RenderableNodeClipSubTreeImpl> inSubtree,
                              const CutlistRenderParams& inParams)
        : mSubtree(std::move(inSubtree))
        , mParams(inParams)
    {
    }

    QRT::Result RenderLayer(TickTime inTime, QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame.Reset();
        CutlistRenderParams params = mParams;
        params.SetFrameTime(MF::FrameTime(inTime));
        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        mSubtree->GetProducer(producer, params.GetFrameTime(), params);
        if (!producer)
            return QRT::kResult_Success;
        const MF::FrameTime local = Shifted(params.GetFrameTime(), mSubtree->GetOffset());
        QRT::InterfaceRef<MF::IVideoFrame> frame = CutlistRenderer::RenderFrameFromCutlist(
            producer, params, local, {params.mPixelFormat}, true);
        if (!frame)
            return kResult_RenderFailed;
        const auto motion =
            QRT::QueryRef<IRenderableNodeIntrinsicParameterProvider>(mSubtree->GetNode());
        if (!motion)
        {
            outFrame = std::move(frame);
            return QRT::kResult_Success;
        }
        MotionRecord first = kIdentityMotionRecord;
        MotionRecord second = kIdentityMotionRecord;
        motion->GetIntrinsicParameters(local.GetFirstFieldTime(), params, first);
        motion->GetIntrinsicParameters(local.GetSecondFieldTime(), params, second);
        // The layer is seen as the compositor would draw it, faded included.
        outFrame = first.mOpacity == 1.0f && second.mOpacity == 1.0f
                       ? ApplyMotion(frame, first, second, params)
                       : CompositeLayer(frame, first, second, {}, params);
        return outFrame ? QRT::kResult_Success : kResult_RenderFailed;
    }

protected:
    ~RenderableNodeSubtreeImpl() = default;

private:
    const QRT::InterfaceRef<RenderableNodeClipSubTreeImpl> mSubtree;
    const CutlistRenderParams mParams;
};

} // namespace

RenderableNodeClipSubTreeImpl::RenderableNodeClipSubTreeImpl(
    QRT::InterfaceRef<MF::IRenderableNode> inNode, TickTime inOffset)
    : mNode(std::move(inNode))
    , mOffset(inOffset)
{
    if (!mNode)
        throw QRT::NullInterfaceException();
}

void RenderableNodeClipSubTreeImpl::GetProducer(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, const MF::FrameTime& inTime,
    const CutlistRenderParams& inParams) const
{
    outProducer.Reset();
    if (const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(mNode))
        provider->GetProducer(outProducer, Shifted(inTime, mOffset), inParams);
}

void RenderableNodeClipSubTreeImpl::GetStillRanges(TickTime inStart, TickTime inEnd,
                                                   MF::TickTimeRangeList& ioRanges) const
{
    const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(mNode);
    if (!provider)
        return;
    MF::TickTimeRangeList ranges;
    provider->GetStillRanges(inStart - mOffset, inEnd - mOffset, ranges);
    for (const auto& [start, end] : ranges)
        ioRanges.emplace_back(start + mOffset, end + mOffset);
}

void RenderableNodeClipSubTreeImpl::GetSmartRenderTimes(TickTime inStart, TickTime inEnd,
                                                        const mvxmediatypes::FrameRate& inFrameRate,
                                                        bool inFlag,
                                                        std::set<TickTime>& ioTimes) const
{
    const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(mNode);
    if (!provider)
        return;
    std::set<TickTime> times;
    provider->GetSmartRenderTimes(inStart - mOffset, inEnd - mOffset, inFrameRate, inFlag, times);
    for (const TickTime time : times)
        ioTimes.insert(time + mOffset);
}

SubTreeRenderList CreateLayerInputs(const MF::IRenderableNode& inEffectNode,
                                    const CutlistRenderParams& inParams)
{
    SubTreeRenderList layers;
    for (std::uint32_t i = 0; i < inEffectNode.GetInputCount(); ++i)
    {
        TickTime offset;
        QRT::InterfaceRef<MF::IRenderableNode> node;
        if (QRT::Failed(inEffectNode.GetInput(i, offset, node)))
            continue;
        auto subtree = QRT::Allocated<RenderableNodeClipSubTreeImpl>::CreateInstance(node, offset);
        layers.push_back(QRT::Allocated<RenderableNodeSubtreeImpl>::Create<SubTreeRender>(
            QRT::InterfaceRef<RenderableNodeClipSubTreeImpl>(subtree.Get()), inParams));
    }
    return layers;
}

} // namespace ML
