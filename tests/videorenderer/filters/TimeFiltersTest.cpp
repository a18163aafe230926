// Time mix and time blend: field-exact mixing of upstream fields, the
// weighted sums of frame blending at speeds 0.5 and 2.5, and the cases that
// hand the upstream frame through untouched.

#include "FilterTestSources.h"
#include "MF/TimeTransform.h"
#include "ML/RenderableSourceFilters.h"

#include <cmath>

#include <gtest/gtest.h>

namespace
{

using namespace FilterTest;
using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;

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
    static constexpr std::uint32_t kWidth = 4;
    static constexpr std::uint32_t kHeight = 6;

    static FrameRef Render(const SourceRef& inSource, const MF::FrameTime& inTime,
                           const ML::CutlistRenderParams& inParams)
    {
        FrameRef frame;
        inSource->RenderFrame(inTime, inParams, frame);
        return frame;
    }

    static MF::FrameTime Conform(const SourceRef& inSource, const MF::FrameTime& inTime,
                                 const ML::CutlistRenderParams& inParams)
    {
        MF::FrameTime conformed;
        inSource->ConformFrameTime(inTime, inParams, conformed);
        return conformed;
    }

    static void ExpectRows(const FrameRef& inFrame, Pixel inFirstSlot, Pixel inSecondSlot,
                           int inTolerance = 0)
    {
        ASSERT_TRUE(inFrame);
        for (std::int32_t y = 0; y < static_cast<std::int32_t>(kHeight); ++y)
            for (std::int32_t x = 0; x < static_cast<std::int32_t>(kWidth); ++x)
            {
                const Pixel got = ReadPixel(*inFrame, x, y);
                const Pixel want = y % 2 == 0 ? inFirstSlot : inSecondSlot;
                ASSERT_LE(std::abs(got.mB - want.mB), inTolerance) << "row " << y;
                ASSERT_LE(std::abs(got.mG - want.mG), inTolerance) << "row " << y;
                ASSERT_LE(std::abs(got.mR - want.mR), inTolerance) << "row " << y;
                ASSERT_LE(std::abs(got.mA - want.mA), inTolerance) << "row " << y;
            }
    }

    static TickTime F(std::int64_t inFields) { return Ticks(inFields * kField); }

    static SourceRef Blend(const SourceRef& inUpstream, double inRate)
    {
        return ML::TimeBlendSource(inUpstream, MF::CreateTimeTransform(inRate), inRate);
    }

    const ML::CutlistRenderParams mParams = MakeParams(kWidth, kHeight);
};

TEST_F(TimeFiltersTest, TimeMixOfARequestUpstreamDeliversReturnsTheUpstreamFrameObject)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef mix = ML::TimeMixSource(upper);
    const MF::FrameTime request(F(6), F(7));
    EXPECT_EQ(Conform(mix, request, mParams), request);
    const FrameRef frame = Render(mix, request, mParams);
    EXPECT_TRUE(frame == upper->LastFrame());
    mvxmediatypes::FrameRate rate;
    mix->GetFrameRate(rate);
    EXPECT_EQ(rate, mvxmediatypes::kFrameRate_Video5994);
}

TEST_F(TimeFiltersTest, TimeMixTakesEachFieldFromTheUpstreamFieldAtItsTimeInBothOrders)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef mix = ML::TimeMixSource(upper);
    // The request straddles upstream frames 3 (fields 6, 7) and 4 (fields 8, 9).
    const MF::FrameTime upperFirst(F(7), F(8));
    ExpectRows(Render(mix, upperFirst, mParams), Marker(F(7), 2), Marker(F(8), 1));
    const MF::FrameTime lowerFirst(F(8), F(7));
    ExpectRows(Render(mix, lowerFirst, mParams), Marker(F(8), 1), Marker(F(7), 2));

    // Prefetches: the frame for the second time, then the one for the first.
    ML::RenderableNodePrefetchList prefetches;
    mix->CollectPrefetches(upperFirst, mParams, prefetches);
    ASSERT_EQ(upper->Prefetched().size(), 2u);
    EXPECT_EQ(upper->Prefetched()[0], MF::FrameTime(F(8), F(9)));
    EXPECT_EQ(upper->Prefetched()[1], MF::FrameTime(F(6), F(7)));

    // Times off the field grid are aligned down to it.
    EXPECT_EQ(Conform(mix, MF::FrameTime(F(7) + Ticks(5), F(8) + Ticks(5)), mParams), upperFirst);
}

TEST_F(TimeFiltersTest, TimeMixOfAProgressiveRequestInsideOneInterlacedFrameKeepsTheFieldAtItsTime)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef mix = ML::TimeMixSource(upper);
    const FrameRef frame = Render(mix, MF::FrameTime(F(7)), mParams);
    ExpectRows(frame, Marker(F(7), 2), Marker(F(7), 2));
    EXPECT_EQ(upper->Rendered().size(), 1u);
    ExpectRows(Render(mix, MF::FrameTime(F(6)), mParams), Marker(F(6), 1), Marker(F(6), 1));
}

TEST_F(TimeFiltersTest, TimeMixOfProgressiveMaterialOffItsGridKeepsTheWholeFrame)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef mix = ML::TimeMixSource(progressive);
    const FrameRef frame = Render(mix, MF::FrameTime(F(7)), mParams);
    EXPECT_TRUE(frame == progressive->LastFrame());
    ExpectRows(frame, Marker(F(6), 1), Marker(F(6), 2));
}

