// Gaussian Blur, separable: each blurred direction is filtered along lines of
// the picture. Small standard deviations (below kBoxFrom pixels) convolve with
// the sampled Gaussian itself, out to four deviations; larger ones run three
// box blurs in a row whose widths are chosen so that their sum of variances is
// near that of the Gaussian (the box widths differ by at most two pixels), a
// running sum each, so the cost per pixel does not grow with the blurriness.
// On an 8-bit picture the result is within 1 code value of the true Gaussian
// below kBoxFrom and within 3 code values from there on.
//
// The blur works on premultiplied float components (so transparent pixels lend
// no colour) and repeats the edge pixels beyond the picture. Columns are
// blurred first, in strips of 16 columns, into a float plane; rows then in
// blocks of 16 rows, each block interleaved so that one step along the rows is
// 16 pixels of contiguous floats. The three boxes run in one sweep along a
// strip or block (SimdBlur.h).
//
// The working buffers are kept between frames (a fresh 1080p plane would cost
// more to touch than the blur itself), one set per frame being rendered, so
// several frames may render at once.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"
#include "SimdBlur.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <memory>
#include <mutex>

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

// Below this standard deviation the blur convolves with the sampled Gaussian.
constexpr double kBoxFrom = 3.0;
// The sampled Gaussian reaches this many standard deviations out.
constexpr double kTapReach = 4.0;

// One blurred direction: the vector kernel's description and the weights it
// points at.
struct LineKernel
{
    explicit LineKernel(double inSigma)
    {
        if (inSigma >= kBoxFrom)
        {
            const std::array<int, kPasses> radii = BoxRadii(inSigma);
            std::copy(radii.begin(), radii.end(), mSimd.boxRadii);
            const int widest = 2 * *std::max_element(radii.begin(), radii.end()) + 2;
            mSimd.ringSteps = 1;
            while (mSimd.ringSteps < widest)
                mSimd.ringSteps *= 2;
            return;
        }
        const int radius = static_cast<int>(std::ceil(kTapReach * inSigma));
        std::vector<double> weights(static_cast<std::size_t>(radius) + 1);
        double total = 0.0;
        for (int t = 0; t <= radius; ++t)
        {
            weights[static_cast<std::size_t>(t)] = std::exp(-0.5 * t * t / (inSigma * inSigma));
            total += (t == 0 ? 1.0 : 2.0) * weights[static_cast<std::size_t>(t)];
        }
        for (double w : weights)
            mTaps.push_back(static_cast<float>(w / total));
        mSimd.taps = mTaps.data();
        mSimd.tapRadius = radius;
    }

    std::vector<float> mTaps;
    Simd::BlurLineKernel mSimd;
};

// Pixels [inX, inX + inCount) of row inY as premultiplied floats, each pixel's
// four inStride floats after the one before.
void LoadPremultiplied(const Pixels& inPixels, int inX, int inY, int inCount, float* outValues,
                       std::ptrdiff_t inStride)
{
    if (!inPixels.mFloat)
        return Simd::LoadPremultiplied8(inPixels.Row<std::uint8_t>(inY) + inX * 4, inCount,
                                        outValues, inStride);
    const float* p = inPixels.Row<float>(inY) + inX * 4;
    for (int i = 0; i < inCount * 4; i += 4, outValues += inStride)
    {
        const float a = p[i + 3];
        outValues[0] = p[i] * a, outValues[1] = p[i + 1] * a;
        outValues[2] = p[i + 2] * a, outValues[3] = a;
    }
}

// The same pixels back from premultiplied floats.
void StoreStraight(const Pixels& inPixels, int inX, int inY, int inCount, const float* inValues,
                   std::ptrdiff_t inStride)
{
    if (!inPixels.mFloat)
        return Simd::StoreStraight8(inValues, inStride, inCount,
                                    inPixels.Row<std::uint8_t>(inY) + inX * 4);
    float* p = inPixels.Row<float>(inY) + inX * 4;
    for (int i = 0; i < inCount * 4; i += 4, inValues += inStride)
    {
        const float a = inValues[3], k = a > 0.0f ? 1.0f / a : 0.0f;
        p[i] = inValues[0] * k, p[i + 1] = inValues[1] * k;
        p[i + 2] = inValues[2] * k, p[i + 3] = a;
    }
}

// The working buffers of one render, premultiplied BGRA floats: the plane
// between the two directions, an input and an output line of steps as long as
// the longer side, and the two rings of the box passes.
struct BlurBuffers
{
    void Reserve(int inWidth, int inHeight, int inRingSteps)
    {
        const auto longer = static_cast<std::size_t>(std::max(inWidth, inHeight));
        mPlane.resize(static_cast<std::size_t>(inWidth) * static_cast<std::size_t>(inHeight) * 4);
        mIn.resize(longer * Simd::kBlurStepFloats);
        mOut.resize(longer * Simd::kBlurStepFloats);
        mRingA.resize(static_cast<std::size_t>(inRingSteps) * Simd::kBlurStepFloats);
        mRingB.resize(static_cast<std::size_t>(inRingSteps) * Simd::kBlurStepFloats);
    }

    std::vector<float> mPlane;
    std::vector<float> mIn;
    std::vector<float> mOut;
    std::vector<float> mRingA;
    std::vector<float> mRingB;
};

constexpr int kStep = Simd::kBlurStepPixels;
constexpr std::ptrdiff_t kStepFloats = Simd::kBlurStepFloats;

class GaussianBlurEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;
    bool IsReentrant() const override { return true; }

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const double sigma = Value(0, inContext) * inContext.mScale;
        const int dimensions = static_cast<int>(Value(1, inContext));
        if (sigma < 0.2 || inPixels.mWidth == 0 || inPixels.mHeight == 0)
            return QRT::kResult_Success;
        std::unique_ptr<BlurBuffers> buffers = Lease();
        const LineKernel kernel(sigma);
        buffers->Reserve(inPixels.mWidth, inPixels.mHeight, kernel.mSimd.ringSteps);
        const bool horizontal = dimensions != 2, vertical = dimensions != 1;
        if (vertical)
            BlurColumns(inPixels, kernel.mSimd, *buffers, horizontal);
        if (horizontal)
            BlurRows(inPixels, kernel.mSimd, *buffers, vertical);
        Return(std::move(buffers));
        return QRT::kResult_Success;
    }

private:
    // Columns, in strips of kStep (the last may be narrower: its spare lanes
    // are blurred too, and dropped), from the picture into the plane
    // (inToPlane) or back into the picture.
    static void BlurColumns(const Pixels& inPixels, const Simd::BlurLineKernel& inKernel,
                            BlurBuffers& ioBuffers, bool inToPlane)
    {
        const int width = inPixels.mWidth, height = inPixels.mHeight;
        const std::ptrdiff_t planeStride = static_cast<std::ptrdiff_t>(width) * 4;
        float* in = ioBuffers.mIn.data();
        float* out = ioBuffers.mOut.data();
        for (int x = 0; x < width; x += kStep)
        {
            const int count = std::min(kStep, width - x);
            if (count < kStep)
                std::fill(ioBuffers.mIn.begin(), ioBuffers.mIn.end(), 0.0f);
            for (int y = 0; y < height; ++y)
                LoadPremultiplied(inPixels, x, y, count, in + y * kStepFloats, 4);
            // A whole strip goes straight into the plane.
            const bool direct = inToPlane && count == kStep;
            float* target = direct ? ioBuffers.mPlane.data() + x * 4 : out;
            Simd::BlurLine(in, kStepFloats, target, direct ? planeStride : kStepFloats, height,
                           inKernel, ioBuffers.mRingA.data(), ioBuffers.mRingB.data());
            for (int y = 0; !direct && y < height; ++y)
            {
                const float* line = out + y * kStepFloats;
                if (inToPlane)
                    std::copy(line, line + count * 4,
                              ioBuffers.mPlane.data() + y * planeStride + x * 4);
                else
                    StoreStraight(inPixels, x, y, count, line, 4);
            }
        }
    }

    // Rows, in blocks of kStep (the last may hold fewer), from the plane
    // (inFromPlane) or the picture into the picture.
    static void BlurRows(const Pixels& inPixels, const Simd::BlurLineKernel& inKernel,
                         BlurBuffers& ioBuffers, bool inFromPlane)
    {
        const int width = inPixels.mWidth, height = inPixels.mHeight;
        const auto rowFloats = static_cast<std::size_t>(width) * 4;
        float* in = ioBuffers.mIn.data();
        float* out = ioBuffers.mOut.data();
        for (int y = 0; y < height; y += kStep)
        {
            const int count = std::min(kStep, height - y);
            if (count < kStep)
                std::fill(ioBuffers.mIn.begin(), ioBuffers.mIn.end(), 0.0f);
            for (int r = 0; r < count; ++r)
            {
                float* line = in + r * 4;
                if (!inFromPlane)
                {
                    LoadPremultiplied(inPixels, 0, y + r, width, line, kStepFloats);
                    continue;
                }
                const float* source =
                    ioBuffers.mPlane.data() + rowFloats * static_cast<std::size_t>(y + r);
                for (int x = 0; x < width; ++x)
                    std::memcpy(line + x * kStepFloats, source + x * 4, 4 * sizeof(float));
            }
            Simd::BlurLine(in, kStepFloats, out, kStepFloats, width, inKernel,
                           ioBuffers.mRingA.data(), ioBuffers.mRingB.data());
            if (inPixels.mFloat)
            {
                for (int r = 0; r < count; ++r)
                    StoreStraight(inPixels, 0, y + r, width, out + r * 4, kStepFloats);
                continue;
            }
            std::uint8_t* rows[kStep];
            for (int r = 0; r < count; ++r)
                rows[r] = inPixels.Row<std::uint8_t>(y + r);
            Simd::StoreStraight8Block(out, width, count, rows);
        }
    }

    std::unique_ptr<BlurBuffers> Lease()
    {
        std::lock_guard lock(mSpareMutex);
        if (mSpare.empty())
            return std::make_unique<BlurBuffers>();
        std::unique_ptr<BlurBuffers> buffers = std::move(mSpare.back());
        mSpare.pop_back();
        return buffers;
    }

    void Return(std::unique_ptr<BlurBuffers> inBuffers)
    {
        std::lock_guard lock(mSpareMutex);
        mSpare.push_back(std::move(inBuffers));
    }

    // Guards mSpare: the buffer sets of finished renders, one per frame that
    // rendered at once, reused by the next.
    std::mutex mSpareMutex;
    std::vector<std::unique_ptr<BlurBuffers>> mSpare;
};

} // namespace

void AddBlurEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_GaussianBlur, kBlurParams, &Make<GaussianBlurEffect>});
}

} // namespace FX::detail
