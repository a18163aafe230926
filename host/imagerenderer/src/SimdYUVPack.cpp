// Packing 8-bit BGRA or VUYA rows into planar Y'CbCr (IR/YUVPlanes.h).
//
// Written once with Highway and compiled for every x86 instruction set it supports
// plus a portable fallback; the best version is chosen on the first call. A vector
// holds one 32-bit lane per pixel: the pixels are loaded de-interleaved, widened,
// turned into Y, Cb and Cr codes in 16.16 fixed point and narrowed back to bytes.
// For 4:2:0 two rows are done together and the chroma codes of each 2x2 block are
// summed: the two rows lane by lane, then the even and odd lanes of two vectors.
// The last partial vector of a row goes through a small stack copy whose padding
// repeats the last pixel, so the tail gets exactly the arithmetic of the body and an
// odd width averages its last column with itself.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdYUVPack.cpp"
#include "IR/YUVPlanes.h"

#include <cmath>
#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::YUVPack::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

// inK: the nine 16.16 factors {Y from R, G, B; Cb from R, G, B; Cr from R, G, B}.
// inVUYA: the pixels are V, U, Y, A bytes taken as they are.

#if HWY_TARGET == HWY_SCALAR
HWY_INLINE void Codes(const std::uint8_t* inP, const std::int32_t* inK, bool inVUYA,
                      std::int32_t& outY, std::int32_t& outCb, std::int32_t& outCr)
{
    if (inVUYA)
    {
        outCr = inP[0];
        outCb = inP[1];
        outY = inP[2];
        return;
    }
    const std::int32_t b = inP[0], g = inP[1], r = inP[2];
    outY = ((16 << 16) + inK[0] * r + inK[1] * g + inK[2] * b + 32768) >> 16;
    outCb = ((128 << 16) + inK[3] * r + inK[4] * g + inK[5] * b + 32768) >> 16;
    outCr = ((128 << 16) + inK[6] * r + inK[7] * g + inK[8] * b + 32768) >> 16;
}

void PackRow444(const std::uint8_t* inSrc, std::uint8_t* outY, std::uint8_t* outCb,
                std::uint8_t* outCr, std::int32_t inWidth, const std::int32_t* inK, bool inVUYA)
{
    for (std::int32_t x = 0; x < inWidth; ++x)
    {
        std::int32_t y, cb, cr;
        Codes(inSrc + 4 * x, inK, inVUYA, y, cb, cr);
        outY[x] = static_cast<std::uint8_t>(y);
        outCb[x] = static_cast<std::uint8_t>(cb);
        outCr[x] = static_cast<std::uint8_t>(cr);
    }
}

void PackRowPair420(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outY0,
                    std::uint8_t* outY1, std::uint8_t* outCb, std::uint8_t* outCr,
                    std::int32_t inWidth, const std::int32_t* inK, bool inVUYA)
{
    for (std::int32_t cx = 0; cx < (inWidth + 1) / 2; ++cx)
    {
        std::int32_t sumCb = 0, sumCr = 0;
        for (std::int32_t dx = 0; dx < 2; ++dx)
        {
            const std::int32_t x = 2 * cx + dx < inWidth ? 2 * cx + dx : 2 * cx;
            std::int32_t y, cb, cr;
            Codes(inTop + 4 * x, inK, inVUYA, y, cb, cr);
            outY0[x] = static_cast<std::uint8_t>(y);
            sumCb += cb;
            sumCr += cr;
            Codes(inBottom + 4 * x, inK, inVUYA, y, cb, cr);
            if (outY1)
                outY1[x] = static_cast<std::uint8_t>(y);
            sumCb += cb;
            sumCr += cr;
        }
        outCb[cx] = static_cast<std::uint8_t>((sumCb + 2) >> 2);
        outCr[cx] = static_cast<std::uint8_t>((sumCr + 2) >> 2);
    }
}
#else
using DI = hn::ScalableTag<std::int32_t>;
using D8 = hn::Rebind<std::uint8_t, DI>;
using VI = hn::Vec<DI>;

