#include "FrameWriters.h"

#include "BE/VideoSources.h"
#include "Options.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

class FrameWritersTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mDirectory = fs::temp_directory_path() /
                     ("vrender_writers_" + std::to_string(getpid()) + "_" +
                      ::testing::UnitTest::GetInstance()->current_test_info()->name());
        fs::remove_all(mDirectory);
        fs::create_directories(mDirectory);
    }
    void TearDown() override { fs::remove_all(mDirectory); }

    static std::vector<std::uint8_t> ReadAll(const fs::path& inPath)
    {
        std::ifstream stream(inPath, std::ios::binary);
        return {std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
    }

    // A BGRA frame whose pixel (x, y) is (B, G, R, A) = (x * 20, y * 30, 200 - x, inAlpha).
    static FrameRef MakeBGRA(std::uint32_t inWidth, std::uint32_t inHeight, std::uint8_t inAlpha)
    {
        FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                                              mt::kPixelAspectRatio_Square, true, false);
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        for (std::uint32_t y = 0; y < inHeight; ++y)
            for (std::uint32_t x = 0; x < inWidth; ++x)
            {
                std::uint8_t* p = base + y * frame->GetRowBytes() + 4 * x;
                p[0] = static_cast<std::uint8_t>(x * 20);
                p[1] = static_cast<std::uint8_t>(y * 30);
                p[2] = static_cast<std::uint8_t>(200 - x);
                p[3] = inAlpha;
            }
        return frame;
    }

    fs::path mDirectory;
};

TEST_F(FrameWritersTest, Y4MHeaderSpellsEveryField)
{
    vrender::StreamInfo info;
    info.mWidth = 1920;
    info.mHeight = 1080;
    info.mFrameRate = mt::kFrameRate_Video2997;
    info.mFieldType = mt::kFieldType_UpperFirst;
    info.mPixelAspectRatio = mt::PixelAspectRatio(10, 11);
    EXPECT_EQ(vrender::MakeY4MHeader(info, vrender::Y4MChroma::k420),
              "YUV4MPEG2 W1920 H1080 F30000:1001 It A10:11 C420 XCOLORRANGE=LIMITED\n");
    info.mFrameRate = mt::kFrameRate_Video25;
    info.mFieldType = mt::kFieldType_LowerFirst;
    info.mPixelAspectRatio = mt::kPixelAspectRatio_Square;
    EXPECT_EQ(vrender::MakeY4MHeader(info, vrender::Y4MChroma::k444),
              "YUV4MPEG2 W1920 H1080 F25:1 Ib A1:1 C444 XCOLORRANGE=LIMITED\n");
    info.mFieldType = mt::kFieldType_Progressive;
    info.mFrameRate = mt::kFrameRate_Video2398;
    EXPECT_EQ(vrender::MakeY4MHeader(info, vrender::Y4MChroma::k444),
              "YUV4MPEG2 W1920 H1080 F24000:1001 Ip A1:1 C444 XCOLORRANGE=LIMITED\n");
}

