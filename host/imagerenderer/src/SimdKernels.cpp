// Explicitly vectorised row kernels of the image renderer (SimdKernels.h).
//
// Written once with Highway and compiled for every x86 instruction set it supports
// (SSE4, AVX2, AVX-512) plus a portable fallback; the best version for the machine
// is chosen on the first call (Highway's dynamic dispatch reads the processor's
// features, so it works the same under the sanitizers). Each kernel runs whole
// vectors over the row and finishes the last partial vector through a small stack
// copy, so the tail gets exactly the arithmetic of the body.
//
// Two styles:
// - association changes and premultiplied over at full opacity work on the bytes as
//   they lie (B, G, R, A, B, ...) in 16-bit fixed point, the pixel's alpha spread
//   over its four bytes by a byte shuffle;
// - the general over and un-premultiplying split pixels into one vector per channel
//   and work in 32-bit float, with the same operations as the scalar kernels;
// - straight over straight and the horizontal bilinear taps compute one weight per
//   pixel (in float for the former) and mix the even and odd bytes of whole pixels in
//   16-bit fixed point, where a pixel's weight fills both of its 16-bit lanes.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdKernels.cpp"
#include "SimdKernels.h"

#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

// Runs inBody(src, dst) on chunks of inChunk pixels; the last partial chunk goes
// through stack copies of the rows. inBody may read and write in place.
template <class Body>
HWY_INLINE void ForEachChunk(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                             std::size_t inChunk, const Body& inBody)
{
    std::size_t i = 0;
    const auto count = static_cast<std::size_t>(inCount);
    for (; i + inChunk <= count; i += inChunk)
        inBody(inSrc + 4 * i, ioDst + 4 * i);
    if (i == count)
        return;
    alignas(64) std::uint8_t src[HWY_MAX_BYTES * 4] = {};
    alignas(64) std::uint8_t dst[HWY_MAX_BYTES * 4] = {};
    const std::size_t bytes = 4 * (count - i);
    std::memcpy(src, inSrc + 4 * i, bytes);
    std::memcpy(dst, ioDst + 4 * i, bytes);
    inBody(src, dst);
    std::memcpy(ioDst + 4 * i, dst, bytes);
}

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback (processors without SSSE3) has no byte shuffles: plain loops
// with the same arithmetic.
HWY_INLINE std::uint8_t MulDiv255(std::uint32_t inA, std::uint32_t inB)
{
    const std::uint32_t t = inA * inB + 128u;
    return static_cast<std::uint8_t>((t * 257u) >> 16);
}

void OverPremultipliedOpaque(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < 4 * inCount; i += 4)
    {
        const std::uint32_t keep = 255u - inSrc[i + 3];
        for (int c = 0; c < 4; ++c)
        {
            const std::uint32_t v = inSrc[i + c] + MulDiv255(ioDst[i + c], keep);
            ioDst[i + c] = static_cast<std::uint8_t>(v > 255u ? 255u : v);
        }
    }
}

void StraightToPremultiplied(const std::uint8_t* inSrc, std::uint8_t* outDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < 4 * inCount; i += 4)
    {
        const std::uint8_t a = inSrc[i + 3];
        for (int c = 0; c < 3; ++c)
            outDst[i + c] = MulDiv255(inSrc[i + c], a);
        outDst[i + 3] = a;
    }
}

void MixRows(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
             std::int32_t inBytes, std::uint32_t inWeight)
{
    for (std::int32_t i = 0; i < inBytes; ++i)
        outDst[i] =
            static_cast<std::uint8_t>((inA[i] * (256u - inWeight) + inB[i] * inWeight + 128u) >> 8);
}
#else
// Each pixel's alpha byte copied into all four of its bytes.
template <class D, class V>
HWY_INLINE V BroadcastAlpha(D inD, V inPixels)
{
    alignas(16) static constexpr std::uint8_t kAlphaIndex[16] = {3,  3,  3,  3,  7,  7,  7,  7,
                                                                 11, 11, 11, 11, 15, 15, 15, 15};
    return hn::TableLookupBytes(inPixels, hn::LoadDup128(inD, kAlphaIndex));
}

// Per byte: round(a * b / 255) for 8-bit a and b, the exact rounded division
// (t + (t >> 8)) >> 8 with t = a * b + 128, which equals (t * 257) >> 16.
template <class D, class V>
HWY_INLINE V MulDiv255(D inD, V inA, V inB)
{
    const hn::Half<D> dh;
    const hn::Rebind<std::uint16_t, decltype(dh)> d16;
    const hn::Rebind<std::int16_t, decltype(dh)> di16;
    const auto k128 = hn::Set(d16, 128);
    const auto k257 = hn::Set(d16, 257);
    auto half = [&](auto inX, auto inY) HWY_ATTR
    {
        const auto t = hn::Add(hn::Mul(hn::PromoteTo(d16, inX), hn::PromoteTo(d16, inY)), k128);
        return hn::DemoteTo(dh, hn::BitCast(di16, hn::MulHigh(t, k257)));
    };
    const auto lo = half(hn::LowerHalf(dh, inA), hn::LowerHalf(dh, inB));
    const auto hi = half(hn::UpperHalf(dh, inA), hn::UpperHalf(dh, inB));
    return hn::Combine(inD, hi, lo);
}

