// Field and interlace filters: which upstream field and time every output row
// comes from, the times passed upstream, and the pass-through cases.

#include "FilterTestSources.h"
#include "ML/RenderableSourceFilters.h"
#include "QRT/Exception.h"
#include "VF/VideoFrameManipulators.h"
#include "sources/FieldFilterSteps.h"

#include <thread>

#include <gtest/gtest.h>

namespace
{

using namespace FilterTest;
using ML::IRenderableSource;
using SourceRef = QRT::InterfaceRef<IRenderableSource>;

class FieldFiltersTest : public ::testing::Test
{
protected:
    static constexpr std::uint32_t kWidth = 4;
    static constexpr std::uint32_t kHeight = 6;

    // Every row of inFrame holds Marker(time of its row's slot).
    static void ExpectRows(const FrameRef& inFrame, Pixel inFirstSlot, Pixel inSecondSlot)
    {
        ASSERT_TRUE(inFrame);
        const QRT::ParamRect bounds = inFrame->GetBounds();
        for (std::int32_t y = 0; y < bounds.Height(); ++y)
            for (std::int32_t x = 0; x < bounds.Width(); ++x)
                ASSERT_EQ(ReadPixel(*inFrame, x, y), y % 2 == 0 ? inFirstSlot : inSecondSlot)
                    << "row " << y << " column " << x;
    }

    static MF::FrameTime Conform(const SourceRef& inSource, const MF::FrameTime& inTime,
                                 const ML::CutlistRenderParams& inParams)
    {
        MF::FrameTime conformed;
        inSource->ConformFrameTime(inTime, inParams, conformed);
        return conformed;
    }

    static FrameRef Render(const SourceRef& inSource, const MF::FrameTime& inTime,
                           const ML::CutlistRenderParams& inParams)
    {
        FrameRef frame;
        inSource->RenderFrame(inTime, inParams, frame);
        return frame;
    }

    const ML::CutlistRenderParams mParams = MakeParams(kWidth, kHeight);
    const TickTime mT = Ticks(3 * kFrame);
    const TickTime mTField = Ticks(3 * kFrame + kField);
};

TEST_F(FieldFiltersTest, DeinterlaceOfProgressiveUpstreamReturnsTheUpstreamFrameObject)
{
    auto upstream = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef filter = ML::DeinterlaceSource(upstream);
    const FrameRef frame = Render(filter, MF::FrameTime(mT), mParams);
    EXPECT_TRUE(frame == upstream->LastFrame());
    ExpectRows(frame, Marker(mT, 1), Marker(mT, 2));
}

TEST_F(FieldFiltersTest, DeinterlaceKeepsTheFieldAtTheRequestedTimeInBothOrders)
{
    for (const std::uint32_t quality : {1u, 4u})
    {
        ML::CutlistRenderParams params = mParams;
        params.mSecondaryQuality = quality;
        // Upper first: the requested time lies in slot 1.
        auto upper = MakeMarkedSource(Delivery::kUpperFirst);
        const SourceRef upperFilter = ML::DeinterlaceSource(upper);
        EXPECT_EQ(Conform(upperFilter, MF::FrameTime(mT + Ticks(5)), params), MF::FrameTime(mT));
        FrameRef frame = Render(upperFilter, MF::FrameTime(mT), params);
        ExpectRows(frame, Marker(mT, 1), Marker(mT, 1));
        EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_Progressive);
        EXPECT_EQ(upper->Rendered().at(0), MF::FrameTime(mT, mTField));

        // Lower first: the requested time lies in slot 2.
        auto lower = MakeMarkedSource(Delivery::kLowerFirst);
        const SourceRef lowerFilter = ML::DeinterlaceSource(lower);
        frame = Render(lowerFilter, MF::FrameTime(mT), params);
        ExpectRows(frame, Marker(mT, 2), Marker(mT, 2));
        EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_Progressive);
    }
}

TEST_F(FieldFiltersTest, DeinterlaceOfAnInterlacedRequestKeepsTheFieldOfItsSecondTime)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef filter = ML::DeinterlaceSource(upper);
    ExpectRows(Render(filter, MF::FrameTime(mT, mTField), mParams), Marker(mTField, 2),
               Marker(mTField, 2));
    mvxmediatypes::FrameRate fieldRate;
    filter->GetFieldRate(fieldRate);
    EXPECT_EQ(fieldRate, mvxmediatypes::kFrameRate_Video2997);
    ML::RenderableNodePrefetchList prefetches;
    filter->CollectPrefetches(MF::FrameTime(mT + Ticks(9)), mParams, prefetches);
    EXPECT_EQ(upper->Prefetched().at(0), MF::FrameTime(mT, mTField));
}

