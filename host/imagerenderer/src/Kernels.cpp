#include "Kernels.h"

#include "SimdKernels.h"
#include "YUV.h"

#include <algorithm>
#include <cmath>
#include <cstring>

// The 8-bit over, association and 4:2:0 kernels forward to the Highway kernels of
// SimdKernels.cpp. The other hot kernels are plain loops that the compiler
// vectorises, built twice, for AVX2 and for the baseline, and the loader picks the
// best one for the machine once. ThreadSanitizer cannot run the load-time resolver
// (it runs before the sanitizer is set up), so that build keeps one version.
#if defined(__x86_64__) && !defined(__clang__) && !defined(__SANITIZE_THREAD__)
#define IR_MULTIVERSION __attribute__((target_clones("avx2", "default")))
#else
#define IR_MULTIVERSION
#endif
#define IR_INLINE [[gnu::always_inline]] inline

namespace IR::Kernels
{

namespace
{

IR_INLINE std::uint8_t RoundTo8(float inV)
{
    // inV is in code units; clamping in float keeps the conversion defined.
    return static_cast<std::uint8_t>(std::min(std::max(inV + 0.5f, 0.0f), 255.0f));
}

// ---------------------------------------------------------------------------
// Over, 8-bit: the vectorised kernels of SimdKernels.cpp. Premultiplied pixels at full
// opacity take the 16-bit fixed-point kernel; everything else the float one.

void OverRow8PP(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                float inOpacity)
{
    if (inOpacity >= 1.0f)
        Simd::OverPremultipliedOpaqueRow8(inSrc, ioDst, inCount);
    else
        Simd::OverRow8(false, false, inSrc, ioDst, inCount, inOpacity);
}

void OverRow8PS(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                float inOpacity)
{
    Simd::OverRow8(false, true, inSrc, ioDst, inCount, inOpacity);
}

void OverRow8SP(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                float inOpacity)
{
    Simd::OverRow8(true, false, inSrc, ioDst, inCount, inOpacity);
}

void OverRow8SS(const std::uint8_t* inSrc, std::uint8_t* ioDst, std::int32_t inCount,
                float inOpacity)
{
    Simd::OverRow8(true, true, inSrc, ioDst, inCount, inOpacity);
}

// ---------------------------------------------------------------------------
// Over, float

template <bool kSrcStraight, bool kDstStraight>
IR_INLINE void OverF(const float* inSrc, float* ioDst, std::int32_t inCount, float inOpacity)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        const float* s = inSrc + 4 * i;
        float* d = ioDst + 4 * i;
        const float sa = s[3] * inOpacity;
        const float da = d[3];
        const float sScale = kSrcStraight ? sa : inOpacity;
        const float keep = 1.0f - sa;
        const float outA = sa + da * keep;
        if constexpr (kDstStraight)
        {
            const float dScale = da * keep;
            const float inv = outA > 0.0f ? 1.0f / outA : 0.0f;
            d[0] = (s[0] * sScale + d[0] * dScale) * inv;
            d[1] = (s[1] * sScale + d[1] * dScale) * inv;
            d[2] = (s[2] * sScale + d[2] * dScale) * inv;
        }
        else
        {
            d[0] = s[0] * sScale + d[0] * keep;
            d[1] = s[1] * sScale + d[1] * keep;
            d[2] = s[2] * sScale + d[2] * keep;
        }
        d[3] = outA;
    }
}

IR_MULTIVERSION void OverRowFPP(const float* inSrc, float* ioDst, std::int32_t inCount,
                                float inOpacity)
{
    OverF<false, false>(inSrc, ioDst, inCount, inOpacity);
}

IR_MULTIVERSION void OverRowFPS(const float* inSrc, float* ioDst, std::int32_t inCount,
                                float inOpacity)
{
    OverF<false, true>(inSrc, ioDst, inCount, inOpacity);
}

IR_MULTIVERSION void OverRowFSP(const float* inSrc, float* ioDst, std::int32_t inCount,
                                float inOpacity)
{
    OverF<true, false>(inSrc, ioDst, inCount, inOpacity);
}

IR_MULTIVERSION void OverRowFSS(const float* inSrc, float* ioDst, std::int32_t inCount,
                                float inOpacity)
{
    OverF<true, true>(inSrc, ioDst, inCount, inOpacity);
}

} // namespace

OverRow8Fn SelectOverRow8(bool inSrcStraight, bool inDstStraight)
{
    if (inSrcStraight)
        return inDstStraight ? OverRow8SS : OverRow8SP;
    return inDstStraight ? OverRow8PS : OverRow8PP;
}

OverRowFFn SelectOverRowF(bool inSrcStraight, bool inDstStraight)
{
    if (inSrcStraight)
        return inDstStraight ? OverRowFSS : OverRowFSP;
    return inDstStraight ? OverRowFPS : OverRowFPP;
}

