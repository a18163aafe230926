// The reference scaler (ReferenceKernels.h): every output pixel summed straight from the
// source pixels under its taps, in double precision, one pixel at a time.

#include "ReferenceKernels.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <utility>
#include <vector>

namespace IR::Reference
{

namespace
{

using Tap = std::pair<std::int32_t, double>;

// Source samples and weights of output sample inI of a scale from inSrc to inDst samples.
std::vector<Tap> TapsOf(std::int32_t inSrc, std::int32_t inDst, std::int32_t inQuality,
                        std::int32_t inI)
{
    const double scale = static_cast<double>(inSrc) / inDst;
    std::vector<Tap> taps;
    if (inQuality >= 5 && inSrc > inDst)
    {
        // The output sample covers [lo, hi) of the source; each source sample weighs by
        // the part of it inside.
        const double lo = inI * scale;
        const double hi = lo + scale;
        for (auto s = static_cast<std::int32_t>(lo); s < inSrc && s < hi; ++s)
            taps.emplace_back(s, (std::min(hi, s + 1.0) - std::max(lo, double(s))) / scale);
        return taps;
    }
    if (inQuality < 3)
    {
        taps.emplace_back(std::min<std::int32_t>(inSrc - 1, std::floor((inI + 0.5) * scale)), 1.0);
        return taps;
    }
    // Bilinear between the two source samples around the output sample's centre.
    const double pos = std::clamp((inI + 0.5) * scale - 0.5, 0.0, inSrc - 1.0);
    const auto below = static_cast<std::int32_t>(std::floor(pos));
    taps.emplace_back(below, 1.0 - (pos - below));
    if (below + 1 < inSrc)
        taps.emplace_back(below + 1, pos - below);
    return taps;
}

struct Buffer
{
    const std::uint8_t* base;
    std::int32_t rowBytes;
    IR_PixelFormat format;
    std::int32_t height;

    bool IsFloat() const { return (format & kIR_FormatBit_Float) != 0; }
    bool IsStraight() const { return (format & kIR_FormatBit_StraightAlpha) != 0; }
    const std::uint8_t* Pixel(std::int32_t inX, std::int32_t inY) const
    {
        const std::int32_t row = (format & kIR_FormatBit_BottomLeft) ? height - 1 - inY : inY;
        return base + std::ptrdiff_t{row} * rowBytes + std::ptrdiff_t{inX} * (IsFloat() ? 16 : 4);
    }
};

} // namespace

void ScaleConvert(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                  std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* outDst,
                  std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat, std::int32_t inDstWidth,
                  std::int32_t inDstHeight, std::int32_t inQuality)
{
    const Buffer src{static_cast<const std::uint8_t*>(inSrc), inSrcRowBytes, inSrcFormat,
                     inSrcHeight};
    const Buffer dst{static_cast<const std::uint8_t*>(outDst), inDstRowBytes, inDstFormat,
                     inDstHeight};
    for (std::int32_t y = 0; y < inDstHeight; ++y)
        for (std::int32_t x = 0; x < inDstWidth; ++x)
        {
            double sum[4] = {0.0, 0.0, 0.0, 0.0};
            for (const auto& [sy, wy] : TapsOf(inSrcHeight, inDstHeight, inQuality, y))
                for (const auto& [sx, wx] : TapsOf(inSrcWidth, inDstWidth, inQuality, x))
                {
                    const std::uint8_t* p = src.Pixel(sx, sy);
                    double v[4];
                    for (int c = 0; c < 4; ++c)
                    {
                        float f = 0.0f;
                        if (src.IsFloat())
                            std::memcpy(&f, p + 4 * c, 4);
                        v[c] = src.IsFloat() ? f : p[c] / 255.0;
                    }
                    for (int c = 0; c < 4; ++c)
                        sum[c] += wx * wy * v[c] * (c < 3 && src.IsStraight() ? v[3] : 1.0);
                }
            if (dst.IsStraight())
                for (int c = 0; c < 3; ++c)
                    sum[c] = sum[3] > 0.0 ? sum[c] / sum[3] : 0.0;
            auto* out = const_cast<std::uint8_t*>(dst.Pixel(x, y));
            for (int c = 0; c < 4; ++c)
            {
                if (dst.IsFloat())
                {
                    const auto f = static_cast<float>(sum[c]);
                    std::memcpy(out + 4 * c, &f, 4);
                }
                else
                    out[c] = static_cast<std::uint8_t>(
                        std::lround(std::clamp(sum[c] * 255.0, 0.0, 255.0)));
            }
        }
}

} // namespace IR::Reference
