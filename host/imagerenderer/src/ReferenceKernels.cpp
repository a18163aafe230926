#include "ReferenceKernels.h"

#include <algorithm>
#include <cmath>
#include <cstring>

namespace IR::Reference
{

namespace
{

bool IsFloat(IR_PixelFormat inFormat)
{
    return (inFormat & kIR_FormatBit_Float) != 0;
}

bool IsStraight(IR_PixelFormat inFormat)
{
    return (inFormat & kIR_FormatBit_StraightAlpha) != 0;
}

// Reads pixel x of a row as doubles 0..1 (8-bit) or as stored (float).
void Get(const void* inRow, bool inFloat, std::int32_t inX, double outP[4])
{
    for (int c = 0; c < 4; ++c)
    {
        if (inFloat)
        {
            float v;
            std::memcpy(&v, static_cast<const std::uint8_t*>(inRow) + 16 * inX + 4 * c, 4);
            outP[c] = v;
        }
        else
        {
            outP[c] = static_cast<const std::uint8_t*>(inRow)[4 * inX + c] / 255.0;
        }
    }
}

void Put(void* inRow, bool inFloat, std::int32_t inX, const double inP[4])
{
    for (int c = 0; c < 4; ++c)
    {
        if (inFloat)
        {
            const float v = static_cast<float>(inP[c]);
            std::memcpy(static_cast<std::uint8_t*>(inRow) + 16 * inX + 4 * c, &v, 4);
        }
        else
        {
            static_cast<std::uint8_t*>(inRow)[4 * inX + c] =
                static_cast<std::uint8_t>(std::lround(std::clamp(inP[c], 0.0, 1.0) * 255.0));
        }
    }
}

const std::uint8_t* RowOf(const void* inBase, std::int32_t inRowBytes, std::int32_t inY)
{
    return static_cast<const std::uint8_t*>(inBase) + static_cast<std::ptrdiff_t>(inY) * inRowBytes;
}

std::uint8_t* RowOf(void* inBase, std::int32_t inRowBytes, std::int32_t inY)
{
    return static_cast<std::uint8_t*>(inBase) + static_cast<std::ptrdiff_t>(inY) * inRowBytes;
}

// Over of premultiplied source s onto destination d (association as flagged).
void OverPixel(const double inS[4], bool inSrcStraight, double ioD[4], bool inDstStraight,
               double inOpacity)
{
    const double sa = inS[3] * inOpacity;
    double sp[3];
    for (int c = 0; c < 3; ++c)
        sp[c] = inSrcStraight ? inS[c] * sa : inS[c] * inOpacity;
    const double da = ioD[3];
    const double outA = sa + da * (1.0 - sa);
    for (int c = 0; c < 3; ++c)
    {
        const double dp = inDstStraight ? ioD[c] * da : ioD[c];
        const double r = sp[c] + dp * (1.0 - sa);
        ioD[c] = inDstStraight ? (outA > 0.0 ? r / outA : 0.0) : r;
    }
    ioD[3] = outA;
}

} // namespace

void Composite(const void* inSrc, std::int32_t inSrcRowBytes, void* ioDst,
               std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
               std::int32_t inHeight, double inOpacity)
{
    const bool isFloat = IsFloat(inFormat);
    const bool straight = IsStraight(inFormat);
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double s[4], d[4];
            Get(RowOf(inSrc, inSrcRowBytes, y), isFloat, x, s);
            Get(RowOf(ioDst, inDstRowBytes, y), isFloat, x, d);
            OverPixel(s, straight, d, straight, inOpacity);
            Put(RowOf(ioDst, inDstRowBytes, y), isFloat, x, d);
        }
}

void CrossDissolve(const void* inA, std::int32_t inARowBytes, const void* inB,
                   std::int32_t inBRowBytes, void* outDst, std::int32_t inDstRowBytes,
                   IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
                   double inWeight)
{
    const void* srcs[2] = {inA, inB};
    const std::int32_t rowBytes[2] = {inARowBytes, inBRowBytes};
    const double weights[2] = {1.0 - inWeight, inWeight};
    Accumulate(srcs, rowBytes, weights, 2, outDst, inDstRowBytes, inFormat, inWidth, inHeight);
}

