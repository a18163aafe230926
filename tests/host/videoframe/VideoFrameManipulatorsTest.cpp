#include "VF/VideoFrameManipulators.h"

#include "ContractExpect.h"
#include "QRT/Allocated.h"
#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrame.h"

#include <cstring>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;
using VF::VideoFrameManipulators;

Frame MakeFrame(mt::PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight)
{
    Frame frame = VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square,
                                       true, false);
    EXPECT_TRUE(frame);
    return frame;
}

uint8_t* Pixel8(const Frame& inFrame, int32_t inX, int32_t inY)
{
    return static_cast<uint8_t*>(inFrame->GetWritableBaseAddress()) +
           static_cast<size_t>(inY) * inFrame->GetRowBytes() + 4 * static_cast<size_t>(inX);
}

const uint8_t* ReadPixel8(const Frame& inFrame, int32_t inX, int32_t inY)
{
    return static_cast<const uint8_t*>(inFrame->GetBaseAddress()) +
           static_cast<size_t>(inY) * inFrame->GetRowBytes() + 4 * static_cast<size_t>(inX);
}

float* PixelF(const Frame& inFrame, int32_t inX, int32_t inY)
{
    return reinterpret_cast<float*>(static_cast<uint8_t*>(inFrame->GetWritableBaseAddress()) +
                                    static_cast<size_t>(inY) * inFrame->GetRowBytes()) +
           4 * static_cast<size_t>(inX);
}

void SetPixel8(const Frame& inFrame, int32_t inX, int32_t inY, uint8_t inB, uint8_t inG,
               uint8_t inR, uint8_t inA)
{
    uint8_t* pixel = Pixel8(inFrame, inX, inY);
    pixel[0] = inB;
    pixel[1] = inG;
    pixel[2] = inR;
    pixel[3] = inA;
}

// Every pixel of row y grey v(y), opaque.
void FillRowsGrey(const Frame& inFrame, const std::vector<uint8_t>& inRowValues)
{
    for (int32_t y = 0; y < inFrame->GetBounds().Height(); ++y)
        for (int32_t x = 0; x < inFrame->GetBounds().Width(); ++x)
            SetPixel8(inFrame, x, y, inRowValues[y], inRowValues[y], inRowValues[y], 255);
}

std::vector<int> RowGreys(const Frame& inFrame, int32_t inX)
{
    std::vector<int> values;
    for (int32_t y = 0; y < inFrame->GetBounds().Height(); ++y)
        values.push_back(ReadPixel8(inFrame, inX, y)[1]);
    return values;
}

uint32_t ReferenceCount(const Frame& inFrame)
{
    const uint32_t count = inFrame->AddRef();
    inFrame->Release();
    return count - 1;
}

