// Explicitly vectorised scaling kernels (SimdScale.h).
//
// Written once with Highway and compiled for every x86 instruction set it supports plus a
// portable fallback; the best version for the machine is chosen on the first call. Each
// vector holds consecutive output positions of one channel: the horizontal pass gathers
// whole source pixels (one 32-bit gather per tap for 8-bit rows, one per channel for
// float rows) and splits them into channels, the vertical pass loads the planes as they
// lie and interleaves the channels again when it stores.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdScale.cpp"
#include "SimdScale.h"

#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

static_assert(HWY_MAX_BYTES <= 4 * kScaleLanePad, "planes are padded to whole vectors");

using DF = hn::ScalableTag<float>;
using DI = hn::RebindToSigned<DF>;
using DU = hn::RebindToUnsigned<DF>;
using VF = hn::Vec<DF>;

struct Channels
{
    VF b, g, r, a;
};

HWY_INLINE Channels ZeroChannels(DF inD)
{
    const VF z = hn::Zero(inD);
    return {z, z, z, z};
}

// acc += w * sample, the sample's colour first scaled by its alpha when asked.
HWY_INLINE void AddSample(VF inW, const Channels& inSample, bool inPremultiply, Channels& ioAcc)
{
    const VF wc = inPremultiply ? hn::Mul(inW, inSample.a) : inW;
    ioAcc.b = hn::MulAdd(wc, inSample.b, ioAcc.b);
    ioAcc.g = hn::MulAdd(wc, inSample.g, ioAcc.g);
    ioAcc.r = hn::MulAdd(wc, inSample.r, ioAcc.r);
    ioAcc.a = hn::MulAdd(inW, inSample.a, ioAcc.a);
}

HWY_INLINE void StorePlanes(DF inD, const Channels& inC, float* outPlanes, std::size_t inStride,
                            std::size_t inX)
{
    hn::Store(inC.b, inD, outPlanes + inX);
    hn::Store(inC.g, inD, outPlanes + inStride + inX);
    hn::Store(inC.r, inD, outPlanes + 2 * inStride + inX);
    hn::Store(inC.a, inD, outPlanes + 3 * inStride + inX);
}

