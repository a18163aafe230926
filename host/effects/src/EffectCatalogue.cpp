// The catalogue: match names to effect makers, and parameters from settings.

#include "FX/EffectCatalogue.h"

#include "EffectBase.h"

#include <atomic>
#include <charconv>
#include <sstream>

namespace FX
{
namespace
{

using detail::EffectEntry;
using detail::ParamSpec;

const std::vector<EffectEntry>& Entries()
{
    static const std::vector<EffectEntry> sEntries = []
    {
        std::vector<EffectEntry> entries;
        detail::AddColorEffects(entries);
        detail::AddKeyEffects(entries);
        detail::AddMatteEffects(entries);
        detail::AddGeometryEffects(entries);
        detail::AddBlurEffects(entries);
        detail::AddPinEffects(entries);
        detail::AddOverlayEffects(entries);
        return entries;
    }();
    return sEntries;
}

const EffectEntry* Find(std::string_view inMatchName)
{
    for (const EffectEntry& entry : Entries())
        if (entry.mMatchName == inMatchName)
            return &entry;
    return nullptr;
}

std::string Number(double inValue)
{
    std::ostringstream text;
    text << inValue;
    return text.str();
}

std::string Quoted(std::string_view inText)
{
    return "\"" + std::string(inText) + "\"";
}

std::optional<double> ParseNumber(const std::string& inText)
{
    double value = 0.0;
    const char* end = inText.data() + inText.size();
    const auto [stop, error] = std::from_chars(inText.data(), end, value);
    if (error != std::errc() || stop != end)
        return std::nullopt;
    return value;
}

// The value of a parameter given as text, by its type.
std::optional<double> ParseText(const ParamSpec& inSpec, const std::string& inText)
{
    switch (inSpec.mType)
    {
    case ParamType::kBool:
        if (inText == "true" || inText == "1")
            return 1.0;
        if (inText == "false" || inText == "0")
            return 0.0;
        return std::nullopt;
    case ParamType::kChoice:
        for (std::size_t i = 0; i < inSpec.mChoices.size(); ++i)
            if (inSpec.mChoices[i] == inText)
                return static_cast<double>(i);
        return std::nullopt;
    case ParamType::kColor:
    {
        if ((inText.size() != 7 && inText.size() != 9) || inText[0] != '#')
            return std::nullopt;
        std::uint32_t color = 0;
        const char* end = inText.data() + inText.size();
        const auto [stop, error] = std::from_chars(inText.data() + 1, end, color, 16);
        if (error != std::errc() || stop != end)
            return std::nullopt;
        return static_cast<double>(inText.size() == 7 ? (color | 0xFF000000u) : color);
    }
    default:
        return ParseNumber(inText);
    }
}

std::string ExpectedText(const ParamSpec& inSpec)
{
    switch (inSpec.mType)
    {
    case ParamType::kBool:
        return "true or false";
    case ParamType::kColor:
        return "a colour \"#RRGGBB\"";
    case ParamType::kChoice:
    {
        std::string names;
        for (std::string_view choice : inSpec.mChoices)
            names += (names.empty() ? "" : ", ") + std::string(choice);
        return "one of " + names;
    }
    default:
        return "a number";
    }
}

class ParamReader
{
public:
    ParamReader(const BE::EffectSettings& inSettings, EffectMade& ioMade)
        : mSettings(inSettings)
        , mMade(ioMade)
    {
    }

    // False (with mMade.mError set) when the parameter is refused.
    bool Read(const ParamSpec& inSpec, EffectParam& outParam)
    {
        outParam.mName = std::string(inSpec.mName);
        outParam.mType = inSpec.mType;
        const bool point = inSpec.mType == ParamType::kPoint;
        const int dimension = point ? 2 : 1;
        const std::string name(inSpec.mName);
        const auto text = mSettings.mParams.find(name);
        const auto curve = mSettings.mKeyframedParams.find(name);
        auto constant = [&](double inX, double inY)
        {
            outParam.mCurve = BE::KeyframeCurve(dimension, Clamped(inSpec, {inX, inY}));
            return true;
        };
        if (text != mSettings.mParams.end())
        {
            const std::optional<double> value = ParseText(inSpec, text->second);
            if (!value)
                return Refuse(Quoted(name) + ": expected " + ExpectedText(inSpec) + ", got " +
                              Quoted(text->second));
            return constant(*value, inSpec.mDefaultY);
        }
        if (curve == mSettings.mKeyframedParams.end())
            return constant(inSpec.mDefault, inSpec.mDefaultY);
        const bool keyed = inSpec.mType == ParamType::kNumber || point;
        if (!keyed && inSpec.mType != ParamType::kBool && inSpec.mType != ParamType::kLayer)
            return Refuse(Quoted(name) + ": expected " + ExpectedText(inSpec) + " as text");
        if (curve->second.GetDimension() != dimension)
            return Refuse(Quoted(name) + ": expected " + (point ? "a point" : "a number"));
        if (curve->second.GetKeys().empty() || !keyed)
        {
            const MF::KeyframePoint value = curve->second.ValueAt(mvxmediatypes::kTime_Zero);
            return constant(value.mX, value.mY);
        }
        std::vector<BE::CurveKey> keys = curve->second.GetKeys();
        for (BE::CurveKey& key : keys)
            key.mValue = Clamped(inSpec, key.mValue);
        const MF::KeyframePoint first = keys.front().mValue;
        outParam.mCurve = BE::KeyframeCurve(dimension, first, std::move(keys));
        return true;
    }

