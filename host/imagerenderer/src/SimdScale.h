#pragma once

// Explicitly vectorised scaling kernels (Highway, chosen for the processor on first use)
// behind the BGRA fast path of IR_ScaleConvert (Scale.cpp). The scale is separable: a
// horizontal pass filters one source row into planar float rows (one plane per channel,
// B, G, R, A, in premultiplied terms), and a vertical pass mixes a few such rows into one
// destination row. Taps are padded: every output position has the same number of taps
// (missing ones weigh 0) and the tap tables and planes hold a multiple of kScaleLanePad
// positions, so the kernels run whole vectors only and need no tails on the planes.

#include <cstddef>
#include <cstdint>

namespace IR::Simd
{

// Positions of planes and tap tables are padded to a multiple of this (the widest vector
// of floats of any target).
inline constexpr std::int32_t kScaleLanePad = 64;

// Horizontal taps of one row, table-driven: output position x sums taps samples, tap t at
// source pixel columns[t * stride + x] with weight weights[t * stride + x]. Columns never
// decrease with x, and for one x they are smallest at tap 0 and largest at the last tap.
struct RowTaps
{
    const std::int32_t* columns = nullptr;
    const float* weights = nullptr;
    std::int32_t taps = 0;
    // Positions per tap (the padded output width).
    std::int32_t stride = 0;
    // Pixels of the source row.
    std::int32_t sourceWidth = 0;
};

// One row of 8-bit B, G, R, A pixels (inRow 4-byte aligned) into four planes at
// outPlanes, outPlanes + inTaps.stride, ... in code values 0..255. With inPremultiply
// (straight sources) each sample's colour is multiplied by its alpha / 255 before it is
// weighed.
void ScaleRowHorizontal8(const std::uint8_t* inRow, const RowTaps& inTaps, bool inPremultiply,
                         float* outPlanes);

// The same from a row of float B, G, R, A pixels, in the source's own units.
void ScaleRowHorizontal32f(const float* inRow, const RowTaps& inTaps, bool inPremultiply,
                           float* outPlanes);

// Vertical mix of inTaps planar rows inRows[t] (each four planes inStride apart) with
// weights inWeights[t] into inCount destination pixels. Planes hold premultiplied values
// whose opaque alpha is inUnit; the result is multiplied by inScale into the destination's
// units. With inUnpremultiply colour is divided by alpha (colour 0 where alpha is 0),
// skipped for vectors whose alphas are all opaque.
struct ColumnTaps
{
    const float* const* rows = nullptr;
    const float* weights = nullptr;
    std::int32_t taps = 0;
    std::size_t stride = 0;
    float unit = 1.0f;
    float scale = 1.0f;
    bool unpremultiply = false;
};

// 8-bit destination: rounded to nearest and clamped to 0..255. No alignment needed.
void ScaleRowVertical8(const ColumnTaps& inTaps, std::uint8_t* outRow, std::int32_t inCount);
// Float destination (4-byte aligned).
void ScaleRowVertical32f(const ColumnTaps& inTaps, float* outRow, std::int32_t inCount);

// Exact halving of 8-bit rows in both directions: output pixel i is, per byte, the rounded
// mean (sum + 2) / 4 of pixels 2i and 2i + 1 of inTop and of inBottom (each holding
// 2 * inCount pixels), which is what bilinear and area sampling give at exactly half size.
// With inOpaqueOnly it stops at the first vector of source pixels with an alpha below 255
// and answers false, the row then partly written; else it answers true.
bool HalveRows8(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
                std::int32_t inCount, bool inOpaqueOnly);

} // namespace IR::Simd
