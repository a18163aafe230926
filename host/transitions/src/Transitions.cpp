// The transition objects: the common render entry (sources switched and
// reversed, fields rendered at their own progress) and the pixel work of each
// kind over the row kernels.

#include "IR/ImageRenderer.h"
#include "QRT/Allocated.h"
#include "TransitionKernels.h"
#include "TransitionObjects.h"
#include "VF/PixelFormatConversions.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <utility>
#include <vector>

namespace TX
{

float PlayedProgress(const TransitionParameters& inParameters, float inProgress)
{
    const float progress = std::clamp(inProgress, 0.0f, 1.0f);
    const float start = std::clamp(inParameters.mStartPercent, 0.0f, 100.0f);
    const float end = std::clamp(inParameters.mEndPercent, 0.0f, 100.0f);
    return (start + (end - start) * progress) / 100.0f;
}

namespace
{

constexpr std::uint32_t kBlack = 0xFF000000u;
constexpr std::uint32_t kWhite = 0xFFFFFFFFu;

// How much of the pixel centred at inCentre lies before inEdge: a step at
// the centre without a ramp, else a linear ramp inRamp pixels wide.
float Cover(float inEdge, float inCentre, float inRamp)
{
    if (inRamp <= 0.0f)
        return inCentre < inEdge ? 1.0f : 0.0f;
    return std::clamp((inEdge - inCentre) / inRamp + 0.5f, 0.0f, 1.0f);
}

// Per-channel weights of one row (four per pixel) in the row's depth.
class WeightRow
{
public:
    WeightRow(bool inFloat, std::int32_t inWidth)
        : mFloat(inFloat)
    {
        const std::size_t channels = static_cast<std::size_t>(inWidth) * 4;
        if (mFloat)
            mFloatB.resize(channels), mFloatC.resize(channels);
        else
            mByteB.resize(channels), mByteC.resize(channels);
    }

    void Set(std::int32_t inPixel, float inWeightB, float inWeightC)
    {
        const std::size_t at = static_cast<std::size_t>(inPixel) * 4;
        if (mFloat)
        {
            std::fill_n(&mFloatB[at], 4, inWeightB);
            std::fill_n(&mFloatC[at], 4, inWeightC);
            return;
        }
        const auto [b, c] = ByteWeights(inWeightB, inWeightC);
        std::fill_n(&mByteB[at], 4, b);
        std::fill_n(&mByteC[at], 4, c);
    }

    // Every pixel's weights from one weight per pixel (B's and the colour's).
    void SetAll(const float* inWeightsB, const float* inWeightsC, std::int32_t inWidth)
    {
        const std::size_t channels = static_cast<std::size_t>(inWidth) * 4;
        if (mFloat)
        {
            for (std::size_t i = 0; i < channels; ++i)
            {
                mFloatB[i] = inWeightsB[i / 4];
                mFloatC[i] = inWeightsC[i / 4];
            }
            return;
        }
        for (std::size_t i = 0; i < channels; ++i)
        {
            const float b = inWeightsB[i / 4];
            const int b8 = static_cast<int>(b * 256.0f + 0.5f);
            const int both =
                std::min(static_cast<int>((b + inWeightsC[i / 4]) * 256.0f + 0.5f), 256);
            mByteB[i] = static_cast<std::uint16_t>(b8);
            mByteC[i] = static_cast<std::uint16_t>(both - b8);
        }
    }

    // Weights in 1/256 whose sum stays within 256.
    static std::pair<std::uint16_t, std::uint16_t> ByteWeights(float inWeightB, float inWeightC)
    {
        const auto b = static_cast<std::uint16_t>(std::lround(inWeightB * 256.0f));
        const auto both = static_cast<std::uint16_t>(
            std::min<long>(std::lround((inWeightB + inWeightC) * 256.0f), 256));
        return {b, static_cast<std::uint16_t>(both > b ? both - b : 0)};
    }

