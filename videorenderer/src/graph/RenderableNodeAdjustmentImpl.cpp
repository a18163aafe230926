// The adjustment node, its clip and its producer.

#include "graph/RenderableNodeAdjustmentImpl.h"

#include "ML/CutlistRenderer.h"
#include "ML/RenderFlags.h"
#include "ML/RenderStatus.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <utility>

namespace ML
{
namespace
{

// The layers below composited, the adjustment clip's effects run over them
// and the result drawn over them with the clip's motion and opacity. The
// clip is the last layer; its own frames are never produced, but its frame
// hash (its input's and its effects' at the time) takes part in the
// compositor's hash, as its motion records do.
class AdjustmentProducer : public CompositorProducer
{
public:
    AdjustmentProducer(const QRT::Guid& inNodeHash,
                       QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl> inClip)
        : CompositorProducer(inNodeHash)
        , mClip(std::move(inClip))
    {
    }

    // Set when the adjustment clip is the last layer.
    void SetAdjusts(bool inAdjusts) { mAdjusts = inAdjusts; }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        if (!mAdjusts)
            return CompositorProducer::ProduceFrame(inTime, inParams, outFrame);
        outFrame.Reset();
        const std::vector<Layer>& layers = GetLayers();
        QRT::InterfaceRef<MF::IVideoFrame> below;
        QRT::Result status = CompositeLayers(inTime, inParams, below, layers.size() - 1);
        if (QRT::Failed(status))
            return status;
        if (!below)
            below = CutlistRenderer::GetBlackFrame(inParams);
        if (!below)
            return kResult_RenderFailed;
        // The effects write into a copy: the composite below is drawn under
        // the adjusted picture.
        below->MarkShared(1);
        const Layer& clip = layers.back();
        const MF::FrameTime clipTime(inTime.GetFirstFieldTime() - clip.mOffset,
                                     inTime.GetSecondFieldTime() - clip.mOffset);
        QRT::InterfaceRef<IRenderableNodeProducer> effects;
        mClip->GetProducerForOperatorsWithFixedInput(
            effects, 0, mClip->GetOperatorCount(), below,
            {clipTime.GetFirstFieldTime(), clipTime.GetSecondFieldTime()}, inParams.mQuality);
        QRT::InterfaceRef<MF::IVideoFrame> adjusted = below;
        if (effects)
        {
            status = effects->ProduceFrame(clipTime, inParams, adjusted);
            if (QRT::Failed(status))
                return status;
        }
        if (!adjusted)
            return kResult_RenderFailed;
        QRT::InterfaceRef<MF::IVideoFrame> result = CompositeLayer(
            adjusted, clip.mFirstFieldMotion, clip.mSecondFieldMotion, below, inParams);
        if (!result)
            return kResult_RenderFailed;
        outFrame = KeepNeededField(std::move(result), inParams);
        return QRT::kResult_Success;
    }

protected:
    ~AdjustmentProducer() = default;

private:
    const QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl> mClip;
    bool mAdjusts = false;
};

} // namespace

QRT::ImmutableString RenderableNodeAdjustmentImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNode_AdjustmentImpl");
}

void RenderableNodeAdjustmentImpl::SetAdjustment(
    const QRT::InterfaceRef<MF::IRenderableNode>& inBelow, std::uint32_t inBelowTrackIndex,
    const QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl>& inClip,
    mvxmediatypes::TickTime inClipOffset, std::uint32_t inClipTrackIndex)
{
    if (!inBelow || !inClip)
        throw QRT::NullInterfaceException();
    mClip = inClip;
    AddTrackInput(inBelow, mvxmediatypes::kTime_Zero, inBelowTrackIndex);
    AddTrackInput(inClip->GetSelfReference(), inClipOffset, inClipTrackIndex);
    bool opaque = false;
    if (inClip->GetInputCount() == 1)
    {
        mvxmediatypes::TickTime offset;
        QRT::InterfaceRef<MF::IRenderableNode> input;
        if (QRT::Succeeded(inClip->GetInput(0, offset, input)) && input)
            opaque = (input->GetRenderFlags() & kRenderFlag_Opaque) != 0;
    }
    SetTypedProperty(QRT::ImmutableString::CreateStatic("AdjustmentNode::AdjustmentMediaIsOpaque"),
                     opaque, true);
}

void RenderableNodeAdjustmentImpl::GetProducer(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, const MF::FrameTime& inTime,
    const CutlistRenderParams& inParams) const
{
    auto producer = QRT::Allocated<AdjustmentProducer>::CreateInstance(GetNodeHash(), mClip);
    AddLayers(inTime, inParams, *producer);
    // Both inputs make layers unless the track limit leaves the clip out.
    producer->SetAdjusts(producer->GetLayers().size() == GetInputs().size());
    outProducer = QRT::InterfaceRef<IRenderableNodeProducer>(producer.Get());
}

QRT::InterfaceRef<MF::IRenderableNode> CreateAdjustmentNode(const AdjustmentNodeSetup& inSetup)
{
    const auto clip =
        QRT::Allocated<RenderableNodeAdjustmentClipImpl>::CreateInstance(inSetup.mClip);
    clip->MakeImmutable();
    const auto node = QRT::Allocated<RenderableNodeAdjustmentImpl>::CreateInstance();
    node->SetAdjustment(inSetup.mBelow, inSetup.mBelowTrackIndex,
                        QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl>(clip.Get()),
                        inSetup.mClipOffset, inSetup.mClip.mTrackID);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
