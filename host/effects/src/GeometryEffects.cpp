// Geometry effects: Transform (drawn through IR_Motion) and Crop.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"
#include "IR/ImageRenderer.h"
#include "VF/VideoFrame.h"

#include <cmath>
#include <cstring>
#include <numbers>

namespace FX::detail
{
namespace
{

constexpr double kFar = 100000.0;

// Transform: the picture scaled (per cent) and skewed around its anchor
// point (an offset from the picture's centre, full-frame pixels), rotated
// clockwise (degrees), and placed with the anchor at the position (an
// offset from the frame's centre); drawn at the opacity (per cent) over
// transparency. Skew shears along the skew axis (degrees from horizontal).
constexpr ParamSpec kTransformParams[] = {
    {"position", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
    {"anchor", ParamType::kPoint, 0.0, -kFar, kFar, 0.0},
    {"scale", ParamType::kNumber, 100.0, 0.0, 10000.0},
    {"rotation", ParamType::kNumber, 0.0, -kFar, kFar},
    {"skew", ParamType::kNumber, 0.0, -70.0, 70.0},
    {"skewAxis", ParamType::kNumber, 0.0, -kFar, kFar},
    {"opacity", ParamType::kNumber, 100.0, 0.0, 100.0},
};

struct Matrix2
{
    double m00, m01, m10, m11;

    Matrix2 operator*(const Matrix2& inOther) const
    {
        return {m00 * inOther.m00 + m01 * inOther.m10, m00 * inOther.m01 + m01 * inOther.m11,
                m10 * inOther.m00 + m11 * inOther.m10, m10 * inOther.m01 + m11 * inOther.m11};
    }
};

Matrix2 Turn(double inDegrees)
{
    const double angle = inDegrees * std::numbers::pi / 180.0;
    const double c = std::cos(angle), s = std::sin(angle);
    // Clockwise on screen, y pointing down.
    return {c, -s, s, c};
}

class TransformEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderStaged(const RenderContext& inContext,
                             QRT::InterfaceRef<MF::IVideoFrame>& ioFrame) override
    {
        const QRT::ParamRect bounds = ioFrame->GetBounds();
        const double width = bounds.Width(), height = bounds.Height();
        const double scale = inContext.mScale;
        const double size = Value(2, inContext) / 100.0;
        const double skew = std::tan(Value(4, inContext) * std::numbers::pi / 180.0);
        const Matrix2 shear =
            Turn(Value(5, inContext)) * Matrix2{1.0, skew, 0.0, 1.0} * Turn(-Value(5, inContext));
        const Matrix2 linear = Turn(Value(3, inContext)) * shear * Matrix2{size, 0.0, 0.0, size};
        const double anchorX = width / 2 + Value(1, inContext) * scale;
        const double anchorY = height / 2 + ValueY(1, inContext) * scale;
        const double positionX = width / 2 + Value(0, inContext) * scale;
        const double positionY = height / 2 + ValueY(0, inContext) * scale;
        IR_AffineMatrix matrix;
        matrix.a = linear.m00;
        matrix.c = linear.m01;
        matrix.b = linear.m10;
        matrix.d = linear.m11;
        matrix.tx = positionX - (linear.m00 * anchorX + linear.m01 * anchorY);
        matrix.ty = positionY - (linear.m10 * anchorX + linear.m11 * anchorY);

        QRT::InterfaceRef<MF::IVideoFrame> result = ioFrame->CreateEmptyFrame(true);
        const Pixels target = PixelsOf(*result);
        const IR_PixelFormat format =
            target.mFloat ? kIR_PixelFormat_BGRA_32f : kIR_PixelFormat_BGRA_8u;
        const std::int32_t status =
            IR_Motion(ioFrame->GetBaseAddress(), ioFrame->GetRowBytes(), format, target.mWidth,
                      target.mHeight, target.mBase, target.mRowBytes, format, target.mWidth,
                      target.mHeight, &matrix, static_cast<float>(Value(6, inContext) / 100.0),
                      static_cast<std::int32_t>(inContext.mQuality), 0, false);
        if (status != kIR_NoError)
            return status;
        ioFrame = std::move(result);
        return QRT::kResult_Success;
    }
};

// Crop: the given share of the picture (per cent of its width or height)
// from each edge becomes transparent black.
constexpr ParamSpec kCropParams[] = {
    {"left", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"top", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"right", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"bottom", ParamType::kNumber, 0.0, 0.0, 100.0},
};

class CropEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        auto edge = [&](std::uint32_t inIndex, std::int32_t inSize) {
            return static_cast<std::int32_t>(
                std::lround(Value(inIndex, inContext) / 100.0 * inSize));
        };
        const std::int32_t left = edge(0, inPixels.mWidth), top = edge(1, inPixels.mHeight);
        const std::int32_t right = inPixels.mWidth - edge(2, inPixels.mWidth);
        const std::int32_t bottom = inPixels.mHeight - edge(3, inPixels.mHeight);
        const std::size_t pixelBytes = inPixels.mFloat ? 16 : 4;
        const std::size_t rowBytes = pixelBytes * static_cast<std::size_t>(inPixels.mWidth);
        for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
        {
            std::uint8_t* row = inPixels.Row<std::uint8_t>(y);
            if (y < top || y >= bottom || left >= right)
            {
                std::memset(row, 0, rowBytes);
                continue;
            }
            std::memset(row, 0, pixelBytes * static_cast<std::size_t>(left));
            std::memset(row + pixelBytes * static_cast<std::size_t>(right), 0,
                        pixelBytes * static_cast<std::size_t>(inPixels.mWidth - right));
        }
        return QRT::kResult_Success;
    }
};

} // namespace

void AddGeometryEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_Transform, kTransformParams, &Make<TransformEffect>});
    ioEntries.push_back({kMatch_Crop, kCropParams, &Make<CropEffect>});
}

} // namespace FX::detail
