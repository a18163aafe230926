#include "Options.h"

#include <string>
#include <string_view>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using vrender::Command;
using vrender::OutputKind;
using vrender::ParseCommandLine;
using vrender::ParsedCommandLine;

class OptionsTest : public ::testing::Test
{
protected:
    static ParsedCommandLine Parse(std::vector<std::string_view> inArguments)
    {
        return ParseCommandLine(inArguments);
    }

    // The error of "source pattern:bars" followed by inArguments.
    static std::string SourceError(std::vector<std::string_view> inArguments)
    {
        inArguments.insert(inArguments.begin(), {"source", "pattern:bars"});
        const ParsedCommandLine parsed = ParseCommandLine(inArguments);
        EXPECT_FALSE(parsed.Succeeded());
        return parsed.mError;
    }
};

TEST_F(OptionsTest, NoArgumentsRunsTheDemo)
{
    const ParsedCommandLine parsed = Parse({});
    ASSERT_TRUE(parsed.Succeeded());
    EXPECT_EQ(parsed.mCommand, Command::kDemo);
    EXPECT_EQ(parsed.mOptions.mMedia, "pattern:moving?size=1280x720");
    EXPECT_EQ(parsed.mOptions.mCount, 50);
    EXPECT_EQ(parsed.mOptions.mOutputPath, "out/demo/frame_%05d.png");
    EXPECT_EQ(parsed.mOptions.mOutputKind, OutputKind::kPngSequence);
}

TEST_F(OptionsTest, HelpAndInfoCommands)
{
    EXPECT_EQ(Parse({"--help"}).mCommand, Command::kHelp);
    EXPECT_EQ(Parse({"help"}).mCommand, Command::kHelp);
    EXPECT_EQ(Parse({"source", "x.png", "--size", "bad", "-h"}).mCommand, Command::kHelp);
    EXPECT_EQ(Parse({"info"}).mCommand, Command::kInfo);
    EXPECT_EQ(Parse({"info", "extra"}).mError,
              "info: unexpected argument 'extra' (info prints the built-in example cutlist)");
    EXPECT_NE(vrender::GetUsageText().find("--frames A:B"), std::string::npos);
}

TEST_F(OptionsTest, UnknownCommandAndLeadingOptionAreNamed)
{
    EXPECT_EQ(Parse({"render"}).mError,
              "unknown command 'render' (commands: source, info, demo, help)");
    EXPECT_EQ(Parse({"--size", "10x10"}).mError,
              "a command comes first: source, info, demo or help (got option '--size')");
}

