// Field and interlace filters: which upstream field and time every output row
// comes from, how deinterlacing rebuilds the dropped field, the times passed
// upstream, and the pass-through cases.

#include "../sources/ScriptedSources.h"
#include "ML/RenderableSourceFilters.h"
#include "sources/FieldFilterSteps.h"

namespace ML::Test
{
namespace
{

class FieldFiltersTest : public ::testing::Test
{
protected:
    static constexpr std::uint32_t kWidth = 4;
    static constexpr std::uint32_t kHeight = 6;

    static MF::FrameTime Prefetched(IRenderableSource& inFilter, const MarkedSource& inUpstream,
                                    const MF::FrameTime& inTime)
    {
        RenderableNodePrefetchList prefetches;
        inFilter.CollectPrefetches(inTime, MakeParams(kWidth, kHeight), prefetches);
        return inUpstream.Prefetched().back();
    }

    const CutlistRenderParams mParams = MakeParams(kWidth, kHeight);
    const TickTime mT = Ticks(3 * kFrame);
    const TickTime mTField = Ticks(3 * kFrame + kField);
};

// Upstream rows carry a gradient (R = 10 * row), so a rebuilt row tells
// interpolation (the mean of the kept rows around it) from line doubling (the
// kept row above, or below at the top edge). The secondary quality decides,
// whatever the quality.
TEST_F(FieldFiltersTest,
       DeinterlaceKeepsTheFieldAtTheRequestedTimeAndRebuildsTheOtherBySecondaryQuality)
{
    const struct
    {
        Delivery mDelivery;
        std::uint32_t mQuality, mSecondaryQuality;
        bool mInterpolated;
    } cases[] = {{Delivery::kUpperFirst, 1, 4, true},
                 {Delivery::kUpperFirst, 4, 1, false},
                 {Delivery::kLowerFirst, 2, 3, true},
                 {Delivery::kLowerFirst, 5, 0, false}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message() << int(c.mDelivery) << c.mQuality << c.mSecondaryQuality);
        CutlistRenderParams params = MakeParams(kWidth, kHeight, c.mQuality);
        params.mSecondaryQuality = c.mSecondaryQuality;
        auto upstream = MakeMarkedSource(c.mDelivery, 0, 0, true);
        const SourceRef filter = DeinterlaceSource(upstream);
        EXPECT_EQ(Conform(*filter, MF::FrameTime(mT + Ticks(5)), params), MF::FrameTime(mT));
        const FrameRef frame = Render(*filter, MF::FrameTime(mT), params);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_Progressive);
        // The requested time is slot 1 of upper-first material, slot 2 of lower-first.
        const std::int32_t keptSlot = c.mDelivery == Delivery::kUpperFirst ? 1 : 2;
        const auto expected = [&](std::int32_t, std::int32_t inY)
        {
            std::int32_t row = inY;
            const bool kept = inY % 2 == keptSlot - 1;
            const bool inside = inY > 0 && inY + 1 < static_cast<std::int32_t>(kHeight);
            if (!kept && !(c.mInterpolated && inside))
                row = inY > 0 ? inY - 1 : inY + 1;
            return GradientMarker(mT, keptSlot, row);
        };
        EXPECT_TRUE(PixelsAre(frame, expected));
    }
    // Progressive frames pass through.
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const FrameRef frame = Render(*DeinterlaceSource(progressive), MF::FrameTime(mT), mParams);
    EXPECT_TRUE(frame == progressive->LastFrame());
}

// Stored fields apart at twice the requested height, the kept field's rows go
// one to one, in order, into a frame of the requested height. At four times
// the height, from quality 3 on each row is the mean of the field's two rows
// it stands for, below it the first of them.
TEST_F(FieldFiltersTest, DeinterlaceStepTakesOneFieldOfATallFieldByFieldFrame)
{
    const auto source = [&](std::int32_t, std::int32_t inY)
    { return inY % 2 == 0 ? GradientMarker(mT, 1, inY) : GradientMarker(mTField, 2, inY); };
    const auto fieldsFormat = mt::kPixelFormat_YUYV_422_8u_Fields;
    const struct
    {
        std::int32_t mMultiple;
        std::uint32_t mQuality;
        std::int32_t mKept;
    } cases[] = {{2, 4, 0}, {2, 4, 1}, {4, 3, 1}, {4, 2, 0}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message() << c.mMultiple << c.mQuality << c.mKept);
        const FrameRef fields =
            Converted(MakeFrame(kWidth, c.mMultiple * kHeight, source), fieldsFormat);
        fields->SetFieldType(mt::kFieldType_UpperFirst);
        const CutlistRenderParams params = MakeParams(kWidth, kHeight, c.mQuality, fieldsFormat);
        const FrameRef result =
            FieldFilterSteps::DeinterlaceKeepingField(fields, params, c.mKept == 1);
        ASSERT_TRUE(result);
        EXPECT_EQ(result->GetBounds(), QRT::ParamRect(0, 0, kWidth, kHeight));
        EXPECT_EQ(result->GetFieldType(), mt::kFieldType_Progressive);
        const bool mean = c.mMultiple == 4 && c.mQuality >= 3;
        const auto expected = [&](std::int32_t inX, std::int32_t inY)
        {
            Pixel pixel = source(inX, c.mMultiple * inY + c.mKept);
            pixel.mR = static_cast<std::uint8_t>(pixel.mR + (mean ? 10 : 0));
            return pixel;
        };
        // Compared after the same round trip through the fields format.
        const FrameRef want =
            Converted(Converted(MakeFrame(kWidth, kHeight, expected), fieldsFormat));
        EXPECT_TRUE(PixelsAre(
            Converted(result),
            [&](std::int32_t inX, std::int32_t inY) { return ReadPixel(*want, inX, inY); }, 4));
    }
}

