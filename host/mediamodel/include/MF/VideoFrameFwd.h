#pragma once

// Forward declaration of the media model's video frame interface. Frames are
// declared and made by the video frame library; the media model's interfaces
// only pass references to them.

namespace MF
{
class IVideoFrame;
} // namespace MF