TEST_F(FieldFiltersTest, DeinterlaceStepTakesOneFieldOfATwiceTallFieldByFieldFrame)
{
    // The frame is stored fields apart and is twice the requested height:
    // its kept field goes straight into a frame of the requested height.
    const FrameRef marked = MakeFrame(kWidth, 2 * kHeight,
                                      [&](std::int32_t, std::int32_t inY) {
                                          return inY % 2 == 0 ? Marker(mT, 1) : Marker(mTField, 2);
                                      });
    FrameRef fields =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields, kWidth, 2 * kHeight,
                             mvxmediatypes::kPixelAspectRatio_Square, false, false);
    ASSERT_GE(
        VF::VideoFrameManipulators::CopyFrame(marked, fields, mvxmediatypes::kRenderQuality_High),
        0);
    fields->SetFieldType(mvxmediatypes::kFieldType_UpperFirst);

    ML::CutlistRenderParams params = mParams;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields;
    for (const bool keepSecond : {false, true})
    {
        const FrameRef result =
            ML::FieldFilterSteps::DeinterlaceKeepingField(fields, params, keepSecond);
        ASSERT_TRUE(result);
        EXPECT_EQ(result->GetBounds(), QRT::ParamRect(0, 0, kWidth, kHeight));
        EXPECT_EQ(result->GetPixelFormat(), mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields);
        EXPECT_EQ(result->GetFieldType(), mvxmediatypes::kFieldType_Progressive);
        // Compared in the same format: the kept field's marker in every row.
        const Pixel kept = keepSecond ? Marker(mTField, 2) : Marker(mT, 1);
        FrameRef expected =
            VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_YUYV_422_8u_Fields, kWidth, kHeight,
                                 mvxmediatypes::kPixelAspectRatio_Square, false, false);
        ASSERT_GE(VF::VideoFrameManipulators::CopyFrame(
                      MakeFrame(kWidth, kHeight, [&](std::int32_t, std::int32_t) { return kept; }),
                      expected, mvxmediatypes::kRenderQuality_High),
                  0);
        // Read back in BGRA (row padding is not picture).
        const auto toBGRA = [&](const FrameRef& inFrame)
        {
            FrameRef bgra =
                MakeFrame(kWidth, kHeight, [](std::int32_t, std::int32_t) { return Pixel{}; });
            EXPECT_GE(VF::VideoFrameManipulators::CopyFrame(inFrame, bgra,
                                                            mvxmediatypes::kRenderQuality_High),
                      0);
            return bgra;
        };
        const FrameRef got = toBGRA(result);
        const FrameRef want = toBGRA(expected);
        for (std::int32_t y = 0; y < static_cast<std::int32_t>(kHeight); ++y)
            for (std::int32_t x = 0; x < static_cast<std::int32_t>(kWidth); ++x)
                EXPECT_EQ(ReadPixel(*got, x, y), ReadPixel(*want, x, y))
                    << "keep second " << keepSecond;
    }
}

TEST_F(FieldFiltersTest, FieldReverseSwapsTheFieldsOfTheFrameAtTheSwappedTime)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef filter = ML::FieldReverseSource(upper);
    const MF::FrameTime lowerFirst(mTField, mT);
    EXPECT_EQ(Conform(filter, lowerFirst, mParams), lowerFirst);

    const FrameRef frame = Render(filter, lowerFirst, mParams);
    EXPECT_EQ(upper->Rendered().at(0), MF::FrameTime(mT, mTField));
    // Each slot now holds the time the request gave it, from the other slot upstream.
    ExpectRows(frame, Marker(mTField, 2), Marker(mT, 1));
    EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_LowerFirst);
    // The upstream frame is left as it was.
    ExpectRows(upper->LastFrame(), Marker(mT, 1), Marker(mTField, 2));

    ML::RenderableNodePrefetchList prefetches;
    filter->CollectPrefetches(lowerFirst, mParams, prefetches);
    EXPECT_EQ(upper->Prefetched().at(0), lowerFirst.Swapped());

    // The other way round: an upper-first request over lower-first material.
    auto lower = MakeMarkedSource(Delivery::kLowerFirst);
    const SourceRef lowerFilter = ML::FieldReverseSource(lower);
    const FrameRef reversed = Render(lowerFilter, MF::FrameTime(mT, mTField), mParams);
    ExpectRows(reversed, Marker(mT, 2), Marker(mTField, 1));
    EXPECT_EQ(reversed->GetFieldType(), mvxmediatypes::kFieldType_UpperFirst);
}

