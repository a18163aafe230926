#include "VF/VideoFrame.h"

#include "ContractExpect.h"
#include "VF/FrameMemoryPool.h"

#include <cstring>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::PixelFormat;
using QRT::InterfaceRef;
namespace mt = mvxmediatypes;

// A 4:2:0 planar 8-bit format, not in the catalogue, to check planar layout.
constexpr PixelFormat kPlanar420 = PixelFormat::Make(
    mt::MakePixelFormatCode('I', '4', '2', '0'),
    mt::MakePixelProperties(true, mt::kPixelSampleKind_8u, 3, false, false, mt::kPixelChroma_420,
                            false, mt::kPixelFieldLayout_Interleaved, 1, 8));

InterfaceRef<MF::IVideoFrame> MakeFrame(PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                                        bool inClear = false, bool inTrack = false)
{
    InterfaceRef<MF::IVideoFrame> frame;
    EXPECT_EQ(VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square,
                                   inClear, inTrack, frame),
              QRT::kResult_Success);
    return frame;
}

void FillBytes(MF::IVideoFrame& ioFrame, uint8_t inValue)
{
    std::memset(ioFrame.GetWritableBaseAddress(), inValue, ioFrame.GetDataSize());
}

bool AllBytesAre(const MF::IVideoFrame& inFrame, uint8_t inValue)
{
    const auto* bytes = static_cast<const uint8_t*>(inFrame.GetBaseAddress());
    for (size_t i = 0; i < inFrame.GetDataSize(); ++i)
        if (bytes[i] != inValue)
            return false;
    return true;
}

class VideoFrameTest : public ::testing::Test
{
};

TEST_F(VideoFrameTest, NewFrameHasRequestedAttributesAndDefaults)
{
    InterfaceRef<MF::IVideoFrame> frame;
    ASSERT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 100, 3,
                                   mt::kPixelAspectRatio_D1PAL, false, false, frame),
              QRT::kResult_Success);
    EXPECT_EQ(frame->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 100, 3));
    EXPECT_EQ(frame->GetRowBytes(), 448); // 400 rounded up to 64
    EXPECT_EQ(frame->GetDataSize(), 448u * 3);
    EXPECT_EQ(frame->GetPixelAspectRatio().GetNumerator(), 59u);
    EXPECT_EQ(frame->GetPixelAspectRatio().GetDenominator(), 54u);
    EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_Progressive);
    EXPECT_EQ(frame->GetAlphaChannel(), mt::kAlphaChannel_Straight);
    EXPECT_TRUE(frame->HasAlpha());
    EXPECT_EQ(frame->GetRenderTime(), 0u);
    uint32_t x = 0, y = 0;
    frame->GetOriginOffset(x, y);
    EXPECT_EQ(x, 0xFFFFFFFFu);
    EXPECT_EQ(y, 0xFFFFFFFFu);
    EXPECT_FALSE(frame->HasFullFrame(0));
    EXPECT_EQ(frame->GetFullFrameRect(), QRT::ParamRect());
    EXPECT_FALSE(frame->TracksVisibleContent());
    EXPECT_EQ(frame->GetVisibleContentRect(), QRT::ParamRect(0, 0, 100, 3));
    EXPECT_FALSE(frame->IsShared());
    EXPECT_EQ(frame->GetPlaneCount(), 1u);
}

TEST_F(VideoFrameTest, SettersChangeAttributes)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 8, 8);
    frame->SetFieldType(mt::kFieldType_LowerFirst);
    frame->SetPixelAspectRatio(mt::kPixelAspectRatio_Anamorphic);
    frame->SetAlphaChannel(mt::kAlphaChannel_Ignore);
    frame->SetOriginOffset(3, 4);
    frame->SetRenderTime(17);
    EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_LowerFirst);
    EXPECT_EQ(frame->GetPixelAspectRatio().GetNumerator(), 2u);
    EXPECT_EQ(frame->GetAlphaChannel(), mt::kAlphaChannel_Ignore);
    EXPECT_FALSE(frame->HasAlpha()); // ignored alpha does not count
    uint32_t x = 0, y = 0;
    frame->GetOriginOffset(x, y);
    EXPECT_EQ(x, 3u);
    EXPECT_EQ(y, 4u);
    EXPECT_EQ(frame->GetRenderTime(), 17u);
}

