#pragma once

// vrender::HoldEdgeFrames: a renderable source over media with an end that
// renders the media's first frame for times before it and the last frame
// for times at or after the end. Re-timed output reads media frames around
// each output time (frame blending, the fields of reverse playback), which
// at the ends of a clip reach outside it; the edge frames stand in for
// those, as a clip's edge frames do when it is played at another speed.
//
// Frame times are conformed by the upstream source unchanged, so that the
// time filters find the frames they rendered under the times they asked
// for. Immutable; any thread.

#include "ML/IRenderableSource.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/TickTime.h"

namespace vrender
{

// inDuration is the media's length (positive), inFrameRate its frame rate.
QRT::InterfaceRef<ML::IRenderableSource>
HoldEdgeFrames(QRT::InterfaceRef<ML::IRenderableSource> inSource,
               mvxmediatypes::TickTime inDuration, mvxmediatypes::FrameRate inFrameRate);

} // namespace vrender