// Through the filter, an upstream frame two or four times the requested
// height gives a frame of the requested size whose rows are the kept field's
// own rows (at four times every other one, from quality 3 on the mean of two);
// a wider one is narrowed to the requested width. Other heights are still
// deinterlaced at the upstream frame's size.
TEST_F(FieldFiltersTest, DeinterlaceTakesTheFieldOfATallUpstreamFrameAtTheRequestedSize)
{
    const struct
    {
        Delivery mDelivery;
        std::uint32_t mWidths, mHeights, mQuality;
    } cases[] = {{Delivery::kUpperFirst, 1, 2, 4},
                 {Delivery::kLowerFirst, 2, 2, 1},
                 {Delivery::kUpperFirst, 1, 4, 2},
                 {Delivery::kLowerFirst, 1, 4, 3}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message()
                     << int(c.mDelivery) << c.mWidths << c.mHeights << c.mQuality);
        auto upstream =
            MakeMarkedSource(c.mDelivery, c.mWidths * kWidth, c.mHeights * kHeight, true);
        const FrameRef frame = Render(*DeinterlaceSource(upstream), MF::FrameTime(mT),
                                      MakeParams(kWidth, kHeight, c.mQuality));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, kWidth, kHeight));
        EXPECT_EQ(frame->GetFieldType(), kProg);
        const std::int32_t kept = c.mDelivery == Delivery::kUpperFirst ? 1 : 2;
        const bool mean = c.mHeights == 4 && c.mQuality >= 3;
        const auto expected = [&](std::int32_t, std::int32_t inY)
        {
            const auto row = static_cast<std::int32_t>(c.mHeights) * inY + kept - 1;
            return GradientMarker(mT, kept, mean ? row + 1 : row);
        };
        EXPECT_TRUE(PixelsAre(frame, expected));
    }
    auto taller = MakeMarkedSource(Delivery::kUpperFirst, kWidth, 3 * kHeight, true);
    const FrameRef frame = Render(*DeinterlaceSource(taller), MF::FrameTime(mT), mParams);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, kWidth, 3 * kHeight));
}

TEST_F(FieldFiltersTest, FieldReverseSwapsTheFieldsOfTheFrameAtTheSwappedTime)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef filter = FieldReverseSource(upper);
    const MF::FrameTime lowerFirst(mTField, mT);
    EXPECT_EQ(Conform(*filter, lowerFirst, mParams), lowerFirst);
    const FrameRef frame = Render(*filter, lowerFirst, mParams);
    EXPECT_EQ(upper->Rendered().at(0), MF::FrameTime(mT, mTField));
    // Each slot now holds the time the request gave it, from the other slot upstream.
    EXPECT_TRUE(RowsAre(frame, Marker(mTField, 2), Marker(mT, 1)));
    EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_LowerFirst);
    EXPECT_EQ(Prefetched(*filter, *upper, lowerFirst), lowerFirst.Swapped());
    EXPECT_EQ(RateOf(*filter), mt::kFrameRate_Video2997);
    EXPECT_EQ(FieldRateOf(*filter), mt::kFrameRate_Video5994);

    // A progressive request passes the upstream frame untouched.
    auto follow = MakeMarkedSource(Delivery::kFollowRequest);
    const FrameRef progressive =
        Render(*FieldReverseSource(follow), MF::FrameTime(mTField), mParams);
    EXPECT_TRUE(progressive == follow->LastFrame());
}