TEST_F(VideoFrameTest, EveryRowOfEveryFormatIs64ByteAligned)
{
    const PixelFormat formats[] = {mt::kPixelFormat_BGRA_4444_8u,
                                   mt::kPixelFormat_BGRA_4444_16u,
                                   mt::kPixelFormat_BGRA_4444_16f,
                                   mt::kPixelFormat_BGRA_4444_32f,
                                   mt::kPixelFormat_BGRP_4444_32f_Linear,
                                   mt::kPixelFormat_VUYA_4444_8u,
                                   mt::kPixelFormat_YUYV_422_8u,
                                   mt::kPixelFormat_YUYV_422_8u_Fields,
                                   mt::kPixelFormat_YUYV_422_8u_HalfWidthFields,
                                   kPlanar420};
    for (const PixelFormat format : formats)
    {
        for (const uint32_t width : {1u, 3u, 17u, 719u, 1920u})
        {
            auto frame = MakeFrame(format, width, 5);
            ASSERT_TRUE(frame);
            for (uint32_t plane = 0; plane < frame->GetPlaneCount(); ++plane)
            {
                const auto base = reinterpret_cast<uintptr_t>(frame->GetPlaneBaseAddress(plane));
                const int32_t rowBytes = frame->GetPlaneRowBytes(plane);
                EXPECT_EQ(rowBytes % 64, 0) << width;
                for (uint32_t row = 0; row < 5; ++row)
                    EXPECT_EQ((base + size_t(rowBytes) * row) % 64, 0u) << width << " " << plane;
            }
        }
    }
}

TEST_F(VideoFrameTest, LayoutOfPackedHalvedAndPlanarFormats)
{
    VF::FrameLayout layout;
    // 16 bytes per pixel: 17 * 16 = 272, rounded to 320.
    ASSERT_EQ(VF::ComputeFrameLayout(mt::kPixelFormat_BGRA_4444_32f, 17, 2, layout),
              QRT::kResult_Success);
    EXPECT_EQ(layout.mPlanes[0].mRowBytes, 320);
    EXPECT_EQ(layout.mTotalBytes, 640u);
    // 4:2:2 with an odd width keeps room for the last pixel pair: 4 pixels * 2 bytes.
    ASSERT_EQ(VF::ComputeFrameLayout(mt::kPixelFormat_YUYV_422_8u, 33, 1, layout),
              QRT::kResult_Success);
    EXPECT_EQ(layout.mPlanes[0].mRowBytes, 128); // 34 * 2 = 68 -> 128
    // Half-width storage: the width counts 4-byte pixel pairs.
    ASSERT_EQ(
        VF::ComputeFrameLayout(mt::kPixelFormat_YUYV_422_8u_HalfWidthFields, 960, 1080, layout),
        QRT::kResult_Success);
    EXPECT_EQ(layout.mPlanes[0].mRowBytes, 3840);
    // 4:2:0: Y, then Cb and Cr at half size rounded up, each plane 64-aligned.
    ASSERT_EQ(VF::ComputeFrameLayout(kPlanar420, 130, 5, layout), QRT::kResult_Success);
    ASSERT_EQ(layout.mPlaneCount, 3u);
    EXPECT_EQ(layout.mPlanes[0].mRowBytes, 192);
    EXPECT_EQ(layout.mPlanes[0].mRows, 5u);
    EXPECT_EQ(layout.mPlanes[1].mOffset, 192u * 5);
    EXPECT_EQ(layout.mPlanes[1].mRowBytes, 128); // 65 -> 128
    EXPECT_EQ(layout.mPlanes[1].mRows, 3u);
    EXPECT_EQ(layout.mPlanes[2].mOffset, 192u * 5 + 128 * 3);
    EXPECT_EQ(layout.mTotalBytes, 192u * 5 + 128 * 3 * 2);
}

