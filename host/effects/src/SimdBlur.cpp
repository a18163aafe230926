// Vectorised Gaussian Blur kernels (SimdBlur.h).
//
// A line's steps are whole multiples of the vector, so a step is a fixed number
// of vectors. Pixel
// conversions work on whole vectors (a pixel per 128-bit block) where pixels
// are contiguous, else one pixel per 128-bit vector, which every target but the
// one-lane fallback has.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdBlur.cpp"
#include "SimdBlur.h"

#include <algorithm>
#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace FX::detail::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

using Tag = hn::CappedTag<float, kBlurStepFloats>;
constexpr std::size_t kLanes = hn::MaxLanes(Tag());
constexpr std::size_t kVectors = kBlurStepFloats / kLanes;
static_assert(kVectors * kLanes == kBlurStepFloats);

// The recursive form: each section runs forward (the causal half of the
// kernel, written to the target) and backward (the rest, added to it), both
// started in the steady state of the line's end step repeated without end.
// The line is swept once per group of kGroup vectors, whose state then fits
// in registers; each new output depends on the previous one through one
// multiply-add only, so the sections' chains overlap.
void RecursivePass(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
                   std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel)
{
    const Tag d;
    using V = hn::Vec<Tag>;
    constexpr std::size_t kGroup = kVectors >= 4 ? 4 : 1;
    const BlurLineKernel::Section& s0 = inKernel.sections[0];
    const BlurLineKernel::Section& s1 = inKernel.sections[1];
    const V e10 = hn::Set(d, s0.e1), e20 = hn::Set(d, s0.e2);
    const V e11 = hn::Set(d, s1.e1), e21 = hn::Set(d, s1.e2);
    const V b00 = hn::Set(d, s0.b0), b10 = hn::Set(d, s0.b1);
    const V b01 = hn::Set(d, s1.b0), b11 = hn::Set(d, s1.b1);
    const V c10 = hn::Set(d, s0.c1), c20 = hn::Set(d, s0.c2);
    const V c11 = hn::Set(d, s1.c1), c21 = hn::Set(d, s1.c2);
    for (std::size_t group = 0; group < kVectors; group += kGroup)
    {
        const float* in = inSource + group * kLanes;
        float* out = outTarget + group * kLanes;
        // Per vector: the input one step back (forward) or ahead (backward)
        // and the one before it, and each section's last two outputs.
        V x1[kGroup], x2[kGroup], y0[kGroup], y0p[kGroup], y1[kGroup], y1p[kGroup];
        for (std::size_t v = 0; v < kGroup; ++v)
        {
            x1[v] = hn::LoadU(d, in + v * kLanes);
            y0[v] = y0p[v] = hn::Mul(x1[v], hn::Set(d, s0.forwardSteady));
            y1[v] = y1p[v] = hn::Mul(x1[v], hn::Set(d, s1.forwardSteady));
        }
        for (int n = 0; n < inCount; ++n)
            for (std::size_t v = 0; v < kGroup; ++v)
            {
                const V x = hn::LoadU(d, in + n * inSourceStride + v * kLanes);
                const V a = hn::NegMulAdd(
                    e10, y0[v],
                    hn::NegMulAdd(e20, y0p[v], hn::MulAdd(b10, x1[v], hn::Mul(b00, x))));
                const V b = hn::NegMulAdd(
                    e11, y1[v],
                    hn::NegMulAdd(e21, y1p[v], hn::MulAdd(b11, x1[v], hn::Mul(b01, x))));
                y0p[v] = y0[v], y0[v] = a, y1p[v] = y1[v], y1[v] = b, x1[v] = x;
                hn::StoreU(hn::Add(a, b), d, out + n * outTargetStride + v * kLanes);
            }
        for (std::size_t v = 0; v < kGroup; ++v)
        {
            x1[v] = x2[v] = hn::LoadU(d, in + (inCount - 1) * inSourceStride + v * kLanes);
            y0[v] = y0p[v] = hn::Mul(x1[v], hn::Set(d, s0.backwardSteady));
            y1[v] = y1p[v] = hn::Mul(x1[v], hn::Set(d, s1.backwardSteady));
        }
        for (int n = inCount - 1; n >= 0; --n)
            for (std::size_t v = 0; v < kGroup; ++v)
            {
                const V a = hn::NegMulAdd(
                    e10, y0[v],
                    hn::NegMulAdd(e20, y0p[v], hn::MulAdd(c20, x2[v], hn::Mul(c10, x1[v]))));
                const V b = hn::NegMulAdd(
                    e11, y1[v],
                    hn::NegMulAdd(e21, y1p[v], hn::MulAdd(c21, x2[v], hn::Mul(c11, x1[v]))));
                y0p[v] = y0[v], y0[v] = a, y1p[v] = y1[v], y1[v] = b;
                x2[v] = x1[v], x1[v] = hn::LoadU(d, in + n * inSourceStride + v * kLanes);
                float* target = out + n * outTargetStride + v * kLanes;
                hn::StoreU(hn::Add(hn::LoadU(d, target), hn::Add(a, b)), d, target);
            }
    }
}

