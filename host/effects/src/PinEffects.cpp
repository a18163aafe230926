// The four-point effects: Corner Pin (the picture drawn into the
// quadrilateral of four corners, through the projective map that takes the
// frame's corners to them) and Garbage Matte (everything outside the
// quadrilateral becomes transparent). Each corner is an offset in full-frame
// pixels from its own corner of the frame.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"
#include "VF/VideoFrame.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace FX::detail
{
namespace
{

constexpr double kFar = 100000.0;

constexpr ParamSpec kCornerParams[] = {
    {"upperLeft", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
    {"upperRight", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
    {"lowerRight", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
    {"lowerLeft", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
};

struct Point
{
    double mX;
    double mY;
};

using Quad = std::array<Point, 4>;
using Matrix3 = std::array<double, 9>;

// The corners in frame pixels, clockwise from the upper left.
template <class Effect>
Quad Corners(const Effect& inEffect, const RenderContext& inContext, int inWidth, int inHeight)
{
    const double frame[4][2] = {
        {0, 0}, {double(inWidth), 0}, {double(inWidth), double(inHeight)}, {0, double(inHeight)}};
    Quad quad{};
    for (std::uint32_t i = 0; i < 4; ++i)
        quad[i] = {frame[i][0] + inEffect.X(i, inContext) * inContext.mScale,
                   frame[i][1] + inEffect.Y(i, inContext) * inContext.mScale};
    return quad;
}

// The projective map of the unit square onto inQuad (corners (0,0), (1,0),
// (1,1), (0,1) in that order), row-major, acting on (u, v, 1).
Matrix3 SquareToQuad(const Quad& inQuad)
{
    const auto [x0, y0] = inQuad[0];
    const auto [x1, y1] = inQuad[1];
    const auto [x2, y2] = inQuad[2];
    const auto [x3, y3] = inQuad[3];
    const double sx = x0 - x1 + x2 - x3, sy = y0 - y1 + y2 - y3;
    const double dx1 = x1 - x2, dx2 = x3 - x2, dy1 = y1 - y2, dy2 = y3 - y2;
    const double det = dx1 * dy2 - dx2 * dy1;
    const double g = det != 0.0 ? (sx * dy2 - dx2 * sy) / det : 0.0;
    const double h = det != 0.0 ? (dx1 * sy - sx * dy1) / det : 0.0;
    return {
        x1 - x0 + g * x1, x3 - x0 + h * x3, x0, y1 - y0 + g * y1, y3 - y0 + h * y3, y0, g, h, 1};
}

// The inverse through the adjugate (its scale does not matter to a projective map).
Matrix3 Inverse(const Matrix3& m)
{
    return {m[4] * m[8] - m[5] * m[7], m[2] * m[7] - m[1] * m[8], m[1] * m[5] - m[2] * m[4],
            m[5] * m[6] - m[3] * m[8], m[0] * m[8] - m[2] * m[6], m[2] * m[3] - m[0] * m[5],
            m[3] * m[7] - m[4] * m[6], m[1] * m[6] - m[0] * m[7], m[0] * m[4] - m[1] * m[3]};
}

// A picture read as premultiplied float components, transparent outside.
class Sampler
{
public:
    explicit Sampler(const MF::IVideoFrame& inFrame)
        : mBase(static_cast<const std::uint8_t*>(inFrame.GetBaseAddress()))
        , mRowBytes(inFrame.GetRowBytes())
        , mWidth(inFrame.GetBounds().Width())
        , mHeight(inFrame.GetBounds().Height())
        , mFloat(inFrame.GetPixelFormat() == mvxmediatypes::kPixelFormat_BGRA_4444_32f)
    {
    }

    // Bilinear at (inX, inY) in pixel coordinates (pixel centres at .5).
    void Bilinear(double inX, double inY, float outPremultiplied[4]) const
    {
        const double x = inX - 0.5, y = inY - 0.5;
        const int x0 = static_cast<int>(std::floor(x)), y0 = static_cast<int>(std::floor(y));
        const float fx = static_cast<float>(x - x0), fy = static_cast<float>(y - y0);
        const float weights[4] = {(1 - fx) * (1 - fy), fx * (1 - fy), (1 - fx) * fy, fx * fy};
        for (int c = 0; c < 4; ++c)
            outPremultiplied[c] = 0.0f;
        for (int i = 0; i < 4; ++i)
        {
            float texel[4];
            Texel(x0 + (i & 1), y0 + (i >> 1), texel);
            for (int c = 0; c < 4; ++c)
                outPremultiplied[c] += weights[i] * texel[c];
        }
    }

private:
    void Texel(int inX, int inY, float outTexel[4]) const
    {
        if (inX < 0 || inY < 0 || inX >= mWidth || inY >= mHeight)
        {
            outTexel[0] = outTexel[1] = outTexel[2] = outTexel[3] = 0.0f;
            return;
        }
        const std::uint8_t* row = mBase + static_cast<std::ptrdiff_t>(inY) * mRowBytes;
        float b, g, r, a;
        if (mFloat)
        {
            const float* p = reinterpret_cast<const float*>(row) + inX * 4;
            b = p[0], g = p[1], r = p[2], a = p[3];
        }
        else
        {
            const std::uint8_t* p = row + inX * 4;
            b = kUnit8[p[0]], g = kUnit8[p[1]], r = kUnit8[p[2]], a = kUnit8[p[3]];
        }
        outTexel[0] = b * a, outTexel[1] = g * a, outTexel[2] = r * a, outTexel[3] = a;
    }

    const std::uint8_t* mBase;
    std::int32_t mRowBytes;
    int mWidth;
    int mHeight;
    bool mFloat;
};

class FourPointEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;
    double X(std::uint32_t inCorner, const RenderContext& inContext) const
    {
        return Value(inCorner, inContext);
    }
    double Y(std::uint32_t inCorner, const RenderContext& inContext) const
    {
        return ValueY(inCorner, inContext);
    }

protected:
    ~FourPointEffect() = default;
};

class CornerPinEffect : public FourPointEffect
{
public:
    using FourPointEffect::FourPointEffect;

protected:
    QRT::Result RenderStaged(const RenderContext& inContext,
                             QRT::InterfaceRef<MF::IVideoFrame>& ioFrame) override
    {
        QRT::InterfaceRef<MF::IVideoFrame> result = ioFrame->CreateEmptyFrame(true);
        const Pixels target = PixelsOf(*result);
        const Quad quad = Corners(*this, inContext, target.mWidth, target.mHeight);
        const Matrix3 back = Inverse(SquareToQuad(quad));
        const Sampler source(*ioFrame);
        for (std::int32_t y = 0; y < target.mHeight; ++y)
            for (std::int32_t x = 0; x < target.mWidth; ++x)
            {
                const double px = x + 0.5, py = y + 0.5;
                const double w = back[6] * px + back[7] * py + back[8];
                if (w == 0.0)
                    continue;
                const double u = (back[0] * px + back[1] * py + back[2]) / w;
                const double v = (back[3] * px + back[4] * py + back[5]) / w;
                // Half a pixel beyond the picture still lends its edge some coverage.
                if (u < -0.5 / target.mWidth || u > 1 + 0.5 / target.mWidth ||
                    v < -0.5 / target.mHeight || v > 1 + 0.5 / target.mHeight)
                    continue;
                float p[4];
                source.Bilinear(u * target.mWidth, v * target.mHeight, p);
                const float inverse = p[3] > 0.0f ? 1.0f / p[3] : 0.0f;
                if (target.mFloat)
                {
                    float* out = target.Row<float>(y) + x * 4;
                    out[0] = p[0] * inverse, out[1] = p[1] * inverse, out[2] = p[2] * inverse;
                    out[3] = p[3];
                }
                else
                {
                    std::uint8_t* out = target.Row<std::uint8_t>(y) + x * 4;
                    out[0] = ToByte(p[0] * inverse), out[1] = ToByte(p[1] * inverse);
                    out[2] = ToByte(p[2] * inverse), out[3] = ToByte(p[3]);
                }
            }
        ioFrame = std::move(result);
        return QRT::kResult_Success;
    }
};

// Garbage Matte: the alpha times the share of each pixel inside the
// quadrilateral, measured on four sub-rows per pixel row.
class GarbageMatteEffect : public FourPointEffect
{
public:
    using FourPointEffect::FourPointEffect;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        constexpr int kSubRows = 4;
        const Quad quad = Corners(*this, inContext, inPixels.mWidth, inPixels.mHeight);
        std::vector<float> coverage(static_cast<std::size_t>(inPixels.mWidth));
        for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
        {
            std::fill(coverage.begin(), coverage.end(), 0.0f);
            for (int sub = 0; sub < kSubRows; ++sub)
                AddRow(quad, y + (sub + 0.5) / kSubRows, coverage, 1.0f / kSubRows);
            for (std::int32_t x = 0; x < inPixels.mWidth; ++x)
            {
                const float share = std::min(1.0f, coverage[static_cast<std::size_t>(x)]);
                if (inPixels.mFloat)
                    inPixels.Row<float>(y)[x * 4 + 3] *= share;
                else
                {
                    std::uint8_t& alpha = inPixels.Row<std::uint8_t>(y)[x * 4 + 3];
                    alpha = ToByte(kUnit8[alpha] * share);
                }
            }
        }
        return QRT::kResult_Success;
    }

private:
    // Adds inWeight times the length of each pixel's part inside the quad on
    // the line at height inY (even-odd rule).
    static void AddRow(const Quad& inQuad, double inY, std::vector<float>& ioCoverage,
                       float inWeight)
    {
        double crossings[4];
        int count = 0;
        for (int i = 0; i < 4; ++i)
        {
            const Point p = inQuad[static_cast<std::size_t>(i)];
            const Point q = inQuad[static_cast<std::size_t>((i + 1) % 4)];
            if ((p.mY <= inY && inY < q.mY) || (q.mY <= inY && inY < p.mY))
                crossings[count++] = p.mX + (inY - p.mY) * (q.mX - p.mX) / (q.mY - p.mY);
        }
        // At most four crossings: an insertion sort.
        for (int i = 1; i < count; ++i)
            for (int j = i; j > 0 && crossings[j] < crossings[j - 1]; --j)
                std::swap(crossings[j], crossings[j - 1]);
        const double width = static_cast<double>(ioCoverage.size());
        for (int i = 0; i + 1 < count; i += 2)
        {
            const double from = std::clamp(crossings[i], 0.0, width);
            const double to = std::clamp(crossings[i + 1], 0.0, width);
            for (auto x = static_cast<std::size_t>(from); x < ioCoverage.size() && x < to; ++x)
            {
                const double inside = std::min(to, x + 1.0) - std::max(from, double(x));
                ioCoverage[x] += static_cast<float>(inside) * inWeight;
            }
        }
    }
};

} // namespace

void AddPinEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_CornerPin, kCornerParams, &Make<CornerPinEffect>});
    ioEntries.push_back({kMatch_GarbageMatte, kCornerParams, &Make<GarbageMatteEffect>});
}

} // namespace FX::detail
