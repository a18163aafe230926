#pragma once

// Node kinds used only by the graph tests: a plain kind with a chosen type
// name and flags, a compositor-style and a transition-style kind that apply
// the flag rules of their real counterparts, and a kind that answers
// IRenderableNodeProducerProvider with scripted still ranges and smart-render
// times and records what it was asked.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"

#include <cstdint>
#include <set>
#include <string>
#include <vector>

namespace graphtest
{

using mvxmediatypes::TickTime;

inline TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// A kind with a chosen type name and fixed render flags.
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

    // Records every PrefetchSelf range, so the walk through inputs can be checked.
    void PrefetchSelf(const MF::TickTimeRange& inRange, const ML::CutlistRenderParams&,
                      ML::RenderableNodePrefetchList&) const override
    {
        mPrefetchRanges.push_back(inRange);
    }
    QRT::InterfaceRef<MF::ITimeTransform> GetTimeTransform() const override { return mTransform; }

    void SetTimeTransform(QRT::InterfaceRef<MF::ITimeTransform> inTransform)
    {
        mTransform = std::move(inTransform);
    }

    mutable std::vector<MF::TickTimeRange> mPrefetchRanges;

protected:
    ~TestNode() = default;

private:
    std::string mType;
    std::uint32_t mFlags;
    QRT::InterfaceRef<MF::ITimeTransform> mTransform;
};

// Compositor rule: the AND of all inputs' flags with 92; 92 without inputs;
// an empty input is an error.
class TestCompositorNode : public ML::RenderableNodeCommonImpl
{
public:
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("TestCompositorNode");
    }
    std::uint32_t ComputeRenderFlags() const override
    {
        std::uint32_t flags = ML::kRenderFlagMask_Compositor;
        for (const Input& input : GetInputs())
            flags &= input.first->GetRenderFlags();
        return flags;
    }

protected:
    ~TestCompositorNode() = default;
};

// Transition rule: the AND of the non-empty inputs' flags with 68; 68 without inputs.
class TestTransitionNode : public ML::RenderableNodeCommonImpl
{
public:
    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("TestTransitionNode");
    }
    std::uint32_t ComputeRenderFlags() const override
    {
        std::uint32_t flags = ML::kRenderFlagMask_Transition;
        for (const Input& input : GetInputs())
            if (input.first)
                flags &= input.first->GetRenderFlags();
        return flags;
    }

protected:
    ~TestTransitionNode() = default;
};

// Answers scripted still ranges and smart-render times (in node time) and
// records the ranges it was asked about.
class ScriptedProviderNode
    : public ML::RenderableNodeWithInterfaces<ML::RenderableNodeCommonImpl,
                                              ML::IRenderableNodeProducerProvider>
{
public:
    ScriptedProviderNode(std::uint32_t inFlags, MF::TickTimeRangeList inStillRanges,
                         std::set<TickTime> inSmartTimes)
        : mFlags(inFlags)
        , mStillRanges(std::move(inStillRanges))
        , mSmartTimes(std::move(inSmartTimes))
    {
    }

    QRT::ImmutableString GetNodeType() const override
    {
        return QRT::ImmutableString::CreateStatic("ScriptedProviderNode");
    }
    std::uint32_t ComputeRenderFlags() const override { return mFlags; }

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
                             bool inFlag, std::set<TickTime>& ioTimes) const override
    {
        mSmartQuestions.emplace_back(inStart, inEnd);
        mSmartFlags.push_back(inFlag);
        ioTimes.insert(mSmartTimes.begin(), mSmartTimes.end());
    }

    mutable MF::TickTimeRangeList mStillQuestions;
    mutable MF::TickTimeRangeList mSmartQuestions;
    mutable std::vector<bool> mSmartFlags;

protected:
    ~ScriptedProviderNode() = default;

private:
    std::uint32_t mFlags;
    MF::TickTimeRangeList mStillRanges;
    std::set<TickTime> mSmartTimes;
};

template <class Kind, class... Args>
QRT::InterfaceRef<Kind> MakeMutable(Args&&... inArgs)
{
    return QRT::Allocated<Kind>::CreateInstance(std::forward<Args>(inArgs)...);
}

// A sealed node as the node interface.
template <class Kind>
QRT::InterfaceRef<MF::IRenderableNode> Seal(const QRT::InterfaceRef<Kind>& inNode)
{
    inNode->MakeImmutable();
    return QRT::InterfaceRef<MF::IRenderableNode>(static_cast<MF::IRenderableNode*>(inNode.Get()));
}

// A sealed TestNode with no properties.
inline QRT::InterfaceRef<MF::IRenderableNode> MakeLeaf(const std::string& inType,
                                                       std::uint32_t inFlags = 0)
{
    return Seal(MakeMutable<TestNode>(inType, inFlags));
}

} // namespace graphtest