// The symmetric convolution with inKernel's taps.
void TapPass(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
             std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel)
{
    const Tag d;
    using V = hn::Vec<Tag>;
    const int radius = inKernel.tapRadius;
    auto output = [&](int inIndex, auto inStep)
    {
        float* out = outTarget + inIndex * outTargetStride;
        V sum[kVectors];
        const V centre = hn::Set(d, inKernel.taps[0]);
        for (std::size_t v = 0; v < kVectors; ++v)
            sum[v] = hn::Mul(centre, hn::LoadU(d, inStep(inIndex) + v * kLanes));
        for (int t = 1; t <= radius; ++t)
        {
            const V weight = hn::Set(d, inKernel.taps[t]);
            const float* before = inStep(inIndex - t);
            const float* after = inStep(inIndex + t);
            for (std::size_t v = 0; v < kVectors; ++v)
                sum[v] = hn::MulAdd(
                    weight,
                    hn::Add(hn::LoadU(d, before + v * kLanes), hn::LoadU(d, after + v * kLanes)),
                    sum[v]);
        }
        for (std::size_t v = 0; v < kVectors; ++v)
            hn::StoreU(sum[v], d, out + v * kLanes);
    };
    auto clamped = [&](int inIndex)
    { return inSource + std::clamp(inIndex, 0, inCount - 1) * inSourceStride; };
    auto direct = [&](int inIndex) { return inSource + inIndex * inSourceStride; };
    const int safeFrom = std::min(inCount, radius);
    const int safeTo = std::max(safeFrom, inCount - radius);
    for (int i = 0; i < safeFrom; ++i)
        output(i, clamped);
    for (int i = safeFrom; i < safeTo; ++i)
        output(i, direct);
    for (int i = safeTo; i < inCount; ++i)
        output(i, clamped);
}

void BlurLineImpl(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
                  std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel)
{
    if (inKernel.taps)
        TapPass(inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel);
    else
        RecursivePass(inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel);
}

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback: plain loops.
void Load8Row(const std::uint8_t* inRow, int inCount, float* outValues, std::ptrdiff_t inStride)
{
    for (int i = 0; i < inCount; ++i, inRow += 4, outValues += inStride)
    {
        const float a = static_cast<float>(inRow[3]) / 255.0f;
        for (int c = 0; c < 3; ++c)
            outValues[c] = static_cast<float>(inRow[c]) / 255.0f * a;
        outValues[3] = a;
    }
}

void Store8Row(const float* inValues, std::ptrdiff_t inStride, int inCount, std::uint8_t* outRow)
{
    for (int i = 0; i < inCount; ++i, inValues += inStride, outRow += 4)
    {
        const float a = inValues[3], k = a > 0.0f ? 1.0f / a : 0.0f;
        for (int c = 0; c < 4; ++c)
        {
            const float value = c == 3 ? a : inValues[c] * k;
            const auto scaled = static_cast<int>(value * 255.0f + 0.5f);
            outRow[c] = static_cast<std::uint8_t>(std::clamp(scaled, 0, 255));
        }
    }
}
#else
// 1 / inAlpha where inAlpha > 0, else 0: the estimate and one Newton step,
// within a few units in the last place of the quotient.
template <class D, class V>
V Inverse(D inD, V inAlpha)
{
    const V estimate = hn::ApproximateReciprocal(inAlpha);
    const V refined = hn::Mul(estimate, hn::NegMulAdd(inAlpha, estimate, hn::Set(inD, 2.0f)));
    return hn::IfThenElseZero(hn::Gt(inAlpha, hn::Zero(inD)), refined);
}

// Lane 3 of every 128-bit block (each pixel's alpha).
template <class D>
hn::Mask<D> AlphaLanes(D inD)
{
    const hn::RebindToSigned<D> di;
    return hn::RebindMask(inD, hn::Eq(hn::And(hn::Iota(di, 0), hn::Set(di, 3)), hn::Set(di, 3)));
}

// Premultiplied floats of as many pixels as inD holds quarter lanes.
template <class D>
hn::Vec<D> Premultiply(D inD, const std::uint8_t* inPixels)
{
    const hn::RebindToSigned<D> di;
    const hn::Rebind<std::uint8_t, D> d8;
    const auto v = hn::Mul(hn::ConvertTo(inD, hn::PromoteTo(di, hn::LoadU(d8, inPixels))),
                           hn::Set(inD, 1.0f / 255.0f));
    return hn::IfThenElse(AlphaLanes(inD), v, hn::Mul(v, hn::Broadcast<3>(v)));
}

// Straight 8-bit codes of premultiplied inValues, as 32-bit lanes.
template <class D>
hn::Vec<hn::RebindToSigned<D>> Straighten(D inD, hn::Vec<D> inValues)
{
    const hn::RebindToSigned<D> di;
    const auto straight = hn::IfThenElse(
        AlphaLanes(inD), inValues, hn::Mul(inValues, Inverse(inD, hn::Broadcast<3>(inValues))));
    return hn::ConvertTo(di, hn::MulAdd(straight, hn::Set(inD, 255.0f), hn::Set(inD, 0.5f)));
}