// The codes of hn::Lanes(DI) pixels at inP.
HWY_INLINE void Codes(const std::uint8_t* inP, const std::int32_t* inK, bool inVUYA, VI& outY,
                      VI& outCb, VI& outCr)
{
    const DI di;
    const D8 d8;
    hn::Vec<D8> c0, c1, c2, c3;
    hn::LoadInterleaved4(d8, inP, c0, c1, c2, c3);
    const VI v0 = hn::PromoteTo(di, c0);
    const VI v1 = hn::PromoteTo(di, c1);
    const VI v2 = hn::PromoteTo(di, c2);
    if (inVUYA)
    {
        outCr = v0;
        outCb = v1;
        outY = v2;
        return;
    }
    const auto mix = [&](std::int32_t inBase, const std::int32_t* inF) HWY_ATTR
    {
        VI sum = hn::Set(di, (inBase << 16) + 32768);
        sum = hn::Add(sum, hn::Mul(hn::Set(di, inF[0]), v2));
        sum = hn::Add(sum, hn::Mul(hn::Set(di, inF[1]), v1));
        sum = hn::Add(sum, hn::Mul(hn::Set(di, inF[2]), v0));
        return hn::ShiftRight<16>(sum);
    };
    outY = mix(16, inK);
    outCb = mix(128, inK + 3);
    outCr = mix(128, inK + 6);
}

HWY_INLINE void StoreBytes(const VI& inV, std::uint8_t* outP)
{
    hn::StoreU(hn::DemoteTo(D8(), inV), D8(), outP);
}

// inCount pixels of inSrc into a stack row of inRoom pixels, the last pixel repeated.
HWY_INLINE void PadRow(const std::uint8_t* inSrc, std::size_t inCount, std::size_t inRoom,
                       std::uint8_t* outRow)
{
    std::memcpy(outRow, inSrc, 4 * inCount);
    for (std::size_t x = inCount; x < inRoom; ++x)
        std::memcpy(outRow + 4 * x, inSrc + 4 * (inCount - 1), 4);
}

void PackRow444(const std::uint8_t* inSrc, std::uint8_t* outY, std::uint8_t* outCb,
                std::uint8_t* outCr, std::int32_t inWidth, const std::int32_t* inK, bool inVUYA)
{
    const std::size_t n = hn::Lanes(DI());
    const auto width = static_cast<std::size_t>(inWidth);
    const auto body = [&](const std::uint8_t* inP, std::uint8_t* outYs, std::uint8_t* outCbs,
                          std::uint8_t* outCrs) HWY_ATTR
    {
        VI y, cb, cr;
        Codes(inP, inK, inVUYA, y, cb, cr);
        StoreBytes(y, outYs);
        StoreBytes(cb, outCbs);
        StoreBytes(cr, outCrs);
    };
    std::size_t x = 0;
    for (; x + n <= width; x += n)
        body(inSrc + 4 * x, outY + x, outCb + x, outCr + x);
    if (x == width)
        return;
    alignas(64) std::uint8_t row[HWY_MAX_BYTES * 4];
    alignas(64) std::uint8_t ys[HWY_MAX_BYTES], cbs[HWY_MAX_BYTES], crs[HWY_MAX_BYTES];
    const std::size_t rest = width - x;
    PadRow(inSrc + 4 * x, rest, n, row);
    body(row, ys, cbs, crs);
    std::memcpy(outY + x, ys, rest);
    std::memcpy(outCb + x, cbs, rest);
    std::memcpy(outCr + x, crs, rest);
}

