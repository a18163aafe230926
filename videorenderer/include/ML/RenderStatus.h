#pragma once

// Status values of the render pipeline (render requests, the render queue,
// the render-frame object and the prefetchers). Signed 32-bit, negative for
// failure; every status of the pipeline is named here once and never written
// as a bare literal elsewhere.

#include "QRT/Result.h"

namespace ML
{

// The frame was rendered, or served from the shared frame cache.
inline constexpr QRT::Result kResult_Rendered = static_cast<QRT::Result>(0x200D0000u);
// The render was queued; the outcome arrives through a notification.
inline constexpr QRT::Result kResult_RenderQueued = static_cast<QRT::Result>(0x200D0001u);
// The render failed, or was refused because the module is shutting down.
inline constexpr QRT::Result kResult_RenderFailed = static_cast<QRT::Result>(0xA00D0000u);
// Nothing found, index out of range, or a prefetch that did not complete.
inline constexpr QRT::Result kResult_NotFound = QRT::kResult_NotFound;
inline constexpr QRT::Result kResult_PrefetchIncomplete = QRT::kResult_NotFound;
// Memory for the frame could not be had.
inline constexpr QRT::Result kResult_OutOfMemory = static_cast<QRT::Result>(0xA00F0006u);
// A queued read or job was cancelled before it ran.
inline constexpr QRT::Result kResult_Cancelled = static_cast<QRT::Result>(0xA00F0007u);

} // namespace ML
