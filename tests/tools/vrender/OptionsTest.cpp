// vrender's command line: arguments to options, and the refusals with their
// messages, checked in the parser and, for a few, in the program's exit code
// and output.

#include "Options.h"

#include "VrenderTestSupport.h"

#include <sstream>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;
using vrender::Command;
using vrender::OutputKind;
using vrender::RenderOptions;
using Args = std::vector<std::string>;

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
                    filters.mSpeed, filters.mFrameBlend, inOptions.mOverwrite, inOptions.mKeepGoing,
                    inOptions.mBuiltInTimeline);
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
    // Each row's options follow "source m"; the row changes the fields that
    // differ from media "m" written to the default frame files.
    using O = RenderOptions;
    using K = OutputKind;
    using C = vrender::Y4MChroma;
    const std::pair<const char*, void (*)(O&)> cases[] = {
        {"", [](O&) {}},
        {"--start 3 --count=7", [](O& o) { std::tie(o.mStart, o.mCount) = std::pair(3, 7); }},
        {"-j 5 -q", [](O& o) { std::tie(o.mJobs, o.mQuiet) = std::pair(5u, true); }},
        {"--overwrite", [](O& o) { o.mOverwrite = true; }},
        {"-y", [](O& o) { o.mOverwrite = true; }},
        {"--size 320x240", [](O& o) { std::tie(o.mWidth, o.mHeight) = std::pair(320u, 240u); }},
        {"--quality 2", [](O& o) { o.mQuality = 2; }},
        {"--format VUYA_4444_8u", [](O& o) { o.mPixelFormat = mt::kPixelFormat_VUYA_4444_8u; }},
        {"--field lower", [](O& o) { o.mFieldType = mt::kFieldType_LowerFirst; }},
        {"--rate 30000/1001", [](O& o) { o.mFrameRate = mt::kFrameRate_Video2997; }},
        // --frames is an inclusive range.
        {"--frames 10:19", [](O& o) { std::tie(o.mStart, o.mCount) = std::pair(10, 10); }},
        {"--y4m",
         [](O& o) { std::tie(o.mOutputKind, o.mOutputPath) = std::pair(K::kY4MStream, ""); }},
        {"-o - --chroma 444",
         [](O& o) {
             std::tie(o.mOutputKind, o.mOutputPath, o.mChroma) =
                 std::tuple(K::kY4MStream, "", C::k444);
         }},
        {"-o out/c.Y4M", [](O& o)
         { std::tie(o.mOutputKind, o.mOutputPath) = std::pair(K::kY4MFile, "out/c.Y4M"); }},
        {"--output x/f_%03d.png", [](O& o) { o.mOutputPath = "x/f_%03d.png"; }},
        {"--output-dir out/100%", [](O& o) { o.mOutputPath = "out/100%%/frame_%05d.png"; }},
        // The filters, in field order: pulldown, reverse dominance, field
        // reverse, deinterlace, flicker, interlace, scale, speed, blend.
        {"--remove-pulldown BC --deinterlace --speed 0.5 --frame-blend --reverse-field-dominance",
         [](O& o) {
             o.mFilters = {
                 mt::kPulldownCadence_23_BC, true, false, true, false, false, false, 0.5, true};
         }},
        {"--field-reverse --remove-flicker --interlace-consecutive",
         [](O& o) { o.mFilters = {{}, false, true, false, true, true, false, {}, false}; }},
        // --scale and --par bring in the scaler; --size alone is no filter.
        {"--scale 320x180", [](O& o)
         { std::tie(o.mWidth, o.mHeight, o.mFilters.mScale) = std::tuple(320u, 180u, true); }},
        {"--par 10:11",
         [](O& o)
         {
             std::tie(o.mPixelAspectRatio, o.mFilters.mScale) =
                 std::pair(mt::PixelAspectRatio(10, 11), true);
         }},
    };
    for (const auto& [args, change] : cases)
    {
        SCOPED_TRACE(args);
        const vrender::ParsedCommandLine parsed = Parse(std::string("source m ") + args);
        ASSERT_EQ(parsed.mError, "");
        EXPECT_EQ(parsed.mCommand, Command::kSource);
        RenderOptions expected;
        expected.mMedia = "m";
        expected.mOutputPath = "out/frames/frame_%05d.png";
        change(expected);
        EXPECT_EQ(Fields(parsed.mOptions), Fields(expected));
    }
    RenderOptions demo;
    std::tie(demo.mBuiltInTimeline, demo.mOutputPath, demo.mOverwrite) =
        std::tuple(true, "out/demo/frame_%05d.png", true);
    EXPECT_EQ(Fields(Parse("").mOptions), Fields(demo));
    // A timeline takes the output options; --par needs no scaler there.
    const vrender::ParsedCommandLine render =
        Parse("render t.json --par 10:11 --keep-going --frames 3:4");
    RenderOptions rendered;
    std::tie(rendered.mMedia, rendered.mPixelAspectRatio, rendered.mKeepGoing, rendered.mStart,
             rendered.mCount, rendered.mOutputPath) =
        std::tuple("t.json", mt::PixelAspectRatio(10, 11), true, 3, 2, "out/frames/frame_%05d.png");
    EXPECT_EQ(render.mCommand, Command::kRender);
    EXPECT_EQ(Fields(render.mOptions), Fields(rendered));
    // Asking for help wins over a mistake elsewhere.
    EXPECT_EQ(Parse("source x.png --size bad -h").mCommand, Command::kHelp);
}

