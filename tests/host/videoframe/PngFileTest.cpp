#include "VF/PngFile.h"

#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <cstring>
#include <filesystem>
#include <fstream>
#include <unistd.h>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;

class PngFileTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mDirectory = std::filesystem::temp_directory_path() /
                     ("vf_png_test_" + std::to_string(::getpid()) + "_" +
                      ::testing::UnitTest::GetInstance()->current_test_info()->name());
        std::filesystem::create_directories(mDirectory);
    }
    void TearDown() override { std::filesystem::remove_all(mDirectory); }

    std::string PathOf(const std::string& inName) const { return (mDirectory / inName).string(); }

    static Frame MakePattern(uint32_t inWidth, uint32_t inHeight)
    {
        Frame frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                                           mt::kPixelAspectRatio_Square, true, false);
        for (uint32_t y = 0; y < inHeight; ++y)
        {
            auto* row = static_cast<uint8_t*>(frame->GetWritableBaseAddress()) +
                        y * static_cast<size_t>(frame->GetRowBytes());
            for (uint32_t x = 0; x < inWidth; ++x)
            {
                row[4 * x + 0] = static_cast<uint8_t>(x * 13 + y);
                row[4 * x + 1] = static_cast<uint8_t>(y * 29);
                row[4 * x + 2] = static_cast<uint8_t>(255 - x);
                row[4 * x + 3] = static_cast<uint8_t>(x * 40 + y * 3);
            }
        }
        return frame;
    }

    static void WriteBytes(const std::string& inPath, const std::vector<char>& inBytes)
    {
        std::ofstream out(inPath, std::ios::binary);
        out.write(inBytes.data(), static_cast<std::streamsize>(inBytes.size()));
    }

    static std::vector<char> ReadBytes(const std::string& inPath)
    {
        std::ifstream in(inPath, std::ios::binary);
        return std::vector<char>(std::istreambuf_iterator<char>(in), {});
    }

    std::filesystem::path mDirectory;
};

bool SamePixels(const Frame& inA, const Frame& inB)
{
    if (inA->GetBounds() != inB->GetBounds())
        return false;
    const size_t rowBytes = static_cast<size_t>(inA->GetBounds().Width()) * 4;
    for (int32_t y = 0; y < inA->GetBounds().Height(); ++y)
        if (std::memcmp(static_cast<const uint8_t*>(inA->GetBaseAddress()) + y * inA->GetRowBytes(),
                        static_cast<const uint8_t*>(inB->GetBaseAddress()) + y * inB->GetRowBytes(),
                        rowBytes) != 0)
            return false;
    return true;
}

TEST_F(PngFileTest, RGBAWriteThenReadIsExact)
{
    const Frame frame = MakePattern(7, 5);
    const std::string path = PathOf("pattern.png");
    const VF::PngStatus written = VF::WritePngFile(path, frame);
    ASSERT_TRUE(written.Succeeded()) << written.mMessage;
    Frame read;
    const VF::PngStatus status = VF::ReadPngFile(path, read);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    EXPECT_TRUE(status.mMessage.empty());
    ASSERT_TRUE(read);
    EXPECT_EQ(read->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(read->GetAlphaChannel(), mt::kAlphaChannel_Straight);
    EXPECT_TRUE(SamePixels(read, frame));
}

TEST_F(PngFileTest, RGBFileReadsOpaque)
{
    const Frame frame = MakePattern(3, 2);
    const std::string path = PathOf("opaque.png");
    ASSERT_TRUE(VF::WritePngFile(path, frame, VF::PngChannels::kRGB).Succeeded());
    Frame read;
    ASSERT_TRUE(VF::ReadPngFile(path, read).Succeeded());
    const auto* pixel =
        static_cast<const uint8_t*>(read->GetBaseAddress()) + read->GetRowBytes() + 8;
    const auto* original =
        static_cast<const uint8_t*>(frame->GetBaseAddress()) + frame->GetRowBytes() + 8;
    EXPECT_EQ(std::memcmp(pixel, original, 3), 0);
    EXPECT_EQ(pixel[3], 255);
}

TEST_F(PngFileTest, FloatFramesAreConvertedBeforeWriting)
{
    const Frame frame = MakePattern(4, 4);
    const Frame floats = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_32f, 4, 4,
                                              mt::kPixelAspectRatio_Square, false, false);
    ASSERT_EQ(VF::VideoFrameManipulators::CopyFrame(frame, floats, mt::kRenderQuality_Max),
              QRT::kResult_Success);
    const std::string path = PathOf("float.png");
    ASSERT_TRUE(VF::WritePngFile(path, floats).Succeeded());
    Frame read;
    ASSERT_TRUE(VF::ReadPngFile(path, read).Succeeded());
    EXPECT_TRUE(SamePixels(read, frame));
}