TEST_F(OptionsTest, SourceDefaults)
{
    const ParsedCommandLine parsed = Parse({"source", "clip.y4m"});
    ASSERT_TRUE(parsed.Succeeded()) << parsed.mError;
    EXPECT_EQ(parsed.mCommand, Command::kSource);
    const vrender::RenderOptions& options = parsed.mOptions;
    EXPECT_EQ(options.mMedia, "clip.y4m");
    EXPECT_FALSE(options.mStart);
    EXPECT_FALSE(options.mCount);
    EXPECT_EQ(options.mWidth, 0u);
    EXPECT_FALSE(options.mPixelAspectRatio);
    EXPECT_EQ(options.mPixelFormat, mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_FALSE(options.mFieldType);
    EXPECT_EQ(options.mQuality, 5u);
    EXPECT_EQ(options.mOutputPath, "out/frames/frame_%05d.png");
    EXPECT_EQ(options.mJobs, 0u);
    EXPECT_FALSE(options.mQuiet);
}

TEST_F(OptionsTest, EveryOptionIsParsed)
{
    const ParsedCommandLine parsed = Parse({"source",
                                            "pattern:moving",
                                            "--start",
                                            "3",
                                            "--count=7",
                                            "--size",
                                            "320x240",
                                            "--par",
                                            "10:11",
                                            "--format",
                                            "VUYA_4444_8u",
                                            "--field",
                                            "lower",
                                            "--quality",
                                            "2",
                                            "--rate",
                                            "30000/1001",
                                            "-o",
                                            "-",
                                            "--chroma",
                                            "444",
                                            "-j",
                                            "5",
                                            "-q"});
    ASSERT_TRUE(parsed.Succeeded()) << parsed.mError;
    const vrender::RenderOptions& options = parsed.mOptions;
    EXPECT_EQ(options.mMedia, "pattern:moving");
    EXPECT_EQ(options.mStart, 3);
    EXPECT_EQ(options.mCount, 7);
    EXPECT_EQ(options.mWidth, 320u);
    EXPECT_EQ(options.mHeight, 240u);
    EXPECT_EQ(options.mPixelAspectRatio, mt::PixelAspectRatio(10, 11));
    EXPECT_EQ(options.mPixelFormat, mt::kPixelFormat_VUYA_4444_8u);
    EXPECT_EQ(options.mFieldType, mt::kFieldType_LowerFirst);
    EXPECT_EQ(options.mQuality, 2u);
    EXPECT_EQ(options.mFrameRate, mt::kFrameRate_Video2997);
    EXPECT_EQ(options.mOutputKind, OutputKind::kY4MStream);
    EXPECT_EQ(options.mChroma, vrender::Y4MChroma::k444);
    EXPECT_EQ(options.mJobs, 5u);
    EXPECT_TRUE(options.mQuiet);
}

TEST_F(OptionsTest, FramesIsAnInclusiveRange)
{
    const ParsedCommandLine parsed = Parse({"source", "a.y4m", "--frames", "10:19"});
    ASSERT_TRUE(parsed.Succeeded());
    EXPECT_EQ(parsed.mOptions.mStart, 10);
    EXPECT_EQ(parsed.mOptions.mCount, 10);
    EXPECT_EQ(Parse({"source", "a.y4m", "--frames", "4:4"}).mOptions.mCount, 1);
}

TEST_F(OptionsTest, OutputChoices)
{
    const ParsedCommandLine y4m = Parse({"source", "a.png", "--y4m"});
    EXPECT_EQ(y4m.mOptions.mOutputKind, OutputKind::kY4MStream);
    const ParsedCommandLine file = Parse({"source", "a.png", "-o", "out/clip.Y4M"});
    EXPECT_EQ(file.mOptions.mOutputKind, OutputKind::kY4MFile);
    EXPECT_EQ(file.mOptions.mOutputPath, "out/clip.Y4M");
    const ParsedCommandLine png = Parse({"source", "a.png", "--output", "x/f_%03d.png"});
    EXPECT_EQ(png.mOptions.mOutputKind, OutputKind::kPngSequence);
    EXPECT_EQ(png.mOptions.mOutputPath, "x/f_%03d.png");
    const ParsedCommandLine directory = Parse({"source", "a.png", "--output-dir", "out/100%"});
    EXPECT_EQ(directory.mOptions.mOutputPath, "out/100%%/frame_%05d.png");
    EXPECT_EQ(vrender::FormatFramePath(directory.mOptions.mOutputPath, 7),
              "out/100%/frame_00007.png");
}

TEST_F(OptionsTest, BadValuesNameTheOptionAndTheProblem)
{
    EXPECT_EQ(SourceError({"--size", "abc"}), "--size: 'abc' is not WIDTHxHEIGHT, e.g. 1280x720");
    EXPECT_EQ(SourceError({"--size", "0x10"}), "--size: '0x10' is out of range (1 to 32768 each)");
    EXPECT_EQ(SourceError({"--size", "40000x10"}),
              "--size: '40000x10' is out of range (1 to 32768 each)");
    EXPECT_EQ(SourceError({"--par", "4:0"}),
              "--par: '4:0' is not N:D with both terms positive, e.g. 1:1 or 10:11");
    EXPECT_EQ(SourceError({"--field", "top"}), "--field: 'top' is not progressive, upper or lower");
    EXPECT_EQ(SourceError({"--quality", "6"}), "--quality: '6' is not a quality 0 to 5");
    EXPECT_EQ(SourceError({"--quality", "-1"}), "--quality: '-1' is not a quality 0 to 5");
    EXPECT_EQ(SourceError({"--jobs", "0"}),
              "--jobs: '0' is not a number of frames in flight, 1 to 64");
    EXPECT_EQ(SourceError({"--jobs", "65"}),
              "--jobs: '65' is not a number of frames in flight, 1 to 64");
    EXPECT_EQ(SourceError({"--rate", "fast"}),
              "--rate: 'fast' is not a frame rate from 1 to 1000, e.g. 25, 30000/1001 or 29.97");
    EXPECT_EQ(SourceError({"--rate", "25/0"}),
              "--rate: '25/0' is not a frame rate from 1 to 1000, e.g. 25, 30000/1001 or 29.97");
    EXPECT_EQ(SourceError({"--start", "x"}), "--start: 'x' is not a frame number (0 or more)");
    EXPECT_EQ(SourceError({"--count", "0"}), "--count: '0' is not a frame count (1 or more)");
    EXPECT_EQ(SourceError({"--frames", "5"}),
              "--frames: '5' is not FIRST:LAST (frame numbers, both included), e.g. 0:49");
    EXPECT_EQ(SourceError({"--frames", "9:3"}),
              "--frames: the last frame 3 comes before the first 9");
    EXPECT_EQ(SourceError({"--chroma", "422", "--y4m"}), "--chroma: '422' is not 420 or 444");
}

TEST_F(OptionsTest, BadFormatsListTheRenderableOnes)
{
    const std::string unknown = SourceError({"--format", "RGB24"});
    EXPECT_EQ(unknown.rfind("--format: unknown pixel format 'RGB24' (one of BGRA_4444_8u, ", 0), 0u)
        << unknown;
    EXPECT_EQ(unknown.find("MJPG"), std::string::npos);
    const std::string compressed = SourceError({"--format", "MJPG_422_Compressed"});
    EXPECT_EQ(compressed.rfind("--format: 'MJPG_422_Compressed' cannot be rendered to (one of ", 0),
              0u)
        << compressed;
    EXPECT_NE(SourceError({"--format", "Any"}).find("cannot be rendered to"), std::string::npos);
}

TEST_F(OptionsTest, StructuralMistakes)
{
    EXPECT_EQ(Parse({"source"}).mError, "source: no media given (an image file, a .y4m file or a "
                                        "pattern: text such as pattern:bars)");
    EXPECT_EQ(SourceError({"other"}), "unexpected argument 'other'");
    EXPECT_EQ(SourceError({"--size"}), "--size needs a value");
    EXPECT_EQ(SourceError({"--bogus"}), "unknown option '--bogus' (see vrender --help)");
    EXPECT_EQ(SourceError({"--quiet=yes"}), "--quiet takes no value");
    EXPECT_EQ(SourceError({"--size", "1x1", "--size", "2x2"}), "--size is given twice");
    EXPECT_EQ(SourceError({"--frames", "0:9", "--count", "3"}),
              "--frames cannot be combined with --start or --count");
    EXPECT_EQ(SourceError({"-o", "-", "--y4m"}),
              "--y4m: the output is already chosen by -o; give only one of -o, --output-dir and "
              "--y4m");
    EXPECT_EQ(SourceError({"--chroma", "444"}),
              "--chroma applies to Y4M output only (-o -, -o FILE.y4m or --y4m)");
    EXPECT_EQ(SourceError({"-o", "out/frame.png"}),
              "-o: 'out/frame.png': the pattern has no frame number (add one, e.g. "
              "frame_%05d.png)");
    EXPECT_EQ(SourceError({"-o", "out/x.tiff"}),
              "-o: 'out/x.tiff' is neither a .png sequence (e.g. out/frame_%05d.png), a .y4m file "
              "nor - (a Y4M stream on standard output)");
    EXPECT_EQ(Parse({"demo", "media.png"}).mError, "unexpected argument 'media.png'");
}

TEST_F(OptionsTest, FrameRates)
{
    EXPECT_EQ(vrender::ParseFrameRate("25"), mt::kFrameRate_Video25);
    EXPECT_EQ(vrender::ParseFrameRate("29.97"), mt::kFrameRate_Video2997);
    EXPECT_EQ(vrender::ParseFrameRate("23.976"), mt::kFrameRate_Video2398);
    EXPECT_EQ(vrender::ParseFrameRate("60000/1001"), mt::kFrameRate_Video5994);
    EXPECT_EQ(vrender::ParseFrameRate("12.5"), mt::FrameRate::Create(56'448'000));
    EXPECT_FALSE(vrender::ParseFrameRate("0"));
    EXPECT_FALSE(vrender::ParseFrameRate("1001"));
    EXPECT_FALSE(vrender::ParseFrameRate("1/2"));
    EXPECT_FALSE(vrender::ParseFrameRate(""));
}

TEST_F(OptionsTest, FramePatterns)
{
    EXPECT_EQ(vrender::CheckFramePattern("f_%05d.png"), "");
    EXPECT_EQ(vrender::CheckFramePattern("f_%d.png"), "");
    EXPECT_EQ(vrender::CheckFramePattern("100%%_%3d.png"), "");
    EXPECT_EQ(vrender::CheckFramePattern("%d_%d.png"),
              "the pattern has more than one frame number");
    EXPECT_EQ(vrender::CheckFramePattern("f_%s.png"),
              "bad frame number conversion at '%s.png' (use %d, %5d or %05d; %% for a percent "
              "sign)");
    EXPECT_EQ(vrender::CheckFramePattern("f_%0005d.png"),
              "bad frame number conversion at '%0005d.png' (use %d, %5d or %05d; %% for a percent "
              "sign)");
    EXPECT_EQ(vrender::CheckFramePattern("f_%"),
              "bad frame number conversion at '%' (use %d, %5d or %05d; %% for a percent sign)");
    EXPECT_EQ(vrender::FormatFramePath("f_%05d.png", 42), "f_00042.png");
    EXPECT_EQ(vrender::FormatFramePath("f_%3d.png", 7), "f_  7.png");
    EXPECT_EQ(vrender::FormatFramePath("f_%d.png", 123456), "f_123456.png");
    EXPECT_EQ(vrender::FormatFramePath("100%%_%02d.png", 123), "100%_123.png");
}

} // namespace

