// Text forms shared by the timeline reader and writer (TimelineFormat.h).

#include "TimelineFormat.h"

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <numeric>

namespace BE::timeline
{
namespace
{

namespace mt = mvxmediatypes;

template <class T>
bool ParseWhole(std::string_view inText, T& outValue)
{
    const char* end = inText.data() + inText.size();
    const auto [ptr, error] = std::from_chars(inText.data(), end, outValue);
    return !inText.empty() && error == std::errc() && ptr == end;
}

std::size_t EditDistance(std::string_view inLeft, std::string_view inRight)
{
    std::vector<std::size_t> row(inRight.size() + 1);
    std::iota(row.begin(), row.end(), std::size_t{0});
    for (std::size_t i = 1; i <= inLeft.size(); ++i)
    {
        std::size_t diagonal = row[0];
        row[0] = i;
        for (std::size_t j = 1; j <= inRight.size(); ++j)
        {
            const std::size_t above = row[j];
            row[j] = std::min(
                {row[j] + 1, row[j - 1] + 1, diagonal + (inLeft[i - 1] == inRight[j - 1] ? 0 : 1)});
            diagonal = above;
        }
    }
    return row.back();
}

} // namespace

std::string TimeText(mt::TickTime inTime, mt::FrameRate inRate)
{
    const std::int64_t ticks = inTime.GetTicks();
    const std::int64_t perFrame = inRate.GetTicksPerFrame();
    if (perFrame > 0 && ticks % perFrame == 0)
        return std::to_string(ticks / perFrame) + "f";
    return std::to_string(ticks) + "t";
}

std::optional<mt::TickTime> ParseTimeText(std::string_view inText, mt::FrameRate inRate)
{
    if (inText.size() < 2)
        return std::nullopt;
    std::int64_t count = 0;
    if (!ParseWhole(inText.substr(0, inText.size() - 1), count))
        return std::nullopt;
    if (inText.back() == 't')
        return mt::TickTime::TicksToTime(count);
    const std::int64_t perFrame = inRate.GetTicksPerFrame();
    if (inText.back() != 'f' || perFrame <= 0)
        return std::nullopt;
    // Frame counts beyond the tick range are refused rather than wrapped.
    if (count > INT64_MAX / perFrame || count < (INT64_MIN + 1) / perFrame)
        return std::nullopt;
    return mt::TickTime::TicksToTime(count * perFrame);
}

std::string RateText(mt::FrameRate inRate)
{
    std::int64_t numerator = mt::kTicksPerSecond;
    std::int64_t denominator = inRate.GetTicksPerFrame();
    const std::int64_t divisor = std::gcd(numerator, denominator);
    if (divisor > 0)
    {
        numerator /= divisor;
        denominator /= divisor;
    }
    if (denominator == 1)
        return std::to_string(numerator);
    return std::to_string(numerator) + "/" + std::to_string(denominator);
}

std::optional<double> ParseRateText(std::string_view inText, std::int64_t& outNumerator,
                                    std::int64_t& outDenominator)
{
    const std::size_t slash = inText.find('/');
    outDenominator = 1;
    if (!ParseWhole(inText.substr(0, slash), outNumerator))
        return std::nullopt;
    if (slash != std::string_view::npos &&
        (!ParseWhole(inText.substr(slash + 1), outDenominator) || outDenominator <= 0))
        return std::nullopt;
    return static_cast<double>(outNumerator) / static_cast<double>(outDenominator);
}

std::string ColorText(std::uint32_t inColor)
{
    char text[12];
    std::snprintf(text, sizeof(text), "#%08X", inColor);
    return text;
}

std::optional<std::uint32_t> ParseColorText(std::string_view inText)
{
    if ((inText.size() != 7 && inText.size() != 9) || inText[0] != '#')
        return std::nullopt;
    std::uint32_t value = 0;
    const char* end = inText.data() + inText.size();
    const auto [ptr, error] = std::from_chars(inText.data() + 1, end, value, 16);
    if (error != std::errc() || ptr != end)
        return std::nullopt;
    return inText.size() == 7 ? (0xFF000000u | value) : value;
}

std::string_view NearestName(std::string_view inWord, std::span<const std::string_view> inNames)
{
    std::string_view best;
    std::size_t bestDistance = SIZE_MAX;
    for (std::string_view name : inNames)
    {
        const std::size_t distance = EditDistance(inWord, name);
        if (distance < bestDistance)
        {
            best = name;
            bestDistance = distance;
        }
    }
    // A third of the word (at least one edit, at most three) still reads as a typo.
    const std::size_t limit = std::clamp<std::size_t>(inWord.size() / 3, 1, 3);
    return bestDistance <= limit ? best : std::string_view();
}

std::string SecondsText(mt::TickTime inTime)
{
    char text[48];
    std::snprintf(text, sizeof(text), "%.3f s", inTime.ToSeconds());
    return text;
}

} // namespace BE::timeline