void Load8Row(const std::uint8_t* inRow, int inCount, float* outValues, std::ptrdiff_t inStride)
{
    const Tag d;
    constexpr int kPixels = static_cast<int>(kLanes / 4);
    int i = 0;
    if (inStride == 4 && kPixels > 1)
        for (; i + kPixels <= inCount; i += kPixels)
            hn::StoreU(Premultiply(d, inRow + i * 4), d, outValues + i * 4);
    const hn::Full128<float> d4;
    for (; i < inCount; ++i)
        hn::StoreU(Premultiply(d4, inRow + i * 4), d4, outValues + i * inStride);
}

void Store8Row(const float* inValues, std::ptrdiff_t inStride, int inCount, std::uint8_t* outRow)
{
    const Tag d;
    constexpr int kPixels = static_cast<int>(kLanes / 4);
    const hn::Rebind<std::uint8_t, Tag> d8;
    int i = 0;
    if (inStride == 4 && kPixels > 1)
        for (; i + kPixels <= inCount; i += kPixels)
            hn::StoreU(hn::DemoteTo(d8, Straighten(d, hn::LoadU(d, inValues + i * 4))), d8,
                       outRow + i * 4);
    const hn::Full128<float> d4;
    const hn::Full32<std::uint8_t> d48;
    for (; i < inCount; ++i)
        hn::StoreU(hn::DemoteTo(d48, Straighten(d4, hn::LoadU(d4, inValues + i * inStride))), d48,
                   outRow + i * 4);
}

// Block layout (pixel x of row r at inValues + x * kBlurStepFloats + r * 4):
// every vector of a step is converted at once, then its pixels go to their rows.
void Store8Block(const float* inValues, int inRows, int inCount, std::uint8_t* outFirst,
                 std::ptrdiff_t inRowBytes)
{
    const Tag d;
    constexpr int kPixels = static_cast<int>(kLanes / 4);
    const hn::Rebind<std::uint8_t, Tag> d8;
    const hn::Repartition<std::uint32_t, decltype(d8)> d32;
    for (int x = 0; x < inCount; ++x, inValues += kBlurStepFloats)
        for (int r0 = 0; r0 < inRows; r0 += kPixels)
        {
            std::uint32_t pixels[kPixels > 4 ? kPixels : 4];
            const auto codes = hn::DemoteTo(d8, Straighten(d, hn::LoadU(d, inValues + r0 * 4)));
            hn::StoreU(hn::BitCast(d32, codes), d32, pixels);
            const int rows = std::min(kPixels, inRows - r0);
            for (int r = 0; r < rows; ++r)
                std::memcpy(outFirst + (r0 + r) * inRowBytes + x * 4, &pixels[r], 4);
        }
}
#endif

void Load8Impl(const std::uint8_t* inFirst, std::ptrdiff_t inRowBytes, int inRows, int inCount,
               float* outValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats)
{
    for (int r = 0; r < inRows; ++r)
        Load8Row(inFirst + r * inRowBytes, inCount, outValues + r * inRowFloats, inPixelFloats);
}

void Store8Impl(const float* inValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats,
                int inRows, int inCount, std::uint8_t* outFirst, std::ptrdiff_t inRowBytes)
{
#if HWY_TARGET != HWY_SCALAR
    if (inRowFloats == 4 && inPixelFloats == kBlurStepFloats)
        return Store8Block(inValues, inRows, inCount, outFirst, inRowBytes);
#endif
    for (int r = 0; r < inRows; ++r)
        Store8Row(inValues + r * inRowFloats, inPixelFloats, inCount, outFirst + r * inRowBytes);
}

} // namespace FX::detail::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace FX::detail::Simd
{

HWY_EXPORT(BlurLineImpl);
HWY_EXPORT(Load8Impl);
HWY_EXPORT(Store8Impl);

void BlurLine(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
              std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel)
{
    HWY_DYNAMIC_DISPATCH(BlurLineImpl)
    (inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel);
}

void LoadPremultiplied8(const std::uint8_t* inFirst, std::ptrdiff_t inRowBytes, int inRows,
                        int inCount, float* outValues, std::ptrdiff_t inRowFloats,
                        std::ptrdiff_t inPixelFloats)
{
    HWY_DYNAMIC_DISPATCH(Load8Impl)
    (inFirst, inRowBytes, inRows, inCount, outValues, inRowFloats, inPixelFloats);
}

void StoreStraight8(const float* inValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats,
                    int inRows, int inCount, std::uint8_t* outFirst, std::ptrdiff_t inRowBytes)
{
    HWY_DYNAMIC_DISPATCH(Store8Impl)
    (inValues, inRowFloats, inPixelFloats, inRows, inCount, outFirst, inRowBytes);
}

} // namespace FX::detail::Simd
#endif
