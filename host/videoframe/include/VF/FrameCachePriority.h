#pragma once

// The priorities with which frames go into the shared video-frame cache
// (VF/SharedVideoFrameCache.h), in a header of their own so that render
// parameters can carry one without the cache's declarations.
//
// kCachePriority_High is for frames that will be asked for again: playback,
// scrubbing and read-ahead, whose frames come back as the user moves about.
// Frames below it are the low class: made for one pass over the material (an
// export), kept only within the cache's small low-priority allowance and
// evicted before any high-priority frame. Plain constants, any thread.

#include <cstdint>

namespace VF
{

inline constexpr int32_t kCachePriority_Low = 0;
inline constexpr int32_t kCachePriority_High = 10;

} // namespace VF
