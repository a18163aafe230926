#pragma once

// A cutlist of one segment onto a test node, whose node lookup can be made to
// fail, and a cutlist provider that records its getter calls (from any
// thread).

#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <string>
#include <vector>

namespace vrtest
{

using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;

// One segment [mStart, mEnd) onto mNode; node time = t + mOffset - mStart.
class TestCutlist : public QRT::Implements<MF::IRenderableCutlist>
{
public:
    mvxmediatypes::TickTime mStart = mvxmediatypes::kTime_Zero;
    mvxmediatypes::TickTime mEnd = mvxmediatypes::TickTime::TicksToTime(1'000'000'000'000);
    mvxmediatypes::TickTime mOffset = mvxmediatypes::kTime_Zero;
    QRT::InterfaceRef<MF::IRenderableNode> mNode;
    QRT::Result mLookupStatus = QRT::kResult_Success;

    std::size_t GetSegmentCount() const override { return 1; }
    QRT::Guid GetCutlistHash() const override { return QRT::Guid(); }
    QRT::Result GetSegment(std::size_t, mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                           mvxmediatypes::TickTime&, QRT::Guid&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result GetNodeByHash(const QRT::Guid&,
                              QRT::InterfaceRef<MF::IRenderableNode>&) const override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result GetNodeAtTime(const MF::FrameTime& inTime,
                              QRT::InterfaceRef<MF::IRenderableNode>& outNode,
                              MF::FrameTime& outLocalTime) const override
    {
        if (QRT::Failed(mLookupStatus))
            return mLookupStatus;
        const mvxmediatypes::TickTime time = inTime.GetTime();
        if (time < mStart || time >= mEnd)
        {
            outNode.Reset();
            return QRT::kResult_Success;
        }
        outNode = mNode;
        const mvxmediatypes::TickTime shift = mOffset - mStart;
        outLocalTime =
            MF::FrameTime(inTime.GetFirstFieldTime() + shift, inTime.GetSecondFieldTime() + shift);
        return QRT::kResult_Success;
    }
    QRT::Result GetSegmentAtTime(mvxmediatypes::TickTime, std::size_t&, mvxmediatypes::TickTime&,
                                 mvxmediatypes::TickTime&, mvxmediatypes::TickTime&,
                                 QRT::Guid&) const override
    {
        return QRT::kResult_NotFound;
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
