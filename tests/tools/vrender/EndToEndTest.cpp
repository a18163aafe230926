// Runs the built vrender program the way a user does and checks what it
// leaves behind: the files, their pixels, the exit codes and the messages.

#include "BE/VideoSources.h"
#include "VF/PngFile.h"

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

class EndToEndTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mDirectory = fs::temp_directory_path() /
                     ("vrender_e2e_" + std::to_string(getpid()) + "_" +
                      ::testing::UnitTest::GetInstance()->current_test_info()->name());
        fs::remove_all(mDirectory);
        fs::create_directories(mDirectory);
    }
    void TearDown() override { fs::remove_all(mDirectory); }

    // Runs vrender with inArguments (shell words); standard output goes to
    // out.txt and standard error to err.txt in the test directory. Answers
    // the exit code.
    int Run(const std::string& inArguments)
    {
        const std::string command = std::string("'") + VRENDER_BINARY + "' " + inArguments +
                                    " > '" + (mDirectory / "out.txt").string() + "' 2> '" +
                                    (mDirectory / "err.txt").string() + "'";
        const int status = std::system(command.c_str());
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

    std::string ReadText(const std::string& inName) const
    {
        std::ifstream stream(mDirectory / inName, std::ios::binary);
        return {std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
    }

    static FrameRef ReadPng(const fs::path& inPath)
    {
        FrameRef frame;
        const VF::PngStatus status = VF::ReadPngFile(inPath.string(), frame);
        EXPECT_TRUE(status.Succeeded()) << status.mMessage;
        return frame;
    }

    // True when the RGB of the two same-sized frames differ anywhere by more
    // than inTolerance.
    static bool Differ(const FrameRef& inA, const FrameRef& inB, int inTolerance)
    {
        const int width = inA->GetBounds().Width();
        const int height = inA->GetBounds().Height();
        for (int y = 0; y < height; ++y)
        {
            const auto* a =
                static_cast<const std::uint8_t*>(inA->GetBaseAddress()) + y * inA->GetRowBytes();
            const auto* b =
                static_cast<const std::uint8_t*>(inB->GetBaseAddress()) + y * inB->GetRowBytes();
            for (int x = 0; x < 4 * width; ++x)
                if (x % 4 != 3 && std::abs(a[x] - b[x]) > inTolerance)
                    return true;
        }
        return false;
    }

    fs::path mDirectory;
};

TEST_F(EndToEndTest, MovingPatternToPngFiles)
{
    const fs::path out = mDirectory / "png";
    ASSERT_EQ(Run("source 'pattern:moving?size=64x36' --count 4 -j 3 -o '" + out.string() +
                  "/f_%03d.png'"),
              0)
        << ReadText("err.txt");
    const std::string err = ReadText("err.txt");
    EXPECT_EQ(err.rfind("Rendered 4 frames in ", 0), 0u) << err;
    EXPECT_NE(err.find(" to " + out.string() + "/f_%03d.png\n"), std::string::npos) << err;
    EXPECT_EQ(ReadText("out.txt"), "") << "PNG output keeps standard output clean";
    FrameRef previous;
    for (int i = 0; i < 4; ++i)
    {
        char name[32];
        std::snprintf(name, sizeof(name), "f_%03d.png", i);
        const FrameRef frame = ReadPng(out / name);
        ASSERT_TRUE(frame) << name;
        EXPECT_EQ(frame->GetBounds().Width(), 64);
        EXPECT_EQ(frame->GetBounds().Height(), 36);
        if (previous)
        {
            EXPECT_TRUE(Differ(previous, frame, 0)) << name << " repeats the frame before";
        }
        previous = frame;
    }
    std::size_t files = 0;
    for (const auto& entry : fs::directory_iterator(out))
    {
        ++files;
        EXPECT_EQ(entry.path().extension(), ".png") << entry.path();
    }
    EXPECT_EQ(files, 4u) << "no temporary files are left";
}

TEST_F(EndToEndTest, Y4MStreamHoldsTheSameFramesInOrder)
{
    const std::string media = "'pattern:moving?size=48x32'";
    const fs::path png = mDirectory / "png";
    ASSERT_EQ(Run("source " + media + " --frames 2:5 -o '" + png.string() + "/f_%d.png'"), 0)
        << ReadText("err.txt");
    ASSERT_EQ(Run("source " + media + " --frames 2:5 --chroma 444 -j 4 --y4m"), 0)
        << ReadText("err.txt");
    const std::string stream = ReadText("out.txt");
    const std::string header = "YUV4MPEG2 W48 H32 F25:1 Ip A1:1 C444 XCOLORRANGE=LIMITED\n";
    ASSERT_EQ(stream.substr(0, header.size()), header);
    EXPECT_EQ(stream.size(), header.size() + 4 * (6 + 3 * 48 * 32));
    EXPECT_NE(ReadText("err.txt").find("Rendered 4 frames"), std::string::npos);

    const fs::path file = mDirectory / "stream.y4m";
    std::ofstream(file, std::ios::binary) << stream;
    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenY4MSource(file.string(), source);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    for (int i = 0; i < 4; ++i)
    {
        FrameRef decoded;
        ASSERT_EQ(source->GetVideoFrame(mt::TickTime::FromFrame(i, mt::kFrameRate_Video25),
                                        BE::VideoFrameRequest{}, MF::BinaryData(), {}, 0, decoded),
                  0);
        const FrameRef same = ReadPng(png / ("f_" + std::to_string(i + 2) + ".png"));
        ASSERT_TRUE(same);
        EXPECT_FALSE(Differ(decoded, same, 3)) << "stream frame " << i;
        if (i > 0)
        {
            const FrameRef other = ReadPng(png / ("f_" + std::to_string(i + 1) + ".png"));
            EXPECT_TRUE(Differ(decoded, other, 3)) << "stream frame " << i << " is out of order";
        }
    }
}

TEST_F(EndToEndTest, SizeAndFormatOptions)
{
    const fs::path out = mDirectory / "scaled";
    ASSERT_EQ(Run("source 'pattern:bars?size=64x36' --count 2 --size 32x18 --format "
                  "BGRA_4444_16u --quality 3 --output-dir '" +
                  out.string() + "'"),
              0)
        << ReadText("err.txt");
    const FrameRef frame = ReadPng(out / "frame_00001.png");
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetBounds().Width(), 32);
    EXPECT_EQ(frame->GetBounds().Height(), 18);
    // The first bar is 75 % white.
    const auto* pixel = static_cast<const std::uint8_t*>(frame->GetBaseAddress());
    EXPECT_NEAR(pixel[0], 191, 2);
    EXPECT_NEAR(pixel[1], 191, 2);
    EXPECT_NEAR(pixel[2], 191, 2);
}

