// vrender as a user meets it: what the program tells and leaves behind for
// still patterns, deep formats, damaged images, options that cannot apply,
// and folders that hold an earlier render.

#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VrenderTestSupport.h"
#include "mvxmediatypes/PixelFormat.h"

#include <set>
#include <string>

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

// The names of the files in inDirectory.
std::set<std::string> Names(const fs::path& inDirectory)
{
    std::set<std::string> names;
    for (const fs::directory_entry& entry : fs::directory_iterator(inDirectory))
        names.insert(entry.path().filename().string());
    return names;
}

using CommandLineRunTest = vrendertest::ScratchDirectoryTest;

TEST_F(CommandLineRunTest, PatternsKeepTheirRateAndStillOnesRenderOneFrame)
{
    // An 8x8 4:2:0 frame is "FRAME\n" and 64 + 2 x 16 bytes.
    const std::size_t frameBytes = 6 + 64 + 2 * 16;
    const std::tuple<const char*, const char*, std::size_t> cases[] = {
        {"pattern:bars?size=8x8&rate=29.97", "F30000:1001", 1},
        {"pattern:solid?size=8x8&rate=24", "F24:1", 1},
        {"pattern:gradient?size=8x8", "F25:1", 1},
        {"pattern:moving?size=8x8&rate=50", "F50:1", 50}};
    for (const auto& [media, rate, frames] : cases)
    {
        SCOPED_TRACE(media);
        const vrendertest::RunResult run = Run({"source", media, "--y4m"});
        ASSERT_EQ(run.mExitCode, 0) << run.mErr;
        const std::string header = "YUV4MPEG2 W8 H8 " + std::string(rate) + " Ip";
        EXPECT_EQ(run.mOut.substr(0, header.size()), header);
        EXPECT_EQ(run.mOut.size(), run.mOut.find('\n') + 1 + frames * frameBytes);
    }
    // A start frame alone does not make a still longer.
    const vrendertest::RunResult later =
        Run({"source", "pattern:solid?size=8x8", "--start", "5", "--y4m"});
    EXPECT_EQ(later.mOut.size(), later.mOut.find('\n') + 1 + frameBytes) << later.mErr;
}

TEST_F(CommandLineRunTest, PngDepthAndChannelsFollowTheFormatAndAlpha)
{
    const std::string opaque = "pattern:bars?size=14x2";
    const std::string translucent = opaque + "&alpha=straight&opacity=128";
    const std::tuple<const char*, std::string, int, int> cases[] = {
        {"BGRA_4444_8u", opaque, 8, 2},
        {"BGRA_4444_8u", translucent, 8, 6},
        {"BGRA_4444_16u", opaque, 16, 2},
        {"BGRA_4444_32f", translucent, 16, 6}};
    for (const auto& [format, media, depth, colorType] : cases)
    {
        SCOPED_TRACE(std::string(format) + " " + media);
        const fs::path out = mDirectory / format / std::to_string(colorType);
        const vrendertest::RunResult run =
            Run({"source", media, "--format", format, "-q", "--output-dir", out.string()});
        ASSERT_EQ(run.mExitCode, 0) << run.mErr;
        const std::string file = vrendertest::ReadText(out / "frame_00000.png");
        // IHDR: the bit depth and colour type follow width and height.
        ASSERT_GT(file.size(), 26u);
        EXPECT_EQ(std::pair(int(file[24]), int(file[25])), std::pair(depth, colorType));
    }
}

TEST_F(CommandLineRunTest, DamagedImagesNameTheFileAndTheDecodersReason)
{
    const std::string path = (mDirectory / "cut.png").string();
    const FrameRef picture = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, 32, 32,
                                                  mt::kPixelAspectRatio_Square, true, false);
    ASSERT_TRUE(VF::WritePngFile(path, picture).Succeeded());
    const std::string bytes = vrendertest::ReadText(path);
    std::ofstream(path, std::ios::binary | std::ios::trunc) << bytes.substr(0, bytes.size() - 20);
    const vrendertest::RunResult run =
        Run({"source", path, "-o", (mDirectory / "f_%d.png").string()});
    EXPECT_EQ(run.mExitCode, 1);
    EXPECT_EQ(run.mErr, "vrender: frame 0: " + path + ": the file ends early (truncated)\n");
}

