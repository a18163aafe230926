// Motion: drawing a source through an affine transform onto a destination, with
// field selection, opacity, blend modes and quality-dependent sampling.
//
// Paths, chosen once per call:
// - 8-bit, quality below 5, normal blend:
//   - a move by whole pixels (identity included) composites shifted rows directly;
//   - bilinear scaling without rotation mixes two source rows with one weight, then
//     neighbouring pixels of that row (MotionSeparable8);
//   - anything else samples each row into 8-bit pixels (nearest, or bilinear with
//     8-bit weights in 64-bit lanes);
//   and composites the row with the 8-bit over kernel.
// - everything else: the source is seen as a float premultiplied image (converted
//   once into scratch memory when it is not already one, in linear light at
//   quality 5), sampled into float rows and blended in float.
// Each destination row touches only the span where the source can contribute.

#include "Blend.h"
#include "Checks.h"
#include "Kernels.h"
#include "SimdKernels.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>

namespace
{

using IR::FormatInfo;
using IR::View;

struct Inverse
{
    // Source position of a destination point: xs = a * xd + c * yd + tx, ys = b * xd + d * yd + ty.
    double a, b, c, d, tx, ty;
};

bool Invert(const IR_AffineMatrix& inM, Inverse& outInverse)
{
    const double det = inM.a * inM.d - inM.b * inM.c;
    if (!(std::fabs(det) > 1e-12))
        return false;
    const double r = 1.0 / det;
    outInverse.a = inM.d * r;
    outInverse.c = -inM.c * r;
    outInverse.b = -inM.b * r;
    outInverse.d = inM.a * r;
    outInverse.tx = -(outInverse.a * inM.tx + outInverse.c * inM.ty);
    outInverse.ty = -(outInverse.b * inM.tx + outInverse.d * inM.ty);
    return true;
}

// The destination columns [x0, x1) of row y whose centres map into the source
// rectangle grown by inMargin source pixels on every side.
void RowSpan(const Inverse& inInv, std::int32_t inY, std::int32_t inSrcW, std::int32_t inSrcH,
             std::int32_t inDstW, double inMargin, std::int32_t& outX0, std::int32_t& outX1)
{
    double lo = -std::numeric_limits<double>::infinity();
    double hi = std::numeric_limits<double>::infinity();
    const double yc = inY + 0.5;
    auto limit = [&](double inBase, double inStep, double inMax)
    {
        // inBase + inStep * xc within (-margin, inMax + margin), xc = x + 0.5.
        const double minV = -inMargin;
        const double maxV = inMax + inMargin;
        if (std::fabs(inStep) < 1e-15)
        {
            if (inBase <= minV || inBase >= maxV)
                hi = lo - 1.0;
            return;
        }
        double t0 = (minV - inBase) / inStep;
        double t1 = (maxV - inBase) / inStep;
        if (t0 > t1)
            std::swap(t0, t1);
        lo = std::max(lo, t0);
        hi = std::min(hi, t1);
    };
    limit(inInv.c * yc + inInv.tx, inInv.a, inSrcW);
    limit(inInv.d * yc + inInv.ty, inInv.b, inSrcH);
    if (!(hi > lo))
    {
        outX0 = outX1 = 0;
        return;
    }
    // One column of slack on each side; the samplers treat outside taps as transparent.
    const double x0 = std::floor(lo - 0.5) - 1.0;
    const double x1 = std::ceil(hi - 0.5) + 2.0;
    outX0 = static_cast<std::int32_t>(std::clamp(x0, 0.0, static_cast<double>(inDstW)));
    outX1 = static_cast<std::int32_t>(std::clamp(x1, 0.0, static_cast<double>(inDstW)));
}

// ---------------------------------------------------------------------------
// 8-bit sampling

inline std::uint32_t Load32(const std::uint8_t* inP)
{
    std::uint32_t v;
    std::memcpy(&v, inP, 4);
    return v;
}

constexpr std::uint64_t kLaneMask = 0x00FF00FF00FF00FFull;
constexpr std::uint64_t kLaneHalf = 0x0080008000800080ull;

// B, G, R, A bytes spread into four 16-bit lanes (B, R, G, A).
inline std::uint64_t Expand(std::uint32_t inP)
{
    const std::uint64_t q = inP;
    return (q | (q << 24)) & kLaneMask;
}

inline std::uint32_t Pack(std::uint64_t inE)
{
    return static_cast<std::uint32_t>(inE | (inE >> 24));
}

// (e0 * (256 - f) + e1 * f + 128) >> 8 in every lane; lanes never carry into each other
// because 255 * 256 + 128 < 65536.
inline std::uint64_t Lerp(std::uint64_t inE0, std::uint64_t inE1, std::uint32_t inF)
{
    return ((inE0 * (256 - inF) + inE1 * inF + kLaneHalf) >> 8) & kLaneMask;
}

// Bilinear mix of four straight pixels with colour weighted by alpha; the result is
// straight (colour 0 where the mixed alpha is 0).
std::uint32_t WeightedStraight(std::uint32_t inP00, std::uint32_t inP01, std::uint32_t inP10,
                               std::uint32_t inP11, std::uint32_t inFx, std::uint32_t inFy)
{
    const float fx = inFx * (1.0f / 256.0f);
    const float fy = inFy * (1.0f / 256.0f);
    const std::uint32_t taps[4] = {inP00, inP01, inP10, inP11};
    const float weights[4] = {(1.0f - fx) * (1.0f - fy), fx * (1.0f - fy), (1.0f - fx) * fy,
                              fx * fy};
    float alpha = 0.0f;
    float colour[3] = {0.0f, 0.0f, 0.0f};
    for (int k = 0; k < 4; ++k)
    {
        const float wa = weights[k] * static_cast<float>(taps[k] >> 24);
        alpha += wa;
        for (int c = 0; c < 3; ++c)
            colour[c] += wa * static_cast<float>((taps[k] >> (8 * c)) & 0xFF);
    }
    if (alpha <= 0.0f)
        return 0;
    std::uint32_t out = static_cast<std::uint32_t>(std::min(alpha + 0.5f, 255.0f)) << 24;
    for (int c = 0; c < 3; ++c)
        out |= static_cast<std::uint32_t>(std::min(colour[c] / alpha + 0.5f, 255.0f)) << (8 * c);
    return out;
}

// Each byte times inWeight / 256, rounded (one source row mixed with a transparent one).
void ScaleRowToward(std::uint8_t* ioRow, std::size_t inBytes, std::uint32_t inWeight)
{
    for (std::size_t i = 0; i < inBytes; ++i)
        ioRow[i] = static_cast<std::uint8_t>((ioRow[i] * inWeight + 128) >> 8);
}

template <bool kStraight>
class Sampler8
{
public:
    Sampler8(const View& inView, std::int32_t inW, std::int32_t inH)
        : mView(inView)
        , mW(inW)
        , mH(inH)
    {
    }