TEST_F(FrameWritersTest, Y4M420PlanesAreExactOnAnOddSizedFrame)
{
    // VUYA bytes are V, U, Y, A; (x, y) holds Y = 16 + 10 (3y + x),
    // U = 100 + x + 10y, V = 200 - x - 10y.
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_VUYA_4444_8u, 3, 3,
                                          mt::kPixelAspectRatio_Square, true, false);
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (int y = 0; y < 3; ++y)
        for (int x = 0; x < 3; ++x)
        {
            std::uint8_t* p = base + y * frame->GetRowBytes() + 4 * x;
            p[0] = static_cast<std::uint8_t>(200 - x - 10 * y);
            p[1] = static_cast<std::uint8_t>(100 + x + 10 * y);
            p[2] = static_cast<std::uint8_t>(16 + 10 * (3 * y + x));
            p[3] = 255;
        }
    const fs::path path = mDirectory / "tiny.y4m";
    auto writer = vrender::CreateY4MWriter(nullptr, path.string(), vrender::Y4MChroma::k420);
    vrender::StreamInfo info;
    info.mWidth = 3;
    info.mHeight = 3;
    std::string error;
    ASSERT_TRUE(writer->Begin(info, error)) << error;
    vrender::EncodedFrame encoded = writer->Encode(0, frame);
    ASSERT_EQ(encoded.mError, "");
    ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    ASSERT_TRUE(writer->Finish(error)) << error;

    const std::string header = "YUV4MPEG2 W3 H3 F25:1 Ip A1:1 C420 XCOLORRANGE=LIMITED\nFRAME\n";
    std::vector<std::uint8_t> expected(header.begin(), header.end());
    for (int i = 0; i < 9; ++i)
        expected.push_back(static_cast<std::uint8_t>(16 + 10 * i));
    // Each chroma sample is the rounded mean of its 2x2 block; the last
    // column and row repeat themselves.
    for (const int value : {106, 107, 121, 122})
        expected.push_back(static_cast<std::uint8_t>(value));
    for (const int value : {195, 193, 180, 178})
        expected.push_back(static_cast<std::uint8_t>(value));
    EXPECT_EQ(ReadAll(path), expected);
}

TEST_F(FrameWritersTest, Y4M444StreamReadsBackThroughTheBackEnd)
{
    const fs::path path = mDirectory / "round.y4m";
    std::FILE* file = std::fopen(path.c_str(), "wb");
    ASSERT_NE(file, nullptr);
    auto writer = vrender::CreateY4MWriter(file, {}, vrender::Y4MChroma::k444);
    EXPECT_EQ(writer->Describe(), "standard output");
    vrender::StreamInfo info;
    info.mWidth = 8;
    info.mHeight = 6;
    std::string error;
    ASSERT_TRUE(writer->Begin(info, error)) << error;
    const FrameRef frames[2] = {MakeBGRA(8, 6, 255), MakeBGRA(8, 6, 255)};
    // The two frames differ, so a swapped or repeated frame shows.
    auto* second = static_cast<std::uint8_t*>(frames[1]->GetWritableBaseAddress());
    second[2] = 10;
    for (int i = 0; i < 2; ++i)
    {
        vrender::EncodedFrame encoded = writer->Encode(i, frames[i]);
        ASSERT_EQ(encoded.mError, "");
        ASSERT_EQ(encoded.mBytes.size(), 6u + 3u * 8u * 6u);
        ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    }
    ASSERT_TRUE(writer->Finish(error)) << error;
    std::fclose(file);

    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenY4MSource(path.string(), source);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    EXPECT_EQ(source->GetBounds().Width(), 8);
    EXPECT_EQ(source->GetFrameRate(), mt::kFrameRate_Video25);
    for (int i = 0; i < 2; ++i)
    {
        FrameRef read;
        ASSERT_EQ(source->GetVideoFrame(mt::TickTime::FromFrame(i, mt::kFrameRate_Video25),
                                        BE::VideoFrameRequest{}, MF::BinaryData(), {}, 0, read),
                  0);
        ASSERT_EQ(read->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
        const auto* got = static_cast<const std::uint8_t*>(read->GetBaseAddress());
        const auto* want = static_cast<const std::uint8_t*>(frames[i]->GetBaseAddress());
        for (int y = 0; y < 6; ++y)
            for (int x = 0; x < 8; ++x)
                for (int c = 0; c < 3; ++c)
                    EXPECT_NEAR(got[y * read->GetRowBytes() + 4 * x + c],
                                want[y * frames[i]->GetRowBytes() + 4 * x + c], 2)
                        << "frame " << i << " pixel " << x << "," << y << " channel " << c;
    }
}

TEST_F(FrameWritersTest, Y4MIntegerKernelMatchesTheGeneralConversion)
{
    // Heights on both sides of the BT.601 / BT.709 switch at 720 rows.
    for (const std::uint32_t height : {8u, 720u})
    {
        const std::uint32_t width = 37;
        FrameRef bgra = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, width, height,
                                             mt::kPixelAspectRatio_Square, false, false);
        std::uint32_t seed = 12345;
        for (std::uint32_t y = 0; y < height; ++y)
        {
            auto* row = static_cast<std::uint8_t*>(bgra->GetWritableBaseAddress()) +
                        y * bgra->GetRowBytes();
            for (std::uint32_t i = 0; i < 4 * width; ++i)
            {
                seed = seed * 1664525u + 1013904223u;
                row[i] = static_cast<std::uint8_t>(i % 4 == 3 ? 255 : seed >> 24);
            }
        }
        FrameRef vuya = VF::CreateVideoFrame(mt::kPixelFormat_VUYA_4444_8u, width, height,
                                             mt::kPixelAspectRatio_Square, false, false);
        ASSERT_EQ(VF::VideoFrameManipulators::CopyFrame(bgra, vuya, mt::kRenderQuality_Max), 0);
        for (const vrender::Y4MChroma chroma : {vrender::Y4MChroma::k444, vrender::Y4MChroma::k420})
        {
            auto writer =
                vrender::CreateY4MWriter(nullptr, (mDirectory / "k.y4m").string(), chroma);
            vrender::StreamInfo info;
            info.mWidth = width;
            info.mHeight = height;
            std::string error;
            ASSERT_TRUE(writer->Begin(info, error)) << error;
            const vrender::EncodedFrame fast = writer->Encode(0, bgra);
            const vrender::EncodedFrame general = writer->Encode(0, vuya);
            ASSERT_EQ(fast.mBytes.size(), general.mBytes.size());
            int worst = 0;
            for (std::size_t i = 0; i < fast.mBytes.size(); ++i)
                worst = std::max(worst, std::abs(fast.mBytes[i] - general.mBytes[i]));
            EXPECT_LE(worst, 1) << "height " << height;
        }
    }
}

