// The catalogue: match names to transition kinds, and the text parameters of
// a track item's transition read into the settings the objects render with.

#include "TX/TransitionCatalogue.h"

#include "TransitionObjects.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <charconv>
#include <cmath>
#include <optional>
#include <set>
#include <sstream>

namespace TX
{
namespace
{

std::atomic<std::uint32_t> sNextInstanceNumber{1};

struct KindEntry
{
    std::string_view mMatchName;
    TransitionKind mKind;
    // The parameters of the kind beyond those of every transition.
    std::set<std::string_view> mOwnParameters;
};

const std::array<KindEntry, 7>& Kinds()
{
    static const std::array<KindEntry, 7> sKinds{{
        {kMatchName_CrossDissolve, TransitionKind::kCrossDissolve, {}},
        {kMatchName_DipToBlack, TransitionKind::kDipToBlack, {}},
        {kMatchName_DipToWhite, TransitionKind::kDipToWhite, {}},
        {kMatchName_Wipe,
         TransitionKind::kWipe,
         {"direction", "border", "borderColor", "softness"}},
        {kMatchName_Push, TransitionKind::kPush, {"direction"}},
        {kMatchName_Slide, TransitionKind::kSlide, {"direction"}},
        {kMatchName_Iris, TransitionKind::kIris, {"border", "borderColor", "softness"}},
    }};
    return sKinds;
}

const std::set<std::string_view> kCommonParameters{"start",  "end",  "switch", "antialias",
                                                   "centre", "from", "to"};

// Reads one transition's parameters; the first problem ends the reading.
class ParameterReader
{
public:
    ParameterReader(const BE::TransitionSettings& inSettings, TransitionCreation& ioCreation)
        : mSettings(inSettings)
        , mCreation(ioCreation)
    {
    }

    bool Failed() const { return !mCreation.mError.empty(); }

    void Fail(std::string_view inName, std::string_view inProblem)
    {
        if (!Failed())
            mCreation.mError = "transition \"" + mSettings.mMatchName + "\": parameter \"" +
                               std::string(inName) + "\" " + std::string(inProblem);
    }

    const std::string* Text(std::string_view inName) const
    {
        const auto found = mSettings.mParams.find(std::string(inName));
        return found == mSettings.mParams.end() ? nullptr : &found->second;
    }

    // A number within [inLow, inHigh]; out of range is clamped with a warning.
    void Number(std::string_view inName, float inLow, float inHigh, float& ioValue)
    {
        const std::string* text = Text(inName);
        if (text == nullptr)
            return;
        const std::optional<float> value = ParseNumber(*text);
        if (!value)
            return Fail(inName, "is not a number: \"" + *text + "\"");
        ioValue = std::clamp(*value, inLow, inHigh);
        if (ioValue != *value)
        {
            std::ostringstream warning;
            warning << "transition \"" << mSettings.mMatchName << "\": parameter \"" << inName
                    << "\" " << *text << " clamped to " << ioValue;
            mCreation.mWarnings.push_back(warning.str());
        }
    }

    void Flag(std::string_view inName, bool& ioValue)
    {
        const std::string* text = Text(inName);
        if (text == nullptr)
            return;
        if (*text != "0" && *text != "1" && *text != "true" && *text != "false")
            return Fail(inName, "is not a boolean: \"" + *text + "\"");
        ioValue = *text == "1" || *text == "true";
    }

    // "x,y", each clamped to 0..1.
    void Point(std::string_view inName, TransitionPoint& ioValue)
    {
        const std::string* text = Text(inName);
        if (text == nullptr)
            return;
        const std::size_t comma = text->find(',');
        const std::optional<float> x =
            comma == std::string::npos ? std::nullopt : ParseNumber(text->substr(0, comma));
        const std::optional<float> y =
            comma == std::string::npos ? std::nullopt : ParseNumber(text->substr(comma + 1));
        if (!x || !y)
            return Fail(inName, "is not a point \"x,y\": \"" + *text + "\"");
        ioValue = {std::clamp(*x, 0.0f, 1.0f), std::clamp(*y, 0.0f, 1.0f)};
        if (ioValue.mX != *x || ioValue.mY != *y)
            mCreation.mWarnings.push_back("transition \"" + mSettings.mMatchName +
                                          "\": parameter \"" + std::string(inName) + "\" " + *text +
                                          " clamped to the frame");
    }