    bool mFloat;
    std::vector<std::uint16_t> mByteB, mByteC;
    std::vector<float> mFloatB, mFloatC;
};

// One render's frames in picture rows, with the rows that stand in for an
// absent input and the colour rows of borders and dips.
class Canvas
{
public:
    Canvas(const VF::IRFrameBuffer* inA, const VF::IRFrameBuffer* inB,
           const VF::IRWritableFrameBuffer& inOut, float inScale)
        : mA(inA)
        , mB(inB)
        , mOut(inOut)
        , mFloat((inOut.mFormat & kIR_FormatBit_Float) != 0)
        , mStraight((inOut.mFormat & kIR_FormatBit_StraightAlpha) != 0)
        , mBottomLeft((inOut.mFormat & kIR_FormatBit_BottomLeft) != 0)
        , mPixelBytes(mFloat ? 16 : 4)
        , mScale(inScale)
        , mStandInA(RowBytes())
        , mStandInB(RowBytes())
        , mZero(RowBytes())
    {
    }

    std::int32_t Width() const { return mOut.mWidth; }
    std::int32_t Height() const { return mOut.mHeight; }
    bool IsFloat() const { return mFloat; }
    float Scale() const { return mScale; }
    std::size_t RowBytes() const { return static_cast<std::size_t>(mOut.mWidth) * mPixelBytes; }
    std::size_t PixelBytes() const { return mPixelBytes; }

    const std::uint8_t* RowA(std::int32_t inY) { return Row(mA, mB, mStandInA, inY); }
    const std::uint8_t* RowB(std::int32_t inY) { return Row(mB, mA, mStandInB, inY); }
    std::uint8_t* OutRow(std::int32_t inY)
    {
        return static_cast<std::uint8_t*>(mOut.mBase) + Offset(mOut.mRowBytes, inY);
    }

    // A row of inColor in the output's format, made once per colour.
    const std::uint8_t* ColorRow(std::uint32_t inColor)
    {
        for (const auto& [color, row] : mColors)
            if (color == inColor)
                return row.data();
        std::vector<std::uint8_t>& row = mColors.emplace_back(inColor, RowBytes()).second;
        IR_FillWithColor(row.data(), static_cast<std::int32_t>(RowBytes()), mOut.mFormat,
                         mOut.mWidth, 1, inColor, 0);
        return row.data();
    }

    void MixUniform(std::int32_t inY, const std::uint8_t* inC, float inWeightB, float inWeightC)
    {
        const std::uint8_t* a = RowA(inY);
        const std::uint8_t* b = RowB(inY);
        const std::int32_t channels = mOut.mWidth * 4;
        if (mFloat)
        {
            Kernels::MixRowF(reinterpret_cast<const float*>(a), reinterpret_cast<const float*>(b),
                             reinterpret_cast<const float*>(inC),
                             reinterpret_cast<float*>(OutRow(inY)), channels, inWeightB, inWeightC);
            return;
        }
        const auto [wb, wc] = WeightRow::ByteWeights(inWeightB, inWeightC);
        Kernels::MixRow8(a, b, inC, OutRow(inY), channels, wb, wc);
    }

    void MixWeights(std::int32_t inY, const std::uint8_t* inC, const WeightRow& inWeights)
    {
        const std::uint8_t* a = RowA(inY);
        const std::uint8_t* b = RowB(inY);
        const std::int32_t channels = mOut.mWidth * 4;
        if (mFloat)
            Kernels::MixRowF(reinterpret_cast<const float*>(a), reinterpret_cast<const float*>(b),
                             reinterpret_cast<const float*>(inC),
                             reinterpret_cast<float*>(OutRow(inY)), channels,
                             inWeights.mFloatB.data(), inWeights.mFloatC.data());
        else
            Kernels::MixRow8(a, b, inC, OutRow(inY), channels, inWeights.mByteB.data(),
                             inWeights.mByteC.data());
    }

