// The compositor node and its producer.

#include "ML/RenderableNodeCompositorImpl.h"

#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderStatus.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "QRT/Hash.h"
#include "mvxcore/debug/Contract.h"
#include "render/VideoFrameCompositeUtilities.h"
#include "sources/FieldFilterSteps.h"

#include <algorithm>
#include <string_view>

namespace ML
{
namespace
{

constexpr std::string_view kProducerHashText = "RenderableNodeCompositorProducer";
// The cutlist parameter that sets no track limit.
constexpr std::int64_t kNoTrackLimit = -1;

MF::FrameTime LayerTime(const MF::FrameTime& inTime, mvxmediatypes::TickTime inOffset)
{
    return MF::FrameTime(inTime.GetFirstFieldTime() - inOffset,
                         inTime.GetSecondFieldTime() - inOffset);
}

} // namespace

// --- RenderableNodeCompositorImpl ------------------------------------------------------

QRT::InterfaceRef<RenderableNodeCompositorImpl> RenderableNodeCompositorImpl::Create()
{
    return QRT::Allocated<RenderableNodeCompositorImpl>::CreateInstance();
}

QRT::ImmutableString RenderableNodeCompositorImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeCompositorImpl");
}

std::uint32_t RenderableNodeCompositorImpl::ComputeRenderFlags() const
{
    std::uint32_t flags = kRenderFlagMask_Compositor;
    for (const Input& input : GetInputs())
    {
        if (!input.first)
            throw QRT::NullInterfaceException();
        flags &= input.first->GetRenderFlags();
    }
    return flags;
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeCompositorImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

void RenderableNodeCompositorImpl::AddTrackInput(
    const QRT::InterfaceRef<MF::IRenderableNode>& inNode, mvxmediatypes::TickTime inOffset,
    std::uint32_t inTrackIndex)
{
    AddInput(inNode, inOffset);
    mTrackIndices.push_back(inTrackIndex);
}

void RenderableNodeCompositorImpl::AddLayers(const MF::FrameTime& inTime,
                                             const CutlistRenderParams& inParams,
                                             CompositorProducer& ioProducer) const
{
    const std::vector<Input>& inputs = GetInputs();
    const bool limited = inParams.mCutlistParameter != kNoTrackLimit && !mTrackIndices.empty();
    if (limited && inputs.size() != mTrackIndices.size())
        mvxcore::debug::ContractViolated(mvxcore::debug::ContractKind::kInput,
                                         "mInputs.size() == mTrackIndices.size()", __FILE__,
                                         __LINE__);
    for (std::size_t index = 0; index < inputs.size(); ++index)
    {
        if (limited && static_cast<std::int64_t>(mTrackIndices[index]) > inParams.mCutlistParameter)
            continue;
        const auto& [node, offset] = inputs[index];
        const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node);
        if (!provider)
            continue;
        CompositorProducer::Layer layer;
        layer.mOffset = offset;
        const MF::FrameTime layerTime = LayerTime(inTime, offset);
        provider->GetProducer(layer.mProducer, layerTime, inParams);
        if (!layer.mProducer)
            continue;
        if (const auto motion = QRT::QueryRef<IRenderableNodeIntrinsicParameterProvider>(node))
        {
            motion->GetIntrinsicParameters(layerTime.GetFirstFieldTime(), inParams,
                                           layer.mFirstFieldMotion);
            motion->GetIntrinsicParameters(layerTime.GetSecondFieldTime(), inParams,
                                           layer.mSecondFieldMotion);
        }
        ioProducer.AddLayer(std::move(layer));
    }
}

void RenderableNodeCompositorImpl::GetProducer(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, const MF::FrameTime& inTime,
    const CutlistRenderParams& inParams) const
{
    auto producer = QRT::Allocated<CompositorProducer>::CreateInstance(GetNodeHash());
    AddLayers(inTime, inParams, *producer);
    outProducer = QRT::InterfaceRef<IRenderableNodeProducer>(producer.Get());
}

void RenderableNodeCompositorImpl::GetStillRanges(mvxmediatypes::TickTime inStart,
                                                  mvxmediatypes::TickTime inEnd,
                                                  MF::TickTimeRangeList& ioRanges) const
{
    for (const auto& [node, offset] : GetInputs())
    {
        const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node);
        if (!provider)
            continue;
        MF::TickTimeRangeList ranges;
        provider->GetStillRanges(inStart - offset, inEnd - offset, ranges);
        for (const auto& [start, end] : ranges)
            ioRanges.emplace_back(start + offset, end + offset);
    }
}

void RenderableNodeCompositorImpl::GetSmartRenderTimes(
    mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
    const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
    std::set<mvxmediatypes::TickTime>& ioTimes) const
{
    if (GetInputs().size() != 1)
        return;
    const auto& [node, offset] = GetInputs().front();
    const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node);
    if (!provider)
        return;
    // Asked in the input's time, answered in the compositor's, as the still ranges.
    std::set<mvxmediatypes::TickTime> times;
    provider->GetSmartRenderTimes(inStart - offset, inEnd - offset, inFrameRate, inFlag, times);
    for (const mvxmediatypes::TickTime time : times)
        ioTimes.insert(time + offset);
}

