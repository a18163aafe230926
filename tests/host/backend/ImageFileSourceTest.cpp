#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"

#include <cstdio>

#include <gtest/gtest.h>
#include <jpeglib.h>

namespace
{

using namespace betest;
using namespace mvxmediatypes;

// Writes a solid-colour JPEG of inWidth x inHeight at quality 100.
void WriteSolidJpeg(const std::string& inPath, int inWidth, int inHeight, int inRed, int inGreen,
                    int inBlue)
{
    std::FILE* file = std::fopen(inPath.c_str(), "wb");
    ASSERT_NE(file, nullptr);
    jpeg_compress_struct info;
    jpeg_error_mgr errors;
    info.err = jpeg_std_error(&errors);
    jpeg_create_compress(&info);
    jpeg_stdio_dest(&info, file);
    info.image_width = JDIMENSION(inWidth);
    info.image_height = JDIMENSION(inHeight);
    info.input_components = 3;
    info.in_color_space = JCS_RGB;
    jpeg_set_defaults(&info);
    jpeg_set_quality(&info, 100, TRUE);
    jpeg_start_compress(&info, TRUE);
    std::vector<JSAMPLE> row;
    for (int x = 0; x < inWidth; ++x)
        row.insert(row.end(), {JSAMPLE(inRed), JSAMPLE(inGreen), JSAMPLE(inBlue)});
    while (info.next_scanline < info.image_height)
    {
        JSAMPROW pointer = row.data();
        jpeg_write_scanlines(&info, &pointer, 1);
    }
    jpeg_finish_compress(&info);
    jpeg_destroy_compress(&info);
    std::fclose(file);
}

class ImageFileSourceTest : public ::testing::Test
{
protected:
    TempDirectory mDirectory;
};

TEST_F(ImageFileSourceTest, StillsReadBackAtEveryTimeScaleAndKeyByContent)
{
    FrameRef picture = VF::CreateVideoFrame(kPixelFormat_BGRA_4444_8u, 3, 1,
                                            kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(picture);
    const std::uint8_t pixels[12] = {10, 20, 30, 255, 40, 50, 60, 128, 9, 8, 7, 0};
    std::copy(pixels, pixels + 12, static_cast<std::uint8_t*>(picture->GetWritableBaseAddress()));
    const std::string path = mDirectory.File("still.PNG");
    ASSERT_TRUE(VF::WritePngFile(path, picture).Succeeded());
    const BE::VideoSourceRef source = OpenOrFail(path);
    EXPECT_TRUE(source->IsStill() && source->IsImage());
    EXPECT_EQ(source->GetAlphaChannel(), kAlphaChannel_Straight);
    const FrameRef frame = ReadFrameOrFail(source, TickTime::FromSeconds(3));
    for (int x = 0; x < 3; ++x)
        EXPECT_EQ(Pixel(frame, x, 0),
                  Bgra(pixels[x * 4], pixels[x * 4 + 1], pixels[x * 4 + 2], pixels[x * 4 + 3]))
            << x;
    // A JPEG still reads back, scales and is keyed by its content.
    const std::string jpeg = mDirectory.File("still.jpeg");
    WriteSolidJpeg(jpeg, 16, 8, 200, 100, 50);
    const BE::VideoSourceRef solid = OpenOrFail(jpeg);
    EXPECT_EQ(solid->GetAlphaChannel(), kAlphaChannel_None);
    const FrameRef small = ReadFrameOrFail(solid, TickTime(), {4, 2});
    EXPECT_EQ(small->GetBounds(), QRT::ParamRect(0, 0, 4, 2));
    const auto pixel = Pixel(small, 3, 1);
    for (const auto& [channel, value] : {std::pair{0, 50}, {1, 100}, {2, 200}, {3, 255}})
        EXPECT_NEAR(pixel[channel], value, 2) << "channel " << channel;
}

TEST_F(ImageFileSourceTest, DamagedFilesAreRefusedAtOpeningOrFailTheRead)
{
    BE::VideoSourceRef source;
    const std::string png = mDirectory.File("garbage.png");
    WriteBytes(png, "this is not a picture at all");
    BE::OpenStatus status = BE::OpenVideoSource(png, source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_EQ(status.mMessage, png + ": not a PNG file (no PNG signature)");
    const std::string jpeg = mDirectory.File("garbage.jpg");
    WriteBytes(jpeg, "this is not a picture at all");
    status = BE::OpenVideoSource(jpeg, source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_GT(status.mMessage.size(), jpeg.size() + 2) << "libjpeg's reason follows";
    EXPECT_EQ(BE::OpenVideoSource(mDirectory.File("absent.png"), source).mResult,
              BE::kResult_MediaCannotOpen);

    // Truncated files open (the header is intact) and fail the read, not the process.
    FrameRef picture = VF::CreateVideoFrame(kPixelFormat_BGRA_4444_8u, 64, 64,
                                            kPixelAspectRatio_Square, true, false);
    const std::string pngPath = mDirectory.File("cut.png");
    ASSERT_TRUE(VF::WritePngFile(pngPath, picture).Succeeded());
    WriteBytes(pngPath, ReadBytes(pngPath).substr(0, 40));
    FrameRef frame;
    const BE::VideoSourceRef cutPng = OpenOrFail(pngPath);
    EXPECT_EQ(BE::GetLastReadFailure(cutPng), "") << "nothing has failed yet";
    EXPECT_TRUE(QRT::Failed(ReadFrame(cutPng, TickTime(), frame)));
    // The decoder's reason is kept for the message, with the file's name.
    EXPECT_EQ(BE::GetLastReadFailure(cutPng), pngPath + ": the file ends early (truncated)");
    const std::string jpegPath = mDirectory.File("cut.jpg");
    WriteSolidJpeg(jpegPath, 64, 64, 10, 20, 30);
    const std::string jpegBytes = ReadBytes(jpegPath);
    // Cut inside the picture data: libjpeg would warn and fill in grey.
    WriteBytes(jpegPath, jpegBytes.substr(0, jpegBytes.size() - 12));
    const BE::VideoSourceRef cutJpeg = OpenOrFail(jpegPath);
    EXPECT_EQ(ReadFrame(cutJpeg, TickTime(), frame), BE::kResult_MediaMalformed);
    EXPECT_FALSE(frame);
    const std::string reason = BE::GetLastReadFailure(cutJpeg);
    EXPECT_EQ(reason.rfind(jpegPath + ": ", 0), 0u) << reason;
    EXPECT_GT(reason.size(), jpegPath.size() + 2) << "libjpeg's reason follows";
    // Repaired, the file reads and the reason is gone.
    WriteBytes(jpegPath, jpegBytes);
    EXPECT_EQ(ReadFrame(cutJpeg, TickTime(), frame), QRT::kResult_Success);
    EXPECT_EQ(BE::GetLastReadFailure(cutJpeg), "");
}

} // namespace