TEST_F(OptionsTest, FilterOptionsStackInTheMediaNodeOrder)
{
    const ParsedCommandLine parsed =
        Parse({"source", "clip.y4m", "--remove-pulldown", "BC", "--deinterlace", "--speed", "0.5",
               "--frame-blend", "--scale", "320x180", "--reverse-field-dominance"});
    ASSERT_TRUE(parsed.Succeeded()) << parsed.mError;
    const vrender::FilterOptions& filters = parsed.mOptions.mFilters;
    EXPECT_EQ(filters.mRemovePulldown, mvxmediatypes::kPulldownCadence_23_BC);
    EXPECT_TRUE(filters.mDeinterlace);
    EXPECT_TRUE(filters.mReverseFieldDominance);
    EXPECT_FALSE(filters.mFieldReverse);
    EXPECT_FALSE(filters.mRemoveFlicker);
    EXPECT_FALSE(filters.mInterlaceConsecutive);
    ASSERT_TRUE(filters.mSpeed);
    EXPECT_EQ(*filters.mSpeed, 0.5);
    EXPECT_TRUE(filters.mFrameBlend);
    EXPECT_TRUE(filters.mScale);
    EXPECT_EQ(parsed.mOptions.mWidth, 320u);
    EXPECT_EQ(parsed.mOptions.mHeight, 180u);

    // --par alone also brings in the scaler; no filter option means no filters.
    EXPECT_TRUE(Parse({"source", "x.png", "--par", "10:11"}).mOptions.mFilters.mScale);
    EXPECT_FALSE(Parse({"source", "x.png", "--size", "64x36"}).mOptions.mFilters.Any());
}

TEST_F(OptionsTest, BadFilterValuesAreNamed)
{
    EXPECT_EQ(SourceError({"--remove-pulldown", "XY"}),
              "--remove-pulldown: 'XY' is not a 2:3 cadence phase (AA, BB, BC, CD or DD)");
    EXPECT_EQ(SourceError({"--speed", "0"}),
              "--speed: '0' is not a speed (a non-zero number from -1000 to 1000, e.g. 0.5)");
    EXPECT_EQ(SourceError({"--speed", "fast"}),
              "--speed: 'fast' is not a speed (a non-zero number from -1000 to 1000, e.g. 0.5)");
    EXPECT_EQ(SourceError({"--deinterlace=1"}), "--deinterlace takes no value");
}