TEST_F(FrameWritersTest, Y4MRefusesAFrameOfTheWrongSize)
{
    auto writer = vrender::CreateY4MWriter(nullptr, (mDirectory / "s.y4m").string(),
                                           vrender::Y4MChroma::k420);
    vrender::StreamInfo info;
    info.mWidth = 4;
    info.mHeight = 4;
    std::string error;
    ASSERT_TRUE(writer->Begin(info, error));
    EXPECT_EQ(writer->Encode(9, MakeBGRA(2, 4, 255)).mError, "frame 9 is 2x4, the stream 4x4");
}

TEST_F(FrameWritersTest, Y4MFileThatCannotBeCreatedIsNamed)
{
    std::ofstream((mDirectory / "blocker").string()) << "x";
    const std::string path = (mDirectory / "blocker" / "out.y4m").string();
    auto writer = vrender::CreateY4MWriter(nullptr, path, vrender::Y4MChroma::k420);
    std::string error;
    EXPECT_FALSE(writer->Begin(vrender::StreamInfo{}, error));
    EXPECT_EQ(
        error.rfind("cannot create directory '" + (mDirectory / "blocker").string() + "': ", 0), 0u)
        << error;
}

TEST_F(FrameWritersTest, PngFramesAppearOnlyOnCommitAndReadBack)
{
    const std::string pattern = (mDirectory / "seq" / "f_%03d.png").string();
    auto writer = vrender::CreatePngSequenceWriter(pattern);
    EXPECT_EQ(writer->Describe(), pattern);
    std::string error;
    ASSERT_TRUE(writer->Begin(vrender::StreamInfo{}, error)) << error;
    const FrameRef frame = MakeBGRA(5, 4, 255);
    vrender::EncodedFrame encoded = writer->Encode(7, frame);
    ASSERT_EQ(encoded.mError, "");
    const fs::path final = mDirectory / "seq" / "f_007.png";
    EXPECT_EQ(encoded.mFinalPath, final.string());
    EXPECT_FALSE(fs::exists(final));
    EXPECT_TRUE(fs::exists(encoded.mTemporaryPath));
    ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    EXPECT_TRUE(fs::exists(final));
    EXPECT_FALSE(fs::exists(final.string() + ".part"));

    FrameRef read;
    const VF::PngStatus status = VF::ReadPngFile(final.string(), read);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    ASSERT_EQ(read->GetBounds().Width(), 5);
    ASSERT_EQ(read->GetBounds().Height(), 4);
    for (int y = 0; y < 4; ++y)
        for (int x = 0; x < 5; ++x)
        {
            const auto* got = static_cast<const std::uint8_t*>(read->GetBaseAddress()) +
                              y * read->GetRowBytes() + 4 * x;
            EXPECT_EQ(got[0], x * 20);
            EXPECT_EQ(got[1], y * 30);
            EXPECT_EQ(got[2], 200 - x);
            EXPECT_EQ(got[3], 255);
        }
}