// 8-bit rows. The source pixels of one vector of output positions mostly lie within a few
// vectors of the row: those are loaded whole and each tap picks its pixels from them with
// lane permutations; where they do not (strong reductions, the row's end) the pixels are
// gathered.
void Horizontal8(const std::uint8_t* inRow, const RowTaps& inTaps, bool inPremultiply,
                 float* outPlanes)
{
    constexpr std::size_t kMaxSpan = 4;
    const DF df;
    const DI di;
    const DU du;
    const auto* pixels = reinterpret_cast<const std::uint32_t*>(inRow);
    const auto stride = static_cast<std::size_t>(inTaps.stride);
    const std::size_t n = hn::Lanes(df);
    const auto width = static_cast<std::size_t>(inTaps.sourceWidth);
    const auto mask = hn::Set(du, 0xFFu);
    const auto laneMask = hn::Set(di, static_cast<std::int32_t>(n - 1));
    // Premultiplied sums carry alpha * 255: one division by 255 per output sample.
    const VF colourScale = hn::Set(df, 1.0f / 255.0f);
    auto channel = [&](auto inBits) HWY_ATTR
    { return hn::ConvertTo(df, hn::BitCast(di, hn::And(inBits, mask))); };
    for (std::size_t x = 0; x < stride; x += n)
    {
        const auto c0 = static_cast<std::size_t>(inTaps.columns[x]);
        const std::size_t last = (inTaps.taps - 1) * stride + x + n - 1;
        const std::size_t span = (static_cast<std::size_t>(inTaps.columns[last]) - c0) / n + 1;
        const bool permute = span <= kMaxSpan && c0 + span * n <= width;
        hn::Vec<DU> block[kMaxSpan];
        // Opaque pixels need no premultiplying.
        auto opaque = hn::Set(du, 0xFF000000u);
        for (std::size_t k = 0; permute && k < span; ++k)
        {
            block[k] = hn::LoadU(du, pixels + c0 + k * n);
            opaque = hn::And(opaque, block[k]);
        }
        const bool premultiply =
            inPremultiply &&
            !(permute && hn::AllTrue(du, hn::Eq(opaque, hn::Set(du, 0xFF000000u))));
        Channels acc = ZeroChannels(df);
        for (std::int32_t t = 0; t < inTaps.taps; ++t)
        {
            const std::size_t at = static_cast<std::size_t>(t) * stride + x;
            const auto columns = hn::Load(di, inTaps.columns + at);
            hn::Vec<DU> p;
            if (permute)
            {
                const auto rel = hn::Sub(columns, hn::Set(di, static_cast<std::int32_t>(c0)));
                const auto lanes = hn::IndicesFromVec(du, hn::And(rel, laneMask));
                p = hn::TableLookupLanes(block[0], lanes);
                for (std::size_t k = 1; k < span; ++k)
                    p = hn::IfThenElse(
                        hn::RebindMask(
                            du, hn::Gt(rel, hn::Set(di, static_cast<std::int32_t>(k * n) - 1))),
                        hn::TableLookupLanes(block[k], lanes), p);
            }
            else
            {
                p = hn::GatherIndex(du, pixels, columns);
            }
            const Channels sample{channel(p), channel(hn::ShiftRight<8>(p)),
                                  channel(hn::ShiftRight<16>(p)),
                                  hn::ConvertTo(df, hn::BitCast(di, hn::ShiftRight<24>(p)))};
            AddSample(hn::Load(df, inTaps.weights + at), sample, premultiply, acc);
        }
        if (premultiply)
        {
            acc.b = hn::Mul(acc.b, colourScale);
            acc.g = hn::Mul(acc.g, colourScale);
            acc.r = hn::Mul(acc.r, colourScale);
        }
        StorePlanes(df, acc, outPlanes, stride, x);
    }
}

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback has no 128-bit vectors: the same sums pixel by pixel.
void Horizontal32f(const float* inRow, const RowTaps& inTaps, bool inPremultiply, float* outPlanes)
{
    const auto stride = static_cast<std::size_t>(inTaps.stride);
    for (std::size_t x = 0; x < stride; ++x)
    {
        float acc[4] = {0.0f, 0.0f, 0.0f, 0.0f};
        for (std::int32_t t = 0; t < inTaps.taps; ++t)
        {
            const std::size_t at = static_cast<std::size_t>(t) * stride + x;
            const float* p = inRow + 4 * static_cast<std::size_t>(inTaps.columns[at]);
            const float w = inTaps.weights[at];
            const float wc = inPremultiply ? w * p[3] : w;
            for (int c = 0; c < 3; ++c)
                acc[c] += wc * p[c];
            acc[3] += w * p[3];
        }
        for (int c = 0; c < 4; ++c)
            outPlanes[c * stride + x] = acc[c];
    }
}
#else
// Float rows: whole pixels are 128-bit loads, weighed as they lie and transposed into the
// planes four output positions at a time.
void Horizontal32f(const float* inRow, const RowTaps& inTaps, bool inPremultiply, float* outPlanes)
{
    const hn::FixedTag<float, 4> d4;
    const auto stride = static_cast<std::size_t>(inTaps.stride);
    for (std::size_t x = 0; x < stride; x += 4)
    {
        hn::Vec<decltype(d4)> acc[4];
        for (int k = 0; k < 4; ++k)
        {
            acc[k] = hn::Zero(d4);
            for (std::int32_t t = 0; t < inTaps.taps; ++t)
            {
                const std::size_t at = static_cast<std::size_t>(t) * stride + x + k;
                auto p = hn::LoadU(d4, inRow + 4 * static_cast<std::size_t>(inTaps.columns[at]));
                if (inPremultiply)
                    p = hn::Mul(p, hn::IfThenElse(hn::FirstN(d4, 3), hn::Broadcast<3>(p),
                                                  hn::Set(d4, 1.0f)));
                acc[k] = hn::MulAdd(hn::Set(d4, inTaps.weights[at]), p, acc[k]);
            }
        }
        const auto bg01 = hn::InterleaveLower(d4, acc[0], acc[1]);
        const auto bg23 = hn::InterleaveLower(d4, acc[2], acc[3]);
        const auto ra01 = hn::InterleaveUpper(d4, acc[0], acc[1]);
        const auto ra23 = hn::InterleaveUpper(d4, acc[2], acc[3]);
        hn::Store(hn::ConcatLowerLower(d4, bg23, bg01), d4, outPlanes + x);
        hn::Store(hn::ConcatUpperUpper(d4, bg23, bg01), d4, outPlanes + stride + x);
        hn::Store(hn::ConcatLowerLower(d4, ra23, ra01), d4, outPlanes + 2 * stride + x);
        hn::Store(hn::ConcatUpperUpper(d4, ra23, ra01), d4, outPlanes + 3 * stride + x);
    }
}
#endif

