#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"

#include <csetjmp>
#include <cstdio>

#include <gtest/gtest.h>
#include <jpeglib.h>

namespace
{

using namespace betest;

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
    std::vector<JSAMPLE> row(std::size_t(inWidth) * 3);
    for (int x = 0; x < inWidth; ++x)
    {
        row[x * 3] = JSAMPLE(inRed);
        row[x * 3 + 1] = JSAMPLE(inGreen);
        row[x * 3 + 2] = JSAMPLE(inBlue);
    }
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

TEST_F(ImageFileSourceTest, PngStillReadsBackExactly)
{
    FrameRef picture = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 3, 2,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(picture);
    auto* base = static_cast<std::uint8_t*>(picture->GetWritableBaseAddress());
    const std::uint8_t pixels[2][12] = {{10, 20, 30, 255, 40, 50, 60, 128, 0, 0, 255, 0},
                                        {1, 2, 3, 4, 255, 255, 255, 255, 9, 8, 7, 200}};
    for (int y = 0; y < 2; ++y)
        std::copy(pixels[y], pixels[y] + 12, base + y * picture->GetRowBytes());
    const std::string path = mDirectory.File("still.PNG");
    ASSERT_TRUE(VF::WritePngFile(path, picture).Succeeded());

    const BE::VideoSourceRef source = OpenOrFail(path);
    EXPECT_TRUE(source->IsStill());
    EXPECT_TRUE(source->IsImage());
    EXPECT_TRUE(source->IsPrefetchWanted(TickTime::FromSeconds(100)));
    EXPECT_EQ(source->GetFrameRate(), mvxmediatypes::kFrameRate_Video1000);
    EXPECT_EQ(source->GetBounds(), QRT::ParamRect(0, 0, 3, 2));
    EXPECT_EQ(source->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_Straight);
    const FrameRef frame = ReadFrameOrFail(source, TickTime::FromSeconds(3));
    for (int y = 0; y < 2; ++y)
        for (int x = 0; x < 3; ++x)
            EXPECT_EQ(Pixel(frame, x, y), Bgra(pixels[y][x * 4], pixels[y][x * 4 + 1],
                                               pixels[y][x * 4 + 2], pixels[y][x * 4 + 3]))
                << x << "," << y;
    // Every time shows the same still: one key, one held frame.
    EXPECT_EQ(source->GetFrameKey(TickTime(), {}, {}, {}),
              source->GetFrameKey(TickTime::FromSeconds(50), {}, {}, {}));
    FrameRef again;
    EXPECT_EQ(ReadFrame(source, TickTime::FromSeconds(9), again,
                        BE::Deprecated::kFrameRequestFlag_NoBlock),
              QRT::kResult_Success);
    EXPECT_EQ(again.Get(), frame.Get());
}

TEST_F(ImageFileSourceTest, JpegStillReadsBackAndScales)
{
    const std::string path = mDirectory.File("still.jpeg");
    WriteSolidJpeg(path, 16, 8, 200, 100, 50);
    const BE::VideoSourceRef source = OpenOrFail(path);
    EXPECT_EQ(source->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
    EXPECT_EQ(source->GetAlphaChannel(), mvxmediatypes::kAlphaChannel_None);
    const FrameRef frame = ReadFrameOrFail(source, TickTime());
    for (const auto& [x, y] : {std::pair{0, 0}, std::pair{15, 7}, std::pair{8, 4}})
    {
        const auto pixel = Pixel(frame, x, y);
        EXPECT_NEAR(pixel[0], 50, 2);
        EXPECT_NEAR(pixel[1], 100, 2);
        EXPECT_NEAR(pixel[2], 200, 2);
        EXPECT_EQ(pixel[3], 255);
    }
    BE::VideoFrameRequest request;
    request.mWidth = 4;
    request.mHeight = 2;
    const FrameRef small = ReadFrameOrFail(source, TickTime(), request);
    EXPECT_EQ(small->GetBounds(), QRT::ParamRect(0, 0, 4, 2));
    EXPECT_NEAR(Pixel(small, 3, 1)[2], 200, 2);
}

TEST_F(ImageFileSourceTest, GarbageFilesAreRefusedAtOpening)
{
    BE::VideoSourceRef source;
    const std::string png = mDirectory.File("garbage.png");
    WriteBytes(png, "this is not a picture at all");
    BE::OpenStatus status = BE::OpenVideoSource(png, source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_EQ(status.mMessage, png + ": not a PNG file (no PNG signature)");
    EXPECT_FALSE(source);

    const std::string jpeg = mDirectory.File("garbage.jpg");
    WriteBytes(jpeg, "this is not a picture at all");
    status = BE::OpenVideoSource(jpeg, source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaMalformed);
    EXPECT_EQ(status.mMessage.substr(0, jpeg.size() + 2), jpeg + ": ");
    EXPECT_GT(status.mMessage.size(), jpeg.size() + 2) << "libjpeg's reason follows";
    EXPECT_FALSE(source);

    status = BE::OpenVideoSource(mDirectory.File("absent.png"), source);
    EXPECT_EQ(status.mResult, BE::kResult_MediaCannotOpen);
}

TEST_F(ImageFileSourceTest, TruncatedFilesFailTheReadNotTheProcess)
{
    FrameRef picture = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 64, 64,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    const std::string pngPath = mDirectory.File("cut.png");
    ASSERT_TRUE(VF::WritePngFile(pngPath, picture).Succeeded());
    const std::string pngBytes = ReadBytes(pngPath);
    WriteBytes(pngPath, pngBytes.substr(0, 40));
    const BE::VideoSourceRef png = OpenOrFail(pngPath);
    FrameRef frame;
    EXPECT_TRUE(QRT::Failed(ReadFrame(png, TickTime(), frame)));
    EXPECT_FALSE(frame);

    const std::string jpegPath = mDirectory.File("cut.jpg");
    WriteSolidJpeg(jpegPath, 64, 64, 10, 20, 30);
    const std::string jpegBytes = ReadBytes(jpegPath);
    // Cut inside the picture data: libjpeg would warn and fill in grey.
    WriteBytes(jpegPath, jpegBytes.substr(0, jpegBytes.size() - 12));
    const BE::VideoSourceRef jpeg = OpenOrFail(jpegPath);
    EXPECT_EQ(ReadFrame(jpeg, TickTime(), frame), BE::kResult_MediaMalformed);
    EXPECT_FALSE(frame);
}

TEST_F(ImageFileSourceTest, FrameKeysAreStableAcrossOpensAndChangeWithTheFile)
{
    const std::string path = mDirectory.File("key.jpg");
    WriteSolidJpeg(path, 8, 8, 1, 2, 3);
    const auto key = OpenOrFail(path)->GetFrameKey(TickTime(), {}, {}, {});
    EXPECT_EQ(key, OpenOrFail(path)->GetFrameKey(TickTime(), {}, {}, {}));
    WriteSolidJpeg(path, 16, 8, 1, 2, 3);
    EXPECT_NE(key, OpenOrFail(path)->GetFrameKey(TickTime(), {}, {}, {}));
}

} // namespace
