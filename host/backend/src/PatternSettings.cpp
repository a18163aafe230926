#include "BE/PatternSettings.h"

#include "BE/MediaStatus.h"
#include "VF/VideoFrame.h"

#include <charconv>
#include <cstdio>
#include <set>

namespace BE
{

using mvxmediatypes::FrameRate;

namespace
{

constexpr std::string_view kPrefix = "pattern:";

struct KindName
{
    PatternKind mKind;
    std::string_view mName;
};
constexpr KindName kKindNames[] = {
    {PatternKind::kBars, "bars"},
    {PatternKind::kSolid, "solid"},
    {PatternKind::kGradient, "gradient"},
    {PatternKind::kMoving, "moving"},
};

// Rates spelled as decimals that stand for the 1001-based broadcast rates.
struct NamedRate
{
    std::string_view mText;
    std::int64_t mNumerator;
    std::int64_t mDenominator;
};
constexpr NamedRate kNamedRates[] = {
    {"23.976", 24000, 1001},
    {"29.97", 30000, 1001},
    {"59.94", 60000, 1001},
};

bool ParseUnsigned(std::string_view inText, std::uint64_t& outValue)
{
    if (inText.empty())
        return false;
    const char* end = inText.data() + inText.size();
    const auto [ptr, error] = std::from_chars(inText.data(), end, outValue);
    return error == std::errc() && ptr == end;
}

bool ParsePair(std::string_view inText, char inSeparator, std::uint64_t& outFirst,
               std::uint64_t& outSecond)
{
    const size_t separator = inText.find(inSeparator);
    if (separator == std::string_view::npos)
        return false;
    return ParseUnsigned(inText.substr(0, separator), outFirst) &&
           ParseUnsigned(inText.substr(separator + 1), outSecond);
}

bool ParseColor(std::string_view inText, std::uint32_t& outColor)
{
    if (inText.size() != 6)
        return false;
    std::uint32_t value = 0;
    const auto [ptr, error] = std::from_chars(inText.data(), inText.data() + 6, value, 16);
    if (error != std::errc() || ptr != inText.data() + 6)
        return false;
    outColor = value;
    return true;
}

std::string ColorText(std::uint32_t inColor)
{
    char text[8];
    std::snprintf(text, sizeof(text), "%06X", inColor & 0xFFFFFFu);
    return text;
}

// Parses one rate; the rate must be a real one (at least one frame per
// 1000 seconds and at most 1000 frames per second keeps every later frame
// computation in range).
bool ParseRate(std::string_view inText, FrameRate& outRate)
{
    std::int64_t numerator = 0;
    std::int64_t denominator = 1;
    bool parsed = false;
    for (const NamedRate& named : kNamedRates)
    {
        if (inText == named.mText)
        {
            numerator = named.mNumerator;
            denominator = named.mDenominator;
            parsed = true;
        }
    }
    std::uint64_t first = 0;
    std::uint64_t second = 0;
    if (!parsed && ParsePair(inText, '/', first, second))
    {
        parsed = first <= 1'000'000'000 && second <= 1'000'000'000;
        numerator = static_cast<std::int64_t>(first);
        denominator = static_cast<std::int64_t>(second);
    }
    else if (!parsed && ParseUnsigned(inText, first))
    {
        parsed = first <= 1'000'000'000;
        numerator = static_cast<std::int64_t>(first);
    }
    if (!parsed || numerator <= 0 || denominator <= 0)
        return false;
    // Between 1/1000 and 1000 frames per second.
    if (numerator > denominator * 1000 || numerator * 1000 < denominator)
        return false;
    outRate = FrameRate::Create(numerator, denominator);
    return true;
}

std::string RateText(const FrameRate& inRate)
{
    // The canonical form is the exact duration in ticks, which names every
    // rate, 1001-based or not, without rounding.
    return std::to_string(mvxmediatypes::kTicksPerSecond) + "/" +
           std::to_string(inRate.GetTicksPerFrame());
}

PatternParseResult Fail(std::string_view inText, const std::string& inProblem)
{
    PatternParseResult result;
    result.mResult = kResult_BadPattern;
    result.mMessage = "pattern '" + std::string(inText) + "': " + inProblem;
    return result;
}

} // namespace

std::string PatternSettings::ToText() const
{
    std::string text(kPrefix);
    for (const KindName& name : kKindNames)
        if (name.mKind == mKind)
            text += name.mName;
    text += "?size=" + std::to_string(mWidth) + "x" + std::to_string(mHeight);
    text += "&rate=" + RateText(mFrameRate);
    text += "&field=";
    text += mFieldType == mvxmediatypes::kFieldType_UpperFirst   ? "upper"
            : mFieldType == mvxmediatypes::kFieldType_LowerFirst ? "lower"
                                                                 : "progressive";
    const mvxmediatypes::PixelAspectRatio par = mPixelAspectRatio.Reduced();
    text +=
        "&par=" + std::to_string(par.GetNumerator()) + ":" + std::to_string(par.GetDenominator());
    text += "&alpha=";
    text += mAlpha == mvxmediatypes::kAlphaChannel_Straight        ? "straight"
            : mAlpha == mvxmediatypes::kAlphaChannel_Premultiplied ? "premultiplied"
                                                                   : "none";
    if (mAlpha != mvxmediatypes::kAlphaChannel_None)
        text += "&opacity=" + std::to_string(mOpacity);
    if (mAlpha == mvxmediatypes::kAlphaChannel_Premultiplied)
        text += "&matte=" + ColorText(mMatte);
    if (mKind == PatternKind::kSolid)
        text += "&color=" + ColorText(mColor);
    if (mKind == PatternKind::kGradient)
        text += "&from=" + ColorText(mFrom) + "&to=" + ColorText(mTo);
    return text;
}

PatternParseResult ParsePatternSettings(std::string_view inText)
{
    if (inText.substr(0, kPrefix.size()) != kPrefix)
        return Fail(inText, "does not start with \"pattern:\"");
    const std::string_view body = inText.substr(kPrefix.size());
    const size_t question = body.find('?');
    const std::string_view kindText = body.substr(0, question);

    PatternSettings settings;
    bool knownKind = false;
    for (const KindName& name : kKindNames)
    {
        if (kindText == name.mName)
        {
            settings.mKind = name.mKind;
            knownKind = true;
        }
    }
    if (!knownKind)
        return Fail(inText, "unknown pattern '" + std::string(kindText) +
                                "' (expected bars, solid, gradient or moving)");

    std::set<std::string_view> seen;
    std::string_view rest =
        question == std::string_view::npos ? std::string_view() : body.substr(question + 1);
    if (question != std::string_view::npos && rest.empty())
        return Fail(inText, "empty parameter list after '?'");
    while (!rest.empty())
    {
        const size_t ampersand = rest.find('&');
        const std::string_view item = rest.substr(0, ampersand);
        rest =
            ampersand == std::string_view::npos ? std::string_view() : rest.substr(ampersand + 1);
        if (ampersand != std::string_view::npos && rest.empty())
            return Fail(inText, "empty parameter after '&'");
        const size_t equals = item.find('=');
        if (equals == std::string_view::npos || equals == 0)
            return Fail(inText, "parameter '" + std::string(item) + "' is not key=value");
        const std::string_view key = item.substr(0, equals);
        const std::string_view value = item.substr(equals + 1);
        const std::string keyText(key);
        const std::string valueText(value);
        if (!seen.insert(key).second)
            return Fail(inText, "parameter '" + keyText + "' given twice");

        std::uint64_t first = 0;
        std::uint64_t second = 0;
        if (key == "size")
        {
            if (!ParsePair(value, 'x', first, second) || first == 0 || second == 0 ||
                first > VF::kMaxFrameDimension || second > VF::kMaxFrameDimension)
                return Fail(inText, "size '" + valueText + "' is not WxH with 1..32768 each");
            settings.mWidth = static_cast<std::uint32_t>(first);
            settings.mHeight = static_cast<std::uint32_t>(second);
        }
        else if (key == "rate")
        {
            if (!ParseRate(value, settings.mFrameRate))
                return Fail(inText,
                            "rate '" + valueText + "' is not a frame rate between 1/1000 and 1000");
        }
        else if (key == "field")
        {
            if (value == "progressive")
                settings.mFieldType = mvxmediatypes::kFieldType_Progressive;
            else if (value == "upper")
                settings.mFieldType = mvxmediatypes::kFieldType_UpperFirst;
            else if (value == "lower")
                settings.mFieldType = mvxmediatypes::kFieldType_LowerFirst;
            else
                return Fail(inText, "field '" + valueText + "' is not progressive, upper or lower");
        }
        else if (key == "par")
        {
            if (!ParsePair(value, ':', first, second) || first == 0 || second == 0 ||
                first > UINT32_MAX || second > UINT32_MAX)
                return Fail(inText, "par '" + valueText + "' is not N:D with positive terms");
            settings.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(
                static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(second));
        }
        else if (key == "alpha")
        {
            if (value == "none")
                settings.mAlpha = mvxmediatypes::kAlphaChannel_None;
            else if (value == "straight")
                settings.mAlpha = mvxmediatypes::kAlphaChannel_Straight;
            else if (value == "premultiplied")
                settings.mAlpha = mvxmediatypes::kAlphaChannel_Premultiplied;
            else
                return Fail(inText,
                            "alpha '" + valueText + "' is not none, straight or premultiplied");
        }
        else if (key == "opacity")
        {
            if (!ParseUnsigned(value, first) || first > 255)
                return Fail(inText, "opacity '" + valueText + "' is not 0..255");
            settings.mOpacity = static_cast<std::uint8_t>(first);
        }
        else if (key == "matte" || key == "color" || key == "from" || key == "to")
        {
            if (key == "color" && settings.mKind != PatternKind::kSolid)
                return Fail(inText, "color applies to solid patterns only");
            if ((key == "from" || key == "to") && settings.mKind != PatternKind::kGradient)
                return Fail(inText, keyText + " applies to gradient patterns only");
            std::uint32_t color = 0;
            if (!ParseColor(value, color))
                return Fail(inText, keyText + " '" + valueText + "' is not RRGGBB");
            (key == "matte"   ? settings.mMatte
             : key == "color" ? settings.mColor
             : key == "from"  ? settings.mFrom
                              : settings.mTo) = color;
        }
        else
        {
            return Fail(inText, "unknown parameter '" + keyText + "'");
        }
    }
    if (seen.contains("opacity") && settings.mAlpha == mvxmediatypes::kAlphaChannel_None)
        return Fail(inText, "opacity needs alpha=straight or alpha=premultiplied");
    if (seen.contains("matte") && settings.mAlpha != mvxmediatypes::kAlphaChannel_Premultiplied)
        return Fail(inText, "matte needs alpha=premultiplied");

    PatternParseResult result;
    result.mSettings = settings;
    return result;
}

} // namespace BE
