#pragma once

// MF::IVideoFrame: one video frame: pixel memory plus the attributes the
// renderer reads and sets (pixel format, bounds, row bytes, pixel aspect
// ratio, field type, alpha kind, render time, origin offset, full-frame and
// visible-content rectangles, the shared mark). Frames are made by
// VF::CreateVideoFrame (VF/VideoFrame.h) and reached through
// QRT::InterfaceRef<MF::IVideoFrame>.
//
// Conventions for every operation below:
// - Threads: a frame that is not shared belongs to whoever made it and is used
//   by one thread at a time. A shared frame (MarkShared, done by the shared
//   frame cache on insertion) is immutable and may be read from any number of
//   threads at once; only the render time and the cached alpha analysis may
//   still change, and both are atomic.
// - Writing: every setter and every writable pixel pointer requires a frame
//   that is not shared (input contract "!IsShared()"). To write a frame that
//   others may see, take VF::MakeWriteableVideoFrame first.
// - Memory layout: plane 0 starts at the base address; every row of every
//   plane starts on a 64-byte boundary and row bytes are multiples of 64.
//   Packed formats (4:4:4 and 4:2:2 pixel pairs) have one plane. 4:2:0 formats
//   have three planes, Y then Cb then Cr, chroma planes of half width and half
//   height rounded up. Formats whose fields are stored apart keep one plane:
//   the first field's rows come first, then the second field's rows. A
//   horizontally halved format (pixel pairs, fields apart) counts its width in
//   stored pixel pairs of 4 bytes each. See VF::ComputeFrameLayout.

#include "QRT/InterfaceRef.h"
#include "QRT/Param.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstddef>
#include <cstdint>

namespace MF
{

// Both words of the origin offset equal to this means the frame has none.
inline constexpr uint32_t kNoOriginOffset = 0xFFFFFFFFu;

class IVideoFrame : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{5a2a4fe9-ee01-4438-8f14-aa8946104d5f}");

    // --- Format and memory ---------------------------------------------------
    virtual mvxmediatypes::PixelFormat GetPixelFormat() const noexcept = 0;
    // (0, 0, width, height).
    virtual QRT::ParamRect GetBounds() const noexcept = 0;
    // Row bytes of plane 0 (a positive multiple of 64).
    virtual int32_t GetRowBytes() const noexcept = 0;
    virtual uint32_t GetPlaneCount() const noexcept = 0;
    // Input contract: inPlane < GetPlaneCount().
    virtual int32_t GetPlaneRowBytes(uint32_t inPlane) const = 0;
    virtual const void* GetPlaneBaseAddress(uint32_t inPlane) const = 0;
    // Input contracts: inPlane < GetPlaneCount() and "!IsShared()".
    virtual void* GetWritablePlaneBaseAddress(uint32_t inPlane) = 0;
    // Plane 0, read-only; never null.
    virtual const void* GetBaseAddress() const noexcept = 0;
    // Plane 0 for writing. Input contract "!IsShared()".
    virtual void* GetWritableBaseAddress() = 0;
    // Bytes of pixel memory the layout uses (all planes, row padding included).
    virtual size_t GetDataSize() const noexcept = 0;

    // --- Attributes ------------------------------------------------------------
    virtual mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept = 0;
    virtual void SetPixelAspectRatio(mvxmediatypes::PixelAspectRatio inRatio) = 0;
    virtual mvxmediatypes::FieldType GetFieldType() const noexcept = 0;
    virtual void SetFieldType(mvxmediatypes::FieldType inFieldType) = 0;
    // How the alpha channel is to be read. New frames of formats with alpha
    // start straight (premultiplied for premultiplied formats), others none.
    virtual mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept = 0;
    virtual void SetAlphaChannel(mvxmediatypes::AlphaChannel inAlpha) = 0;
    // The alpha query: true when the pixel format stores an alpha channel and
    // the frame's alpha kind is neither none nor ignore.
    virtual bool HasAlpha() const noexcept = 0;
    // True when every alpha value is fully opaque (always true without an
    // alpha channel). The scan is done once and remembered until AlphaChanged.
    virtual bool IsAlphaOpaque() const = 0;
    // Called after the alpha values were changed in place: forgets the
    // remembered alpha analysis. Allowed on any frame.
    virtual void AlphaChanged() noexcept = 0;

