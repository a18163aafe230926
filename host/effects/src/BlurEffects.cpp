// Gaussian Blur: three box blurs in a row along each blurred direction,
// whose widths are chosen so that their sum of variances is that of the
// Gaussian (the box widths differ by at most two pixels). Each box pass is
// a running sum, so the cost per pixel does not grow with the blurriness.
// The blur works on premultiplied float components (so transparent pixels
// lend no colour) and repeats the edge pixels beyond the picture.
//
// The effect keeps its working planes between frames (a fresh 1080p plane
// would cost more to touch than the blur itself), so it renders one frame
// at a time: it is not re-entrant.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace FX::detail
{
namespace
{

constexpr std::string_view kDimensions[] = {"both", "horizontal", "vertical"};

constexpr ParamSpec kBlurParams[] = {
    // The Gaussian's standard deviation in full-frame pixels.
    {"blurriness", ParamType::kNumber, 10.0, 0.0, 1000.0},
    {"dimensions", ParamType::kChoice, 0.0, 0.0, 2.0, 0.0, kDimensions},
};

constexpr int kPasses = 3;

// The radii of the three boxes for standard deviation inSigma.
std::array<int, kPasses> BoxRadii(double inSigma)
{
    const double ideal = std::sqrt(12.0 * inSigma * inSigma / kPasses + 1.0);
    int lower = static_cast<int>(std::floor(ideal));
    if (lower % 2 == 0)
        --lower;
    const int upper = lower + 2;
    const double m = (12.0 * inSigma * inSigma - kPasses * lower * lower - 4.0 * kPasses * lower -
                      3.0 * kPasses) /
                     (-4.0 * lower - 4.0);
    const int smaller = static_cast<int>(std::lround(m));
    std::array<int, kPasses> radii{};
    for (int i = 0; i < kPasses; ++i)
        radii[static_cast<std::size_t>(i)] = ((i < smaller ? lower : upper) - 1) / 2;
    return radii;
}

// One box pass of radius inRadius along a line of inCount steps, each step
// kLanes contiguous floats (a pixel's four components, or a strip of pixels
// of one row), steps inInStride floats apart in inSource and inOutStride
// apart in outTarget. Beyond the line's ends its end steps repeat.
template <int kLanes>
void BoxLine(const float* inSource, std::ptrdiff_t inInStride, float* outTarget,
             std::ptrdiff_t inOutStride, int inCount, int inRadius)
{
    const float scale = 1.0f / static_cast<float>(2 * inRadius + 1);
    float sum[kLanes];
    auto step = [&](int inIndex)
    { return inSource + std::clamp(inIndex, 0, inCount - 1) * inInStride; };
    for (int c = 0; c < kLanes; ++c)
        sum[c] = 0.0f;
    for (int i = -inRadius - 1; i < inRadius; ++i)
    {
        const float* in = step(i);
        for (int c = 0; c < kLanes; ++c)
            sum[c] += in[c];
    }
    auto emit = [&](int inIndex, const float* inAdded, const float* inRemoved)
    {
        float* out = outTarget + inIndex * inOutStride;
        for (int c = 0; c < kLanes; ++c)
        {
            sum[c] += inAdded[c] - inRemoved[c];
            out[c] = sum[c] * scale;
        }
    };
    // The steps whose window reaches past an end take the clamped reads.
    const int safeFrom = std::min(inCount, inRadius + 1);
    const int safeTo = std::max(safeFrom, inCount - inRadius);
    for (int i = 0; i < safeFrom; ++i)
        emit(i, step(i + inRadius), step(i - inRadius - 1));
    for (int i = safeFrom; i < safeTo; ++i)
        emit(i, inSource + (i + inRadius) * inInStride, inSource + (i - inRadius - 1) * inInStride);
    for (int i = safeTo; i < inCount; ++i)
        emit(i, step(i + inRadius), step(i - inRadius - 1));
}

// Pixels [inX, inX + inCount) of row inY as premultiplied floats, each pixel's
// four inStride floats after the one before.
template <std::ptrdiff_t inStride = 4>
void LoadPremultiplied(const Pixels& inPixels, int inX, int inY, int inCount, float* outValues)
{
    if (inPixels.mFloat)
    {
        const float* p = inPixels.Row<float>(inY) + inX * 4;
        for (int i = 0; i < inCount * 4; i += 4, outValues += inStride)
        {
            const float a = p[i + 3];
            outValues[0] = p[i] * a, outValues[1] = p[i + 1] * a;
            outValues[2] = p[i + 2] * a, outValues[3] = a;
        }
        return;
    }
    const std::uint8_t* p = inPixels.Row<std::uint8_t>(inY) + inX * 4;
    for (int i = 0; i < inCount * 4; i += 4, outValues += inStride)
    {
        const float a = kUnit8[p[i + 3]];
        outValues[0] = kUnit8[p[i]] * a, outValues[1] = kUnit8[p[i + 1]] * a;
        outValues[2] = kUnit8[p[i + 2]] * a, outValues[3] = a;
    }
}

// The same pixels back from premultiplied floats.
template <std::ptrdiff_t inStride = 4>
void StoreStraight(const Pixels& inPixels, int inX, int inY, int inCount, const float* inValues)
{
    auto inverse = [](float inAlpha) { return inAlpha > 0.0f ? 1.0f / inAlpha : 0.0f; };
    if (inPixels.mFloat)
    {
        float* p = inPixels.Row<float>(inY) + inX * 4;
        for (int i = 0; i < inCount * 4; i += 4, inValues += inStride)
        {
            const float a = inValues[3], k = inverse(a);
            p[i] = inValues[0] * k, p[i + 1] = inValues[1] * k;
            p[i + 2] = inValues[2] * k, p[i + 3] = a;
        }
        return;
    }
    std::uint8_t* p = inPixels.Row<std::uint8_t>(inY) + inX * 4;
    for (int i = 0; i < inCount * 4; i += 4, inValues += inStride)
    {
        const float a = inValues[3], k = inverse(a);
        p[i] = ToByte(inValues[0] * k), p[i + 1] = ToByte(inValues[1] * k);
        p[i + 2] = ToByte(inValues[2] * k), p[i + 3] = ToByte(a);
    }
}

class GaussianBlurEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;
    bool IsReentrant() const override { return false; }

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const double sigma = Value(0, inContext) * inContext.mScale;
        const int dimensions = static_cast<int>(Value(1, inContext));
        const int width = inPixels.mWidth, height = inPixels.mHeight;
        if (sigma < 0.2 || width == 0 || height == 0)
            return QRT::kResult_Success;
        const std::array<int, kPasses> radii = BoxRadii(sigma);
        const bool horizontal = dimensions != 2, vertical = dimensions != 1;
        // Rows are blurred in blocks of kStrip rows (the last few one at a
        // time) in two block buffers, which stay in the cache; columns in
        // strips of kStrip pixels, for the same reason. Between the two the
        // plane holds the horizontally blurred picture.
        const std::size_t rowFloats = static_cast<std::size_t>(width) * 4;
        const std::size_t stripFloats = static_cast<std::size_t>(height) * kStrip * 4;
        mRowA.resize(rowFloats);
        mRowB.resize(rowFloats);
        if (vertical)
        {
            mPlane.resize(rowFloats * static_cast<std::size_t>(height));
            mStripA.resize(stripFloats);
            mStripB.resize(stripFloats);
        }
        float* rowA = mRowA.data();
        float* rowB = mRowB.data();
        constexpr std::ptrdiff_t kStripStride = kStrip * 4;
        int firstSingleRow = 0;
        if (horizontal)
        {
            // Blocks of kStrip rows, interleaved so that one step along the
            // rows is kStrip pixels of contiguous floats.
            mRowA.resize(rowFloats * kStrip);
            mRowB.resize(rowFloats * kStrip);
            rowA = mRowA.data();
            rowB = mRowB.data();
            for (; firstSingleRow + kStrip <= height; firstSingleRow += kStrip)
            {
                const int y0 = firstSingleRow;
                for (int r = 0; r < kStrip; ++r)
                    LoadPremultiplied<kStripStride>(inPixels, 0, y0 + r, width, rowA + r * 4);
                BoxLine<kStrip * 4>(rowA, kStripStride, rowB, kStripStride, width, radii[0]);
                BoxLine<kStrip * 4>(rowB, kStripStride, rowA, kStripStride, width, radii[1]);
                BoxLine<kStrip * 4>(rowA, kStripStride, rowB, kStripStride, width, radii[2]);
                for (int r = 0; r < kStrip; ++r)
                {
                    if (!vertical)
                    {
                        StoreStraight<kStripStride>(inPixels, 0, y0 + r, width, rowB + r * 4);
                        continue;
                    }
                    float* target = mPlane.data() + rowFloats * static_cast<std::size_t>(y0 + r);
                    const float* source = rowB + r * 4;
                    for (int x = 0; x < width; ++x)
                        for (int c = 0; c < 4; ++c)
                            target[x * 4 + c] = source[x * kStripStride + c];
                }
            }
        }
        for (int y = firstSingleRow; y < height; ++y)
        {
            float* target =
                vertical ? mPlane.data() + rowFloats * static_cast<std::size_t>(y) : rowA;
            LoadPremultiplied(inPixels, 0, y, width, horizontal ? rowA : target);
            if (horizontal)
            {
                BoxLine<4>(rowA, 4, rowB, 4, width, radii[0]);
                BoxLine<4>(rowB, 4, rowA, 4, width, radii[1]);
                BoxLine<4>(rowA, 4, vertical ? target : rowB, 4, width, radii[2]);
            }
            if (!vertical)
                StoreStraight(inPixels, 0, y, width, horizontal ? rowB : target);
        }
        if (!vertical)
            return QRT::kResult_Success;
        const auto planeStride = static_cast<std::ptrdiff_t>(rowFloats);
        for (int x = 0; x + kStrip <= width; x += kStrip)
        {
            BoxLine<kStrip * 4>(mPlane.data() + x * 4, planeStride, mStripA.data(), kStripStride,
                                height, radii[0]);
            BoxLine<kStrip * 4>(mStripA.data(), kStripStride, mStripB.data(), kStripStride, height,
                                radii[1]);
            BoxLine<kStrip * 4>(mStripB.data(), kStripStride, mStripA.data(), kStripStride, height,
                                radii[2]);
            for (int y = 0; y < height; ++y)
                StoreStraight(inPixels, x, y, kStrip, mStripA.data() + y * kStripStride);
        }
        // The last columns, fewer than a strip, one pixel at a time.
        for (int x = width - width % kStrip; x < width; ++x)
        {
            BoxLine<4>(mPlane.data() + x * 4, planeStride, mStripA.data(), 4, height, radii[0]);
            BoxLine<4>(mStripA.data(), 4, mStripB.data(), 4, height, radii[1]);
            BoxLine<4>(mStripB.data(), 4, mStripA.data(), 4, height, radii[2]);
            for (int y = 0; y < height; ++y)
                StoreStraight(inPixels, x, y, 1, mStripA.data() + y * 4);
        }
        return QRT::kResult_Success;
    }

private:
    static constexpr int kStrip = 16;

    // The working buffers, premultiplied BGRA floats, reused from frame to
    // frame. Touched only inside RenderInPlace, which the caller serialises.
    std::vector<float> mRowA;
    std::vector<float> mRowB;
    std::vector<float> mPlane;
    std::vector<float> mStripA;
    std::vector<float> mStripB;
};

} // namespace

void AddBlurEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_GaussianBlur, kBlurParams, &Make<GaussianBlurEffect>});
}

} // namespace FX::detail
