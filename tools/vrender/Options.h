#pragma once

// vrender's command line: what the user asked for, parsed and checked.
//
// ParseCommandLine never prints and never exits: it answers the command and
// its options, or an error message that names the argument and the problem
// ("--size: 'abc' is not WIDTHxHEIGHT, e.g. 1280x720"). main prints the
// message and the usage hint. Plain functions over plain values; any thread.

#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"
#include "mvxmediatypes/Pulldown.h"

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace vrender
{

enum class Command
{
    kHelp,   // print the usage
    kDemo,   // the built-in demo timeline (no arguments, or "demo")
    kRender, // render frames of a timeline file
    kSource, // render frames of one media source
    kInfo,   // print a cutlist
};

enum class OutputKind
{
    kPngSequence, // numbered PNG files
    kY4MStream,   // a Y4M stream on standard output
    kY4MFile,     // a Y4M file
};

enum class Y4MChroma
{
    k420,
    k444,
};

// Largest --jobs value: each frame in flight holds a full frame or two.
inline constexpr std::uint32_t kMaxJobs = 64;

// The frame filters stacked on the media source, applied in the order a
// media node stacks them: pulldown removal (which replaces the field steps),
// reverse field dominance, field reverse, deinterlace, flicker removal,
// interlacing of consecutive frames, scaling, then re-timing.
struct FilterOptions
{
    // --remove-pulldown AA|BB|BC|CD|DD: the 2:3 cadence phase of frame 0.
    mvxmediatypes::PulldownCadence mRemovePulldown = mvxmediatypes::kPulldownCadence_None;
    bool mReverseFieldDominance = false;
    bool mFieldReverse = false;
    bool mDeinterlace = false;
    bool mRemoveFlicker = false;
    bool mInterlaceConsecutive = false;
    // --scale WxH (also sets the output size) or --par: the scaler with
    // pixel-aspect correction.
    bool mScale = false;
    // --speed S: media time = output time x S, through time mix, or time
    // blend with --frame-blend.
    std::optional<double> mSpeed;
    bool mFrameBlend = false;

    bool Any() const
    {
        return mRemovePulldown != mvxmediatypes::kPulldownCadence_None || mReverseFieldDominance ||
               mFieldReverse || mDeinterlace || mRemoveFlicker || mInterlaceConsecutive || mScale ||
               mSpeed.has_value();
    }
};

struct RenderOptions
{
    // The media (a file path or a "pattern:" text), or the timeline file.
    std::string mMedia;
    // Render the built-in demo timeline instead of mMedia.
    bool mBuiltInTimeline = false;
    // First frame and number of frames; unset means the whole media (or the
    // default length of endless media).
    std::optional<std::int64_t> mStart;
    std::optional<std::int64_t> mCount;
    // Output size; 0 x 0 means the source's size.
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    // Unset: the source's pixel aspect ratio.
    std::optional<mvxmediatypes::PixelAspectRatio> mPixelAspectRatio;
    // Unset: BGRA_4444_8u, or the stream's own sampling for Y4M output
    // without filters (see PlanRender).
    std::optional<mvxmediatypes::PixelFormat> mPixelFormat;
    // Unset: the source's field order.
    std::optional<mvxmediatypes::FieldType> mFieldType;
    // Unset: the source's frame rate (25 for still images).
    std::optional<mvxmediatypes::FrameRate> mFrameRate;
    std::uint32_t mQuality = mvxmediatypes::kRenderQuality_Max;
    OutputKind mOutputKind = OutputKind::kPngSequence;
    // The PNG path pattern (one printf-style frame number, e.g. %05d) or the
    // Y4M file path; empty for a stream.
    std::string mOutputPath;
    Y4MChroma mChroma = Y4MChroma::k420;
    // 0: the default (twice the core count, at most kMaxJobs).
    std::uint32_t mJobs = 0;
    // --memory SIZE: bytes the frames in flight may take; unset: half the
    // physical memory.
    std::optional<std::uint64_t> mMemoryBudget;
    bool mQuiet = false;
    // --overwrite: replace PNG files of the pattern left by an earlier run and
    // remove its frames outside the new range. Without it such files stop
    // the render before anything is written.
    bool mOverwrite = false;
    // --keep-going: a frame that fails is reported and written black, and
    // the render goes on; the exit status is still 1.
    bool mKeepGoing = false;
    FilterOptions mFilters;
};

struct ParsedCommandLine
{
    Command mCommand = Command::kHelp;
    RenderOptions mOptions;
    // Empty on success.
    std::string mError;

    bool Succeeded() const { return mError.empty(); }
};

// Parses the arguments after the program name.
ParsedCommandLine ParseCommandLine(std::span<const std::string_view> inArguments);

// The options of the built-in demo: the demo timeline (DemoTimeline.h) as
// PNG files in out/demo/, replacing those of an earlier demo.
RenderOptions MakeDemoOptions();

// The text of --help.
std::string GetUsageText();

// The names of the pixel formats --format takes, ", "-separated.
std::string RenderableFormatNames();

// Warnings for the options that cannot apply to a still source (a still
// image or a still pattern): "--speed does not apply to a still source
// ('still.png'); ignored". Empty when every option applies.
std::vector<std::string> GetStillSourceWarnings(const RenderOptions& inOptions);

// Parsers of single values, shared with the tests. Each answers nothing when
// the text is not a valid value.
std::optional<std::int64_t> ParseCount(std::string_view inText);
std::optional<mvxmediatypes::FrameRate> ParseFrameRate(std::string_view inText);
// Bytes, with an optional K, M, G or T suffix (powers of 1024): "512M", "4G".
std::optional<std::uint64_t> ParseByteSize(std::string_view inText);

// A printf-style frame-number pattern: exactly one %d, %Nd or %0Nd (N up to
// 2 digits) and any number of %% escapes. Answers an empty string when the
// pattern is valid, else the problem.
std::string CheckFramePattern(std::string_view inPattern);
// The pattern with its frame number filled in (the pattern must be valid).
std::string FormatFramePath(std::string_view inPattern, std::int64_t inFrame);
// The frame number of inPath when inPath is what FormatFramePath makes of
// the (valid) pattern for some frame number 0 or more; else nothing.
std::optional<std::int64_t> MatchFramePath(std::string_view inPattern, std::string_view inPath);

} // namespace vrender
