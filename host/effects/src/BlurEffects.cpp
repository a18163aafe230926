// Gaussian Blur, separable: each blurred direction is filtered along lines of
// the picture. Small standard deviations (below kRecursiveFrom pixels)
// convolve with the sampled Gaussian itself, out to four deviations; larger
// ones run a fourth-order recursive filter (two second-order sections, forward
// and backward) whose impulse response is the sampled Gaussian to within 0.06 %
// of its peak, so the cost per pixel does not grow with the blurriness. On an
// 8-bit picture the result is within 1 code value of the true Gaussian.
//
// The blur works on premultiplied float components (so transparent pixels lend
// no colour) and repeats the edge pixels beyond the picture. Columns are
// blurred first, in strips of 16 columns, into a float plane; rows then in
// blocks of 16 rows, each block interleaved so that one step along the rows is
// 16 pixels of contiguous floats (SimdBlur.h).
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
#include <complex>
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

// Below this standard deviation the blur convolves with the sampled Gaussian.
constexpr double kRecursiveFrom = 3.0;
// The sampled Gaussian reaches this many standard deviations out.
constexpr double kTapReach = 4.0;

// exp(-x * x / 2) for x >= 0 as the sum over two terms of
// (a cos(w x) + b sin(w x)) exp(-l x): the recursive filter's kernel, in
// standard deviations.
struct Term
{
    double a, b, w, l;
};
constexpr Term kTerms[2] = {{1.6800, 3.7350, 0.6318, 1.7830}, {-0.6803, -0.2598, 1.9970, 1.7230}};

// One blurred direction: the vector kernel's description and the weights it
// points at.
struct LineKernel
{
    explicit LineKernel(double inSigma)
    {
        if (inSigma >= kRecursiveFrom)
        {
            Recursive(inSigma);
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

    // Term k at sample n >= 0 is Re(c p^n) with c = a - ib, p = exp((-l + iw) / sigma):
    // a section with poles p and its conjugate, numerator Re(c) - Re(c conj(p)) z^-1.
    // The feedback is rounded to float first and the whole kernel (causal half
    // plus the mirrored rest without its centre) scaled to a gain of exactly 1
    // with the rounded poles, so a flat picture stays flat however wide the
    // blur.
    void Recursive(double inSigma)
    {
        double b0[2], b1[2], e1[2], e2[2], total = 0.0;
        for (int k = 0; k < 2; ++k)
        {
            const std::complex<double> c(kTerms[k].a, -kTerms[k].b);
            const std::complex<double> p =
                std::exp(std::complex<double>(-kTerms[k].l, kTerms[k].w) / inSigma);
            e1[k] = static_cast<float>(-2.0 * p.real());
            e2[k] = static_cast<float>(std::norm(p));
            b0[k] = c.real();
            b1[k] = -(c * std::conj(p)).real();
            const double causal = (b0[k] + b1[k]) / (1.0 + e1[k] + e2[k]);
            total += 2.0 * causal - b0[k];
        }
        for (int k = 0; k < 2; ++k)
        {
            Simd::BlurLineKernel::Section& s = mSimd.sections[k];
            const double f0 = b0[k] / total, f1 = b1[k] / total;
            const double c1 = f1 - e1[k] * f0, c2 = -e2[k] * f0;
            s.b0 = static_cast<float>(f0), s.b1 = static_cast<float>(f1);
            s.c1 = static_cast<float>(c1), s.c2 = static_cast<float>(c2);
            s.e1 = static_cast<float>(e1[k]), s.e2 = static_cast<float>(e2[k]);
            s.forwardSteady = static_cast<float>((f0 + f1) / (1.0 + e1[k] + e2[k]));
            s.backwardSteady = static_cast<float>((c1 + c2) / (1.0 + e1[k] + e2[k]));
        }
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
// between the two directions and an input and an output line of steps as long
// as the longer side.
struct BlurBuffers
{
    void Reserve(int inWidth, int inHeight)
    {
        const auto longer = static_cast<std::size_t>(std::max(inWidth, inHeight));
        mPlane.resize(static_cast<std::size_t>(inWidth) * static_cast<std::size_t>(inHeight) * 4);
        mIn.resize(longer * Simd::kBlurStepFloats);
        mOut.resize(longer * Simd::kBlurStepFloats);
    }

    std::vector<float> mPlane;
    std::vector<float> mIn;
    std::vector<float> mOut;
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
        buffers->Reserve(inPixels.mWidth, inPixels.mHeight);
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
                           inKernel);
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
            Simd::BlurLine(in, kStepFloats, out, kStepFloats, width, inKernel);
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
