#include "Options.h"

#include "BE/PatternSettings.h"
#include "VF/VideoFrame.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <set>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;

constexpr char kDefaultOutputPattern[] = "out/frames/frame_%05d.png";
constexpr std::string_view kPatternPrefix = "pattern:";
constexpr char kDemoOutputPattern[] = "out/demo/frame_%05d.png";

std::string Quoted(std::string_view inText)
{
    std::string quoted;
    quoted.reserve(inText.size() + 2);
    quoted.push_back('\'');
    quoted.append(inText);
    quoted.push_back('\'');
    return quoted;
}

bool EndsWithNoCase(std::string_view inText, std::string_view inSuffix)
{
    if (inText.size() < inSuffix.size())
        return false;
    return std::equal(inSuffix.begin(), inSuffix.end(), inText.end() - inSuffix.size(),
                      [](char inA, char inB) { return std::tolower(inA) == std::tolower(inB); });
}

std::optional<std::uint64_t> ParseUnsigned(std::string_view inText)
{
    std::uint64_t value = 0;
    const char* end = inText.data() + inText.size();
    const auto [ptr, error] = std::from_chars(inText.data(), end, value);
    if (inText.empty() || error != std::errc() || ptr != end)
        return std::nullopt;
    return value;
}

// The raster formats, which can be rendered to and written out.
std::string RasterFormatNames()
{
    std::string names;
    for (const mt::PixelFormat format : mt::GetPixelFormatCatalogue())
    {
        if (!format.IsRaster() || format.IsPlanar())
            continue;
        if (!names.empty())
            names += ", ";
        names += mt::GetPixelFormatName(format);
    }
    return names;
}

bool IsFilterOption(std::string_view inName)
{
    static const std::set<std::string_view> kFilters = {
        "--reverse-field-dominance", "--field-reverse", "--deinterlace", "--remove-flicker",
        "--interlace-consecutive",   "--frame-blend",   "--scale",       "--speed",
        "--remove-pulldown"};
    return kFilters.contains(inName);
}

// Parses the options after the command into ioResult; stops at the first
// error.
class OptionParser
{
public:
    OptionParser(std::span<const std::string_view> inArguments, ParsedCommandLine& ioResult)
        : mArguments(inArguments)
        , mResult(ioResult)
        , mTakesMedia(ioResult.mCommand != Command::kDemo)
    {
    }

    void Run()
    {
        // Asking for help wins over any mistake elsewhere on the line.
        for (const std::string_view argument : mArguments)
        {
            if (argument == "-h" || argument == "--help")
            {
                mResult.mCommand = Command::kHelp;
                return;
            }
        }
        for (mIndex = 0; mIndex < mArguments.size() && mResult.Succeeded(); ++mIndex)
        {
            const std::string_view argument = mArguments[mIndex];
            if (argument.size() > 1 && argument[0] == '-')
                ParseOption(argument);
            else if (mTakesMedia && !mHaveMedia)
            {
                mResult.mOptions.mMedia = std::string(argument);
                mHaveMedia = true;
            }
            else
                Fail("unexpected argument " + Quoted(argument));
        }
        if (!mResult.Succeeded())
            return;
        if (mTakesMedia && !mHaveMedia)
            return Fail(mResult.mCommand == Command::kRender
                            ? "render: no timeline file given (a .json timeline, see "
                              "docs/timeline-format.md)"
                            : "source: no media given (an image file, a .y4m file or a pattern: "
                              "text such as pattern:bars)");
        Finish();
    }

private:
    void Fail(std::string inMessage)
    {
        if (mResult.Succeeded())
            mResult.mError = std::move(inMessage);
    }

    // Takes the option's value: the text after '=' or the next argument.
    std::optional<std::string_view> TakeValue(std::string_view inName,
                                              std::optional<std::string_view> inInline)
    {
        if (inInline)
            return inInline;
        if (mIndex + 1 >= mArguments.size())
        {
            Fail(std::string(inName) + " needs a value");
            return std::nullopt;
        }
        return mArguments[++mIndex];
    }

    bool FirstTime(std::string_view inName)
    {
        if (mSeen.insert(std::string(inName)).second)
            return true;
        Fail(std::string(inName) + " is given twice");
        return false;
    }

