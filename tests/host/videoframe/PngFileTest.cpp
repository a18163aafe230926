#include "VF/PngFile.h"

#include "FrameTestSupport.h"
#include "VF/VideoFrameManipulators.h"

#include <filesystem>
#include <fstream>
#include <unistd.h>

#include <gtest/gtest.h>

namespace
{

using namespace vftest;

// A straight BGRA frame with every channel varying and translucent alpha.
Frame MakePattern(uint32_t inWidth, uint32_t inHeight)
{
    const Frame frame = MakeFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight);
    for (uint32_t i = 0; i < 4 * inWidth * inHeight; ++i)
        Row(frame, int32_t(i / (4 * inWidth)))[i % (4 * inWidth)] = uint8_t(i * 13 + i / 7);
    return frame;
}

bool SamePixels(const Frame& inA, const Frame& inB)
{
    bool same = inA->GetBounds() == inB->GetBounds();
    for (int32_t y = 0; same && y < inA->GetBounds().Height(); ++y)
        same = std::memcmp(Row(inA, y), Row(inB, y), size_t(inA->GetBounds().Width()) * 4) == 0;
    return same;
}

void WriteBytes(const std::string& inPath, const std::vector<char>& inBytes)
{
    std::ofstream(inPath, std::ios::binary).write(inBytes.data(), std::streamsize(inBytes.size()));
}

// Reads the file; the frame must be left empty unless the read succeeds.
VF::PngStatus Read(const std::string& inPath, Frame& outFrame)
{
    outFrame = MakePattern(1, 1);
    const VF::PngStatus status = VF::ReadPngFile(inPath, outFrame);
    EXPECT_EQ(bool(outFrame), status.Succeeded()) << status.mMessage;
    return status;
}

// Each case works in its own temporary directory.
class PngFileTest : public ::testing::Test
{
protected:
    void SetUp() override { std::filesystem::create_directories(mDirectory); }
    void TearDown() override { std::filesystem::remove_all(mDirectory); }
    std::string PathOf(const std::string& inName) const { return (mDirectory / inName).string(); }

    const std::filesystem::path mDirectory =
        std::filesystem::temp_directory_path() /
        ("vf_png_test_" + std::to_string(::getpid()) + "_" +
         ::testing::UnitTest::GetInstance()->current_test_info()->name());
};

TEST_F(PngFileTest, WriteThenReadIsExactForRGBAOpaqueForRGBAndConvertsFloat)
{
    const Frame frame = MakePattern(7, 5);
    const Frame floats = MakeFrame(mt::kPixelFormat_BGRA_4444_32f, 7, 5);
    ASSERT_EQ(VF::VideoFrameManipulators::CopyFrame(frame, floats, mt::kRenderQuality_Max),
              QRT::kResult_Success);
    Frame read;
    for (const Frame& written : {frame, floats})
    {
        const VF::PngStatus status = VF::WritePngFile(PathOf("pattern.png"), written);
        ASSERT_TRUE(status.Succeeded()) << status.mMessage;
        ASSERT_EQ(Read(PathOf("pattern.png"), read).mMessage, "");
        EXPECT_EQ(
            std::tuple(read->GetPixelFormat(), read->GetAlphaChannel(), SamePixels(read, frame)),
            std::tuple(mt::kPixelFormat_BGRA_4444_8u, mt::kAlphaChannel_Straight, true));
    }
    ASSERT_TRUE(VF::WritePngFile(PathOf("rgb.png"), frame, VF::PngChannels::kRGB).Succeeded());
    ASSERT_TRUE(Read(PathOf("rgb.png"), read).Succeeded());
    EXPECT_EQ(std::pair(std::memcmp(Row(read, 1, 2), Row(frame, 1, 2), 3), int{Row(read, 1, 2)[3]}),
              std::pair(0, 255));
}

TEST_F(PngFileTest, TruncatedOrCorruptedFileIsMalformedNotACrash)
{
    const std::string path = PathOf("whole.png");
    ASSERT_TRUE(VF::WritePngFile(path, MakePattern(64, 64)).Succeeded());
    std::ifstream in(path, std::ios::binary);
    const std::vector<char> bytes{std::istreambuf_iterator<char>(in), {}};
    Frame read;
    for (const size_t keep : {bytes.size() / 2, size_t{40}})
    {
        const std::string cut = PathOf("cut" + std::to_string(keep) + ".png");
        WriteBytes(cut, std::vector<char>(bytes.begin(), bytes.begin() + keep));
        const VF::PngStatus status = Read(cut, read);
        EXPECT_EQ(status.mResult, VF::kResult_PngMalformed) << keep;
        EXPECT_EQ(status.mMessage.rfind(cut + ": ", 0), 0u) << status.mMessage;
    }
}

TEST_F(PngFileTest, GarbageEmptyAndMissingFilesCannotBeOpened)
{
    const std::string garbage = PathOf("garbage.png"), empty = PathOf("empty.png");
    const std::string missing = PathOf("missing.png");
    WriteBytes(garbage, std::vector<char>(300, 'x'));
    WriteBytes(empty, {});
    Frame read;
    for (const auto& [path, message] :
         {std::pair{garbage, garbage + ": not a PNG file"}, std::pair{empty, std::string()},
          std::pair{missing, missing + ": No such file or directory"}})
    {
        const VF::PngStatus status = Read(path, read);
        EXPECT_EQ(status.mResult, VF::kResult_PngCannotOpen) << path;
        EXPECT_TRUE(message.empty() || status.mMessage == message) << status.mMessage;
    }
    const std::string unwritable = PathOf("no/such/directory/out.png");
    const VF::PngStatus status = VF::WritePngFile(unwritable, MakePattern(2, 2));
    EXPECT_EQ(status.mResult, VF::kResult_PngWriteFailed);
    EXPECT_EQ(status.mMessage.rfind(unwritable + ": ", 0), 0u);
}

} // namespace