    // inCount pixels of inSource from pixel inSourceX to pixel inOutX of row inY.
    void CopyPixels(std::int32_t inY, std::int32_t inOutX, const std::uint8_t* inSource,
                    std::int32_t inSourceX, std::int32_t inCount)
    {
        if (inCount > 0)
            std::memcpy(OutRow(inY) + std::size_t(inOutX) * mPixelBytes,
                        inSource + std::size_t(inSourceX) * mPixelBytes,
                        std::size_t(inCount) * mPixelBytes);
    }

private:
    std::ptrdiff_t Offset(std::int32_t inRowBytes, std::int32_t inY) const
    {
        const std::int32_t memoryRow = mBottomLeft ? mOut.mHeight - 1 - inY : inY;
        return std::ptrdiff_t{memoryRow} * inRowBytes;
    }

    // An absent input is transparent: zeros, or in straight alpha the other
    // input's colour with alpha 0, so that a mix with it fades the other's
    // coverage and keeps its colour.
    const std::uint8_t* Row(const VF::IRFrameBuffer* inSelf, const VF::IRFrameBuffer* inOther,
                            std::vector<std::uint8_t>& ioStandIn, std::int32_t inY) const
    {
        if (inSelf != nullptr)
            return static_cast<const std::uint8_t*>(inSelf->mBase) + Offset(inSelf->mRowBytes, inY);
        if (inOther == nullptr || !mStraight)
            return mZero.data();
        std::memcpy(ioStandIn.data(),
                    static_cast<const std::uint8_t*>(inOther->mBase) +
                        Offset(inOther->mRowBytes, inY),
                    ioStandIn.size());
        if (mFloat)
        {
            float* pixels = reinterpret_cast<float*>(ioStandIn.data());
            for (std::int32_t x = 0; x < mOut.mWidth; ++x)
                pixels[std::size_t(x) * 4 + 3] = 0.0f;
        }
        else
            for (std::int32_t x = 0; x < mOut.mWidth; ++x)
                ioStandIn[std::size_t(x) * 4 + 3] = 0;
        return ioStandIn.data();
    }

    const VF::IRFrameBuffer* mA;
    const VF::IRFrameBuffer* mB;
    const VF::IRWritableFrameBuffer& mOut;
    const bool mFloat;
    const bool mStraight;
    const bool mBottomLeft;
    const std::size_t mPixelBytes;
    const float mScale;
    std::vector<std::uint8_t> mStandInA, mStandInB, mZero;
    std::vector<std::pair<std::uint32_t, std::vector<std::uint8_t>>> mColors;
};

// Rows inFirst, inFirst + inStep, ... of a pass.
template <class F>
void ForRows(const Canvas& inCanvas, std::int32_t inFirst, std::int32_t inStep, F&& inRow)
{
    for (std::int32_t y = inFirst; y < inCanvas.Height(); y += inStep)
        inRow(y);
}

bool IsHorizontal(std::uint16_t inDirection)
{
    return inDirection == kTransitionDirection_FromLeft ||
           inDirection == kTransitionDirection_FromRight;
}

// From the left or the top: positions count from the start side.
bool FromStartSide(std::uint16_t inDirection)
{
    return inDirection == kTransitionDirection_FromLeft ||
           inDirection == kTransitionDirection_FromTop;
}

class Transition : public QRT::Implements<ITransition>
{
public:
    Transition(TransitionKind inKind, std::string inMatchName,
               const TransitionParameters& inParameters, const TransitionStyle& inStyle,
               MF::BinaryData inOpaqueData)
        : mKind(inKind)
        , mMatchName(std::move(inMatchName))
        , mParameters(inParameters)
        , mStyle(inStyle)
        , mOpaqueData(std::move(inOpaqueData))
    {
    }

    const std::string& GetMatchName() const override { return mMatchName; }
    const MF::BinaryData& GetOpaqueData() const override { return mOpaqueData; }
    const TransitionParameters& GetParameters() const override { return mParameters; }