// A frame that offers only MF::IVideoFrame (no pixel-access interfaces), as
// frames of other libraries may.
class FrameWithoutAddress : public QRT::Implements<MF::IVideoFrame>
{
public:
    explicit FrameWithoutAddress(Frame inInner)
        : mInner(std::move(inInner))
    {
    }
    mt::PixelFormat GetPixelFormat() const noexcept override { return mInner->GetPixelFormat(); }
    QRT::ParamRect GetBounds() const noexcept override { return mInner->GetBounds(); }
    int32_t GetRowBytes() const noexcept override { return mInner->GetRowBytes(); }
    uint32_t GetPlaneCount() const noexcept override { return mInner->GetPlaneCount(); }
    int32_t GetPlaneRowBytes(uint32_t inPlane) const override
    {
        return mInner->GetPlaneRowBytes(inPlane);
    }
    const void* GetPlaneBaseAddress(uint32_t inPlane) const override
    {
        return mInner->GetPlaneBaseAddress(inPlane);
    }
    void* GetWritablePlaneBaseAddress(uint32_t inPlane) override
    {
        return mInner->GetWritablePlaneBaseAddress(inPlane);
    }
    const void* GetBaseAddress() const noexcept override { return mInner->GetBaseAddress(); }
    void* GetWritableBaseAddress() override { return mInner->GetWritableBaseAddress(); }
    size_t GetDataSize() const noexcept override { return mInner->GetDataSize(); }
    mt::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mInner->GetPixelAspectRatio();
    }
    void SetPixelAspectRatio(mt::PixelAspectRatio inRatio) override
    {
        mInner->SetPixelAspectRatio(inRatio);
    }
    mt::FieldType GetFieldType() const noexcept override { return mInner->GetFieldType(); }
    void SetFieldType(mt::FieldType inFieldType) override { mInner->SetFieldType(inFieldType); }
    mt::AlphaChannel GetAlphaChannel() const noexcept override { return mInner->GetAlphaChannel(); }
    void SetAlphaChannel(mt::AlphaChannel inAlpha) override { mInner->SetAlphaChannel(inAlpha); }
    bool HasAlpha() const noexcept override { return mInner->HasAlpha(); }
    bool IsAlphaOpaque() const override { return mInner->IsAlphaOpaque(); }
    void AlphaChanged() noexcept override { mInner->AlphaChanged(); }
    uint32_t GetRenderTime() const noexcept override { return mInner->GetRenderTime(); }
    void SetRenderTime(uint32_t inMilliseconds) noexcept override
    {
        mInner->SetRenderTime(inMilliseconds);
    }
    void GetOriginOffset(uint32_t& outX, uint32_t& outY) const noexcept override
    {
        mInner->GetOriginOffset(outX, outY);
    }
    void SetOriginOffset(uint32_t inX, uint32_t inY) override { mInner->SetOriginOffset(inX, inY); }
    bool HasFullFrame(int32_t inWhole) const override { return mInner->HasFullFrame(inWhole); }
    QRT::ParamRect GetFullFrameRect() const noexcept override { return mInner->GetFullFrameRect(); }
    void SetFullFrameRect(const QRT::ParamRect& inRect) override
    {
        mInner->SetFullFrameRect(inRect);
    }
    bool CanProvideRect(const QRT::ParamRect& inRect) const noexcept override
    {
        return mInner->CanProvideRect(inRect);
    }
    bool TracksVisibleContent() const noexcept override { return mInner->TracksVisibleContent(); }
    QRT::ParamRect GetVisibleContentRect() const noexcept override
    {
        return mInner->GetVisibleContentRect();
    }
    void SetVisibleContentRect(const QRT::ParamRect& inRect) override
    {
        mInner->SetVisibleContentRect(inRect);
    }
    void GrowVisibleContentRect(const QRT::ParamRect& inRect) override
    {
        mInner->GrowVisibleContentRect(inRect);
    }
    void MarkShared(int32_t inShared) override { mInner->MarkShared(inShared); }
    bool IsShared() const noexcept override { return mInner->IsShared(); }
    Frame CreateEmptyFrame(bool inClear) const override
    {
        return mInner->CreateEmptyFrame(inClear);
    }

private:
    Frame mInner;
};

class VideoFrameManipulatorsTest : public ::testing::Test
{
};

// --- Format mapping -------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, CatalogueFormatsMapToTheirIRFormats)
{
    EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(mt::kPixelFormat_BGRA_4444_8u), 0x4u);
    EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(mt::kPixelFormat_BGRA_4444_32f), 0x5u);
    EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(mt::kPixelFormat_BGRP_4444_32f_Linear), 0xBu);
    EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(mt::kPixelFormat_VUYA_4444_8u), 0x104u);
    EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(mt::kPixelFormat_YUYV_422_8u), 0x200u);
    for (const mt::PixelFormat format :
         {mt::kPixelFormat_BGRA_4444_16u, mt::kPixelFormat_BGRA_4444_16f,
          mt::kPixelFormat_VUYA_4444_32f, mt::kPixelFormat_YUYV_422_8u_Fields,
          mt::kPixelFormat_MJPG_422_Compressed, mt::kPixelFormat_Any, mt::kPixelFormat_Invalid})
        EXPECT_EQ(VF::BEPixelFormatToIRPixelFormat(format), VF::kIR_PixelFormat_Invalid);
    EXPECT_FALSE(IR_IsValidPixelFormat(VF::kIR_PixelFormat_Invalid));
}