    void SetOutput(std::string_view inName)
    {
        if (!mOutputOption.empty())
            return Fail(std::string(inName) + ": the output is already chosen by " + mOutputOption +
                        "; give only one of -o, --output-dir and --y4m");
        mOutputOption = std::string(inName);
    }

    void ParseOption(std::string_view inArgument)
    {
        std::string_view name = inArgument;
        std::optional<std::string_view> inlineValue;
        if (inArgument.starts_with("--"))
        {
            const std::size_t equals = inArgument.find('=');
            if (equals != std::string_view::npos)
            {
                name = inArgument.substr(0, equals);
                inlineValue = inArgument.substr(equals + 1);
            }
        }
        if (name == "-j")
            name = "--jobs";
        if (name == "-q")
            name = "--quiet";
        if (name == "-y")
            name = "--overwrite";
        if (name == "--output")
            name = "-o";
        if (!FirstTime(name))
            return;

        RenderOptions& options = mResult.mOptions;
        static const std::set<std::string_view> kFilterFlags = {
            "--reverse-field-dominance", "--field-reverse",         "--deinterlace",
            "--remove-flicker",          "--interlace-consecutive", "--frame-blend"};
        if (kFilterFlags.contains(name))
        {
            if (inlineValue)
                return Fail(std::string(name) + " takes no value");
            FilterOptions& filters = options.mFilters;
            if (name == "--reverse-field-dominance")
                filters.mReverseFieldDominance = true;
            else if (name == "--field-reverse")
                filters.mFieldReverse = true;
            else if (name == "--deinterlace")
                filters.mDeinterlace = true;
            else if (name == "--remove-flicker")
                filters.mRemoveFlicker = true;
            else if (name == "--interlace-consecutive")
                filters.mInterlaceConsecutive = true;
            else
                filters.mFrameBlend = true;
            return;
        }
        if (name == "--quiet" || name == "--y4m" || name == "--overwrite" || name == "--keep-going")
        {
            if (inlineValue)
                return Fail(std::string(name) + " takes no value");
            if (name == "--quiet")
                options.mQuiet = true;
            else if (name == "--keep-going")
                options.mKeepGoing = true;
            else if (name == "--overwrite")
                options.mOverwrite = true;
            else
            {
                SetOutput(name);
                options.mOutputKind = OutputKind::kY4MStream;
                options.mOutputPath.clear();
            }
            return;
        }

        static const std::set<std::string_view> kValued = {
            "--frames", "--start",   "--count", "--size",           "--par", "--format",
            "--field",  "--quality", "--rate",  "--jobs",           "-o",    "--output-dir",
            "--chroma", "--scale",   "--speed", "--remove-pulldown"};
        if (!kValued.contains(name) && name != "--memory")
            return Fail("unknown option " + Quoted(inArgument) + " (see vrender --help)");
        const std::optional<std::string_view> value = TakeValue(name, inlineValue);
        if (!value)
            return;
        const std::string prefix = std::string(name) + ": ";

        if (name == "--frames")
        {
            const std::size_t colon = value->find(':');
            const std::optional<std::int64_t> first = colon == std::string_view::npos
                                                          ? std::nullopt
                                                          : ParseCount(value->substr(0, colon));
            const std::optional<std::int64_t> last = colon == std::string_view::npos
                                                         ? std::nullopt
                                                         : ParseCount(value->substr(colon + 1));
            if (!first || !last)
                return Fail(prefix + Quoted(*value) +
                            " is not FIRST:LAST (frame numbers, both included), e.g. 0:49");
            if (*last < *first)
                return Fail(prefix + "the last frame " + std::to_string(*last) +
                            " comes before the first " + std::to_string(*first));
            options.mStart = *first;
            options.mCount = *last - *first + 1;
        }
        else if (name == "--start")
        {
            options.mStart = ParseCount(*value);
            if (!options.mStart)
                return Fail(prefix + Quoted(*value) + " is not a frame number (0 or more)");
        }
        else if (name == "--count")
        {
            options.mCount = ParseCount(*value);
            if (!options.mCount || *options.mCount < 1)
                return Fail(prefix + Quoted(*value) + " is not a frame count (1 or more)");
        }
        else if (name == "--remove-pulldown")
        {
            static const std::pair<std::string_view, mvxmediatypes::PulldownCadence> kCadences[] = {
                {"AA", mvxmediatypes::kPulldownCadence_23_AA},
                {"BB", mvxmediatypes::kPulldownCadence_23_BB},
                {"BC", mvxmediatypes::kPulldownCadence_23_BC},
                {"CD", mvxmediatypes::kPulldownCadence_23_CD},
                {"DD", mvxmediatypes::kPulldownCadence_23_DD}};
            for (const auto& [text, cadence] : kCadences)
                if (*value == text)
                    options.mFilters.mRemovePulldown = cadence;
            if (options.mFilters.mRemovePulldown == mvxmediatypes::kPulldownCadence_None)
                return Fail(prefix + Quoted(*value) +
                            " is not a 2:3 cadence phase (AA, BB, BC, CD or DD)");
        }
        else if (name == "--speed")
        {
            const std::string text(*value);
            char* end = nullptr;
            const double speed = std::strtod(text.c_str(), &end);
            if (text.empty() || end != text.c_str() + text.size() || !std::isfinite(speed) ||
                speed == 0.0 || std::fabs(speed) > 1000.0)
                return Fail(prefix + Quoted(*value) +
                            " is not a speed (a non-zero number from -1000 to 1000, e.g. 0.5)");
            options.mFilters.mSpeed = speed;
        }
        else if (name == "--size" || name == "--scale")
        {
            const std::size_t x = value->find_first_of("xX");
            const std::optional<std::uint64_t> width =
                x == std::string_view::npos ? std::nullopt : ParseUnsigned(value->substr(0, x));
            const std::optional<std::uint64_t> height =
                x == std::string_view::npos ? std::nullopt : ParseUnsigned(value->substr(x + 1));
            if (!width || !height)
                return Fail(prefix + Quoted(*value) + " is not WIDTHxHEIGHT, e.g. 1280x720");
            if (*width < 1 || *height < 1 || *width > VF::kMaxFrameDimension ||
                *height > VF::kMaxFrameDimension)
                return Fail(prefix + Quoted(*value) + " is out of range (1 to 32768 each)");
            options.mWidth = static_cast<std::uint32_t>(*width);
            options.mHeight = static_cast<std::uint32_t>(*height);
            if (name == "--scale")
                options.mFilters.mScale = true;
        }
        else if (name == "--par")
        {
            const std::size_t colon = value->find(':');
            const std::optional<std::uint64_t> numerator =
                colon == std::string_view::npos ? std::nullopt
                                                : ParseUnsigned(value->substr(0, colon));
            const std::optional<std::uint64_t> denominator =
                colon == std::string_view::npos ? std::nullopt
                                                : ParseUnsigned(value->substr(colon + 1));
            if (!numerator || !denominator || *numerator < 1 || *denominator < 1 ||
                *numerator > UINT32_MAX || *denominator > UINT32_MAX)
                return Fail(prefix + Quoted(*value) +
                            " is not N:D with both terms positive, e.g. 1:1 or 10:11");
            options.mPixelAspectRatio = mt::PixelAspectRatio(
                static_cast<std::uint32_t>(*numerator), static_cast<std::uint32_t>(*denominator));
            options.mFilters.mScale = true;
        }
        else if (name == "--format")
        {
            const std::optional<mt::PixelFormat> format = mt::PixelFormatFromName(*value);
            if (!format)
                return Fail(prefix + "unknown pixel format " + Quoted(*value) + " (one of " +
                            RasterFormatNames() + ")");
            if (!format->IsRaster() || format->IsPlanar())
                return Fail(prefix + Quoted(*value) + " cannot be rendered to (one of " +
                            RasterFormatNames() + ")");
            options.mPixelFormat = *format;
        }
        else if (name == "--field")
        {
            if (*value == "progressive")
                options.mFieldType = mt::kFieldType_Progressive;
            else if (*value == "upper")
                options.mFieldType = mt::kFieldType_UpperFirst;
            else if (*value == "lower")
                options.mFieldType = mt::kFieldType_LowerFirst;
            else
                return Fail(prefix + Quoted(*value) + " is not progressive, upper or lower");
        }
        else if (name == "--quality")
        {
            const std::optional<std::uint64_t> quality = ParseUnsigned(*value);
            if (!quality || *quality > mt::kRenderQuality_Max)
                return Fail(prefix + Quoted(*value) + " is not a quality 0 to 5");
            options.mQuality = static_cast<std::uint32_t>(*quality);
        }
        else if (name == "--rate")
        {
            options.mFrameRate = ParseFrameRate(*value);
            if (!options.mFrameRate)
                return Fail(prefix + Quoted(*value) +
                            " is not a frame rate from 1 to 1000, e.g. 25, 30000/1001 or 29.97");
        }
        else if (name == "--jobs")
        {
            const std::optional<std::uint64_t> jobs = ParseUnsigned(*value);
            if (!jobs || *jobs < 1 || *jobs > kMaxJobs)
                return Fail(prefix + Quoted(*value) +
                            " is not a number of frames in flight, 1 to " +
                            std::to_string(kMaxJobs));
            options.mJobs = static_cast<std::uint32_t>(*jobs);
        }
        else if (name == "--memory")
        {
            options.mMemoryBudget = ParseByteSize(*value);
            if (!options.mMemoryBudget || *options.mMemoryBudget == 0)
                return Fail(prefix + Quoted(*value) + " is not a memory size, e.g. 512M or 4G");
        }
        else if (name == "--chroma")
        {
            if (*value == "420")
                options.mChroma = Y4MChroma::k420;
            else if (*value == "444")
                options.mChroma = Y4MChroma::k444;
            else
                return Fail(prefix + Quoted(*value) + " is not 420 or 444");
        }
        else if (name == "-o")
        {
            SetOutput(name);
            if (*value == "-")
            {
                options.mOutputKind = OutputKind::kY4MStream;
                options.mOutputPath.clear();
            }
            else if (EndsWithNoCase(*value, ".y4m"))
            {
                options.mOutputKind = OutputKind::kY4MFile;
                options.mOutputPath = std::string(*value);
            }
            else if (EndsWithNoCase(*value, ".png"))
            {
                const std::string problem = CheckFramePattern(*value);
                if (!problem.empty())
                    return Fail(prefix + Quoted(*value) + ": " + problem);
                options.mOutputKind = OutputKind::kPngSequence;
                options.mOutputPath = std::string(*value);
            }
            else
                return Fail(prefix + Quoted(*value) +
                            " is neither a .png sequence (e.g. out/frame_%05d.png), a .y4m file "
                            "nor - (a Y4M stream on standard output)");
        }
        else if (name == "--output-dir")
        {
            if (value->empty())
                return Fail(prefix + "the directory name is empty");
            SetOutput(name);
            std::string directory;
            // The directory becomes part of a printf-style pattern.
            for (const char c : *value)
                directory += c == '%' ? std::string("%%") : std::string(1, c);
            if (directory.back() != '/')
                directory += '/';
            options.mOutputKind = OutputKind::kPngSequence;
            options.mOutputPath = directory + "frame_%05d.png";
        }
    }

