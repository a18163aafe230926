// Vectorised Gaussian Blur kernels (SimdBlur.h).
//
// A line's steps are whole multiples of the vector, so a step is a fixed number
// of vectors held in registers. The box passes run together in one sweep, their
// intermediate steps in two small rings that stay in the first-level cache. Pixel
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

// The three box passes in one sweep along the line extended by its end steps
// (as far as the three radii reach together): the first pass's running sum
// takes the entering input step minus the leaving one, its outputs go into
// ring A, from which the second pass takes its entering and leaving steps
// likewise, into ring B for the third, whose outputs are the line's.
void BoxChain(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
              std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel,
              float* ioRingA, float* ioRingB)
{
    const Tag d;
    using V = hn::Vec<Tag>;
    const int* radii = inKernel.boxRadii;
    const int widths[3] = {2 * radii[0] + 1, 2 * radii[1] + 1, 2 * radii[2] + 1};
    const V scales[3] = {hn::Set(d, 1.0f / static_cast<float>(widths[0])),
                         hn::Set(d, 1.0f / static_cast<float>(widths[1])),
                         hn::Set(d, 1.0f / static_cast<float>(widths[2]))};
    const int reach = radii[0] + radii[1] + radii[2];
    const int mask = inKernel.ringSteps - 1;
    auto input = [&](int inIndex)
    { return inSource + std::clamp(inIndex - reach, 0, inCount - 1) * inSourceStride; };
    auto ringA = [&](int inIndex) { return ioRingA + (inIndex & mask) * kBlurStepFloats; };
    auto ringB = [&](int inIndex) { return ioRingB + (inIndex & mask) * kBlurStepFloats; };
    V sums[3][kVectors];
    for (auto& pass : sums)
        for (V& sum : pass)
            sum = hn::Zero(d);
    // Adds step inEntering (and takes away inLeaving, when there is one) to
    // the sums of one pass and writes their means to outMeans.
    auto slide = [&](V* ioSums, const V& inScale, const float* inEntering, const float* inLeaving,
                     float* outMeans)
    {
        for (std::size_t v = 0; v < kVectors; ++v)
        {
            const V entering = hn::LoadU(d, inEntering + v * kLanes);
            ioSums[v] = inLeaving ? hn::Add(ioSums[v],
                                            hn::Sub(entering, hn::LoadU(d, inLeaving + v * kLanes)))
                                  : hn::Add(ioSums[v], entering);
            hn::StoreU(hn::Mul(ioSums[v], inScale), d, outMeans + v * kLanes);
        }
    };
    // Step j of the extended input completes the first pass's window centred
    // on j - r0 (once j has reached a full window), and so on down the chain.
    const int length = inCount + 2 * reach;
    for (int j = 0; j < length; ++j)
    {
        const int a = j - radii[0];
        slide(sums[0], scales[0], input(j), j >= widths[0] ? input(j - widths[0]) : nullptr,
              ringA(a));
        const int aCount = j - (widths[0] - 1);
        if (aCount < 0)
            continue;
        const int b = a - radii[1];
        slide(sums[1], scales[1], ringA(a), aCount >= widths[1] ? ringA(a - widths[1]) : nullptr,
              ringB(b));
        const int bCount = aCount - (widths[1] - 1);
        if (bCount < 0)
            continue;
        const int c = b - radii[2];
        const int cCount = bCount - (widths[2] - 1);
        // The last pass writes only its full windows, the line's steps.
        if (cCount < 0)
        {
            for (std::size_t v = 0; v < kVectors; ++v)
                sums[2][v] = hn::Add(sums[2][v], hn::LoadU(d, ringB(b) + v * kLanes));
            continue;
        }
        slide(sums[2], scales[2], ringB(b), bCount >= widths[2] ? ringB(b - widths[2]) : nullptr,
              outTarget + (c - reach) * outTargetStride);
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
                  std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel,
                  float* ioRingA, float* ioRingB)
{
    if (inKernel.taps)
        TapPass(inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel);
    else
        BoxChain(inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel, ioRingA,
                 ioRingB);
}

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback: plain loops.
void Load8Impl(const std::uint8_t* inRow, int inCount, float* outValues, std::ptrdiff_t inStride)
{
    for (int i = 0; i < inCount; ++i, inRow += 4, outValues += inStride)
    {
        const float a = static_cast<float>(inRow[3]) / 255.0f;
        for (int c = 0; c < 3; ++c)
            outValues[c] = static_cast<float>(inRow[c]) / 255.0f * a;
        outValues[3] = a;
    }
}

void Store8Impl(const float* inValues, std::ptrdiff_t inStride, int inCount, std::uint8_t* outRow)
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
void Store8BlockImpl(const float* inValues, int inCount, int inRows, std::uint8_t* const* outRows)
{
    for (int r = 0; r < inRows; ++r)
        Store8Impl(inValues + r * 4, kBlurStepFloats, inCount, outRows[r]);
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

void Load8Impl(const std::uint8_t* inRow, int inCount, float* outValues, std::ptrdiff_t inStride)
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

void Store8Impl(const float* inValues, std::ptrdiff_t inStride, int inCount, std::uint8_t* outRow)
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

// A block line (step x holds pixel x of inRows rows) into those rows: every
// vector of a step is converted at once, then its pixels go to their rows.
void Store8BlockImpl(const float* inValues, int inCount, int inRows, std::uint8_t* const* outRows)
{
    const Tag d;
    constexpr int kPixels = static_cast<int>(kLanes / 4);
    const hn::Rebind<std::uint8_t, Tag> d8;
    const hn::Repartition<std::uint32_t, decltype(d8)> d32;
    for (int x = 0; x < inCount; ++x, inValues += kBlurStepFloats)
        for (int r0 = 0; r0 < inRows; r0 += kPixels)
        {
            alignas(16) std::uint32_t pixels[kPixels > 4 ? kPixels : 4];
            const auto codes = hn::DemoteTo(d8, Straighten(d, hn::LoadU(d, inValues + r0 * 4)));
            hn::StoreU(hn::BitCast(d32, codes), d32, pixels);
            const int rows = std::min(kPixels, inRows - r0);
            for (int r = 0; r < rows; ++r)
                std::memcpy(outRows[r0 + r] + x * 4, &pixels[r], 4);
        }
}
#endif

} // namespace FX::detail::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace FX::detail::Simd
{

HWY_EXPORT(BlurLineImpl);
HWY_EXPORT(Load8Impl);
HWY_EXPORT(Store8Impl);
HWY_EXPORT(Store8BlockImpl);

void BlurLine(const float* inSource, std::ptrdiff_t inSourceStride, float* outTarget,
              std::ptrdiff_t outTargetStride, int inCount, const BlurLineKernel& inKernel,
              float* ioScratchA, float* ioScratchB)
{
    HWY_DYNAMIC_DISPATCH(BlurLineImpl)
    (inSource, inSourceStride, outTarget, outTargetStride, inCount, inKernel, ioScratchA,
     ioScratchB);
}

void LoadPremultiplied8(const std::uint8_t* inRow, int inCount, float* outValues,
                        std::ptrdiff_t inStride)
{
    HWY_DYNAMIC_DISPATCH(Load8Impl)(inRow, inCount, outValues, inStride);
}

void StoreStraight8(const float* inValues, std::ptrdiff_t inStride, int inCount,
                    std::uint8_t* outRow)
{
    HWY_DYNAMIC_DISPATCH(Store8Impl)(inValues, inStride, inCount, outRow);
}

void StoreStraight8Block(const float* inValues, int inCount, int inRows,
                         std::uint8_t* const* outRows)
{
    HWY_DYNAMIC_DISPATCH(Store8BlockImpl)(inValues, inCount, inRows, outRows);
}

} // namespace FX::detail::Simd
#endif