    std::uint32_t Tap(std::int64_t inX, std::int64_t inY) const
    {
        if (static_cast<std::uint64_t>(inX) >= static_cast<std::uint64_t>(mW) ||
            static_cast<std::uint64_t>(inY) >= static_cast<std::uint64_t>(mH))
            return 0;
        return Load32(mView.Row(static_cast<std::int32_t>(inY)) + 4 * inX);
    }

    // Positions in 32.32 fixed point, already shifted by -0.5 for bilinear.
    void Bilinear(std::int64_t inU, std::int64_t inV, std::int64_t inDU, std::int64_t inDV,
                  std::uint32_t* outRow, std::int32_t inCount) const
    {
        for (std::int32_t i = 0; i < inCount; ++i, inU += inDU, inV += inDV)
        {
            const std::int64_t x = inU >> 32;
            const std::int64_t y = inV >> 32;
            const std::uint32_t fx = static_cast<std::uint32_t>(inU >> 24) & 0xFF;
            const std::uint32_t fy = static_cast<std::uint32_t>(inV >> 24) & 0xFF;
            std::uint32_t p00, p01, p10, p11;
            if (x >= 0 && y >= 0 && x + 1 < mW && y + 1 < mH)
            {
                const std::uint8_t* r0 = mView.Row(static_cast<std::int32_t>(y)) + 4 * x;
                const std::uint8_t* r1 = r0 + mView.step;
                p00 = Load32(r0);
                p01 = Load32(r0 + 4);
                p10 = Load32(r1);
                p11 = Load32(r1 + 4);
            }
            else
            {
                p00 = Tap(x, y);
                p01 = Tap(x + 1, y);
                p10 = Tap(x, y + 1);
                p11 = Tap(x + 1, y + 1);
            }
            if constexpr (kStraight)
            {
                // Straight colour interpolates directly only between taps of equal alpha
                // (opaque video, the common case); otherwise weigh colour by alpha.
                const std::uint32_t a = p00 >> 24;
                if ((p01 >> 24) != a || (p10 >> 24) != a || (p11 >> 24) != a)
                {
                    outRow[i] = WeightedStraight(p00, p01, p10, p11, fx, fy);
                    continue;
                }
            }
            const std::uint64_t top = Lerp(Expand(p00), Expand(p01), fx);
            const std::uint64_t bottom = Lerp(Expand(p10), Expand(p11), fx);
            outRow[i] = Pack(Lerp(top, bottom, fy));
        }
    }

    void Nearest(std::int64_t inU, std::int64_t inV, std::int64_t inDU, std::int64_t inDV,
                 std::uint32_t* outRow, std::int32_t inCount) const
    {
        for (std::int32_t i = 0; i < inCount; ++i, inU += inDU, inV += inDV)
            outRow[i] = Tap(inU >> 32, inV >> 32);
    }

private:
    View mView;
    std::int32_t mW;
    std::int32_t mH;
};

inline std::int64_t ToFixed(double inV)
{
    return static_cast<std::int64_t>(std::llround(inV * 4294967296.0));
}

// ---------------------------------------------------------------------------
// Float sampling on a premultiplied float image.

class SamplerF
{
public:
    SamplerF(const std::uint8_t* inBase, std::ptrdiff_t inStep, std::int32_t inW, std::int32_t inH)
        : mBase(inBase)
        , mStep(inStep)
        , mW(inW)
        , mH(inH)
    {
    }

