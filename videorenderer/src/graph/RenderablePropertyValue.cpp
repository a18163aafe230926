// Text form of node property values (see ML/RenderablePropertyValue.h).

#include "ML/RenderablePropertyValue.h"

#include <charconv>
#include <system_error>

namespace ML
{
namespace
{

template <class T>
MF::RenderablePropertyValue FormatInteger(T inValue)
{
    char buffer[24];
    const std::to_chars_result result = std::to_chars(buffer, buffer + sizeof(buffer), inValue);
    return MF::RenderablePropertyValue(buffer, result.ptr);
}

// The whole text must be one number; "+", blanks and trailing characters are refused.
template <class T>
bool ParseWhole(std::string_view inText, T& outValue)
{
    if (inText.empty() || inText.front() == '+')
        return false;
    T value{};
    const char* end = inText.data() + inText.size();
    const std::from_chars_result result = std::from_chars(inText.data(), end, value);
    if (result.ec != std::errc() || result.ptr != end)
        return false;
    outValue = value;
    return true;
}

} // namespace

MF::RenderablePropertyValue FormatPropertyValue(double inValue)
{
    // "%g" with six significant digits is what a default-formatted stream
    // writes; to_chars gives it without consulting the locale.
    char buffer[32];
    const std::to_chars_result result =
        std::to_chars(buffer, buffer + sizeof(buffer), inValue, std::chars_format::general, 6);
    return MF::RenderablePropertyValue(buffer, result.ptr);
}

MF::RenderablePropertyValue FormatPropertyValue(std::int32_t inValue)
{
    return FormatInteger(inValue);
}

MF::RenderablePropertyValue FormatPropertyValue(std::int64_t inValue)
{
    return FormatInteger(inValue);
}

MF::RenderablePropertyValue FormatPropertyValue(std::uint32_t inValue)
{
    return FormatInteger(inValue);
}

MF::RenderablePropertyValue FormatPropertyValue(std::uint64_t inValue)
{
    return FormatInteger(inValue);
}

MF::RenderablePropertyValue FormatPropertyValue(bool inValue)
{
    return inValue ? "1" : "0";
}

MF::RenderablePropertyValue FormatPropertyValue(mvxmediatypes::TickTime inValue)
{
    return FormatInteger(inValue.GetTicks());
}

bool ParsePropertyValue(std::string_view inText, double& outValue)
{
    return ParseWhole(inText, outValue);
}

bool ParsePropertyValue(std::string_view inText, std::int32_t& outValue)
{
    return ParseWhole(inText, outValue);
}

bool ParsePropertyValue(std::string_view inText, std::int64_t& outValue)
{
    return ParseWhole(inText, outValue);
}

bool ParsePropertyValue(std::string_view inText, std::uint32_t& outValue)
{
    // from_chars would read "-1" as an error already; the explicit check keeps
    // the rule visible.
    if (!inText.empty() && inText.front() == '-')
        return false;
    return ParseWhole(inText, outValue);
}

bool ParsePropertyValue(std::string_view inText, std::uint64_t& outValue)
{
    if (!inText.empty() && inText.front() == '-')
        return false;
    return ParseWhole(inText, outValue);
}

bool ParsePropertyValue(std::string_view inText, bool& outValue)
{
    if (inText == "0" || inText == "1")
    {
        outValue = inText == "1";
        return true;
    }
    return false;
}

bool ParsePropertyValue(std::string_view inText, mvxmediatypes::TickTime& outValue)
{
    std::int64_t ticks = 0;
    if (!ParseWhole(inText, ticks))
        return false;
    outValue = mvxmediatypes::TickTime::TicksToTime(ticks);
    return true;
}

MF::RenderablePropertyValue FormatPropertyValue(const MF::BinaryData& inValue)
{
    static constexpr char kDigits[] = "0123456789abcdef";
    MF::RenderablePropertyValue text;
    text.reserve(inValue.GetSize() * 2);
    for (const std::uint8_t byte : inValue.GetBytes())
    {
        text += kDigits[byte >> 4];
        text += kDigits[byte & 15];
    }
    return text;
}

} // namespace ML
