#pragma once

// The catalogue of the host's transitions: a TX::ITransition made from the
// transition settings of a track item (BE::TransitionSettings: match name,
// times, reverse, parameters as text). Any thread may call it.
//
// Match names and their parameters (every one optional):
//   all:   "start", "end" (per cent played at progress 0 and 1, 0 to 100),
//          "switch" (switch sources, "0"/"1"), "antialias" (0 hard edges,
//          1 edges covered by area), "centre", "from", "to" (points "x,y" in
//          frame-relative units: the centre, start and end positions)
//   "TX.CrossDissolve"  A dissolves into B
//   "TX.DipToBlack", "TX.DipToWhite"  A fades to the colour, then B from it
//   "TX.Wipe"   an edge crosses the frame and reveals B: "direction" (left,
//               right, top, bottom: the side B enters from), "border" (width
//               in pixels), "borderColor" (#RRGGBB or #AARRGGBB),
//               "softness" (pixels over which the edges blend)
//   "TX.Push"   B pushes A out of the frame: "direction"
//   "TX.Slide"  B slides in over A: "direction"
//   "TX.Iris"   a circle grows from the centre and reveals B: "border",
//               "borderColor", "softness"
// A number out of range is clamped to its range and named in the warnings;
// text that is not a number, an unknown direction or parameter, or an unknown
// match name is refused with a message that names it.

#include "BE/SequenceTypes.h"
#include "BE/TimelineFile.h"
#include "QRT/InterfaceRef.h"
#include "TX/Transition.h"

#include <string>
#include <string_view>
#include <vector>

namespace TX
{

inline constexpr std::string_view kMatchName_CrossDissolve = "TX.CrossDissolve";
inline constexpr std::string_view kMatchName_DipToBlack = "TX.DipToBlack";
inline constexpr std::string_view kMatchName_DipToWhite = "TX.DipToWhite";
inline constexpr std::string_view kMatchName_Wipe = "TX.Wipe";
inline constexpr std::string_view kMatchName_Push = "TX.Push";
inline constexpr std::string_view kMatchName_Slide = "TX.Slide";
inline constexpr std::string_view kMatchName_Iris = "TX.Iris";

struct TransitionCreation
{
    // Empty when refused.
    QRT::InterfaceRef<ITransition> mTransition;
    // Why it was refused; empty on success.
    std::string mError;
    // Parameters clamped to their range.
    std::vector<std::string> mWarnings;
};

TransitionCreation CreateTransition(const BE::TransitionSettings& inSettings);

// The timeline loader's check (BE::TransitionCheck): CreateTransition's error
// and warnings, so that a transition it would refuse refuses the file and a
// clamped parameter is warned of at load.
BE::EffectCheckResult CheckTransition(const BE::TransitionSettings& inSettings);

} // namespace TX
