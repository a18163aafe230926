#pragma once

// Linear-light accumulation of 8-bit BGRA rows, fused: each source row is read as
// bytes, taken to linear light, weighted and summed in registers, and the sum goes
// back to 8-bit sRGB codes in the same pass, with no float row in memory. Written
// with Highway and chosen for the processor on first use; ReferenceKernels.h holds
// the double-precision twin the tests compare it against.

#include "Formats.h"

#include <cstdint>

namespace IR
{

// Linear-light accumulation of whole 8-bit BGRA buffers of one format (the quality-5
// path of IR_Accumulate): sources of weight zero are not read, and a single remaining
// source of weight one is copied, which is what the transfer there and back gives.
std::int32_t AccumulateLinear8(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                               const double* inWeights, std::int32_t inCount, void* outDst,
                               std::int32_t inDstRowBytes, const FormatInfo& inInfo,
                               std::int32_t inWidth, std::int32_t inHeight);

} // namespace IR

namespace IR::Simd
{

// outDst = sum of inWeights[i] * inRows[i] over inSources rows of inPixels pixels, in
// linear light: colour through the sRGB transfer, alpha as stored and clamped to 0..1.
// Premultiplied rows are un-premultiplied first (colour above alpha is taken as alpha),
// linearised, premultiplied again, summed, and the sum is un-premultiplied by its own
// alpha before encoding. Encoded results are within 0.02 of a code value of the exact
// transfer before rounding. Source rows may not overlap the destination unless they
// are the same row.
void AccumulateLinearRow8(const std::uint8_t* const* inRows, const float* inWeights,
                          std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels,
                          bool inPremultiplied);

} // namespace IR::Simd
