#include "ML/RenderableSourceFilters.h"
#include "QRT/Allocated.h"
#include "QRT/QRTUnknown.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"
#include "sources/FieldFilterSteps.h"

namespace ML
{

namespace
{

using namespace FieldFilterSteps;

// The frame height up to which telecined material carries its earlier field
// in the second slot (standard-definition video is lower field first).
constexpr std::int32_t kStandardDefinitionMaxRows = 576;

// RenderableSourcePulldownRemoval: turns telecined material (film frames
// spread over video fields by a 2:3 cadence) back into progressive film
// frames at four fifths of the upstream rate. A film frame that lies whole in
// one upstream frame is that frame; a split one is rebuilt from the current
// upstream frame and the field it lacks from the previous one. Immutable;
// called from render and prefetch threads at once.
class RenderableSourcePulldownRemoval : public QRT::Implements<IRenderableSource>
{
public:
    RenderableSourcePulldownRemoval(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                                    mvxmediatypes::PulldownCadence inCadence)
        : mUpstream(inUpstream)
        , mCadence(inCadence)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        mvxmediatypes::FrameRate filmRate;
        GetFrameRate(filmRate);
        const mvxmediatypes::TickTime t = inRequested.GetTime();
        outConformed = MF::FrameTime(filmRate.IsZero() ? t : t.AlignToFrame(filmRate));
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        const Mapping mapping = Map(inTime, inParams);
        mUpstream->CollectPrefetches(mapping.mCurrent, inParams, ioPrefetches);
        if (mapping.mSplit)
            mUpstream->CollectPrefetches(mapping.mPrevious, inParams, ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const Mapping mapping = Map(inTime, inParams);
        const FrameRef current = RenderUpstream(mUpstream, mapping.mCurrent, inParams);
        if (!mapping.mSplit || !current)
        {
            outFrame = current;
            return;
        }
        const FrameRef previous = RenderUpstream(mUpstream, mapping.mPrevious, inParams);
        if (!previous)
            return;

        const auto quality = static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality);
        if (current->GetPixelFormat().IsFieldByField())
        {
            CutlistRenderParams params = inParams;
            const QRT::ParamRect bounds = current->GetBounds();
            params.mWidth = static_cast<std::uint32_t>(bounds.Width());
            params.mHeight = static_cast<std::uint32_t>(bounds.Height());
            params.mPixelAspectRatio = current->GetPixelAspectRatio();
            FrameRef merged = CreateFrameForParams(params, current);
            const bool tall = bounds.Height() > kStandardDefinitionMaxRows;
            ThrowIfFailed(CopyFieldIntoSlot(tall ? previous : current, kSecondSlot, merged,
                                            kSecondSlot, params.mQuality));
            ThrowIfFailed(CopyFieldIntoSlot(tall ? current : previous, kFirstSlot, merged,
                                            kFirstSlot, params.mQuality));
            outFrame = merged;
            return;
        }
        FrameRef merged = VF::MakeWriteableVideoFrame(current, quality);
        if (VF::VideoFrameManipulators::MergePulldownFrames(merged, previous) < 0)
            return;
        merged->SetFieldType(mvxmediatypes::kFieldType_Progressive);
        outFrame = merged;
    }

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) override
    {
        mUpstream->GetFrameRate(outRate);
        if (!outRate.IsZero())
            outRate = outRate * 4 / 5;
    }

    void GetFieldRate(mvxmediatypes::FrameRate& outRate) override { GetFrameRate(outRate); }

private:
    // The upstream frames that hold one film frame.
    struct Mapping
    {
        MF::FrameTime mCurrent;
        MF::FrameTime mPrevious;
        bool mSplit = false;
    };

    Mapping Map(const MF::FrameTime& inTime, const CutlistRenderParams& inParams)
    {
        mvxmediatypes::FrameRate videoRate;
        mUpstream->GetFrameRate(videoRate);
        MVX_INPUT_CONTRACT(!videoRate.IsZero());
        Mapping mapping;
        const mvxmediatypes::TickTime m = mvxmediatypes::MapPulldownFrameTo2997Frame(
            inTime.GetSecondFieldTime(), videoRate, mCadence, mapping.mSplit);
        mapping.mCurrent = ConformUpstream(mUpstream, MF::FrameTime(m), inParams);
        if (mapping.mSplit)
            mapping.mPrevious = ConformUpstream(
                mUpstream, MF::FrameTime(m - videoRate.GetFrameDuration()), inParams);
        return mapping;
    }

    const QRT::InterfaceRef<IRenderableSource> mUpstream;
    const mvxmediatypes::PulldownCadence mCadence;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
RemovePulldownFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource,
                         mvxmediatypes::PulldownCadence inCadence)
{
    return QRT::Allocated<RenderableSourcePulldownRemoval>::Create<IRenderableSource>(inSource,
                                                                                      inCadence);
}

} // namespace ML
