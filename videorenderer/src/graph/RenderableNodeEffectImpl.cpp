// The effect node and its operator.

#include "graph/RenderableNodeEffectImpl.h"

#include "ML/MatchNames.h"
#include "ML/RenderFlags.h"
#include "ML/RenderablePropertyValue.h"
#include "ML/SubTreeRender.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "QRT/Hash.h"

#include <algorithm>
#include <string_view>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

constexpr std::string_view kOperatorHashText = "EffectNodeOperator";

QRT::ImmutableString Key(const char* inName)
{
    return QRT::ImmutableString::CreateStatic(inName);
}

// What an operator keeps of its node.
struct OperatorSetup
{
    QRT::InterfaceRef<FX::IEffect> mEffect;
    TickTime mDuration;
    mvxmediatypes::FrameRate mFrameRate;
    QRT::Guid mNodeHash;
    std::uint32_t mRenderFlags = 0;
    FX::RenderContext mContext;
    // Null for a re-entrant effect.
    std::shared_ptr<std::mutex> mRenderLock;
};

// One effect applied for one request; made by the node, owned by the clip
// producer that applies it, used by one thread at a time.
class EffectNodeOperator : public QRT::Implements<IRenderableNodeOperator>
{
public:
    EffectNodeOperator() = default;

    void InitializeOperator(OperatorSetup inSetup) { mSetup = std::move(inSetup); }

    QRT::InterfaceRef<IRenderableNodeOperator> GetSelfReference()
    {
        return QRT::InterfaceRef<IRenderableNodeOperator>(this);
    }

    QRT::Result
    ApplyOperator(const MF::FrameTime& inOutputTime, const MF::FrameTime& /*inInputTime*/,
                  const CutlistRenderParams& /*inParams*/, const SubTreeRenderList& inLayerInputs,
                  QRT::InterfaceRef<MF::IVideoFrame>& ioFrame, std::uint32_t inFlags) override
    {
        if (!mSetup.mEffect)
            throw QRT::NullInterfaceException();
        FX::RenderContext context = mSetup.mContext;
        context.mTime = inOutputTime.GetTime();
        context.mFrame = context.mTime.ToFrame64(mSetup.mFrameRate);
        context.mDurationFrames = mSetup.mDuration.ToFrame64(mSetup.mFrameRate);
        context.mFrameRate = mSetup.mFrameRate;
        context.mFlags = inFlags;
        FX::LayerInputs layers;
        layers.reserve(inLayerInputs.size());
        for (const QRT::InterfaceRef<SubTreeRender>& layer : inLayerInputs)
            layers.emplace_back(layer.Get());
        if (!mSetup.mRenderLock)
            return mSetup.mEffect->Render(context, ioFrame, layers);
        const std::lock_guard<std::mutex> lock(*mSetup.mRenderLock);
        return mSetup.mEffect->Render(context, ioFrame, layers);
    }

    QRT::Result GetOperatorHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                                const CutlistRenderParams& inParams) override
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kOperatorHashText);
        if ((mSetup.mRenderFlags & kRenderFlag_TimeInvariant) == 0)
        {
            QRT::MixHash::MixInValue(hash, inTime.GetFirstFieldTime().GetTicks());
            QRT::MixHash::MixInValue(hash, inTime.GetSecondFieldTime().GetTicks());
        }
        QRT::MixHash::MixInGuid(hash, mSetup.mNodeHash);
        QRT::MixHash::MixInValue(hash, inParams.mWidth);
        QRT::MixHash::MixInValue(hash, inParams.mHeight);
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetNumerator());
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetDenominator());
        QRT::MixHash::MixInValue(hash, inParams.mHorizontalScale);
        QRT::MixHash::MixInValue(hash, inParams.mVerticalScale);
        QRT::MixHash::MixInValue(hash, inParams.mQuality);
        QRT::MixHash::MixInValue(hash, inParams.mSecondaryQuality);
        QRT::MixHash::MixInValue(hash, inParams.mPixelFormat.GetValue());
        outHash = QRT::HashValueToGuid(hash);
        return QRT::kResult_Success;
    }

protected:
    ~EffectNodeOperator() = default;

private:
    OperatorSetup mSetup;
};

} // namespace

QRT::ImmutableString RenderableNodeEffectImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeEffectImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeEffectImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

bool RenderableNodeEffectImpl::IsTimeVariant() const
{
    if (!mEffect)
        throw QRT::NullInterfaceException();
    if (mEffect->IsTimeVariant())
        return true;
    for (std::uint32_t i = 0; i < mEffect->GetParamCount(); ++i)
    {
        const FX::EffectParam& param = mEffect->GetParam(i);
        if (param.IsTimeVariant() && !param.IsConstant())
            return true;
        if (param.mType == FX::ParamType::kLayer &&
            param.ValueAt(mvxmediatypes::kTime_Zero) < FX::kNoLayer)
            return true;
    }
    return false;
}

