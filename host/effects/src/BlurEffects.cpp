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

// One box pass over inCount pixels of four components, inStride floats
// apart, from inSource into outTarget.
void BoxLine(const float* inSource, float* outTarget, int inCount, std::ptrdiff_t inStride,
             int inRadius)
{
    const float scale = 1.0f / static_cast<float>(2 * inRadius + 1);
    float sum[4] = {0, 0, 0, 0};
    auto at = [&](int inIndex)
    { return inSource + std::clamp(inIndex, 0, inCount - 1) * inStride; };
    for (int i = -inRadius - 1; i < inRadius; ++i)
        for (int c = 0; c < 4; ++c)
            sum[c] += at(i)[c];
    for (int i = 0; i < inCount; ++i)
    {
        const float* in = at(i + inRadius);
        const float* out = at(i - inRadius - 1);
        float* target = outTarget + i * inStride;
        for (int c = 0; c < 4; ++c)
        {
            sum[c] += in[c] - out[c];
            target[c] = sum[c] * scale;
        }
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
        if (sigma < 0.2 || inPixels.mWidth == 0 || inPixels.mHeight == 0)
            return QRT::kResult_Success;
        const std::array<int, kPasses> radii = BoxRadii(sigma);
        const std::size_t count = static_cast<std::size_t>(inPixels.mWidth) *
                                  static_cast<std::size_t>(inPixels.mHeight) * 4;
        mPlane.resize(count);
        mSpare.resize(count);
        Load(inPixels);
        const int width = inPixels.mWidth, height = inPixels.mHeight;
        if (dimensions != 2)
            for (const int radius : radii)
            {
                for (int y = 0; y < height; ++y)
                {
                    const std::size_t start = static_cast<std::size_t>(y) * width * 4;
                    BoxLine(mPlane.data() + start, mSpare.data() + start, width, 4, radius);
                }
                mPlane.swap(mSpare);
            }
        if (dimensions != 1)
            for (const int radius : radii)
            {
                for (int x = 0; x < width; ++x)
                    BoxLine(mPlane.data() + x * 4, mSpare.data() + x * 4, height,
                            static_cast<std::ptrdiff_t>(width) * 4, radius);
                mPlane.swap(mSpare);
            }
        Store(inPixels);
        return QRT::kResult_Success;
    }

private:
    void Load(const Pixels& inPixels)
    {
        float* plane = mPlane.data();
        for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
            for (std::int32_t x = 0; x < inPixels.mWidth; ++x, plane += 4)
            {
                float b, g, r, a;
                if (inPixels.mFloat)
                {
                    const float* p = inPixels.Row<float>(y) + x * 4;
                    b = p[0], g = p[1], r = p[2], a = p[3];
                }
                else
                {
                    const std::uint8_t* p = inPixels.Row<std::uint8_t>(y) + x * 4;
                    b = kUnit8[p[0]], g = kUnit8[p[1]], r = kUnit8[p[2]], a = kUnit8[p[3]];
                }
                plane[0] = b * a, plane[1] = g * a, plane[2] = r * a, plane[3] = a;
            }
    }

    void Store(const Pixels& inPixels) const
    {
        const float* plane = mPlane.data();
        for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
            for (std::int32_t x = 0; x < inPixels.mWidth; ++x, plane += 4)
            {
                const float a = plane[3];
                const float inverse = a > 0.0f ? 1.0f / a : 0.0f;
                const float b = plane[0] * inverse, g = plane[1] * inverse, r = plane[2] * inverse;
                if (inPixels.mFloat)
                {
                    float* p = inPixels.Row<float>(y) + x * 4;
                    p[0] = b, p[1] = g, p[2] = r, p[3] = a;
                }
                else
                {
                    std::uint8_t* p = inPixels.Row<std::uint8_t>(y) + x * 4;
                    p[0] = ToByte(b), p[1] = ToByte(g), p[2] = ToByte(r), p[3] = ToByte(a);
                }
            }
    }

    // The working planes, premultiplied BGRA floats; reused from frame to
    // frame. Touched only inside RenderInPlace, which the caller serialises.
    std::vector<float> mPlane;
    std::vector<float> mSpare;
};

} // namespace

void AddBlurEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_GaussianBlur, kBlurParams, &Make<GaussianBlurEffect>});
}

} // namespace FX::detail