TEST_F(VideoFrameManipulatorsTest, IRFrameBufferDescribesPlaneZero)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 5, 3);
    const VF::IRFrameBuffer buffer = VF::GetIRFrameBuffer(*frame);
    EXPECT_EQ(buffer.mBase, frame->GetBaseAddress());
    EXPECT_EQ(buffer.mRowBytes, 128);
    EXPECT_EQ(buffer.mFormat, kIR_PixelFormat_BGRA_32f);
    EXPECT_EQ(buffer.mWidth, 5);
    EXPECT_EQ(buffer.mHeight, 3);
    frame->MarkShared(1);
    EXPECT_INPUT_CONTRACT(VF::GetWritableIRFrameBuffer(*frame), "!inFrame.IsShared()");
    const Frame sixteen = MakeFrame(mt::kPixelFormat_BGRA_4444_16u, 5, 3);
    EXPECT_FALSE(VF::GetIRFrameBuffer(*sixteen).IsAddressable());
}

// --- CopyFrame --------------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, EightBitToFloatAndBackStaysWithinOneCodeValue)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 16, 16);
    for (int32_t y = 0; y < 16; ++y)
        for (int32_t x = 0; x < 16; ++x)
        {
            const auto v = static_cast<uint8_t>(y * 16 + x);
            SetPixel8(source, x, y, v, static_cast<uint8_t>(255 - v), static_cast<uint8_t>(v / 2),
                      255);
        }
    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 16, 16);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, floats, mt::kRenderQuality_High),
              QRT::kResult_Success);
    EXPECT_NEAR(PixelF(floats, 3, 2)[0], 35.0f / 255.0f, 1e-6f);
    EXPECT_NEAR(PixelF(floats, 3, 2)[1], 220.0f / 255.0f, 1e-6f);
    EXPECT_NEAR(PixelF(floats, 3, 2)[3], 1.0f, 1e-6f);
    const Frame back = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 16, 16);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(floats, back, mt::kRenderQuality_High),
              QRT::kResult_Success);
    for (int32_t y = 0; y < 16; ++y)
        for (int32_t x = 0; x < 16; ++x)
            for (int c = 0; c < 4; ++c)
                EXPECT_NEAR(ReadPixel8(back, x, y)[c], ReadPixel8(source, x, y)[c], 1)
                    << x << "," << y << " channel " << c;
}

TEST_F(VideoFrameManipulatorsTest, HalvingWithNearestTakesTheLowerRightPixelOfEachBlock)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 4, 4);
    for (int32_t y = 0; y < 4; ++y)
        for (int32_t x = 0; x < 4; ++x)
            SetPixel8(source, x, y, static_cast<uint8_t>(10 * (4 * y + x)), 0, 0, 255);
    const Frame half = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, half, mt::kRenderQuality_Low),
              QRT::kResult_Success);
    // Destination pixel (x, y) samples source (2x + 1, 2y + 1).
    EXPECT_EQ(ReadPixel8(half, 0, 0)[0], 50);
    EXPECT_EQ(ReadPixel8(half, 1, 0)[0], 70);
    EXPECT_EQ(ReadPixel8(half, 0, 1)[0], 130);
    EXPECT_EQ(ReadPixel8(half, 1, 1)[0], 150);
}

TEST_F(VideoFrameManipulatorsTest, HalvingWithBilinearAveragesEachBlock)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 4, 4);
    for (int32_t y = 0; y < 4; ++y)
        for (int32_t x = 0; x < 4; ++x)
            SetPixel8(source, x, y, static_cast<uint8_t>(8 * (4 * y + x)), 0, 0, 255);
    const Frame half = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, half, mt::kRenderQuality_High),
              QRT::kResult_Success);
    // Block (0,0): 0, 8, 32, 40 -> 20.
    EXPECT_EQ(ReadPixel8(half, 0, 0)[0], 20);
    EXPECT_EQ(ReadPixel8(half, 1, 0)[0], 36);
    EXPECT_EQ(ReadPixel8(half, 0, 1)[0], 84);
    EXPECT_EQ(ReadPixel8(half, 1, 1)[0], 100);
    EXPECT_EQ(ReadPixel8(half, 1, 1)[3], 255);
}