void OverPremultipliedOpaque(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount)
{
    const hn::ScalableTag<std::uint8_t> d8;
    ForEachChunk(inSrc, ioDst, inCount, hn::Lanes(d8) / 4,
                 [&](const std::uint8_t* inS, std::uint8_t* ioD) HWY_ATTR
                 {
                     const auto s = hn::LoadU(d8, inS);
                     const auto d = hn::LoadU(d8, ioD);
                     // 255 - alpha is the complement of the byte.
                     const auto keep = hn::Not(BroadcastAlpha(d8, s));
                     hn::StoreU(hn::SaturatedAdd(s, MulDiv255(d8, d, keep)), d8, ioD);
                 });
}

void StraightToPremultiplied(const std::uint8_t* inSrc, std::uint8_t* outDst, std::int32_t inCount)
{
    const hn::ScalableTag<std::uint8_t> d8;
    const hn::Repartition<std::uint32_t, decltype(d8)> d32;
    // Alpha multiplies by 255, which leaves it as it is.
    const auto alphaByte = hn::BitCast(d8, hn::Set(d32, 0xFF000000u));
    ForEachChunk(inSrc, outDst, inCount, hn::Lanes(d8) / 4,
                 [&](const std::uint8_t* inS, std::uint8_t* outD) HWY_ATTR
                 {
                     const auto s = hn::LoadU(d8, inS);
                     const auto factor = hn::Or(BroadcastAlpha(d8, s), alphaByte);
                     hn::StoreU(MulDiv255(d8, s, factor), d8, outD);
                 });
}

void MixRows(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
             std::int32_t inBytes, std::uint32_t inWeight)
{
    const hn::ScalableTag<std::uint8_t> d8;
    const hn::Half<decltype(d8)> dh;
    const hn::Rebind<std::uint16_t, decltype(dh)> d16;
    const hn::Rebind<std::int16_t, decltype(dh)> di16;
    const auto wb = hn::Set(d16, static_cast<std::uint16_t>(inWeight));
    const auto wa = hn::Set(d16, static_cast<std::uint16_t>(256 - inWeight));
    const auto k128 = hn::Set(d16, 128);
    auto half = [&](auto inX, auto inY) HWY_ATTR
    {
        const auto t = hn::Add(
            hn::Add(hn::Mul(hn::PromoteTo(d16, inX), wa), hn::Mul(hn::PromoteTo(d16, inY), wb)),
            k128);
        return hn::DemoteTo(dh, hn::BitCast(di16, hn::ShiftRight<8>(t)));
    };
    // An even mix is the rounded average of the bytes, (a + b + 1) >> 1, the same value.
    const bool even = inWeight == 128;
    auto body = [&](const std::uint8_t* inP, const std::uint8_t* inQ, std::uint8_t* outP) HWY_ATTR
    {
        const auto a = hn::LoadU(d8, inP);
        const auto b = hn::LoadU(d8, inQ);
        if (even)
        {
            hn::StoreU(hn::AverageRound(a, b), d8, outP);
            return;
        }
        const auto lo = half(hn::LowerHalf(dh, a), hn::LowerHalf(dh, b));
        const auto hi = half(hn::UpperHalf(dh, a), hn::UpperHalf(dh, b));
        hn::StoreU(hn::Combine(d8, hi, lo), d8, outP);
    };
    const std::size_t n = hn::Lanes(d8);
    const auto bytes = static_cast<std::size_t>(inBytes);
    std::size_t i = 0;
    for (; i + n <= bytes; i += n)
        body(inA + i, inB + i, outDst + i);
    if (i == bytes)
        return;
    alignas(64) std::uint8_t a[HWY_MAX_BYTES] = {}, b[HWY_MAX_BYTES] = {}, out[HWY_MAX_BYTES];
    std::memcpy(a, inA + i, bytes - i);
    std::memcpy(b, inB + i, bytes - i);
    body(a, b, out);
    std::memcpy(outDst + i, out, bytes - i);
}
#endif

// Float helpers on one vector of whole pixels held in 32-bit lanes.

// Unaligned whole pixels (the loads and stores tolerate any address).
template <class DU>
HWY_INLINE hn::Vec<DU> LoadPixels(DU inDu, const std::uint8_t* inP)
{
    return hn::LoadU(inDu, reinterpret_cast<const std::uint32_t*>(inP));
}

