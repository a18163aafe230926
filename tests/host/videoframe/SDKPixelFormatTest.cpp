#include "VF/SDKPixelFormat.h"

#include "VF/OvPix.h"
#include "VF/VideoFrame.h"

#include <atomic>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;

uint32_t ReferenceCount(const Frame& inFrame)
{
    const uint32_t count = inFrame->AddRef();
    inFrame->Release();
    return count - 1;
}

Frame MakeFrame(mt::PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight)
{
    return VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square, true,
                                false);
}

class SDKPixelFormatTest : public ::testing::Test
{
};

TEST_F(SDKPixelFormatTest, EveryRasterCatalogueFormatRoundTrips)
{
    size_t mapped = 0;
    for (const mt::PixelFormat format : mt::GetPixelFormatCatalogue())
    {
        const VF::OvPixelFormat code = VF::BEToSDKPixelFormat(format);
        if (!format.IsValid())
        {
            EXPECT_EQ(code, VF::kOvPixelFormat_Invalid) << mt::GetPixelFormatName(format);
            continue;
        }
        ++mapped;
        EXPECT_TRUE(VF::IsValidSDKPixelFormat(code)) << mt::GetPixelFormatName(format);
        EXPECT_EQ(VF::SDKToBEPixelFormat(code), format) << mt::GetPixelFormatName(format);
    }
    EXPECT_EQ(mapped, 11u);
}

TEST_F(SDKPixelFormatTest, CodesAreTheirFourCharacters)
{
    EXPECT_EQ(VF::kOvPixelFormat_BGRA_4444_8u, 0x41524742u); // "BGRA", B in the lowest byte
    EXPECT_EQ(VF::SDKToBEPixelFormat(0x41524742u), mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(VF::SDKToBEPixelFormat(VF::MakeOvPixelFormat('V', '3', '2', 'f')),
              mt::kPixelFormat_VUYA_4444_32f);
}

TEST_F(SDKPixelFormatTest, UnknownCodesAreInvalid)
{
    for (const VF::OvPixelFormat code : {VF::kOvPixelFormat_Invalid, VF::kOvPixelFormat_Unset,
                                         VF::MakeOvPixelFormat('A', 'R', 'G', 'B'), 0xFFFFFFFFu,
                                         VF::MakeOvPixelFormat('*', '*', '*', '*')})
    {
        EXPECT_FALSE(VF::IsValidSDKPixelFormat(code)) << code;
        EXPECT_EQ(VF::SDKToBEPixelFormat(code), mt::kPixelFormat_Invalid) << code;
    }
    EXPECT_EQ(VF::BEToSDKPixelFormat(mt::kPixelFormat_Any), VF::kOvPixelFormat_Invalid);
    EXPECT_EQ(VF::BEToSDKPixelFormat(mt::PixelFormat(0x1234)), VF::kOvPixelFormat_Invalid);
}

class OvPixTest : public ::testing::Test
{
};

TEST_F(OvPixTest, HandleDescribesTheFramesPixels)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 5, 3);
    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
    ASSERT_NE(handle, nullptr);
    EXPECT_EQ(handle->mLeft, 0);
    EXPECT_EQ(handle->mTop, 0);
    EXPECT_EQ(handle->mRight, 5);
    EXPECT_EQ(handle->mBottom, 3);
    EXPECT_EQ(handle->mRowBytes, frame->GetRowBytes());
    EXPECT_EQ(handle->mPixelFormat, VF::kOvPixelFormat_BGRA_4444_32f);
    EXPECT_EQ(handle->mPixels, frame->GetBaseAddress());
    EXPECT_EQ(handle->mReadOnly, 0);
    EXPECT_EQ(VF::GetVideoFrameFromOvPix(handle).Get(), frame.Get());
    const QRT::InterfaceRef<QRT::QRTUnknown> mapped = VF::GetOvPixHandFrameMapping(handle);
    EXPECT_EQ(QRT::QueryRef<MF::IVideoFrame>(mapped).Get(), frame.Get());
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(handle));
}

TEST_F(OvPixTest, HandleOfASharedFrameIsReadOnly)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    frame->MarkShared(1);
    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
    ASSERT_NE(handle, nullptr);
    EXPECT_EQ(handle->mReadOnly, 1);
    EXPECT_EQ(handle->mPixels, frame->GetBaseAddress());
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(handle));
}

TEST_F(OvPixTest, HandleHoldsTheFrameUntilDisposed)
{
    Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    ASSERT_EQ(ReferenceCount(frame), 1u);
    const size_t liveBefore = VF::GetLiveOvPixCount();
    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
    ASSERT_NE(handle, nullptr);
    EXPECT_EQ(ReferenceCount(frame), 2u);
    EXPECT_EQ(VF::GetLiveOvPixCount(), liveBefore + 1);
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(handle));
    EXPECT_EQ(ReferenceCount(frame), 1u);
    EXPECT_EQ(VF::GetLiveOvPixCount(), liveBefore);
    // A disposed handle is empty and cannot be disposed again.
    EXPECT_FALSE(VF::GetVideoFrameFromOvPix(handle));
    EXPECT_FALSE(VF::GetOvPixHandFrameMapping(handle));
    EXPECT_FALSE(VF::DisposeOvPixFromVideoFrame(handle));
}

TEST_F(OvPixTest, HandleKeepsTheFrameAliveAfterTheCallerLetsGo)
{
    Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    auto* raw = frame.Get();
    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
    frame.Reset();
    const Frame again = VF::GetVideoFrameFromOvPix(handle);
    ASSERT_TRUE(again);
    EXPECT_EQ(again.Get(), raw);
    EXPECT_EQ(ReferenceCount(again), 2u);
    EXPECT_TRUE(VF::DisposeOvPixFromVideoFrame(handle));
    EXPECT_EQ(ReferenceCount(again), 1u);
}

TEST_F(OvPixTest, NullUnknownAndUnmappableAnswerNothing)
{
    EXPECT_EQ(VF::NewOvPixFromVideoFrame(Frame()), nullptr);
    EXPECT_FALSE(VF::GetVideoFrameFromOvPix(nullptr));
    EXPECT_FALSE(VF::DisposeOvPixFromVideoFrame(nullptr));
    VF::OvPixRecord notAHandle;
    EXPECT_FALSE(VF::GetVideoFrameFromOvPix(&notAHandle));
    EXPECT_FALSE(VF::DisposeOvPixFromVideoFrame(&notAHandle));
}

TEST_F(OvPixTest, ConcurrentCreationAndDisposalLeavesNoHandleAndNoReference)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, 2, 2);
    const size_t liveBefore = VF::GetLiveOvPixCount();
    std::atomic<int> failures{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back(
            [&]
            {
                for (int i = 0; i < 500; ++i)
                {
                    const VF::OvPix handle = VF::NewOvPixFromVideoFrame(frame);
                    if (VF::GetVideoFrameFromOvPix(handle).Get() != frame.Get() ||
                        !VF::DisposeOvPixFromVideoFrame(handle))
                        ++failures;
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(failures.load(), 0);
    EXPECT_EQ(VF::GetLiveOvPixCount(), liveBefore);
    EXPECT_EQ(ReferenceCount(frame), 1u);
}

} // namespace