void Accumulate(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                const double* inWeights, std::int32_t inCount, void* outDst,
                std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
                std::int32_t inHeight)
{
    const bool isFloat = IsFloat(inFormat);
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double sum[4] = {0.0, 0.0, 0.0, 0.0};
            for (std::int32_t i = 0; i < inCount; ++i)
            {
                double p[4];
                Get(RowOf(inSrcs[i], inSrcRowBytes[i], y), isFloat, x, p);
                for (int c = 0; c < 4; ++c)
                    sum[c] += inWeights[i] * p[c];
            }
            if (isFloat)
                sum[3] = std::clamp(sum[3], 0.0, 1.0);
            Put(RowOf(outDst, inDstRowBytes, y), isFloat, x, sum);
        }
}

void AccumulateLinear8(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                       const double* inWeights, std::int32_t inCount, void* outDst,
                       std::int32_t inDstRowBytes, bool inPremultiplied, std::int32_t inWidth,
                       std::int32_t inHeight)
{
    const auto toLinear = [](double inC)
    { return inC <= 0.04045 ? inC / 12.92 : std::pow((inC + 0.055) / 1.055, 2.4); };
    const auto toEncoded = [](double inL)
    { return inL <= 0.0031308 ? inL * 12.92 : 1.055 * std::pow(inL, 1.0 / 2.4) - 0.055; };
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double sum[4] = {0.0, 0.0, 0.0, 0.0};
            for (std::int32_t i = 0; i < inCount; ++i)
            {
                double p[4];
                Get(RowOf(inSrcs[i], inSrcRowBytes[i], y), false, x, p);
                for (int c = 0; c < 3; ++c)
                {
                    double linear = toLinear(p[c]);
                    if (inPremultiplied)
                        linear = p[3] > 0.0 ? toLinear(std::min(1.0, p[c] / p[3])) * p[3] : 0.0;
                    sum[c] += inWeights[i] * linear;
                }
                sum[3] += inWeights[i] * p[3];
            }
            const double a = std::clamp(sum[3], 0.0, 1.0);
            double out[4] = {0.0, 0.0, 0.0, a};
            for (int c = 0; c < 3; ++c)
            {
                if (!inPremultiplied)
                    out[c] = toEncoded(std::clamp(sum[c], 0.0, 1.0));
                else if (a > 0.0)
                    out[c] = toEncoded(std::clamp(sum[c] / a, 0.0, 1.0)) * a;
            }
            Put(RowOf(outDst, inDstRowBytes, y), false, x, out);
        }
}

void PremultipliedToStraight8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                              std::uint8_t* outDst, std::int32_t inDstRowBytes,
                              std::int32_t inWidth, std::int32_t inHeight)
{
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double p[4];
            Get(RowOf(inSrc, inSrcRowBytes, y), false, x, p);
            for (int c = 0; c < 3; ++c)
                p[c] = p[3] > 0.0 ? std::min(1.0, p[c] / p[3]) : 0.0;
            Put(RowOf(outDst, inDstRowBytes, y), false, x, p);
        }
}

void StraightToPremultiplied8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                              std::uint8_t* outDst, std::int32_t inDstRowBytes,
                              std::int32_t inWidth, std::int32_t inHeight)
{
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double p[4];
            Get(RowOf(inSrc, inSrcRowBytes, y), false, x, p);
            for (int c = 0; c < 3; ++c)
                p[c] *= p[3];
            Put(RowOf(outDst, inDstRowBytes, y), false, x, p);
        }
}

void YUV420ToBGRA8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes, bool inMatrix601,
                   std::uint8_t* outDst, std::int32_t inDstRowBytes, std::int32_t inWidth,
                   std::int32_t inHeight)
{
    const double kr = inMatrix601 ? 0.299 : 0.2126;
    const double kb = inMatrix601 ? 0.114 : 0.0722;
    const double kg = 1.0 - kr - kb;
    const std::uint8_t* u = inSrc + static_cast<std::ptrdiff_t>(inSrcRowBytes) * inHeight;
    const std::uint8_t* v =
        u + static_cast<std::ptrdiff_t>(inSrcRowBytes / 2) * ((inHeight + 1) / 2);
    for (std::int32_t y = 0; y < inHeight; ++y)
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            const double luma = (RowOf(inSrc, inSrcRowBytes, y)[x] - 16) / 219.0;
            const double cb = (u[(y / 2) * (inSrcRowBytes / 2) + x / 2] - 128) / 224.0;
            const double cr = (v[(y / 2) * (inSrcRowBytes / 2) + x / 2] - 128) / 224.0;
            const double r = luma + 2.0 * (1.0 - kr) * cr;
            const double b = luma + 2.0 * (1.0 - kb) * cb;
            const double g = (luma - kr * r - kb * b) / kg;
            const double p[4] = {b, g, r, 1.0};
            Put(RowOf(outDst, inDstRowBytes, y), false, x, p);
        }
}