TEST_F(VideoFrameManipulatorsTest, StagedFormatsConvertExactly)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 3, 2);
    SetPixel8(source, 0, 0, 0, 1, 2, 255);
    SetPixel8(source, 1, 0, 100, 128, 200, 255);
    SetPixel8(source, 2, 1, 255, 254, 17, 64);
    for (const mt::PixelFormat middle :
         {mt::kPixelFormat_BGRA_4444_16u, mt::kPixelFormat_BGRA_4444_16f})
    {
        const Frame staged = MakeFrame(middle, 3, 2);
        ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, staged, mt::kRenderQuality_High),
                  QRT::kResult_Success);
        const Frame back = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 3, 2);
        ASSERT_EQ(VideoFrameManipulators::CopyFrame(staged, back, mt::kRenderQuality_High),
                  QRT::kResult_Success);
        for (int32_t y = 0; y < 2; ++y)
            EXPECT_EQ(std::memcmp(ReadPixel8(back, 0, y), ReadPixel8(source, 0, y), 12), 0)
                << mt::GetPixelFormatName(middle) << " row " << y;
    }
    // 16-bit unsigned stores v * 257 for 8-bit v.
    const Frame sixteen = MakeFrame(mt::kPixelFormat_BGRA_4444_16u, 3, 2);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, sixteen, mt::kRenderQuality_High),
              QRT::kResult_Success);
    uint16_t stored[4];
    std::memcpy(stored, static_cast<const uint8_t*>(sixteen->GetBaseAddress()) + 8, 8);
    EXPECT_EQ(stored[0], 100 * 257);
    EXPECT_EQ(stored[1], 128 * 257);
    EXPECT_EQ(stored[2], 200 * 257);
    EXPECT_EQ(stored[3], 65535);
}

TEST_F(VideoFrameManipulatorsTest, FloatYCbCrRoundTripsAndStoresFullRangeLuma)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 1);
    SetPixel8(source, 0, 0, 255, 255, 255, 255);
    SetPixel8(source, 1, 0, 30, 160, 220, 128);
    const Frame yuv = MakeFrame(mt::kPixelFormat_VUYA_4444_32f, 2, 1);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(source, yuv, mt::kRenderQuality_High),
              QRT::kResult_Success);
    // White: Y' 1, no chroma.
    EXPECT_NEAR(PixelF(yuv, 0, 0)[2], 1.0f, 1e-5f);
    EXPECT_NEAR(PixelF(yuv, 0, 0)[0], 0.0f, 1e-5f);
    EXPECT_NEAR(PixelF(yuv, 0, 0)[1], 0.0f, 1e-5f);
    const Frame back = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 1);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(yuv, back, mt::kRenderQuality_High),
              QRT::kResult_Success);
    for (int c = 0; c < 4; ++c)
        EXPECT_NEAR(ReadPixel8(back, 1, 0)[c], ReadPixel8(source, 1, 0)[c], 1) << c;
}

TEST_F(VideoFrameManipulatorsTest, FieldsStoredApartAreReorderedExactly)
{
    const Frame interleaved = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 4, 5);
    for (int32_t y = 0; y < 5; ++y)
        std::memset(static_cast<uint8_t*>(interleaved->GetWritableBaseAddress()) +
                        y * interleaved->GetRowBytes(),
                    20 + 10 * y, 8);
    const Frame apart = MakeFrame(mt::kPixelFormat_YUYV_422_8u_Fields, 4, 5);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(interleaved, apart, mt::kRenderQuality_Draft),
              QRT::kResult_Success);
    // Memory rows: picture rows 0, 2, 4, then 1, 3.
    const auto* memory = static_cast<const uint8_t*>(apart->GetBaseAddress());
    const int expected[5] = {20, 40, 60, 30, 50};
    for (int32_t row = 0; row < 5; ++row)
        EXPECT_EQ(memory[row * apart->GetRowBytes()], expected[row]) << row;
    const Frame back = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 4, 5);
    ASSERT_EQ(VideoFrameManipulators::CopyFrame(apart, back, mt::kRenderQuality_Draft),
              QRT::kResult_Success);
    for (int32_t y = 0; y < 5; ++y)
        EXPECT_EQ(std::memcmp(static_cast<const uint8_t*>(back->GetBaseAddress()) +
                                  y * back->GetRowBytes(),
                              static_cast<const uint8_t*>(interleaved->GetBaseAddress()) +
                                  y * interleaved->GetRowBytes(),
                              8),
                  0);
}

