// Fused linear-light accumulation of 8-bit BGRA rows (SimdAccumulate.h).
//
// Lanes are the bytes of the row as they lie (B, G, R, A, B, ...), one 32-bit lane
// per byte, so a pixel is four lanes and fills one 128-bit block. Every source is
// promoted, linearised and added into one float vector per block; the last partial
// block goes through stack copies, so the tail gets the arithmetic of the body.
//
// The transfer both ways without per-lane table reads where it can (gathers are slow
// on some processors):
// - encoded to linear light: the linear segment, else a degree-7 polynomial (within
//   0.01 of a code value once encoded again);
// - linear light in 0..1 to encoded: 4096 cells over 0..1, each a packed pair (value at
//   the cell's start in 1/256 code units, low half; its rise over the cell, high
//   half), read at 20-bit resolution and interpolated in integers. The encoder's curve
//   bends least where its cells are steepest (the linear segment), so the
//   interpolation stays within 0.01 of a code value.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdAccumulate.cpp"
#include "SimdAccumulate.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <vector>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

#ifndef IR_SIMD_ACCUMULATE_TABLES
#define IR_SIMD_ACCUMULATE_TABLES
namespace IR::Simd
{
namespace
{

constexpr int kCells = 4096;
// Linear light is read as round-down(v * 2^20): 12 bits of cell, 8 bits inside it.
constexpr float kEncodeScale = 1048576.0f;

// Encoded 0..1 to linear light above the linear segment: a degree-7 polynomial in
// t = (x - kCurveMid) * kCurveScale, Chebyshev-fitted on 0.04045..1; its error is at
// most 0.01 of a code value once encoded again.
constexpr float kLinearSegment = 0.04045f;
constexpr float kCurveScale = static_cast<float>(2.0 / (1.0 - 0.04045));
constexpr float kCurveMid = static_cast<float>((1.0 + 0.04045) / 2.0);
constexpr float kCurve[8] = {2.332421190e-01f,  4.668906385e-01f,  2.725536918e-01f,
                             3.033641574e-02f,  -3.610066338e-03f, 9.099971649e-04f,
                             -6.184238452e-04f, 2.964146868e-04f};

struct AccumulateTables
{
    std::int32_t linearToEncoded[kCells + 1];

    AccumulateTables()
    {
        const auto toEncoded = [](double inL)
        { return inL <= 0.0031308 ? inL * 12.92 : 1.055 * std::pow(inL, 1.0 / 2.4) - 0.055; };
        const auto fixedAt = [&](int inCell)
        { return std::lround(toEncoded(std::min(1.0, inCell / double(kCells))) * 255.0 * 256.0); };
        for (int i = 0; i <= kCells; ++i)
        {
            const long start = fixedAt(i);
            const long rise = i < kCells ? fixedAt(i + 1) - start : 0;
            linearToEncoded[i] = static_cast<std::int32_t>(start | (rise << 16));
        }
    }
};

const AccumulateTables& Tables()
{
    static const AccumulateTables sTables;
    return sTables;
}

} // namespace
} // namespace IR::Simd

#endif

HWY_BEFORE_NAMESPACE();
namespace IR::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback (processors without SSSE3) cannot hold a pixel in a vector:
// plain loops with the same curve, table and arithmetic.
inline float Clamp01(float inV)
{
    return std::min(std::max(inV, 0.0f), 1.0f);
}

inline std::int32_t EncodeFixed(float inLinear, const std::int32_t* inTable)
{
    const auto q = static_cast<std::int32_t>(inLinear * kEncodeScale);
    const std::int32_t packed = inTable[q >> 8];
    return ((packed & 0xFFFF) << 8) + (packed >> 16) * (q & 0xFF);
}

inline float ToLinear(float inX)
{
    if (inX <= kLinearSegment)
        return inX / 12.92f;
    const float t = (inX - kCurveMid) * kCurveScale;
    float p = kCurve[7];
    for (int k = 6; k >= 0; --k)
        p = p * t + kCurve[k];
    return p;
}

template <bool kPremultiplied>
void AccumulateLinear(const std::uint8_t* const* inRows, const float* inWeights,
                      std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
    const AccumulateTables& t = Tables();
    for (std::int32_t x = 0; x < 4 * inPixels; x += 4)
    {
        float sum[4] = {0.0f, 0.0f, 0.0f, 0.0f};
        for (std::int32_t s = 0; s < inSources; ++s)
        {
            const std::uint8_t* p = inRows[s] + x;
            const float a = p[3] * (1.0f / 255.0f);
            for (int c = 0; c < 3; ++c)
            {
                const float v = p[c] * (1.0f / 255.0f);
                const float linear = !kPremultiplied
                                         ? ToLinear(v)
                                         : (a > 0.0f ? ToLinear(Clamp01(v / a)) * a : 0.0f);
                sum[c] += inWeights[s] * linear;
            }
            sum[3] += inWeights[s] * a;
        }
        const float a = Clamp01(sum[3]);
        for (int c = 0; c < 3; ++c)
        {
            if (!kPremultiplied)
            {
                const std::int32_t fixed = EncodeFixed(Clamp01(sum[c]), t.linearToEncoded);
                outDst[x + c] = static_cast<std::uint8_t>((fixed + 32768) >> 16);
                continue;
            }
            const float straight = a > 0.0f ? Clamp01(sum[c] / a) : 0.0f;
            const float codes = float(EncodeFixed(straight, t.linearToEncoded)) / 65536.0f;
            outDst[x + c] = static_cast<std::uint8_t>(std::min(255.0f, codes * a + 0.5f));
        }
        outDst[x + 3] = static_cast<std::uint8_t>(a * 255.0f + 0.5f);
    }
}
#else

