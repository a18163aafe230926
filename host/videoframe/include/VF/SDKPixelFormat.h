#pragma once

// The pixel formats of the plug-in SDK and their conversion to and from the
// media types' catalogue.
//
// An SDK pixel format (OvPixelFormat) is a 32-bit code of four characters,
// the first in the lowest byte (as written by MakeOvPixelFormat). The codes
// are part of the plug-in boundary and never change. Each code stands for
// exactly one catalogue format and back:
//
//   code     constant                               catalogue format
//   "BGRA"   kOvPixelFormat_BGRA_4444_8u            BGRA_4444_8u
//   "B16u"   kOvPixelFormat_BGRA_4444_16u           BGRA_4444_16u
//   "B16f"   kOvPixelFormat_BGRA_4444_16f           BGRA_4444_16f
//   "B32f"   kOvPixelFormat_BGRA_4444_32f           BGRA_4444_32f
//   "BPLf"   kOvPixelFormat_BGRP_4444_32f_Linear    BGRP_4444_32f_Linear
//   "VUYA"   kOvPixelFormat_VUYA_4444_8u            VUYA_4444_8u
//   "V32f"   kOvPixelFormat_VUYA_4444_32f           VUYA_4444_32f
//   "YUY2"   kOvPixelFormat_YUYV_422_8u             YUYV_422_8u
//   "YUYF"   kOvPixelFormat_YUYV_422_8u_Fields      YUYV_422_8u_Fields
//   "YUYH"   kOvPixelFormat_YUYV_422_8u_HalfWidthFields YUYV_422_8u_HalfWidthFields
//   "MJPG"   kOvPixelFormat_MJPG_422_Compressed     MJPG_422_Compressed
//
// Any other code (kOvPixelFormat_Invalid, the query preset
// kOvPixelFormat_Unset, unknown codes) is invalid and converts to
// kPixelFormat_Invalid; a catalogue format without a code (Any, Invalid,
// formats outside the catalogue) converts to kOvPixelFormat_Invalid.
// Plain functions; safe from any thread.

#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace VF
{

using OvPixelFormat = uint32_t;

constexpr OvPixelFormat MakeOvPixelFormat(char inA, char inB, char inC, char inD)
{
    return mvxmediatypes::MakePixelFormatCode(inA, inB, inC, inD);
}

inline constexpr OvPixelFormat kOvPixelFormat_Invalid = 0;
// The value a format query record is preset with, so that an answer that
// leaves it unchanged is recognised. Never a valid format.
inline constexpr OvPixelFormat kOvPixelFormat_Unset = MakeOvPixelFormat('b', 'a', 'd', 'f');

inline constexpr OvPixelFormat kOvPixelFormat_BGRA_4444_8u = MakeOvPixelFormat('B', 'G', 'R', 'A');
inline constexpr OvPixelFormat kOvPixelFormat_BGRA_4444_16u = MakeOvPixelFormat('B', '1', '6', 'u');
inline constexpr OvPixelFormat kOvPixelFormat_BGRA_4444_16f = MakeOvPixelFormat('B', '1', '6', 'f');
inline constexpr OvPixelFormat kOvPixelFormat_BGRA_4444_32f = MakeOvPixelFormat('B', '3', '2', 'f');
inline constexpr OvPixelFormat kOvPixelFormat_BGRP_4444_32f_Linear =
    MakeOvPixelFormat('B', 'P', 'L', 'f');
inline constexpr OvPixelFormat kOvPixelFormat_VUYA_4444_8u = MakeOvPixelFormat('V', 'U', 'Y', 'A');
inline constexpr OvPixelFormat kOvPixelFormat_VUYA_4444_32f = MakeOvPixelFormat('V', '3', '2', 'f');
inline constexpr OvPixelFormat kOvPixelFormat_YUYV_422_8u = MakeOvPixelFormat('Y', 'U', 'Y', '2');
inline constexpr OvPixelFormat kOvPixelFormat_YUYV_422_8u_Fields =
    MakeOvPixelFormat('Y', 'U', 'Y', 'F');
inline constexpr OvPixelFormat kOvPixelFormat_YUYV_422_8u_HalfWidthFields =
    MakeOvPixelFormat('Y', 'U', 'Y', 'H');
inline constexpr OvPixelFormat kOvPixelFormat_MJPG_422_Compressed =
    MakeOvPixelFormat('M', 'J', 'P', 'G');

// True for the eleven codes of the table.
bool IsValidSDKPixelFormat(OvPixelFormat inFormat);
// The catalogue format of a code; kPixelFormat_Invalid for an invalid code.
mvxmediatypes::PixelFormat SDKToBEPixelFormat(OvPixelFormat inFormat);
// The code of a catalogue format; kOvPixelFormat_Invalid when it has none.
OvPixelFormat BEToSDKPixelFormat(mvxmediatypes::PixelFormat inFormat);

} // namespace VF