TEST_F(PngFileTest, TruncatedFileIsMalformedNotACrash)
{
    const std::string path = PathOf("whole.png");
    ASSERT_TRUE(VF::WritePngFile(path, MakePattern(64, 64)).Succeeded());
    const std::vector<char> bytes = ReadBytes(path);
    ASSERT_GT(bytes.size(), 100u);
    for (const size_t keep : {bytes.size() / 2, size_t{40}, bytes.size() * 3 / 4})
    {
        const std::string cut = PathOf("cut" + std::to_string(keep) + ".png");
        WriteBytes(cut, std::vector<char>(bytes.begin(), bytes.begin() + keep));
        Frame read = MakePattern(1, 1);
        const VF::PngStatus status = VF::ReadPngFile(cut, read);
        EXPECT_EQ(status.mResult, VF::kResult_PngMalformed) << keep;
        EXPECT_EQ(status.mMessage.rfind(cut + ": ", 0), 0u) << status.mMessage;
        EXPECT_GT(status.mMessage.size(), cut.size() + 2);
        EXPECT_FALSE(read);
    }
}

TEST_F(PngFileTest, GarbageAndMissingFilesCannotBeOpened)
{
    const std::string garbage = PathOf("garbage.png");
    WriteBytes(garbage, std::vector<char>(300, 'x'));
    Frame read;
    VF::PngStatus status = VF::ReadPngFile(garbage, read);
    EXPECT_EQ(status.mResult, VF::kResult_PngCannotOpen);
    EXPECT_EQ(status.mMessage, garbage + ": not a PNG file");
    const std::string empty = PathOf("empty.png");
    WriteBytes(empty, {});
    EXPECT_EQ(VF::ReadPngFile(empty, read).mResult, VF::kResult_PngCannotOpen);
    const std::string missing = PathOf("missing.png");
    status = VF::ReadPngFile(missing, read);
    EXPECT_EQ(status.mResult, VF::kResult_PngCannotOpen);
    EXPECT_EQ(status.mMessage, missing + ": No such file or directory");
    EXPECT_FALSE(read);
}

TEST_F(PngFileTest, CorruptedDataAfterAValidSignatureIsMalformed)
{
    const std::string path = PathOf("corrupt.png");
    ASSERT_TRUE(VF::WritePngFile(path, MakePattern(16, 16)).Succeeded());
    std::vector<char> bytes = ReadBytes(path);
    // Scramble everything after the signature and header chunk.
    for (size_t i = 40; i < bytes.size(); ++i)
        bytes[i] = static_cast<char>(bytes[i] ^ 0x5A);
    WriteBytes(path, bytes);
    Frame read;
    EXPECT_EQ(VF::ReadPngFile(path, read).mResult, VF::kResult_PngMalformed);
    EXPECT_FALSE(read);
}

TEST_F(PngFileTest, UnwritablePathFails)
{
    const std::string path = PathOf("no/such/directory/out.png");
    const VF::PngStatus status = VF::WritePngFile(path, MakePattern(2, 2));
    EXPECT_EQ(status.mResult, VF::kResult_PngWriteFailed);
    EXPECT_EQ(status.mMessage.rfind(path + ": ", 0), 0u);
}

} // namespace