TEST_F(VideoFrameManipulatorsTest, CopyFrameContracts)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    EXPECT_INPUT_CONTRACT(
        VideoFrameManipulators::CopyFrame(Frame(), frame, mt::kRenderQuality_High),
        "inSource != nullptr");
    EXPECT_INPUT_CONTRACT(
        VideoFrameManipulators::CopyFrame(frame, Frame(), mt::kRenderQuality_High),
        "inDestination != nullptr");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::CopyFrame(frame, frame, mt::kRenderQuality_High),
                          "inSource.Get() != inDestination.Get()");
}

TEST_F(VideoFrameManipulatorsTest, SharedFramesAreNeverWritten)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    FillRowsGrey(source, {10, 20});
    const Frame shared = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    FillRowsGrey(shared, {99, 99});
    shared->MarkShared(1);
    EXPECT_INPUT_CONTRACT(
        VideoFrameManipulators::CopyFrame(source, shared, mt::kRenderQuality_High),
        "!inDestination->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::SwapFields(source, shared),
                          "!inDestination->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::MergePulldownFrames(shared, source),
                          "!inDestination->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::OpaqueAlpha(shared), "!ioFrame->IsShared()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::InvertAlpha(shared), "!ioFrame->IsShared()");
    EXPECT_EQ(RowGreys(shared, 1), (std::vector<int>{99, 99}));
    // A shared source is read, not changed.
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    ASSERT_EQ(VideoFrameManipulators::SwapFields(shared, destination), QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{99, 99}));
}

// --- Fields -------------------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, InterlacedScalingKeepsEachFieldsRowsApart)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 8);
    source->SetFieldType(mt::kFieldType_UpperFirst);
    // First field rows 10..40, second field rows 110..140.
    FillRowsGrey(source, {10, 110, 20, 120, 30, 130, 40, 140});
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 4);
    destination->SetFieldType(mt::kFieldType_UpperFirst);
    ASSERT_EQ(VideoFrameManipulators::CopyFrameWithFields(
                  source, destination, mt::kRenderQuality_High, VF::kFieldSelection_First),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{15, 115, 35, 135}));
    // Scaling the frame as a whole mixes the fields.
    ASSERT_EQ(VideoFrameManipulators::CopyFrameWithFields(
                  source, destination, mt::kRenderQuality_High, VF::kFieldSelection_Frame),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{60, 70, 80, 90}));
}

TEST_F(VideoFrameManipulatorsTest, ProgressiveDestinationTakesTheSelectedFieldInTime)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 8);
    FillRowsGrey(source, {10, 110, 20, 120, 30, 130, 40, 140});
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 4);
    source->SetFieldType(mt::kFieldType_LowerFirst);
    // Lower first: the earlier field is rows 1, 3, 5, 7.
    ASSERT_EQ(VideoFrameManipulators::CopyFrameWithFields(
                  source, destination, mt::kRenderQuality_High, VF::kFieldSelection_First),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 1), (std::vector<int>{110, 120, 130, 140}));
    ASSERT_EQ(VideoFrameManipulators::CopyFrameWithFields(
                  source, destination, mt::kRenderQuality_High, VF::kFieldSelection_Second),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 1), (std::vector<int>{10, 20, 30, 40}));
    source->SetFieldType(mt::kFieldType_UpperFirst);
    ASSERT_EQ(VideoFrameManipulators::CopyFrameWithFields(
                  source, destination, mt::kRenderQuality_High, VF::kFieldSelection_First),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{10, 20, 30, 40}));
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::CopyFrameWithFields(source, destination,
                                                                      mt::kRenderQuality_High, 3),
                          "inFieldSelection == kFieldSelection_Frame || inFieldSelection == "
                          "kFieldSelection_First || inFieldSelection == kFieldSelection_Second");
}