TEST_F(TimeFiltersTest, TimeMixAtDraftQualityForTheSecondFieldConformsToItsProgressiveTime)
{
    auto follow = MakeMarkedSource(Delivery::kFollowRequest);
    const SourceRef mix = ML::TimeMixSource(follow);
    ML::CutlistRenderParams params = mParams;
    params.mQuality = 2;
    params.mSingleField = 2;
    EXPECT_EQ(Conform(mix, MF::FrameTime(F(6), F(7)), params), MF::FrameTime(F(7)));
    params.mSingleField = 1;
    EXPECT_EQ(Conform(mix, MF::FrameTime(F(6), F(7)), params), MF::FrameTime(F(6)));
    params.mQuality = 3;
    EXPECT_EQ(Conform(mix, MF::FrameTime(F(6), F(7)), params), MF::FrameTime(F(6), F(7)));
}

TEST_F(TimeFiltersTest, TimeBlendAtSpeedOneOnTheGridReturnsTheUpstreamFrameUnblended)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 1.0);
    const FrameRef frame = Render(blend, MF::FrameTime(F(6), F(7)), mParams);
    EXPECT_TRUE(frame == upper->LastFrame());
    mvxmediatypes::FrameRate rate;
    blend->GetFrameRate(rate);
    EXPECT_EQ(rate, mvxmediatypes::kFrameRate_Video1000);
}

TEST_F(TimeFiltersTest, TimeBlendAtHalfSpeedBlendsTheTwoFieldsAroundEachOutputField)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 0.5);
    // Output fields at 6.25 and 6.75 upstream fields: both between fields 6 and 7.
    const MF::FrameTime request(Ticks(6 * kField + kField / 4), Ticks(6 * kField + 3 * kField / 4));
    EXPECT_EQ(Conform(blend, request, mParams), request);
    const FrameRef frame = Render(blend, request, mParams);
    const Pixel six = Marker(F(6), 1);
    const Pixel seven = Marker(F(7), 2);
    ExpectRows(frame, WeightedSum({{0.75, six}, {0.25, seven}}),
               WeightedSum({{0.25, six}, {0.75, seven}}), 1);
    // Four samples, one upstream frame holds them all: rendered once.
    EXPECT_EQ(upper->Rendered().size(), 1u);

    // Between two upstream frames: fields 7.5 and 8.
    const MF::FrameTime straddling(Ticks(7 * kField + kField / 2), F(8));
    ExpectRows(Render(blend, straddling, mParams),
               WeightedSum({{0.5, seven}, {0.5, Marker(F(8), 1)}}), Marker(F(8), 1), 1);
    ML::RenderableNodePrefetchList prefetches;
    blend->CollectPrefetches(straddling, mParams, prefetches);
    ASSERT_EQ(upper->Prefetched().size(), 2u);
    EXPECT_EQ(upper->Prefetched()[0], MF::FrameTime(F(6), F(7)));
    EXPECT_EQ(upper->Prefetched()[1], MF::FrameTime(F(8), F(9)));
}

TEST_F(TimeFiltersTest, TimeBlendOfAProgressiveRequestBlendsTheFramesAroundItsSecondTime)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef blend = Blend(progressive, 0.5);
    const MF::FrameTime request(Ticks(3 * kFrame + kFrame / 4));
    const FrameRef frame = Render(blend, request, mParams);
    const TickTime three = Ticks(3 * kFrame);
    const TickTime four = Ticks(4 * kFrame);
    ExpectRows(frame, WeightedSum({{0.75, Marker(three, 1)}, {0.25, Marker(four, 1)}}),
               WeightedSum({{0.75, Marker(three, 2)}, {0.25, Marker(four, 2)}}), 1);
}

TEST_F(TimeFiltersTest, TimeBlendAtTwoAndAHalfAccumulatesEveryFieldInEachOutputFieldsSpan)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 2.5);
    // Fields 6 and 8.5: spans [6, 8.5) and [8.5, 11) of upstream fields.
    const MF::FrameTime request(F(6), Ticks(8 * kField + kField / 2));
    const FrameRef frame = Render(blend, request, mParams);
    ExpectRows(
        frame,
        WeightedSum({{0.4, Marker(F(6), 1)}, {0.4, Marker(F(7), 2)}, {0.2, Marker(F(8), 1)}}),
        WeightedSum({{0.2, Marker(F(8), 1)}, {0.4, Marker(F(9), 2)}, {0.4, Marker(F(10), 1)}}), 1);
    // Upstream frames 3, 4 and 5, each once.
    ASSERT_EQ(upper->Rendered().size(), 3u);
    EXPECT_EQ(upper->Rendered()[0], MF::FrameTime(F(6), F(7)));
    EXPECT_EQ(upper->Rendered()[1], MF::FrameTime(F(8), F(9)));
    EXPECT_EQ(upper->Rendered()[2], MF::FrameTime(F(10), F(11)));
    ML::RenderableNodePrefetchList prefetches;
    blend->CollectPrefetches(request, mParams, prefetches);
    EXPECT_EQ(upper->Prefetched(), upper->Rendered());
}

TEST_F(TimeFiltersTest, TimeBlendBelowQualityThreeBehavesAsTimeMix)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef blend = Blend(upper, 0.5);
    const SourceRef mix = ML::TimeMixSource(upper);
    ML::CutlistRenderParams params = mParams;
    params.mQuality = 2;
    const MF::FrameTime request(F(7) + Ticks(11), F(8) + Ticks(11));
    EXPECT_EQ(Conform(blend, request, params), Conform(mix, request, params));
    const MF::FrameTime onGrid(F(7), F(8));
    const FrameRef blended = Render(blend, onGrid, params);
    ExpectRows(blended, Marker(F(7), 2), Marker(F(8), 1));
    const FrameRef mixed = Render(mix, onGrid, params);
    ExpectRows(mixed, Marker(F(7), 2), Marker(F(8), 1));
}

} // namespace