    // Milliseconds the frame took to render (0 until set). Atomic: may be set
    // on a shared frame.
    virtual uint32_t GetRenderTime() const noexcept = 0;
    virtual void SetRenderTime(uint32_t inMilliseconds) noexcept = 0;

    // The offset of the wanted picture inside a larger frame, in pixels; both
    // words kNoOriginOffset when there is none (the default).
    virtual void GetOriginOffset(uint32_t& outX, uint32_t& outY) const noexcept = 0;
    virtual void SetOriginOffset(uint32_t inX, uint32_t inY) = 0;

    // --- Full frame and visible content ------------------------------------------
    // The full-frame query. inWhole 0: the frame carries full-frame bounds (it
    // is a rendering of, or a part of, a full frame whose rectangle it
    // records). inWhole 1: it carries them and its bounds equal them. Any other
    // value is an input contract violation.
    virtual bool HasFullFrame(int32_t inWhole) const = 0;
    // The recorded full-frame rectangle; all zeros when none.
    virtual QRT::ParamRect GetFullFrameRect() const noexcept = 0;
    // Records the full-frame rectangle; all zeros forgets it. Input contracts:
    // not shared; the rectangle is all zeros or not empty.
    virtual void SetFullFrameRect(const QRT::ParamRect& inRect) = 0;
    // The rectangle query: true when inRect lies inside the frame's bounds.
    virtual bool CanProvideRect(const QRT::ParamRect& inRect) const noexcept = 0;

    // True when the frame tracks which part of it holds drawn content (frames
    // made with the tracking flag of CreateVideoFrame). Frames that do not
    // track answer their bounds as the visible-content rectangle.
    virtual bool TracksVisibleContent() const noexcept = 0;
    // All zeros when a tracking frame holds nothing yet.
    virtual QRT::ParamRect GetVisibleContentRect() const noexcept = 0;
    // Sets the rectangle (clipped to the bounds) and starts tracking.
    virtual void SetVisibleContentRect(const QRT::ParamRect& inRect) = 0;
    // Grows a tracking frame's rectangle to the union with inRect (clipped to
    // the bounds); does nothing on a frame that does not track.
    virtual void GrowVisibleContentRect(const QRT::ParamRect& inRect) = 0;

    // --- Sharing -----------------------------------------------------------------
    // The marking operation: 1 marks the frame shared, after which it is never
    // written again. Sharing is one-way: 0 on a shared frame is an input
    // contract violation; 0 on a frame that is not shared does nothing.
    virtual void MarkShared(int32_t inShared) = 0;
    virtual bool IsShared() const noexcept = 0;

    // A new, unshared frame of the same format, size and attributes (field
    // type, pixel aspect ratio, alpha kind, origin offset, full frame; not the
    // render time nor the pixels). inClear zeroes its pixels.
    virtual QRT::InterfaceRef<IVideoFrame> CreateEmptyFrame(bool inClear) const = 0;

protected:
    ~IVideoFrame() = default;
};

// The row-bytes pixel-access interface: row bytes of plane 0.
class IVideoFrameRowBytes : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{282d21cf-d8da-4e4f-82be-6e9c176ca796}");
    virtual int32_t GetRowBytes() const noexcept = 0;

protected:
    ~IVideoFrameRowBytes() = default;
};

// The base-address pixel-access interface: the start of plane 0. The
// read-only address is always given; the writable one only for a frame that
// is not shared (input contract "!IsShared()" otherwise), so that nobody
// writes into a frame the cache hands to other threads.
class IVideoFrameBaseAddress : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{58d1d4d6-e9fb-4fe0-a8bc-3a3c7634eb3b}");
    virtual const void* GetBaseAddress() const noexcept = 0;
    virtual void* GetWritableBaseAddress() = 0;

protected:
    ~IVideoFrameBaseAddress() = default;
};

} // namespace MF