TEST_F(VideoFrameTest, BadFormatsAndSizesGiveStatusesAndNoFrame)
{
    InterfaceRef<MF::IVideoFrame> frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_Invalid, 2, 2, mt::kPixelAspectRatio_Square,
                                   false, false, frame),
              VF::kResult_InvalidPixelFormat);
    EXPECT_FALSE(frame); // emptied on failure
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_Any, 2, 2, mt::kPixelAspectRatio_Square, false,
                                   false, frame),
              VF::kResult_InvalidPixelFormat);
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_MJPG_422_Compressed, 2, 2,
                                   mt::kPixelAspectRatio_Square, false, false, frame),
              VF::kResult_InvalidPixelFormat);
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 0, 2,
                                   mt::kPixelAspectRatio_Square, false, false, frame),
              VF::kResult_InvalidFrameSize);
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 0,
                                   mt::kPixelAspectRatio_Square, false, false, frame),
              VF::kResult_InvalidFrameSize);
    EXPECT_EQ(VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, VF::kMaxFrameDimension + 1, 2,
                                   mt::kPixelAspectRatio_Square, false, false, frame),
              VF::kResult_InvalidFrameSize);
    EXPECT_FALSE(VF::CreateVideoFrame(mt::kPixelFormat_Invalid, 2, 2, mt::kPixelAspectRatio_Square,
                                      true, true));
}

TEST_F(VideoFrameTest, ClearFlagZeroesARecycledDirtyBuffer)
{
    const void* dirtyAddress = nullptr;
    {
        auto dirty = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 333, 77);
        FillBytes(*dirty, 0xAB);
        dirtyAddress = dirty->GetBaseAddress();
    }
    auto cleared = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 333, 77, true, false);
    // The pool hands the dirty buffer out again, and it arrives zeroed.
    EXPECT_EQ(cleared->GetBaseAddress(), dirtyAddress);
    EXPECT_TRUE(AllBytesAre(*cleared, 0));
}

TEST_F(VideoFrameTest, TrackingFlagStartsEmptyClearedAndGrows)
{
    {
        auto dirty = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 16);
        FillBytes(*dirty, 0x5A);
    }
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 16, false, true);
    EXPECT_TRUE(frame->TracksVisibleContent());
    EXPECT_EQ(frame->GetVisibleContentRect(), QRT::ParamRect());
    EXPECT_TRUE(AllBytesAre(*frame, 0));
    frame->GrowVisibleContentRect(QRT::ParamRect(4, 4, 10, 8));
    frame->GrowVisibleContentRect(QRT::ParamRect(20, 2, 30, 5));
    EXPECT_EQ(frame->GetVisibleContentRect(), QRT::ParamRect(4, 2, 30, 8));
    // Clipped to the bounds.
    frame->GrowVisibleContentRect(QRT::ParamRect(-5, -5, 100, 3));
    EXPECT_EQ(frame->GetVisibleContentRect(), QRT::ParamRect(0, 0, 64, 8));
    // An untracked frame ignores growth and answers its bounds.
    auto untracked = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 64, 16);
    untracked->GrowVisibleContentRect(QRT::ParamRect(1, 1, 2, 2));
    EXPECT_EQ(untracked->GetVisibleContentRect(), QRT::ParamRect(0, 0, 64, 16));
}

