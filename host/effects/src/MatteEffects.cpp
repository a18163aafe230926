// Mattes: the track matte (the alpha or the luma of another layer of the
// sequence becomes the clip's alpha), the image matte (the same with a still
// image) and the difference matte (the clip is made transparent where it
// matches a layer). The layer
// is the first layer input; its picture is the layer at the effect's time,
// drawn at the render's size, and lines up with the clip's pixels after the
// clip frame's origin offset.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"
#include "VF/PngFile.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <filesystem>
#include <mutex>
#include <string>
#include <vector>

namespace FX::detail
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

// A layer's picture as straight BGRA floats, one value of four per pixel,
// with the alpha taken as opaque where the frame has none.
struct LayerPicture
{
    std::int32_t mWidth = 0;
    std::int32_t mHeight = 0;
    std::vector<float> mBgra;

    bool Empty() const { return mBgra.empty(); }
    // The pixel at (inX, inY), or transparent black outside the picture.
    const float* At(std::int32_t inX, std::int32_t inY) const
    {
        static constexpr float kClear[4] = {0.0f, 0.0f, 0.0f, 0.0f};
        if (inX < 0 || inY < 0 || inX >= mWidth || inY >= mHeight)
            return kClear;
        return &mBgra[(static_cast<std::size_t>(inY) * static_cast<std::size_t>(mWidth) +
                       static_cast<std::size_t>(inX)) *
                      4];
    }
};

// inFrame as a picture of inWidth x inHeight (scaled when its size differs).
QRT::Result ToPicture(const FrameRef& inFrame, std::int32_t inWidth, std::int32_t inHeight,
                      std::uint32_t inQuality, LayerPicture& outPicture)
{
    outPicture = {};
    FrameRef staged = VF::CreateVideoFrame(
        mvxmediatypes::kPixelFormat_BGRA_4444_32f, static_cast<std::uint32_t>(inWidth),
        static_cast<std::uint32_t>(inHeight), inFrame->GetPixelAspectRatio(), false, false);
    if (!staged)
        return kIR_UnsupportedFormat;
    const QRT::Result status = VF::VideoFrameManipulators::CopyFrame(
        inFrame, staged, static_cast<mvxmediatypes::RenderQuality>(inQuality));
    if (QRT::Failed(status))
        return status;
    outPicture.mWidth = inWidth;
    outPicture.mHeight = inHeight;
    outPicture.mBgra.resize(static_cast<std::size_t>(inWidth) * static_cast<std::size_t>(inHeight) *
                            4);
    const bool opaque = !inFrame->HasAlpha();
    const bool premultiplied =
        inFrame->GetAlphaChannel() == mvxmediatypes::kAlphaChannel_Premultiplied;
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        const auto* row = reinterpret_cast<const float*>(
            static_cast<const std::uint8_t*>(staged->GetBaseAddress()) +
            static_cast<std::ptrdiff_t>(y) * staged->GetRowBytes());
        float* out =
            &outPicture.mBgra[static_cast<std::size_t>(y) * static_cast<std::size_t>(inWidth) * 4];
        for (std::int32_t x = 0; x < 4 * inWidth; x += 4)
        {
            const float alpha = opaque ? 1.0f : row[x + 3];
            const float unpremultiply = premultiplied && alpha > 0.0f ? 1.0f / alpha : 1.0f;
            for (int c = 0; c < 3; ++c)
                out[x + c] = row[x + c] * unpremultiply;
            out[x + 3] = alpha;
        }
    }
    return QRT::kResult_Success;
}

// The first layer's picture at the context's time; empty when there is no
// layer or it shows nothing there.
QRT::Result ReadLayer(const RenderContext& inContext, const LayerInputs& inLayers,
                      LayerPicture& outPicture)
{
    outPicture = {};
    if (inLayers.empty() || !inLayers.front())
        return QRT::kResult_Success;
    FrameRef frame;
    const QRT::Result status = inLayers.front()->RenderLayer(inContext.mTime, frame);
    if (QRT::Failed(status) || !frame)
        return status;
    const QRT::ParamRect bounds = frame->GetBounds();
    return ToPicture(frame, bounds.Width(), bounds.Height(), inContext.mQuality, outPicture);
}