TEST_F(FieldFiltersTest, ReverseFieldDominanceSwapsTimesOnlyAndNeverPixels)
{
    auto follow = MakeMarkedSource(Delivery::kFollowRequest);
    const SourceRef filter = ReverseFieldDominanceOfSource(follow);
    const MF::FrameTime upperFirst(mT, mTField);
    // Upstream follows the swapped (lower first) request; the answer is swapped back.
    EXPECT_EQ(Conform(*filter, upperFirst, mParams), upperFirst);
    const FrameRef frame = Render(*filter, upperFirst, mParams);
    EXPECT_TRUE(frame == follow->LastFrame());
    EXPECT_EQ(follow->Rendered().at(0), upperFirst.Swapped());
    EXPECT_TRUE(RowsAre(frame, Marker(mTField, 1), Marker(mT, 2)));
    EXPECT_EQ(FieldRateOf(*filter), mt::kFrameRate_Video5994);
}

TEST_F(FieldFiltersTest, InterlaceConsecutiveTakesEachFieldFromTheUpstreamFrameAtTwiceItsTime)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef filter = InterlaceConsecutiveFramesFromSource(progressive);
    EXPECT_EQ(FieldRateOf(*filter), mt::kFrameRate_Video5994);
    // Output frame 2 (fields at 2F and 2F + F/2) comes from upstream frames 4 and 5.
    const TickTime t = Ticks(2 * kFrame);
    const TickTime tHalf = Ticks(2 * kFrame + kField);
    const TickTime four = Ticks(4 * kFrame);
    const TickTime five = Ticks(5 * kFrame);
    EXPECT_TRUE(RowsAre(Render(*filter, MF::FrameTime(t, tHalf), mParams), Marker(four, 1),
                        Marker(five, 2)));
    // Lower first: slot 1 holds the later field.
    EXPECT_TRUE(RowsAre(Render(*filter, MF::FrameTime(tHalf, t), mParams), Marker(five, 1),
                        Marker(four, 2)));
    EXPECT_EQ(Conform(*filter, MF::FrameTime(tHalf + Ticks(3)), mParams), MF::FrameTime(tHalf));
    EXPECT_EQ(Conform(*filter, MF::FrameTime(tHalf + Ticks(3), t + Ticks(3)), mParams),
              MF::FrameTime(tHalf, t));

    // Both upstream frames are prefetched; a progressive request on one frame
    // prefetches once and renders that frame itself.
    RenderableNodePrefetchList prefetches;
    filter->CollectPrefetches(MF::FrameTime(t, tHalf), mParams, prefetches);
    filter->CollectPrefetches(MF::FrameTime(t), mParams, prefetches);
    EXPECT_EQ(progressive->Prefetched(),
              (std::vector{MF::FrameTime(four), MF::FrameTime(five), MF::FrameTime(four)}));
    const std::size_t renders = progressive->Rendered().size();
    // Rendered first: the upstream's last frame is the one this render made.
    const FrameRef rendered = Render(*filter, MF::FrameTime(t), mParams);
    EXPECT_TRUE(progressive->LastFrame() == rendered);
    EXPECT_EQ(progressive->Rendered().size(), renders + 1);
}

TEST_F(FieldFiltersTest, RemoveFlickerFiltersRowsOneTwoOneIntoAProgressiveFrame)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef filter = RemoveFlickerFromSource(upper);
    EXPECT_EQ(Conform(*filter, MF::FrameTime(mTField + Ticks(1)), mParams), MF::FrameTime(mT));
    const FrameRef frame = Render(*filter, MF::FrameTime(mT), mParams);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_Progressive);
    const Pixel a = Marker(mT, 1);
    const Pixel b = Marker(mTField, 2);
    const auto mix = [](int inA, int inB, int inC)
    { return static_cast<std::uint8_t>((inA + 2 * inB + inC + 2) / 4); };
    const auto filtered = [&](const Pixel& inAbove, const Pixel& inAt, const Pixel& inBelow)
    {
        return Pixel{mix(inAbove.mB, inAt.mB, inBelow.mB), mix(inAbove.mG, inAt.mG, inBelow.mG),
                     mix(inAbove.mR, inAt.mR, inBelow.mR), 255};
    };
    // Edge rows repeat themselves as their missing neighbour.
    EXPECT_TRUE(PixelsAre(frame,
                          [&](std::int32_t, std::int32_t inY)
                          {
                              const Pixel at = inY % 2 == 0 ? a : b;
                              const Pixel other = inY % 2 == 0 ? b : a;
                              return filtered(inY == 0 ? at : other, at,
                                              inY + 1 == int(kHeight) ? at : other);
                          }));
    EXPECT_EQ(FieldRateOf(*filter), mt::kFrameRate_Video2997);
    EXPECT_EQ(Prefetched(*filter, *upper, MF::FrameTime(mT)), MF::FrameTime(mT, mTField));
}

} // namespace
} // namespace ML::Test