TEST_F(VideoFrameTest, FullFrameQueryAndRectangleQuery)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 40, 30);
    frame->SetFullFrameRect(QRT::ParamRect(0, 0, 40, 30));
    EXPECT_TRUE(frame->HasFullFrame(0));
    EXPECT_TRUE(frame->HasFullFrame(1));
    frame->SetFullFrameRect(QRT::ParamRect(0, 0, 80, 60)); // a part of a larger frame
    EXPECT_TRUE(frame->HasFullFrame(0));
    EXPECT_FALSE(frame->HasFullFrame(1));
    EXPECT_EQ(frame->GetFullFrameRect(), QRT::ParamRect(0, 0, 80, 60));
    frame->SetFullFrameRect(QRT::ParamRect());
    EXPECT_FALSE(frame->HasFullFrame(0));
    EXPECT_INPUT_CONTRACT(frame->HasFullFrame(2), "inWhole == 0 || inWhole == 1");
    EXPECT_INPUT_CONTRACT(frame->SetFullFrameRect(QRT::ParamRect(5, 5, 5, 9)),
                          "IsAllZero(inRect) || !inRect.IsEmpty()");
    EXPECT_TRUE(frame->CanProvideRect(QRT::ParamRect(0, 0, 40, 30)));
    EXPECT_TRUE(frame->CanProvideRect(QRT::ParamRect(10, 10, 20, 20)));
    EXPECT_FALSE(frame->CanProvideRect(QRT::ParamRect(0, 0, 41, 30)));
    EXPECT_FALSE(frame->CanProvideRect(QRT::ParamRect(-1, 0, 10, 10)));
}

TEST_F(VideoFrameTest, SharedFrameRefusesEveryWriteButRenderTime)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 8, 8);
    frame->MarkShared(0); // unmarking an unshared frame does nothing
    EXPECT_FALSE(frame->IsShared());
    frame->MarkShared(1);
    EXPECT_TRUE(frame->IsShared());
    EXPECT_NE(frame->GetBaseAddress(), nullptr);
    EXPECT_INPUT_CONTRACT(frame->GetWritableBaseAddress(), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->GetWritablePlaneBaseAddress(0), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->SetFieldType(mt::kFieldType_UpperFirst), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->SetOriginOffset(1, 1), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->SetVisibleContentRect(QRT::ParamRect()), "!IsShared()");
    EXPECT_INPUT_CONTRACT(frame->MarkShared(0), "inShared != 0 || !IsShared()");
    EXPECT_EQ(frame->GetFieldType(), mt::kFieldType_Progressive);
    frame->SetRenderTime(9);
    EXPECT_EQ(frame->GetRenderTime(), 9u);
    EXPECT_INPUT_CONTRACT(frame->GetPlaneRowBytes(1), "inPlane < mLayout.mPlaneCount");
}

TEST_F(VideoFrameTest, PixelAccessInterfacesAnswerRowBytesAndBaseAddress)
{
    EXPECT_EQ(MF::IVideoFrameRowBytes::kIID, QRT::Guid("{282d21cf-d8da-4e4f-82be-6e9c176ca796}"));
    EXPECT_EQ(MF::IVideoFrameBaseAddress::kIID,
              QRT::Guid("{58d1d4d6-e9fb-4fe0-a8bc-3a3c7634eb3b}"));
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_16u, 21, 4);
    auto rowBytes = QRT::QueryRef<MF::IVideoFrameRowBytes>(frame);
    auto baseAddress = QRT::QueryRef<MF::IVideoFrameBaseAddress>(frame);
    ASSERT_TRUE(rowBytes);
    ASSERT_TRUE(baseAddress);
    EXPECT_EQ(rowBytes->GetRowBytes(), 192); // 21 * 8 = 168 -> 192
    EXPECT_EQ(baseAddress->GetBaseAddress(), frame->GetBaseAddress());
    EXPECT_EQ(baseAddress->GetWritableBaseAddress(), frame->GetBaseAddress());
    frame->MarkShared(1);
    EXPECT_INPUT_CONTRACT(baseAddress->GetWritableBaseAddress(), "!IsShared()");
    // Back to the frame interface through the access interface.
    EXPECT_TRUE(QRT::QueryRef<MF::IVideoFrame>(rowBytes) == frame);
}

