// Time mix and time blend: field-exact mixing of upstream fields, the
// weighted sums of frame blending at speeds 0.5 and 2.5, and the cases that
// hand the upstream frame through untouched.

#include "../sources/ScriptedSources.h"
#include "MF/TimeTransform.h"
#include "ML/RenderableSourceFilters.h"

#include <cmath>

namespace ML::Test
{
namespace
{

// (weight, marker) pairs summed channel by channel.
Pixel WeightedSum(std::initializer_list<std::pair<double, Pixel>> inParts)
{
    double b = 0, g = 0, r = 0, a = 0;
    for (const auto& [weight, pixel] : inParts)
    {
        b += weight * pixel.mB;
        g += weight * pixel.mG;
        r += weight * pixel.mR;
        a += weight * pixel.mA;
    }
    const auto round = [](double inValue)
    { return static_cast<std::uint8_t>(std::lround(inValue)); };
    return Pixel{round(b), round(g), round(r), round(a)};
}

class TimeFiltersTest : public ::testing::Test
{
protected:
    static TickTime F(std::int64_t inFields) { return Ticks(inFields * kField); }
    static SourceRef Blend(const SourceRef& inUpstream, double inRate)
    {
        return TimeBlendSource(inUpstream, MF::CreateTimeTransform(inRate), inRate);
    }
    std::vector<MF::FrameTime> Prefetches(IRenderableSource& inFilter,
                                          const MarkedSource& inUpstream,
                                          const MF::FrameTime& inTime) const
    {
        RenderableNodePrefetchList prefetches;
        const std::size_t before = inUpstream.Prefetched().size();
        inFilter.CollectPrefetches(inTime, mParams, prefetches);
        const std::vector<MF::FrameTime> all = inUpstream.Prefetched();
        return {all.begin() + static_cast<std::ptrdiff_t>(before), all.end()};
    }

