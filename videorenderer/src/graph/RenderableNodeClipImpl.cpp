// The clip node: its keys, time transform, flags, producers and intrinsic
// motion.

#include "graph/RenderableNodeClipImpl.h"

#include "ML/IRenderableNodeOperatorProvider.h"
#include "ML/RenderFlags.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "QRT/Hash.h"
#include "graph/ClipTimeTransforms.h"
#include "graph/RenderableNodeMediaImpl.h"
#include "graph/RenderableNodeSubtreeImpl.h"

#include <algorithm>
#include <cmath>
#include <string_view>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

QRT::ImmutableString Key(const char* inName)
{
    return QRT::ImmutableString::CreateStatic(inName);
}

// One operator per operator node, made for the request, each with the
// renderers of the layers it reads.
void MakeOperators(const std::vector<QRT::InterfaceRef<MF::IRenderableNode>>& inNodes,
                   std::size_t inFirst, std::size_t inCount, const MF::FrameTime& inTime,
                   const CutlistRenderParams& inParams, ClipProducerSetup& ioSetup)
{
    for (std::size_t i = inFirst; i < inFirst + inCount; ++i)
    {
        const auto provider = QRT::QueryRef<IRenderableNodeOperatorProvider>(inNodes[i]);
        if (!provider)
            continue;
        QRT::InterfaceRef<IRenderableNodeOperator> made;
        provider->CreateOperator(made, inTime, inParams);
        if (!made)
            continue;
        ioSetup.mOperators.push_back(std::move(made));
        ioSetup.mLayerInputs.push_back(CreateLayerInputs(*inNodes[i], inParams));
    }
}

} // namespace

RenderableNodeClipImpl::RenderableNodeClipImpl(const ClipNodeSetup& inSetup)
{
    if (!inSetup.mTrackItem || !inSetup.mInput)
        throw QRT::NullInterfaceException();
    BE::TrackItemSettings item = inSetup.mTrackItem->GetSettings();
    item.mClip = inSetup.mTrackItem->GetClip()->GetClipSettings();
    const BE::ClipSettings& clip = item.mClip;
    const BE::FrameHold& hold = clip.mFrameHold;

    mKeyframes.mMotion = item.mMotion;
    mKeyframes.mOpacity = item.mOpacity;
    mBlendMode = item.mBlendMode;
    mTransform = CreateClipTimeTransform(item);
    if (hold.IsSet() && hold.mFilters)
        mHoldClipTime = CreatePlaybackTimeTransform(item)->InverseTransform(hold.mAt);
    // A speed that is not a number counts as changed, hence the negation.
    mTimeChanged = !(clip.mSpeed == 1.0) || clip.IsTimeRemapped();
    mClearsFlag16 = mTimeChanged;
    mSetsFlag128 = mTimeChanged && clip.mFrameBlend && !hold.IsSet();

    SetTypedProperty(Key("ClipNode::ClipSpeed"), clip.mSpeed, true);
    SetTypedProperty(Key("ClipNode::ClipBackwards"), clip.mReverse, true);
    if (hold.IsSet())
    {
        SetTypedProperty(Key("ClipNode::FrameHoldFilters"), hold.mFilters, true);
        SetTypedProperty(Key("ClipNode::FrameHoldDeinterlace"), hold.mDeinterlace, true);
        SetTypedProperty(Key("ClipNode::FrameHoldAtTime"), hold.mAt, true);
    }
    SetTypedProperty(Key("ClipNode::TrackID"), inSetup.mTrackID, false);
    if (clip.IsTimeRemapped())
        SetProperty(Key("ClipNode::TimeRemapping"), clip.GetTimeRemappingText(), true);
    SetTypedProperty(Key("ClipNode::TrackItemStartAsTicks"), item.mStart, false);
    SetTypedProperty(Key("ClipNode::TrackItemEndAsTicks"), item.mEnd, false);
    SetTypedProperty(Key("ClipNode::EffectiveTrackItemStartAsTicks"),
                     inSetup.mEffectiveStart.IsValid() ? inSetup.mEffectiveStart : item.mStart,
                     false);
    SetTypedProperty(Key("ClipNode::EffectiveTrackItemEndAsTicks"),
                     inSetup.mEffectiveEnd.IsValid() ? inSetup.mEffectiveEnd : item.mEnd, false);

    AddInput(inSetup.mInput, mvxmediatypes::kTime_Zero);
    for (const QRT::InterfaceRef<MF::IRenderableNode>& effect : inSetup.mOperators)
        AddOperator(effect);
}