template <class DU>
HWY_INLINE void StorePixels(DU inDu, hn::Vec<DU> inV, std::uint8_t* outP)
{
    hn::StoreU(inV, inDu, reinterpret_cast<std::uint32_t*>(outP));
}

// Channel inShift / 8 of every pixel as float code values.
template <int kShift, class DF, class VU>
HWY_INLINE auto Channel(DF inDf, VU inPixels)
{
    const hn::DFromV<VU> du;
    const hn::RebindToSigned<DF> di;
    const auto bits = hn::And(hn::ShiftRight<kShift>(inPixels), hn::Set(du, 0xFFu));
    return hn::ConvertTo(inDf, hn::BitCast(di, bits));
}

// Code values already inside 0..255 rounded to nearest (adding 2^23 leaves the rounded
// integer in the low mantissa bits), back in the low byte of each lane.
template <class VF>
HWY_INLINE auto InRangeToCode(VF inCodes)
{
    const hn::DFromV<VF> df;
    const hn::RebindToUnsigned<decltype(df)> du;
    return hn::And(hn::BitCast(du, hn::Add(inCodes, hn::Set(df, 8388608.0f))), hn::Set(du, 0xFFu));
}

// The same for any code values: clamped to 0..255 first.
template <class VF>
HWY_INLINE auto ToCode(VF inCodes)
{
    const hn::DFromV<VF> df;
    return InRangeToCode(hn::Min(hn::Max(inCodes, hn::Zero(df)), hn::Set(df, 255.0f)));
}

template <class VU>
HWY_INLINE VU PackPixel(VU inB, VU inG, VU inR, VU inA)
{
    return hn::Or(hn::Or(inB, hn::ShiftLeft<8>(inG)),
                  hn::Or(hn::ShiftLeft<16>(inR), hn::ShiftLeft<24>(inA)));
}

template <bool kSrcStraight, bool kDstStraight>
HWY_INLINE void OverFloat(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                          float inOpacity)
{
    const hn::ScalableTag<float> df;
    const hn::RebindToUnsigned<decltype(df)> du;
    const auto k1 = hn::Set(df, 1.0f / 255.0f);
    const auto k255 = hn::Set(df, 255.0f);
    const auto one = hn::Set(df, 1.0f);
    const auto opacity = hn::Set(df, inOpacity);
    const auto alphaMask = hn::Set(du, 0xFF000000u);
    const bool opaqueSkips = inOpacity >= 1.0f;
    ForEachChunk(
        inSrc, ioDst, inCount, hn::Lanes(df),
        [&](const std::uint8_t* inS, std::uint8_t* ioD) HWY_ATTR
        {
            const auto s = LoadPixels(du, inS);
            // Opaque source pixels at full opacity simply replace the destination: the
            // usual case inside video frames, checked a vector at a time.
            if (opaqueSkips && hn::AllTrue(du, hn::Eq(hn::And(s, alphaMask), alphaMask)))
            {
                StorePixels(du, s, ioD);
                return;
            }
            const auto d = LoadPixels(du, ioD);
            const auto srcA = hn::Mul(hn::Mul(Channel<24>(df, s), k1), opacity);
            const auto dstA = hn::Mul(Channel<24>(df, d), k1);
            auto sScale = kSrcStraight ? srcA : opacity;
            const auto keep = hn::Sub(one, srcA);
            const auto outA = hn::MulAdd(dstA, keep, srcA);
            auto dScale = keep;
            if constexpr (kDstStraight)
            {
                // Alpha 0 carries no colour: the reciprocal is masked to 0 there. One
                // refinement step takes the estimate to full float precision.
                const auto estimate = hn::ApproximateReciprocal(outA);
                const auto refined =
                    hn::Mul(estimate, hn::NegMulAdd(outA, estimate, hn::Set(df, 2.0f)));
                const auto inv = hn::IfThenElseZero(hn::Gt(outA, hn::Zero(df)), refined);
                dScale = hn::Mul(hn::Mul(dstA, keep), inv);
                sScale = hn::Mul(sScale, inv);
            }
            // Straight results are weighted means of two codes, inside 0..255 already;
            // premultiplied ones may leave it when colour exceeds alpha.
            auto code = [&](auto inValue) HWY_ATTR
            {
                if constexpr (kDstStraight)
                    return InRangeToCode(hn::Min(inValue, k255));
                else
                    return ToCode(inValue);
            };
            const auto b =
                code(hn::MulAdd(Channel<0>(df, d), dScale, hn::Mul(Channel<0>(df, s), sScale)));
            const auto g =
                code(hn::MulAdd(Channel<8>(df, d), dScale, hn::Mul(Channel<8>(df, s), sScale)));
            const auto r =
                code(hn::MulAdd(Channel<16>(df, d), dScale, hn::Mul(Channel<16>(df, s), sScale)));
            StorePixels(du, PackPixel(b, g, r, InRangeToCode(hn::Mul(outA, k255))), ioD);
        });
}

