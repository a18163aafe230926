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
constexpr double kRecursiveFrom = 1.5;
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

// Pixels [inX, inX + inCount) of rows [inY, inY + inRows) as premultiplied
// floats: row r's pixel i at outValues + r * inRowFloats + i * inPixelFloats.
void LoadPremultiplied(const Pixels& inPixels, int inX, int inY, int inRows, int inCount,
                       float* outValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats)
{
    if (!inPixels.mFloat)
        return Simd::LoadPremultiplied8(inPixels.Row<std::uint8_t>(inY) + inX * 4,
                                        inPixels.mRowBytes, inRows, inCount, outValues, inRowFloats,
                                        inPixelFloats);
    for (int r = 0; r < inRows; ++r)
    {
        const float* p = inPixels.Row<float>(inY + r) + inX * 4;
        float* values = outValues + r * inRowFloats;
        for (int i = 0; i < inCount * 4; i += 4, values += inPixelFloats)
        {
            const float a = p[i + 3];
            values[0] = p[i] * a, values[1] = p[i + 1] * a;
            values[2] = p[i + 2] * a, values[3] = a;
        }
    }
}

// The same pixels back from premultiplied floats.
void StoreStraight(const Pixels& inPixels, int inX, int inY, int inRows, int inCount,
                   const float* inValues, std::ptrdiff_t inRowFloats, std::ptrdiff_t inPixelFloats)
{
    if (!inPixels.mFloat)
        return Simd::StoreStraight8(inValues, inRowFloats, inPixelFloats, inRows, inCount,
                                    inPixels.Row<std::uint8_t>(inY) + inX * 4, inPixels.mRowBytes);
    for (int r = 0; r < inRows; ++r)
    {
        float* p = inPixels.Row<float>(inY + r) + inX * 4;
        const float* values = inValues + r * inRowFloats;
        for (int i = 0; i < inCount * 4; i += 4, values += inPixelFloats)
        {
            const float a = values[3], k = a > 0.0f ? 1.0f / a : 0.0f;
            p[i] = values[0] * k, p[i + 1] = values[1] * k;
            p[i + 2] = values[2] * k, p[i + 3] = a;
        }
    }
}

// The working buffers of one render, premultiplied BGRA floats: the plane
// between the two directions, in blocks of kStep rows (the last padded) laid
// out as the row pass reads them, and an input and an output line of steps
// as long as the longer side.
struct BlurBuffers
{
    void Reserve(int inWidth, int inHeight)
    {
        const auto longer = static_cast<std::size_t>(std::max(inWidth, inHeight));
        const auto blocks = static_cast<std::size_t>((inHeight + Simd::kBlurStepPixels - 1) /
                                                     Simd::kBlurStepPixels);
        mPlane.resize(blocks * static_cast<std::size_t>(inWidth) * Simd::kBlurStepFloats);
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
        const std::ptrdiff_t blockFloats = static_cast<std::ptrdiff_t>(width) * kStepFloats;
        float* in = ioBuffers.mIn.data();
        float* out = ioBuffers.mOut.data();
        for (int x = 0; x < width; x += kStep)
        {
            const int count = std::min(kStep, width - x);
            if (count < kStep)
                std::fill(ioBuffers.mIn.begin(), ioBuffers.mIn.end(), 0.0f);
            LoadPremultiplied(inPixels, x, 0, height, count, in, kStepFloats, 4);
            Simd::BlurLine(in, kStepFloats, out, kStepFloats, height, inKernel);
            if (!inToPlane)
            {
                StoreStraight(inPixels, x, 0, height, count, out, kStepFloats, 4);
                continue;
            }
            for (int y = 0; y < height; ++y)
            {
                float* block = ioBuffers.mPlane.data() + (y / kStep) * blockFloats +
                               x * kStepFloats + (y % kStep) * 4;
                for (int i = 0; i < count; ++i)
                    std::memcpy(block + i * kStepFloats, out + y * kStepFloats + i * 4,
                                4 * sizeof(float));
            }
        }
    }

    // Rows, in blocks of kStep (the last may hold fewer), from the plane
    // (inFromPlane) or the picture into the picture.
    static void BlurRows(const Pixels& inPixels, const Simd::BlurLineKernel& inKernel,
                         BlurBuffers& ioBuffers, bool inFromPlane)
    {
        const int width = inPixels.mWidth, height = inPixels.mHeight;
        const std::ptrdiff_t blockFloats = static_cast<std::ptrdiff_t>(width) * kStepFloats;
        float* out = ioBuffers.mOut.data();
        for (int y = 0; y < height; y += kStep)
        {
            const int count = std::min(kStep, height - y);
            float* in = ioBuffers.mPlane.data() + (y / kStep) * blockFloats;
            if (!inFromPlane)
            {
                in = ioBuffers.mIn.data();
                if (count < kStep)
                    std::fill(ioBuffers.mIn.begin(), ioBuffers.mIn.end(), 0.0f);
                LoadPremultiplied(inPixels, 0, y, count, width, in, 4, kStepFloats);
            }
            Simd::BlurLine(in, kStepFloats, out, kStepFloats, width, inKernel);
            StoreStraight(inPixels, 0, y, count, width, out, 4, kStepFloats);
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