void Motion8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes, std::int32_t inSrcWidth,
             std::int32_t inSrcHeight, std::uint8_t* ioDst, std::int32_t inDstRowBytes,
             std::int32_t inDstWidth, std::int32_t inDstHeight, bool inStraight,
             const IR_AffineMatrix& inMatrix, double inOpacity, std::int32_t inQuality,
             bool inHasLowerFrame)
{
    const IR_AffineMatrix& m = inMatrix;
    const double det = m.a * m.d - m.b * m.c;
    // Premultiplied source pixel, transparent outside the source.
    auto tap = [&](std::int64_t inX, std::int64_t inY, double outP[4])
    {
        if (inX < 0 || inY < 0 || inX >= inSrcWidth || inY >= inSrcHeight)
        {
            outP[0] = outP[1] = outP[2] = outP[3] = 0.0;
            return;
        }
        Get(RowOf(inSrc, inSrcRowBytes, static_cast<std::int32_t>(inY)), false,
            static_cast<std::int32_t>(inX), outP);
        if (inStraight)
            for (int c = 0; c < 3; ++c)
                outP[c] *= outP[3];
    };
    for (std::int32_t y = 0; y < inDstHeight; ++y)
        for (std::int32_t x = 0; x < inDstWidth; ++x)
        {
            const double xd = x + 0.5 - m.tx;
            const double yd = y + 0.5 - m.ty;
            const double u = (m.d * xd - m.c * yd) / det;
            const double v = (-m.b * xd + m.a * yd) / det;
            double s[4];
            if (inQuality >= 3)
            {
                const double bu = u - 0.5;
                const double bv = v - 0.5;
                const auto ix = static_cast<std::int64_t>(std::floor(bu));
                const auto iy = static_cast<std::int64_t>(std::floor(bv));
                const double fx = bu - std::floor(bu);
                const double fy = bv - std::floor(bv);
                double p00[4], p01[4], p10[4], p11[4];
                tap(ix, iy, p00);
                tap(ix + 1, iy, p01);
                tap(ix, iy + 1, p10);
                tap(ix + 1, iy + 1, p11);
                for (int c = 0; c < 4; ++c)
                    s[c] = (p00[c] * (1 - fx) + p01[c] * fx) * (1 - fy) +
                           (p10[c] * (1 - fx) + p11[c] * fx) * fy;
            }
            else
            {
                tap(static_cast<std::int64_t>(std::floor(u)),
                    static_cast<std::int64_t>(std::floor(v)), s);
            }
            std::uint8_t* row = RowOf(ioDst, inDstRowBytes, y);
            double d[4] = {0.0, 0.0, 0.0, 0.0};
            if (inHasLowerFrame)
                Get(row, false, x, d);
            OverPixel(s, false, d, inStraight, inOpacity);
            Put(row, false, x, d);
        }
}

void BlendPixel(std::uint32_t inMode, const double inSrc[4], const double inDst[4],
                double outPremultiplied[4])
{
    const double as = inSrc[3];
    const double ab = inDst[3];
    for (int c = 0; c < 3; ++c)
    {
        const double cs = inSrc[c];
        const double cb = inDst[c];
        double b = cs;
        switch (inMode)
        {
        case kIR_BlendMode_Multiply:
            b = cb * cs;
            break;
        case kIR_BlendMode_Screen:
            b = cb + cs - cb * cs;
            break;
        case kIR_BlendMode_Darken:
            b = std::min(cb, cs);
            break;
        case kIR_BlendMode_Lighten:
            b = std::max(cb, cs);
            break;
        case kIR_BlendMode_Add:
            b = std::min(1.0, cb + cs);
            break;
        case kIR_BlendMode_Subtract:
            b = std::max(0.0, cb - cs);
            break;
        case kIR_BlendMode_Difference:
            b = std::fabs(cb - cs);
            break;
        case kIR_BlendMode_Overlay:
            b = cb <= 0.5 ? 2.0 * cb * cs : 1.0 - 2.0 * (1.0 - cb) * (1.0 - cs);
            break;
        default:
            break;
        }
        outPremultiplied[c] = (1.0 - ab) * as * cs + (1.0 - as) * ab * cb + as * ab * b;
    }
    outPremultiplied[3] = as + ab - as * ab;
}

} // namespace IR::Reference