void OverPP(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    OverFloat<false, false>(inSrc, ioDst, inCount, inOpacity);
}

void OverPS(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    OverFloat<false, true>(inSrc, ioDst, inCount, inOpacity);
}

void OverSP(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    OverFloat<true, false>(inSrc, ioDst, inCount, inOpacity);
}

#if HWY_TARGET == HWY_SCALAR
void OverSS(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    OverFloat<true, true>(inSrc, ioDst, inCount, inOpacity);
}
#else
// Straight over straight, the common case of video frames. The result is a weighted mean
// of the two straight colours, c = cd + (cs - cd) * t with t = ws / (ws + wd),
// ws = 255 * as and wd = ad * (255 - as) (as scaled by the opacity). Only the weights
// need float: t comes from the approximate reciprocal (relative error below 2^-11) and
// the colour mix runs in 16-bit fixed point on the even and odd bytes of the pixels as
// they lie, where each pixel's t sits in both of its 16-bit lanes. Alpha is
// round((ws + wd) / 255), exact at full opacity.
void OverSS(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    const hn::ScalableTag<std::uint32_t> du;
    const hn::Repartition<float, decltype(du)> df;
    const hn::RebindToSigned<decltype(df)> di;
    const hn::Repartition<std::uint8_t, decltype(du)> d8;
    const hn::Repartition<std::uint16_t, decltype(du)> d16;
    const hn::Repartition<std::int16_t, decltype(du)> di16;
    const auto alphaMask = hn::Set(du, 0xFF000000u);
    const auto colourMask = hn::Set(du, 0x00FFFFFFu);
    const auto lowBytes = hn::Set(d16, 0x00FF);
    const auto opacity = hn::Set(df, inOpacity);
    const auto k255 = hn::Set(df, 255.0f);
    const auto k1 = hn::Set(df, 1.0f / 255.0f);
    // Adding 2^23 leaves a rounded value below 2^16 in the low 16 bits of the lane.
    const auto kMagic = hn::Set(df, 8388608.0f);
    // t in Q15, scaled so that even an estimate 2^-11 too high stays below 32768; for
    // t = 1 the shortfall (0.06 %) still rounds every colour difference back to itself.
    const auto kTScale = hn::Set(df, 255.0f * 32750.0f);
    // No weight is this small unless both are zero: keeps the reciprocal finite.
    const auto kTiny = hn::Set(df, 1e-30f);
    // Bytes 0 and 1 of each lane into both of its 16-bit halves.
    alignas(16) static constexpr std::uint8_t kLowHalfTwice[16] = {0, 1, 0, 1, 4,  5,  4,  5,
                                                                   8, 9, 8, 9, 12, 13, 12, 13};
    const auto lowHalfTwice = hn::LoadDup128(d8, kLowHalfTwice);
    const bool opaqueSkips = inOpacity >= 1.0f;
    const bool allTransparent = inOpacity <= 0.0f;
    auto alphaOf = [&](auto inPixels) HWY_ATTR
    { return hn::ConvertTo(df, hn::BitCast(di, hn::ShiftRight<24>(inPixels))); };
    ForEachChunk(
        inSrc, ioDst, inCount, hn::Lanes(du),
        [&](const std::uint8_t* inS, std::uint8_t* ioD) HWY_ATTR
        {
            const auto s = LoadPixels(du, inS);
            const auto sAlpha = hn::And(s, alphaMask);
            if (opaqueSkips && hn::AllTrue(du, hn::Eq(sAlpha, alphaMask)))
            {
                StorePixels(du, s, ioD);
                return;
            }
            const auto d = LoadPixels(du, ioD);
            // A transparent source keeps the destination, whose pixels of alpha 0 lose
            // their colour.
            if (allTransparent || hn::AllTrue(du, hn::Eq(sAlpha, hn::Zero(du))))
            {
                StorePixels(du, hn::IfThenElseZero(hn::Ne(hn::And(d, alphaMask), hn::Zero(du)), d),
                            ioD);
                return;
            }
            const auto srcA = hn::Mul(alphaOf(s), opacity);
            const auto wd = hn::Mul(alphaOf(d), hn::Sub(k255, srcA));
            const auto total = hn::MulAdd(srcA, k255, wd);
            const auto inv = hn::ApproximateReciprocal(hn::Max(total, kTiny));
            const auto tq = hn::BitCast(d8, hn::Add(hn::Mul(hn::Mul(srcA, kTScale), inv), kMagic));
            const auto t = hn::BitCast(di16, hn::TableLookupBytes(tq, lowHalfTwice));
            const auto s16 = hn::BitCast(d16, s);
            const auto d16v = hn::BitCast(d16, d);
            auto mix = [&](auto inS16, auto inD16) HWY_ATTR
            {
                const auto diff = hn::BitCast(di16, hn::Sub(inS16, inD16));
                return hn::BitCast(d16,
                                   hn::Add(hn::BitCast(di16, inD16), hn::MulFixedPoint15(diff, t)));
            };
            const auto even = mix(hn::And(s16, lowBytes), hn::And(d16v, lowBytes));
            const auto odd = mix(hn::ShiftRight<8>(s16), hn::ShiftRight<8>(d16v));
            const auto colour = hn::BitCast(du, hn::Or(even, hn::ShiftLeft<8>(odd)));
            // The rounded alpha code sits in the low byte; the shift drops the rest.
            const auto outA =
                hn::ShiftLeft<24>(hn::BitCast(du, hn::Add(hn::Mul(total, k1), kMagic)));
            const auto out = hn::Or(hn::And(colour, colourMask), outA);
            // Alpha 0 carries no colour.
            StorePixels(
                du, hn::IfThenElseZero(hn::RebindMask(du, hn::Gt(total, hn::Zero(df))), out), ioD);
        });
}
#endif

