#pragma once

// Pixel formats of the media types' catalogue seen from the image renderer:
// which IR pixel format describes a frame's memory, and the IR-side
// description of a frame's pixel buffer (base address, row bytes, IR format,
// width, height) that the IR_* calls take.
//
// Plain functions; safe from any thread. A frame's buffer description is only
// as stable as the frame: hold the frame while the description is used.

#include "IR/ImageRenderer.h"
#include "MF/IVideoFrame.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace VF
{

// The answer for a catalogue format the image renderer cannot address
// directly (bits 2 and 3 together are never a valid IR format).
inline constexpr IR_PixelFormat kIR_PixelFormat_Invalid = 0xFFFFFFFFu;

// The IR format whose memory layout is that of inFormat:
//   BGRA_4444_8u          -> kIR_PixelFormat_BGRA_8u (straight alpha)
//   BGRA_4444_32f         -> kIR_PixelFormat_BGRA_32f (straight alpha)
//   BGRP_4444_32f_Linear  -> kIR_PixelFormat_BGRP_32f_Linear (premultiplied, linear)
//   VUYA_4444_8u          -> kIR_PixelFormat_VUYA_4444_8u
//   YUYV_422_8u           -> kIR_PixelFormat_YUYV_422_8u
// Every other format (16-bit samples, float Y'CbCr, fields stored apart,
// compressed, Any, Invalid) answers kIR_PixelFormat_Invalid; the frame
// manipulators reach those through a staging copy.
IR_PixelFormat BEPixelFormatToIRPixelFormat(mvxmediatypes::PixelFormat inFormat);

// A frame's plane 0 as the image renderer sees it. mFormat is
// kIR_PixelFormat_Invalid when the frame's format has no IR equivalent; the
// other fields are filled all the same.
struct IRFrameBuffer
{
    const void* mBase = nullptr;
    int32_t mRowBytes = 0;
    IR_PixelFormat mFormat = kIR_PixelFormat_Invalid;
    int32_t mWidth = 0;
    int32_t mHeight = 0;

    bool IsAddressable() const { return mFormat != kIR_PixelFormat_Invalid; }
};

// The same for writing.
struct IRWritableFrameBuffer
{
    void* mBase = nullptr;
    int32_t mRowBytes = 0;
    IR_PixelFormat mFormat = kIR_PixelFormat_Invalid;
    int32_t mWidth = 0;
    int32_t mHeight = 0;

    bool IsAddressable() const { return mFormat != kIR_PixelFormat_Invalid; }
};

IRFrameBuffer GetIRFrameBuffer(const MF::IVideoFrame& inFrame);
// Input contract: "!inFrame.IsShared()" (a shared frame is never written).
IRWritableFrameBuffer GetWritableIRFrameBuffer(MF::IVideoFrame& inFrame);

} // namespace VF