    void Finish()
    {
        RenderOptions& options = mResult.mOptions;
        // A pattern text is an argument like any other: a mistake in it is
        // found here, before the renderer starts.
        const bool isSource = mResult.mCommand == Command::kSource;
        if (!isSource)
            for (const std::string& seen : mSeen)
                if (IsFilterOption(seen))
                    return Fail(seen + " applies to vrender source only (a timeline sets it on "
                                       "the clip)");
        // A timeline is rendered at any size and ratio without a scaler.
        if (!isSource)
            options.mFilters.mScale = false;
        if (isSource && options.mMedia.starts_with(kPatternPrefix))
        {
            const BE::PatternParseResult pattern = BE::ParsePatternSettings(options.mMedia);
            if (!pattern.Succeeded())
                return Fail(pattern.mMessage);
        }
        if (mSeen.contains("--frames") && (mSeen.contains("--start") || mSeen.contains("--count")))
            return Fail("--frames cannot be combined with --start or --count");
        if (mSeen.contains("--chroma") && options.mOutputKind == OutputKind::kPngSequence)
            return Fail("--chroma applies to Y4M output only (-o -, -o FILE.y4m or --y4m)");
        if (mOutputOption.empty() && options.mOutputPath.empty() &&
            options.mOutputKind == OutputKind::kPngSequence)
            options.mOutputPath = kDefaultOutputPattern;
    }

