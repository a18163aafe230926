#pragma once

// The time transforms a clip node re-times its input with, beside the linear
// speed transform of the media model (MF::CreateTimeTransform):
// - a chain that applies several transforms one after the other;
// - time remapping: the input's time read off a keyframe curve of media
//   seconds over clip time;
// - a frame hold: every time maps to one held time.
//
// All are immutable after creation and may be used from any thread. Each
// mixes a tag of its own and all of its data into a hash, so equal mappings
// hash equally and different kinds never collide.

#include "BE/Keyframes.h"
#include "BE/SequenceTypes.h"
#include "MF/TimeTransform.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/TickTime.h"

#include <vector>

namespace ML
{

using TimeTransformRef = QRT::InterfaceRef<MF::ITimeTransform>;

// inSteps applied in order (the first maps the outer time); the inverse runs
// them backwards. An empty chain is the identity. Input contract: no step is
// empty.
TimeTransformRef CreateMultiTimeTransform(std::vector<TimeTransformRef> inSteps);

// Media time = inCurve's value (seconds) at the outer time. The inverse
// searches the keyed span of a curve that never decreases (or never
// increases) and answers kTime_Invalid for a curve that turns, or for a
// time the curve never reaches. Input contract: the curve has keys.
TimeTransformRef CreateRemapTimeTransform(const BE::KeyframeCurve& inCurve);

// Every valid time maps to inHeldTime; kTime_Invalid stays invalid. No time
// maps back (the inverse is kTime_Invalid) and the speed is 0. Input
// contract: inHeldTime is valid.
TimeTransformRef CreateHoldTimeTransform(mvxmediatypes::TickTime inHeldTime);

// How inItem plays its media, from clip time (0 at the item's start) to
// media time, without its frame hold: the in point plus clip time times the
// speed; backwards (reverse set, or a negative speed, but not both) from the
// end of the used range (the out point, or the in point plus the item's
// length times the speed) towards the in point; a time remapping replaces
// the in point and direction by its curve, read at clip time times the
// speed. Always a chain (CreateMultiTimeTransform).
TimeTransformRef CreatePlaybackTimeTransform(const BE::TrackItemSettings& inItem);

// The playback transform followed by the item's frame hold, when it has one.
TimeTransformRef CreateClipTimeTransform(const BE::TrackItemSettings& inItem);

} // namespace ML
