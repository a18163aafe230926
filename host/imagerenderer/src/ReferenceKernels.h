#pragma once

// Plain reference twins of the fast kernels: one pixel at a time, in double
// precision, written for clarity. The tests run them beside the fast kernels on
// random, misaligned buffers and compare; nothing in the renderer calls them.

#include "IR/ImageRenderer.h"

#include <cstdint>

namespace IR::Reference
{

// Source over destination on BGRA buffers of one format (8-bit or float, straight or
// premultiplied, gamma-encoded values blended as stored).
void Composite(const void* inSrc, std::int32_t inSrcRowBytes, void* ioDst,
               std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
               std::int32_t inHeight, double inOpacity);

void CrossDissolve(const void* inA, std::int32_t inARowBytes, const void* inB,
                   std::int32_t inBRowBytes, void* outDst, std::int32_t inDstRowBytes,
                   IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
                   double inWeight);

void Accumulate(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                const double* inWeights, std::int32_t inCount, void* outDst,
                std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
                std::int32_t inHeight);

// The same on 8-bit BGRA (straight or premultiplied) in linear light, with the exact sRGB
// transfer: premultiplied colour is un-premultiplied before linearising (capped at alpha)
// and the sum is un-premultiplied by its clamped alpha before encoding.
void AccumulateLinear8(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                       const double* inWeights, std::int32_t inCount, void* outDst,
                       std::int32_t inDstRowBytes, bool inPremultiplied, std::int32_t inWidth,
                       std::int32_t inHeight);

// 8-bit association changes.
void PremultipliedToStraight8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                              std::uint8_t* outDst, std::int32_t inDstRowBytes,
                              std::int32_t inWidth, std::int32_t inHeight);
void StraightToPremultiplied8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                              std::uint8_t* outDst, std::int32_t inDstRowBytes,
                              std::int32_t inWidth, std::int32_t inHeight);

// Planar 4:2:0 (contiguous layout) to 8-bit BGRA.
void YUV420ToBGRA8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes, bool inMatrix601,
                   std::uint8_t* outDst, std::int32_t inDstRowBytes, std::int32_t inWidth,
                   std::int32_t inHeight);

// Normal-blend motion on 8-bit BGRA (nearest below quality 3, bilinear at 3 and 4),
// straight or premultiplied, all rows, onto a lower frame or a cleared destination.
void Motion8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes, std::int32_t inSrcWidth,
             std::int32_t inSrcHeight, std::uint8_t* ioDst, std::int32_t inDstRowBytes,
             std::int32_t inDstWidth, std::int32_t inDstHeight, bool inStraight,
             const IR_AffineMatrix& inMatrix, double inOpacity, std::int32_t inQuality,
             bool inHasLowerFrame);

// BGRA buffers of one transfer (8-bit or float, straight or premultiplied, any origin)
// scaled onto the whole destination: nearest below quality 3, bilinear, or area averaging
// at quality 5 where the picture shrinks, summing premultiplied values (ReferenceScale.cpp).
void ScaleConvert(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                  std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* outDst,
                  std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat, std::int32_t inDstWidth,
                  std::int32_t inDstHeight, std::int32_t inQuality);

// One blend of straight colours with alphas, the textbook way (with divisions):
// outputs premultiplied colour and alpha.
void BlendPixel(std::uint32_t inMode, const double inSrc[4], const double inDst[4],
                double outPremultiplied[4]);

} // namespace IR::Reference