    const float* Tap(std::int64_t inX, std::int64_t inY) const
    {
        static const float kZero[4] = {0.0f, 0.0f, 0.0f, 0.0f};
        if (static_cast<std::uint64_t>(inX) >= static_cast<std::uint64_t>(mW) ||
            static_cast<std::uint64_t>(inY) >= static_cast<std::uint64_t>(mH))
            return kZero;
        return reinterpret_cast<const float*>(mBase + inY * mStep) + 4 * inX;
    }

    void Nearest(double inU, double inV, float* outP) const
    {
        const float* p = Tap(static_cast<std::int64_t>(std::floor(inU)),
                             static_cast<std::int64_t>(std::floor(inV)));
        std::memcpy(outP, p, 16);
    }

    // inU, inV are source positions of pixel centres (not shifted).
    void Bilinear(double inU, double inV, float* outP) const
    {
        const double u = inU - 0.5;
        const double v = inV - 0.5;
        const double fu = std::floor(u);
        const double fv = std::floor(v);
        const auto x = static_cast<std::int64_t>(fu);
        const auto y = static_cast<std::int64_t>(fv);
        const float wx = static_cast<float>(u - fu);
        const float wy = static_cast<float>(v - fv);
        const float* p00 = Tap(x, y);
        const float* p01 = Tap(x + 1, y);
        const float* p10 = Tap(x, y + 1);
        const float* p11 = Tap(x + 1, y + 1);
        for (int c = 0; c < 4; ++c)
        {
            const float top = p00[c] + (p01[c] - p00[c]) * wx;
            const float bottom = p10[c] + (p11[c] - p10[c]) * wx;
            outP[c] = top + (bottom - top) * wy;
        }
    }

private:
    const std::uint8_t* mBase;
    std::ptrdiff_t mStep;
    std::int32_t mW;
    std::int32_t mH;
};

struct MotionCall
{
    const void* src;
    std::int32_t srcRowBytes;
    IR_PixelFormat srcFormat;
    std::int32_t srcW, srcH;
    void* dst;
    std::int32_t dstRowBytes;
    IR_PixelFormat dstFormat;
    std::int32_t dstW, dstH;
    const IR_AffineMatrix* matrix;
    float opacity;
    std::int32_t quality;
    std::int32_t field;
    bool hasLower;
    std::uint32_t mode;
};

std::int32_t FirstRow(std::int32_t inField)
{
    return inField == kIR_Field_Second ? 1 : 0;
}

std::int32_t RowStride(std::int32_t inField)
{
    return inField == kIR_Field_All ? 1 : 2;
}

// Bilinear motion without rotation or shear (scaling and translation only): the
// filter separates. Each destination row mixes two source rows vertically with one
// weight into a premultiplied row (vectorised), then each destination pixel mixes
// two neighbours of that row horizontally (vectorised: pairs at a fixed stride when the
// step is exactly one or two source pixels, gathered pairs otherwise); column positions
// and weights are the same for every row and are computed once. Premultiplied samples
// over a premultiplied lower frame at full opacity are composited as they are made.
// Straight sources are premultiplied row by row first, so the mix weighs colour by
// alpha as the general sampler does.
std::int32_t MotionSeparable8(const MotionCall& inCall, const FormatInfo& inInfo,
                              const Inverse& inInv)
{
    const View srcView = IR::MakeView(inCall.src, inCall.srcRowBytes,
                                      IR::RequireFormat(inCall.srcFormat), inCall.srcH);
    const View dstView = IR::MakeView(inCall.dst, inCall.dstRowBytes,
                                      IR::RequireFormat(inCall.dstFormat), inCall.dstH);
    const bool straight = inInfo.alpha == IR::Alpha::kStraight;
    const std::int32_t srcW = inCall.srcW;
    const std::int32_t dstW = inCall.dstW;
    // Source columns -2 .. srcW + 1 so that taps just outside the source read transparent
    // pixels: the row spans keep every tap inside that range.
    constexpr std::int32_t kPad = 2;
    const std::size_t paddedPixels = static_cast<std::size_t>(srcW) + 2 * kPad;
    const std::size_t srcRowBytes = static_cast<std::size_t>(srcW) * 4;
    IR::ScratchBlock scratch(paddedPixels * 4 + 2 * srcRowBytes +
                             static_cast<std::size_t>(dstW) * 12);
    if (!scratch.Valid())
        return kIR_OutOfMemory;
    std::uint8_t* mixed = scratch.Bytes();
    std::uint8_t* top = mixed + paddedPixels * 4;
    std::uint8_t* bottom = top + srcRowBytes;
    auto* samples = reinterpret_cast<std::uint32_t*>(bottom + srcRowBytes);
    auto* columns = reinterpret_cast<std::int32_t*>(samples + dstW);
    auto* weights = reinterpret_cast<std::uint32_t*>(columns + dstW);
    std::memset(mixed, 0, paddedPixels * 4);
    // Positions in 32.32 fixed point shifted by half a pixel, as the general sampler.
    const std::int64_t dU = ToFixed(inInv.a);
    const std::int64_t u0 = ToFixed(inInv.a * 0.5 + inInv.tx - 0.5);
    for (std::int32_t x = 0; x < dstW; ++x)
    {
        const std::int64_t u = u0 + dU * x;
        columns[x] = static_cast<std::int32_t>(std::clamp<std::int64_t>(u >> 32, -kPad, srcW));
        weights[x] = static_cast<std::uint32_t>(u >> 24) & 0xFF;
    }
    // A step of exactly one or two source pixels (same size, or exactly half) gives every
    // column the same weight and pairs at a fixed stride: no gather is needed where no
    // column was clamped, i.e. on the columns [evenX0, evenX1).
    std::int32_t stride = 0;
    std::int32_t evenX0 = 0, evenX1 = 0;
    if (dU == (std::int64_t{1} << 32) || dU == (std::int64_t{2} << 32))
    {
        stride = static_cast<std::int32_t>(dU >> 32);
        const std::int64_t first = u0 >> 32;
        // Columns first + stride * x within [-kPad, srcW].
        const std::int64_t lo = (-kPad - first + stride - 1) / stride;
        const std::int64_t loClamped = first >= -kPad ? 0 : lo;
        const std::int64_t hi = srcW - first < 0 ? -1 : (srcW - first) / stride;
        evenX0 = static_cast<std::int32_t>(std::clamp<std::int64_t>(loClamped, 0, dstW));
        evenX1 = static_cast<std::int32_t>(std::clamp<std::int64_t>(hi + 1, evenX0, dstW));
    }
    // Premultiplied samples over a premultiplied destination at full opacity are
    // composited as they are made, without a pass through a sample row.
    const bool fuseOver = inCall.hasLower && !straight && inCall.opacity >= 1.0f;
    auto horizontal =
        [&](const std::uint8_t* inMid, std::int32_t inX0, std::int32_t inX1, std::uint8_t* ioOut)
    {
        auto gathered = [&](std::int32_t inA, std::int32_t inB)
        {
            if (inB > inA)
                IR::Simd::MixGatheredPairsRow8(inMid, columns + inA, weights + inA,
                                               ioOut + 4 * static_cast<std::ptrdiff_t>(inA - inX0),
                                               inB - inA, fuseOver);
        };
        const std::int32_t a = std::clamp(evenX0, inX0, inX1);
        const std::int32_t b = std::clamp(evenX1, a, inX1);
        if (stride == 0 || b <= a)
        {
            gathered(inX0, inX1);
            return;
        }
        gathered(inX0, a);
        IR::Simd::MixPixelPairsRow8(inMid + 4 * static_cast<std::ptrdiff_t>(columns[a]), stride,
                                    weights[a], ioOut + 4 * static_cast<std::ptrdiff_t>(a - inX0),
                                    b - a, fuseOver);
        gathered(b, inX1);
    };
    const auto over = IR::Kernels::SelectOverRow8(false, straight);
    // A source row, premultiplied at least in columns [inC0, inC1), or nullptr outside the
    // source (transparent).
    auto sourceRow = [&](std::int64_t inY, std::uint8_t* inScratch, std::int32_t inC0,
                         std::int32_t inC1) -> const std::uint8_t*
    {
        if (inY < 0 || inY >= inCall.srcH)
            return nullptr;
        const std::uint8_t* row = srcView.Row(static_cast<std::int32_t>(inY));
        if (!straight)
            return row;
        IR::Kernels::StraightToPremultipliedRow8(row + 4 * inC0, inScratch + 4 * inC0, inC1 - inC0);
        return inScratch;
    };
    for (std::int32_t y = FirstRow(inCall.field); y < inCall.dstH; y += RowStride(inCall.field))
    {
        std::uint8_t* dstRow = dstView.Row(y);
        if (!inCall.hasLower)
            std::memset(dstRow, 0, static_cast<std::size_t>(dstW) * 4);
        std::int32_t x0, x1;
        RowSpan(inInv, y, srcW, inCall.srcH, dstW, 1.0, x0, x1);
        if (x1 <= x0)
            continue;
        const std::int64_t v = ToFixed(inInv.d * (y + 0.5) + inInv.ty - 0.5);
        const std::int64_t sy = v >> 32;
        const std::uint32_t fy = static_cast<std::uint32_t>(v >> 24) & 0xFF;
        // Only the source columns this row's taps read are mixed; columns run monotonically
        // (backwards for a mirror image), so the ends of the span bound them.
        const std::int32_t c0 = std::clamp(std::min(columns[x0], columns[x1 - 1]), 0, srcW);
        const std::int32_t c1 = std::clamp(std::max(columns[x0], columns[x1 - 1]) + 2, c0, srcW);
        const std::size_t mixOffset = static_cast<std::size_t>(c0) * 4;
        const std::size_t mixBytes = static_cast<std::size_t>(c1 - c0) * 4;
        const std::uint8_t* a = sourceRow(sy, top, c0, c1);
        const std::uint8_t* b = fy != 0 ? sourceRow(sy + 1, bottom, c0, c1) : nullptr;
        std::uint8_t* mid = mixed + 4 * kPad;
        // The vertical mix of the two rows.
        if (a != nullptr && b != nullptr)
            IR::Simd::MixRows8(a + mixOffset, b + mixOffset, mid + mixOffset,
                               static_cast<std::int32_t>(mixBytes), fy);
        else if (a != nullptr && fy == 0)
            std::memcpy(mid + mixOffset, a + mixOffset, mixBytes);
        else if (a != nullptr || b != nullptr)
        {
            // One row lies outside the source: mix the other with transparent black.
            std::memcpy(mid + mixOffset, (a != nullptr ? a : b) + mixOffset, mixBytes);
            ScaleRowToward(mid + mixOffset, mixBytes, a != nullptr ? 256 - fy : fy);
        }
        else
            std::memset(mid + mixOffset, 0, mixBytes);
        const std::int32_t n = x1 - x0;
        if (fuseOver)
        {
            horizontal(mid, x0, x1, dstRow + 4 * x0);
            continue;
        }
        // The horizontal mix of neighbouring pixels of the mixed row.
        auto* sampleBytes = reinterpret_cast<std::uint8_t*>(samples + x0);
        horizontal(mid, x0, x1, sampleBytes);
        if (inCall.hasLower)
        {
            over(sampleBytes, dstRow + 4 * x0, n, inCall.opacity);
            continue;
        }
        if (straight)
            IR::Kernels::PremultipliedToStraightRow8(sampleBytes, sampleBytes, n);
        IR::Kernels::CopyScaledRow8(sampleBytes, dstRow + 4 * x0, n, inCall.opacity, straight);
    }
    return kIR_NoError;
}

std::int32_t Motion8(const MotionCall& inCall, const FormatInfo& inInfo, const Inverse& inInv)
{
    const View srcView = IR::MakeView(inCall.src, inCall.srcRowBytes,
                                      IR::RequireFormat(inCall.srcFormat), inCall.srcH);
    const View dstView = IR::MakeView(inCall.dst, inCall.dstRowBytes,
                                      IR::RequireFormat(inCall.dstFormat), inCall.dstH);
    const bool straight = inInfo.alpha == IR::Alpha::kStraight;
    const bool bilinear = inCall.quality >= IR::kBilinearQuality;
    IR::ScratchBlock row(static_cast<std::size_t>(inCall.dstW) * 4);
    if (!row.Valid())
        return kIR_OutOfMemory;
    auto* samples = reinterpret_cast<std::uint32_t*>(row.Bytes());
    // Samples keep the format's own alpha association.
    const auto over = IR::Kernels::SelectOverRow8(straight, straight);
    const Sampler8<true> straightSampler(srcView, inCall.srcW, inCall.srcH);
    const Sampler8<false> premultipliedSampler(srcView, inCall.srcW, inCall.srcH);
    const std::int64_t dU = ToFixed(inInv.a);
    const std::int64_t dV = ToFixed(inInv.b);
    // Bilinear positions are pixel centres shifted by half a pixel; nearest uses them as they are.
    const double shift = bilinear ? 0.5 : 0.0;
    for (std::int32_t y = FirstRow(inCall.field); y < inCall.dstH; y += RowStride(inCall.field))
    {
        std::uint8_t* dstRow = dstView.Row(y);
        if (!inCall.hasLower)
            std::memset(dstRow, 0, static_cast<std::size_t>(inCall.dstW) * 4);
        std::int32_t x0, x1;
        RowSpan(inInv, y, inCall.srcW, inCall.srcH, inCall.dstW, 1.0, x0, x1);
        if (x1 <= x0)
            continue;
        const double xc = x0 + 0.5;
        const double yc = y + 0.5;
        const std::int64_t u = ToFixed(inInv.a * xc + inInv.c * yc + inInv.tx - shift);
        const std::int64_t v = ToFixed(inInv.b * xc + inInv.d * yc + inInv.ty - shift);
        const std::int32_t n = x1 - x0;
        if (bilinear)
        {
            if (straight)
                straightSampler.Bilinear(u, v, dU, dV, samples, n);
            else
                premultipliedSampler.Bilinear(u, v, dU, dV, samples, n);
        }
        else
        {
            if (straight)
                straightSampler.Nearest(u, v, dU, dV, samples, n);
            else
                premultipliedSampler.Nearest(u, v, dU, dV, samples, n);
        }
        const auto* sampleBytes = reinterpret_cast<const std::uint8_t*>(samples);
        if (inCall.hasLower)
            over(sampleBytes, dstRow + 4 * x0, n, inCall.opacity);
        else
            IR::Kernels::CopyScaledRow8(sampleBytes, dstRow + 4 * x0, n, inCall.opacity, straight);
    }
    return kIR_NoError;
}

// Whether the matrix only moves pixels by whole pixels (no scaling, rotation or
// fractional offset): then every sampling mode reads each destination pixel from
// exactly one source pixel, and the motion is a composite of shifted rows.
bool IsWholePixelTranslation(const IR_AffineMatrix& inM)
{
    constexpr double kLimit = 1 << 30;
    return inM.a == 1.0 && inM.d == 1.0 && inM.b == 0.0 && inM.c == 0.0 &&
           inM.tx == std::floor(inM.tx) && inM.ty == std::floor(inM.ty) &&
           std::fabs(inM.tx) < kLimit && std::fabs(inM.ty) < kLimit;
}

std::int32_t Translate8(const MotionCall& inCall, const FormatInfo& inInfo)
{
    const View srcView = IR::MakeView(inCall.src, inCall.srcRowBytes,
                                      IR::RequireFormat(inCall.srcFormat), inCall.srcH);
    const View dstView = IR::MakeView(inCall.dst, inCall.dstRowBytes,
                                      IR::RequireFormat(inCall.dstFormat), inCall.dstH);
    const bool straight = inInfo.alpha == IR::Alpha::kStraight;
    const auto over = IR::Kernels::SelectOverRow8(straight, straight);
    const auto tx = static_cast<std::int64_t>(inCall.matrix->tx);
    const auto ty = static_cast<std::int64_t>(inCall.matrix->ty);
    const auto x0 = static_cast<std::int32_t>(std::clamp<std::int64_t>(tx, 0, inCall.dstW));
    const auto x1 =
        static_cast<std::int32_t>(std::clamp<std::int64_t>(tx + inCall.srcW, 0, inCall.dstW));
    const std::size_t rowBytes = static_cast<std::size_t>(inCall.dstW) * 4;
    for (std::int32_t y = FirstRow(inCall.field); y < inCall.dstH; y += RowStride(inCall.field))
    {
        std::uint8_t* dstRow = dstView.Row(y);
        const std::int64_t sy = y - ty;
        const bool visible = sy >= 0 && sy < inCall.srcH && x1 > x0;
        if (!inCall.hasLower)
        {
            // Only the columns the source does not cover need clearing.
            if (!visible)
            {
                std::memset(dstRow, 0, rowBytes);
                continue;
            }
            std::memset(dstRow, 0, static_cast<std::size_t>(x0) * 4);
            std::memset(dstRow + 4 * static_cast<std::size_t>(x1), 0,
                        static_cast<std::size_t>(inCall.dstW - x1) * 4);
        }
        if (!visible)
            continue;
        const std::uint8_t* srcRow =
            srcView.Row(static_cast<std::int32_t>(sy)) + 4 * static_cast<std::int64_t>(x0 - tx);
        if (inCall.hasLower)
            over(srcRow, dstRow + 4 * static_cast<std::size_t>(x0), x1 - x0, inCall.opacity);
        else
            IR::Kernels::CopyScaledRow8(srcRow, dstRow + 4 * static_cast<std::size_t>(x0), x1 - x0,
                                        inCall.opacity, straight);
    }
    return kIR_NoError;
}

std::int32_t MotionFloat(const MotionCall& inCall, const FormatInfo& inInfo, const Inverse& inInv)
{
    const bool linear = inCall.quality >= IR::kBestQuality || inInfo.linear;
    // The source as a float premultiplied image in the working transfer.
    const std::uint8_t* srcBase = nullptr;
    std::ptrdiff_t srcStep = 0;
    IR::ScratchBlock converted(inInfo.isFloat && inInfo.alpha == IR::Alpha::kPremultiplied &&
                                       inInfo.linear == linear
                                   ? 64
                                   : static_cast<std::size_t>(inCall.srcW) * inCall.srcH * 16 + 64);
    if (!converted.Valid())
        return kIR_OutOfMemory;
    if (inInfo.isFloat && inInfo.alpha == IR::Alpha::kPremultiplied && inInfo.linear == linear)
    {
        const View view = IR::MakeView(inCall.src, inCall.srcRowBytes,
                                       IR::RequireFormat(inCall.srcFormat), inCall.srcH);
        srcBase = view.base;
        srcStep = view.step;
    }
    else
    {
        const IR::RowReader reader(inCall.src, inCall.srcRowBytes, inCall.srcFormat, inCall.srcW,
                                   inCall.srcH, linear, true);
        srcStep = static_cast<std::ptrdiff_t>(inCall.srcW) * 16;
        for (std::int32_t y = 0; y < inCall.srcH; ++y)
            reader.Read(y, reinterpret_cast<float*>(converted.Bytes() + y * srcStep));
        srcBase = converted.Bytes();
    }
    const SamplerF sampler(srcBase, srcStep, inCall.srcW, inCall.srcH);

    IR::ScratchBlock rows(static_cast<std::size_t>(inCall.dstW) * 32);
    if (!rows.Valid())
        return kIR_OutOfMemory;
    float* samples = rows.Floats();
    float* backdrop = samples + 4 * static_cast<std::size_t>(inCall.dstW);
    const IR::RowReader dstReader(inCall.dst, inCall.dstRowBytes, inCall.dstFormat, inCall.dstW,
                                  inCall.dstH, linear, true);
    const IR::RowWriter dstWriter(inCall.dst, inCall.dstRowBytes, inCall.dstFormat, inCall.dstW,
                                  inCall.dstH, linear, true);
    const View dstView = IR::MakeView(inCall.dst, inCall.dstRowBytes,
                                      IR::RequireFormat(inCall.dstFormat), inCall.dstH);
    const std::size_t rowBytes =
        static_cast<std::size_t>(IR_MinimumRowBytes(inCall.dstFormat, inCall.dstW));
    // Supersampling only pays where the transform shrinks: elsewhere it would only blur.
    const bool shrinks = std::max({std::fabs(inInv.a) + std::fabs(inInv.c),
                                   std::fabs(inInv.b) + std::fabs(inInv.d)}) > 1.0 + 1e-9;
    const bool best = inCall.quality >= IR::kBestQuality && shrinks;
    const bool bilinear = inCall.quality >= IR::kBilinearQuality;
    for (std::int32_t y = FirstRow(inCall.field); y < inCall.dstH; y += RowStride(inCall.field))
    {
        if (!inCall.hasLower)
            std::memset(dstView.Row(y), 0, rowBytes);
        std::int32_t x0, x1;
        RowSpan(inInv, y, inCall.srcW, inCall.srcH, inCall.dstW, 2.0, x0, x1);
        if (x1 <= x0)
            continue;
        const double yc = y + 0.5;
        for (std::int32_t x = x0; x < x1; ++x)
        {
            float* out = samples + 4 * x;
            auto at = [&](double inX, double inY, float* outP)
            {
                const double u = inInv.a * inX + inInv.c * inY + inInv.tx;
                const double v = inInv.b * inX + inInv.d * inY + inInv.ty;
                if (bilinear)
                    sampler.Bilinear(u, v, outP);
                else
                    sampler.Nearest(u, v, outP);
            };
            if (best)
            {
                // 2x2 supersampling inside the destination pixel.
                float sum[4] = {0.0f, 0.0f, 0.0f, 0.0f};
                float one[4];
                for (int k = 0; k < 4; ++k)
                {
                    at(x + 0.25 + 0.5 * (k & 1), y + 0.25 + 0.5 * (k >> 1), one);
                    for (int c = 0; c < 4; ++c)
                        sum[c] += one[c];
                }
                for (int c = 0; c < 4; ++c)
                    out[c] = sum[c] * 0.25f * inCall.opacity;
            }
            else
            {
                at(x + 0.5, yc, out);
                for (int c = 0; c < 4; ++c)
                    out[c] *= inCall.opacity;
            }
        }
        const std::int32_t n = x1 - x0;
        if (inCall.hasLower)
        {
            dstReader.Read(y, backdrop);
            IR::BlendRowF(inCall.mode, samples + 4 * x0, backdrop + 4 * x0, n);
            dstWriter.Write(y, backdrop, x0, x1);
        }
        else
        {
            dstWriter.Write(y, samples, x0, x1);
        }
    }
    return kIR_NoError;
}

std::int32_t RunMotion(const MotionCall& inCall)
{
    const FormatInfo srcInfo = IR::RequireFormat(inCall.srcFormat);
    const FormatInfo dstInfo = IR::RequireFormat(inCall.dstFormat);
    IR::RequireBuffer(inCall.src, inCall.srcRowBytes, inCall.srcFormat, inCall.srcW, inCall.srcH);
    IR::RequireBuffer(inCall.dst, inCall.dstRowBytes, inCall.dstFormat, inCall.dstW, inCall.dstH);
    MVX_INPUT_CONTRACT(inCall.matrix != nullptr);
    const IR_AffineMatrix& m = *inCall.matrix;
    MVX_INPUT_CONTRACT(std::isfinite(m.a) && std::isfinite(m.b) && std::isfinite(m.c) &&
                       std::isfinite(m.d) && std::isfinite(m.tx) && std::isfinite(m.ty));
    IR::RequireUnit(inCall.opacity);
    IR::RequireQuality(inCall.quality);
    MVX_INPUT_CONTRACT(inCall.field >= kIR_Field_All && inCall.field <= kIR_Field_Second);
    MVX_INPUT_CONTRACT(IR_IsValidBlendMode(inCall.mode));
    // Both buffers in one format; only the origin may differ.
    if (srcInfo.layout != IR::Layout::kBGRA || (inCall.srcFormat & ~kIR_FormatBit_BottomLeft) !=
                                                   (inCall.dstFormat & ~kIR_FormatBit_BottomLeft))
        return kIR_UnsupportedFormat;
    if (inCall.dstW == 0 || inCall.dstH == 0)
        return kIR_NoError;
    Inverse inv{};
    if (inCall.srcW == 0 || inCall.srcH == 0 || !Invert(m, inv))
    {
        // Nothing of the source is visible; a cleared destination still gets cleared.
        if (!inCall.hasLower)
        {
            const View view = IR::MakeView(inCall.dst, inCall.dstRowBytes, dstInfo, inCall.dstH);
            for (std::int32_t y = FirstRow(inCall.field); y < inCall.dstH;
                 y += RowStride(inCall.field))
                std::memset(
                    view.Row(y), 0,
                    static_cast<std::size_t>(IR_MinimumRowBytes(inCall.dstFormat, inCall.dstW)));
        }
        return kIR_NoError;
    }
    if (!srcInfo.isFloat && inCall.quality < IR::kBestQuality &&
        inCall.mode == kIR_BlendMode_Normal)
    {
        if (IsWholePixelTranslation(m))
            return Translate8(inCall, srcInfo);
        if (m.b == 0.0 && m.c == 0.0 && inCall.quality >= IR::kBilinearQuality)
            return MotionSeparable8(inCall, srcInfo, inv);
        return Motion8(inCall, srcInfo, inv);
    }
    return MotionFloat(inCall, srcInfo, inv);
}

} // namespace

