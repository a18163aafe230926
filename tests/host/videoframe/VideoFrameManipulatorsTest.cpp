#include "VF/VideoFrameManipulators.h"

#include "ContractExpect.h"
#include "FrameTestSupport.h"
#include "VF/PixelFormatConversions.h"

#include <gtest/gtest.h>

namespace
{

using namespace vftest;
using QRT::ParamRect;
using VF::VideoFrameManipulators;

constexpr mt::PixelFormat kBGRA8 = mt::kPixelFormat_BGRA_4444_8u;
constexpr mt::PixelFormat kBGRA32f = mt::kPixelFormat_BGRA_4444_32f;

float* PixelF(const Frame& inFrame, int32_t inX, int32_t inY)
{
    return reinterpret_cast<float*>(Row(inFrame, inY)) + 4 * size_t(inX);
}

void SetPixel8(const Frame& inFrame, int32_t inX, int32_t inY, std::array<uint8_t, 4> inBGRA)
{
    std::memcpy(Row(inFrame, inY, inX), inBGRA.data(), 4);
}

// A one-row 8-bit frame holding the bytes, and the bytes of such a row.
Frame Row8(const std::vector<uint8_t>& inBytes)
{
    const Frame frame = MakeFrame(kBGRA8, uint32_t(inBytes.size() / 4), 1);
    std::memcpy(Row(frame, 0), inBytes.data(), inBytes.size());
    return frame;
}
std::vector<uint8_t> Bytes8(const Frame& inFrame)
{
    return std::vector<uint8_t>(Row(inFrame, 0), Row(inFrame, 0, inFrame->GetBounds().Width()));
}

// An 8-bit frame whose row y is opaque grey inRowValues[y].
Frame GreyRows(const std::vector<uint8_t>& inRowValues, uint32_t inWidth = 2)
{
    const Frame frame = MakeFrame(kBGRA8, inWidth, uint32_t(inRowValues.size()));
    for (int32_t y = 0; y < int32_t(inRowValues.size()); ++y)
        for (int32_t x = 0; x < int32_t(inWidth); ++x)
            SetPixel8(frame, x, y, {inRowValues[y], inRowValues[y], inRowValues[y], 255});
    return frame;
}

// The green channel of column inX, row by row.
std::vector<int> Greys(const Frame& inFrame, int32_t inX)
{
    std::vector<int> values;
    for (int32_t y = 0; y < inFrame->GetBounds().Height(); ++y)
        values.push_back(Row(inFrame, y, inX)[1]);
    return values;
}

QRT::Result Copy(const Frame& inSource, const Frame& inDestination,
                 mt::RenderQuality inQuality = mt::kRenderQuality_High)
{
    return VideoFrameManipulators::CopyFrame(inSource, inDestination, inQuality);
}

using VideoFrameManipulatorsTest = ::testing::Test;

TEST_F(VideoFrameManipulatorsTest, CatalogueFormatsMapToTheirIRFormats)
{
    const std::pair<mt::PixelFormat, uint32_t> mapped[] = {
        {kBGRA8, 0x4u},
        {kBGRA32f, 0x5u},
        {mt::kPixelFormat_BGRP_4444_32f_Linear, 0xBu},
        {mt::kPixelFormat_VUYA_4444_8u, 0x104u},
        {mt::kPixelFormat_YUYV_422_8u, 0x200u}};
    for (const auto& [format, ir] : mapped)
        EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(format), ir) << mt::GetPixelFormatName(format);
    // Formats without an IR layout are not addressable; a shared frame has no writable buffer.
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_16u, 5, 3);
    EXPECT_FALSE(VF::GetIRFrameBuffer(*frame).IsAddressable());
    frame->MarkShared(1);
    EXPECT_INPUT_CONTRACT(VF::GetWritableIRFrameBuffer(*frame), "!inFrame.IsShared()");
    // Without a format asked for, a frame is its own addressable frame.
    EXPECT_EQ(VideoFrameManipulators::MakeAddressableVideoFrame(frame, mt::kPixelFormat_Any,
                                                                mt::kRenderQuality_High),
              frame);
}