TEST_F(VideoFrameTest, AlphaAnalysisIsRememberedUntilAlphaChanged)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 5, 3, true, false);
    EXPECT_FALSE(frame->IsAlphaOpaque()); // cleared: transparent
    FillBytes(*frame, 0xFF);
    EXPECT_FALSE(frame->IsAlphaOpaque()); // remembered
    frame->AlphaChanged();
    EXPECT_TRUE(frame->IsAlphaOpaque());
    // One transparent pixel in the last row.
    auto* last = static_cast<uint8_t*>(frame->GetWritableBaseAddress()) + 2 * frame->GetRowBytes();
    last[4 * 4 + 3] = 0x7F;
    frame->AlphaChanged();
    EXPECT_FALSE(frame->IsAlphaOpaque());

    auto floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 2, 1, true, false);
    float pixels[8] = {0, 0, 0, 1.0f, 0.5f, 0.5f, 0.5f, 1.0f};
    std::memcpy(floats->GetWritableBaseAddress(), pixels, sizeof pixels);
    EXPECT_TRUE(floats->IsAlphaOpaque());

    auto noAlpha = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 4, 2, true, false);
    EXPECT_FALSE(noAlpha->HasAlpha());
    EXPECT_EQ(noAlpha->GetAlphaChannel(), mt::kAlphaChannel_None);
    EXPECT_TRUE(noAlpha->IsAlphaOpaque());
    auto premultiplied = MakeFrame(mt::kPixelFormat_BGRP_4444_32f_Linear, 4, 2);
    EXPECT_EQ(premultiplied->GetAlphaChannel(), mt::kAlphaChannel_Premultiplied);
}

TEST_F(VideoFrameTest, CreateEmptyFrameCopiesAttributesNotPixels)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 12, 6);
    FillBytes(*frame, 0x11);
    frame->SetFieldType(mt::kFieldType_UpperFirst);
    frame->SetOriginOffset(2, 1);
    frame->SetFullFrameRect(QRT::ParamRect(0, 0, 24, 12));
    frame->SetRenderTime(40);
    frame->MarkShared(1);
    auto empty = frame->CreateEmptyFrame(true);
    EXPECT_FALSE(empty->IsShared());
    EXPECT_EQ(empty->GetBounds(), frame->GetBounds());
    EXPECT_EQ(empty->GetFieldType(), mt::kFieldType_UpperFirst);
    uint32_t x = 0, y = 0;
    empty->GetOriginOffset(x, y);
    EXPECT_EQ(x, 2u);
    EXPECT_EQ(y, 1u);
    EXPECT_EQ(empty->GetFullFrameRect(), QRT::ParamRect(0, 0, 24, 12));
    EXPECT_EQ(empty->GetRenderTime(), 0u);
    EXPECT_TRUE(AllBytesAre(*empty, 0));
    EXPECT_TRUE(AllBytesAre(*frame, 0x11));
}

class CopyOnWriteTest : public ::testing::Test
{
};

TEST_F(CopyOnWriteTest, SoleUnsharedHolderWritesInPlace)
{
    auto frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 16, 4);
    MF::IVideoFrame* original = frame.Get();
    frame = VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_High);
    EXPECT_EQ(frame.Get(), original);
}