TEST_F(VideoFrameManipulatorsTest, SwapFieldsExchangesRowPairs)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 3, 5);
    FillRowsGrey(source, {0, 10, 20, 30, 40});
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 3, 5);
    ASSERT_EQ(VideoFrameManipulators::SwapFields(source, destination), QRT::kResult_Success);
    // The unpaired last row takes the row above it.
    EXPECT_EQ(RowGreys(destination, 2), (std::vector<int>{10, 0, 30, 20, 30}));
    EXPECT_EQ(RowGreys(source, 2), (std::vector<int>{0, 10, 20, 30, 40}));
}

TEST_F(VideoFrameManipulatorsTest, SwapFieldsWorksOnPictureRowsOfFieldsStoredApart)
{
    const Frame source = MakeFrame(mt::kPixelFormat_YUYV_422_8u_Fields, 2, 4);
    auto* memory = static_cast<uint8_t*>(source->GetWritableBaseAddress());
    // Memory rows hold picture rows 0, 2, 1, 3.
    const uint8_t pictureRowValue[4] = {1, 2, 3, 4};
    const int memoryRowOfPicture[4] = {0, 2, 1, 3};
    for (int row = 0; row < 4; ++row)
        std::memset(memory + memoryRowOfPicture[row] * source->GetRowBytes(), pictureRowValue[row],
                    4);
    const Frame destination = MakeFrame(mt::kPixelFormat_YUYV_422_8u_Fields, 2, 4);
    ASSERT_EQ(VideoFrameManipulators::SwapFields(source, destination), QRT::kResult_Success);
    const auto* out = static_cast<const uint8_t*>(destination->GetBaseAddress());
    const int expectedPicture[4] = {2, 1, 4, 3};
    for (int row = 0; row < 4; ++row)
        EXPECT_EQ(out[memoryRowOfPicture[row] * destination->GetRowBytes()], expectedPicture[row])
            << row;
}

TEST_F(VideoFrameManipulatorsTest, VerticalConvolveWeightsOneTwoOne)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 4);
    FillRowsGrey(source, {0, 40, 80, 0});
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 4);
    ASSERT_EQ(VideoFrameManipulators::VerticalConvolve(source, destination), QRT::kResult_Success);
    // (3*0 + 40) / 4, (0 + 80 + 80) / 4, (40 + 160 + 0) / 4, (80 + 3*0) / 4.
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{10, 40, 50, 20}));
    EXPECT_EQ(ReadPixel8(destination, 1, 2)[3], 255);

    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 1, 3);
    PixelF(floats, 0, 0)[0] = 1.0f;
    PixelF(floats, 0, 1)[0] = 0.0f;
    PixelF(floats, 0, 2)[0] = 0.5f;
    const Frame filtered = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 1, 3);
    ASSERT_EQ(VideoFrameManipulators::VerticalConvolve(floats, filtered), QRT::kResult_Success);
    EXPECT_FLOAT_EQ(PixelF(filtered, 0, 0)[0], 0.75f);
    EXPECT_FLOAT_EQ(PixelF(filtered, 0, 1)[0], 0.375f);
    EXPECT_FLOAT_EQ(PixelF(filtered, 0, 2)[0], 0.375f);
}

TEST_F(VideoFrameManipulatorsTest, VerticalConvolveRefusesMismatchedFrames)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 4);
    const Frame taller = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 5);
    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 2, 4);
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::VerticalConvolve(source, taller),
                          "inSource->GetBounds() == inDestination->GetBounds()");
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::VerticalConvolve(source, floats),
                          "inSource->GetPixelFormat() == inDestination->GetPixelFormat()");
}