    std::span<const std::string_view> mArguments;
    ParsedCommandLine& mResult;
    const bool mTakesMedia;
    std::size_t mIndex = 0;
    bool mHaveMedia = false;
    std::set<std::string> mSeen;
    std::string mOutputOption;
};

} // namespace

std::optional<std::uint64_t> ParseByteSize(std::string_view inText)
{
    static constexpr std::string_view kSuffixes = "KMGT";
    const std::size_t suffix =
        inText.empty() ? std::string_view::npos : kSuffixes.find(inText.back());
    const std::optional<std::uint64_t> number = ParseUnsigned(
        suffix == std::string_view::npos ? inText : inText.substr(0, inText.size() - 1));
    const unsigned shift = suffix == std::string_view::npos ? 0 : 10 * (unsigned(suffix) + 1);
    if (!number || *number > (UINT64_MAX >> shift))
        return std::nullopt;
    return *number << shift;
}

std::optional<std::int64_t> ParseCount(std::string_view inText)
{
    const std::optional<std::uint64_t> value = ParseUnsigned(inText);
    // Frame numbers stay far below the range where times overflow.
    if (!value || *value > 1'000'000'000)
        return std::nullopt;
    return static_cast<std::int64_t>(*value);
}

std::optional<mt::FrameRate> ParseFrameRate(std::string_view inText)
{
    // The common NTSC-family rates are exact ratios, not their rounded decimals.
    if (inText == "23.976")
        return mt::kFrameRate_Video2398;
    if (inText == "29.97")
        return mt::kFrameRate_Video2997;
    if (inText == "59.94")
        return mt::kFrameRate_Video5994;
    std::uint64_t numerator = 0;
    std::uint64_t denominator = 1;
    const std::size_t slash = inText.find('/');
    if (slash != std::string_view::npos)
    {
        const std::optional<std::uint64_t> n = ParseUnsigned(inText.substr(0, slash));
        const std::optional<std::uint64_t> d = ParseUnsigned(inText.substr(slash + 1));
        if (!n || !d || *d == 0)
            return std::nullopt;
        numerator = *n;
        denominator = *d;
    }
    else if (const std::optional<std::uint64_t> n = ParseUnsigned(inText))
        numerator = *n;
    else
    {
        double value = 0.0;
        const char* end = inText.data() + inText.size();
        const auto [ptr, error] = std::from_chars(inText.data(), end, value);
        if (inText.empty() || error != std::errc() || ptr != end || !std::isfinite(value) ||
            value < 1.0 || value > 1000.0)
            return std::nullopt;
        return mt::FrameRate::FromValue(value);
    }
    if (numerator < denominator || numerator > 1000 * denominator || denominator > 1'000'000'000)
        return std::nullopt;
    return mt::FrameRate::Create(static_cast<std::int64_t>(numerator),
                                 static_cast<std::int64_t>(denominator));
}

std::string CheckFramePattern(std::string_view inPattern)
{
    int conversions = 0;
    for (std::size_t i = 0; i < inPattern.size(); ++i)
    {
        if (inPattern[i] != '%')
            continue;
        if (i + 1 < inPattern.size() && inPattern[i + 1] == '%')
        {
            ++i;
            continue;
        }
        std::size_t j = i + 1;
        while (j < inPattern.size() && j - i <= 3 &&
               std::isdigit(static_cast<unsigned char>(inPattern[j])))
            ++j;
        if (j >= inPattern.size() || inPattern[j] != 'd' || j - i > 3)
            return "bad frame number conversion at " + Quoted(inPattern.substr(i)) +
                   " (use %d, %5d or %05d; %% for a percent sign)";
        ++conversions;
        i = j;
    }
    if (conversions == 0)
        return "the pattern has no frame number (add one, e.g. frame_%05d.png)";
    if (conversions > 1)
        return "the pattern has more than one frame number";
    return {};
}

std::string FormatFramePath(std::string_view inPattern, std::int64_t inFrame)
{
    std::string path;
    for (std::size_t i = 0; i < inPattern.size(); ++i)
    {
        if (inPattern[i] != '%')
        {
            path += inPattern[i];
            continue;
        }
        if (inPattern[i + 1] == '%')
        {
            path += '%';
            ++i;
            continue;
        }
        std::size_t j = i + 1;
        const bool zeros = inPattern[j] == '0';
        std::size_t width = 0;
        while (std::isdigit(static_cast<unsigned char>(inPattern[j])))
            width = width * 10 + static_cast<std::size_t>(inPattern[j++] - '0');
        std::string digits = std::to_string(inFrame);
        if (digits.size() < width)
            digits.insert(0, width - digits.size(), zeros ? '0' : ' ');
        path += digits;
        i = j;
    }
    return path;
}

std::optional<std::int64_t> MatchFramePath(std::string_view inPattern, std::string_view inPath)
{
    // The text before and after the frame number, %% unescaped.
    std::size_t conversion = 0;
    while (conversion < inPattern.size() &&
           (inPattern[conversion] != '%' || inPattern[conversion + 1] == '%'))
        conversion += inPattern[conversion] == '%' ? 2 : 1;
    const std::size_t end = inPattern.find('d', conversion) + 1;
    const std::string prefix = FormatFramePath(inPattern.substr(0, conversion), 0);
    const std::string suffix = FormatFramePath(inPattern.substr(end), 0);
    if (inPath.size() <= prefix.size() + suffix.size() || !inPath.starts_with(prefix) ||
        !inPath.ends_with(suffix))
        return std::nullopt;
    std::string_view digits =
        inPath.substr(prefix.size(), inPath.size() - prefix.size() - suffix.size());
    while (digits.size() > 1 && digits.front() == ' ')
        digits.remove_prefix(1);
    const std::optional<std::int64_t> frame = ParseCount(digits);
    // The exact spelling (width, padding) must be the pattern's own.
    if (!frame || FormatFramePath(inPattern, *frame) != inPath)
        return std::nullopt;
    return frame;
}

ParsedCommandLine ParseCommandLine(std::span<const std::string_view> inArguments)
{
    ParsedCommandLine result;
    if (inArguments.empty())
    {
        result.mCommand = Command::kDemo;
        result.mOptions = MakeDemoOptions();
        return result;
    }
    const std::string_view command = inArguments[0];
    const std::span<const std::string_view> rest = inArguments.subspan(1);
    if (command == "-h" || command == "--help" || command == "help")
        result.mCommand = Command::kHelp;
    else if (command == "info")
    {
        result.mCommand = Command::kInfo;
        for (const std::string_view argument : rest)
        {
            if (argument == "-h" || argument == "--help")
            {
                result.mCommand = Command::kHelp;
                return result;
            }
        }
        if (!rest.empty() && rest[0] == "--demo")
            result.mOptions.mBuiltInTimeline = true;
        else if (!rest.empty())
            result.mOptions.mMedia = std::string(rest[0]);
        if (rest.size() > 1)
            result.mError = "info: unexpected argument " + Quoted(rest[1]) +
                            " (info prints the built-in example cutlist, one timeline file, or the "
                            "demo timeline "
                            "with --demo)";
    }
    else if (command == "demo")
    {
        result.mCommand = Command::kDemo;
        result.mOptions = MakeDemoOptions();
        OptionParser parser(rest, result);
        parser.Run();
    }
    else if (command == "source" || command == "render")
    {
        result.mCommand = command == "source" ? Command::kSource : Command::kRender;
        OptionParser parser(rest, result);
        parser.Run();
    }
    else if (command.starts_with("-"))
        result.mError = "a command comes first: render, source, info, demo or help (got option " +
                        Quoted(command) + ")";
    else
        result.mError =
            "unknown command " + Quoted(command) + " (commands: render, source, info, demo, help)";
    return result;
}

RenderOptions MakeDemoOptions()
{
    RenderOptions options;
    options.mBuiltInTimeline = true;
    options.mOutputPath = kDemoOutputPattern;
    // out/demo/ is the demo's own: a second demo replaces the first.
    options.mOverwrite = true;
    return options;
}

std::string RenderableFormatNames()
{
    return RasterFormatNames();
}

std::vector<std::string> GetStillSourceWarnings(const RenderOptions& inOptions)
{
    std::vector<std::string> warnings;
    const FilterOptions& filters = inOptions.mFilters;
    const std::string still = " does not apply to a still source (" + Quoted(inOptions.mMedia) +
                              " shows one picture at every time); ignored";
    if (filters.mSpeed)
        warnings.push_back("--speed" + still);
    if (filters.mFrameBlend)
        warnings.push_back("--frame-blend" + still);
    // Pulldown removal replaces the field filters, this one included.
    if (filters.mInterlaceConsecutive &&
        filters.mRemovePulldown == mvxmediatypes::kPulldownCadence_None)
        warnings.push_back("--interlace-consecutive" + still);
    return warnings;
}

} // namespace vrender