TEST_F(CopyOnWriteTest, SharedFrameYieldsACopyAndStaysUnchanged)
{
    auto original = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 16, 4);
    FillBytes(*original, 0x22);
    original->SetFieldType(mt::kFieldType_LowerFirst);
    original->SetPixelAspectRatio(mt::kPixelAspectRatio_D1NTSC);
    original->SetAlphaChannel(mt::kAlphaChannel_Premultiplied);
    original->SetOriginOffset(7, 8);
    original->SetFullFrameRect(QRT::ParamRect(0, 0, 32, 8));
    original->SetVisibleContentRect(QRT::ParamRect(1, 1, 5, 3));
    original->SetRenderTime(12);
    original->MarkShared(1);

    auto writable = VF::MakeWriteableVideoFrame(original, mt::kRenderQuality_Draft);
    ASSERT_TRUE(writable);
    EXPECT_NE(writable.Get(), original.Get());
    EXPECT_FALSE(writable->IsShared());
    EXPECT_TRUE(AllBytesAre(*writable, 0x22));
    EXPECT_EQ(writable->GetPixelFormat(), original->GetPixelFormat());
    EXPECT_EQ(writable->GetBounds(), original->GetBounds());
    EXPECT_EQ(writable->GetFieldType(), mt::kFieldType_LowerFirst);
    EXPECT_EQ(writable->GetPixelAspectRatio().GetNumerator(), 10u);
    EXPECT_EQ(writable->GetAlphaChannel(), mt::kAlphaChannel_Premultiplied);
    uint32_t x = 0, y = 0;
    writable->GetOriginOffset(x, y);
    EXPECT_EQ(x, 7u);
    EXPECT_EQ(y, 8u);
    EXPECT_EQ(writable->GetFullFrameRect(), QRT::ParamRect(0, 0, 32, 8));
    EXPECT_EQ(writable->GetVisibleContentRect(), QRT::ParamRect(1, 1, 5, 3));
    EXPECT_EQ(writable->GetRenderTime(), 12u);

    FillBytes(*writable, 0x99);
    writable->SetFieldType(mt::kFieldType_Progressive);
    EXPECT_TRUE(AllBytesAre(*original, 0x22));
    EXPECT_EQ(original->GetFieldType(), mt::kFieldType_LowerFirst);
}

TEST_F(CopyOnWriteTest, FrameHeldTwiceYieldsACopy)
{
    auto frame = MakeFrame(mt::kPixelFormat_YUYV_422_8u, 9, 3);
    FillBytes(*frame, 0x33);
    const InterfaceRef<MF::IVideoFrame> otherHolder = frame;
    auto writable = VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_Max);
    EXPECT_NE(writable.Get(), otherHolder.Get());
    FillBytes(*writable, 0x44);
    EXPECT_TRUE(AllBytesAre(*otherHolder, 0x33));
    // Once the other holder lets go, the copy is written in place.
    MF::IVideoFrame* copy = writable.Get();
    writable = VF::MakeWriteableVideoFrame(writable, mt::kRenderQuality_Max);
    EXPECT_EQ(writable.Get(), copy);
}

TEST_F(CopyOnWriteTest, PlanarFrameCopiesEveryPlane)
{
    auto frame = MakeFrame(kPlanar420, 70, 9);
    for (uint32_t plane = 0; plane < 3; ++plane)
        std::memset(frame->GetWritablePlaneBaseAddress(plane), int(plane + 1),
                    size_t(frame->GetPlaneRowBytes(plane)) * (plane == 0 ? 9 : 5));
    frame->MarkShared(1);
    auto copy = VF::MakeWriteableVideoFrame(frame, mt::kRenderQuality_High);
    for (uint32_t plane = 0; plane < 3; ++plane)
    {
        const auto* bytes = static_cast<const uint8_t*>(copy->GetPlaneBaseAddress(plane));
        const size_t size = size_t(copy->GetPlaneRowBytes(plane)) * (plane == 0 ? 9 : 5);
        EXPECT_EQ(bytes[0], plane + 1);
        EXPECT_EQ(bytes[size - 1], plane + 1);
    }
}

TEST_F(CopyOnWriteTest, NullFrameIsAContractError)
{
    EXPECT_INPUT_CONTRACT(
        VF::MakeWriteableVideoFrame(InterfaceRef<MF::IVideoFrame>(), mt::kRenderQuality_High),
        "inFrame != nullptr");
}

} // namespace
