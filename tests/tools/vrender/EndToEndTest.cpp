// Runs the built vrender program the way a user does and checks what it
// leaves behind: the files, their pixels, the exit codes and the messages.

#include "BE/VideoSources.h"
#include "VF/PngFile.h"
#include "VrenderTestSupport.h"

#include <random>
#include <string>
#include <sys/ioctl.h>
#include <sys/stat.h>

#include <gtest/gtest.h>

namespace
{

namespace fs = std::filesystem;
namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using Args = std::vector<std::string>;

FrameRef ReadPng(const fs::path& inPath)
{
    FrameRef frame;
    const VF::PngStatus status = VF::ReadPngFile(inPath.string(), frame);
    EXPECT_TRUE(status.Succeeded()) << inPath << ": " << status.mMessage;
    return frame;
}

// True when the RGB of the two same-sized frames differ anywhere by more than inTolerance.
bool Differ(const FrameRef& inA, const FrameRef& inB, int inTolerance)
{
    for (int y = 0; y < inA->GetBounds().Height(); ++y)
    {
        const auto* a =
            static_cast<const std::uint8_t*>(inA->GetBaseAddress()) + y * inA->GetRowBytes();
        const auto* b =
            static_cast<const std::uint8_t*>(inB->GetBaseAddress()) + y * inB->GetRowBytes();
        for (int x = 0; x < 4 * inA->GetBounds().Width(); ++x)
            if (x % 4 != 3 && std::abs(a[x] - b[x]) > inTolerance)
                return true;
    }
    return false;
}

// An 8x8 4:4:4 clip of grey frames whose luma tells them apart: frame i
// has luma 40 (i + 1). The last frame loses inCut bytes.
fs::path WriteNumberedClip(const fs::path& inPath, int inFrames, std::size_t inCut = 0)
{
    std::string bytes = "YUV4MPEG2 W8 H8 F25:1 Ip A1:1 C444\n";
    for (int i = 0; i < inFrames; ++i)
    {
        bytes += "FRAME\n";
        bytes.append(64, char(40 * (i + 1)));
        bytes.append(128, char(128));
    }
    std::ofstream(inPath, std::ios::binary) << bytes.substr(0, bytes.size() - inCut);
    return inPath;
}

// The frame numbers of WriteNumberedClip in a 4:4:4 stream of such frames.
std::vector<int> NumberFrames(const std::string& inStream)
{
    std::vector<int> numbers;
    for (std::size_t at = inStream.find("FRAME\n"); at != std::string::npos;
         at = inStream.find("FRAME\n", at + 6 + 3 * 64))
        numbers.push_back((std::uint8_t(inStream[at + 6]) + 20) / 40 - 1);
    return numbers;
}

using EndToEndTest = vrendertest::ScratchDirectoryTest;

TEST_F(EndToEndTest, SpeedsPlayTheWholeClipAndReverseStartsAtItsEnd)
{
    const std::string clip = WriteNumberedClip(mDirectory / "clip.y4m", 5).string();
    const std::pair<Args, std::vector<int>> cases[] = {{{"-1"}, {4, 3, 2, 1, 0}},
                                                       {{"-1", "--frame-blend"}, {4, 3, 2, 1, 0}},
                                                       {{"2"}, {0, 2, 4}},
                                                       {{"-2"}, {4, 2, 0}},
                                                       {{"0.5"}, {0, 0, 1, 1, 2, 2, 3, 3, 4, 4}},
                                                       {{"-0.5"}, {4, 4, 3, 3, 2, 2, 1, 1, 0, 0}}};
    for (const auto& [speed, expected] : cases)
    {
        SCOPED_TRACE(speed.front() + (speed.size() > 1 ? " " + speed.back() : ""));
        Args args{"source", clip, "--chroma", "444", "-o", "-", "--speed"};
        args.insert(args.end(), speed.begin(), speed.end());
        const auto run = Run(args);
        ASSERT_EQ(run.mExitCode, 0) << run.mErr;
        EXPECT_EQ(NumberFrames(run.mOut), expected);
    }
    // Blending reaches past the clip's ends; the edge frames stand in.
    const auto blended = Run({"source", clip, "--speed", "-2", "--frame-blend", "-o", "-"});
    EXPECT_EQ(blended.mExitCode, 0) << blended.mErr;
    EXPECT_EQ(blended.mErr.rfind("Rendered 3 frames", 0), 0u) << blended.mErr;
}

TEST_F(EndToEndTest, ACutLastFrameFailsAloneAndIsNamed)
{
    const std::string clip = WriteNumberedClip(mDirectory / "cut.y4m", 5, 10).string();
    const auto complete = Run({"source", clip, "--frames", "0:3", "-o", "-"});
    EXPECT_EQ(complete.mExitCode, 0) << complete.mErr;
    const fs::path out = mDirectory / "all";
    const auto all = Run({"source", clip, "-j", "1", "-o", (out / "f_%d.png").string()});
    EXPECT_EQ(all.mExitCode, 1);
    EXPECT_EQ(all.mErr, "vrender: frame 4: " + clip + ": frame 4 is truncated: 182 of 192 bytes\n");
    for (int i = 0; i < 4; ++i)
        EXPECT_TRUE(ReadPng(out / ("f_" + std::to_string(i) + ".png"))) << "frame " << i;
    EXPECT_EQ(std::distance(fs::directory_iterator(out), fs::directory_iterator()), 4);
}

TEST_F(EndToEndTest, ATimelineClipThatFailsToReadFailsItsFrameOnly)
{
    // The clip's cut frame 4 falls on the sequence's frame 6.
    const std::string clip = WriteNumberedClip(mDirectory / "cut.y4m", 5, 10).string();
    const std::string timeline = (mDirectory / "t.json").string();
    std::ofstream(timeline) << R"({"sequences": [{"name": "T", "size": [8, 8], "tracks": [
        {"items": [{"start": 0, "end": "8f", "media": {"color": "#404040"}}]},
        {"items": [{"start": "2f", "end": "7f", "media": {"file": "cut.y4m"}}]}]}]})";
    const std::string reason = "frame 6: " + clip + ": frame 4 is truncated: 182 of 192 bytes";
    const auto stopped = Run({"render", timeline, "-j", "1", "--chroma", "444", "-o", "-"});
    EXPECT_EQ(stopped.mExitCode, 1);
    EXPECT_EQ(stopped.mErr, "vrender: " + reason + "\n");
    // The solid reads as 1 in the numbering, black as -1.
    EXPECT_EQ(NumberFrames(stopped.mOut), (std::vector<int>{1, 1, 0, 1, 2, 3}));

    const auto going = Run({"render", timeline, "--keep-going", "--chroma", "444", "-o", "-"});
    EXPECT_EQ(going.mExitCode, 1);
    EXPECT_EQ(going.mErr,
              "vrender: " + reason + "; written black\nvrender: " + reason + " (written black)\n");
    EXPECT_EQ(NumberFrames(going.mOut), (std::vector<int>{1, 1, 0, 1, 2, 3, -1, 1}));

    // What the renderer cannot build is the timeline's fault, said as such at load.
    std::ofstream(timeline) << R"({"sequences": [{"name": "T", "tracks": [{"items": [{"end": 1,
        "media": {"color": "#404040"}, "transitions": [{"match": "X", "start": 0, "end": 1}]}]}]}]})";
    const auto refused = Run({"render", timeline, "-o", "-"});
    EXPECT_EQ(refused.mExitCode, 1);
    EXPECT_EQ(refused.mErr, "vrender: " + timeline +
                                ":2: /sequences/0/tracks/0/items/0/transitions/0/match: unknown "
                                "transition match name \"X\"\n");
}