std::uint32_t RenderableNodeEffectImpl::ComputeRenderFlags() const
{
    std::uint32_t flags = kRenderFlag_4;
    if (!IsTimeVariant())
        flags |= kRenderFlag_TimeInvariant;
    if (!FindHashedProperty(Key("EffectNode::LayerInputHashes")))
        flags |= kRenderFlag_NoLayerInputs;
    return flags;
}

void RenderableNodeEffectImpl::SetEffect(const QRT::InterfaceRef<FX::IEffect>& inEffect,
                                         mvxmediatypes::FrameRate inFrameRate,
                                         const std::string& inStreamLabel)
{
    if (!inEffect)
        throw QRT::NullInterfaceException();
    mEffect = inEffect;
    mFrameRate = inFrameRate;
    mStreamLabel = inStreamLabel;
    mDuration = inEffect->HasDuration() ? inEffect->GetDuration() : mvxmediatypes::kTime_Zero;
    if (!inEffect->IsReentrant())
        mRenderLock = std::make_shared<std::mutex>();
    else
        mRenderLock.reset();

    SetProperty(Key("EffectNode::FilterMatchName"), inEffect->GetMatchName(), true);
    if (!inStreamLabel.empty())
        SetProperty(Key("EffectNode::StreamLabel"), inStreamLabel, true);
    if (inEffect->HasDuration())
        SetTypedProperty(Key("EffectNode::EffectDuration"), inEffect->GetDuration(), true);
    if (MF::BinaryData opaque; inEffect->GetOpaqueData(opaque))
        SetProperty(Key("EffectNode::FilterOpaqueData"), FormatPropertyValue(opaque), true);
    std::string params = std::to_string(inEffect->GetParamCount()) + "\n";
    for (std::uint32_t i = 0; i < inEffect->GetParamCount(); ++i)
        params += inEffect->GetParam(i).GetText() + "\n";
    SetProperty(Key("EffectNode::FilterParams"), params, true);
    SetTypedProperty(Key("EffectNode::RuntimeInstanceID"), inEffect->GetInstanceID(), false);
}

void RenderableNodeEffectImpl::SetLayerInputs(const std::vector<EffectLayerInput>& inLayers)
{
    std::string hashes;
    for (const EffectLayerInput& layer : inLayers)
    {
        if (!layer.mNode)
            throw QRT::NullInterfaceException();
        AddInput(layer.mNode, layer.mOffset);
        hashes +=
            layer.mNode->GetNodeHash().ToString() + "@" + FormatPropertyValue(layer.mOffset) + "\n";
    }
    SetProperty(Key("EffectNode::LayerInputHashes"), hashes, true);
}

void RenderableNodeEffectImpl::CreateOperator(
    QRT::InterfaceRef<IRenderableNodeOperator>& outOperator, const MF::FrameTime& inTime,
    const CutlistRenderParams& inParams) const
{
    outOperator.Reset();
    if (!mEffect)
        throw QRT::NullInterfaceException();
    const std::string_view match = mEffect->GetMatchName();
    if (match == kMatchnameOpacity.ToStringView() || match == kMatchnameMotion.ToStringView())
        return;
    OperatorSetup setup;
    setup.mEffect = mEffect;
    setup.mDuration = mDuration;
    setup.mFrameRate = mFrameRate;
    setup.mNodeHash = GetNodeHash();
    setup.mRenderFlags = GetRenderFlags();
    setup.mRenderLock = mRenderLock;
    FX::RenderContext& context = setup.mContext;
    context.mFrameRect = QRT::ParamRect(0, 0, static_cast<std::int32_t>(inParams.mWidth),
                                        static_cast<std::int32_t>(inParams.mHeight));
    context.mFieldType = static_cast<mvxmediatypes::FieldType>(inParams.mFieldType);
    context.mQuality = inParams.mQuality;
    context.mPixelAspectRatio = inParams.mPixelAspectRatio;
    context.mScale =
        static_cast<float>(std::min(inParams.mHorizontalScale, inParams.mVerticalScale));
    context.mTime = inTime.GetTime();
    context.mStreamLabel = mStreamLabel;
    const QRT::InterfaceRef<EffectNodeOperator> made =
        QRT::Allocated<EffectNodeOperator>::CreateInstance();
    made->InitializeOperator(std::move(setup));
    outOperator = made->GetSelfReference();
}

const FX::IEffect& RenderableNodeEffectImpl::GetKeyframeStore() const
{
    if (!mEffect)
        throw QRT::NullInterfaceException();
    return *mEffect;
}

QRT::InterfaceRef<MF::IRenderableNode> CreateEffectNode(const EffectNodeSetup& inSetup)
{
    const QRT::InterfaceRef<RenderableNodeEffectImpl> node =
        QRT::Allocated<RenderableNodeEffectImpl>::CreateInstance();
    node->SetEffect(inSetup.mEffect, inSetup.mFrameRate, inSetup.mStreamLabel);
    node->SetLayerInputs(inSetup.mLayerInputs);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