TEST_F(FieldFiltersTest, FieldReverseOfAProgressiveRequestReturnsTheUpstreamFrameUntouched)
{
    auto follow = MakeMarkedSource(Delivery::kFollowRequest);
    const SourceRef filter = ML::FieldReverseSource(follow);
    const FrameRef frame = Render(filter, MF::FrameTime(mTField), mParams);
    EXPECT_TRUE(frame == follow->LastFrame());
    ExpectRows(frame, Marker(mTField, 1), Marker(mTField, 2));
}

TEST_F(FieldFiltersTest, ReverseFieldDominanceSwapsTimesOnlyAndNeverPixels)
{
    auto follow = MakeMarkedSource(Delivery::kFollowRequest);
    const SourceRef filter = ML::ReverseFieldDominanceOfSource(follow);
    const MF::FrameTime upperFirst(mT, mTField);
    // Upstream follows the swapped (lower first) request; the answer is swapped back.
    EXPECT_EQ(Conform(filter, upperFirst, mParams), upperFirst);
    const FrameRef frame = Render(filter, upperFirst, mParams);
    EXPECT_TRUE(frame == follow->LastFrame());
    EXPECT_EQ(follow->Rendered().at(0), upperFirst.Swapped());
    ExpectRows(frame, Marker(mTField, 1), Marker(mT, 2));

    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef fixedFilter = ML::ReverseFieldDominanceOfSource(upper);
    EXPECT_EQ(Conform(fixedFilter, upperFirst, mParams), MF::FrameTime(mTField, mT));
    ML::RenderableNodePrefetchList prefetches;
    fixedFilter->CollectPrefetches(upperFirst, mParams, prefetches);
    EXPECT_EQ(upper->Prefetched().at(0), upperFirst.Swapped());
}

TEST_F(FieldFiltersTest, InterlaceConsecutiveTakesEachFieldFromTheUpstreamFrameAtTwiceItsTime)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef filter = ML::InterlaceConsecutiveFramesFromSource(progressive);
    mvxmediatypes::FrameRate fieldRate;
    filter->GetFieldRate(fieldRate);
    EXPECT_EQ(fieldRate, mvxmediatypes::kFrameRate_Video5994);

    // Output frame 2 (fields at 2F and 2F + F/2) comes from upstream frames 4 and 5.
    const TickTime t = Ticks(2 * kFrame);
    const TickTime tHalf = Ticks(2 * kFrame + kField);
    const TickTime four = Ticks(4 * kFrame);
    const TickTime five = Ticks(5 * kFrame);
    ExpectRows(Render(filter, MF::FrameTime(t, tHalf), mParams), Marker(four, 1), Marker(five, 2));
    // Lower first: slot 1 holds the later field.
    ExpectRows(Render(filter, MF::FrameTime(tHalf, t), mParams), Marker(five, 1), Marker(four, 2));

    EXPECT_EQ(Conform(filter, MF::FrameTime(tHalf + Ticks(3)), mParams), MF::FrameTime(tHalf));
    EXPECT_EQ(Conform(filter, MF::FrameTime(tHalf + Ticks(3), t + Ticks(3)), mParams),
              MF::FrameTime(tHalf, t));
    EXPECT_EQ(Conform(filter, MF::FrameTime(t + Ticks(3), tHalf + Ticks(3)), mParams),
              MF::FrameTime(t, tHalf));
}

TEST_F(FieldFiltersTest, InterlaceConsecutivePrefetchesOnceWhenBothFieldsShareAnUpstreamFrame)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef filter = ML::InterlaceConsecutiveFramesFromSource(progressive);
    ML::RenderableNodePrefetchList prefetches;
    filter->CollectPrefetches(MF::FrameTime(Ticks(2 * kFrame), Ticks(2 * kFrame + kField)), mParams,
                              prefetches);
    ASSERT_EQ(progressive->Prefetched().size(), 2u);
    EXPECT_EQ(progressive->Prefetched()[0], MF::FrameTime(Ticks(4 * kFrame)));
    EXPECT_EQ(progressive->Prefetched()[1], MF::FrameTime(Ticks(5 * kFrame)));

    filter->CollectPrefetches(MF::FrameTime(Ticks(2 * kFrame)), mParams, prefetches);
    EXPECT_EQ(progressive->Prefetched().size(), 3u);
    // A progressive request on one upstream frame is that frame.
    const FrameRef frame = Render(filter, MF::FrameTime(Ticks(2 * kFrame)), mParams);
    EXPECT_TRUE(frame == progressive->LastFrame());
    EXPECT_EQ(progressive->Rendered().size(), 1u);
}