void PremultipliedToStraight(const std::uint8_t* inSrc, std::uint8_t* outDst, std::int32_t inCount)
{
    const hn::ScalableTag<float> df;
    const hn::RebindToUnsigned<decltype(df)> du;
    const auto k255 = hn::Set(df, 255.0f);
    const auto alphaMask = hn::Set(du, 0xFF000000u);
    ForEachChunk(inSrc, outDst, inCount, hn::Lanes(df),
                 [&](const std::uint8_t* inS, std::uint8_t* outD) HWY_ATTR
                 {
                     const auto p = LoadPixels(du, inS);
                     const auto alpha = Channel<24>(df, p);
                     // One division per pixel; alpha 0 gives colour 0.
                     const auto scale =
                         hn::IfThenElseZero(hn::Gt(alpha, hn::Zero(df)), hn::Div(k255, alpha));
                     const auto b = ToCode(hn::Mul(Channel<0>(df, p), scale));
                     const auto g = ToCode(hn::Mul(Channel<8>(df, p), scale));
                     const auto r = ToCode(hn::Mul(Channel<16>(df, p), scale));
                     const auto colour =
                         hn::Or(b, hn::Or(hn::ShiftLeft<8>(g), hn::ShiftLeft<16>(r)));
                     StorePixels(du, hn::Or(colour, hn::And(p, alphaMask)), outD);
                 });
}

#if HWY_TARGET == HWY_SCALAR
void YUV420ToBGRA(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                  std::uint8_t* outDst, std::int32_t inWidth, const std::int32_t* inCoefficients)
{
    const std::int32_t* k = inCoefficients;
    auto toByte = [](std::int32_t inV) HWY_ATTR
    {
        const std::int32_t v = (inV + 32768) >> 16;
        return static_cast<std::uint8_t>(v < 0 ? 0 : (v > 255 ? 255 : v));
    };
    for (std::int32_t x = 0; x < inWidth; ++x)
    {
        const std::int32_t cb = inU[x >> 1] - 128;
        const std::int32_t cr = inV[x >> 1] - 128;
        const std::int32_t y = (inY[x] - 16) * k[0];
        std::uint8_t* d = outDst + 4 * x;
        d[0] = toByte(y + k[4] * cb);
        d[1] = toByte(y - k[2] * cb - k[3] * cr);
        d[2] = toByte(y + k[1] * cr);
        d[3] = 255;
    }
}
#else
void YUV420ToBGRA(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                  std::uint8_t* outDst, std::int32_t inWidth, const std::int32_t* inCoefficients)
{
    const hn::ScalableTag<std::int32_t> di;
    const hn::Rebind<std::uint8_t, decltype(di)> d8;
    const hn::Half<decltype(di)> dhi;
    const hn::Rebind<std::uint8_t, decltype(dhi)> dh8;
    const hn::Rebind<std::uint16_t, decltype(dhi)> dh16;
    const auto ky = hn::Set(di, inCoefficients[0]);
    const auto crR = hn::Set(di, inCoefficients[1]);
    const auto cbG = hn::Set(di, inCoefficients[2]);
    const auto crG = hn::Set(di, inCoefficients[3]);
    const auto cbB = hn::Set(di, inCoefficients[4]);
    const auto k16 = hn::Set(di, 16);
    const auto k128 = hn::Set(di, 128);
    const auto kHalf = hn::Set(di, 32768);
    const auto opaque = hn::Set(d8, 255);
    // One chroma sample serves two luma samples: each chroma byte is doubled.
    auto chroma = [&](const std::uint8_t* inC) HWY_ATTR
    {
        const auto c16 = hn::PromoteTo(dh16, hn::LoadU(dh8, inC));
        const auto doubled = hn::BitCast(d8, hn::Or(c16, hn::ShiftLeft<8>(c16)));
        return hn::Sub(hn::PromoteTo(di, doubled), k128);
    };
    auto body = [&](const std::uint8_t* inYs, const std::uint8_t* inUs, const std::uint8_t* inVs,
                    std::uint8_t* outD) HWY_ATTR
    {
        const auto y = hn::Mul(hn::Sub(hn::PromoteTo(di, hn::LoadU(d8, inYs)), k16), ky);
        const auto cb = chroma(inUs);
        const auto cr = chroma(inVs);
        auto toByte = [&](auto inV) HWY_ATTR
        { return hn::DemoteTo(d8, hn::ShiftRight<16>(hn::Add(inV, kHalf))); };
        const auto b = toByte(hn::Add(y, hn::Mul(cbB, cb)));
        const auto g = toByte(hn::Sub(hn::Sub(y, hn::Mul(cbG, cb)), hn::Mul(crG, cr)));
        const auto r = toByte(hn::Add(y, hn::Mul(crR, cr)));
        hn::StoreInterleaved4(b, g, r, opaque, d8, outD);
    };
    const std::size_t n = hn::Lanes(di);
    const auto width = static_cast<std::size_t>(inWidth);
    std::size_t x = 0;
    for (; x + n <= width; x += n)
        body(inY + x, inU + x / 2, inV + x / 2, outDst + 4 * x);
    if (x == width)
        return;
    // The last partial vector through stack copies (x is even: n is).
    alignas(64) std::uint8_t ys[HWY_MAX_BYTES] = {}, us[HWY_MAX_BYTES] = {}, vs[HWY_MAX_BYTES] = {};
    alignas(64) std::uint8_t out[HWY_MAX_BYTES * 4];
    const std::size_t rest = width - x;
    std::memcpy(ys, inY + x, rest);
    std::memcpy(us, inU + x / 2, (rest + 1) / 2);
    std::memcpy(vs, inV + x / 2, (rest + 1) / 2);
    body(ys, us, vs, out);
    std::memcpy(outDst + 4 * x, out, 4 * rest);
}
#endif

