// Scaling taps and the vectorised BGRA scaler (Scale.h).
//
// The scaler filters horizontally first: each source row the vertical taps need is
// filtered once into planar float rows kept in a small ring (the vertical taps only move
// forward), then every destination row mixes its rows of the ring. All tables, the ring
// and a copy row for misaligned 8-bit sources live in one scratch block of the call.

#include "Scale.h"

#include "Checks.h"
#include "SimdScale.h"

#include <algorithm>
#include <cmath>
#include <cstring>

namespace IR
{

namespace
{

bool AreaSampling(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality)
{
    return inQuality >= kBestQuality && inSrc > inDst;
}

// Carves 64-byte aligned arrays out of one scratch block: a first pass with no block
// counts the bytes, a second hands out the arrays.
class Carver
{
public:
    explicit Carver(std::uint8_t* inBase)
        : mBase(inBase)
    {
    }

    template <typename T>
    T* Take(std::size_t inCount)
    {
        T* at = mBase == nullptr ? nullptr : reinterpret_cast<T*>(mBase + mUsed);
        mUsed += (inCount * sizeof(T) + 63) / 64 * 64;
        return at;
    }
    std::size_t Used() const { return mUsed; }

private:
    std::uint8_t* mBase;
    std::size_t mUsed = 0;
};

} // namespace

std::int32_t MaxScaleTaps(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality)
{
    if (AreaSampling(inSrc, inDst, inQuality))
        return static_cast<std::int32_t>(std::ceil(static_cast<double>(inSrc) / inDst)) + 1;
    return inQuality >= kBilinearQuality ? 2 : 1;
}

void ScaleTapsAt(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality, std::int32_t inI,
                 std::int32_t& outFirst, std::int32_t& outCount, float* outWeights)
{
    const double scale = static_cast<double>(inSrc) / inDst;
    std::fill(outWeights, outWeights + MaxScaleTaps(inSrc, inDst, inQuality), 0.0f);
    if (AreaSampling(inSrc, inDst, inQuality))
    {
        // Box filter: each source sample weighs by its overlap with the output sample.
        const double lo = inI * scale;
        const double hi = (inI + 1) * scale;
        outFirst = static_cast<std::int32_t>(std::floor(lo));
        const auto last = std::min(inSrc - 1, static_cast<std::int32_t>(std::ceil(hi)) - 1);
        outCount = last - outFirst + 1;
        for (std::int32_t s = outFirst; s <= last; ++s)
            outWeights[s - outFirst] =
                static_cast<float>((std::min<double>(hi, s + 1) - std::max<double>(lo, s)) / scale);
    }
    else if (inQuality >= kBilinearQuality)
    {
        const double pos = std::clamp((inI + 0.5) * scale - 0.5, 0.0, inSrc - 1.0);
        outFirst = std::min(static_cast<std::int32_t>(pos), std::max(0, inSrc - 2));
        const auto f = static_cast<float>(pos - outFirst);
        outCount = inSrc > 1 ? 2 : 1;
        outWeights[0] = inSrc > 1 ? 1.0f - f : 1.0f;
        outWeights[1] = inSrc > 1 ? f : 0.0f;
    }
    else
    {
        outFirst = std::min(inSrc - 1, static_cast<std::int32_t>((inI + 0.5) * scale));
        outCount = 1;
        outWeights[0] = 1.0f;
    }
}

Taps MakeTaps(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality)
{
    Taps taps;
    taps.maxCount = MaxScaleTaps(inSrc, inDst, inQuality);
    taps.first.resize(inDst);
    taps.count.resize(inDst);
    taps.weights.assign(static_cast<std::size_t>(inDst) * taps.maxCount, 0.0f);
    for (std::int32_t i = 0; i < inDst; ++i)
        ScaleTapsAt(inSrc, inDst, inQuality, i, taps.first[i], taps.count[i],
                    &taps.weights[static_cast<std::size_t>(i) * taps.maxCount]);
    return taps;
}

bool ScaleConvertBGRA(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                      std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* outDst,
                      std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                      std::int32_t inDstWidth, std::int32_t inDstHeight, std::int32_t inQuality,
                      std::int32_t& outStatus)
{
    FormatInfo s;
    FormatInfo d;
    if (!DescribeFormat(inSrcFormat, s) || !DescribeFormat(inDstFormat, d) ||
        s.layout != Layout::kBGRA || d.layout != Layout::kBGRA || s.linear != d.linear)
        return false;
    const std::int32_t hMax = MaxScaleTaps(inSrcWidth, inDstWidth, inQuality);
    const std::int32_t vMax = MaxScaleTaps(inSrcHeight, inDstHeight, inQuality);
    const std::size_t pad = (static_cast<std::size_t>(inDstWidth) + Simd::kScaleLanePad - 1) /
                            Simd::kScaleLanePad * Simd::kScaleLanePad;
    const auto hCells = static_cast<std::size_t>(hMax) * pad;
    const std::int32_t ringSize = vMax + 1;
    const std::size_t plane4 = 4 * pad;
    auto carve = [&](Carver& ioCarver)
    {
        struct
        {
            const float** rows;
            std::int32_t* columns;
            float* weights;
            float* tapWeights;
            std::int32_t* vFirst;
            std::int32_t* vCount;
            float* vWeights;
            std::int32_t* ringTag;
            float* ring;
            std::uint8_t* rowCopy;
        } a{ioCarver.Take<const float*>(vMax),
            ioCarver.Take<std::int32_t>(hCells),
            ioCarver.Take<float>(hCells),
            ioCarver.Take<float>(hMax),
            ioCarver.Take<std::int32_t>(inDstHeight),
            ioCarver.Take<std::int32_t>(inDstHeight),
            ioCarver.Take<float>(static_cast<std::size_t>(inDstHeight) * vMax),
            ioCarver.Take<std::int32_t>(ringSize),
            ioCarver.Take<float>(plane4 * ringSize),
            ioCarver.Take<std::uint8_t>(s.isFloat ? 0 : 4 * static_cast<std::size_t>(inSrcWidth))};
        return a;
    };
    Carver sizing(nullptr);
    carve(sizing);
    ScratchBlock scratch(sizing.Used());
    if (!scratch.Valid())
    {
        outStatus = kIR_OutOfMemory;
        return true;
    }
    Carver carver(scratch.Bytes());
    const auto a = carve(carver);

    // Horizontal taps, trimmed to the most any position really uses.
    // Padding positions repeat the last real columns with weight 0, so that the columns
    // never decrease along the row.
    std::int32_t hTaps = 1;
    std::int32_t first = 0;
    std::int32_t count = 1;
    for (std::size_t x = 0; x < pad; ++x)
    {
        if (x < static_cast<std::size_t>(inDstWidth))
            ScaleTapsAt(inSrcWidth, inDstWidth, inQuality, static_cast<std::int32_t>(x), first,
                        count, a.tapWeights);
        else
            std::fill(a.tapWeights, a.tapWeights + hMax, 0.0f);
        hTaps = std::max(hTaps, count);
        for (std::int32_t t = 0; t < hMax; ++t)
        {
            a.columns[t * pad + x] = std::min(first + t, first + count - 1);
            a.weights[t * pad + x] = a.tapWeights[t];
        }
    }
    for (std::int32_t y = 0; y < inDstHeight; ++y)
        ScaleTapsAt(inSrcHeight, inDstHeight, inQuality, y, a.vFirst[y], a.vCount[y],
                    a.vWeights + static_cast<std::size_t>(y) * vMax);
    std::fill(a.ringTag, a.ringTag + ringSize, -1);

    const View src = MakeView(inSrc, inSrcRowBytes, s, inSrcHeight);
    const View dst = MakeView(outDst, inDstRowBytes, d, inDstHeight);
    const Simd::RowTaps rowTaps{a.columns, a.weights, hTaps, static_cast<std::int32_t>(pad),
                                inSrcWidth};
    const bool premultiply = s.alpha == Alpha::kStraight;
    const auto filtered = [&](std::int32_t inRow) -> const float*
    {
        const std::int32_t slot = inRow % ringSize;
        float* planes = a.ring + plane4 * slot;
        if (a.ringTag[slot] == inRow)
            return planes;
        const std::uint8_t* row = src.Row(inRow);
        if (s.isFloat)
        {
            Simd::ScaleRowHorizontal32f(reinterpret_cast<const float*>(row), rowTaps, premultiply,
                                        planes);
        }
        else
        {
            // The gathers read whole 32-bit pixels.
            if (reinterpret_cast<std::uintptr_t>(row) % 4 != 0)
                row = static_cast<const std::uint8_t*>(
                    std::memcpy(a.rowCopy, row, 4 * static_cast<std::size_t>(inSrcWidth)));
            Simd::ScaleRowHorizontal8(row, rowTaps, premultiply, planes);
        }
        a.ringTag[slot] = inRow;
        return planes;
    };
    Simd::ColumnTaps columnTaps;
    columnTaps.rows = a.rows;
    columnTaps.stride = pad;
    columnTaps.unit = s.isFloat ? 1.0f : 255.0f;
    columnTaps.scale = (d.isFloat ? 1.0f : 255.0f) / columnTaps.unit;
    columnTaps.unpremultiply = d.alpha == Alpha::kStraight;
    // Exactly half size in 8 bits: bilinear and area sampling both average 2 x 2 blocks,
    // which needs no association change where the pixels are opaque.
    const bool halving = !s.isFloat && !d.isFloat && inSrcWidth == 2 * inDstWidth &&
                         inSrcHeight == 2 * inDstHeight && inQuality >= kBilinearQuality;
    const bool opaqueOnly = s.alpha != Alpha::kPremultiplied || d.alpha != Alpha::kPremultiplied;
    for (std::int32_t y = 0; y < inDstHeight; ++y)
    {
        if (halving && Simd::HalveRows8(src.Row(2 * y), src.Row(2 * y + 1), dst.Row(y), inDstWidth,
                                        opaqueOnly))
            continue;
        for (std::int32_t t = 0; t < a.vCount[y]; ++t)
            a.rows[t] = filtered(a.vFirst[y] + t);
        columnTaps.weights = a.vWeights + static_cast<std::size_t>(y) * vMax;
        columnTaps.taps = a.vCount[y];
        if (d.isFloat)
            Simd::ScaleRowVertical32f(columnTaps, reinterpret_cast<float*>(dst.Row(y)), inDstWidth);
        else
            Simd::ScaleRowVertical8(columnTaps, dst.Row(y), inDstWidth);
    }
    outStatus = kIR_NoError;
    return true;
}

} // namespace IR