TEST_F(OptionsTest, RefusalsNameTheArgumentAndExitWithTwo)
{
    // How each message begins; the program runs for a few of them.
    const std::pair<const char*, const char*> cases[] = {
        {"draw", "unknown command 'draw' (commands: render, source, info, demo, help)"},
        {"--size 10x10",
         "a command comes first: render, source, info, demo or help (got option '--size')"},
        {"render", "render: no timeline file given (a .json timeline"},
        {"render t.json --deinterlace", "--deinterlace applies to vrender source only"},
        {"demo --speed 2", "--speed applies to vrender source only"},
        {"info a.json extra", "info: unexpected argument 'extra' (info prints the built-in"},
        {"demo media.png", "unexpected argument 'media.png'"},
        {"source", "source: no media given (an image file, a .y4m file or a pattern:"},
        {"source m other", "unexpected argument 'other'"},
        {"source m --size", "--size needs a value"},
        {"source m --bogus", "unknown option '--bogus' (see vrender --help)"},
        {"source m --quiet=yes", "--quiet takes no value"},
        {"source m --deinterlace=1", "--deinterlace takes no value"},
        {"source m --size 1x1 --size 2x2", "--size is given twice"},
        {"source m --frames 0:9 --count 3", "--frames cannot be combined with --start or --count"},
        {"source m -o - --y4m", "--y4m: the output is already chosen by -o; give only one of -o,"},
        {"source m --chroma 444", "--chroma applies to Y4M output only (-o -, -o FILE.y4m or"},
        {"source m -o out/frame.png", "-o: 'out/frame.png': the pattern has no frame number"},
        {"source m -o out/x.tiff", "-o: 'out/x.tiff' is neither a .png sequence (e.g. out/"},
        {"source m --output-dir=", "--output-dir: the directory name is empty"},
        {"source m --size abc", "--size: 'abc' is not WIDTHxHEIGHT, e.g. 1280x720"},
        {"source m --size 0x10", "--size: '0x10' is out of range (1 to 32768 each)"},
        {"source m --par 4:0", "--par: '4:0' is not N:D with both terms positive"},
        {"source m --field top", "--field: 'top' is not progressive, upper or lower"},
        {"source m --quality 6", "--quality: '6' is not a quality 0 to 5"},
        {"source m --jobs 0", "--jobs: '0' is not a number of frames in flight, 1 to 64"},
        {"source m --rate fast", "--rate: 'fast' is not a frame rate from 1 to 1000, e.g. 25,"},
        {"source m --start x", "--start: 'x' is not a frame number (0 or more)"},
        {"source m --count 0", "--count: '0' is not a frame count (1 or more)"},
        {"source m --frames 5", "--frames: '5' is not FIRST:LAST (frame numbers, both included)"},
        {"source m --frames 9:3", "--frames: the last frame 3 comes before the first 9"},
        {"source m --chroma 422 --y4m", "--chroma: '422' is not 420 or 444"},
        {"source m --remove-pulldown XY", "--remove-pulldown: 'XY' is not a 2:3 cadence phase"},
        {"source m --speed 0", "--speed: '0' is not a speed (a non-zero number from -1000 to"},
        {"source m --format RGB24",
         "--format: unknown pixel format 'RGB24' (one of BGRA_4444_8u, "},
        {"source m --format Any", "--format: 'Any' cannot be rendered to (one of BGRA_4444_8u, "},
        // A pattern text is checked with the arguments (PatternSettingsTest has the reasons).
        {"source pattern:nope", "pattern 'pattern:nope': unknown pattern 'nope' (expected bars,"},
    };
    for (const auto& [args, error] : cases)
        EXPECT_THAT(Parse(args).mError, testing::StartsWith(error)) << args;
    for (const char* args :
         {"draw", "source m --size", "source m --chroma 444", "source pattern:nope"})
    {
        SCOPED_TRACE(args);
        const vrendertest::RunResult run = Run(Words(args));
        EXPECT_EQ(run.mExitCode, 2);
        EXPECT_EQ(run.mErr, "vrender: " + Parse(args).mError +
                                "\nRun 'vrender --help' for the commands and options.\n");
        EXPECT_EQ(run.mOut, "");
    }
}