TEST_F(EndToEndTest, Y4MFileOutput)
{
    const fs::path file = mDirectory / "clip.y4m";
    ASSERT_EQ(Run("source 'pattern:moving?size=32x16&rate=30000/1001' --count 3 -o '" +
                  file.string() + "'"),
              0)
        << ReadText("err.txt");
    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenY4MSource(file.string(), source);
    ASSERT_TRUE(status.Succeeded()) << status.mMessage;
    EXPECT_EQ(source->GetFrameRate(), mt::kFrameRate_Video2997);
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(source);
    ASSERT_TRUE(info);
    EXPECT_EQ(info->GetDuration(), mt::TickTime::FromFrame(3, mt::kFrameRate_Video2997));
}

TEST_F(EndToEndTest, UnreadableMediaIsNamed)
{
    const std::string missing = (mDirectory / "missing.y4m").string();
    EXPECT_EQ(Run("source '" + missing + "' --count 1 -o '" + mDirectory.string() + "/f_%d.png'"),
              1);
    const std::string err = ReadText("err.txt");
    EXPECT_EQ(err.rfind("vrender: " + missing + ": ", 0), 0u) << err;

    const fs::path bad = mDirectory / "bad.y4m";
    std::ofstream(bad) << "not a y4m file\n";
    EXPECT_EQ(Run("source '" + bad.string() + "'"), 1);
    EXPECT_EQ(ReadText("err.txt").rfind("vrender: " + bad.string() + ": ", 0), 0u)
        << ReadText("err.txt");

    EXPECT_EQ(Run("source 'pattern:stripes' --count 1"), 1);
    EXPECT_NE(ReadText("err.txt").find("pattern:stripes"), std::string::npos)
        << ReadText("err.txt");
}