TEST_F(EndToEndTest, AFrameLargerThanTheMemoryBudgetIsRefusedBeforeRendering)
{
    const auto run =
        Run({"source", "pattern:moving?size=32768x32768", "--memory", "1G", "-o", "-"});
    EXPECT_EQ(run.mExitCode, 1);
    EXPECT_EQ(run.mErr.rfind("vrender: a 32768x32768 frame needs about ", 0), 0u) << run.mErr;
    EXPECT_NE(run.mErr.find(" more than the memory budget of 1.0 GiB (--memory)\n"),
              std::string::npos)
        << run.mErr;
    EXPECT_EQ(run.mOut, "");
    EXPECT_EQ(Run({"source", "pattern:moving", "--memory", "1Q"}).mExitCode, 2);
}

TEST_F(EndToEndTest, AFifoIsRefusedWithoutWaitingForAWriter)
{
    const std::string fifo = (mDirectory / "fifo.y4m").string();
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    const int out = open((mDirectory / "out.txt").c_str(), O_WRONLY | O_CREAT, 0644);
    const pid_t child = Start({"source", fifo, "-o", "-"}, out);
    close(out);
    EXPECT_EQ(WaitForExit(child), 1);
    EXPECT_EQ(vrendertest::ReadText(mDirectory / "err.txt"),
              "vrender: " + fifo + ": not a regular file (a FIFO)\n");
}

