#include "VF/SDKPixelFormat.h"

#include "FrameTestSupport.h"
#include "VF/OvPix.h"

#include <gtest/gtest.h>

namespace
{

using namespace vftest;

// A code from its four characters, the first in the lowest byte.
constexpr VF::OvPixelFormat Code(const char (&inChars)[5])
{
    return uint32_t(uint8_t(inChars[0])) | uint32_t(uint8_t(inChars[1])) << 8 |
           uint32_t(uint8_t(inChars[2])) << 16 | uint32_t(uint8_t(inChars[3])) << 24;
}

using SDKPixelFormatTest = ::testing::Test;

TEST_F(SDKPixelFormatTest, CatalogueFormatsHaveTheirCodesBothWays)
{
    const std::pair<mt::PixelFormat, VF::OvPixelFormat> table[] = {
        {mt::kPixelFormat_BGRA_4444_8u, Code("BGRA")},
        {mt::kPixelFormat_BGRP_4444_32f_Linear, Code("BPLf")},
        {mt::kPixelFormat_YUYV_422_8u, Code("YUY2")},
        {mt::kPixelFormat_MJPG_422_Compressed, Code("MJPG")},
    };
    for (const auto& [format, code] : table)
        EXPECT_EQ(std::tuple(VF::BEToSDKPixelFormat(format), VF::SDKToBEPixelFormat(code),
                             VF::IsValidSDKPixelFormat(code)),
                  std::tuple(code, format, true))
            << mt::GetPixelFormatName(format);
    EXPECT_EQ(VF::BEToSDKPixelFormat(mt::kPixelFormat_Any), VF::kOvPixelFormat_Invalid);
    for (const VF::OvPixelFormat code : {VF::kOvPixelFormat_Invalid, Code("ARGB")})
        EXPECT_EQ(std::pair(VF::IsValidSDKPixelFormat(code), VF::SDKToBEPixelFormat(code)),
                  std::pair(false, mt::kPixelFormat_Invalid));
}

using OvPixTest = ::testing::Test;

TEST_F(OvPixTest, HandleDescribesASharedFrameReadOnlyAndHoldsItUntilDisposed)
{
    Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 5, 3);
    frame->MarkShared(1);
    MF::IVideoFrame* const raw = frame.Get();
    const size_t liveBefore = VF::GetLiveOvPixCount();
    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
    ASSERT_NE(handle, nullptr);
    EXPECT_EQ(std::tuple(handle->mLeft, handle->mTop, handle->mRight, handle->mBottom,
                         handle->mRowBytes, handle->mPixelFormat, handle->mPixels,
                         handle->mReadOnly),
              std::tuple(0, 0, 5, 3, frame->GetRowBytes(), VF::kOvPixelFormat_BGRA_4444_32f,
                         frame->GetBaseAddress(), 1));
    EXPECT_EQ(QRT::QueryRef<MF::IVideoFrame>(VF::GetOvPixHandFrameMapping(handle)).Get(), raw);
    EXPECT_EQ(VF::GetLiveOvPixCount(), liveBefore + 1);
    // The handle keeps the frame alive after the caller lets go.
    frame.Reset();
    frame = VF::GetVideoFrameFromOvPix(handle);
    ASSERT_EQ(frame.Get(), raw);
    EXPECT_EQ(ReferenceCount(frame), 2u);
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(handle));
    EXPECT_EQ(ReferenceCount(frame), 1u);
    EXPECT_EQ(VF::GetLiveOvPixCount(), liveBefore);
    // A disposed handle, a null one and an unknown one are empty and cannot be disposed.
    VF::OvPixRecord notAHandle;
    for (VF::OvPix empty : {handle, VF::OvPix(nullptr), VF::OvPix(&notAHandle)})
    {
        EXPECT_FALSE(VF::GetVideoFrameFromOvPix(empty));
        EXPECT_FALSE(VF::DisposeOvPixFromVideoFrame(empty));
    }
    EXPECT_FALSE(VF::GetOvPixHandFrameMapping(handle));
    EXPECT_EQ(VF::NewOvPixFromVideoFrame(Frame()), nullptr);
    // An unshared frame is described writable.
    const Frame writable = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    const VF::OvPix writableHandle = VF::NewOvPixFromVideoFrame(writable);
    EXPECT_EQ(std::pair(writableHandle->mPixels, writableHandle->mReadOnly),
              std::pair(writable->GetWritableBaseAddress(), 0));
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(writableHandle));
}

} // namespace
