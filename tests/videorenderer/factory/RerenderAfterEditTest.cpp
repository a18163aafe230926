// Re-rendering after an edit: with the shared frame cache, only the frames
// of segments that the edited clip takes part in are produced again.

#include "BE/TimelineFile.h"
#include "ML/CutlistRenderer.h"
#include "QRT/Allocated.h"
#include "VF/SharedVideoFrameCache.h"
#include "factory/CutlistFactory.h"

#include <string>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;

// Forwards to a producer and counts the frames it is asked to produce.
class CountingProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    CountingProducer(QRT::InterfaceRef<IRenderableNodeProducer> inInner, int& ioCount)
        : mInner(std::move(inInner))
        , mCount(ioCount)
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        ++mCount;
        return mInner->ProduceFrame(inTime, inParams, outFrame);
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override
    {
        mInner->GetFrameHash(outHash, inTime, inParams);
    }

private:
    const QRT::InterfaceRef<IRenderableNodeProducer> mInner;
    int& mCount;
};

// Ten seconds at 25 frames per second on three tracks: A under everything,
// B and C on the second track, D on the third. C plays at inSpeedOfC.
BE::SequenceRef TenSeconds(const std::string& inSpeedOfC)
{
    const auto item = [](const char* inStart, const char* inEnd, const std::string& inClip = "{}")
    {
        return std::string(R"({"start": )") + inStart + R"(, "end": )" + inEnd +
               R"(, "media": {"pattern": "pattern:moving?size=48x27"}, "clip": )" + inClip + "}";
    };
    const std::string text =
        R"({"sequences": [{"name": "Edit", "size": [48, 27], "tracks": [{"items": [)" +
        item("0", "10") + R"(]}, {"items": [)" + item("2", "5") + "," +
        item("6", "9", R"({"speed": )" + inSpeedOfC + "}") + R"(]}, {"items": [)" +
        item("4", "8", R"({"in": 1})") + "]}]}]}";
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(text, "edit.json", ".");
    EXPECT_EQ(loaded.mError, "");
    return loaded.mMain;
}

// Renders every frame through the shared cache; answers the frames produced.
int RenderAll(const BE::SequenceRef& inSequence)
{
    QRT::InterfaceRef<MF::IRenderableCutlist> cutlist;
    EXPECT_EQ(CreateCutlistFactory()->CreateSequenceCutlist(inSequence, {}, cutlist),
              QRT::kResult_Success);
    int produced = 0;
    for (std::int64_t frame = 0; frame < 250; ++frame)
    {
        CutlistRenderParams params;
        params.SetFrameTime(
            MF::FrameTime::Make(mt::TickTime::FromFrame(frame, mt::kFrameRate_Video25),
                                mt::kFieldType_Progressive, mt::kTime_Zero));
        params.mWidth = params.mFullFrameWidth = 48;
        params.mHeight = params.mFullFrameHeight = 27;
        params.mPixelFormat = mt::kPixelFormat_BGRA_4444_8u;
        params.mQuality = params.mSecondaryQuality = 4;
        params.mFrameRate = mt::kFrameRate_Video25;
        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        MF::FrameTime local;
        EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(cutlist, params, producer, local),
                  QRT::kResult_Success);
        EXPECT_TRUE(producer) << frame;
        const auto counting =
            QRT::Allocated<CountingProducer>::Create<IRenderableNodeProducer>(producer, produced);
        EXPECT_TRUE(CutlistRenderer::RenderFrameFromCutlist(counting, params, local,
                                                            {params.mPixelFormat}, true))
            << frame;
    }
    return produced;
}

TEST(RerenderAfterEdit, OnlyTheSegmentsOfTheEditedClipAreProducedAgain)
{
    VF::SharedVideoFrameCache::Clear();
    EXPECT_EQ(RenderAll(TenSeconds("1")), 250);
    // Unchanged, nothing is produced again.
    EXPECT_EQ(RenderAll(TenSeconds("1")), 0);
    // C covers [6 s, 9 s): its two segments (with D and A, then with A) are
    // produced again, 75 frames; the other 175 come from the cache.
    EXPECT_EQ(RenderAll(TenSeconds("0.5")), 75);
}

} // namespace
} // namespace ML
