#pragma once

// Statuses of the back end's media: opening files and pattern texts, and
// reading frames. Negative values are failures (QRT::Result).

#include "QRT/Result.h"

namespace BE
{

// The file does not exist or cannot be read.
inline constexpr QRT::Result kResult_MediaCannotOpen = static_cast<QRT::Result>(0xA0180001u);
// The file is of a known kind but damaged, truncated or inconsistent.
inline constexpr QRT::Result kResult_MediaMalformed = static_cast<QRT::Result>(0xA0180002u);
// The file is well formed but uses something this back end does not read
// (an unknown extension, a bit depth or chroma layout it cannot decode).
inline constexpr QRT::Result kResult_MediaUnsupported = static_cast<QRT::Result>(0xA0180003u);
// A "pattern:" text that cannot be parsed.
inline constexpr QRT::Result kResult_BadPattern = static_cast<QRT::Result>(0xA0180004u);
// The requested time lies before the first or after the last frame of the media.
inline constexpr QRT::Result kResult_FrameOutOfRange = static_cast<QRT::Result>(0xA0180005u);
// A frame request with kFrameRequestFlag_NoBlock found no frame that is ready
// without blocking (the frame is neither decoded nor held).
inline constexpr QRT::Result kResult_FrameNotReady = QRT::kResult_NotFound;

} // namespace BE