    void Direction(std::uint16_t& ioValue)
    {
        const std::string* text = Text("direction");
        if (text == nullptr)
            return;
        static const std::array<std::string_view, 4> sNames{"left", "right", "top", "bottom"};
        const auto found = std::find(sNames.begin(), sNames.end(), *text);
        if (found == sNames.end())
            return Fail("direction", "is not left, right, top or bottom: \"" + *text + "\"");
        ioValue = static_cast<std::uint16_t>(found - sNames.begin());
    }

    // "#RRGGBB" (opaque) or "#AARRGGBB".
    void Color(std::string_view inName, std::uint32_t& ioValue)
    {
        const std::string* text = Text(inName);
        if (text == nullptr)
            return;
        std::uint32_t value = 0;
        const char* begin = text->data() + 1;
        const char* end = text->data() + text->size();
        const bool sized = text->size() == 7 || text->size() == 9;
        if (!sized || (*text)[0] != '#' || std::from_chars(begin, end, value, 16).ptr != end)
            return Fail(inName, "is not a colour #RRGGBB or #AARRGGBB: \"" + *text + "\"");
        ioValue = text->size() == 7 ? 0xFF000000u | value : value;
    }

private:
    static std::optional<float> ParseNumber(std::string_view inText)
    {
        float value = 0;
        const char* end = inText.data() + inText.size();
        const auto [ptr, error] = std::from_chars(inText.data(), end, value);
        if (error != std::errc() || ptr != end || !std::isfinite(value))
            return std::nullopt;
        return value;
    }

    const BE::TransitionSettings& mSettings;
    TransitionCreation& mCreation;
};

} // namespace

TransitionCreation CreateTransition(const BE::TransitionSettings& inSettings)
{
    TransitionCreation creation;
    const auto entry = std::find_if(Kinds().begin(), Kinds().end(),
                                    [&](const KindEntry& inEntry)
                                    { return inEntry.mMatchName == inSettings.mMatchName; });
    if (entry == Kinds().end())
    {
        creation.mError = "unknown transition match name \"" + inSettings.mMatchName + "\"";
        return creation;
    }
    ParameterReader reader(inSettings, creation);
    for (const auto& [name, value] : inSettings.mParams)
        if (!kCommonParameters.contains(name) && !entry->mOwnParameters.contains(name))
            reader.Fail(name, "is not a parameter of this transition");

    TransitionParameters parameters;
    TransitionStyle style;
    constexpr float kMaxPixels = 100000.0f;
    reader.Number("start", 0.0f, 100.0f, parameters.mStartPercent);
    reader.Number("end", 0.0f, 100.0f, parameters.mEndPercent);
    reader.Flag("switch", parameters.mSwitchSources);
    float antiAlias = 1.0f;
    reader.Number("antialias", 0.0f, 1.0f, antiAlias);
    parameters.mAntiAliasQuality = static_cast<std::int32_t>(antiAlias);
    reader.Point("centre", parameters.mCenterPosition);
    reader.Point("from", parameters.mStartPosition);
    reader.Point("to", parameters.mEndPosition);
    reader.Direction(parameters.mDirection);
    reader.Number("border", 0.0f, kMaxPixels, parameters.mBorderWidth);
    reader.Color("borderColor", parameters.mBorderColor);
    reader.Number("softness", 0.0f, kMaxPixels, style.mSoftness);
    if (reader.Failed())
        return creation;

    parameters.mReverse = inSettings.mReverse;
    parameters.mDuration = inSettings.mEnd - inSettings.mStart;
    parameters.mInstanceNumber = sNextInstanceNumber.fetch_add(1);
    // Softness is the one setting beyond the parameters: it is the opaque data.
    MF::BinaryData opaque;
    if (entry->mOwnParameters.contains("softness"))
    {
        std::ostringstream text;
        text << "softness=" << style.mSoftness;
        opaque = MF::BinaryData::FromText(text.str());
    }
    creation.mTransition = CreateTransitionObject(entry->mKind, inSettings.mMatchName, parameters,
                                                  style, std::move(opaque));
    return creation;
}

BE::EffectCheckResult CheckTransition(const BE::TransitionSettings& inSettings)
{
    TransitionCreation creation = CreateTransition(inSettings);
    return {std::move(creation.mError), std::move(creation.mWarnings)};
}

} // namespace TX
