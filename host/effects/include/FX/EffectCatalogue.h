#pragma once

// The catalogue of the host's built-in video effects: which match names it
// knows and the effect object it makes from an item's effect settings.
//
// Parameters. Each effect declares its parameters with a default and a
// range. A setting may give a parameter as text (BE::EffectSettings::mParams:
// a number, "true"/"false", a choice's name, a colour "#RRGGBB") or as a
// curve (mKeyframedParams). A parameter not given keeps its default. A value
// outside its range is clamped and reported as a warning; an unknown
// parameter is ignored with a warning; text that is not a value of the
// parameter's type refuses the effect.
//
// Every function may be called from any thread.

#include "BE/SequenceTypes.h"
#include "BE/TimelineFile.h"
#include "FX/Effect.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace FX
{

// Match names of the effects the catalogue makes.
inline constexpr std::string_view kMatch_ProcAmp = "KX.VNTR ProcAmp";
inline constexpr std::string_view kMatch_Transform = "KX.VNTR Geometry";
inline constexpr std::string_view kMatch_AlphaAdjust = "KX.VNTR Alpha Adjust";
inline constexpr std::string_view kMatch_VideoLimiter = "KX.VNTR Video Limiter";
inline constexpr std::string_view kMatch_LumaKey = "KX.VNTR Legacy Key Luma";
inline constexpr std::string_view kMatch_ChromaKey = "KX.VNTR Legacy Key Chroma";
inline constexpr std::string_view kMatch_RGBDifferenceKey = "KX.VNTR Legacy Key RGBDifference";
inline constexpr std::string_view kMatch_BlueScreenKey = "KX.VNTR Legacy Key BlueScreen";
inline constexpr std::string_view kMatch_GreenScreenKey = "KX.VNTR Legacy Key GreenScreen";
inline constexpr std::string_view kMatch_NonRedKey = "KX.VNTR Legacy Key NonRed";
inline constexpr std::string_view kMatch_MultiplyKey = "KX.VNTR Legacy Key Multiply";
inline constexpr std::string_view kMatch_ScreenKey = "KX.VNTR Legacy Key Screen";
inline constexpr std::string_view kMatch_RemoveMatte = "KX.VNTR Legacy Key Remove Matte";
inline constexpr std::string_view kMatch_TrackMatte = "KX.VNTR Legacy Key Track Matte";
inline constexpr std::string_view kMatch_ImageMatte = "KX.VNTR Legacy Key Image Matte";
inline constexpr std::string_view kMatch_DifferenceMatte = "KX.VNTR Legacy Key Difference Matte";
inline constexpr std::string_view kMatch_CornerPin = "KX.VNTR Corner Pin";
inline constexpr std::string_view kMatch_GarbageMatte = "KX.VNTR Garbage Matte";
inline constexpr std::string_view kMatch_Timecode = "KX.VNTR Orvl Timecode";
inline constexpr std::string_view kMatch_MulticamHilite = "KX.VNTR Multicam Hilite";
inline constexpr std::string_view kMatch_Crop = "VR.Crop";
inline constexpr std::string_view kMatch_GaussianBlur = "VR.GaussianBlur";
// The item's own opacity and motion: known names, but no effect object (the
// clip evaluates them itself).
inline constexpr std::string_view kMatch_Opacity = "KX.VNTR Opacity";
inline constexpr std::string_view kMatch_Motion = "KX.VNTR Motion";

struct EffectMade
{
    // Empty when the settings were refused (mError says why).
    QRT::InterfaceRef<IEffect> mEffect;
    std::string mError;
    std::vector<std::string> mWarnings;
};

// The effect of inSettings. inDuration, when given, is the effect's duration
// (the item's length). An unknown match name is refused with
// "unknown effect \"NAME\"".
EffectMade CreateEffect(const BE::EffectSettings& inSettings,
                        std::optional<mvxmediatypes::TickTime> inDuration = std::nullopt);

// Every match name CreateEffect makes, in catalogue order.
std::vector<std::string> GetEffectMatchNames();

// The timeline loader's check (BE::EffectCheck): the effect must be one the
// catalogue makes (the item's opacity and motion are written as its own keys,
// not as effects); warnings as CreateEffect gives them.
BE::EffectCheckResult CheckEffect(const BE::EffectSettings& inSettings);

} // namespace FX
