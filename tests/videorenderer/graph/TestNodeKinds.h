#pragma once

// The graph tests' doubles and hash helpers: a plain node kind with a chosen
// type name and flags that records its prefetch ranges; a kind that also
// answers IRenderableNodeProducerProvider with scripted still ranges and
// smart-render times and records the ranges it was asked about; and an independent
// re-computation of hashes from their byte runs, so the tests check the exact
// order and length of every run mixed, not merely that a hash changed.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "QRT/Allocated.h"
#include "QRT/Guid.h"
#include "QRT/Hash.h"

#include <cstdint>
#include <cstring>
#include <set>
#include <string>
#include <type_traits>
#include <vector>

namespace graphtest
{

using mvxmediatypes::TickTime;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;
using ByteRuns = std::vector<std::string>;

inline TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

inline MF::TickTimeRange Range(std::int64_t inStart, std::int64_t inEnd)
{
    return {Ticks(inStart), Ticks(inEnd)};
}

class TestNode : public ML::RenderableNodeCommonImpl
{
public:
    TestNode(std::string inType, std::uint32_t inFlags)
        : mType(std::move(inType))
        , mFlags(inFlags)
    {
    }
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateDynamic(mType);
    }
    std::uint32_t ComputeRenderFlags() const override { return mFlags; }
    void PrefetchSelf(const MF::TickTimeRange& inRange, const ML::CutlistRenderParams&,
                      ML::RenderableNodePrefetchList&) const override
    {
        mPrefetchRanges.push_back(inRange);
    }
    QRT::InterfaceRef<MF::ITimeTransform> GetTimeTransform() const override { return mTransform; }

    mutable std::vector<MF::TickTimeRange> mPrefetchRanges;
    QRT::InterfaceRef<MF::ITimeTransform> mTransform;

protected:
    ~TestNode() = default;

private:
    std::string mType;
    std::uint32_t mFlags;
};

// Still ranges and smart-render times are scripted in node time.
class ScriptedProviderNode
    : public ML::RenderableNodeWithInterfaces<TestNode, ML::IRenderableNodeProducerProvider>
{
public:
    using RenderableNodeWithInterfaces::RenderableNodeWithInterfaces;
    void GetProducer(QRT::InterfaceRef<ML::IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime&, const ML::CutlistRenderParams&) const override
    {
        outProducer.Reset();
    }
    void GetStillRanges(TickTime inStart, TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override
    {
        mStillQuestions.emplace_back(inStart, inEnd);
        ioRanges.insert(ioRanges.end(), mStillRanges.begin(), mStillRanges.end());
    }
    void GetSmartRenderTimes(TickTime inStart, TickTime inEnd, const mvxmediatypes::FrameRate&,
                             bool, std::set<TickTime>& ioTimes) const override
    {
        mSmartQuestions.emplace_back(inStart, inEnd);
        ioTimes.insert(mSmartTimes.begin(), mSmartTimes.end());
    }

    MF::TickTimeRangeList mStillRanges;
    std::set<TickTime> mSmartTimes;
    mutable MF::TickTimeRangeList mStillQuestions;
    mutable MF::TickTimeRangeList mSmartQuestions;

protected:
    ~ScriptedProviderNode() = default;
};

template <class Kind, class... Args>
QRT::InterfaceRef<Kind> MakeMutable(Args&&... inArgs)
{
    return QRT::Allocated<Kind>::CreateInstance(std::forward<Args>(inArgs)...);
}

// Seals the node and answers it as the node interface.
template <class Kind>
NodeRef Seal(const QRT::InterfaceRef<Kind>& inNode)
{
    inNode->MakeImmutable();
    return NodeRef(static_cast<MF::IRenderableNode*>(inNode.Get()));
}

inline NodeRef MakeLeaf(const std::string& inType, std::uint32_t inFlags = 0)
{
    return Seal(MakeMutable<TestNode>(inType, inFlags));
}

// The object bytes of a value, as MixHash::MixInValue mixes them; give the
// type explicitly where a literal would otherwise pick int.
template <class T>
std::string BytesOf(const T& inValue)
{
    static_assert(std::is_trivially_copyable_v<T>);
    std::string bytes(sizeof(T), '\0');
    std::memcpy(bytes.data(), &inValue, sizeof(T));
    return bytes;
}

inline std::string BytesOf(const QRT::Guid& inGuid)
{
    const auto bytes = QRT::GuidToBytes(inGuid);
    return std::string(reinterpret_cast<const char*>(bytes.data()), bytes.size());
}

inline QRT::Guid HashOfRuns(const ByteRuns& inRuns)
{
    QRT::HashValue hash;
    for (const std::string& run : inRuns)
        QRT::MixHash::MixInData(hash, run.data(), run.size());
    return QRT::HashValueToGuid(hash);
}

} // namespace graphtest
