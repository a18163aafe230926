// Scaler: pass-through of fitting frames, pixel aspect correction, field-correct
// reduction, the nearest-field choice for progressive requests, odd interlaced
// heights, draft renders that keep a full-frame rendering whole, and requests for
// 4:2:0 of 4:2:0 frames.

#include "../sources/ScriptedSources.h"
#include "IR/ImageRenderer.h"
#include "ML/RenderableSourceFilters.h"

namespace ML::Test
{
namespace
{

class ScalerTest : public ::testing::Test
{
protected:
    // Params reducing 1080 rows of 16 columns to inHeight.
    static CutlistRenderParams Reducing(std::uint32_t inHeight, std::uint32_t inQuality = 4)
    {
        CutlistRenderParams params = MakeParams(16, inHeight, inQuality);
        params.mVerticalScale = static_cast<double>(inHeight) / 1080.0;
        params.mFullFrameHeight = 1080;
        return params;
    }

    // Slot-1 rows hold the marker of inTime's first time, slot-2 rows of its second.
    static ::testing::AssertionResult RowsFrom(const FrameRef& inFrame, const MF::FrameTime& inTime)
    {
        return RowsAre(inFrame, Marker(inTime.GetFirstFieldTime(), 1),
                       Marker(inTime.GetSecondFieldTime(), 2));
    }

    const TickTime mT = Ticks(3 * kFrame);
    const TickTime mTField = Ticks(3 * kFrame + kField);
};

TEST_F(ScalerTest, AFrameAlreadyAtTheRequestedBoundsAndRatioPassesUnchanged)
{
    const CutlistRenderParams params = MakeParams(8, 6);
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    // Each render comes first: the upstream's last frame is the one it made.
    const FrameRef fromProgressive =
        Render(*ScaleAndPARCorrectSource(progressive), MF::FrameTime(mT), params);
    EXPECT_TRUE(progressive->LastFrame() == fromProgressive);
    // Interlaced in the requested order passes too.
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const FrameRef fromUpper =
        Render(*ScaleAndPARCorrectSource(upper), MF::FrameTime(mT, mTField), params);
    EXPECT_TRUE(upper->LastFrame() == fromUpper);
}

TEST_F(ScalerTest, Reducing1080iTo576iKeepsEveryFieldsRowsFromTheSameFieldAndEvenHeights)
{
    for (const Delivery delivery : {Delivery::kUpperFirst, Delivery::kLowerFirst})
    {
        auto source = MakeMarkedSource(delivery, 16, 1080);
        const MF::FrameTime request = delivery == Delivery::kUpperFirst
                                          ? MF::FrameTime(mT, mTField)
                                          : MF::FrameTime(mTField, mT);
        const FrameRef frame = Render(*ScaleAndPARCorrectSource(source), request, Reducing(576));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 576));
        EXPECT_EQ(frame->GetFieldType(), request.GetFieldOrder());
        EXPECT_TRUE(RowsFrom(frame, request));
    }
}

TEST_F(ScalerTest, WhileReducingAProgressiveRequestTakesTheNearestFieldAndOrderIsSwapped)
{
    auto upper = MakeMarkedSource(Delivery::kUpperFirst, 16, 1080);
    const SourceRef upperScaler = ScaleAndPARCorrectSource(upper);
    const SourceRef lowerScaler =
        ScaleAndPARCorrectSource(MakeMarkedSource(Delivery::kLowerFirst, 16, 1080));
    const CutlistRenderParams params = Reducing(540);
    // Halfway between the fields: the field before the requested time when
    // it is the second one, else the first.
    const MF::FrameTime halfway(Ticks(3 * kFrame + kField / 2));
    EXPECT_EQ(Conform(*lowerScaler, halfway, params), MF::FrameTime(mT));
    EXPECT_EQ(Conform(*upperScaler, halfway, params), MF::FrameTime(mT));
    const MF::FrameTime nearLater(mTField - Ticks(1));
    EXPECT_EQ(Conform(*upperScaler, nearLater, params), MF::FrameTime(mTField));
    // Without a vertical reduction upstream's answer stands; with one the
    // opposite field order is reported swapped.
    EXPECT_EQ(Conform(*upperScaler, nearLater, MakeParams(16, 1080)), MF::FrameTime(mT, mTField));
    const MF::FrameTime lowerFirst(mTField, mT);
    EXPECT_EQ(Conform(*upperScaler, lowerFirst, Reducing(576)), lowerFirst);
    RenderableNodePrefetchList prefetches;
    upperScaler->CollectPrefetches(lowerFirst, Reducing(576), prefetches);
    EXPECT_EQ(upper->Prefetched().at(0), MF::FrameTime(mT, mTField));
    EXPECT_EQ(FieldRateOf(*upperScaler), mt::kFrameRate_Video5994);

    // Every row comes from the field nearest the requested time.
    for (const auto& [scaler, slot] : {std::pair{upperScaler, 2}, std::pair{lowerScaler, 1}})
    {
        const FrameRef frame = Render(*scaler, MF::FrameTime(mTField), params);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 540));
        EXPECT_TRUE(AllPixelsAre(frame, Marker(mTField, slot)));
    }
}