TEST_F(OptionsTest, FrameRatesAndFramePatterns)
{
    const std::pair<const char*, std::optional<mt::FrameRate>> rates[] = {
        {"25", mt::kFrameRate_Video25},
        {"29.97", mt::kFrameRate_Video2997},
        {"60000/1001", mt::kFrameRate_Video5994},
        {"12.5", mt::FrameRate::Create(56'448'000)},
        {"0", std::nullopt},
        {"1/2", std::nullopt},
        {"25/0", std::nullopt},
        {"", std::nullopt}};
    for (const auto& [text, rate] : rates)
        EXPECT_EQ(vrender::ParseFrameRate(text), rate) << '"' << text << '"';

    const std::string bad = "bad frame number conversion at ";
    const std::string use = " (use %d, %5d or %05d; %% for a percent sign)";
    const std::pair<const char*, std::string> patterns[] = {
        {"f_%05d.png", ""},
        {"f_%d.png", ""},
        {"100%%_%3d.png", ""},
        {"%d_%d.png", "the pattern has more than one frame number"},
        {"f_%s.png", bad + "'%s.png'" + use},
        {"f_%", bad + "'%'" + use}};
    for (const auto& [pattern, problem] : patterns)
        EXPECT_EQ(vrender::CheckFramePattern(pattern), problem) << pattern;
    EXPECT_EQ(vrender::FormatFramePath("100%%_%02d.png", 123), "100%_123.png");

    // Names of the pattern's own spelling match, and only those.
    const std::tuple<const char*, const char*, std::optional<std::int64_t>> names[] = {
        {"f_%05d.png", "f_00012.png", 12},
        {"f_%05d.png", "f_12.png", std::nullopt},
        {"f_%05d.png", "f_00012.png.part", std::nullopt},
        {"f_%05d.png", "f_-0001.png", std::nullopt},
        {"%d.png", "07.png", std::nullopt},
        {"%3d.png", "  7.png", 7},
        {"100%%_%d.png", "100%_3.png", 3},
        {"100%%_%d.png", "100%%_3.png", std::nullopt}};
    for (const auto& [pattern, name, frame] : names)
        EXPECT_EQ(vrender::MatchFramePath(pattern, name), frame) << pattern << " " << name;
}

} // namespace