// The first SIGINT or SIGTERM ends a render wherever it waits: on a pipe
// whose reader has stopped reading, or on frames; only complete PNG files
// are left.
TEST_F(EndToEndTest, ASignalEndsTheRenderWhereverItWaits)
{
    const std::pair<int, int> signals[] = {{SIGINT, 130}, {SIGTERM, 143}};
    for (const auto& [signal, exitCode] : signals)
    {
        SCOPED_TRACE(signal);
        int pipeEnds[2];
        ASSERT_EQ(pipe(pipeEnds), 0);
        const pid_t streaming =
            Start({"source", "pattern:moving?size=1920x1080", "--count", "2000", "--y4m", "-q"},
                  pipeEnds[1]);
        close(pipeEnds[1]);
        const int capacity = fcntl(pipeEnds[0], F_GETPIPE_SZ);
        EXPECT_TRUE(Await(
            [&]
            {
                int queued = 0;
                return ioctl(pipeEnds[0], FIONREAD, &queued) == 0 && queued >= capacity;
            }))
            << "the pipe fills up";
        kill(streaming, signal);
        EXPECT_EQ(WaitForExit(streaming), exitCode) << "the stalled writer is cut short";
        close(pipeEnds[0]);

        const fs::path out = mDirectory / ("png" + std::to_string(signal));
        const int log = open((mDirectory / "out.txt").c_str(), O_WRONLY | O_CREAT, 0644);
        const pid_t rendering = Start({"source", "pattern:moving?size=320x180", "--count", "100000",
                                       "-q", "-o", (out / "f_%06d.png").string()},
                                      log);
        close(log);
        EXPECT_TRUE(Await([&] { return fs::exists(out / "f_000000.png"); }));
        kill(rendering, signal);
        EXPECT_EQ(WaitForExit(rendering), exitCode);
        EXPECT_EQ(
            vrendertest::ReadText(mDirectory / "err.txt").rfind("vrender: cancelled after ", 0),
            0u);
        for (const auto& entry : fs::directory_iterator(out))
        {
            ASSERT_EQ(entry.path().extension(), ".png") << entry.path();
            const FrameRef frame = ReadPng(entry.path());
            ASSERT_TRUE(frame) << entry.path();
            EXPECT_EQ(frame->GetBounds().Width(), 320);
        }
    }
}

TEST_F(EndToEndTest, Y4MStreamHoldsTheSameFramesInOrder)
{
    const fs::path png = mDirectory / "png";
    const std::string media = "pattern:moving?size=48x32";
    ASSERT_EQ(
        Run({"source", media, "--frames", "2:5", "-o", (png / "f_%d.png").string()}).mExitCode, 0);
    const auto run =
        Run({"source", media, "--frames", "2:5", "--chroma", "444", "-j", "4", "--y4m"});
    ASSERT_EQ(run.mExitCode, 0) << run.mErr;
    const std::string header = "YUV4MPEG2 W48 H32 F25:1 Ip A1:1 C444 XCOLORRANGE=LIMITED\n";
    ASSERT_EQ(run.mOut.substr(0, header.size()), header);
    EXPECT_EQ(run.mOut.size(), header.size() + 4 * (6 + 3 * 48 * 32));
    EXPECT_EQ(run.mErr.rfind("Rendered 4 frames", 0), 0u) << run.mErr;
    EXPECT_NE(run.mErr.find(" to standard output\n"), std::string::npos) << run.mErr;

    std::ofstream(mDirectory / "stream.y4m", std::ios::binary) << run.mOut;
    BE::VideoSourceRef source;
    ASSERT_TRUE(BE::OpenY4MSource((mDirectory / "stream.y4m").string(), source).Succeeded());
    for (int i = 0; i < 4; ++i)
    {
        FrameRef decoded;
        ASSERT_EQ(source->GetVideoFrame(mt::TickTime::FromFrame(i, mt::kFrameRate_Video25),
                                        BE::VideoFrameRequest{}, MF::BinaryData(), {}, 0, decoded),
                  0);
        const FrameRef same = ReadPng(png / ("f_" + std::to_string(i + 2) + ".png"));
        ASSERT_TRUE(same);
        EXPECT_FALSE(Differ(decoded, same, 3)) << "stream frame " << i;
    }
}