void IR_BuildMotionMatrix(const IR_MotionGeometry& inGeometry, std::int32_t inSrcWidth,
                          std::int32_t inSrcHeight, std::int32_t inDstWidth,
                          std::int32_t inDstHeight, IR_AffineMatrix* outMatrix)
{
    MVX_INPUT_CONTRACT(outMatrix != nullptr);
    MVX_INPUT_CONTRACT(inSrcWidth >= 0 && inSrcHeight >= 0 && inDstWidth >= 0 && inDstHeight >= 0);
    MVX_INPUT_CONTRACT(std::isfinite(inGeometry.anchorX) && std::isfinite(inGeometry.anchorY) &&
                       std::isfinite(inGeometry.positionX) && std::isfinite(inGeometry.positionY) &&
                       std::isfinite(inGeometry.scaleX) && std::isfinite(inGeometry.scaleY) &&
                       std::isfinite(inGeometry.rotationDegrees));
    // Whole quarter turns are exact so that 90-degree rotations land on whole pixels.
    const double turns = inGeometry.rotationDegrees / 90.0;
    double cosR, sinR;
    if (turns == std::floor(turns))
    {
        static constexpr double kCos[4] = {1.0, 0.0, -1.0, 0.0};
        static constexpr double kSin[4] = {0.0, 1.0, 0.0, -1.0};
        const auto q = static_cast<int>(((static_cast<long long>(turns) % 4) + 4) % 4);
        cosR = kCos[q];
        sinR = kSin[q];
    }
    else
    {
        const double r = inGeometry.rotationDegrees * (3.14159265358979323846 / 180.0);
        cosR = std::cos(r);
        sinR = std::sin(r);
    }
    const double sx = inGeometry.scaleX;
    const double sy = inGeometry.scaleY;
    // p_dst = R * S * (p_src - anchor) + position; with y down, a positive angle turns clockwise.
    IR_AffineMatrix m;
    m.a = cosR * sx;
    m.b = sinR * sx;
    m.c = -sinR * sy;
    m.d = cosR * sy;
    const double ax = static_cast<double>(inGeometry.anchorX) * inSrcWidth;
    const double ay = static_cast<double>(inGeometry.anchorY) * inSrcHeight;
    m.tx = static_cast<double>(inGeometry.positionX) * inDstWidth - (m.a * ax + m.c * ay);
    m.ty = static_cast<double>(inGeometry.positionY) * inDstHeight - (m.b * ax + m.d * ay);
    *outMatrix = m;
}