    const CutlistRenderParams mParams = MakeParams(4, 6);
};

TEST_F(TimeFiltersTest, TimeMixTakesEachFieldOrFrameFromUpstreamAtItsTime)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef mix = TimeMixSource(upper);
    EXPECT_TRUE(
        RowsAre(Render(*mix, MF::FrameTime(F(7)), mParams), Marker(F(7), 2), Marker(F(7), 2)));
    EXPECT_TRUE(
        RowsAre(Render(*mix, MF::FrameTime(F(6)), mParams), Marker(F(6), 1), Marker(F(6), 1)));
    // An interlaced request straddling upstream frames 3 (fields 6, 7) and 4 (fields 8, 9).
    const MF::FrameTime upperFirst(F(7), F(8));
    EXPECT_TRUE(RowsAre(Render(*mix, upperFirst, mParams), Marker(F(7), 2), Marker(F(8), 1)));
    EXPECT_TRUE(RowsAre(Render(*mix, MF::FrameTime(F(8), F(7)), mParams), Marker(F(8), 1),
                        Marker(F(7), 2)));
    // Prefetches: the frame for the second time, then the one for the first.
    EXPECT_EQ(Prefetches(*mix, *upper, upperFirst),
              (std::vector{MF::FrameTime(F(8), F(9)), MF::FrameTime(F(6), F(7))}));
    // Times off the field grid are aligned down to it.
    EXPECT_EQ(Conform(*mix, MF::FrameTime(F(7) + Ticks(5), F(8) + Ticks(5)), mParams), upperFirst);
    // A request upstream delivers, also through time blend at speed one on the
    // grid, returns the upstream frame object.
    const SourceRef blend = Blend(upper, 1.0);
    const MF::FrameTime request(F(6), F(7));
    EXPECT_EQ(Conform(*mix, request, mParams), request);
    // Each render comes first: the upstream's last frame is the one it made.
    const FrameRef mixed = Render(*mix, request, mParams);
    EXPECT_TRUE(upper->LastFrame() == mixed);
    const FrameRef blended = Render(*blend, request, mParams);
    EXPECT_TRUE(upper->LastFrame() == blended);
    EXPECT_EQ(RateOf(*mix), mt::kFrameRate_Video5994);
    EXPECT_EQ(RateOf(*blend), mt::kFrameRate_Video1000);
    // Progressive material off its grid keeps the whole frame.
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const FrameRef frame = Render(*TimeMixSource(progressive), MF::FrameTime(F(7)), mParams);
    EXPECT_TRUE(frame == progressive->LastFrame());
    EXPECT_TRUE(RowsAre(frame, Marker(F(6), 1), Marker(F(6), 2)));
}

TEST_F(TimeFiltersTest, TimeMixAtDraftQualityForOneFieldConformsToItsProgressiveTime)
{
    const SourceRef mix = TimeMixSource(MakeMarkedSource(Delivery::kFollowRequest));
    const struct
    {
        std::uint32_t mQuality, mSingleField;
        MF::FrameTime mConformed;
    } cases[] = {{2, 2, MF::FrameTime(F(7))}, {3, 1, MF::FrameTime(F(6), F(7))}};
    for (const auto& c : cases)
    {
        CutlistRenderParams params = MakeParams(4, 6, c.mQuality);
        params.mSingleField = c.mSingleField;
        EXPECT_EQ(Conform(*mix, MF::FrameTime(F(6), F(7)), params), c.mConformed)
            << "quality " << c.mQuality << " single field " << c.mSingleField;
    }
}

TEST_F(TimeFiltersTest, TimeBlendAtHalfSpeedBlendsTheTwoFieldsAroundEachOutputField)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 0.5);
    // Output fields at 6.25 and 6.75 upstream fields: both between fields 6 and 7.
    const MF::FrameTime request(Ticks(6 * kField + kField / 4), Ticks(6 * kField + 3 * kField / 4));
    EXPECT_EQ(Conform(*blend, request, mParams), request);
    const Pixel six = Marker(F(6), 1);
    const Pixel seven = Marker(F(7), 2);
    EXPECT_TRUE(RowsAre(Render(*blend, request, mParams), WeightedSum({{0.75, six}, {0.25, seven}}),
                        WeightedSum({{0.25, six}, {0.75, seven}}), 1));
    // Four samples, one upstream frame holds them all: rendered once.
    EXPECT_EQ(upper->Rendered().size(), 1u);

    // Between two upstream frames: fields 7.5 and 8.
    const MF::FrameTime straddling(Ticks(7 * kField + kField / 2), F(8));
    EXPECT_TRUE(RowsAre(Render(*blend, straddling, mParams),
                        WeightedSum({{0.5, seven}, {0.5, Marker(F(8), 1)}}), Marker(F(8), 1), 1));
    EXPECT_EQ(Prefetches(*blend, *upper, straddling),
              (std::vector{MF::FrameTime(F(6), F(7)), MF::FrameTime(F(8), F(9))}));

    // A progressive request blends the frames around its time; on the upstream grid it is
    // the upstream frame itself, whether the blend mixes codes or linear light.
    auto frames = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef progressive = Blend(frames, 0.5);
    const TickTime three = Ticks(3 * kFrame);
    const TickTime four = Ticks(4 * kFrame);
    EXPECT_TRUE(
        RowsAre(Render(*progressive, MF::FrameTime(Ticks(3 * kFrame + kFrame / 4)), mParams),
                WeightedSum({{0.75, Marker(three, 1)}, {0.25, Marker(four, 1)}}),
                WeightedSum({{0.75, Marker(three, 2)}, {0.25, Marker(four, 2)}}), 1));
    for (std::uint32_t quality : {4u, 5u})
    {
        const FrameRef onGrid =
            Render(*progressive, MF::FrameTime(four), MakeParams(4, 6, quality));
        EXPECT_TRUE(onGrid == frames->LastFrame()) << quality;
        EXPECT_TRUE(RowsAre(onGrid, Marker(four, 1), Marker(four, 2))) << quality;
    }
}