TEST_F(VideoFrameManipulatorsTest, EightBitThroughEachStagedFormatAndBack)
{
    // Every code value, translucent alpha included: exact through the same format and the
    // 16-bit formats, within one code value through float RGB and YCbCr.
    const Frame source = MakeFrame(kBGRA8, 16, 16);
    for (int32_t v = 0; v < 256; ++v)
        SetPixel8(source, v % 16, v / 16,
                  {uint8_t(v), uint8_t(255 - v), uint8_t(v / 2), uint8_t(v | 64)});
    SetPixel8(source, 0, 0, {255, 255, 255, 255});
    for (const auto& [middle, tolerance] :
         {std::pair{kBGRA8, 0}, std::pair{mt::kPixelFormat_BGRA_4444_16u, 0},
          std::pair{mt::kPixelFormat_BGRA_4444_16f, 0}, std::pair{kBGRA32f, 1},
          std::pair{mt::kPixelFormat_VUYA_4444_32f, 1}})
    {
        const Frame staged = MakeFrame(middle, 16, 16), back = MakeFrame(kBGRA8, 16, 16);
        ASSERT_EQ(Copy(source, staged), QRT::kResult_Success);
        ASSERT_EQ(Copy(staged, back), QRT::kResult_Success);
        for (int32_t i = 0; i < 16 * 16 * 4; ++i)
            ASSERT_NEAR(Row(back, i / 64, i / 4 % 16)[i % 4],
                        Row(source, i / 64, i / 4 % 16)[i % 4], tolerance)
                << mt::GetPixelFormatName(middle) << " " << i;
    }
}

TEST_F(VideoFrameManipulatorsTest, BadFramesAreContractErrorsAndSharedFramesAreNeverWritten)
{
    const Frame source = GreyRows({10, 20}), shared = GreyRows({99, 99});
    EXPECT_INPUT_CONTRACT(Copy(Frame(), source), "inSource != nullptr");
    EXPECT_INPUT_CONTRACT(Copy(source, Frame()), "inDestination != nullptr");
    EXPECT_INPUT_CONTRACT(Copy(source, source), "inSource.Get() != inDestination.Get()");
    shared->MarkShared(1);
    EXPECT_INPUT_CONTRACT(Copy(source, shared), "!inDestination->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::OpaqueAlpha(shared), "!ioFrame->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::CopyFrameWithFields(source, GreyRows({0, 0}),
                                                                      mt::kRenderQuality_High, 3),
                          "inFieldSelection == kFieldSelection_Frame || inFieldSelection == "
                          "kFieldSelection_First || inFieldSelection == kFieldSelection_Second");
    EXPECT_EQ(Greys(shared, 1), (std::vector<int>{99, 99}));
}

TEST_F(VideoFrameManipulatorsTest, SwapFieldsExchangesPictureRowPairs)
{
    const Frame source = GreyRows({0, 10, 20, 30, 40}, 3), destination = MakeFrame(kBGRA8, 3, 5);
    ASSERT_EQ(VideoFrameManipulators::SwapFields(source, destination), QRT::kResult_Success);
    // The unpaired last row takes the row above it.
    EXPECT_EQ(Greys(destination, 2), (std::vector<int>{10, 0, 30, 20, 30}));

    // Fields stored apart: memory rows hold picture rows 0, 2, 1, 3.
    const Frame apart = MakeFrame(mt::kPixelFormat_YUYV_422_8u_Fields, 2, 4);
    const Frame swapped = MakeFrame(mt::kPixelFormat_YUYV_422_8u_Fields, 2, 4);
    const int memoryRowOfPicture[4] = {0, 2, 1, 3};
    for (int row = 0; row < 4; ++row)
        std::memset(Row(apart, memoryRowOfPicture[row]), row + 1, 4);
    ASSERT_EQ(VideoFrameManipulators::SwapFields(apart, swapped), QRT::kResult_Success);
    const int expectedPicture[4] = {2, 1, 4, 3};
    for (int row = 0; row < 4; ++row)
        EXPECT_EQ(Row(swapped, memoryRowOfPicture[row])[0], expectedPicture[row]) << row;
}

TEST_F(VideoFrameManipulatorsTest, VerticalConvolveWeightsOneTwoOne)
{
    const Frame source = GreyRows({0, 40, 80, 0}), destination = MakeFrame(kBGRA8, 2, 4);
    ASSERT_EQ(VideoFrameManipulators::VerticalConvolve(source, destination), QRT::kResult_Success);
    // (3*0 + 40) / 4, (0 + 80 + 80) / 4, (40 + 160 + 0) / 4, (80 + 3*0) / 4.
    EXPECT_EQ(Greys(destination, 0), (std::vector<int>{10, 40, 50, 20}));
    EXPECT_EQ(Row(destination, 2, 1)[3], 255);

    const Frame floats = MakeFrame(kBGRA32f, 1, 3), filtered = MakeFrame(kBGRA32f, 1, 3);
    PixelF(floats, 0, 0)[0] = 1.0f;
    PixelF(floats, 0, 2)[0] = 0.5f;
    ASSERT_EQ(VideoFrameManipulators::VerticalConvolve(floats, filtered), QRT::kResult_Success);
    EXPECT_EQ(std::vector<float>({PixelF(filtered, 0, 0)[0], PixelF(filtered, 0, 1)[0],
                                  PixelF(filtered, 0, 2)[0]}),
              (std::vector<float>{0.75f, 0.375f, 0.375f}));

    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::VerticalConvolve(source, MakeFrame(kBGRA8, 2, 5)),
                          "inSource->GetBounds() == inDestination->GetBounds()");
    EXPECT_INPUT_CONTRACT(
        VideoFrameManipulators::VerticalConvolve(source, MakeFrame(kBGRA32f, 2, 4)),
        "inSource->GetPixelFormat() == inDestination->GetPixelFormat()");
}