// Horizontal bilinear taps: output pixel i mixes a pair of neighbouring pixels with
// (p * (256 - w) + q * w + 128) >> 8 per byte, the same integer arithmetic as the
// scalar sampler. With kOver the samples (premultiplied) go over the premultiplied
// destination at full opacity instead of being stored.
#if HWY_TARGET == HWY_SCALAR
HWY_INLINE std::uint8_t MixByte(std::uint32_t inP, std::uint32_t inQ, std::uint32_t inW)
{
    return static_cast<std::uint8_t>((inP * (256u - inW) + inQ * inW + 128u) >> 8);
}

HWY_INLINE void EmitPair(const std::uint8_t* inP, const std::uint8_t* inQ, std::uint32_t inW,
                         std::uint8_t* ioD, bool inOver)
{
    std::uint8_t sample[4];
    for (int c = 0; c < 4; ++c)
        sample[c] = MixByte(inP[c], inQ[c], inW);
    if (!inOver)
    {
        std::memcpy(ioD, sample, 4);
        return;
    }
    OverPremultipliedOpaque(sample, ioD, 1);
}

void MixPixelPairs(const std::uint8_t* inRow, std::int32_t inStride, std::uint32_t inWeight,
                   std::uint8_t* ioDst, std::int32_t inCount, bool inOver)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        const std::uint8_t* p = inRow + 4 * static_cast<std::ptrdiff_t>(inStride) * i;
        EmitPair(p, p + 4, inWeight, ioDst + 4 * i, inOver);
    }
}

void MixGatheredPairs(const std::uint8_t* inRow, const std::int32_t* inColumns,
                      const std::uint32_t* inWeights, std::uint8_t* ioDst, std::int32_t inCount,
                      bool inOver)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        const std::uint8_t* p = inRow + 4 * static_cast<std::ptrdiff_t>(inColumns[i]);
        EmitPair(p, p + 4, inWeights[i], ioDst + 4 * i, inOver);
    }
}
#else
// The pair mix on whole vectors of pixels p and q. inFactor holds w * 128 in both 16-bit
// lanes of each pixel: p + ((q - p) * w * 128 + 2^14) >> 15 on the even and on the odd
// bytes is exactly the scalar formula.
template <class DU, class V16>
HWY_INLINE hn::Vec<DU> MixPairs(DU inDu, hn::Vec<DU> inP, hn::Vec<DU> inQ, V16 inFactor)
{
    const hn::Repartition<std::uint16_t, DU> d16;
    const hn::Repartition<std::int16_t, DU> di16;
    const auto lowBytes = hn::Set(d16, 0x00FF);
    const auto p = hn::BitCast(d16, inP);
    const auto q = hn::BitCast(d16, inQ);
    auto mix = [&](auto inA, auto inB) HWY_ATTR
    {
        const auto diff = hn::BitCast(di16, hn::Sub(inB, inA));
        return hn::BitCast(d16,
                           hn::Add(hn::BitCast(di16, inA), hn::MulFixedPoint15(diff, inFactor)));
    };
    const auto even = mix(hn::And(p, lowBytes), hn::And(q, lowBytes));
    const auto odd = mix(hn::ShiftRight<8>(p), hn::ShiftRight<8>(q));
    return hn::BitCast(inDu, hn::Or(even, hn::ShiftLeft<8>(odd)));
}