// A 4:2:0 clip written as a 4:2:0 stream or file keeps every sample: random
// samples survive no conversion, so equal frames show that none was made,
// neither with planes whose rows are padded in memory nor with whole ones.
TEST_F(EndToEndTest, A420ClipPassesThroughByteForByte)
{
    for (const auto& [width, height] : {std::pair(33, 17), std::pair(128, 4)})
    {
        SCOPED_TRACE(width);
        const std::size_t frameBytes = width * height + 2 * ((width + 1) / 2) * ((height + 1) / 2);
        std::mt19937 random(width);
        std::string frames;
        for (int i = 0; i < 3; ++i)
        {
            frames += "FRAME\n";
            for (std::size_t b = 0; b < frameBytes; ++b)
                frames += static_cast<char>(random());
        }
        const std::string size = "W" + std::to_string(width) + " H" + std::to_string(height);
        const fs::path clip = mDirectory / ("clip" + std::to_string(width) + ".y4m");
        std::ofstream(clip, std::ios::binary) << "YUV4MPEG2 " << size << " F25:1 C420jpeg\n"
                                              << frames;
        const fs::path file = mDirectory / ("out" + std::to_string(width) + ".y4m");
        const auto stream = Run({"source", clip.string(), "-j", "2", "--y4m"});
        ASSERT_EQ(Run({"source", clip.string(), "-o", file.string()}).mExitCode, 0);
        ASSERT_EQ(stream.mExitCode, 0) << stream.mErr;
        for (const std::string& output : {stream.mOut, vrendertest::ReadText(file)})
        {
            const std::string header = "YUV4MPEG2 " + size + " F25:1 Ip A1:1 C420 ";
            EXPECT_EQ(output.substr(0, header.size()), header);
            EXPECT_TRUE(output.substr(output.find('\n') + 1) == frames) << "frames differ";
        }
    }
}

TEST_F(EndToEndTest, SizeFormatAndQualityOptions)
{
    const fs::path out = mDirectory / "scaled";
    const auto run =
        Run({"source", "pattern:bars?size=64x36", "--count", "2", "--size", "32x18", "--format",
             "BGRA_4444_16u", "--quality", "3", "--output-dir", out.string()});
    ASSERT_EQ(run.mExitCode, 0) << run.mErr;
    const FrameRef frame = ReadPng(out / "frame_00001.png");
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 32, 18));
    // The first bar is 75 % white.
    for (int c = 0; c < 3; ++c)
        EXPECT_NEAR(static_cast<const std::uint8_t*>(frame->GetBaseAddress())[c], 191, 2);
}

TEST_F(EndToEndTest, InfoPrintsToStandardOutput)
{
    const auto info = Run({"info"});
    ASSERT_EQ(info.mExitCode, 0) << info.mErr;
    EXPECT_EQ(info.mOut.rfind("Cutlist \"Example\" {", 0), 0u) << info.mOut;
}

TEST_F(EndToEndTest, PngFilesAtHalfSpeedThroughTimeMixOrTimeBlend)
{
    // At half speed, time mix shows media frame floor(n / 2): output frames 0
    // and 1 are the same picture. Time blend mixes media frames 0 and 1 into
    // output frame 1, which then differs from both neighbours.
    for (const std::string kind : {"mix", "blend"})
    {
        const fs::path out = mDirectory / kind;
        Args args{
            "source", "pattern:moving?size=64x36",  "--count", "3", "--speed", "0.5", "-j", "3",
            "-o",     (out / "f_%03d.png").string()};
        if (kind == "blend")
            args.push_back("--frame-blend");
        const auto run = Run(args);
        ASSERT_EQ(run.mExitCode, 0) << run.mErr;
        EXPECT_EQ(run.mErr.rfind("Rendered 3 frames in ", 0), 0u) << run.mErr;
        EXPECT_NE(run.mErr.find(" to " + out.string() + "/f_%03d.png\n"), std::string::npos);
        EXPECT_EQ(run.mOut, "") << "PNG output keeps standard output clean";
        EXPECT_EQ(std::distance(fs::directory_iterator(out), fs::directory_iterator()), 3)
            << "no temporary files are left";
    }
    const FrameRef mix0 = ReadPng(mDirectory / "mix" / "f_000.png");
    const FrameRef mix1 = ReadPng(mDirectory / "mix" / "f_001.png");
    const FrameRef mix2 = ReadPng(mDirectory / "mix" / "f_002.png");
    const FrameRef blend1 = ReadPng(mDirectory / "blend" / "f_001.png");
    ASSERT_TRUE(mix0 && mix1 && mix2 && blend1);
    EXPECT_FALSE(Differ(mix0, mix1, 0)) << "time mix repeats media frame 0";
    EXPECT_TRUE(Differ(mix1, mix2, 0));
    EXPECT_TRUE(Differ(blend1, mix0, 0)) << "time blend mixes media frames 0 and 1";
    EXPECT_TRUE(Differ(blend1, mix2, 0));
}

} // namespace