TEST_F(TimeFiltersTest, TimeBlendOfPlanarFramesMixesTheirCodesAndFallsBackToBGRA)
{
    // Progressive 4:2:0 upstream frames blend plane by plane, their codes mixed at every
    // quality (frames 3 and 4: Y 104 and 136, Cb 64, Cr 6 and 8), halves rounded up; on the
    // grid the upstream frame itself is the answer.
    auto frames = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef blend = Blend(frames, 0.5);
    const TickTime four = Ticks(4 * kFrame);
    const struct
    {
        std::int64_t mOffset; // ticks after frame 3
        std::uint32_t mQuality;
        Pixel mExpected; // Y, Cb, Cr as B, G, R
    } cases[] = {{kFrame / 4, 5, {112, 64, 7, 0}},
                 {kFrame / 2, 5, {120, 64, 7, 0}},
                 {3 * kFrame / 4, 3, {128, 64, 8, 0}}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mOffset);
        const CutlistRenderParams params =
            MakeParams(5, 3, c.mQuality, mt::kPixelFormat_YUV_420_8u_Planar);
        EXPECT_TRUE(PlanesAre(Render(*blend, MF::FrameTime(Ticks(3 * kFrame + c.mOffset)), params),
                              c.mExpected));
    }
    const CutlistRenderParams planar = MakeParams(5, 3, 5, mt::kPixelFormat_YUV_420_8u_Planar);
    const FrameRef onGrid = Render(*blend, MF::FrameTime(four), planar);
    EXPECT_TRUE(onGrid == frames->LastFrame());
    EXPECT_TRUE(PlanesAre(onGrid, Marker(four, 1)));

    // Upstream frames that are not 4:2:0 blend into 8-bit BGRA for a 4:2:0 request, the
    // pixels a BGRA request gets.
    const SourceRef interlaced = Blend(MakeMarkedSource(Delivery::kUpperFirst), 0.5);
    const MF::FrameTime between(Ticks(3 * kFrame + kFrame / 4));
    const FrameRef fallback =
        Render(*interlaced, between, MakeParams(4, 6, 5, planar.mPixelFormat));
    const FrameRef asked = Render(*interlaced, between, MakeParams(4, 6, 5));
    ASSERT_TRUE(fallback && asked);
    EXPECT_EQ(fallback->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_TRUE(PixelsAre(fallback, [&](std::int32_t inX, std::int32_t inY)
                          { return ReadPixel(*asked, inX, inY); }));
}

TEST_F(TimeFiltersTest, TimeBlendAtTwoAndAHalfAccumulatesEveryFieldInEachOutputFieldsSpan)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 2.5);
    // Fields 6 and 8.5: spans [6, 8.5) and [8.5, 11) of upstream fields.
    const MF::FrameTime request(F(6), Ticks(8 * kField + kField / 2));
    EXPECT_TRUE(RowsAre(
        Render(*blend, request, mParams),
        WeightedSum({{0.4, Marker(F(6), 1)}, {0.4, Marker(F(7), 2)}, {0.2, Marker(F(8), 1)}}),
        WeightedSum({{0.2, Marker(F(8), 1)}, {0.4, Marker(F(9), 2)}, {0.4, Marker(F(10), 1)}}), 1));
    // Upstream frames 3, 4 and 5, each once, and prefetched the same.
    const std::vector frames{MF::FrameTime(F(6), F(7)), MF::FrameTime(F(8), F(9)),
                             MF::FrameTime(F(10), F(11))};
    EXPECT_EQ(upper->Rendered(), frames);
    EXPECT_EQ(Prefetches(*blend, *upper, request), frames);
}

TEST_F(TimeFiltersTest, TimeBlendBelowQualityThreeBehavesAsTimeMix)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 0.5);
    const SourceRef mix = TimeMixSource(upper);
    const CutlistRenderParams params = MakeParams(4, 6, 2);
    const MF::FrameTime request(F(7) + Ticks(11), F(8) + Ticks(11));
    EXPECT_EQ(Conform(*blend, request, params), Conform(*mix, request, params));
    for (const SourceRef& filter : {blend, mix})
        EXPECT_TRUE(RowsAre(Render(*filter, MF::FrameTime(F(7), F(8)), params), Marker(F(7), 2),
                            Marker(F(8), 1)));
}

} // namespace
} // namespace ML::Test