// Stores the samples, or composites them over the destination.
template <class DU>
HWY_INLINE void Emit(DU inDu, hn::Vec<DU> inSamples, std::uint8_t* ioD, bool inOver)
{
    if (!inOver)
    {
        StorePixels(inDu, inSamples, ioD);
        return;
    }
    const hn::Repartition<std::uint8_t, DU> d8;
    const auto s = hn::BitCast(d8, inSamples);
    const auto d = hn::LoadU(d8, ioD);
    hn::StoreU(hn::SaturatedAdd(s, MulDiv255(d8, d, hn::Not(BroadcastAlpha(d8, s)))), d8, ioD);
}

template <int kStride>
HWY_INLINE void MixPixelPairsStride(const std::uint8_t* inRow, std::uint32_t inWeight,
                                    std::uint8_t* ioDst, std::int32_t inCount, bool inOver)
{
    const hn::ScalableTag<std::uint32_t> du;
    const hn::Repartition<std::int16_t, decltype(du)> di16;
    const std::size_t n = hn::Lanes(du);
    const auto factor = hn::Set(di16, static_cast<std::int16_t>(inWeight * 128));
    auto body = [&](const std::uint8_t* inP, std::uint8_t* ioD) HWY_ATTR
    {
        hn::Vec<decltype(du)> p, q;
        if constexpr (kStride == 1)
        {
            p = LoadPixels(du, inP);
            q = LoadPixels(du, inP + 4);
        }
        else
        {
            // Pixels 2i and 2i + 1 of two vectors' worth of the row.
            const auto lo = LoadPixels(du, inP);
            const auto hi = LoadPixels(du, inP + 4 * n);
            p = hn::ConcatEven(du, hi, lo);
            q = hn::ConcatOdd(du, hi, lo);
        }
        // Phase-aligned halving (w = 128) is the rounded average, the same value; a
        // whole-pixel phase (w = 0) takes the first pixel of each pair as it is.
        if (inWeight == 0)
            Emit(du, p, ioD, inOver);
        else if (inWeight == 128)
        {
            const hn::Repartition<std::uint8_t, decltype(du)> d8;
            Emit(du, hn::BitCast(du, hn::AverageRound(hn::BitCast(d8, p), hn::BitCast(d8, q))), ioD,
                 inOver);
        }
        else
            Emit(du, MixPairs(du, p, q, factor), ioD, inOver);
    };
    const auto count = static_cast<std::size_t>(inCount);
    std::size_t i = 0;
    for (; i + n <= count; i += n)
        body(inRow + 4 * kStride * i, ioDst + 4 * i);
    if (i == count)
        return;
    // The last partial vector through stack copies: the pixels the taps read (the pair
    // of the last output pixel ends at kStride * (rest - 1) + 1) and the destination.
    alignas(64) std::uint8_t src[HWY_MAX_BYTES * 2 + 8] = {};
    alignas(64) std::uint8_t dst[HWY_MAX_BYTES] = {};
    const std::size_t rest = count - i;
    std::memcpy(src, inRow + 4 * kStride * i, 4 * (kStride * (rest - 1) + 2));
    std::memcpy(dst, ioDst + 4 * i, 4 * rest);
    body(src, dst);
    std::memcpy(ioDst + 4 * i, dst, 4 * rest);
}

void MixPixelPairs(const std::uint8_t* inRow, std::int32_t inStride, std::uint32_t inWeight,
                   std::uint8_t* ioDst, std::int32_t inCount, bool inOver)
{
    if (inStride == 1)
        MixPixelPairsStride<1>(inRow, inWeight, ioDst, inCount, inOver);
    else
        MixPixelPairsStride<2>(inRow, inWeight, ioDst, inCount, inOver);
}

