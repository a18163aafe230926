#pragma once

// Explicitly vectorised 8-bit row kernels (Highway, chosen for the processor on first
// use). Kernels.cpp routes its hot entry points here; the scalar twins in
// ReferenceKernels.h are what the tests compare them against. Rows are B, G, R, A
// bytes with no alignment requirement; every kernel may run in place.

#include <cstdint>

namespace IR::Simd
{

// Premultiplied over premultiplied at full opacity: d = s + d * (255 - sa) / 255 with
// the exact rounded division by 255, saturating at 255.
void OverPremultipliedOpaqueRow8(const std::uint8_t* inSrc, std::uint8_t* ioDst,
                                 std::int32_t inCount);

// Source over destination in float arithmetic for any association pair and opacity.
void OverRow8(bool inSrcStraight, bool inDstStraight, const std::uint8_t* inSrc,
              std::uint8_t* ioDst, std::int32_t inCount, float inOpacity);

// Association changes; un-premultiplying gives colour 0 where alpha is 0.
void StraightToPremultipliedRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount);
void PremultipliedToStraightRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount);

// Per byte: (a * (256 - w) + b * w + 128) >> 8 with inWeight w in 0..256.
void MixRows8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
              std::int32_t inBytes, std::uint32_t inWeight);

// Horizontal bilinear taps of one row of premultiplied pixels: output pixel i mixes
// pixels k * i and k * i + 1 of inRow (k = inStride, 1 or 2) per byte with
// (p * (256 - w) + q * w + 128) >> 8, w = inWeight in 0..255, so inRow must hold
// k * (inCount - 1) + 2 pixels. With inOverPremultiplied the samples are composited over
// the premultiplied destination at full opacity (as OverPremultipliedOpaqueRow8), else
// stored. The destination must not overlap inRow.
void MixPixelPairsRow8(const std::uint8_t* inRow, std::int32_t inStride, std::uint32_t inWeight,
                       std::uint8_t* ioDst, std::int32_t inCount, bool inOverPremultiplied);

// The same with a pair and a weight per output pixel: pixels inColumns[i] and
// inColumns[i] + 1 of inRow (columns may be negative where inRow has pixels before it;
// inRow must be 4-byte aligned) with weight inWeights[i].
void MixGatheredPairsRow8(const std::uint8_t* inRow, const std::int32_t* inColumns,
                          const std::uint32_t* inWeights, std::uint8_t* ioDst, std::int32_t inCount,
                          bool inOverPremultiplied);

// One row of 4:2:0 to opaque BGRA. inCoefficients are the 16.16 fixed-point factors
// {luma, Cr->R, Cb->G, Cr->G, Cb->B} on video-range codes.
void YUV420ToBGRARow8(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                      std::uint8_t* outDst, std::int32_t inWidth,
                      const std::int32_t inCoefficients[5]);

} // namespace IR::Simd