// The mixed, converted channels of destination positions [inX, inX + lanes).
HWY_INLINE Channels MixColumns(DF inD, const ColumnTaps& inTaps, std::size_t inX)
{
    Channels acc = ZeroChannels(inD);
    const std::size_t s = inTaps.stride;
    for (std::int32_t t = 0; t < inTaps.taps; ++t)
    {
        const VF w = hn::Set(inD, inTaps.weights[t]);
        const float* row = inTaps.rows[t] + inX;
        acc.b = hn::MulAdd(w, hn::Load(inD, row), acc.b);
        acc.g = hn::MulAdd(w, hn::Load(inD, row + s), acc.g);
        acc.r = hn::MulAdd(w, hn::Load(inD, row + 2 * s), acc.r);
        acc.a = hn::MulAdd(w, hn::Load(inD, row + 3 * s), acc.a);
    }
    const VF scale = hn::Set(inD, inTaps.scale);
    VF colourScale = scale;
    if (inTaps.unpremultiply)
    {
        // Weights summing to 1 in float may leave opaque alpha a rounding below the unit:
        // alphas within a millionth of it count as opaque (dividing by them would change
        // colour by less than that).
        const VF unit = hn::Set(inD, inTaps.unit);
        const auto opaque = hn::Ge(acc.a, hn::Set(inD, inTaps.unit * (1.0f - 1e-6f)));
        if (!hn::AllTrue(inD, opaque))
        {
            const auto some = hn::Gt(acc.a, hn::Zero(inD));
            const VF safeA = hn::IfThenElse(some, acc.a, unit);
            colourScale = hn::IfThenElse(
                opaque, scale, hn::IfThenElseZero(some, hn::Div(hn::Mul(scale, unit), safeA)));
        }
    }
    acc.b = hn::Mul(acc.b, colourScale);
    acc.g = hn::Mul(acc.g, colourScale);
    acc.r = hn::Mul(acc.r, colourScale);
    acc.a = hn::Mul(acc.a, scale);
    return acc;
}

void Vertical8(const ColumnTaps& inTaps, std::uint8_t* outRow, std::int32_t inCount)
{
    const DF df;
    const DI di;
    const DU du;
    const VF half = hn::Set(df, 0.5f);
    const VF top = hn::Set(df, 255.0f);
    auto code = [&](VF inV) HWY_ATTR
    {
        const VF v = hn::Min(hn::Max(hn::Add(inV, half), hn::Zero(df)), top);
        return hn::BitCast(du, hn::ConvertTo(di, v));
    };
    const std::size_t n = hn::Lanes(df);
    const auto count = static_cast<std::size_t>(inCount);
    for (std::size_t x = 0; x < count; x += n)
    {
        const Channels c = MixColumns(df, inTaps, x);
        const auto packed =
            hn::Or(hn::Or(code(c.b), hn::ShiftLeft<8>(code(c.g))),
                   hn::Or(hn::ShiftLeft<16>(code(c.r)), hn::ShiftLeft<24>(code(c.a))));
        // Through an aligned copy: the destination row has no alignment.
        alignas(64) std::uint32_t pixels[HWY_MAX_BYTES / 4];
        hn::Store(packed, du, pixels);
        if (x + n <= count)
            std::memcpy(outRow + 4 * x, pixels, 4 * n);
        else
            std::memcpy(outRow + 4 * x, pixels, 4 * (count - x));
    }
}

void Vertical32f(const ColumnTaps& inTaps, float* outRow, std::int32_t inCount)
{
    const DF df;
    const std::size_t n = hn::Lanes(df);
    const auto count = static_cast<std::size_t>(inCount);
    for (std::size_t x = 0; x < count; x += n)
    {
        const Channels c = MixColumns(df, inTaps, x);
        if (x + n <= count)
        {
            hn::StoreInterleaved4(c.b, c.g, c.r, c.a, df, outRow + 4 * x);
            continue;
        }
        alignas(64) float tail[HWY_MAX_BYTES];
        hn::StoreInterleaved4(c.b, c.g, c.r, c.a, df, tail);
        std::memcpy(outRow + 4 * x, tail, 16 * (count - x));
    }
}

