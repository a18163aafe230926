#pragma once

// Creation and copy-on-write of video frames (MF::IVideoFrame).
//
// Pixel memory comes from the process-wide frame memory pool
// (VF/FrameMemoryPool.h): creating a frame of a size made before reuses a
// recycled buffer, so steady-state rendering asks the system for no memory.
// Every function here may be called from any thread.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <array>
#include <cstddef>
#include <cstdint>

namespace VF
{

// Statuses of frame creation.
inline constexpr QRT::Result kResult_InvalidPixelFormat = static_cast<QRT::Result>(0xA0100001u);
inline constexpr QRT::Result kResult_InvalidFrameSize = static_cast<QRT::Result>(0xA0100002u);
inline constexpr QRT::Result kResult_OutOfFrameMemory = static_cast<QRT::Result>(0xA0100003u);

// Row alignment of every plane, in bytes.
inline constexpr size_t kRowAlignment = 64;
// Largest width or height a frame may have.
inline constexpr uint32_t kMaxFrameDimension = 32768;

// The memory layout of a frame of one format and size.
struct FrameLayout
{
    struct Plane
    {
        size_t mOffset = 0;    // from the start of the pixel memory; a multiple of 64
        int32_t mRowBytes = 0; // a multiple of 64
        uint32_t mRows = 0;
    };
    uint32_t mPlaneCount = 0;
    std::array<Plane, 3> mPlanes{};
    size_t mTotalBytes = 0;
};

// The layout of a frame (see the memory layout notes in MF/IVideoFrame.h).
// Answers kResult_InvalidPixelFormat for formats that are not an uncompressed
// raster (Invalid, Any, compressed), kResult_InvalidFrameSize for a zero or
// too large width or height, kResult_Success otherwise.
QRT::Result ComputeFrameLayout(mvxmediatypes::PixelFormat inFormat, uint32_t inWidth,
                               uint32_t inHeight, FrameLayout& outLayout);

// Creates a frame.
// - inClear: the pixels start as zero bytes (transparent black for RGB
//   formats); without it their content is whatever the recycled buffer held.
// - inTrackVisibleContent: the frame tracks its visible-content rectangle,
//   which starts empty (all zeros), and its pixels start cleared whatever
//   inClear says, since an empty visible rectangle promises that nothing has
//   been drawn. Compositing grows the rectangle as layers are drawn in, and a
//   layer whose rectangle stays empty is skipped.
// The frame starts unshared, field type progressive, alpha kind straight
// (premultiplied for premultiplied formats, none for formats without alpha),
// no origin offset, no full frame, render time 0.
// Answers the statuses of ComputeFrameLayout, kResult_OutOfFrameMemory when
// the memory cannot be had, and kResult_Success with the frame in outFrame;
// on failure outFrame is emptied.
QRT::Result CreateVideoFrame(mvxmediatypes::PixelFormat inFormat, uint32_t inWidth,
                             uint32_t inHeight, mvxmediatypes::PixelAspectRatio inRatio,
                             bool inClear, bool inTrackVisibleContent,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame);

// The same, answering the frame, or an empty reference on any failure.
QRT::InterfaceRef<MF::IVideoFrame> CreateVideoFrame(mvxmediatypes::PixelFormat inFormat,
                                                    uint32_t inWidth, uint32_t inHeight,
                                                    mvxmediatypes::PixelAspectRatio inRatio,
                                                    bool inClear, bool inTrackVisibleContent);

// Copy on write. Answers inFrame itself when nobody else can see it: it is not
// shared and the caller's reference is the only one. Otherwise answers a new,
// unshared frame with the same format, size, attributes (as CreateEmptyFrame,
// plus the visible-content rectangle and render time) and pixels. The
// original is never written. Every quality gives an exact copy. Input
// contract: "inFrame != NULL". Failure to get memory throws std::bad_alloc.
QRT::InterfaceRef<MF::IVideoFrame>
MakeWriteableVideoFrame(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                        mvxmediatypes::RenderQuality inQuality);

// Copies the pixels of inSource into inDestination row by row; both must have
// the same format and size. Input contracts: both given, destination not shared,
// equal format and bounds.
void CopyFramePixels(const MF::IVideoFrame& inSource, MF::IVideoFrame& inDestination);

} // namespace VF