void PackRowPair420(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outY0,
                    std::uint8_t* outY1, std::uint8_t* outCb, std::uint8_t* outCr,
                    std::int32_t inWidth, const std::int32_t* inK, bool inVUYA)
{
    const DI di;
    const std::size_t n = hn::Lanes(di);
    const auto width = static_cast<std::size_t>(inWidth);
    const VI two = hn::Set(di, 2);
    // 2n pixels of both rows: 2n luma samples of each row, n chroma samples.
    const auto body = [&](const std::uint8_t* inT, const std::uint8_t* inB, std::uint8_t* outY0s,
                          std::uint8_t* outY1s, std::uint8_t* outCbs, std::uint8_t* outCrs) HWY_ATTR
    {
        VI sumCb[2], sumCr[2];
        for (std::size_t half = 0; half < 2; ++half)
        {
            VI y, cb, cr, yb, cbb, crb;
            Codes(inT + 4 * n * half, inK, inVUYA, y, cb, cr);
            Codes(inB + 4 * n * half, inK, inVUYA, yb, cbb, crb);
            StoreBytes(y, outY0s + n * half);
            if (outY1s)
                StoreBytes(yb, outY1s + n * half);
            sumCb[half] = hn::Add(cb, cbb);
            sumCr[half] = hn::Add(cr, crb);
        }
        const auto pairs = [&](const VI* inSums) HWY_ATTR
        {
            const VI sum = hn::Add(hn::ConcatEven(di, inSums[1], inSums[0]),
                                   hn::ConcatOdd(di, inSums[1], inSums[0]));
            return hn::ShiftRight<2>(hn::Add(sum, two));
        };
        StoreBytes(pairs(sumCb), outCbs);
        StoreBytes(pairs(sumCr), outCrs);
    };
    std::size_t x = 0;
    for (; x + 2 * n <= width; x += 2 * n)
        body(inTop + 4 * x, inBottom + 4 * x, outY0 + x, outY1 ? outY1 + x : nullptr, outCb + x / 2,
             outCr + x / 2);
    if (x == width)
        return;
    alignas(64) std::uint8_t top[HWY_MAX_BYTES * 8], bottom[HWY_MAX_BYTES * 8];
    alignas(64) std::uint8_t y0s[HWY_MAX_BYTES * 2], y1s[HWY_MAX_BYTES * 2];
    alignas(64) std::uint8_t cbs[HWY_MAX_BYTES], crs[HWY_MAX_BYTES];
    const std::size_t rest = width - x;
    PadRow(inTop + 4 * x, rest, 2 * n, top);
    PadRow(inBottom + 4 * x, rest, 2 * n, bottom);
    body(top, bottom, y0s, y1s, cbs, crs);
    std::memcpy(outY0 + x, y0s, rest);
    if (outY1)
        std::memcpy(outY1 + x, y1s, rest);
    std::memcpy(outCb + x / 2, cbs, (rest + 1) / 2);
    std::memcpy(outCr + x / 2, crs, (rest + 1) / 2);
}
#endif

} // namespace IR::YUVPack::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::YUVPack
{

HWY_EXPORT(PackRow444);
HWY_EXPORT(PackRowPair420);

namespace
{

// The 16.16 factors of the conversion from gamma-encoded R, G, B codes.
void MakeFactors(bool inMatrix601, std::int32_t outK[9])
{
    const double kr = inMatrix601 ? 0.299 : 0.2126;
    const double kb = inMatrix601 ? 0.114 : 0.0722;
    const double kg = 1.0 - kr - kb;
    const double luma = 219.0 / 255.0;
    const double chroma = 224.0 / 255.0;
    const double factors[9] = {
        luma * kr,
        luma * kg,
        luma * kb,
        -chroma * kr / (2 * (1 - kb)),
        -chroma * kg / (2 * (1 - kb)),
        chroma * 0.5,
        chroma * 0.5,
        -chroma * kg / (2 * (1 - kr)),
        -chroma * kb / (2 * (1 - kr)),
    };
    for (int i = 0; i < 9; ++i)
        outK[i] = static_cast<std::int32_t>(std::lround(factors[i] * 65536.0));
}

} // namespace
} // namespace IR::YUVPack

std::int32_t IR_PackYUVPlanes(const void* inSrc, std::int32_t inSrcRowBytes,
                              IR_PixelFormat inSrcFormat, bool inMatrix601, std::uint8_t* outY,
                              std::int32_t inYRowBytes, std::uint8_t* outCb,
                              std::int32_t inCbRowBytes, std::uint8_t* outCr,
                              std::int32_t inCrRowBytes, bool inSubsampled, std::int32_t inWidth,
                              std::int32_t inHeight)
{
    using namespace IR::YUVPack;
    const bool vuya = inSrcFormat == kIR_PixelFormat_VUYA_4444_8u;
    if ((!vuya && inSrcFormat != kIR_PixelFormat_BGRA_8u) || inSrc == nullptr || outY == nullptr ||
        outCb == nullptr || outCr == nullptr || inWidth < 1 || inHeight < 1)
        return kIR_UnsupportedFormat;
    std::int32_t k[9];
    MakeFactors(inMatrix601, k);
    const auto* src = static_cast<const std::uint8_t*>(inSrc);
    const auto row = [](auto* inBase, std::int32_t inRowBytes, std::int32_t inY)
    { return inBase + static_cast<std::ptrdiff_t>(inY) * inRowBytes; };
    if (!inSubsampled)
    {
        for (std::int32_t y = 0; y < inHeight; ++y)
            HWY_DYNAMIC_DISPATCH(PackRow444)
        (row(src, inSrcRowBytes, y), row(outY, inYRowBytes, y), row(outCb, inCbRowBytes, y),
         row(outCr, inCrRowBytes, y), inWidth, k, vuya);
        return kIR_NoError;
    }
    for (std::int32_t y = 0; y < inHeight; y += 2)
    {
        // The last row of an odd height is its own partner.
        const bool pair = y + 1 < inHeight;
        const std::uint8_t* top = row(src, inSrcRowBytes, y);
        HWY_DYNAMIC_DISPATCH(PackRowPair420)
        (top, pair ? top + inSrcRowBytes : top, row(outY, inYRowBytes, y),
         pair ? row(outY, inYRowBytes, y + 1) : nullptr, row(outCb, inCbRowBytes, y / 2),
         row(outCr, inCrRowBytes, y / 2), inWidth, k, vuya);
    }
    return kIR_NoError;
}
#endif