#if HWY_TARGET == HWY_SCALAR
bool Halve8(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
            std::int32_t inCount, bool inOpaqueOnly)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        const std::uint8_t* t = inTop + 8 * i;
        const std::uint8_t* b = inBottom + 8 * i;
        if (inOpaqueOnly && (t[3] & t[7] & b[3] & b[7]) != 255)
            return false;
        for (int c = 0; c < 4; ++c)
            outDst[4 * i + c] =
                static_cast<std::uint8_t>((t[c] + t[c + 4] + b[c] + b[c + 4] + 2) >> 2);
    }
    return true;
}
#else
// Even and odd pixels of both rows split by ConcatEven / ConcatOdd; the bytes of each pixel
// summed in two 16-bit lanes per pixel (B and R, G and A), which cannot overflow.
bool Halve8(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
            std::int32_t inCount, bool inOpaqueOnly)
{
    const DU du;
    const hn::Repartition<std::uint8_t, DU> d8;
    const std::size_t n = hn::Lanes(du);
    const auto lowBytes = hn::Set(du, 0x00FF00FFu);
    const auto two = hn::Set(du, 0x00020002u);
    const auto alpha = hn::Set(du, 0xFF000000u);
    auto body = [&](const std::uint8_t* inT, const std::uint8_t* inB, std::uint8_t* outD) HWY_ATTR
    {
        const auto t0 = hn::BitCast(du, hn::LoadU(d8, inT));
        const auto t1 = hn::BitCast(du, hn::LoadU(d8, inT + 4 * n));
        const auto b0 = hn::BitCast(du, hn::LoadU(d8, inB));
        const auto b1 = hn::BitCast(du, hn::LoadU(d8, inB + 4 * n));
        if (inOpaqueOnly &&
            !hn::AllTrue(du,
                         hn::Eq(hn::And(hn::And(hn::And(t0, t1), hn::And(b0, b1)), alpha), alpha)))
            return false;
        const auto te = hn::ConcatEven(du, t1, t0);
        const auto to = hn::ConcatOdd(du, t1, t0);
        const auto be = hn::ConcatEven(du, b1, b0);
        const auto bo = hn::ConcatOdd(du, b1, b0);
        auto mean = [&](auto inA, auto inB2, auto inC, auto inD) HWY_ATTR
        {
            const auto sum = hn::Add(hn::Add(hn::And(inA, lowBytes), hn::And(inB2, lowBytes)),
                                     hn::Add(hn::And(inC, lowBytes), hn::And(inD, lowBytes)));
            return hn::And(hn::ShiftRight<2>(hn::Add(sum, two)), lowBytes);
        };
        const auto lo = mean(te, to, be, bo);
        const auto hi = mean(hn::ShiftRight<8>(te), hn::ShiftRight<8>(to), hn::ShiftRight<8>(be),
                             hn::ShiftRight<8>(bo));
        hn::StoreU(hn::BitCast(d8, hn::Or(lo, hn::ShiftLeft<8>(hi))), d8, outD);
        return true;
    };
    const auto count = static_cast<std::size_t>(inCount);
    std::size_t i = 0;
    for (; i + n <= count; i += n)
        if (!body(inTop + 8 * i, inBottom + 8 * i, outDst + 4 * i))
            return false;
    if (i == count)
        return true;
    // The last partial vector through stack copies, padded with opaque pixels.
    alignas(64) std::uint8_t top[2 * HWY_MAX_BYTES];
    alignas(64) std::uint8_t bottom[2 * HWY_MAX_BYTES];
    alignas(64) std::uint8_t out[HWY_MAX_BYTES];
    std::memset(top, 255, sizeof(top));
    std::memset(bottom, 255, sizeof(bottom));
    std::memcpy(top, inTop + 8 * i, 8 * (count - i));
    std::memcpy(bottom, inBottom + 8 * i, 8 * (count - i));
    if (!body(top, bottom, out))
        return false;
    std::memcpy(outDst + 4 * i, out, 4 * (count - i));
    return true;
}
#endif

} // namespace IR::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::Simd
{

HWY_EXPORT(Horizontal8);
HWY_EXPORT(Horizontal32f);
HWY_EXPORT(Vertical8);
HWY_EXPORT(Vertical32f);
HWY_EXPORT(Halve8);

bool HalveRows8(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
                std::int32_t inCount, bool inOpaqueOnly)
{
    return HWY_DYNAMIC_DISPATCH(Halve8)(inTop, inBottom, outDst, inCount, inOpaqueOnly);
}

void ScaleRowHorizontal8(const std::uint8_t* inRow, const RowTaps& inTaps, bool inPremultiply,
                         float* outPlanes)
{
    HWY_DYNAMIC_DISPATCH(Horizontal8)(inRow, inTaps, inPremultiply, outPlanes);
}

void ScaleRowHorizontal32f(const float* inRow, const RowTaps& inTaps, bool inPremultiply,
                           float* outPlanes)
{
    HWY_DYNAMIC_DISPATCH(Horizontal32f)(inRow, inTaps, inPremultiply, outPlanes);
}

void ScaleRowVertical8(const ColumnTaps& inTaps, std::uint8_t* outRow, std::int32_t inCount)
{
    HWY_DYNAMIC_DISPATCH(Vertical8)(inTaps, outRow, inCount);
}

void ScaleRowVertical32f(const ColumnTaps& inTaps, float* outRow, std::int32_t inCount)
{
    HWY_DYNAMIC_DISPATCH(Vertical32f)(inTaps, outRow, inCount);
}

} // namespace IR::Simd
#endif