// Below quality 3 a full-frame rendering delivered at exactly the requested
// time is handed on whole, for the consumer to reduce with the rest of its
// layer; any other case is scaled to the requested size.
TEST_F(ScalerTest, DraftQualityKeepsAFullFrameRenderingAtTheRequestedTimeWhole)
{
    const struct
    {
        std::uint32_t mQuality;
        Delivery mDelivery;
        std::uint32_t mNativeHeight;
        MF::FrameTime mRequest;
        bool mWhole;
    } cases[] = {
        {2, Delivery::kProgressive, 1080, MF::FrameTime(mT), true},
        {0, Delivery::kUpperFirst, 1080, MF::FrameTime(mT, mTField), true},
        {3, Delivery::kProgressive, 1080, MF::FrameTime(mT), false},
        // Not the full frame.
        {2, Delivery::kProgressive, 720, MF::FrameTime(mT), false},
        // Upstream delivers another time than the one requested.
        {2, Delivery::kProgressive, 1080, MF::FrameTime(mT + Ticks(5)), false},
        {2, Delivery::kUpperFirst, 1080, MF::FrameTime(mTField, mT), false},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message() << "case " << &c - cases);
        auto source = MakeMarkedSource(c.mDelivery, 16, c.mNativeHeight);
        const FrameRef frame =
            Render(*ScaleAndPARCorrectSource(source), c.mRequest, Reducing(540, c.mQuality));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame == source->LastFrame(), c.mWhole);
        EXPECT_EQ(frame->GetBounds().Height(), c.mWhole ? 1080 : 540);
    }
}

// A 4:2:0 frame at exactly half its size in both directions has its planes halved
// (from quality 3); converted to BGRA with the source's matrix when the reduced picture
// reads Y'CbCr with the other one (BT.709 from 720 rows). Any other 4:2:0 reduction is
// scaled as BGRA converted with the source's matrix.
TEST_F(ScalerTest, A420FrameAtHalfSizeHasItsPlanesHalvedElseItIsScaledInBGRA)
{
    const Pixel codes = Marker(mT, 1); // Y, Cb, Cr as B, G, R
    // The BGRA pixel of those codes through a matrix.
    const auto bgra = [&](bool inMatrix601)
    {
        const std::uint8_t y[4] = {codes.mB, codes.mB, codes.mB, codes.mB};
        Pixel pixel;
        EXPECT_EQ(IR_ConvertYUV420Planes(y, 2, &codes.mG, 1, &codes.mR, 1, inMatrix601, &pixel, 4,
                                         kIR_PixelFormat_BGRA_8u, 1, 1),
                  kIR_NoError);
        return pixel;
    };
    enum Answer
    {
        kPlanes,
        kBGRA601,
        kBGRA709
    };
    const struct
    {
        std::uint32_t mWidth, mHeight, mToWidth, mToHeight, mQuality;
        Answer mAnswer;
    } cases[] = {{8, 4, 4, 2, 4, kPlanes},      {8, 4, 4, 2, 2, kBGRA601},
                 {8, 4, 6, 3, 4, kBGRA601},     {4, 800, 2, 400, 5, kBGRA709},
                 {4, 1440, 2, 720, 3, kPlanes}, {6, 4, 3, 2, 4, kBGRA601}};
    for (const auto& c : cases)
    {
        SCOPED_TRACE(testing::Message() << c.mWidth << "x" << c.mHeight << " to " << c.mToWidth
                                        << "x" << c.mToHeight << " at " << c.mQuality);
        const FrameRef frame = Render(
            *ScaleAndPARCorrectSource(
                MakeMarkedSource(Delivery::kProgressive, c.mWidth, c.mHeight)),
            MF::FrameTime(mT),
            MakeParams(c.mToWidth, c.mToHeight, c.mQuality, mt::kPixelFormat_YUV_420_8u_Planar));
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(),
                  QRT::ParamRect(0, 0, std::int32_t(c.mToWidth), std::int32_t(c.mToHeight)));
        if (c.mAnswer == kPlanes)
        {
            EXPECT_TRUE(PlanesAre(frame, codes));
            continue;
        }
        ASSERT_EQ(frame->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
        const Pixel expected = bgra(c.mAnswer == kBGRA601);
        EXPECT_TRUE(PixelsAre(
            frame, [&](std::int32_t, std::int32_t) { return expected; }, 1));
    }
}

} // namespace
} // namespace ML::Test
