#include "VF/VideoFrameManipulators.h"

#include "FrameStaging.h"
#include "IR/ImageRenderer.h"
#include "VF/VideoFrame.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cstring>

namespace VF
{
namespace
{

namespace mt = mvxmediatypes;
using detail::StagedImage;
using FrameRef = VideoFrameManipulators::FrameRef;

// The largest height whose split film frames miss their first field (rows 0,
// 2, 4); taller frames miss the second.
constexpr int32_t kPulldownFirstFieldMaximumRows = 576;

int32_t IRQuality(mt::RenderQuality inQuality)
{
    return static_cast<int32_t>(std::min<uint32_t>(inQuality, mt::kRenderQuality_Max));
}

// A rectangle of rows of a staged image: every row, or one field's rows.
struct ImageView
{
    std::byte* mBase = nullptr;
    int32_t mRowBytes = 0;
    IR_PixelFormat mFormat = 0;
    int32_t mWidth = 0;
    int32_t mHeight = 0;
};

ImageView WholeView(const StagedImage& inImage)
{
    return ImageView{static_cast<std::byte*>(inImage.GetWritableBase()), inImage.GetRowBytes(),
                     inImage.GetFormat(), inImage.GetWidth(), inImage.GetHeight()};
}

// Rows inParity, inParity + 2, ... of a view.
ImageView FieldView(const ImageView& inView, int32_t inParity)
{
    return ImageView{inView.mBase + static_cast<size_t>(inParity) * inView.mRowBytes,
                     inView.mRowBytes * 2, inView.mFormat, inView.mWidth,
                     (inView.mHeight - inParity + 1) / 2};
}

QRT::Result Scale(const ImageView& inSource, const ImageView& inDestination, int32_t inQuality)
{
    if (inSource.mFormat == inDestination.mFormat && inSource.mWidth == inDestination.mWidth &&
        inSource.mHeight == inDestination.mHeight)
    {
        // Same format and size: the rows as they are (a conversion round trip
        // through RGB would clamp Y'CbCr values outside the RGB cube).
        const auto bytes =
            static_cast<size_t>(IR_MinimumRowBytes(inSource.mFormat, inSource.mWidth));
        for (int32_t y = 0; y < inSource.mHeight; ++y)
            std::memcpy(inDestination.mBase + static_cast<ptrdiff_t>(y) * inDestination.mRowBytes,
                        inSource.mBase + static_cast<ptrdiff_t>(y) * inSource.mRowBytes, bytes);
        return QRT::kResult_Success;
    }
    return IR_ScaleConvert(inSource.mBase, inSource.mRowBytes, inSource.mFormat, inSource.mWidth,
                           inSource.mHeight, inDestination.mBase, inDestination.mRowBytes,
                           inDestination.mFormat, inDestination.mWidth, inDestination.mHeight,
                           inQuality);
}

void RequireWritablePair(const FrameRef& inSource, const FrameRef& inDestination)
{
    MVX_INPUT_CONTRACT(inSource != nullptr);
    MVX_INPUT_CONTRACT(inDestination != nullptr);
    MVX_INPUT_CONTRACT(inSource.Get() != inDestination.Get());
    MVX_INPUT_CONTRACT(!inDestination->IsShared());
}

void RequireMatchingPair(const FrameRef& inSource, const FrameRef& inDestination)
{
    RequireWritablePair(inSource, inDestination);
    MVX_INPUT_CONTRACT(inSource->GetPixelFormat() == inDestination->GetPixelFormat());
    MVX_INPUT_CONTRACT(inSource->GetBounds() == inDestination->GetBounds());
}

// Row access of a single-plane frame by picture row, for the row-wise
// operations (field swap, flicker filter, pulldown merge).
struct RowAccess
{
    mt::PixelFormat mFormat;
    int32_t mHeight = 0;
    size_t mActiveBytes = 0;