TEST_F(FieldFiltersTest, RemoveFlickerFiltersRowsOneTwoOneIntoAProgressiveFrame)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef filter = ML::RemoveFlickerFromSource(upper);
    EXPECT_EQ(Conform(filter, MF::FrameTime(mTField + Ticks(1)), mParams), MF::FrameTime(mT));
    const FrameRef frame = Render(filter, MF::FrameTime(mT), mParams);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetFieldType(), mvxmediatypes::kFieldType_Progressive);
    const Pixel a = Marker(mT, 1);
    const Pixel b = Marker(mTField, 2);
    const auto mix = [](int inA, int inB, int inC)
    { return static_cast<std::uint8_t>((inA + 2 * inB + inC + 2) / 4); };
    const auto expected = [&](const Pixel& inAbove, const Pixel& inAt, const Pixel& inBelow)
    {
        return Pixel{mix(inAbove.mB, inAt.mB, inBelow.mB), mix(inAbove.mG, inAt.mG, inBelow.mG),
                     mix(inAbove.mR, inAt.mR, inBelow.mR), 255};
    };
    EXPECT_EQ(ReadPixel(*frame, 0, 0), expected(a, a, b));
    EXPECT_EQ(ReadPixel(*frame, 1, 2), expected(b, a, b));
    EXPECT_EQ(ReadPixel(*frame, 2, 3), expected(a, b, a));
    EXPECT_EQ(ReadPixel(*frame, 3, kHeight - 1), expected(a, b, b));
    mvxmediatypes::FrameRate fieldRate;
    filter->GetFieldRate(fieldRate);
    EXPECT_EQ(fieldRate, mvxmediatypes::kFrameRate_Video2997);
}

TEST_F(FieldFiltersTest, EmptyUpstreamRaisesNullInterfaceAtFirstUse)
{
    const SourceRef filters[] = {ML::DeinterlaceSource(nullptr), ML::FieldReverseSource(nullptr),
                                 ML::ReverseFieldDominanceOfSource(nullptr),
                                 ML::InterlaceConsecutiveFramesFromSource(nullptr),
                                 ML::RemoveFlickerFromSource(nullptr)};
    for (const SourceRef& filter : filters)
    {
        ASSERT_TRUE(filter);
        FrameRef frame;
        EXPECT_THROW(filter->RenderFrame(MF::FrameTime(mT), mParams, frame),
                     QRT::NullInterfaceException);
        mvxmediatypes::FrameRate rate;
        EXPECT_THROW(filter->GetFrameRate(rate), QRT::NullInterfaceException);
    }
}

TEST_F(FieldFiltersTest, AChainRendersTheSameFramesFromManyThreadsAtOnce)
{
    auto lower = MakeMarkedSource(Delivery::kLowerFirst);
    const SourceRef chain = ML::InterlaceConsecutiveFramesFromSource(
        ML::DeinterlaceSource(ML::FieldReverseSource(ML::ReverseFieldDominanceOfSource(lower))));
    const MF::FrameTime request(Ticks(kFrame + kField), Ticks(kFrame));
    const FrameRef reference = Render(chain, request, mParams);
    ASSERT_TRUE(reference);

    std::vector<std::thread> threads;
    std::vector<int> mismatches(4, 0);
    for (int thread = 0; thread < 4; ++thread)
        threads.emplace_back(
            [&, thread]
            {
                for (int round = 0; round < 25; ++round)
                {
                    const FrameRef frame = Render(chain, request, mParams);
                    if (std::memcmp(frame->GetBaseAddress(), reference->GetBaseAddress(),
                                    reference->GetDataSize()) != 0)
                        ++mismatches[thread];
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    for (int thread = 0; thread < 4; ++thread)
        EXPECT_EQ(mismatches[thread], 0) << "thread " << thread;
}

} // namespace