IR_MULTIVERSION void CopyScaledRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                    std::int32_t inCount, float inOpacity, bool inStraight)
{
    if (inStraight)
    {
        // Straight colour is untouched by opacity; only alpha scales. A pixel whose alpha
        // is (or becomes) zero carries no colour, as over a cleared destination.
        const std::uint8_t visible = inOpacity > 0.0f ? 0xFF : 0;
        for (std::int32_t i = 0; i < inCount; ++i)
        {
            const std::uint8_t* s = inSrc + 4 * i;
            std::uint8_t* d = outDst + 4 * i;
            const std::uint8_t keep = s[3] != 0 ? visible : 0;
            d[0] = s[0] & keep;
            d[1] = s[1] & keep;
            d[2] = s[2] & keep;
            d[3] = inOpacity >= 1.0f ? s[3] : RoundTo8(s[3] * inOpacity);
        }
        return;
    }
    if (inOpacity >= 1.0f)
    {
        std::memcpy(outDst, inSrc, 4 * static_cast<std::size_t>(inCount));
        return;
    }
    for (std::int32_t i = 0; i < 4 * inCount; ++i)
        outDst[i] = RoundTo8(inSrc[i] * inOpacity);
}

// ---------------------------------------------------------------------------
// Mixing

void CrossDissolveRow8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
                       std::int32_t inBytes, float inWeight)
{
    Simd::MixRows8(inA, inB, outDst, inBytes,
                   static_cast<std::uint32_t>(std::lround(inWeight * 256.0f)));
}

IR_MULTIVERSION void CrossDissolveRowF(const float* inA, const float* inB, float* outDst,
                                       std::int32_t inFloats, float inWeight)
{
    const float wa = 1.0f - inWeight;
    for (std::int32_t i = 0; i < inFloats; ++i)
        outDst[i] = inA[i] * wa + inB[i] * inWeight;
}

IR_MULTIVERSION void AccumulateRow8(const std::uint8_t* inSrc, float* ioAcc, std::int32_t inCount,
                                    float inWeight)
{
    for (std::int32_t i = 0; i < inCount; ++i)
        ioAcc[i] += inWeight * inSrc[i];
}

IR_MULTIVERSION void AccumulateRowF(const float* inSrc, float* ioAcc, std::int32_t inCount,
                                    float inWeight)
{
    for (std::int32_t i = 0; i < inCount; ++i)
        ioAcc[i] += inWeight * inSrc[i];
}

IR_MULTIVERSION void StoreRow8(const float* inAcc, std::uint8_t* outDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
        outDst[i] = RoundTo8(inAcc[i]);
}

IR_MULTIVERSION void Row8ToF(const std::uint8_t* inSrc, float* outDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
        outDst[i] = inSrc[i] * (1.0f / 255.0f);
}

IR_MULTIVERSION void RowFTo8(const float* inSrc, std::uint8_t* outDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
        outDst[i] = RoundTo8(inSrc[i] * 255.0f);
}

void PremultipliedToStraightRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount)
{
    Simd::PremultipliedToStraightRow8(inSrc, outDst, inCount);
}

void StraightToPremultipliedRow8(const std::uint8_t* inSrc, std::uint8_t* outDst,
                                 std::int32_t inCount)
{
    Simd::StraightToPremultipliedRow8(inSrc, outDst, inCount);
}

namespace
{

// 4:2:0 coefficients in 16-bit fixed point on video-range codes.
struct FixedYUV
{
    std::int32_t y, crR, cbG, crG, cbB;
};

FixedYUV MakeFixedYUV(const YUVCoefficients& inK)
{
    constexpr float kScale = 65536.0f * 255.0f;
    return {static_cast<std::int32_t>(std::lround(kScale / 219.0f)),
            static_cast<std::int32_t>(std::lround(kScale * inK.crR / 224.0f)),
            static_cast<std::int32_t>(std::lround(kScale * inK.cbG / 224.0f)),
            static_cast<std::int32_t>(std::lround(kScale * inK.crG / 224.0f)),
            static_cast<std::int32_t>(std::lround(kScale * inK.cbB / 224.0f))};
}

} // namespace

void YUV420ToBGRARow8(const std::uint8_t* inY, const std::uint8_t* inU, const std::uint8_t* inV,
                      std::uint8_t* outDst, std::int32_t inWidth, bool inMatrix601)
{
    static const FixedYUV s601 = MakeFixedYUV(kBT601);
    static const FixedYUV s709 = MakeFixedYUV(kBT709);
    const FixedYUV& k = inMatrix601 ? s601 : s709;
    const std::int32_t coefficients[5] = {k.y, k.crR, k.cbG, k.crG, k.cbB};
    Simd::YUV420ToBGRARow8(inY, inU, inV, outDst, inWidth, coefficients);
}

IR_MULTIVERSION bool ToBlackRow8(std::uint8_t* ioRow, std::int32_t inCount, float inOpacity,
                                 bool inStraight)
{
    std::uint32_t minAlpha = 255;
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        std::uint8_t* p = ioRow + 4 * i;
        const std::uint32_t a = p[3];
        minAlpha = std::min(minAlpha, a);
        const float scale = inStraight ? a * (1.0f / 255.0f) * inOpacity : inOpacity;
        p[0] = RoundTo8(p[0] * scale);
        p[1] = RoundTo8(p[1] * scale);
        p[2] = RoundTo8(p[2] * scale);
        p[3] = 255;
    }
    return minAlpha < 255;
}

IR_MULTIVERSION bool ToBlackRowF(float* ioRow, std::int32_t inCount, float inOpacity,
                                 bool inStraight)
{
    float minAlpha = 1.0f;
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        float* p = ioRow + 4 * i;
        const float a = p[3];
        minAlpha = std::min(minAlpha, a);
        const float scale = inStraight ? a * inOpacity : inOpacity;
        p[0] *= scale;
        p[1] *= scale;
        p[2] *= scale;
        p[3] = 1.0f;
    }
    return minAlpha < 1.0f;
}

} // namespace IR::Kernels