using DF = hn::ScalableTag<float>;
using DI = hn::RebindToSigned<DF>;
using D8 = hn::Rebind<std::uint8_t, DI>;
using VF = hn::Vec<DF>;
using VI = hn::Vec<DI>;

// Encoded values in 1/65536 code units of linear values already clamped to 0..1.
HWY_INLINE VI EncodeFixed(DF inDf, VF inLinear, const std::int32_t* inTable)
{
    const DI di;
    const VI q = hn::ConvertTo(di, hn::Mul(inLinear, hn::Set(inDf, kEncodeScale)));
    const VI packed = hn::GatherIndex(di, inTable, hn::ShiftRight<8>(q));
    const VI start = hn::And(packed, hn::Set(di, 0xFFFF));
    const VI rise = hn::ShiftRight<16>(packed);
    return hn::Add(hn::ShiftLeft<8>(start), hn::Mul(rise, hn::And(q, hn::Set(di, 0xFF))));
}

HWY_INLINE VF Clamp01(DF inDf, VF inV)
{
    return hn::Min(hn::Max(inV, hn::Zero(inDf)), hn::Set(inDf, 1.0f));
}

// Encoded values in 0..1 to linear light.
HWY_INLINE VF ToLinear(DF inDf, VF inX)
{
    const VF t = hn::Mul(hn::Sub(inX, hn::Set(inDf, kCurveMid)), hn::Set(inDf, kCurveScale));
    VF p = hn::Set(inDf, kCurve[7]);
    for (int k = 6; k >= 0; --k)
        p = hn::MulAdd(p, t, hn::Set(inDf, kCurve[k]));
    return hn::IfThenElse(hn::Le(inX, hn::Set(inDf, kLinearSegment)),
                          hn::Mul(inX, hn::Set(inDf, 1.0f / 12.92f)), p);
}

// Byte codes as linear light; alpha lanes as code / 255.
template <bool kPremultiplied>
HWY_INLINE VF Linearize(DF inDf, VI inCodes, hn::Mask<DF> inAlphaLane)
{
    const VF a = hn::Mul(hn::ConvertTo(inDf, inCodes), hn::Set(inDf, 1.0f / 255.0f));
    if constexpr (!kPremultiplied)
        return hn::IfThenElse(inAlphaLane, a, ToLinear(inDf, a));
    else
    {
        const VF alpha = hn::Broadcast<3>(a);
        const auto visible = hn::Gt(alpha, hn::Zero(inDf));
        const VF safe = hn::IfThenElse(visible, alpha, hn::Set(inDf, 1.0f));
        const VF straight = hn::IfThenElseZero(visible, Clamp01(inDf, hn::Div(a, safe)));
        return hn::IfThenElse(inAlphaLane, alpha, hn::Mul(ToLinear(inDf, straight), alpha));
    }
}

// The sum back to byte codes (alpha clamped to 0..1, colour encoded).
template <bool kPremultiplied>
HWY_INLINE VI Encode(DF inDf, VF inSum, hn::Mask<DF> inAlphaLane, const AccumulateTables& inT)
{
    const DI di;
    const VF half = hn::Set(inDf, 0.5f);
    const VF alpha = Clamp01(inDf, hn::Broadcast<3>(inSum));
    const VI alphaCode = hn::ConvertTo(di, hn::MulAdd(alpha, hn::Set(inDf, 255.0f), half));
    VI colourCode;
    if constexpr (!kPremultiplied)
    {
        const VI fixed = EncodeFixed(inDf, Clamp01(inDf, inSum), inT.linearToEncoded);
        colourCode = hn::ShiftRight<16>(hn::Add(fixed, hn::Set(di, 32768)));
    }
    else
    {
        const auto visible = hn::Gt(alpha, hn::Zero(inDf));
        const VF safe = hn::IfThenElse(visible, alpha, hn::Set(inDf, 1.0f));
        const VF straight = hn::IfThenElseZero(visible, Clamp01(inDf, hn::Div(inSum, safe)));
        const VI fixed = EncodeFixed(inDf, straight, inT.linearToEncoded);
        const VF codes = hn::Mul(hn::ConvertTo(inDf, fixed), hn::Set(inDf, 1.0f / 65536.0f));
        colourCode = hn::ConvertTo(di, hn::MulAdd(codes, alpha, half));
    }
    return hn::IfThenElse(hn::RebindMask(di, inAlphaLane), alphaCode, colourCode);
}