// --- CompositorProducer ----------------------------------------------------------------

CompositorProducer::CompositorProducer(const QRT::Guid& inNodeHash)
    : mNodeHash(inNodeHash)
{
}

QRT::Result CompositorProducer::CompositeLayers(const MF::FrameTime& inTime,
                                                const CutlistRenderParams& inParams,
                                                QRT::InterfaceRef<MF::IVideoFrame>& outFrame,
                                                std::size_t inLayerCount)
{
    QRT::InterfaceRef<MF::IVideoFrame> result;
    for (std::size_t index = 0; index < std::min(inLayerCount, mLayers.size()); ++index)
    {
        const Layer& layer = mLayers[index];
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        const QRT::Result status =
            layer.mProducer->ProduceFrame(LayerTime(inTime, layer.mOffset), inParams, frame);
        if (QRT::Failed(status))
            return status;
        if (!frame)
            continue;
        if (result)
            result = CompositeLayer(frame, layer.mFirstFieldMotion, layer.mSecondFieldMotion,
                                    result, inParams);
        else if (layer.mFirstFieldMotion.mOpacity == 1.0f &&
                 layer.mSecondFieldMotion.mOpacity == 1.0f)
            result =
                ApplyMotion(frame, layer.mFirstFieldMotion, layer.mSecondFieldMotion, inParams);
        else
            // The bottom layer keeps its opacity: a faded layer over nothing
            // stays faded. Without a lower frame no blend mode applies.
            result = CompositeLayer(frame, layer.mFirstFieldMotion, layer.mSecondFieldMotion, {},
                                    inParams);
        // A failed draw discards the composite rather than delivering part of it.
        if (!result)
            return kResult_RenderFailed;
    }
    outFrame = std::move(result);
    return QRT::kResult_Success;
}

QRT::Result CompositorProducer::ProduceFrame(const MF::FrameTime& inTime,
                                             const CutlistRenderParams& inParams,
                                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame)
{
    if (mLayers.empty())
    {
        outFrame = CutlistRenderer::GetBlackFrame(inParams);
        return QRT::kResult_Success;
    }
    QRT::InterfaceRef<MF::IVideoFrame> result;
    const QRT::Result status = CompositeLayers(inTime, inParams, result);
    if (QRT::Failed(status))
        return status;
    outFrame = KeepNeededField(std::move(result), inParams);
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IVideoFrame>
CompositorProducer::KeepNeededField(QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                    const CutlistRenderParams& inParams)
{
    QRT::InterfaceRef<MF::IVideoFrame> result = std::move(inFrame);
    if (result && inParams.mSingleField != 0)
    {
        const mvxmediatypes::FieldType fieldType = result->GetFieldType();
        // The needed field's rows: field 1 of an upper-first frame is rows 0,
        // 2, 4; of a lower-first frame rows 1, 3, 5.
        const bool keepSecondRows =
            (inParams.mSingleField == 2) != (fieldType != mvxmediatypes::kFieldType_UpperFirst);
        if (mvxmediatypes::IsInterlaced(fieldType))
            result = FieldFilterSteps::DeinterlaceKeepingField(result, inParams, keepSecondRows);
    }
    return result;
}

void CompositorProducer::GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                                      const CutlistRenderParams& inParams)
{
    if (mLayers.empty())
    {
        outHash = CutlistRenderer::GetBlackFrameHash(inParams);
        return;
    }
    static_assert(sizeof(inParams.mPixelAspectRatio) == 8 && sizeof(inParams.mPixelFormat) == 8);
    QRT::HashValue hash;
    QRT::MixHash::MixInString(hash, kProducerHashText);
    for (const Layer& layer : mLayers)
    {
        // The record has no padding (its layout is fixed): every byte is a field.
        QRT::MixHash::MixInData(hash, &layer.mFirstFieldMotion, sizeof(MotionRecord));
        QRT::MixHash::MixInData(hash, &layer.mSecondFieldMotion, sizeof(MotionRecord));
        QRT::Guid layerHash;
        layer.mProducer->GetFrameHash(layerHash, LayerTime(inTime, layer.mOffset), inParams);
        QRT::MixHash::MixInGuid(hash, layerHash);
    }
    QRT::MixHash::MixInGuid(hash, mNodeHash);
    QRT::MixHash::MixInData(hash, &inParams.mPixelAspectRatio, sizeof(inParams.mPixelAspectRatio));
    QRT::MixHash::MixInValue(hash, inParams.mWidth);
    QRT::MixHash::MixInValue(hash, inParams.mHeight);
    QRT::MixHash::MixInValue(hash, inParams.mQuality);
    QRT::MixHash::MixInValue(hash, inParams.mSingleField);
    QRT::MixHash::MixInValue(hash, inParams.mSecondaryQuality);
    QRT::MixHash::MixInData(hash, &inParams.mPixelFormat, sizeof(inParams.mPixelFormat));
    outHash = QRT::HashValueToGuid(hash);
}

} // namespace ML