    QRT::Result Render(const MF::IVideoFrame* inFrameA, const MF::IVideoFrame* inFrameB,
                       MF::IVideoFrame& ioOutput, float inProgress,
                       const TransitionParameters& inParameters,
                       const TransitionFrameSettings& inFrame,
                       std::uint32_t /*inQuality*/) const override
    {
        const VF::IRWritableFrameBuffer out = VF::GetWritableIRFrameBuffer(ioOutput);
        if (!out.IsAddressable() || (out.mFormat & kIR_FormatMask_Layout) != kIR_FormatLayout_BGRA)
            return kIR_UnsupportedFormat;
        VF::IRFrameBuffer a, b;
        for (const auto& [frame, buffer] : {std::pair{inFrameA, &a}, std::pair{inFrameB, &b}})
        {
            if (frame == nullptr)
                continue;
            *buffer = VF::GetIRFrameBuffer(*frame);
            if (buffer->mFormat != out.mFormat || buffer->mWidth != out.mWidth ||
                buffer->mHeight != out.mHeight)
                return kResult_FramesDoNotMatch;
        }
        const VF::IRFrameBuffer* first = inFrameA ? &a : nullptr;
        const VF::IRFrameBuffer* second = inFrameB ? &b : nullptr;
        float progress = PlayedProgress(inParameters, inProgress);
        float secondField = PlayedProgress(inParameters, inFrame.mSecondFieldProgress);
        if (inParameters.mSwitchSources)
            std::swap(first, second);
        // Played backwards, from the end picture to the start one: the edge
        // moves the other way and the pictures end where they would start.
        if (inParameters.mReverse)
        {
            std::swap(first, second);
            progress = 1.0f - progress;
            secondField = 1.0f - secondField;
        }
        Canvas canvas(first, second, out, inFrame.mScale > 0.0f ? inFrame.mScale : 1.0f);
        const bool interlaced = inFrame.mFieldType == mvxmediatypes::kFieldType_UpperFirst ||
                                inFrame.mFieldType == mvxmediatypes::kFieldType_LowerFirst;
        if (!interlaced || progress == secondField)
        {
            RenderRows(canvas, 0, 1, progress, inParameters);
            return QRT::kResult_Success;
        }
        const std::int32_t firstRow =
            inFrame.mFieldType == mvxmediatypes::kFieldType_UpperFirst ? 0 : 1;
        RenderRows(canvas, firstRow, 2, progress, inParameters);
        RenderRows(canvas, 1 - firstRow, 2, secondField, inParameters);
        return QRT::kResult_Success;
    }

protected:
    ~Transition() = default;

private:
    float Ramp(const Canvas& inCanvas, const TransitionParameters& inParameters) const
    {
        const float softness = mStyle.mSoftness * inCanvas.Scale();
        return std::max(softness, inParameters.mAntiAliasQuality > 0 ? 1.0f : 0.0f);
    }

    void RenderRows(Canvas& ioCanvas, std::int32_t inFirst, std::int32_t inStep, float inProgress,
                    const TransitionParameters& inParameters) const
    {
        switch (mKind)
        {
        case TransitionKind::kCrossDissolve:
            ForRows(ioCanvas, inFirst, inStep,
                    [&](std::int32_t y) { ioCanvas.MixUniform(y, nullptr, inProgress, 0.0f); });
            break;
        case TransitionKind::kDipToBlack:
        case TransitionKind::kDipToWhite:
            Dip(ioCanvas, inFirst, inStep, inProgress);
            break;
        case TransitionKind::kWipe:
            Wipe(ioCanvas, inFirst, inStep, inProgress, inParameters);
            break;
        case TransitionKind::kPush:
        case TransitionKind::kSlide:
            Move(ioCanvas, inFirst, inStep, inProgress, inParameters.mDirection);
            break;
        case TransitionKind::kIris:
            Iris(ioCanvas, inFirst, inStep, inProgress, inParameters);
            break;
        }
    }

    // A to the colour over the first half, the colour to B over the second.
    void Dip(Canvas& ioCanvas, std::int32_t inFirst, std::int32_t inStep, float inProgress) const
    {
        const std::uint8_t* color =
            ioCanvas.ColorRow(mKind == TransitionKind::kDipToWhite ? kWhite : kBlack);
        const float toB = inProgress < 0.5f ? 0.0f : 2.0f * inProgress - 1.0f;
        const float toColor = inProgress < 0.5f ? 2.0f * inProgress : 1.0f - toB;
        ForRows(ioCanvas, inFirst, inStep,
                [&](std::int32_t y) { ioCanvas.MixUniform(y, color, toB, toColor); });
    }

