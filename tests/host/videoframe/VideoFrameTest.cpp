#include "VF/VideoFrame.h"

#include "ContractExpect.h"
#include "FrameTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace vftest;
using QRT::ParamRect;

constexpr mt::PixelFormat kPlanar420 = mt::kPixelFormat_YUV_420_8u_Planar;
constexpr mt::PixelFormat kBGRA8 = mt::kPixelFormat_BGRA_4444_8u;

std::pair<uint32_t, uint32_t> OriginOf(const MF::IVideoFrame& inFrame)
{
    uint32_t x = 0, y = 0;
    inFrame.GetOriginOffset(x, y);
    return {x, y};
}

// Gives a frame attributes that all differ from the defaults.
void SetAttributes(MF::IVideoFrame& ioFrame)
{
    ioFrame.SetFieldType(mt::kFieldType_LowerFirst);
    ioFrame.SetPixelAspectRatio(mt::kPixelAspectRatio_D1NTSC);
    ioFrame.SetAlphaChannel(mt::kAlphaChannel_Premultiplied);
    ioFrame.SetOriginOffset(7, 8);
    ioFrame.SetFullFrameRect(ParamRect(0, 0, 32, 8));
    ioFrame.SetVisibleContentRect(ParamRect(1, 1, 5, 3));
    ioFrame.SetRenderTime(12);
}

// The attributes of SetAttributes; an empty frame made from such a frame starts its own
// render time and visible content.
void ExpectAttributes(const MF::IVideoFrame& inFrame, bool inEmpty)
{
    EXPECT_EQ(std::tuple(inFrame.GetFieldType(), inFrame.GetPixelAspectRatio().GetNumerator(),
                         inFrame.GetAlphaChannel(), OriginOf(inFrame), inFrame.GetFullFrameRect(),
                         inFrame.GetRenderTime(), inFrame.IsShared()),
              std::tuple(mt::kFieldType_LowerFirst, 10u, mt::kAlphaChannel_Premultiplied,
                         std::pair(7u, 8u), ParamRect(0, 0, 32, 8), inEmpty ? 0u : 12u, false));
    EXPECT_TRUE(inEmpty || inFrame.GetVisibleContentRect() == ParamRect(1, 1, 5, 3));
}

using VideoFrameTest = ::testing::Test;

TEST_F(VideoFrameTest, LayoutOfPackedHalvedAndPlanarFormats)
{
    // 17 * 16 = 272 -> 320; an odd 4:2:2 width keeps room for the last pair, 68 -> 128; half
    // width counts 4-byte pixel pairs.
    const std::tuple<mt::PixelFormat, uint32_t, int32_t> packed[] = {
        {mt::kPixelFormat_BGRA_4444_32f, 17, 320},
        {mt::kPixelFormat_YUYV_422_8u, 33, 128},
        {mt::kPixelFormat_YUYV_422_8u_HalfWidthFields, 960, 3840}};
    VF::FrameLayout layout;
    for (const auto& [format, width, rowBytes] : packed)
    {
        ASSERT_EQ(VF::ComputeFrameLayout(format, width, 2, layout), QRT::kResult_Success);
        EXPECT_EQ(std::pair(layout.mPlanes[0].mRowBytes, layout.mTotalBytes),
                  std::pair(rowBytes, size_t(2 * rowBytes)));
    }
    // 4:2:0: Y, then Cb and Cr at half size rounded up (65 -> 128), each plane 64-aligned.
    ASSERT_EQ(VF::ComputeFrameLayout(kPlanar420, 130, 5, layout), QRT::kResult_Success);
    ASSERT_EQ(layout.mPlaneCount, 3u);
    const std::tuple<size_t, int32_t, uint32_t> planes[] = {
        {0, 192, 5}, {192 * 5, 128, 3}, {192 * 5 + 128 * 3, 128, 3}};
    for (uint32_t p = 0; p < 3; ++p)
        EXPECT_EQ(std::tuple(layout.mPlanes[p].mOffset, layout.mPlanes[p].mRowBytes,
                             layout.mPlanes[p].mRows),
                  planes[p]);
    EXPECT_EQ(layout.mTotalBytes, 192u * 5 + 128 * 3 * 2);
}

TEST_F(VideoFrameTest, BadFormatsAndSizesGiveStatusesAndNoFrame)
{
    const std::tuple<mt::PixelFormat, uint32_t, uint32_t, QRT::Result> cases[] = {
        {mt::kPixelFormat_Invalid, 2, 2, VF::kResult_InvalidPixelFormat},
        {mt::kPixelFormat_MJPG_422_Compressed, 2, 2, VF::kResult_InvalidPixelFormat},
        {kBGRA8, 0, 2, VF::kResult_InvalidFrameSize},
        {kBGRA8, 2, 0, VF::kResult_InvalidFrameSize},
        {kBGRA8, VF::kMaxFrameDimension + 1, 2, VF::kResult_InvalidFrameSize},
        {kBGRA8, 2, VF::kMaxFrameDimension + 1, VF::kResult_InvalidFrameSize},
    };
    for (const auto& [format, width, height, status] : cases)
    {
        Frame frame = MakeFrame(kBGRA8, 2, 2);
        EXPECT_EQ(VF::CreateVideoFrame(format, width, height, mt::kPixelAspectRatio_Square, false,
                                       false, frame),
                  status);
        EXPECT_FALSE(frame); // emptied on failure
        EXPECT_FALSE(
            VF::CreateVideoFrame(format, width, height, mt::kPixelAspectRatio_Square, true, true));
    }
}

