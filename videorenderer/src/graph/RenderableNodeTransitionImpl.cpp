// The transition node: its keys, flags and producer set-up.

#include "graph/RenderableNodeTransitionImpl.h"

#include "ML/RenderFlags.h"
#include "ML/RenderablePropertyValue.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "mvxcore/debug/Contract.h"

#include <string>

namespace ML
{
namespace
{

QRT::ImmutableString Key(const char* inName)
{
    return QRT::ImmutableString::CreateStatic(inName);
}

std::string PointText(const TX::TransitionPoint& inPoint)
{
    return FormatPropertyValue(double{inPoint.mX}) + "," + FormatPropertyValue(double{inPoint.mY});
}

MF::FrameTime InputTime(const MF::FrameTime& inTime, mvxmediatypes::TickTime inOffset)
{
    return MF::FrameTime(inTime.GetFirstFieldTime() - inOffset,
                         inTime.GetSecondFieldTime() - inOffset);
}

} // namespace

RenderableNodeTransitionImpl::RenderableNodeTransitionImpl(const TransitionNodeSetup& inSetup)
    : mTransition(inSetup.mTransition)
{
    if (!mTransition)
        throw QRT::NullInterfaceException();
    mParameters = mTransition->GetParameters();
    const TX::TransitionParameters& p = mParameters;
    SetProperty(Key("TransitionNode::TransitionMatchName"), mTransition->GetMatchName(), true);
    SetProperty(Key("TransitionNode::TransitionOpaqueData"),
                FormatPropertyValue(mTransition->GetOpaqueData()), true);
    SetProperty(Key("TransitionNode::TransitionStartPosition"), PointText(p.mStartPosition), true);
    SetProperty(Key("TransitionNode::TransitionEndPosition"), PointText(p.mEndPosition), true);
    SetProperty(Key("TransitionNode::TransitionCenterPosition"), PointText(p.mCenterPosition),
                true);
    SetTypedProperty(Key("TransitionNode::TransitionStartPercent"), double{p.mStartPercent}, true);
    SetTypedProperty(Key("TransitionNode::TransitionEndPercent"), double{p.mEndPercent}, true);
    SetTypedProperty(Key("TransitionNode::TransitionBorderWidth"), double{p.mBorderWidth}, true);
    SetTypedProperty(Key("TransitionNode::TransitionBorderColor"), p.mBorderColor, true);
    SetTypedProperty(Key("TransitionNode::TransitionSwitchSources"), p.mSwitchSources, true);
    SetTypedProperty(Key("TransitionNode::TransitionReverse"), p.mReverse, true);
    SetProperty(Key("TransitionNode::TransitionDirection"), std::to_string(p.mDirection), true);
    SetTypedProperty(Key("TransitionNode::TransitionAntiAliasQuality"), p.mAntiAliasQuality, true);
    SetTypedProperty(Key("TransitionNode::TransitionDuration"), p.mDuration, true);
    SetTypedProperty(Key("TransitionNode::RuntimeInstanceID"), p.mInstanceNumber, false);
    AddInput(inSetup.mOutgoing, inSetup.mOutgoingOffset);
    AddInput(inSetup.mIncoming, inSetup.mIncomingOffset);
}

QRT::ImmutableString RenderableNodeTransitionImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeTransitionImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeTransitionImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

std::uint32_t RenderableNodeTransitionImpl::ComputeRenderFlags() const
{
    std::uint32_t flags = kRenderFlagMask_Transition;
    for (const Input& input : GetInputs())
        if (input.first)
            flags &= input.first->GetRenderFlags();
    return flags;
}

void RenderableNodeTransitionImpl::GetProducer(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, const MF::FrameTime& inTime,
    const CutlistRenderParams& inParams) const
{
    const std::vector<Input>& inInputs = GetInputs();
    MVX_INPUT_CONTRACT(inInputs.size() == 2);
    TransitionProducerSetup setup;
    setup.mTransition = mTransition;
    setup.mParameters = mParameters;
    setup.mNodeHash = GetNodeHash();
    for (std::size_t index = 0; index < 2; ++index)
    {
        const auto& [node, offset] = inInputs[index];
        TransitionProducerSetup::Side& side = setup.mSides[index];
        side.mOffset = offset;
        const MF::FrameTime inputTime = InputTime(inTime, offset);
        if (const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node))
            provider->GetProducer(side.mProducer, inputTime, inParams);
        if (const auto motion = QRT::QueryRef<IRenderableNodeIntrinsicParameterProvider>(node))
        {
            motion->GetIntrinsicParameters(inputTime.GetFirstFieldTime(), inParams,
                                           side.mFirstField);
            motion->GetIntrinsicParameters(inputTime.GetSecondFieldTime(), inParams,
                                           side.mSecondField);
        }
    }
    outProducer = CreateTransitionNodeProducer(std::move(setup));
}

void RenderableNodeTransitionImpl::GetStillRanges(mvxmediatypes::TickTime /*inStart*/,
                                                  mvxmediatypes::TickTime /*inEnd*/,
                                                  MF::TickTimeRangeList& /*ioRanges*/) const
{
}

void RenderableNodeTransitionImpl::GetSmartRenderTimes(
    mvxmediatypes::TickTime /*inStart*/, mvxmediatypes::TickTime /*inEnd*/,
    const mvxmediatypes::FrameRate& /*inFrameRate*/, bool /*inFlag*/,
    std::set<mvxmediatypes::TickTime>& /*ioTimes*/) const
{
}

QRT::Result
RenderableNodeTransitionImpl::GetIntrinsicParameters(mvxmediatypes::TickTime /*inLayerTime*/,
                                                     const CutlistRenderParams& /*inParams*/,
                                                     MotionRecord& /*ioRecord*/) const
{
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IRenderableNode> CreateTransitionNode(const TransitionNodeSetup& inSetup)
{
    QRT::InterfaceRef<RenderableNodeTransitionImpl> node =
        QRT::Allocated<RenderableNodeTransitionImpl>::CreateInstance(inSetup);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