    // B up to the edge, then the border, then A. The edge travels from
    // before the start side (border and softness out of sight) to past the
    // far side: at progress p it stands at p * (extent + border + softness)
    // - border - softness / 2.
    void Wipe(Canvas& ioCanvas, std::int32_t inFirst, std::int32_t inStep, float inProgress,
              const TransitionParameters& inParameters) const
    {
        const std::uint16_t direction = inParameters.mDirection;
        const bool horizontal = IsHorizontal(direction);
        const std::int32_t extent = horizontal ? ioCanvas.Width() : ioCanvas.Height();
        const float border = std::max(0.0f, inParameters.mBorderWidth) * ioCanvas.Scale();
        const float softness = mStyle.mSoftness * ioCanvas.Scale();
        const float ramp = Ramp(ioCanvas, inParameters);
        const float edge = inProgress * (float(extent) + border + softness) - border - softness / 2;
        const std::uint8_t* color =
            border > 0.0f ? ioCanvas.ColorRow(inParameters.mBorderColor) : nullptr;
        const bool fromStart = FromStartSide(direction);
        const auto weights = [&](std::int32_t inAt)
        {
            const float centre = float(fromStart ? inAt : extent - 1 - inAt) + 0.5f;
            const float b = Cover(edge, centre, ramp);
            return std::pair{b, color ? Cover(edge + border, centre, ramp) - b : 0.0f};
        };
        if (!horizontal)
        {
            ForRows(ioCanvas, inFirst, inStep,
                    [&](std::int32_t y)
                    {
                        const auto [b, c] = weights(y);
                        ioCanvas.MixUniform(y, color, b, c);
                    });
            return;
        }
        WeightRow row(ioCanvas.IsFloat(), ioCanvas.Width());
        for (std::int32_t x = 0; x < ioCanvas.Width(); ++x)
        {
            const auto [b, c] = weights(x);
            row.Set(x, b, c);
        }
        ForRows(ioCanvas, inFirst, inStep,
                [&](std::int32_t y) { ioCanvas.MixWeights(y, color, row); });
    }

    // Push: B enters from the side and A leaves by the other. Slide: B
    // enters over A, which stays. Whole pixels.
    void Move(Canvas& ioCanvas, std::int32_t inFirst, std::int32_t inStep, float inProgress,
              std::uint16_t inDirection) const
    {
        const bool push = mKind == TransitionKind::kPush;
        const bool fromStart = FromStartSide(inDirection);
        const std::int32_t width = ioCanvas.Width();
        const std::int32_t height = ioCanvas.Height();
        if (!IsHorizontal(inDirection))
        {
            const std::int32_t shift = static_cast<std::int32_t>(std::lround(inProgress * height));
            ForRows(ioCanvas, inFirst, inStep,
                    [&](std::int32_t y)
                    {
                        const std::uint8_t* source;
                        if (fromStart)
                            source = y < shift ? ioCanvas.RowB(height - shift + y)
                                               : ioCanvas.RowA(push ? y - shift : y);
                        else
                            source = y < height - shift ? ioCanvas.RowA(push ? y + shift : y)
                                                        : ioCanvas.RowB(y - (height - shift));
                        ioCanvas.CopyPixels(y, 0, source, 0, width);
                    });
            return;
        }
        const std::int32_t shift = static_cast<std::int32_t>(std::lround(inProgress * width));
        ForRows(ioCanvas, inFirst, inStep,
                [&](std::int32_t y)
                {
                    const std::uint8_t* a = ioCanvas.RowA(y);
                    const std::uint8_t* b = ioCanvas.RowB(y);
                    if (fromStart)
                    {
                        ioCanvas.CopyPixels(y, 0, b, width - shift, shift);
                        ioCanvas.CopyPixels(y, shift, a, push ? 0 : shift, width - shift);
                    }
                    else
                    {
                        ioCanvas.CopyPixels(y, 0, a, push ? shift : 0, width - shift);
                        ioCanvas.CopyPixels(y, width - shift, b, 0, shift);
                    }
                });
    }