TEST_F(VideoFrameManipulatorsTest, MergePulldownTakesTheMissingFieldByHeight)
{
    const Frame current = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 6);
    FillRowsGrey(current, std::vector<uint8_t>(6, 1));
    const Frame previous = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 6);
    FillRowsGrey(previous, std::vector<uint8_t>(6, 2));
    ASSERT_EQ(VideoFrameManipulators::MergePulldownFrames(current, previous), QRT::kResult_Success);
    EXPECT_EQ(RowGreys(current, 1), (std::vector<int>{2, 1, 2, 1, 2, 1}));
    EXPECT_EQ(RowGreys(previous, 1), std::vector<int>(6, 2));

    // Above 576 rows the second field comes from the previous frame.
    const Frame tallCurrent = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 1, 578);
    FillRowsGrey(tallCurrent, std::vector<uint8_t>(578, 1));
    const Frame tallPrevious = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 1, 578);
    FillRowsGrey(tallPrevious, std::vector<uint8_t>(578, 2));
    ASSERT_EQ(VideoFrameManipulators::MergePulldownFrames(tallCurrent, tallPrevious),
              QRT::kResult_Success);
    const std::vector<int> rows = RowGreys(tallCurrent, 0);
    EXPECT_EQ(rows[0], 1);
    EXPECT_EQ(rows[1], 2);
    EXPECT_EQ(rows[576], 1);
    EXPECT_EQ(rows[577], 2);
}

// --- Rectangles ---------------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, CopyRectScalesIntoTheRectangleAndKeepsTheRest)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    FillRowsGrey(source, {50, 150});
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 6, 6);
    FillRowsGrey(destination, std::vector<uint8_t>(6, 7));
    ASSERT_EQ(VideoFrameManipulators::CopyRect(source, QRT::ParamRect(0, 0, 2, 2), destination,
                                               QRT::ParamRect(1, 2, 5, 6), mt::kRenderQuality_Low,
                                               VF::kCopyChannels_All),
              QRT::kResult_Success);
    EXPECT_EQ(RowGreys(destination, 0), (std::vector<int>{7, 7, 7, 7, 7, 7}));
    EXPECT_EQ(RowGreys(destination, 1), (std::vector<int>{7, 7, 50, 50, 150, 150}));
    EXPECT_EQ(RowGreys(destination, 4), (std::vector<int>{7, 7, 50, 50, 150, 150}));
    EXPECT_EQ(RowGreys(destination, 5), (std::vector<int>{7, 7, 7, 7, 7, 7}));
}

TEST_F(VideoFrameManipulatorsTest, CopyRectCanCopyAlphaAlone)
{
    const Frame source = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 1);
    SetPixel8(source, 0, 0, 1, 2, 3, 40);
    SetPixel8(source, 1, 0, 4, 5, 6, 80);
    const Frame destination = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 1);
    SetPixel8(destination, 0, 0, 100, 101, 102, 255);
    SetPixel8(destination, 1, 0, 103, 104, 105, 255);
    ASSERT_EQ(VideoFrameManipulators::CopyRect(source, source->GetBounds(), destination,
                                               destination->GetBounds(), mt::kRenderQuality_High,
                                               VF::kCopyChannels_Alpha),
              QRT::kResult_Success);
    const uint8_t expected[8] = {100, 101, 102, 40, 103, 104, 105, 80};
    EXPECT_EQ(std::memcmp(ReadPixel8(destination, 0, 0), expected, 8), 0);
    EXPECT_INPUT_CONTRACT(VideoFrameManipulators::CopyRect(source, QRT::ParamRect(0, 0, 3, 1),
                                                           destination, destination->GetBounds(),
                                                           mt::kRenderQuality_High,
                                                           VF::kCopyChannels_All),
                          "inSource->CanProvideRect(inSourceRect)");
}

// --- Alpha ---------------------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, OpaqueAndInvertAlphaChangeOnlyAlpha)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 3, 1);
    SetPixel8(frame, 0, 0, 1, 2, 3, 0);
    SetPixel8(frame, 1, 0, 4, 5, 6, 100);
    SetPixel8(frame, 2, 0, 7, 8, 9, 255);
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(frame), QRT::kResult_Success);
    const uint8_t inverted[12] = {1, 2, 3, 255, 4, 5, 6, 155, 7, 8, 9, 0};
    EXPECT_EQ(std::memcmp(ReadPixel8(frame, 0, 0), inverted, 12), 0);
    EXPECT_FALSE(frame->IsAlphaOpaque());
    ASSERT_EQ(VideoFrameManipulators::OpaqueAlpha(frame), QRT::kResult_Success);
    const uint8_t opaque[12] = {1, 2, 3, 255, 4, 5, 6, 255, 7, 8, 9, 255};
    EXPECT_EQ(std::memcmp(ReadPixel8(frame, 0, 0), opaque, 12), 0);
    // The remembered analysis was dropped.
    EXPECT_TRUE(frame->IsAlphaOpaque());
}