    static bool Make(const MF::IVideoFrame& inFrame, RowAccess& outAccess)
    {
        outAccess.mFormat = inFrame.GetPixelFormat();
        outAccess.mHeight = inFrame.GetBounds().Height();
        outAccess.mActiveBytes =
            detail::ActiveRowBytes(outAccess.mFormat, inFrame.GetBounds().Width());
        return inFrame.GetPlaneCount() == 1 && outAccess.mActiveBytes != 0;
    }
    const std::byte* Row(const MF::IVideoFrame& inFrame, int32_t inRow) const
    {
        return static_cast<const std::byte*>(inFrame.GetBaseAddress()) +
               static_cast<size_t>(detail::MemoryRowOfPictureRow(mFormat, mHeight, inRow)) *
                   static_cast<size_t>(inFrame.GetRowBytes());
    }
    std::byte* WritableRow(MF::IVideoFrame& inFrame, int32_t inRow) const
    {
        return static_cast<std::byte*>(inFrame.GetWritableBaseAddress()) +
               static_cast<size_t>(detail::MemoryRowOfPictureRow(mFormat, mHeight, inRow)) *
                   static_cast<size_t>(inFrame.GetRowBytes());
    }
};

template <typename Sample>
void ConvolveIntegerRow(const std::byte* inAbove, const std::byte* inRow, const std::byte* inBelow,
                        std::byte* outRow, size_t inBytes)
{
    const size_t count = inBytes / sizeof(Sample);
    for (size_t i = 0; i < count; ++i)
    {
        Sample a, b, c;
        std::memcpy(&a, inAbove + i * sizeof(Sample), sizeof(Sample));
        std::memcpy(&b, inRow + i * sizeof(Sample), sizeof(Sample));
        std::memcpy(&c, inBelow + i * sizeof(Sample), sizeof(Sample));
        const auto value = static_cast<Sample>((uint32_t{a} + 2u * b + c + 2u) >> 2);
        std::memcpy(outRow + i * sizeof(Sample), &value, sizeof(Sample));
    }
}

void ConvolveFloatRow(const std::byte* inAbove, const std::byte* inRow, const std::byte* inBelow,
                      std::byte* outRow, size_t inBytes)
{
    const size_t count = inBytes / sizeof(float);
    for (size_t i = 0; i < count; ++i)
    {
        float a, b, c;
        std::memcpy(&a, inAbove + i * 4, 4);
        std::memcpy(&b, inRow + i * 4, 4);
        std::memcpy(&c, inBelow + i * 4, 4);
        const float value = (a + 2.0f * b + c) * 0.25f;
        std::memcpy(outRow + i * 4, &value, 4);
    }
}

void ConvolveHalfRow(const std::byte* inAbove, const std::byte* inRow, const std::byte* inBelow,
                     std::byte* outRow, size_t inBytes)
{
    const size_t count = inBytes / 2;
    for (size_t i = 0; i < count; ++i)
    {
        uint16_t a, b, c;
        std::memcpy(&a, inAbove + i * 2, 2);
        std::memcpy(&b, inRow + i * 2, 2);
        std::memcpy(&c, inBelow + i * 2, 2);
        const uint16_t value = detail::FloatToHalf(
            (detail::HalfToFloat(a) + 2.0f * detail::HalfToFloat(b) + detail::HalfToFloat(c)) *
            0.25f);
        std::memcpy(outRow + i * 2, &value, 2);
    }
}

// Alpha in the fourth channel of interleaved 4:4:4 pixels, read and written as
// 0..1 whatever the sample kind.
struct AlphaAccess
{
    uint32_t mKind = 0;
    size_t mSampleBytes = 0;