    // B inside a circle that grows from the centre to past the farthest
    // corner, the border around it, A outside.
    void Iris(Canvas& ioCanvas, std::int32_t inFirst, std::int32_t inStep, float inProgress,
              const TransitionParameters& inParameters) const
    {
        const bool travels = !(inParameters.mStartPosition == inParameters.mEndPosition);
        const auto lerp = [&](float inFrom, float inTo)
        { return inFrom + (inTo - inFrom) * inProgress; };
        const TransitionPoint centre = travels
                                           ? TransitionPoint{lerp(inParameters.mStartPosition.mX,
                                                                  inParameters.mEndPosition.mX),
                                                             lerp(inParameters.mStartPosition.mY,
                                                                  inParameters.mEndPosition.mY)}
                                           : inParameters.mCenterPosition;
        const float width = float(ioCanvas.Width());
        const float height = float(ioCanvas.Height());
        const float cx = centre.mX * width;
        const float cy = centre.mY * height;
        const float reach = std::hypot(std::max(cx, width - cx), std::max(cy, height - cy));
        const float border = std::max(0.0f, inParameters.mBorderWidth) * ioCanvas.Scale();
        const float softness = mStyle.mSoftness * ioCanvas.Scale();
        const float ramp = Ramp(ioCanvas, inParameters);
        const float radius = inProgress * (reach + border + softness) - border - softness / 2;
        const std::uint8_t* color =
            border > 0.0f ? ioCanvas.ColorRow(inParameters.mBorderColor) : nullptr;
        const std::int32_t count = ioCanvas.Width();
        WeightRow row(ioCanvas.IsFloat(), count);
        std::vector<float> weightsB(static_cast<std::size_t>(count));
        std::vector<float> weightsC(static_cast<std::size_t>(count));
        // Without a ramp the edge is a step at the pixel centre; with one, a
        // linear ramp (a plain loop either way, so that it vectorises).
        const float slope = ramp > 0.0f ? 1.0f / ramp : 0.0f;
        ForRows(ioCanvas, inFirst, inStep,
                [&](std::int32_t y)
                {
                    const float dy = float(y) + 0.5f - cy;
                    for (std::int32_t x = 0; x < count; ++x)
                    {
                        const float dx = float(x) + 0.5f - cx;
                        const float distance = std::sqrt(dx * dx + dy * dy);
                        float inside, withBorder;
                        if (ramp > 0.0f)
                        {
                            inside = std::clamp((radius - distance) * slope + 0.5f, 0.0f, 1.0f);
                            withBorder =
                                std::clamp((radius + border - distance) * slope + 0.5f, 0.0f, 1.0f);
                        }
                        else
                        {
                            inside = distance < radius ? 1.0f : 0.0f;
                            withBorder = distance < radius + border ? 1.0f : 0.0f;
                        }
                        weightsB[std::size_t(x)] = inside;
                        weightsC[std::size_t(x)] = color ? withBorder - inside : 0.0f;
                    }
                    row.SetAll(weightsB.data(), weightsC.data(), count);
                    ioCanvas.MixWeights(y, color, row);
                });
    }

    const TransitionKind mKind;
    const std::string mMatchName;
    const TransitionParameters mParameters;
    const TransitionStyle mStyle;
    const MF::BinaryData mOpaqueData;
};

} // namespace

QRT::InterfaceRef<ITransition> CreateTransitionObject(TransitionKind inKind,
                                                      std::string inMatchName,
                                                      const TransitionParameters& inParameters,
                                                      const TransitionStyle& inStyle,
                                                      MF::BinaryData inOpaqueData)
{
    return QRT::Allocated<Transition>::Create<ITransition>(
        inKind, std::move(inMatchName), inParameters, inStyle, std::move(inOpaqueData));
}

} // namespace TX
