#include "EdgeHoldSource.h"

#include "QRT/Allocated.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;

class EdgeHoldSource : public QRT::Implements<ML::IRenderableSource>
{
public:
    EdgeHoldSource(QRT::InterfaceRef<ML::IRenderableSource> inUpstream, mt::TickTime inLastFrame)
        : mUpstream(std::move(inUpstream))
        , mLastFrame(inLastFrame)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams& inParams,
                          MF::FrameTime& outConformed) override
    {
        mUpstream->ConformFrameTime(inRequested, inParams, outConformed);
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                           ML::RenderableNodePrefetchList& ioPrefetches) override
    {
        mUpstream->CollectPrefetches(Hold(inTime), WithTime(inParams, Hold(inTime)), ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        mUpstream->RenderFrame(Hold(inTime), WithTime(inParams, Hold(inTime)), outFrame);
    }

    void GetFrameRate(mt::FrameRate& outRate) override { mUpstream->GetFrameRate(outRate); }

    void GetFieldRate(mt::FrameRate& outRate) override { mUpstream->GetFieldRate(outRate); }

private:
    mt::TickTime Hold(mt::TickTime inTime) const
    {
        return std::clamp(inTime, mt::kTime_Zero, mLastFrame);
    }

    MF::FrameTime Hold(const MF::FrameTime& inTime) const
    {
        return MF::FrameTime(Hold(inTime.GetFirstFieldTime()), Hold(inTime.GetSecondFieldTime()));
    }

    // The parameters lead with the frame time they are rendered for.
    static ML::CutlistRenderParams WithTime(const ML::CutlistRenderParams& inParams,
                                            const MF::FrameTime& inTime)
    {
        ML::CutlistRenderParams params = inParams;
        params.SetFrameTime(inTime);
        return params;
    }

    const QRT::InterfaceRef<ML::IRenderableSource> mUpstream;
    // The start of the media's last frame.
    const mt::TickTime mLastFrame;
};

} // namespace

QRT::InterfaceRef<ML::IRenderableSource>
HoldEdgeFrames(QRT::InterfaceRef<ML::IRenderableSource> inSource, mt::TickTime inDuration,
               mt::FrameRate inFrameRate)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    MVX_INPUT_CONTRACT(inDuration > mt::kTime_Zero);
    const std::int64_t ticks = std::max<std::int64_t>(inFrameRate.GetTicksPerFrame(), 1);
    const std::int64_t frames = (inDuration.GetTicks() + ticks - 1) / ticks;
    return QRT::Allocated<EdgeHoldSource>::Create<ML::IRenderableSource>(
        std::move(inSource), mt::TickTime::TicksToTime((frames - 1) * ticks));
}

} // namespace vrender