TEST_F(VideoFrameTest, TrackedVisibleContentGrowsWithinTheBoundsAndFullFrameAnswersQueries)
{
    const Frame frame = MakeFrame(kBGRA8, 64, 16, false, true);
    EXPECT_EQ(frame->GetVisibleContentRect(), ParamRect());
    frame->GrowVisibleContentRect(ParamRect(4, 4, 10, 8));
    frame->GrowVisibleContentRect(ParamRect(20, 2, 30, 5));
    EXPECT_EQ(frame->GetVisibleContentRect(), ParamRect(4, 2, 30, 8));
    frame->GrowVisibleContentRect(ParamRect(-5, -5, 100, 3));
    EXPECT_EQ(frame->GetVisibleContentRect(), ParamRect(0, 0, 64, 8));
    // An untracked frame ignores growth and answers its bounds.
    const Frame untracked = MakeFrame(kBGRA8, 40, 30);
    untracked->GrowVisibleContentRect(ParamRect(1, 1, 2, 2));
    EXPECT_EQ(untracked->GetVisibleContentRect(), ParamRect(0, 0, 40, 30));
    // The whole frame, a part of a larger frame, and none.
    for (const auto& [rect, part, whole] :
         {std::tuple{ParamRect(0, 0, 40, 30), true, true},
          std::tuple{ParamRect(0, 0, 80, 60), true, false}, std::tuple{ParamRect(), false, false}})
    {
        untracked->SetFullFrameRect(rect);
        EXPECT_EQ(std::pair(untracked->HasFullFrame(0), untracked->HasFullFrame(1)),
                  std::pair(part, whole));
    }
    EXPECT_INPUT_CONTRACT(untracked->HasFullFrame(2), "inWhole == 0 || inWhole == 1");
    EXPECT_INPUT_CONTRACT(untracked->SetFullFrameRect(ParamRect(5, 5, 5, 9)),
                          "IsAllZero(inRect) || !inRect.IsEmpty()");
}

TEST_F(VideoFrameTest, SharedFrameRefusesEveryWriteButRenderTime)
{
    const Frame frame = MakeFrame(kBGRA8, 8, 8);
    frame->MarkShared(0); // unmarking an unshared frame does nothing
    EXPECT_FALSE(frame->IsShared());
    frame->MarkShared(1);
    EXPECT_INPUT_CONTRACT(frame->GetWritableBaseAddress(), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->SetFieldType(mt::kFieldType_UpperFirst), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->SetVisibleContentRect(ParamRect()), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->MarkShared(0), "inShared != 0 || !IsShared()");
    frame->SetRenderTime(9);
    EXPECT_EQ(frame->GetRenderTime(), 9u);
    EXPECT_INPUT_CONTRACT(frame->GetPlaneRowBytes(1), "inPlane < mLayout.mPlaneCount");
}

TEST_F(VideoFrameTest, AlphaAnalysisIsRememberedUntilAlphaChanged)
{
    const Frame frame = MakeFrame(kBGRA8, 5, 3);
    EXPECT_FALSE(frame->IsAlphaOpaque()); // cleared: transparent
    FillBytes(*frame, 0xFF);
    EXPECT_FALSE(frame->IsAlphaOpaque()); // remembered
    frame->AlphaChanged();
    EXPECT_TRUE(frame->IsAlphaOpaque());
    Row(frame, 2, 4)[3] = 0x7F; // one translucent pixel, the last
    frame->AlphaChanged();
    EXPECT_FALSE(frame->IsAlphaOpaque());
    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 2, 1);
    const float pixels[8] = {0, 0, 0, 1.0f, 0.5f, 0.5f, 0.5f, 1.0f};
    std::memcpy(floats->GetWritableBaseAddress(), pixels, sizeof pixels);
    EXPECT_TRUE(floats->IsAlphaOpaque());
    const Frame yuyv = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 4, 2);
    EXPECT_TRUE(yuyv->IsAlphaOpaque() && !yuyv->HasAlpha());
}

using CopyOnWriteTest = ::testing::Test;

TEST_F(CopyOnWriteTest, SharedOrTwiceHeldFrameYieldsACopyAndAnEmptyFrameOnlyAttributes)
{
    const Frame original = MakeFrame(kBGRA8, 16, 4);
    FillBytes(*original, 0x22);
    SetAttributes(*original);
    original->MarkShared(1);
    const Frame writable = VF::MakeWriteableVideoFrame(original, mt::kRenderQuality_Draft);
    ASSERT_TRUE(writable);
    EXPECT_NE(writable.Get(), original.Get());
    EXPECT_TRUE(AllBytesAre(*writable, 0x22));
    ExpectAttributes(*writable, false);
    FillBytes(*writable, 0x99);
    EXPECT_TRUE(AllBytesAre(*original, 0x22));
    // An empty frame copies the attributes, not the pixels.
    const Frame empty = original->CreateEmptyFrame(true);
    ExpectAttributes(*empty, true);
    EXPECT_TRUE(AllBytesAre(*empty, 0));
    // A frame held twice yields a copy too; the sole unshared holder writes in place.
    Frame frame = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 9, 3);
    const Frame otherHolder = frame;
    frame = VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_Max);
    EXPECT_NE(frame.Get(), otherHolder.Get());
    MF::IVideoFrame* const copy = frame.Get();
    EXPECT_EQ(VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_Max).Get(), copy);
}

} // namespace
