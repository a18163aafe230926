#pragma once

// Weighted sums of 8-bit sample planes: one plane of several planar Y'CbCr
// frames (a Y, Cb or Cr plane, or any other plane of one 8-bit sample per
// position) summed into the same plane of a destination. Vectorised for the
// processor (Highway, chosen on first use); safe from any thread; no memory is
// allocated once the transient pool is warm.

#include "IR/ImageRenderer.h"

#include <cstdint>

// outDst = sum of inWeights[i] * inSrcs[i] over inCount planes of inWidth x
// inHeight samples, each with its own row bytes.
//
// The samples are summed as they are stored, at every quality: the planes of
// planar Y'CbCr hold gamma-encoded luma and colour differences, which have no
// linear-light form one plane at a time, so a blend of planar frames mixes their
// codes (what the BGRA mixing operations do below quality 5).
//
// Arithmetic: the weights are taken in steps of 1/65536 (each step count is the
// difference of the rounded running sums, so the steps add up to the rounded
// sum of the weights); each weighted sample is truncated to 1/256 of a code value
// and the sum is rounded to nearest, halves up. Every result is within
// 0.5 + inCount / 128 of the exact weighted sum, and exact halves of two
// samples (weights 0.5 and 0.5) give (a + b + 1) / 2. Sources of weight zero are
// not read; a single source of weight one is copied.
//
// A source row may be the destination row itself (in place); other overlaps are
// not allowed. Row bytes past inWidth are not touched. Contract
// (MVX_INPUT_CONTRACT): inCount >= 1; the arrays, every source and the
// destination non-null; sizes >= 0; every row bytes >= inWidth; weights finite,
// 0..1, summing to at most 1 (within 1e-6). A zero size does nothing. Answers
// kIR_NoError, or kIR_OutOfMemory when more than 16 sources need scratch memory
// the pool cannot give.
std::int32_t IR_AccumulatePlane8(const std::uint8_t* const* inSrcs,
                                 const std::int32_t* inSrcRowBytes, const double* inWeights,
                                 std::int32_t inCount, std::uint8_t* outDst,
                                 std::int32_t inDstRowBytes, std::int32_t inWidth,
                                 std::int32_t inHeight);
