#pragma once

// What the timeline reader and writer share: the names of enumerated values
// and the text forms of times, rates and colours.

#include "BE/SequenceTypes.h"

#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace BE::timeline
{

template <class T>
struct NamedValue
{
    std::string_view mName;
    T mValue;
};

inline constexpr NamedValue<mvxmediatypes::FieldType> kFieldTypes[] = {
    {"progressive", mvxmediatypes::kFieldType_Progressive},
    {"upper", mvxmediatypes::kFieldType_UpperFirst},
    {"lower", mvxmediatypes::kFieldType_LowerFirst},
};

inline constexpr NamedValue<mvxmediatypes::AlphaChannel> kAlphaChannels[] = {
    {"none", mvxmediatypes::kAlphaChannel_None},
    {"straight", mvxmediatypes::kAlphaChannel_Straight},
    {"premultiplied", mvxmediatypes::kAlphaChannel_Premultiplied},
    {"ignore", mvxmediatypes::kAlphaChannel_Ignore},
};

inline constexpr NamedValue<IR_BlendMode> kBlendModes[] = {
    {"normal", kIR_BlendMode_Normal},     {"darken", kIR_BlendMode_Darken},
    {"multiply", kIR_BlendMode_Multiply}, {"lighten", kIR_BlendMode_Lighten},
    {"screen", kIR_BlendMode_Screen},     {"add", kIR_BlendMode_Add},
    {"overlay", kIR_BlendMode_Overlay},   {"difference", kIR_BlendMode_Difference},
    {"subtract", kIR_BlendMode_Subtract},
};

inline constexpr NamedValue<FieldProcessing> kFieldProcessing[] = {
    {"none", FieldProcessing::kNone},
    {"interlace", FieldProcessing::kInterlaceConsecutiveFrames},
    {"deinterlace", FieldProcessing::kDeinterlaceAlways},
    {"flicker", FieldProcessing::kRemoveFlicker},
};

inline constexpr NamedValue<KeyframeInterpolation> kInterpolations[] = {
    {"linear", KeyframeInterpolation::kLinear},
    {"hold", KeyframeInterpolation::kHold},
    {"bezier", KeyframeInterpolation::kBezier},
};

inline constexpr NamedValue<mvxmediatypes::PulldownCadence> kCadences[] = {
    {"none", mvxmediatypes::kPulldownCadence_None}, {"AA", mvxmediatypes::kPulldownCadence_23_AA},
    {"BB", mvxmediatypes::kPulldownCadence_23_BB},  {"BC", mvxmediatypes::kPulldownCadence_23_BC},
    {"CD", mvxmediatypes::kPulldownCadence_23_CD},  {"DD", mvxmediatypes::kPulldownCadence_23_DD},
};

template <class T, std::size_t N>
std::string_view NameOf(const NamedValue<T> (&inTable)[N], T inValue)
{
    for (const NamedValue<T>& entry : inTable)
        if (entry.mValue == inValue)
            return entry.mName;
    return inTable[0].mName;
}

template <class T, std::size_t N>
std::optional<T> ValueOf(const NamedValue<T> (&inTable)[N], std::string_view inName)
{
    for (const NamedValue<T>& entry : inTable)
        if (entry.mName == inName)
            return entry.mValue;
    return std::nullopt;
}

template <class T, std::size_t N>
std::string NamesOf(const NamedValue<T> (&inTable)[N])
{
    std::string names;
    for (const NamedValue<T>& entry : inTable)
        names += (names.empty() ? "" : ", ") + std::string(entry.mName);
    return names;
}

// "40f" when inTime is a whole number of frames at inRate, else "12345t".
std::string TimeText(mvxmediatypes::TickTime inTime, mvxmediatypes::FrameRate inRate);
// A time written as seconds (inText empty, inSeconds used), "<n>f" or
// "<n>t"; nullopt when the text is neither.
std::optional<mvxmediatypes::TickTime> ParseTimeText(std::string_view inText,
                                                     mvxmediatypes::FrameRate inRate);

// "25" or "30000/1001".
std::string RateText(mvxmediatypes::FrameRate inRate);
// Frames per second of "N" or "N/D"; nullopt when malformed.
std::optional<double> ParseRateText(std::string_view inText, std::int64_t& outNumerator,
                                    std::int64_t& outDenominator);

// "#AARRGGBB".
std::string ColorText(std::uint32_t inColor);
// "#RRGGBB" (opaque) or "#AARRGGBB"; nullopt when malformed.
std::optional<std::uint32_t> ParseColorText(std::string_view inText);

// The candidate nearest to inWord by edit distance, or empty when none is
// close enough to be a likely misspelling.
std::string_view NearestName(std::string_view inWord, std::span<const std::string_view> inNames);

// "1.500 s", for messages.
std::string SecondsText(mvxmediatypes::TickTime inTime);

} // namespace BE::timeline
