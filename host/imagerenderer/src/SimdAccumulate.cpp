// Fused linear-light accumulation of 8-bit BGRA rows (SimdAccumulate.h).
//
// Pixels are split into one float vector per channel (a block of as many pixels as a
// vector has float lanes), so the transfer runs on colour only. Every source is split,
// linearised and added into the four channel sums of the block; the last partial block
// goes through stack copies, so the tail gets the arithmetic of the body.
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

// Byte codes as values in 0..1.
HWY_INLINE VF Unit(DF inDf, hn::Vec<D8> inCodes)
{
    return hn::Mul(hn::ConvertTo(inDf, hn::PromoteTo(DI(), inCodes)), hn::Set(inDf, 1.0f / 255.0f));
}

// 1 / alpha where alpha is above zero, else 0 (colour of a transparent pixel counts as 0).
HWY_INLINE VF Reciprocal(DF inDf, VF inAlpha)
{
    const auto visible = hn::Gt(inAlpha, hn::Zero(inDf));
    return hn::IfThenElseZero(
        visible,
        hn::Div(hn::Set(inDf, 1.0f), hn::IfThenElse(visible, inAlpha, hn::Set(inDf, 1.0f))));
}

HWY_INLINE hn::Vec<D8> ToCodes(DF inDf, VF inValue)
{
    return hn::DemoteTo(D8(), hn::ConvertTo(DI(), hn::Add(inValue, hn::Set(inDf, 0.5f))));
}

template <bool kPremultiplied>
void AccumulateLinear(const std::uint8_t* const* inRows, const float* inWeights,
                      std::int32_t inSources, std::uint8_t* outDst, std::int32_t inPixels)
{
    const DF df;
    const D8 d8;
    const std::size_t n = hn::Lanes(df);
    const auto pixels = static_cast<std::size_t>(inPixels);
    // n pixels from pixel inX; inTail pixels (< n) when it is the last partial block.
    const auto block = [&](std::size_t inX, std::size_t inTail)
    {
        VF sum[4] = {hn::Zero(df), hn::Zero(df), hn::Zero(df), hn::Zero(df)};
        alignas(64) std::uint8_t part[4 * HWY_MAX_BYTES / sizeof(float)];
        for (std::int32_t s = 0; s < inSources; ++s)
        {
            const std::uint8_t* from = inRows[s] + 4 * inX;
            if (inTail != 0)
            {
                std::memset(part, 0, sizeof part);
                std::memcpy(part, from, 4 * inTail);
                from = part;
            }
            hn::Vec<D8> channels[4];
            hn::LoadInterleaved4(d8, from, channels[0], channels[1], channels[2], channels[3]);
            const VF w = hn::Set(df, inWeights[s]);
            const VF alpha = Unit(df, channels[3]);
            VF toStraight = hn::Set(df, 1.0f);
            if constexpr (kPremultiplied)
                toStraight = Reciprocal(df, alpha);
            for (int c = 0; c < 3; ++c)
            {
                VF linear;
                if constexpr (kPremultiplied)
                    linear = hn::Mul(
                        ToLinear(df, Clamp01(df, hn::Mul(Unit(df, channels[c]), toStraight))),
                        alpha);
                else
                    linear = ToLinear(df, Unit(df, channels[c]));
                sum[c] = hn::MulAdd(w, linear, sum[c]);
            }
            sum[3] = hn::MulAdd(w, alpha, sum[3]);
        }
        const VF alpha = Clamp01(df, sum[3]);
        VF scale = hn::Set(df, 255.0f);
        VF toStraight = hn::Set(df, 1.0f);
        if constexpr (kPremultiplied)
        {
            scale = hn::Mul(scale, alpha);
            toStraight = Reciprocal(df, alpha);
        }
        hn::Vec<D8> codes[3];
        for (int c = 0; c < 3; ++c)
        {
            const VF straight = Clamp01(df, hn::Mul(sum[c], toStraight));
            codes[c] = ToCodes(df, hn::Mul(ToEncoded(df, straight), scale));
        }
        const hn::Vec<D8> alphaCodes = ToCodes(df, hn::Mul(alpha, hn::Set(df, 255.0f)));
        std::uint8_t* to = inTail == 0 ? outDst + 4 * inX : part;
        hn::StoreInterleaved4(codes[0], codes[1], codes[2], alphaCodes, d8, to);
        if (inTail != 0)
            std::memcpy(outDst + 4 * inX, part, 4 * inTail);
    };
    std::size_t x = 0;
    for (; x + n <= pixels; x += n)
        block(x, 0);
    if (x < pixels)
        block(x, pixels - x);
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