bool IR_IsValidBlendMode(std::uint32_t inBlendMode)
{
    switch (inBlendMode)
    {
    case kIR_BlendMode_Darken:
    case kIR_BlendMode_Multiply:
    case kIR_BlendMode_Lighten:
    case kIR_BlendMode_Screen:
    case kIR_BlendMode_Add:
    case kIR_BlendMode_Overlay:
    case kIR_BlendMode_Difference:
    case kIR_BlendMode_Subtract:
    case kIR_BlendMode_Normal:
        return true;
    default:
        return false;
    }
}

std::int32_t IR_Motion(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                       std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* ioDst,
                       std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                       std::int32_t inDstWidth, std::int32_t inDstHeight,
                       const IR_AffineMatrix* inMatrix, float inOpacity, std::int32_t inQuality,
                       std::int32_t inFieldSelector, bool inHasLowerFrame)
{
    return RunMotion({inSrc, inSrcRowBytes, inSrcFormat, inSrcWidth, inSrcHeight, ioDst,
                      inDstRowBytes, inDstFormat, inDstWidth, inDstHeight, inMatrix, inOpacity,
                      inQuality, inFieldSelector, inHasLowerFrame, kIR_BlendMode_Normal});
}

std::int32_t IR_MotionWithBlendMode(const void* inSrc, std::int32_t inSrcRowBytes,
                                    IR_PixelFormat inSrcFormat, std::int32_t inSrcWidth,
                                    std::int32_t inSrcHeight, void* ioDst,
                                    std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                                    std::int32_t inDstWidth, std::int32_t inDstHeight,
                                    const IR_AffineMatrix* inMatrix, float inOpacity,
                                    std::int32_t inQuality, std::int32_t inFieldSelector,
                                    bool inHasLowerFrame, std::uint32_t inBlendMode)
{
    return RunMotion({inSrc, inSrcRowBytes, inSrcFormat, inSrcWidth, inSrcHeight, ioDst,
                      inDstRowBytes, inDstFormat, inDstWidth, inDstHeight, inMatrix, inOpacity,
                      inQuality, inFieldSelector, inHasLowerFrame, inBlendMode});
}
