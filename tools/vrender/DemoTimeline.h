#pragma once

// The built-in demo timeline that `vrender` renders when it is given no
// command: four seconds at 1280x720 and 25 frames per second on four tracks,
// made of generated media only, so that it renders on any machine:
// - a nested two-track sequence (a gradient card with a moving picture
//   inset) for two seconds, then, through a soft-edged wipe, a moving
//   full-frame pattern;
// - colour bars, a still, laid over the middle two seconds with the
//   multiply blend, blurring more and more;
// - a picture-in-picture that slides across the frame, turns, and fades in
//   and out;
// - an offline clip for the last second, shown as the offline slate.

#include <string_view>

namespace vrender
{

// The timeline text (docs/timeline-format.md).
std::string_view GetDemoTimelineText();

// The name the demo timeline goes by in messages.
inline constexpr char kDemoTimelineName[] = "the demo timeline";

} // namespace vrender