void MixGatheredPairs(const std::uint8_t* inRow, const std::int32_t* inColumns,
                      const std::uint32_t* inWeights, std::uint8_t* ioDst, std::int32_t inCount,
                      bool inOver)
{
    const hn::ScalableTag<std::uint32_t> du;
    const hn::RebindToSigned<decltype(du)> di;
    const hn::Repartition<std::int16_t, decltype(du)> di16;
    const std::size_t n = hn::Lanes(du);
    const auto* pixels = reinterpret_cast<const std::uint32_t*>(inRow);
    const auto one = hn::Set(di, 1);
    auto body = [&](const std::int32_t* inC, const std::uint32_t* inW, std::uint8_t* ioD) HWY_ATTR
    {
        const auto columns = hn::LoadU(di, inC);
        const auto p = hn::GatherIndex(du, pixels, columns);
        const auto q = hn::GatherIndex(du, pixels, hn::Add(columns, one));
        // w * 128 in both 16-bit halves of the pixel's lane.
        const auto factor =
            hn::BitCast(di16, hn::Mul(hn::LoadU(du, inW), hn::Set(du, 0x00800080u)));
        Emit(du, MixPairs(du, p, q, factor), ioD, inOver);
    };
    const auto count = static_cast<std::size_t>(inCount);
    std::size_t i = 0;
    for (; i + n <= count; i += n)
        body(inColumns + i, inWeights + i, ioDst + 4 * i);
    if (i == count)
        return;
    // Unused lanes read the pair at column 0 with weight 0 and are never written back.
    alignas(64) std::int32_t columns[HWY_MAX_BYTES / 4] = {};
    alignas(64) std::uint32_t weights[HWY_MAX_BYTES / 4] = {};
    alignas(64) std::uint8_t dst[HWY_MAX_BYTES] = {};
    const std::size_t rest = count - i;
    std::memcpy(columns, inColumns + i, 4 * rest);
    std::memcpy(weights, inWeights + i, 4 * rest);
    std::memcpy(dst, ioDst + 4 * i, 4 * rest);
    body(columns, weights, dst);
    std::memcpy(ioDst + 4 * i, dst, 4 * rest);
}
#endif

} // namespace IR::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::Simd
{

HWY_EXPORT(OverPremultipliedOpaque);
HWY_EXPORT(OverPP);
HWY_EXPORT(OverPS);
HWY_EXPORT(OverSP);
HWY_EXPORT(OverSS);
HWY_EXPORT(StraightToPremultiplied);
HWY_EXPORT(PremultipliedToStraight);
HWY_EXPORT(YUV420ToBGRA);
HWY_EXPORT(MixRows);
HWY_EXPORT(MixPixelPairs);
HWY_EXPORT(MixGatheredPairs);

void MixPixelPairsRow8(const std::uint8_t* inRow, std::int32_t inStride, std::uint32_t inWeight,
                       std::uint8_t* ioDst, std::int32_t inCount, bool inOverPremultiplied)
{
    HWY_DYNAMIC_DISPATCH(MixPixelPairs)
    (inRow, inStride, inWeight, ioDst, inCount, inOverPremultiplied);
}

void MixGatheredPairsRow8(const std::uint8_t* inRow, const std::int32_t* inColumns,
                          const std::uint32_t* inWeights, std::uint8_t* ioDst, std::int32_t inCount,
                          bool inOverPremultiplied)
{
    HWY_DYNAMIC_DISPATCH(MixGatheredPairs)
    (inRow, inColumns, inWeights, ioDst, inCount, inOverPremultiplied);
}

void MixRows8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
              std::int32_t inBytes, std::uint32_t inWeight)
{
    HWY_DYNAMIC_DISPATCH(MixRows)(inA, inB, outDst, inBytes, inWeight);
}

void OverPremultipliedOpaqueRow8(const std::uint8_t* inSrc, std::uint8_t* ioDst,
                                 std::int32_t inCount)
{
    HWY_DYNAMIC_DISPATCH(OverPremultipliedOpaque)(inSrc, ioDst, inCount);
}

void OverRow8(bool inSrcStraight, bool inDstStraight, const std::uint8_t* inSrc,
              std::uint8_t* ioDst, std::int32_t inCount, float inOpacity)
{
    if (inSrcStraight)
    {
        if (inDstStraight)
            HWY_DYNAMIC_DISPATCH(OverSS)(inSrc, ioDst, inCount, inOpacity);
        else
            HWY_DYNAMIC_DISPATCH(OverSP)(inSrc, ioDst, inCount, inOpacity);
    }
    else if (inDstStraight)
    {
        HWY_DYNAMIC_DISPATCH(OverPS)(inSrc, ioDst, inCount, inOpacity);
    }
    else
    {
        HWY_DYNAMIC_DISPATCH(OverPP)(inSrc, ioDst, inCount, inOpacity);
    }
}

void StraightToPremultipliedRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount)
{
    HWY_DYNAMIC_DISPATCH(StraightToPremultiplied)(inSrc, outDst, inCount);
}

void PremultipliedToStraightRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount)
{
    HWY_DYNAMIC_DISPATCH(PremultipliedToStraight)(inSrc, outDst, inCount);
}

void YUV420ToBGRARow8(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                      std::uint8_t* outDst, std::int32_t inWidth,
                      const std::int32_t inCoefficients[5])
{
    HWY_DYNAMIC_DISPATCH(YUV420ToBGRA)(inY, inU, inV, outDst, inWidth, inCoefficients);
}

} // namespace IR::Simd
#endif
