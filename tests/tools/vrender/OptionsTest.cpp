// vrender's command line: arguments to options, and every refusal with its
// message, checked in the parser and in the program's exit code and output.

#include "Options.h"

#include "VrenderTestSupport.h"

#include <sstream>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

// The tables designate only the fields that differ from RenderOptions' defaults.
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"

namespace
{

namespace mt = mvxmediatypes;
using vrender::Command;
using vrender::OutputKind;
using vrender::RenderOptions;
using Args = std::vector<std::string>;

const std::string kFrames = "out/frames/frame_%05d.png";

// Every field, so that an option that also changes another field shows.
auto Fields(const RenderOptions& inOptions)
{
    const vrender::FilterOptions& filters = inOptions.mFilters;
    return std::tie(inOptions.mMedia, inOptions.mStart, inOptions.mCount, inOptions.mWidth,
                    inOptions.mHeight, inOptions.mPixelAspectRatio, inOptions.mPixelFormat,
                    inOptions.mFieldType, inOptions.mFrameRate, inOptions.mQuality,
                    inOptions.mOutputKind, inOptions.mOutputPath, inOptions.mChroma,
                    inOptions.mJobs, inOptions.mQuiet, filters.mRemovePulldown,
                    filters.mReverseFieldDominance, filters.mFieldReverse, filters.mDeinterlace,
                    filters.mRemoveFlicker, filters.mInterlaceConsecutive, filters.mScale,
                    filters.mSpeed, filters.mFrameBlend);
}

// The words of inText, split at spaces.
Args Words(std::string_view inText)
{
    Args words;
    std::istringstream stream{std::string(inText)};
    for (std::string word; stream >> word;)
        words.push_back(word);
    return words;
}

vrender::ParsedCommandLine Parse(std::string_view inText)
{
    const Args words = Words(inText);
    const std::vector<std::string_view> views(words.begin(), words.end());
    return vrender::ParseCommandLine(views);
}

using OptionsTest = vrendertest::ScratchDirectoryTest;

TEST_F(OptionsTest, ArgumentsBecomeTheseOptions)
{
    const std::pair<const char*, RenderOptions> cases[] = {
        {"",
         {.mMedia = "pattern:moving?size=1280x720",
          .mStart = 0,
          .mCount = 50,
          .mOutputPath = "out/demo/frame_%05d.png"}},
        {"source clip.y4m", {.mMedia = "clip.y4m", .mOutputPath = kFrames}},
        {"source pattern:moving --start 3 --count=7 --size 320x240 --par 10:11 --format "
         "VUYA_4444_8u --field lower --quality 2 --rate 30000/1001 -o - --chroma 444 -j 5 -q",
         {.mMedia = "pattern:moving",
          .mStart = 3,
          .mCount = 7,
          .mWidth = 320,
          .mHeight = 240,
          .mPixelAspectRatio = mt::PixelAspectRatio(10, 11),
          .mPixelFormat = mt::kPixelFormat_VUYA_4444_8u,
          .mFieldType = mt::kFieldType_LowerFirst,
          .mFrameRate = mt::kFrameRate_Video2997,
          .mQuality = 2,
          .mOutputKind = OutputKind::kY4MStream,
          .mChroma = vrender::Y4MChroma::k444,
          .mJobs = 5,
          .mQuiet = true,
          .mFilters = {.mScale = true}}},
        // --frames is an inclusive range.
        {"source a.y4m --frames 10:19",
         {.mMedia = "a.y4m", .mStart = 10, .mCount = 10, .mOutputPath = kFrames}},
        {"source a.y4m --frames 4:4",
         {.mMedia = "a.y4m", .mStart = 4, .mCount = 1, .mOutputPath = kFrames}},
        {"source a.png --y4m", {.mMedia = "a.png", .mOutputKind = OutputKind::kY4MStream}},
        {"source a.png -o out/clip.Y4M",
         {.mMedia = "a.png", .mOutputKind = OutputKind::kY4MFile, .mOutputPath = "out/clip.Y4M"}},
        {"source a.png --output x/f_%03d.png", {.mMedia = "a.png", .mOutputPath = "x/f_%03d.png"}},
        {"source a.png --output-dir out/100%",
         {.mMedia = "a.png", .mOutputPath = "out/100%%/frame_%05d.png"}},
        // The filters stack in the media node's order, whatever the argument order.
        {"source clip.y4m --remove-pulldown BC --deinterlace --speed 0.5 --frame-blend --scale "
         "320x180 --reverse-field-dominance",
         {.mMedia = "clip.y4m",
          .mWidth = 320,
          .mHeight = 180,
          .mOutputPath = kFrames,
          .mFilters = {.mRemovePulldown = mt::kPulldownCadence_23_BC,
                       .mReverseFieldDominance = true,
                       .mDeinterlace = true,
                       .mScale = true,
                       .mSpeed = 0.5,
                       .mFrameBlend = true}}},
        // --par alone brings in the scaler; --size alone is no filter.
        {"source x.png --par 10:11",
         {.mMedia = "x.png",
          .mPixelAspectRatio = mt::PixelAspectRatio(10, 11),
          .mOutputPath = kFrames,
          .mFilters = {.mScale = true}}},
        {"source x.png --size 64x36",
         {.mMedia = "x.png", .mWidth = 64, .mHeight = 36, .mOutputPath = kFrames}},
    };
    for (const auto& [args, options] : cases)
    {
        SCOPED_TRACE(args);
        const vrender::ParsedCommandLine parsed = Parse(args);
        ASSERT_EQ(parsed.mError, "");
        EXPECT_EQ(parsed.mCommand, *args ? Command::kSource : Command::kDemo);
        EXPECT_EQ(Fields(parsed.mOptions), Fields(options));
    }
}

TEST_F(OptionsTest, HelpAndInfoCommands)
{
    for (const auto& [args, command] : {std::pair{"--help", Command::kHelp},
                                        {"help", Command::kHelp},
                                        {"source x.png --size bad -h", Command::kHelp},
                                        {"info", Command::kInfo}})
    {
        EXPECT_EQ(Parse(args).mError, "") << args;
        EXPECT_EQ(Parse(args).mCommand, command) << args;
    }
    EXPECT_NE(vrender::GetUsageText().find("--frames A:B"), std::string::npos);
}

TEST_F(OptionsTest, RefusalsNameTheArgumentAndExitWithTwo)
{
    const std::pair<const char*, std::string> cases[] = {
        {"render", "unknown command 'render' (commands: source, info, demo, help)"},
        {"--size 10x10", "a command comes first: source, info, demo or help (got option '--size')"},
        {"info extra",
         "info: unexpected argument 'extra' (info prints the built-in example cutlist)"},
        {"demo media.png", "unexpected argument 'media.png'"},
        {"source", "source: no media given (an image file, a .y4m file or a pattern: text such "
                   "as pattern:bars)"},
        {"source pattern:bars other", "unexpected argument 'other'"},
        {"source pattern:bars --size", "--size needs a value"},
        {"source pattern:bars --bogus", "unknown option '--bogus' (see vrender --help)"},
        {"source pattern:bars --quiet=yes", "--quiet takes no value"},
        {"source pattern:bars --deinterlace=1", "--deinterlace takes no value"},
        {"source pattern:bars --size 1x1 --size 2x2", "--size is given twice"},
        {"source pattern:bars --frames 0:9 --count 3",
         "--frames cannot be combined with --start or --count"},
        {"source pattern:bars -o - --y4m",
         "--y4m: the output is already chosen by -o; give only one "
         "of -o, --output-dir and --y4m"},
        {"source pattern:bars --chroma 444",
         "--chroma applies to Y4M output only (-o -, -o FILE.y4m or --y4m)"},
        {"source pattern:bars -o out/frame.png",
         "-o: 'out/frame.png': the pattern has no frame number "
         "(add one, e.g. frame_%05d.png)"},
        {"source pattern:bars -o out/x.tiff",
         "-o: 'out/x.tiff' is neither a .png sequence (e.g. out/frame_%05d.png), a .y4m file nor "
         "- (a Y4M stream on standard output)"},
        {"source pattern:bars --size abc", "--size: 'abc' is not WIDTHxHEIGHT, e.g. 1280x720"},
        {"source pattern:bars --size 0x10", "--size: '0x10' is out of range (1 to 32768 each)"},
        {"source pattern:bars --size 40000x10",
         "--size: '40000x10' is out of range (1 to 32768 each)"},
        {"source pattern:bars --par 4:0",
         "--par: '4:0' is not N:D with both terms positive, e.g. 1:1 or 10:11"},
        {"source pattern:bars --field top", "--field: 'top' is not progressive, upper or lower"},
        {"source pattern:bars --quality 6", "--quality: '6' is not a quality 0 to 5"},
        {"source pattern:bars --quality -1", "--quality: '-1' is not a quality 0 to 5"},
        {"source pattern:bars --jobs 0",
         "--jobs: '0' is not a number of frames in flight, 1 to 64"},
        {"source pattern:bars --jobs 65",
         "--jobs: '65' is not a number of frames in flight, 1 to 64"},
        {"source pattern:bars --rate fast",
         "--rate: 'fast' is not a frame rate from 1 to 1000, e.g. 25, 30000/1001 or 29.97"},
        {"source pattern:bars --rate 25/0",
         "--rate: '25/0' is not a frame rate from 1 to 1000, e.g. 25, 30000/1001 or 29.97"},
        {"source pattern:bars --start x", "--start: 'x' is not a frame number (0 or more)"},
        {"source pattern:bars --count 0", "--count: '0' is not a frame count (1 or more)"},
        {"source pattern:bars --frames 5",
         "--frames: '5' is not FIRST:LAST (frame numbers, both included), e.g. 0:49"},
        {"source pattern:bars --frames 9:3", "--frames: the last frame 3 comes before the first 9"},
        {"source pattern:bars --chroma 422 --y4m", "--chroma: '422' is not 420 or 444"},
        {"source pattern:bars --remove-pulldown XY",
         "--remove-pulldown: 'XY' is not a 2:3 cadence phase (AA, BB, BC, CD or DD)"},
        {"source pattern:bars --speed 0",
         "--speed: '0' is not a speed (a non-zero number from -1000 to 1000, e.g. 0.5)"},
        {"source pattern:bars --speed fast",
         "--speed: 'fast' is not a speed (a non-zero number from -1000 to 1000, e.g. 0.5)"},
    };
    for (const auto& [args, error] : cases)
    {
        SCOPED_TRACE(args);
        EXPECT_EQ(Parse(args).mError, error);
        const vrendertest::RunResult run = Run(Words(args));
        EXPECT_EQ(run.mExitCode, 2);
        EXPECT_EQ(run.mErr,
                  "vrender: " + error + "\nRun 'vrender --help' for the commands and options.\n");
        EXPECT_EQ(run.mOut, "");
    }
}

TEST_F(OptionsTest, BadFormatsListTheRenderableOnes)
{
    const std::string unknown = Parse("source pattern:bars --format RGB24").mError;
    EXPECT_EQ(unknown.rfind("--format: unknown pixel format 'RGB24' (one of BGRA_4444_8u, ", 0), 0u)
        << unknown;
    EXPECT_EQ(unknown.find("MJPG"), std::string::npos);
    for (const char* format : {"MJPG_422_Compressed", "Any"})
    {
        const std::string refused =
            Parse(std::string("source pattern:bars --format ") + format).mError;
        EXPECT_EQ(refused.rfind(
                      "--format: '" + std::string(format) + "' cannot be rendered to (one of ", 0),
                  0u)
            << refused;
    }
}

TEST_F(OptionsTest, FrameRatesAndFramePatterns)
{
    const std::pair<const char*, std::optional<mt::FrameRate>> rates[] = {
        {"25", mt::kFrameRate_Video25},
        {"29.97", mt::kFrameRate_Video2997},
        {"23.976", mt::kFrameRate_Video2398},
        {"60000/1001", mt::kFrameRate_Video5994},
        {"12.5", mt::FrameRate::Create(56'448'000)},
        {"0", std::nullopt},
        {"1001", std::nullopt},
        {"1/2", std::nullopt},
        {"", std::nullopt}};
    for (const auto& [text, rate] : rates)
        EXPECT_EQ(vrender::ParseFrameRate(text), rate) << '"' << text << '"';

    const std::string badConversion = " (use %d, %5d or %05d; %% for a percent sign)";
    const std::pair<const char*, std::string> patterns[] = {
        {"f_%05d.png", ""},
        {"f_%d.png", ""},
        {"100%%_%3d.png", ""},
        {"%d_%d.png", "the pattern has more than one frame number"},
        {"f_%s.png", "bad frame number conversion at '%s.png'" + badConversion},
        {"f_%0005d.png", "bad frame number conversion at '%0005d.png'" + badConversion},
        {"f_%", "bad frame number conversion at '%'" + badConversion}};
    for (const auto& [pattern, problem] : patterns)
        EXPECT_EQ(vrender::CheckFramePattern(pattern), problem) << pattern;

    const std::tuple<const char*, int, const char*> paths[] = {
        {"f_%05d.png", 42, "f_00042.png"},
        {"f_%3d.png", 7, "f_  7.png"},
        {"f_%d.png", 123456, "f_123456.png"},
        {"100%%_%02d.png", 123, "100%_123.png"},
        {"out/100%%/frame_%05d.png", 7, "out/100%/frame_00007.png"}};
    for (const auto& [pattern, frame, path] : paths)
        EXPECT_EQ(vrender::FormatFramePath(pattern, frame), path);
}

} // namespace