TEST_F(CommandLineRunTest, OptionsThatCannotApplyToAStillSourceWarnOnceEvenWhenQuiet)
{
    const std::string still = " does not apply to a still source ('pattern:bars?size=8x8' shows "
                              "one picture at every time); ignored\n";
    const vrendertest::RunResult run = Run({"source", "pattern:bars?size=8x8", "--speed", "2",
                                            "--interlace-consecutive", "-q", "--y4m"});
    ASSERT_EQ(run.mExitCode, 0) << run.mErr;
    EXPECT_EQ(run.mErr.substr(0, run.mErr.find("Rendered")),
              "vrender: warning: --speed" + still + "vrender: warning: --interlace-consecutive" +
                  still);
    const vrendertest::RunResult moving =
        Run({"source", "pattern:moving?size=8x8", "--count", "2", "--speed", "2", "--y4m"});
    ASSERT_EQ(moving.mExitCode, 0) << moving.mErr;
    EXPECT_EQ(moving.mErr.find("warning"), std::string::npos) << moving.mErr;
}

TEST_F(CommandLineRunTest, EarlierFramesStopTheRenderOrGiveWayToOverwrite)
{
    const fs::path out = mDirectory / "out";
    const std::string pattern = (out / "f_%02d.png").string();
    const std::string media = "pattern:moving?size=8x8";
    // Files are numbered by source frame.
    ASSERT_EQ(Run({"source", media, "--frames", "10:14", "-o", pattern}).mExitCode, 0);
    // Names that do not match the pattern are never touched.
    for (const char* other : {"notes.txt", "f_7.png", "f_09.png.bak"})
        std::ofstream(out / other) << "keep";
    const std::set<std::string> before = Names(out);
    EXPECT_EQ(before, (std::set<std::string>{"f_10.png", "f_11.png", "f_12.png", "f_13.png",
                                             "f_14.png", "notes.txt", "f_7.png", "f_09.png.bak"}));

    const std::string larger = "pattern:moving?size=16x16";
    const vrendertest::RunResult refused =
        Run({"source", larger, "--frames", "12:13", "-o", pattern});
    EXPECT_EQ(refused.mExitCode, 1);
    EXPECT_EQ(refused.mErr, "vrender: '" + (out / "f_10.png").string() + "' and 4 more frames of " +
                                pattern +
                                " from an earlier render exist; give --overwrite to replace them "
                                "(the earlier frames outside the new range are then removed)\n");
    EXPECT_EQ(Names(out), before);

    const vrendertest::RunResult replaced =
        Run({"source", larger, "--frames", "12:13", "--overwrite", "-o", pattern});
    ASSERT_EQ(replaced.mExitCode, 0) << replaced.mErr;
    EXPECT_EQ(Names(out), (std::set<std::string>{"f_12.png", "f_13.png", "notes.txt", "f_7.png",
                                                 "f_09.png.bak"}));
    FrameRef frame;
    ASSERT_TRUE(VF::ReadPngFile((out / "f_13.png").string(), frame).Succeeded());
    EXPECT_EQ(frame->GetBounds().Width(), 16) << "the new render's frame";

    // A Y4M file is not replaced without --overwrite either.
    const std::string clip = (out / "notes.txt").string() + ".y4m";
    std::ofstream(clip) << "keep";
    const vrendertest::RunResult y4m = Run({"source", media, "--count", "1", "-o", clip});
    EXPECT_EQ(std::pair(y4m.mExitCode, y4m.mErr),
              std::pair(1, "vrender: '" + clip + "' exists; give --overwrite to replace it\n"));
    EXPECT_EQ(Run({"source", media, "--count", "1", "-y", "-o", clip}).mExitCode, 0);
    EXPECT_EQ(vrendertest::ReadText(clip).rfind("YUV4MPEG2 W8 H8 ", 0), 0u);
}

TEST_F(CommandLineRunTest, HelpNamesEveryFormatTheExitCodesAndTheNumbering)
{
    const vrendertest::RunResult help = Run({"--help"});
    ASSERT_EQ(help.mExitCode, 0);
    for (const mt::PixelFormat format : mt::GetPixelFormatCatalogue())
    {
        const std::string name(mt::GetPixelFormatName(format));
        const bool listed = help.mOut.find(" " + name + ",") != std::string::npos ||
                            help.mOut.find(" " + name + "\n") != std::string::npos;
        EXPECT_EQ(listed, format.IsRaster() && !format.IsPlanar()) << name;
    }
    for (const char* text :
         {"Exit status:\n  0 ", "\n  1 ", "\n  2    bad arguments", "\n  130  cancelled",
          "\n  143  cancelled", "--frames 10:19 writes frame_00010.png",
          "1\n                      for a still image or a still pattern; 50 for\n"
          "                      pattern:moving"})
        EXPECT_NE(help.mOut.find(text), std::string::npos) << text;
}

} // namespace