TEST_F(VideoFrameManipulatorsTest, InvertAlphaReassociatesPremultipliedColour)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRP_4444_32f_Linear, 2, 1);
    float* pixel = PixelF(frame, 0, 0);
    pixel[0] = 0.2f;
    pixel[3] = 0.25f;
    PixelF(frame, 1, 0)[0] = 0.5f; // colour under alpha 0
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(frame), QRT::kResult_Success);
    EXPECT_FLOAT_EQ(PixelF(frame, 0, 0)[0], 0.6f);
    EXPECT_FLOAT_EQ(PixelF(frame, 0, 0)[3], 0.75f);
    EXPECT_FLOAT_EQ(PixelF(frame, 1, 0)[0], 0.0f);
    EXPECT_FLOAT_EQ(PixelF(frame, 1, 0)[3], 1.0f);
}

TEST_F(VideoFrameManipulatorsTest, OpaqueAlphaOnSixteenBitAndNoAlphaFormats)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_16f, 1, 1);
    ASSERT_EQ(VideoFrameManipulators::OpaqueAlpha(frame), QRT::kResult_Success);
    uint16_t alpha;
    std::memcpy(&alpha, static_cast<const uint8_t*>(frame->GetBaseAddress()) + 6, 2);
    EXPECT_EQ(alpha, 0x3C00); // 1.0
    const Frame yuyv = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 2, 1);
    ASSERT_EQ(VideoFrameManipulators::InvertAlpha(yuyv), QRT::kResult_Success);
    EXPECT_EQ(static_cast<const uint8_t*>(yuyv->GetBaseAddress())[3], 0);
}

// --- Addressable frames ----------------------------------------------------------------

TEST_F(VideoFrameManipulatorsTest, AddressableFrameIsTheFrameItselfWhenPossible)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    EXPECT_EQ(VideoFrameManipulators::MakeAddressableVideoFrame(
                  frame, mt::kPixelFormat_BGRA_4444_8u, mt::kRenderQuality_High)
                  .Get(),
              frame.Get());
    EXPECT_EQ(VideoFrameManipulators::MakeAddressableVideoFrame(frame, mt::kPixelFormat_Any,
                                                                mt::kRenderQuality_High)
                  .Get(),
              frame.Get());
}

TEST_F(VideoFrameManipulatorsTest, AddressableFrameIsACopyInAnotherFormatOrWithoutAddress)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    FillRowsGrey(frame, {51, 102});
    frame->SetFieldType(mt::kFieldType_LowerFirst);
    const Frame floats = VideoFrameManipulators::MakeAddressableVideoFrame(
        frame, mt::kPixelFormat_BGRA_4444_32f, mt::kRenderQuality_High);
    ASSERT_TRUE(floats);
    EXPECT_NE(floats.Get(), frame.Get());
    EXPECT_EQ(floats->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_32f);
    EXPECT_EQ(floats->GetFieldType(), mt::kFieldType_LowerFirst);
    EXPECT_NEAR(PixelF(floats, 1, 1)[1], 0.4f, 1e-6f);

    const Frame wrapped = QRT::Allocated<FrameWithoutAddress>::Create<MF::IVideoFrame>(frame);
    const Frame copy = VideoFrameManipulators::MakeAddressableVideoFrame(
        wrapped, mt::kPixelFormat_BGRA_4444_8u, mt::kRenderQuality_High);
    ASSERT_TRUE(copy);
    EXPECT_NE(copy.Get(), wrapped.Get());
    EXPECT_TRUE(QRT::QueryRef<MF::IVideoFrameBaseAddress>(copy));
    EXPECT_EQ(RowGreys(copy, 0), (std::vector<int>{51, 102}));
    EXPECT_EQ(ReferenceCount(frame), 2u); // the test's and the wrapper's
}

} // namespace
