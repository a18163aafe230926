#pragma once

// Fast row kernels of the image renderer. Each works on one row of contiguous
// pixels, has no per-pixel branches on format, and is chosen once per call by the
// operation. Each has a plain reference twin in ReferenceKernels.h; the tests run
// both on random, misaligned rows of odd widths and compare them.
//
// 8-bit pixels are B, G, R, A bytes; float pixels are B, G, R, A floats.

#include <cstdint>

namespace IR::Kernels
{

// Source over destination on 8-bit rows; the source scaled by inOpacity (0..1).
// The template choices (straight or premultiplied source and destination) are made
// by SelectOverRow8.
using OverRow8Fn = void (*)(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                            float inOpacity);
OverRow8Fn SelectOverRow8(bool inSrcStraight, bool inDstStraight);

// The same on float rows (no clamping).
using OverRowFFn = void (*)(const float* inSrc, float* ioDst, std::int32_t inCount,
                            float inOpacity);
OverRowFFn SelectOverRowF(bool inSrcStraight, bool inDstStraight);

// dst = src scaled by the opacity (the "cleared destination" case of motion); source and
// destination share one association (straight: alpha scales; premultiplied: all scale).
void CopyScaledRow8(const std::uint8_t* inSrc, std::uint8_t* outDst, std::int32_t inCount,
                    float inOpacity, bool inStraight);

// dst = (1 - w) * a + w * b per byte, with w quantised to 1/256 (error at most one code value).
void CrossDissolveRow8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
                       std::int32_t inBytes, float inWeight);
void CrossDissolveRowF(const float* inA, const float* inB, float* outDst, std::int32_t inFloats,
                       float inWeight);

// acc += w * src over inCount values.
void AccumulateRow8(const std::uint8_t* inSrc, float* ioAcc, std::int32_t inCount, float inWeight);
void AccumulateRowF(const float* inSrc, float* ioAcc, std::int32_t inCount, float inWeight);
// Rounds and clamps accumulated values to bytes.
void StoreRow8(const float* inAcc, std::uint8_t* outDst, std::int32_t inCount);

// 8-bit -> float (/255) and float -> 8-bit (round, clamp), per component.
void Row8ToF(const std::uint8_t* inSrc, float* outDst, std::int32_t inCount);
void RowFTo8(const float* inSrc, std::uint8_t* outDst, std::int32_t inCount);

// 8-bit association changes (pixels); may run in place.
void PremultipliedToStraightRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount);
void StraightToPremultipliedRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount);

// One row of planar 4:2:0 (luma row, its chroma rows) to 8-bit BGRA with opaque
// alpha; inMatrix601 picks the matrix.
void YUV420ToBGRARow8(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                      std::uint8_t* outDst, std::int32_t inWidth, bool inMatrix601);

// Over opaque black in place; answers whether any alpha was below 255 (or 1.0).
bool ToBlackRow8(std::uint8_t* ioRow, std::int32_t inCount, float inOpacity, bool inStraight);
bool ToBlackRowF(float* ioRow, std::int32_t inCount, float inOpacity, bool inStraight);

} // namespace IR::Kernels
