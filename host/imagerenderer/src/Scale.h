#pragma once

// Filter taps of the image renderer's scaling and the vectorised BGRA scaler behind
// IR_ScaleConvert. Nearest sampling below quality 3, bilinear at 3 and 4, area averaging
// (a box filter) at 5 where the picture shrinks, bilinear where it grows.

#include "Formats.h"

#include <cstdint>
#include <vector>

namespace IR
{

// Most taps any output position of a scale from inSrc to inDst samples uses.
std::int32_t MaxScaleTaps(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality);

// Taps of output position inI: source samples [outFirst, outFirst + outCount) with
// outWeights[0 .. outCount), summing to 1; outWeights has room for MaxScaleTaps values and
// those past outCount are set to 0.
void ScaleTapsAt(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality, std::int32_t inI,
                 std::int32_t& outFirst, std::int32_t& outCount, float* outWeights);

// The taps of every output position.
struct Taps
{
    std::vector<std::int32_t> first;
    std::vector<std::int32_t> count;
    std::vector<float> weights; // maxCount per output position
    std::int32_t maxCount = 1;
};

Taps MakeTaps(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality);

// The fast path of IR_ScaleConvert for checked arguments with different sizes: BGRA
// source and destination (8-bit or float, straight or premultiplied, any origin) of one
// transfer, any sampling (nearest is a filter of one tap). Filters in premultiplied float: straight
// sources are premultiplied per sample as the horizontal pass reads them, straight destinations
// un-premultiplied per pixel as the vertical pass writes them (skipped for vectors of
// opaque pixels); there are no whole-frame association passes. 8-bit results are within
// one code value of exact arithmetic. Answers false, having written nothing, for any
// other call; else true with the status in outStatus.
bool ScaleConvertBGRA(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                      std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* outDst,
                      std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                      std::int32_t inDstWidth, std::int32_t inDstHeight, std::int32_t inQuality,
                      std::int32_t& outStatus);

} // namespace IR
