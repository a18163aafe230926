// Scaler: pass-through of fitting frames, field-correct reduction, the
// nearest-field choice for progressive requests, odd interlaced heights.

#include "FilterTestSources.h"
#include "ML/RenderableSourceFilters.h"

#include <gtest/gtest.h>

namespace
{

using namespace FilterTest;
using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;

class ScalerTest : public ::testing::Test
{
protected:
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

    // Params reducing 1080 rows to inHeight.
    static ML::CutlistRenderParams Reducing(std::uint32_t inHeight)
    {
        ML::CutlistRenderParams params = MakeParams(16, inHeight);
        params.mVerticalScale = static_cast<double>(inHeight) / 1080.0;
        params.mFullFrameHeight = 1080;
        return params;
    }

    const TickTime mT = Ticks(3 * kFrame);
    const TickTime mTField = Ticks(3 * kFrame + kField);
};

TEST_F(ScalerTest, AFrameAlreadyAtTheRequestedBoundsAndRatioPassesUnchanged)
{
    auto progressive = MakeMarkedSource(Delivery::kProgressive);
    const SourceRef scaler = ML::ScaleAndPARCorrectSource(progressive);
    const ML::CutlistRenderParams params = MakeParams(8, 6);
    const FrameRef frame = Render(scaler, MF::FrameTime(mT), params);
    EXPECT_TRUE(frame == progressive->LastFrame());

    // Interlaced in the requested order passes too.
    auto upper = MakeMarkedSource(Delivery::kUpperFirst);
    const SourceRef upperScaler = ML::ScaleAndPARCorrectSource(upper);
    const FrameRef interlaced = Render(upperScaler, MF::FrameTime(mT, mTField), params);
    EXPECT_TRUE(interlaced == upper->LastFrame());

    // Another pixel aspect ratio is corrected into a new frame.
    ML::CutlistRenderParams wide = params;
    wide.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(4, 3);
    auto native =
        MakeMarkedSource(Delivery::kProgressive, mvxmediatypes::kFrameRate_Video2997, 8, 6);
    const SourceRef nativeScaler = ML::ScaleAndPARCorrectSource(native);
    const FrameRef corrected = Render(nativeScaler, MF::FrameTime(mT), wide);
    ASSERT_TRUE(corrected);
    EXPECT_FALSE(corrected == native->LastFrame());
    EXPECT_EQ(corrected->GetPixelAspectRatio(), mvxmediatypes::PixelAspectRatio(4, 3));
}

TEST_F(ScalerTest, Reducing1080iTo576iKeepsEveryFieldsRowsFromTheSameField)
{
    for (const Delivery delivery : {Delivery::kUpperFirst, Delivery::kLowerFirst})
    {
        auto source = MakeMarkedSource(delivery, mvxmediatypes::kFrameRate_Video2997, 16, 1080);
        const SourceRef scaler = ML::ScaleAndPARCorrectSource(source);
        const ML::CutlistRenderParams params = Reducing(576);
        const MF::FrameTime request = delivery == Delivery::kUpperFirst
                                          ? MF::FrameTime(mT, mTField)
                                          : MF::FrameTime(mTField, mT);
        const FrameRef frame = Render(scaler, request, params);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 576));
        EXPECT_EQ(frame->GetFieldType(), request.GetFieldOrder());
        for (std::int32_t y = 0; y < 576; ++y)
        {
            const Pixel expected = y % 2 == 0 ? Marker(request.GetFirstFieldTime(), 1)
                                              : Marker(request.GetSecondFieldTime(), 2);
            for (std::int32_t x = 0; x < 16; ++x)
                ASSERT_EQ(ReadPixel(*frame, x, y), expected) << "row " << y;
        }
    }
}

TEST_F(ScalerTest, AnInterlacedRequestForAnOddHeightIsRenderedOneRowTaller)
{
    auto source =
        MakeMarkedSource(Delivery::kUpperFirst, mvxmediatypes::kFrameRate_Video2997, 16, 1080);
    const SourceRef scaler = ML::ScaleAndPARCorrectSource(source);
    const FrameRef frame = Render(scaler, MF::FrameTime(mT, mTField), Reducing(575));
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 576));
    // A progressive request keeps the odd height.
    const FrameRef progressive = Render(scaler, MF::FrameTime(mTField), Reducing(575));
    EXPECT_EQ(progressive->GetBounds(), QRT::ParamRect(0, 0, 16, 575));
}

TEST_F(ScalerTest, AProgressiveRequestWhileReducingTakesTheNearestField)
{
    auto upper =
        MakeMarkedSource(Delivery::kUpperFirst, mvxmediatypes::kFrameRate_Video2997, 16, 1080);
    auto lower =
        MakeMarkedSource(Delivery::kLowerFirst, mvxmediatypes::kFrameRate_Video2997, 16, 1080);
    const SourceRef upperScaler = ML::ScaleAndPARCorrectSource(upper);
    const SourceRef lowerScaler = ML::ScaleAndPARCorrectSource(lower);
    const ML::CutlistRenderParams params = Reducing(540);

    // Halfway between the fields: the field before the requested time when
    // it is the second one, else the first.
    const MF::FrameTime halfway(Ticks(3 * kFrame + kField / 2));
    EXPECT_EQ(Conform(lowerScaler, halfway, params), MF::FrameTime(mT));
    EXPECT_EQ(Conform(upperScaler, halfway, params), MF::FrameTime(mT));
    const MF::FrameTime nearLater(mTField - Ticks(1));
    EXPECT_EQ(Conform(upperScaler, nearLater, params), MF::FrameTime(mTField));
    // Without a vertical reduction upstream's answer stands.
    EXPECT_EQ(Conform(upperScaler, nearLater, MakeParams(16, 1080)), MF::FrameTime(mT, mTField));

    // Every row comes from the field nearest the requested time.
    for (const auto& [scaler, slot] : {std::pair{upperScaler, 2}, std::pair{lowerScaler, 1}})
    {
        const FrameRef frame = Render(scaler, MF::FrameTime(mTField), params);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 540));
        for (std::int32_t y = 0; y < 540; ++y)
            ASSERT_EQ(ReadPixel(*frame, 5, y), Marker(mTField, slot)) << "row " << y;
    }
}

TEST_F(ScalerTest, OppositeFieldOrderIsReportedSwappedWhenReducing)
{
    auto upper =
        MakeMarkedSource(Delivery::kUpperFirst, mvxmediatypes::kFrameRate_Video2997, 16, 1080);
    const SourceRef scaler = ML::ScaleAndPARCorrectSource(upper);
    const MF::FrameTime lowerFirst(mTField, mT);
    EXPECT_EQ(Conform(scaler, lowerFirst, Reducing(576)), MF::FrameTime(mTField, mT));
    EXPECT_EQ(Conform(scaler, lowerFirst, MakeParams(16, 1080)), MF::FrameTime(mT, mTField));
    ML::RenderableNodePrefetchList prefetches;
    scaler->CollectPrefetches(lowerFirst, Reducing(576), prefetches);
    EXPECT_EQ(upper->Prefetched().at(0), MF::FrameTime(mT, mTField));
}

} // namespace