// Multiplies the alpha of every pixel of inPixels by inFactor(x, y, b, g, r)
// where (x, y) is the pixel's place in the rendered picture.
template <class Factor>
void MultiplyAlpha(const Pixels& inPixels, const MF::IVideoFrame& inFrame, Factor&& inFactor)
{
    std::uint32_t originX = 0;
    std::uint32_t originY = 0;
    inFrame.GetOriginOffset(originX, originY);
    const bool hasOrigin = originX != MF::kNoOriginOffset || originY != MF::kNoOriginOffset;
    const auto dx = hasOrigin ? static_cast<std::int32_t>(originX) : 0;
    const auto dy = hasOrigin ? static_cast<std::int32_t>(originY) : 0;
    for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
    {
        if (inPixels.mFloat)
        {
            float* row = inPixels.Row<float>(y);
            for (std::int32_t x = 0; x < inPixels.mWidth; ++x)
            {
                float* pixel = row + 4 * x;
                pixel[3] *= inFactor(x - dx, y - dy, pixel[0], pixel[1], pixel[2]);
            }
            continue;
        }
        std::uint8_t* row = inPixels.Row<std::uint8_t>(y);
        for (std::int32_t x = 0; x < inPixels.mWidth; ++x)
        {
            std::uint8_t* pixel = row + 4 * x;
            const float factor =
                inFactor(x - dx, y - dy, kUnit8[pixel[0]], kUnit8[pixel[1]], kUnit8[pixel[2]]);
            pixel[3] = ToByte(kUnit8[pixel[3]] * factor);
        }
    }
}

// Runs inApply on the writable staged pixels of ioFrame.
template <class Apply>
QRT::Result RenderAlpha(const RenderContext& inContext, FrameRef& ioFrame, Apply&& inApply)
{
    return EffectBase::Stage(inContext, ioFrame,
                             [&](FrameRef& ioStaged)
                             {
                                 ioStaged = VF::MakeWriteableVideoFrame(
                                     ioStaged,
                                     static_cast<mvxmediatypes::RenderQuality>(inContext.mQuality));
                                 inApply(PixelsOf(*ioStaged), *ioStaged);
                                 ioStaged->AlphaChanged();
                                 return QRT::kResult_Success;
                             });
}

constexpr std::string_view kMatteKinds[] = {"alpha", "luma"};

constexpr ParamSpec kTrackMatteParams[] = {
    {"matte", ParamType::kLayer, kNoLayer, 0.0, kNoLayer},
    {"using", ParamType::kChoice, 0.0, 0.0, 1.0, 0.0, kMatteKinds},
    {"invert", ParamType::kBool, 0.0, 0.0, 1.0},
};

// Multiplies the clip's alpha by inMatte's alpha, or its luma over black
// (luma times alpha), or one minus either when inverted.
QRT::Result ApplyMatte(const RenderContext& inContext, FrameRef& ioFrame,
                       const LayerPicture& inMatte, bool inLuma, bool inInvert)
{
    return RenderAlpha(
        inContext, ioFrame,
        [&](const Pixels& inPixels, const MF::IVideoFrame& inFrame)
        {
            MultiplyAlpha(inPixels, inFrame,
                          [&](std::int32_t inX, std::int32_t inY, float, float, float)
                          {
                              const float* m = inMatte.At(inX, inY);
                              const float value = inLuma ? Luma(m[2], m[1], m[0]) * m[3] : m[3];
                              return inInvert ? 1.0f - value : value;
                          });
        });
}

// Track matte: the clip's alpha is multiplied by the matte layer's alpha, or
// by its luma over black (luma times alpha), or by one minus either when
// inverted. Without a matte picture the matte is clear: the clip vanishes,
// or stays whole when inverted.
class TrackMatteEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

    QRT::Result Render(const RenderContext& inContext, FrameRef& ioFrame,
                       const LayerInputs& inLayers) override
    {
        LayerPicture matte;
        const QRT::Result status = ReadLayer(inContext, inLayers, matte);
        if (QRT::Failed(status))
            return status;
        return ApplyMatte(inContext, ioFrame, matte, Value(1, inContext) >= 0.5,
                          Value(2, inContext) >= 0.5);
    }
};

constexpr ParamSpec kImageMatteParams[] = {
    {"using", ParamType::kChoice, 0.0, 0.0, 1.0, 0.0, kMatteKinds},
    {"invert", ParamType::kBool, 0.0, 0.0, 1.0},
};

