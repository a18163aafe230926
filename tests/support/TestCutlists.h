#pragma once

// Cutlists of one segment onto a node, cutlists whose lookups fail, and a
// cutlist provider that records its getter calls (from any thread).

#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "ML/IMutableCutlist.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <string>
#include <vector>

namespace vrtest
{

using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;

// A sealed cutlist of one segment [inStart, inEnd) onto inNode, whose time
// at inStart is inOffset (ticks).
inline CutlistRef OneSegment(const QRT::InterfaceRef<MF::IRenderableNode>& inNode,
                             std::int64_t inStart = 0, std::int64_t inEnd = 1'000'000'000'000,
                             std::int64_t inOffset = 0)
{
    using mvxmediatypes::TickTime;
    auto cutlist = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("test"));
    cutlist->AddSegment(TickTime::TicksToTime(inStart), TickTime::TicksToTime(inEnd),
                        TickTime::TicksToTime(inOffset), inNode);
    cutlist->MakeImmutable();
    return CutlistRef(cutlist);
}

// The status of every lookup of a FailingCutlist.
inline const auto kLookupFailure = static_cast<QRT::Result>(0xA0990002u);

class FailingCutlist : public QRT::Implements<MF::IRenderableCutlist>
{
public:
    std::size_t GetSegmentCount() const override { return 0; }
    QRT::Guid GetCutlistHash() const override { return QRT::Guid(); }
    QRT::Result GetSegment(std::size_t, mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                           mvxmediatypes::TickTime&, QRT::Guid&) const override
    {
        return kLookupFailure;
    }
    QRT::Result GetNodeByHash(const QRT::Guid&,
                              QRT::InterfaceRef<MF::IRenderableNode>&) const override
    {
        return kLookupFailure;
    }
    QRT::Result GetNodeAtTime(const MF::FrameTime&, QRT::InterfaceRef<MF::IRenderableNode>&,
                              MF::FrameTime&) const override
    {
        return kLookupFailure;
    }
    QRT::Result GetSegmentAtTime(mvxmediatypes::TickTime, std::size_t&, mvxmediatypes::TickTime&,
                                 mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                                 QRT::Guid&) const override
    {
        return kLookupFailure;
    }
    QRT::ImmutableString GetName() const override { return QRT::ImmutableString(); }
};

// One getter call as a provider saw it.
struct GetterCall
{
    int mWhich = 0; // 0 main, 1 alternate, 2 third
    std::string mName;
    bool mFlag = false;
};

// A provider without the sequence description that answers mCutlists[0..2]
// from the main, alternate and third getters and records each call.
class BareCutlistProvider : public QRT::Implements<MF::IRenderableCutlistProvider>
{
public:
    CutlistRef mCutlists[3];

    CutlistRef GetMainCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(0, inName, inFlag);
    }
    CutlistRef GetAlternateCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(1, inName, inFlag);
    }
    CutlistRef GetThirdCutlist(const QRT::ImmutableString& inName, bool inFlag) override
    {
        return Record(2, inName, inFlag);
    }

    std::vector<GetterCall> Calls()
    {
        std::lock_guard lock(mMutex);
        return mCalls;
    }

private:
    CutlistRef Record(int inWhich, const QRT::ImmutableString& inName, bool inFlag)
    {
        std::lock_guard lock(mMutex);
        mCalls.push_back({inWhich, inName.ToStdString(), inFlag});
        return mCutlists[inWhich];
    }

    // Guards mCalls.
    std::mutex mMutex;
    std::vector<GetterCall> mCalls;
};

} // namespace vrtest