TEST_F(FrameWritersTest, PngKeepsTranslucentAlpha)
{
    auto writer = vrender::CreatePngSequenceWriter((mDirectory / "a_%d.png").string());
    std::string error;
    ASSERT_TRUE(writer->Begin(vrender::StreamInfo{}, error));
    vrender::EncodedFrame encoded = writer->Encode(0, MakeBGRA(3, 2, 128));
    ASSERT_TRUE(writer->Commit(encoded, error)) << error;
    FrameRef read;
    ASSERT_TRUE(VF::ReadPngFile((mDirectory / "a_0.png").string(), read).Succeeded());
    EXPECT_EQ(static_cast<const std::uint8_t*>(read->GetBaseAddress())[3], 128);
}

TEST_F(FrameWritersTest, PngDiscardLeavesNothingBehind)
{
    auto writer = vrender::CreatePngSequenceWriter((mDirectory / "d_%d.png").string());
    std::string error;
    ASSERT_TRUE(writer->Begin(vrender::StreamInfo{}, error));
    vrender::EncodedFrame encoded = writer->Encode(3, MakeBGRA(3, 2, 255));
    ASSERT_TRUE(fs::exists(encoded.mTemporaryPath));
    const std::string temporary = encoded.mTemporaryPath;
    writer->Discard(encoded);
    EXPECT_FALSE(fs::exists(temporary));
    EXPECT_TRUE(fs::is_empty(mDirectory));
}

TEST_F(FrameWritersTest, PngDirectoryThatCannotBeMadeIsNamed)
{
    std::ofstream((mDirectory / "blocker").string()) << "x";
    auto writer = vrender::CreatePngSequenceWriter((mDirectory / "blocker" / "f_%d.png").string());
    std::string error;
    EXPECT_FALSE(writer->Begin(vrender::StreamInfo{}, error));
    EXPECT_EQ(
        error.rfind("cannot create directory '" + (mDirectory / "blocker").string() + "': ", 0), 0u)
        << error;
}

TEST_F(FrameWritersTest, FrameRateRatiosAreReduced)
{
    std::int64_t numerator = 0;
    std::int64_t denominator = 0;
    vrender::GetFrameRateRatio(mt::kFrameRate_Video5994, numerator, denominator);
    EXPECT_EQ(numerator, 60000);
    EXPECT_EQ(denominator, 1001);
    vrender::GetFrameRateRatio(mt::kFrameRate_Video50, numerator, denominator);
    EXPECT_EQ(numerator, 50);
    EXPECT_EQ(denominator, 1);
    vrender::GetFrameRateRatio(mt::kFrameRate_Zero, numerator, denominator);
    EXPECT_EQ(numerator, 0);
    EXPECT_EQ(denominator, 1);
}

} // namespace
