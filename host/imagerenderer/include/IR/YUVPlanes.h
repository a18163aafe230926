#pragma once

// Packing 8-bit pixels into planar 8-bit Y'CbCr, the layout of Y4M frames and
// of planar 4:2:0 video frames: a Y plane and a Cb and a Cr plane, each at its
// own address with its own row bytes. One pass over the source, vectorised
// for the processor (Highway, chosen on first use); safe from any thread.

#include "IR/ImageRenderer.h"

#include <cstdint>

// Converts inWidth x inHeight pixels of inSrcFormat into the three planes.
// - kIR_PixelFormat_BGRA_8u: video-range codes in 16.16 fixed point,
//   Y = 16 + 219 (Kr R + Kg G + Kb B) / 255, Cb = 128 + 224 (B - Y') / (2 (1 - Kb)) / 255,
//   Cr = 128 + 224 (R - Y') / (2 (1 - Kr)) / 255, with BT.601 (inMatrix601) or
//   BT.709 factors, each rounded to the nearest code; alpha is dropped.
// - kIR_PixelFormat_VUYA_4444_8u: the samples as they are (alpha dropped).
// With inSubsampled the chroma planes are 4:2:0, (inWidth + 1) / 2 by
// (inHeight + 1) / 2: each sample is (a + b + c + d + 2) / 4 of the per-pixel
// codes of its 2x2 block, the last column or row of an odd size standing in
// for its missing partner. Without it they are full size (4:4:4).
// Answers kIR_NoError, or kIR_UnsupportedFormat for any other source format,
// a size below 1 or a null plane.
std::int32_t IR_PackYUVPlanes(const void* inSrc, std::int32_t inSrcRowBytes,
                              IR_PixelFormat inSrcFormat, bool inMatrix601, std::uint8_t* outY,
                              std::int32_t inYRowBytes, std::uint8_t* outCb,
                              std::int32_t inCbRowBytes, std::uint8_t* outCr,
                              std::int32_t inCrRowBytes, bool inSubsampled, std::int32_t inWidth,
                              std::int32_t inHeight);