QRT::ImmutableString RenderableNodeClipImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeClipImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeClipImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

void RenderableNodeClipImpl::MixKindIntoHash(QRT::HashValue& ioHash) const
{
    RenderableNodeCommonImpl::MixKindIntoHash(ioHash);
    QRT::MixHash::MixInString(ioHash, std::string_view("TimeTransform::"));
    mTransform->MixIntoHash(ioHash);
}

std::uint32_t RenderableNodeClipImpl::OperatorFlags() const
{
    std::uint32_t flags = kRenderFlagMask_Operators;
    for (const QRT::InterfaceRef<MF::IRenderableNode>& effect : GetOperators())
        flags &= effect->GetRenderFlags();
    return flags;
}

std::uint32_t RenderableNodeClipImpl::ComputeRenderFlags() const
{
    if (GetInputs().empty() || !GetInputs().front().first)
        throw QRT::NullInterfaceException();
    std::uint32_t flags = GetInputs().front().first->GetRenderFlags();
    if (mClearsFlag16)
        flags &= ~kRenderFlag_16;
    flags &= ~kRenderFlagMask_Operators | OperatorFlags();
    if (mSetsFlag128)
        flags |= kRenderFlag_128;
    if (!GetOperators().empty())
        flags &= ~kRenderFlag_Opaque;
    return flags;
}

QRT::InterfaceRef<MF::ITimeTransform> RenderableNodeClipImpl::GetTimeTransform() const
{
    return mTransform;
}

void RenderableNodeClipImpl::GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                                         const MF::FrameTime& inTime,
                                         const CutlistRenderParams& inParams) const
{
    outProducer.Reset();
    if (GetInputs().size() != 1)
        return;
    const auto& [input, offset] = GetInputs().front();
    if (!input)
        throw QRT::NullInterfaceException();
    ClipProducerSetup setup;
    setup.mOffset = offset;
    setup.mTransform = mTransform;
    setup.mNodeHash = GetNodeHash();
    setup.mInputTimeInvariant = (input->GetRenderFlags() & kRenderFlag_TimeInvariant) != 0;
    if (const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(input))
        provider->GetProducer(setup.mInput, MapClipTime(setup, inTime), inParams);
    MakeOperators(GetOperators(), 0, GetOperators().size(), inTime, inParams, setup);
    setup.mOperatorHoldTime = mHoldClipTime;
    outProducer = CreateClipNodeProducer(std::move(setup));
}

void RenderableNodeClipImpl::GetProducerForOperatorsWithFixedInput(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, std::uint32_t inFirst,
    std::uint32_t inCount, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
    const MF::TickTimeRange& inRange, std::uint32_t inQuality) const
{
    outProducer.Reset();
    if (GetInputs().size() != 1 ||
        std::uint64_t{inFirst} + inCount > static_cast<std::uint64_t>(GetOperators().size()) ||
        !inFrame)
        return;
    QRT::HashValue hash;
    QRT::MixHash::MixInString(hash, std::string_view("GetProducerForOperatorsWithFixedInput"));
    QRT::MixHash::MixInGuid(hash, GetInputSideHash());
    for (std::uint32_t i = inFirst; i < inFirst + inCount; ++i)
    {
        QRT::MixHash::MixInString(hash, std::string_view("Operator::"));
        QRT::MixHash::MixInGuid(hash, GetOperators()[i]->GetNodeHash());
    }
    // The operators are made for the frame they are given.
    CutlistRenderParams params;
    params.SetFrameTime(MF::FrameTime(inRange.first, inRange.second));
    const QRT::ParamRect bounds = inFrame->GetBounds();
    params.mWidth = params.mFullFrameWidth = static_cast<std::uint32_t>(bounds.Width());
    params.mHeight = params.mFullFrameHeight = static_cast<std::uint32_t>(bounds.Height());
    params.mPixelAspectRatio = params.mFullFramePixelAspectRatio = inFrame->GetPixelAspectRatio();
    params.mPixelFormat = inFrame->GetPixelFormat();
    params.mFieldType = static_cast<std::uint32_t>(inFrame->GetFieldType());
    params.mQuality = inQuality;

    ClipProducerSetup setup;
    setup.mOffset = GetInputs().front().second;
    setup.mTransform = mTransform;
    setup.mNodeHash = QRT::HashValueToGuid(hash);
    MakeOperators(GetOperators(), inFirst, inCount, params.GetFrameTime(), params, setup);
    setup.mFixedFrame = inFrame;
    outProducer = CreateClipNodeProducer(std::move(setup));
}