TEST_F(VideoFrameManipulatorsTest, CopyRectScalesIntoTheRectangleKeepsTheRestAndCanCopyAlphaAlone)
{
    const Frame source = GreyRows({50, 150}), destination = GreyRows(std::vector<uint8_t>(6, 7), 6);
    ASSERT_EQ(VideoFrameManipulators::CopyRect(source, ParamRect(0, 0, 2, 2), destination,
                                               ParamRect(1, 2, 5, 6), mt::kRenderQuality_Low,
                                               VF::kCopyChannels_All),
              QRT::kResult_Success);
    const std::vector<int> outside(6, 7), inside{7, 7, 50, 50, 150, 150};
    for (int32_t x = 0; x < 6; ++x)
        EXPECT_EQ(Greys(destination, x), x == 0 || x == 5 ? outside : inside) << x;
    // Alpha alone.
    const Frame alphas = Row8({1, 2, 3, 40, 4, 5, 6, 80});
    const Frame opaque = Row8({100, 101, 102, 255, 103, 104, 105, 255});
    ASSERT_EQ(VideoFrameManipulators::CopyRect(alphas, alphas->GetBounds(), opaque,
                                               opaque->GetBounds(), mt::kRenderQuality_High,
                                               VF::kCopyChannels_Alpha),
              QRT::kResult_Success);
    EXPECT_EQ(Bytes8(opaque), (std::vector<uint8_t>{100, 101, 102, 40, 103, 104, 105, 80}));
    EXPECT_INPUT_CONTRACT(
        VideoFrameManipulators::CopyRect(alphas, ParamRect(0, 0, 3, 1), opaque, opaque->GetBounds(),
                                         mt::kRenderQuality_High, VF::kCopyChannels_All),
        "inSource->CanProvideRect(inSourceRect)");
}

TEST_F(VideoFrameManipulatorsTest, OpaqueAndInvertAlphaChangeOnlyAlpha)
{
    const Frame frame = Row8({1, 2, 3, 0, 4, 5, 6, 100, 7, 8, 9, 255});
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(frame), QRT::kResult_Success);
    EXPECT_EQ(Bytes8(frame), (std::vector<uint8_t>{1, 2, 3, 255, 4, 5, 6, 155, 7, 8, 9, 0}));
    EXPECT_FALSE(frame->IsAlphaOpaque());
    ASSERT_EQ(VideoFrameManipulators::OpaqueAlpha(frame), QRT::kResult_Success);
    EXPECT_EQ(Bytes8(frame), (std::vector<uint8_t>{1, 2, 3, 255, 4, 5, 6, 255, 7, 8, 9, 255}));
    EXPECT_TRUE(frame->IsAlphaOpaque()); // the remembered analysis was dropped

    // Premultiplied colour is reassociated; colour under alpha 0 comes out as 0.
    const Frame linear = MakeFrame(mt::kPixelFormat_BGRP_4444_32f_Linear, 2, 1);
    PixelF(linear, 0, 0)[0] = 0.2f;
    PixelF(linear, 0, 0)[3] = 0.25f;
    PixelF(linear, 1, 0)[0] = 0.5f;
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(linear), QRT::kResult_Success);
    EXPECT_EQ((std::array{PixelF(linear, 0, 0)[0], PixelF(linear, 0, 0)[3], PixelF(linear, 1, 0)[0],
                          PixelF(linear, 1, 0)[3]}),
              (std::array{0.6f, 0.75f, 0.0f, 1.0f}));

    // 16-bit float alpha becomes 1.0; a format without alpha is left alone.
    const Frame half = MakeFrame(mt::kPixelFormat_BGRA_4444_16f, 1, 1);
    ASSERT_EQ(VideoFrameManipulators::OpaqueAlpha(half), QRT::kResult_Success);
    uint16_t alpha;
    std::memcpy(&alpha, Row(half, 0) + 6, 2);
    EXPECT_EQ(alpha, 0x3C00);
    const Frame yuyv = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 2, 1);
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(yuyv), QRT::kResult_Success);
    EXPECT_EQ(Row(yuyv, 0)[3], 0);
}

} // namespace