template <bool kPremultiplied>
void AccumulateLinear(const std::uint8_t* const* inRows, const float* inWeights,
                      std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
    const DF df;
    const DI di;
    const D8 d8;
    const AccumulateTables& tables = Tables();
    const std::size_t n = hn::Lanes(df);
    const auto alphaLane =
        hn::RebindMask(df, hn::Eq(hn::And(hn::Iota(di, 0), hn::Set(di, 3)), hn::Set(di, 3)));
    const std::size_t bytes = 4 * static_cast<std::size_t>(inPixels);
    // One block of n bytes at offset inAt; inTail bytes (< n) when it is the last partial one.
    const auto block = [&](std::size_t inAt, std::size_t inTail)
    {
        VF sum = hn::Zero(df);
        alignas(64) std::uint8_t part[HWY_MAX_BYTES];
        for (std::int32_t s = 0; s < inSources; ++s)
        {
            const std::uint8_t* from = inRows[s] + inAt;
            if (inTail != 0)
            {
                std::memset(part, 0, sizeof part);
                std::memcpy(part, from, inTail);
                from = part;
            }
            const VI codes = hn::PromoteTo(di, hn::LoadU(d8, from));
            sum = hn::MulAdd(hn::Set(df, inWeights[s]),
                             Linearize<kPremultiplied>(df, codes, alphaLane), sum);
        }
        const auto out = hn::DemoteTo(d8, Encode<kPremultiplied>(df, sum, alphaLane, tables));
        if (inTail == 0)
        {
            hn::StoreU(out, d8, outDst + inAt);
            return;
        }
        hn::StoreU(out, d8, part);
        std::memcpy(outDst + inAt, part, inTail);
    };
    std::size_t i = 0;
    for (; i + n <= bytes; i += n)
        block(i, 0);
    if (i < bytes)
        block(i, bytes - i);
}

#endif

void AccumulateLinearStraight(const std::uint8_t* const* inRows, const float* inWeights,
                              std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
    AccumulateLinear<false>(inRows, inWeights, inSources, outDst, inPixels);
}

void AccumulateLinearPremultiplied(const std::uint8_t* const* inRows, const float* inWeights,
                                   std::int32_t inSources, std::uint8_t* outDst,
                                   std::int32_t inPixels)
{
    AccumulateLinear<true>(inRows, inWeights, inSources, outDst, inPixels);
}

} // namespace IR::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::Simd
{

HWY_EXPORT(AccumulateLinearStraight);
HWY_EXPORT(AccumulateLinearPremultiplied);

void AccumulateLinearRow8(const std::uint8_t* const* inRows, const float* inWeights,
                          std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels,
                          bool inPremultiplied)
{
    if (inPremultiplied)
    {
        HWY_DYNAMIC_DISPATCH(AccumulateLinearPremultiplied)
        (inRows, inWeights, inSources, outDst, inPixels);
        return;
    }
    HWY_DYNAMIC_DISPATCH(AccumulateLinearStraight)(inRows, inWeights, inSources, outDst, inPixels);
}

} // namespace IR::Simd

namespace IR
{

std::int32_t AccumulateLinear8(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                               const double* inWeights, std::int32_t inCount, void* outDst,
                               std::int32_t inDstRowBytes, const FormatInfo& inInfo,
                               std::int32_t inWidth, std::int32_t inHeight)
{
    std::vector<View> views;
    std::vector<float> weights;
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        if (inWeights[i] == 0.0)
            continue;
        views.push_back(MakeView(inSrcs[i], inSrcRowBytes[i], inInfo, inHeight));
        weights.push_back(static_cast<float>(inWeights[i]));
    }
    const View dst = MakeView(outDst, inDstRowBytes, inInfo, inHeight);
    const auto bytes = static_cast<std::size_t>(inWidth) * 4;
    const bool copy = views.size() == 1 && weights[0] == 1.0f;
    const bool premultiplied = inInfo.alpha == Alpha::kPremultiplied;
    std::vector<const std::uint8_t*> rows(views.size());
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        for (std::size_t i = 0; i < views.size(); ++i)
            rows[i] = views[i].Row(y);
        if (copy)
        {
            if (rows[0] != dst.Row(y))
                std::memmove(dst.Row(y), rows[0], bytes);
            continue;
        }
        Simd::AccumulateLinearRow8(rows.data(), weights.data(),
                                   static_cast<std::int32_t>(rows.size()), dst.Row(y), inWidth,
                                   premultiplied);
    }
    return kIR_NoError;
}

} // namespace IR
#endif
