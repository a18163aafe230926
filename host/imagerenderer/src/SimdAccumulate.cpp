// Fused linear-light accumulation of 8-bit BGRA rows (SimdAccumulate.h).
//
// Lanes are the bytes of the row as they lie (B, G, R, A, B, ...), one 32-bit lane
// per byte, so a pixel is four lanes and fills one 128-bit block. Every source is
// promoted, linearised and added into one float vector per block; the last partial
// block goes through stack copies, so the tail gets the arithmetic of the body.
//
// The transfer both ways is computed, with no table reads (gathers are slow on some
// processors):
// - encoded to linear light: the linear segment, else a degree-7 polynomial in the
//   encoded value (within 0.01 of a code value once encoded again);
// - linear light to encoded: the linear segment, else a degree-6 polynomial in the
//   fourth root of the linear value (two square roots), within 0.001 of a code value.
// Both are Chebyshev fits on the curved part of the transfer.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdAccumulate.cpp"
#include "SimdAccumulate.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <vector>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

#ifndef IR_SIMD_ACCUMULATE_CURVES
#define IR_SIMD_ACCUMULATE_CURVES
namespace IR::Simd
{
namespace
{

// A polynomial in t = (x - mid) * scale, coefficients from the constant term up.
template <int kTerms>
struct Curve
{
    float mid;
    float scale;
    float terms[kTerms];
};

constexpr float kDecodeLinearEnd = 0.04045f;
constexpr float kEncodeLinearEnd = 0.0031308f;
// Encoded x in 0.04045..1 to linear light.
constexpr Curve<8> kDecode = {static_cast<float>((1.0 + 0.04045) / 2.0),
                              static_cast<float>(2.0 / (1.0 - 0.04045)),
                              {2.332421190e-01f, 4.668906385e-01f, 2.725536918e-01f,
                               3.033641574e-02f, -3.610066338e-03f, 9.099971649e-04f,
                               -6.184238452e-04f, 2.964146868e-04f}};
// The fourth root q of linear light in 0.0031308..1 to the encoded value.
constexpr double kQuarterStart = 0.2365450320046059;
constexpr Curve<7> kEncode = {static_cast<float>((1.0 + kQuarterStart) / 2.0),
                              static_cast<float>(2.0 / (1.0 - kQuarterStart)),
                              {4.183899443e-01f, 4.871176182e-01f, 1.002556593e-01f,
                               -6.812332791e-03f, 1.387697313e-03f, -5.287540371e-04f,
                               1.910060662e-04f}};

} // namespace
} // namespace IR::Simd
#endif

HWY_BEFORE_NAMESPACE();
namespace IR::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback (processors without SSSE3) cannot hold a pixel in a vector:
// plain loops with the same curves and arithmetic.
inline float Clamp01(float inV)
{
    return std::min(std::max(inV, 0.0f), 1.0f);
}

template <int kTerms>
float Evaluate(const Curve<kTerms>& inCurve, float inX)
{
    const float t = (inX - inCurve.mid) * inCurve.scale;
    float p = inCurve.terms[kTerms - 1];
    for (int k = kTerms - 2; k >= 0; --k)
        p = p * t + inCurve.terms[k];
    return p;
}

inline float ToLinear(float inX)
{
    return inX <= kDecodeLinearEnd ? inX * (1.0f / 12.92f) : Evaluate(kDecode, inX);
}

inline float ToEncoded(float inL)
{
    return inL <= kEncodeLinearEnd ? inL * 12.92f : Evaluate(kEncode, std::sqrt(std::sqrt(inL)));
}

template <bool kPremultiplied>
void AccumulateLinear(const std::uint8_t* const* inRows, const float* inWeights,
                      std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
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
            const float straight =
                !kPremultiplied ? Clamp01(sum[c]) : (a > 0.0f ? Clamp01(sum[c] / a) : 0.0f);
            const float scale = !kPremultiplied ? 255.0f : 255.0f * a;
            outDst[x + c] = static_cast<std::uint8_t>(ToEncoded(straight) * scale + 0.5f);
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

HWY_INLINE VF Clamp01(DF inDf, VF inV)
{
    return hn::Min(hn::Max(inV, hn::Zero(inDf)), hn::Set(inDf, 1.0f));
}

template <int kTerms>
HWY_INLINE VF Evaluate(DF inDf, const Curve<kTerms>& inCurve, VF inX)
{
    const VF t = hn::Mul(hn::Sub(inX, hn::Set(inDf, inCurve.mid)), hn::Set(inDf, inCurve.scale));
    VF p = hn::Set(inDf, inCurve.terms[kTerms - 1]);
    for (int k = kTerms - 2; k >= 0; --k)
        p = hn::MulAdd(p, t, hn::Set(inDf, inCurve.terms[k]));
    return p;
}

// Encoded values in 0..1 to linear light, and back.
HWY_INLINE VF ToLinear(DF inDf, VF inX)
{
    return hn::IfThenElse(hn::Le(inX, hn::Set(inDf, kDecodeLinearEnd)),
                          hn::Mul(inX, hn::Set(inDf, 1.0f / 12.92f)), Evaluate(inDf, kDecode, inX));
}

HWY_INLINE VF ToEncoded(DF inDf, VF inL)
{
    return hn::IfThenElse(hn::Le(inL, hn::Set(inDf, kEncodeLinearEnd)),
                          hn::Mul(inL, hn::Set(inDf, 12.92f)),
                          Evaluate(inDf, kEncode, hn::Sqrt(hn::Sqrt(inL))));
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
HWY_INLINE VI Encode(DF inDf, VF inSum, hn::Mask<DF> inAlphaLane)
{
    const DI di;
    const VF alpha = Clamp01(inDf, hn::Broadcast<3>(inSum));
    VF straight = Clamp01(inDf, inSum);
    VF scale = hn::Set(inDf, 255.0f);
    if constexpr (kPremultiplied)
    {
        const auto visible = hn::Gt(alpha, hn::Zero(inDf));
        const VF safe = hn::IfThenElse(visible, alpha, hn::Set(inDf, 1.0f));
        straight = hn::IfThenElseZero(visible, Clamp01(inDf, hn::Div(inSum, safe)));
        scale = hn::Mul(scale, alpha);
    }
    const VF value = hn::IfThenElse(inAlphaLane, hn::Mul(alpha, hn::Set(inDf, 255.0f)),
                                    hn::Mul(ToEncoded(inDf, straight), scale));
    return hn::ConvertTo(di, hn::Add(value, hn::Set(inDf, 0.5f)));
}

template <bool kPremultiplied>
void AccumulateLinear(const std::uint8_t* const* inRows, const float* inWeights,
                      std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
    const DF df;
    const DI di;
    const D8 d8;
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
        const auto out = hn::DemoteTo(d8, Encode<kPremultiplied>(df, sum, alphaLane));
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