// Image matte: as the track matte, with a still PNG image, scaled to the
// frame, as the matte. The image's path is the effect's opaque data (a
// relative one is taken from the timeline file's folder); it is read at the
// first render, once. A path that cannot be read fails every
// render with the reader's status.
class ImageMatteEffect : public EffectBase
{
public:
    explicit ImageMatteEffect(EffectSetup inSetup)
        : EffectBase(std::move(inSetup))
    {
    }

    QRT::Result Render(const RenderContext& inContext, FrameRef& ioFrame,
                       const LayerInputs& /*inLayers*/) override
    {
        std::call_once(mRead,
                       [&]
                       {
                           MF::BinaryData path;
                           if (!GetOpaqueData(path))
                           {
                               mStatus = VF::kResult_PngCannotOpen;
                               return;
                           }
                           const auto bytes = path.GetBytes();
                           // A relative name is the timeline file's folder's.
                           std::filesystem::path file(std::string(bytes.begin(), bytes.end()));
                           if (file.is_relative() && !GetBaseFolder().empty())
                               file = std::filesystem::path(GetBaseFolder()) / file;
                           mStatus =
                               VF::ReadPngFile(file.lexically_normal().string(), mImage).mResult;
                       });
        if (QRT::Failed(mStatus))
            return mStatus;
        // The delivered picture's size; the frame's own without one.
        QRT::ParamRect size = inContext.mFrameRect;
        if (size.Width() <= 0 || size.Height() <= 0)
            size = ioFrame ? ioFrame->GetBounds() : size;
        LayerPicture matte;
        const QRT::Result status =
            ToPicture(mImage, size.Width(), size.Height(), inContext.mQuality, matte);
        if (QRT::Failed(status))
            return status;
        return ApplyMatte(inContext, ioFrame, matte, Value(0, inContext) >= 0.5,
                          Value(1, inContext) >= 0.5);
    }

protected:
    ~ImageMatteEffect() = default;

private:
    // Guards the one read of the image; mImage and mStatus are fixed after it.
    std::once_flag mRead;
    FrameRef mImage;
    QRT::Result mStatus = QRT::kResult_Success;
};

constexpr ParamSpec kDifferenceMatteParams[] = {
    {"layer", ParamType::kLayer, kNoLayer, 0.0, kNoLayer},
    {"threshold", ParamType::kNumber, 10.0, 0.0, 100.0},
    {"softness", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"invert", ParamType::kBool, 0.0, 0.0, 1.0},
};

// Difference matte: d is the largest component difference between the clip
// and the layer; the alpha is multiplied by 0 up to the threshold, rising
// to 1 over the softness (inverted: one minus that). Without a layer
// picture the clip is compared with transparent black.
class DifferenceMatteEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

    QRT::Result Render(const RenderContext& inContext, FrameRef& ioFrame,
                       const LayerInputs& inLayers) override
    {
        LayerPicture layer;
        const QRT::Result status = ReadLayer(inContext, inLayers, layer);
        if (QRT::Failed(status))
            return status;
        const auto threshold = static_cast<float>(Value(1, inContext) / 100.0);
        const auto softness = static_cast<float>(Value(2, inContext) / 100.0);
        const bool invert = Value(3, inContext) >= 0.5;
        return RenderAlpha(
            inContext, ioFrame,
            [&](const Pixels& inPixels, const MF::IVideoFrame& inFrame)
            {
                MultiplyAlpha(
                    inPixels, inFrame,
                    [&](std::int32_t inX, std::int32_t inY, float inB, float inG, float inR)
                    {
                        const float* m = layer.At(inX, inY);
                        const float d = std::max(
                            {std::abs(inB - m[0]), std::abs(inG - m[1]), std::abs(inR - m[2])});
                        float keep = d <= threshold ? 0.0f : 1.0f;
                        if (softness > 0.0f)
                            keep = std::clamp((d - threshold) / softness, 0.0f, 1.0f);
                        return invert ? 1.0f - keep : keep;
                    });
            });
    }
};

} // namespace

void AddMatteEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_TrackMatte, kTrackMatteParams, &Make<TrackMatteEffect>});
    ioEntries.push_back({kMatch_ImageMatte, kImageMatteParams, &Make<ImageMatteEffect>});
    ioEntries.push_back(
        {kMatch_DifferenceMatte, kDifferenceMatteParams, &Make<DifferenceMatteEffect>});
}

} // namespace FX::detail