TEST_F(EndToEndTest, RangeBeyondAY4MFileIsRefused)
{
    const fs::path file = mDirectory / "three.y4m";
    ASSERT_EQ(Run("source 'pattern:moving?size=16x16' --count 3 -o '" + file.string() + "'"), 0);
    EXPECT_EQ(Run("source '" + file.string() + "' --frames 1:3 -o -"), 1);
    EXPECT_EQ(ReadText("err.txt"), "vrender: frames 1 to 3: the media has 3 frames (0 to 2)\n");
    EXPECT_EQ(ReadText("out.txt"), "") << "nothing is written before the range is checked";
}

TEST_F(EndToEndTest, BadArgumentsExitWithTwoAndAHint)
{
    EXPECT_EQ(Run("source pattern:bars --size big"), 2);
    EXPECT_EQ(ReadText("err.txt"), "vrender: --size: 'big' is not WIDTHxHEIGHT, e.g. 1280x720\n"
                                   "Run 'vrender --help' for the commands and options.\n");
    EXPECT_EQ(Run("--help"), 0);
    EXPECT_EQ(ReadText("out.txt").rfind("vrender: renders video frames", 0), 0u);
}

TEST_F(EndToEndTest, InfoPrintsTheExampleCutlist)
{
    ASSERT_EQ(Run("info"), 0) << ReadText("err.txt");
    const std::string out = ReadText("out.txt");
    EXPECT_EQ(out.rfind("Cutlist \"Example\" {", 0), 0u) << out;
    EXPECT_NE(out.find("\n3 segments:\n"), std::string::npos);
    EXPECT_NE(out.find("  RenderableNodeDisabledImpl {"), std::string::npos);
}

} // namespace

TEST_F(EndToEndTest, SpeedRetimesThroughTimeMixOrTimeBlend)
{
    // At half speed, time mix shows media frame floor(n / 2): output frames 0
    // and 1 are the same picture. Time blend mixes media frames 0 and 1 into
    // output frame 1, which then differs from both neighbours.
    const fs::path mix = mDirectory / "mix";
    const fs::path blend = mDirectory / "blend";
    ASSERT_EQ(Run("source 'pattern:moving?size=64x36' --count 3 --speed 0.5 -o '" + mix.string() +
                  "/f_%d.png'"),
              0)
        << ReadText("err.txt");
    ASSERT_EQ(Run("source 'pattern:moving?size=64x36' --count 3 --speed 0.5 --frame-blend -o '" +
                  blend.string() + "/f_%d.png'"),
              0)
        << ReadText("err.txt");
    const FrameRef mix0 = ReadPng(mix / "f_0.png");
    const FrameRef mix1 = ReadPng(mix / "f_1.png");
    const FrameRef mix2 = ReadPng(mix / "f_2.png");
    const FrameRef blend1 = ReadPng(blend / "f_1.png");
    ASSERT_TRUE(mix0 && mix1 && mix2 && blend1);
    EXPECT_FALSE(Differ(mix0, mix1, 0)) << "time mix repeats media frame 0";
    EXPECT_TRUE(Differ(mix1, mix2, 0));
    EXPECT_TRUE(Differ(blend1, mix0, 0)) << "time blend mixes media frames 0 and 1";
    EXPECT_TRUE(Differ(blend1, mix2, 0));
}