void RenderableNodeClipImpl::GetStillRanges(TickTime inStart, TickTime inEnd,
                                            MF::TickTimeRangeList& ioRanges) const
{
    const std::uint32_t wanted = kRenderFlag_4 | kRenderFlag_TimeInvariant;
    if ((OperatorFlags() & wanted) != wanted || mTimeChanged || mTransform->GetSpeed() != 1.0 ||
        GetInputs().size() != 1)
        return;
    const auto& [input, offset] = GetInputs().front();
    const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(input);
    if (!provider)
        return;
    // Played unchanged, the input runs at clip time plus a fixed start (the
    // in point): ask in its time and move the answers back.
    const TickTime shift = mTransform->Transform(mvxmediatypes::kTime_Zero) - offset;
    MF::TickTimeRangeList ranges;
    provider->GetStillRanges(inStart + shift, inEnd + shift, ranges);
    for (const MF::TickTimeRange& range : ranges)
        ioRanges.emplace_back(range.first - shift, range.second - shift);
}

void RenderableNodeClipImpl::GetSmartRenderTimes(TickTime inStart, TickTime inEnd,
                                                 const mvxmediatypes::FrameRate& inFrameRate,
                                                 bool inFlag, std::set<TickTime>& ioTimes) const
{
    if (GetInputs().size() != 1)
        return;
    const auto& [input, offset] = GetInputs().front();
    if (const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(input))
        provider->GetSmartRenderTimes(inStart - offset, inEnd - offset, inFrameRate, inFlag,
                                      ioTimes);
}

QRT::Result RenderableNodeClipImpl::GetIntrinsicParameters(TickTime inLayerTime,
                                                           const CutlistRenderParams& inParams,
                                                           MotionRecord& ioRecord) const
{
    ioRecord = kIdentityMotionRecord;
    if (GetInputs().empty() || !GetInputs().front().first)
        return QRT::kResult_Success;
    const auto& [input, offset] = GetInputs().front();
    const TickTime time = mHoldClipTime.IsValid() ? mHoldClipTime : inLayerTime - offset;
    const BE::MotionKeyframes& motion = mKeyframes.mMotion;
    const auto* media = dynamic_cast<const RenderableNodeMediaImpl*>(input.Get());
    const double mediaWidth = media ? media->GetRenderState().mWidth : inParams.mFullFrameWidth;
    const double mediaHeight = media ? media->GetRenderState().mHeight : inParams.mFullFrameHeight;
    const auto relative = [](double inOffset, double inSize)
    { return static_cast<float>(0.5 + (inSize > 0 ? inOffset / inSize : 0.0)); };
    const MF::KeyframePoint position = motion.mPosition.ValueAt(time);
    const MF::KeyframePoint anchor = motion.mAnchor.ValueAt(time);
    const double scale = motion.mScale.ValueAt(time).mX / 100.0;
    ioRecord.mPositionX = relative(position.mX, inParams.mFullFrameWidth);
    ioRecord.mPositionY = relative(position.mY, inParams.mFullFrameHeight);
    ioRecord.mAnchorX = relative(anchor.mX, mediaWidth);
    ioRecord.mAnchorY = relative(anchor.mY, mediaHeight);
    ioRecord.mScaleX = ioRecord.mScaleY = static_cast<float>(scale);
    ioRecord.mRotation = motion.mRotation.ValueAt(time).mX;
    ioRecord.mOpacity =
        static_cast<float>(std::clamp(mKeyframes.mOpacity.ValueAt(time).mX / 100.0, 0.0, 1.0));
    ioRecord.mBlendMode = mBlendMode;
    if (media)
    {
        const MediaNodeRenderState& state = media->GetRenderState();
        if (!SameGeometry(ioRecord, kIdentityMotionRecord))
        {
            ioRecord.mMediaWidth = static_cast<std::uint32_t>(state.mWidth);
            ioRecord.mMediaHeight = static_cast<std::uint32_t>(state.mHeight);
        }
        ioRecord.mMediaPixelAspect = static_cast<float>(state.mPixelAspectRatio.ToDouble());
    }
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IRenderableNode> CreateClipNode(const ClipNodeSetup& inSetup)
{
    QRT::InterfaceRef<RenderableNodeClipImpl> node =
        QRT::Allocated<RenderableNodeClipImpl>::CreateInstance(inSetup);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
