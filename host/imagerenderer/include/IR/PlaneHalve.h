#pragma once

// Halving of 8-bit sample planes in both directions: one plane of a planar
// Y'CbCr frame (or any plane of one 8-bit sample per position) reduced to half
// its width and height. Vectorised for the processor (Highway, chosen on first
// use); safe from any thread; allocates nothing.

#include "IR/ImageRenderer.h"

#include <cstdint>

// outDst, inWidth x inHeight samples, from inSrc, 2 inWidth x 2 inHeight
// samples: each sample is the rounded mean (a + b + c + d + 2) / 4 of its 2x2
// block of source samples, which is what bilinear and area sampling give at
// exactly half size (the same rounding as the BGRA halving of IR_ScaleConvert).
// The 2x2 blocks of a 4:2:0 frame's chroma planes halved the same way stay
// centred between their luma samples. Row bytes past inWidth are not touched.
// Contract (MVX_INPUT_CONTRACT): both planes non-null, sizes >= 0,
// inSrcRowBytes >= 2 inWidth, inDstRowBytes >= inWidth; the planes do not
// overlap. A zero size does nothing. Answers kIR_NoError.
std::int32_t IR_HalvePlane8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                            std::uint8_t* outDst, std::int32_t inDstRowBytes, std::int32_t inWidth,
                            std::int32_t inHeight);