    // Warnings for parameters the effect does not have.
    void WarnUnknown(std::span<const ParamSpec> inSpecs)
    {
        auto known = [&](const std::string& inName)
        {
            for (const ParamSpec& spec : inSpecs)
                if (spec.mName == inName)
                    return true;
            return false;
        };
        auto warn = [&](const std::string& inName)
        {
            if (!known(inName))
                mMade.mWarnings.push_back(Quoted(mSettings.mMatchName) + " has no parameter " +
                                          Quoted(inName) + "; it is ignored");
        };
        for (const auto& [name, text] : mSettings.mParams)
            warn(name);
        for (const auto& [name, curve] : mSettings.mKeyframedParams)
            warn(name);
    }

private:
    double Clamped(const ParamSpec& inSpec, double inValue)
    {
        const bool ranged = inSpec.mType == ParamType::kNumber || inSpec.mType == ParamType::kPoint;
        if (!ranged || (inValue >= inSpec.mMin && inValue <= inSpec.mMax))
            return inValue;
        // Not a number counts as below the range.
        const double clamped = inValue > inSpec.mMax ? inSpec.mMax : inSpec.mMin;
        mMade.mWarnings.push_back(Quoted(mSettings.mMatchName) + " parameter " +
                                  Quoted(inSpec.mName) + ": " + Number(inValue) + " is outside " +
                                  Number(inSpec.mMin) + ".." + Number(inSpec.mMax) +
                                  "; clamped to " + Number(clamped));
        return clamped;
    }

    MF::KeyframePoint Clamped(const ParamSpec& inSpec, MF::KeyframePoint inValue)
    {
        const bool point = inSpec.mType == ParamType::kPoint;
        return {Clamped(inSpec, inValue.mX), point ? Clamped(inSpec, inValue.mY) : 0.0};
    }

    bool Refuse(const std::string& inProblem)
    {
        mMade.mError = Quoted(mSettings.mMatchName) + " parameter " + inProblem;
        return false;
    }

    const BE::EffectSettings& mSettings;
    EffectMade& mMade;
};

std::atomic<std::uint32_t> sNextInstanceID{1};

} // namespace

EffectMade CreateEffect(const BE::EffectSettings& inSettings,
                        std::optional<mvxmediatypes::TickTime> inDuration)
{
    EffectMade made;
    const EffectEntry* entry = Find(inSettings.mMatchName);
    if (!entry)
    {
        made.mError = "unknown effect " + Quoted(inSettings.mMatchName);
        return made;
    }
    detail::EffectSetup setup;
    setup.mMatchName = inSettings.mMatchName;
    setup.mDuration = inDuration;
    setup.mOpaqueData = inSettings.mOpaqueData;
    setup.mBaseFolder = inSettings.mBaseFolder;
    ParamReader reader(inSettings, made);
    for (const ParamSpec& spec : entry->mParams)
        if (!reader.Read(spec, setup.mParams.emplace_back()))
        {
            made.mWarnings.clear();
            return made;
        }
    reader.WarnUnknown(entry->mParams);
    setup.mInstanceID = sNextInstanceID.fetch_add(1, std::memory_order_relaxed);
    made.mEffect = entry->mMake(std::move(setup));
    return made;
}

std::vector<std::string> GetEffectMatchNames()
{
    std::vector<std::string> names;
    for (const EffectEntry& entry : Entries())
        names.emplace_back(entry.mMatchName);
    return names;
}

BE::EffectCheckResult CheckEffect(const BE::EffectSettings& inSettings)
{
    BE::EffectCheckResult result;
    if (inSettings.mMatchName == kMatch_Opacity || inSettings.mMatchName == kMatch_Motion)
    {
        result.mError = Quoted(inSettings.mMatchName) +
                        " is the item's own opacity or motion: give it with the item's "
                        "\"opacity\" or \"motion\" key";
        return result;
    }
    EffectMade made = CreateEffect(inSettings);
    result.mError = std::move(made.mError);
    result.mWarnings = std::move(made.mWarnings);
    return result;
}

} // namespace FX