    static bool Make(mt::PixelFormat inFormat, AlphaAccess& outAccess)
    {
        if (!inFormat.IsRaster() || !inFormat.HasAlpha() || inFormat.GetChroma() != 0 ||
            inFormat.GetChannelCount() != 4)
            return false;
        outAccess.mKind = inFormat.GetSampleKind();
        switch (outAccess.mKind)
        {
        case mt::kPixelSampleKind_8u:
            outAccess.mSampleBytes = 1;
            return true;
        case mt::kPixelSampleKind_16u:
        case mt::kPixelSampleKind_16f:
            outAccess.mSampleBytes = 2;
            return true;
        case mt::kPixelSampleKind_32f:
            outAccess.mSampleBytes = 4;
            return true;
        default:
            return false;
        }
    }
    float Read(const std::byte* inSample) const
    {
        switch (mKind)
        {
        case mt::kPixelSampleKind_8u:
            return std::to_integer<uint8_t>(*inSample) / 255.0f;
        case mt::kPixelSampleKind_16u:
        case mt::kPixelSampleKind_16f:
        {
            uint16_t value;
            std::memcpy(&value, inSample, 2);
            return mKind == mt::kPixelSampleKind_16u ? value / 65535.0f
                                                     : detail::HalfToFloat(value);
        }
        default:
        {
            float value;
            std::memcpy(&value, inSample, 4);
            return value;
        }
        }
    }
    void Write(std::byte* outSample, float inValue) const
    {
        switch (mKind)
        {
        case mt::kPixelSampleKind_8u:
            *outSample = static_cast<std::byte>(
                static_cast<uint8_t>(std::clamp(inValue, 0.0f, 1.0f) * 255.0f + 0.5f));
            return;
        case mt::kPixelSampleKind_16u:
        {
            const auto value =
                static_cast<uint16_t>(std::clamp(inValue, 0.0f, 1.0f) * 65535.0f + 0.5f);
            std::memcpy(outSample, &value, 2);
            return;
        }
        case mt::kPixelSampleKind_16f:
        {
            const uint16_t value = detail::FloatToHalf(inValue);
            std::memcpy(outSample, &value, 2);
            return;
        }
        default:
            std::memcpy(outSample, &inValue, 4);
            return;
        }
    }
};

enum class AlphaChange
{
    kOpaque,
    kInvert,
};

QRT::Result ChangeAlpha(const FrameRef& ioFrame, AlphaChange inChange)
{
    MVX_INPUT_CONTRACT(ioFrame != nullptr);
    MVX_INPUT_CONTRACT(!ioFrame->IsShared());
    const mt::PixelFormat format = ioFrame->GetPixelFormat();
    if (!format.HasAlpha())
        return QRT::kResult_Success;
    AlphaAccess alpha;
    if (!AlphaAccess::Make(format, alpha) || ioFrame->GetPlaneCount() != 1)
        return kResult_UnsupportedPixelFormat;
    const bool premultiplied = format.IsPremultiplied();
    const QRT::ParamRect bounds = ioFrame->GetBounds();
    const size_t pixelBytes = alpha.mSampleBytes * 4;
    auto* base = static_cast<std::byte*>(ioFrame->GetWritableBaseAddress());
    const size_t rowBytes = static_cast<size_t>(ioFrame->GetRowBytes());
    for (int32_t y = 0; y < bounds.Height(); ++y)
    {
        std::byte* pixel = base + static_cast<size_t>(y) * rowBytes;
        for (int32_t x = 0; x < bounds.Width(); ++x, pixel += pixelBytes)
        {
            std::byte* a = pixel + 3 * alpha.mSampleBytes;
            if (inChange == AlphaChange::kOpaque)
            {
                alpha.Write(a, 1.0f);
                continue;
            }
            const float old = alpha.Read(a);
            const float inverted = 1.0f - old;
            if (premultiplied)
            {
                // Re-associate colour with the new alpha; colour under a
                // zero alpha is unknown and becomes 0.
                const float factor = old > 0.0f ? inverted / old : 0.0f;
                for (int c = 0; c < 3; ++c)
                    alpha.Write(pixel + c * alpha.mSampleBytes,
                                alpha.Read(pixel + c * alpha.mSampleBytes) * factor);
            }
            alpha.Write(a, inverted);
        }
    }
    ioFrame->AlphaChanged();
    return QRT::kResult_Success;
}

} // namespace

QRT::Result VideoFrameManipulators::CopyFrame(const FrameRef& inSource,
                                              const FrameRef& inDestination,
                                              mt::RenderQuality inQuality)
{
    RequireWritablePair(inSource, inDestination);
    if (inSource->GetPixelFormat() == inDestination->GetPixelFormat() &&
        inSource->GetBounds() == inDestination->GetBounds())
    {
        // Same layout: an exact copy, whatever the format.
        CopyFramePixels(*inSource, *inDestination);
        return QRT::kResult_Success;
    }
    StagedImage source;
    QRT::Result status = source.OpenForReading(*inSource);
    if (QRT::Failed(status))
        return status;
    StagedImage destination;
    status = destination.OpenForWriting(*inDestination, false);
    if (QRT::Failed(status))
        return status;
    status = Scale(WholeView(source), WholeView(destination), IRQuality(inQuality));
    if (QRT::Failed(status))
        return status;
    destination.Commit();
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::CopyFrameWithFields(const FrameRef& inSource,
                                                        const FrameRef& inDestination,
                                                        mt::RenderQuality inQuality,
                                                        int32_t inFieldSelection)
{
    RequireWritablePair(inSource, inDestination);
    MVX_INPUT_CONTRACT(inFieldSelection == kFieldSelection_Frame ||
                       inFieldSelection == kFieldSelection_First ||
                       inFieldSelection == kFieldSelection_Second);
    if (inFieldSelection == kFieldSelection_Frame || inSource->GetBounds().Height() < 2)
        return CopyFrame(inSource, inDestination, inQuality);
    StagedImage source;
    QRT::Result status = source.OpenForReading(*inSource);
    if (QRT::Failed(status))
        return status;
    StagedImage destination;
    status = destination.OpenForWriting(*inDestination, false);
    if (QRT::Failed(status))
        return status;
    const ImageView sourceView = WholeView(source);
    const ImageView destinationView = WholeView(destination);
    const int32_t quality = IRQuality(inQuality);
    if (mt::IsInterlaced(inDestination->GetFieldType()))
    {
        // Each field on its own, so that no row of one field is ever made
        // from rows of the other.
        for (int32_t parity = 0; parity < 2 && QRT::Succeeded(status); ++parity)
        {
            const ImageView field = FieldView(destinationView, parity);
            if (field.mHeight > 0)
                status = Scale(FieldView(sourceView, parity), field, quality);
        }
    }
    else
    {
        const bool lowerFirst = inSource->GetFieldType() == mt::kFieldType_LowerFirst;
        const bool wantFirst = inFieldSelection == kFieldSelection_First;
        // The earlier field is rows 1, 3, 5 for lower-first material.
        const int32_t parity = (wantFirst == lowerFirst) ? 1 : 0;
        status = Scale(FieldView(sourceView, parity), destinationView, quality);
    }
    if (QRT::Failed(status))
        return status;
    destination.Commit();
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::CopyRect(const FrameRef& inSource,
                                             const QRT::ParamRect& inSourceRect,
                                             const FrameRef& inDestination,
                                             const QRT::ParamRect& inDestinationRect,
                                             mt::RenderQuality inQuality, uint32_t inChannels)
{
    RequireWritablePair(inSource, inDestination);
    MVX_INPUT_CONTRACT(!inSourceRect.IsEmpty() && !inDestinationRect.IsEmpty());
    MVX_INPUT_CONTRACT(inSource->CanProvideRect(inSourceRect));
    MVX_INPUT_CONTRACT(inDestination->CanProvideRect(inDestinationRect));
    MVX_INPUT_CONTRACT(inChannels != 0 && (inChannels & ~kCopyChannels_All) == 0);
    const mt::PixelFormat sourceFormat = inSource->GetPixelFormat();
    const mt::PixelFormat destinationFormat = inDestination->GetPixelFormat();
    MVX_INPUT_CONTRACT(sourceFormat.GetChroma() == mt::kPixelChroma_444 ||
                       (inSourceRect.mLeft & 1) == 0);
    MVX_INPUT_CONTRACT(destinationFormat.GetChroma() == mt::kPixelChroma_444 ||
                       (inDestinationRect.mLeft & 1) == 0);
    uint32_t channels = inChannels;
    // Without alpha in the destination only colour can be copied, and colour
    // is then the whole pixel.
    if (!destinationFormat.HasAlpha())
        channels = (channels & kCopyChannels_Color) != 0 ? kCopyChannels_All : 0;
    if (channels == 0)
        return QRT::kResult_Success;

    StagedImage source;
    QRT::Result status = source.OpenForReading(*inSource);
    if (QRT::Failed(status))
        return status;
    StagedImage destination;
    const bool whole =
        inDestinationRect == inDestination->GetBounds() && channels == kCopyChannels_All;
    status = destination.OpenForWriting(*inDestination, !whole);
    if (QRT::Failed(status))
        return status;

    // Rectangles are in stored pixels; the staged picture of a pixel-pair
    // format is twice as wide.
    auto subView =
        [](const StagedImage& inImage, const MF::IVideoFrame& inFrame, const QRT::ParamRect& inRect)
    {
        const int32_t widthFactor = inImage.GetWidth() / inFrame.GetBounds().Width();
        const int64_t offset = IR_MinimumRowBytes(inImage.GetFormat(), inRect.mLeft * widthFactor);
        return ImageView{static_cast<std::byte*>(inImage.GetWritableBase()) + offset +
                             static_cast<size_t>(inRect.mTop) * inImage.GetRowBytes(),
                         inImage.GetRowBytes(), inImage.GetFormat(), inRect.Width() * widthFactor,
                         inRect.Height()};
    };
    const ImageView from = subView(source, *inSource, inSourceRect);
    const ImageView to = subView(destination, *inDestination, inDestinationRect);
    const int32_t quality = IRQuality(inQuality);
    if (channels == kCopyChannels_All)
    {
        status = Scale(from, to, quality);
    }
    else
    {
        // One of colour and alpha: scale into scratch, then take only the
        // chosen channel bytes (alpha is the fourth channel of every
        // four-channel layout).
        const int64_t rowBytes = IR_MinimumRowBytes(to.mFormat, to.mWidth);
        void* scratch = IR_AllocateTransientMemoryBlock(static_cast<size_t>(rowBytes) * to.mHeight);
        if (scratch == nullptr)
            return kIR_OutOfMemory;
        const ImageView temporary{static_cast<std::byte*>(scratch), static_cast<int32_t>(rowBytes),
                                  to.mFormat, to.mWidth, to.mHeight};
        status = Scale(from, temporary, quality);
        const size_t channelBytes = static_cast<size_t>(rowBytes) / to.mWidth / 4;
        for (int32_t y = 0; y < to.mHeight && QRT::Succeeded(status); ++y)
        {
            const std::byte* in = temporary.mBase + static_cast<size_t>(y) * temporary.mRowBytes;
            std::byte* out = to.mBase + static_cast<size_t>(y) * to.mRowBytes;
            for (int32_t x = 0; x < to.mWidth; ++x, in += 4 * channelBytes, out += 4 * channelBytes)
            {
                if (channels == kCopyChannels_Alpha)
                    std::memcpy(out + 3 * channelBytes, in + 3 * channelBytes, channelBytes);
                else
                    std::memcpy(out, in, 3 * channelBytes);
            }
        }
        IR_FreeTransientMemoryBlock(scratch);
    }
    if (QRT::Failed(status))
        return status;
    destination.Commit();
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::SwapFields(const FrameRef& inSource,
                                               const FrameRef& inDestination)
{
    RequireMatchingPair(inSource, inDestination);
    RowAccess rows;
    if (!RowAccess::Make(*inSource, rows))
        return kResult_UnsupportedPixelFormat;
    for (int32_t y = 0; y < rows.mHeight; ++y)
    {
        int32_t partner = (y & 1) == 0 ? y + 1 : y - 1;
        if (partner >= rows.mHeight)
            partner = std::max(0, y - 1);
        std::memcpy(rows.WritableRow(*inDestination, y), rows.Row(*inSource, partner),
                    rows.mActiveBytes);
    }
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::VerticalConvolve(const FrameRef& inSource,
                                                     const FrameRef& inDestination)
{
    RequireMatchingPair(inSource, inDestination);
    RowAccess rows;
    if (!RowAccess::Make(*inSource, rows))
        return kResult_UnsupportedPixelFormat;
    using RowFilter =
        void (*)(const std::byte*, const std::byte*, const std::byte*, std::byte*, size_t);
    RowFilter filter = nullptr;
    switch (rows.mFormat.GetSampleKind())
    {
    case mt::kPixelSampleKind_8u:
        filter = &ConvolveIntegerRow<uint8_t>;
        break;
    case mt::kPixelSampleKind_16u:
        filter = &ConvolveIntegerRow<uint16_t>;
        break;
    case mt::kPixelSampleKind_16f:
        filter = &ConvolveHalfRow;
        break;
    case mt::kPixelSampleKind_32f:
        filter = &ConvolveFloatRow;
        break;
    default:
        return kResult_UnsupportedPixelFormat;
    }
    const int32_t last = rows.mHeight - 1;
    for (int32_t y = 0; y <= last; ++y)
        filter(rows.Row(*inSource, std::max(0, y - 1)), rows.Row(*inSource, y),
               rows.Row(*inSource, std::min(last, y + 1)), rows.WritableRow(*inDestination, y),
               rows.mActiveBytes);
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::MergePulldownFrames(const FrameRef& inDestination,
                                                        const FrameRef& inPreviousFrame)
{
    RequireMatchingPair(inPreviousFrame, inDestination);
    RowAccess rows;
    if (!RowAccess::Make(*inDestination, rows))
        return kResult_UnsupportedPixelFormat;
    const int32_t parity = rows.mHeight <= kPulldownFirstFieldMaximumRows ? 0 : 1;
    for (int32_t y = parity; y < rows.mHeight; y += 2)
        std::memcpy(rows.WritableRow(*inDestination, y), rows.Row(*inPreviousFrame, y),
                    rows.mActiveBytes);
    return QRT::kResult_Success;
}

QRT::Result VideoFrameManipulators::OpaqueAlpha(const FrameRef& ioFrame)
{
    return ChangeAlpha(ioFrame, AlphaChange::kOpaque);
}

QRT::Result VideoFrameManipulators::InvertAlpha(const FrameRef& ioFrame)
{
    return ChangeAlpha(ioFrame, AlphaChange::kInvert);
}

QRT::Result VideoFrameManipulators::FillWithColor(const FrameRef& ioFrame, uint32_t inColor)
{
    MVX_INPUT_CONTRACT(ioFrame != nullptr);
    MVX_INPUT_CONTRACT(!ioFrame->IsShared());
    const QRT::ParamRect bounds = ioFrame->GetBounds();
    const detail::StagingPlan plan =
        detail::GetStagingPlan(ioFrame->GetPixelFormat(), bounds.Width(), bounds.Height());
    QRT::Result status = QRT::kResult_Success;
    if (plan.mKind == detail::StagingKind::kFieldsApart && ioFrame->GetPlaneCount() == 1)
    {
        // Every row gets the same pixels, so the order in which the fields
        // are stored does not matter: the rows are filled as one raster.
        status = IR_FillWithColor(ioFrame->GetWritableBaseAddress(), ioFrame->GetRowBytes(),
                                  plan.mFormat, plan.mWidth, plan.mHeight, inColor, 0);
    }
    else
    {
        StagedImage image;
        status = image.OpenForWriting(*ioFrame, false);
        if (QRT::Failed(status))
            return status;
        status = IR_FillWithColor(image.GetWritableBase(), image.GetRowBytes(), image.GetFormat(),
                                  image.GetWidth(), image.GetHeight(), inColor, 0);
        if (QRT::Succeeded(status))
            image.Commit();
    }
    if (QRT::Succeeded(status))
        ioFrame->AlphaChanged();
    return status;
}

FrameRef VideoFrameManipulators::MakeAddressableVideoFrame(const FrameRef& inFrame,
                                                           mt::PixelFormat inFormat,
                                                           mt::RenderQuality inQuality)
{
    MVX_INPUT_CONTRACT(inFrame != nullptr);
    const mt::PixelFormat target = inFormat.IsValid() ? inFormat : inFrame->GetPixelFormat();
    if (target == inFrame->GetPixelFormat() &&
        QRT::QueryRef<MF::IVideoFrameBaseAddress>(inFrame) != nullptr)
        return inFrame;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    FrameRef copy = CreateVideoFrame(target, static_cast<uint32_t>(bounds.Width()),
                                     static_cast<uint32_t>(bounds.Height()),
                                     inFrame->GetPixelAspectRatio(), false, false);
    if (copy == nullptr)
        return {};
    copy->SetFieldType(inFrame->GetFieldType());
    copy->SetFullFrameRect(inFrame->GetFullFrameRect());
    if (QRT::Failed(CopyFrame(inFrame, copy, inQuality)))
        return {};
    return copy;
}

} // namespace VF
