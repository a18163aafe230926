// The common part of every renderable node kind (see ML/RenderableNodeCommonImpl.h).

#include "ML/RenderableNodeCommonImpl.h"

#include "mvxcore/debug/Contract.h"

#include <string_view>

namespace ML
{
namespace
{

constexpr std::string_view kHashSeedText = "ML::RenderableNodeCommonImpl";
constexpr std::string_view kPropertyNameText = "PropertyName::";
constexpr std::string_view kPropertyValueText = "PropertyValue::";
constexpr std::string_view kInputText = "Input::";
constexpr std::string_view kNodeTypeText = "NodeType::";
constexpr std::string_view kOperatorText = "Operator::";

} // namespace

QRT::Guid RenderableNodeCommonImpl::GetNodeHash() const
{
    MVX_INPUT_CONTRACT(!mMutable);
    return mNodeHash;
}

QRT::Guid RenderableNodeCommonImpl::GetInputSideHash() const
{
    MVX_INPUT_CONTRACT(!mMutable);
    return mInputSideHash;
}

std::uint32_t RenderableNodeCommonImpl::GetRenderFlags() const
{
    MVX_INPUT_CONTRACT(!mMutable);
    return mRenderFlags;
}

void RenderableNodeCommonImpl::GetProperties(MF::RenderablePropertyMap& outProperties) const
{
    MF::RenderablePropertyMap properties = mHashedProperties;
    // insert keeps an existing entry: a key in both maps keeps its hashed value.
    properties.insert(mUnhashedProperties.begin(), mUnhashedProperties.end());
    outProperties.swap(properties);
}

QRT::Result RenderableNodeCommonImpl::GetProperty(const QRT::ImmutableString& inKey,
                                                  MF::RenderablePropertyValue& outValue) const
{
    auto found = mHashedProperties.find(inKey);
    if (found == mHashedProperties.end())
    {
        found = mUnhashedProperties.find(inKey);
        if (found == mUnhashedProperties.end())
            return QRT::kResult_NotFound;
    }
    outValue = found->second;
    return QRT::kResult_Success;
}

const MF::RenderablePropertyValue*
RenderableNodeCommonImpl::FindHashedProperty(const QRT::ImmutableString& inKey) const
{
    const auto found = mHashedProperties.find(inKey);
    return found == mHashedProperties.end() ? nullptr : &found->second;
}

std::uint32_t RenderableNodeCommonImpl::GetInputCount() const
{
    return static_cast<std::uint32_t>(mInputs.size());
}

QRT::Result
RenderableNodeCommonImpl::GetInput(std::uint32_t inIndex, mvxmediatypes::TickTime& outOffset,
                                   QRT::InterfaceRef<MF::IRenderableNode>& outNode) const
{
    MVX_INPUT_CONTRACT(!mMutable);
    if (inIndex >= mInputs.size())
        return QRT::kResult_NotFound;
    outOffset = mInputs[inIndex].second;
    outNode = mInputs[inIndex].first;
    return QRT::kResult_Success;
}

std::uint32_t RenderableNodeCommonImpl::GetOperatorCount() const
{
    return static_cast<std::uint32_t>(mOperators.size());
}

QRT::Result
RenderableNodeCommonImpl::GetOperator(std::uint32_t inIndex,
                                      QRT::InterfaceRef<MF::IRenderableNode>& outNode) const
{
    MVX_INPUT_CONTRACT(!mMutable);
    if (inIndex >= mOperators.size())
        return QRT::kResult_NotFound;
    outNode = mOperators[inIndex];
    return QRT::kResult_Success;
}

void RenderableNodeCommonImpl::MixKindIntoHash(QRT::HashValue& ioHash) const
{
    QRT::MixHash::MixInString(ioHash, kNodeTypeText);
    QRT::MixHash::MixInString(ioHash, GetNodeType());
}

std::uint32_t RenderableNodeCommonImpl::ComputeRenderFlags() const
{
    return 0;
}

void RenderableNodeCommonImpl::PrefetchSelf(const MF::TickTimeRange& /*inRange*/,
                                            const CutlistRenderParams& /*inParams*/,
                                            RenderableNodePrefetchList& /*ioPrefetches*/) const
{
}

QRT::InterfaceRef<MF::ITimeTransform> RenderableNodeCommonImpl::GetTimeTransform() const
{
    return {};
}

void RenderableNodeCommonImpl::MakeImmutable()
{
    MVX_INPUT_CONTRACT(mMutable);

    QRT::HashValue hash;
    QRT::MixHash::MixInString(hash, kHashSeedText);
    for (const auto& [key, value] : mHashedProperties)
    {
        QRT::MixHash::MixInString(hash, kPropertyNameText);
        QRT::MixHash::MixInString(hash, key);
        QRT::MixHash::MixInString(hash, kPropertyValueText);
        QRT::MixHash::MixInString(hash, value);
    }
    for (const auto& [node, offset] : mInputs)
    {
        QRT::MixHash::MixInString(hash, kInputText);
        QRT::MixHash::MixInValue(hash, offset.GetTicks());
        // An empty slot still counts (its offset is mixed) so that input
        // positions stay distinguishable.
        if (node)
            QRT::MixHash::MixInGuid(hash, node->GetNodeHash());
    }
    MixKindIntoHash(hash);
    const QRT::Guid inputSideHash = QRT::HashValueToGuid(hash);

    for (const auto& oper : mOperators)
    {
        QRT::MixHash::MixInString(hash, kOperatorText);
        QRT::MixHash::MixInGuid(hash, oper->GetNodeHash());
    }

    // Everything that can throw (operators, the kind's flag rule) runs before
    // any field changes, so a failed seal leaves the node as it was.
    const std::uint32_t renderFlags = ComputeRenderFlags();

    mInputSideHash = inputSideHash;
    mNodeHash = QRT::HashValueToGuid(hash);
    mRenderFlags = renderFlags;
    mMutable = false;
}

void RenderableNodeCommonImpl::Prefetch(const MF::TickTimeRange& inRange,
                                        const CutlistRenderParams& inParams,
                                        RenderableNodePrefetchList& ioPrefetches) const
{
    MVX_INPUT_CONTRACT(!mMutable);
    const QRT::InterfaceRef<MF::ITimeTransform> transform = GetTimeTransform();
    for (const auto& [node, offset] : mInputs)
    {
        const QRT::InterfaceRef<IRenderableNodePrefetchProvider> provider =
            QRT::QueryRef<IRenderableNodePrefetchProvider>(node);
        if (!provider)
            continue;
        MF::TickTimeRange inputRange(inRange.first - offset, inRange.second - offset);
        if (transform)
        {
            inputRange.first = transform->Transform(inputRange.first);
            inputRange.second = transform->Transform(inputRange.second);
        }
        provider->Prefetch(inputRange, inParams, ioPrefetches);
    }
    PrefetchSelf(inRange, inParams, ioPrefetches);
}

void RenderableNodeCommonImpl::SetProperty(const QRT::ImmutableString& inKey,
                                           std::string_view inValue, bool inHashed)
{
    MVX_INPUT_CONTRACT(mMutable);
    MF::RenderablePropertyMap& properties = inHashed ? mHashedProperties : mUnhashedProperties;
    if (inValue.empty())
    {
        properties.erase(inKey);
        return;
    }
    properties.insert_or_assign(inKey, MF::RenderablePropertyValue(inValue));
}

void RenderableNodeCommonImpl::AddInput(const QRT::InterfaceRef<MF::IRenderableNode>& inNode,
                                        mvxmediatypes::TickTime inOffset)
{
    MVX_INPUT_CONTRACT(mMutable);
    mInputs.emplace_back(inNode, inOffset);
}

void RenderableNodeCommonImpl::AddOperator(const QRT::InterfaceRef<MF::IRenderableNode>& inNode)
{
    MVX_INPUT_CONTRACT(mMutable);
    mOperators.push_back(inNode);
}

} // namespace ML
