// Generated test pictures (BE/PatternSettings.h).
//
// Moving pattern geometry for a picture of W x H:
//   background  grey 48, 48, 48
//   box         grey 224, 224, 224; a square of S = max(1, min(W, H) / 4)
//               whose bottom edge is the picture's bottom row; its left edge
//               at phase p is (p * max(1, W / 32)) mod (W - S + 1)
//   digits      yellow 255, 255, 0; the frame number (a minus sign first
//               for negative frames) in a 3 x 5 cell font scaled by
//               k = max(1, H / 16), starting at (k, k), 4k per character
// Phases: a progressive frame n is drawn at phase 2n. An interlaced frame n
// draws its earlier field at phase 2n and its later field at 2n + 1 (upper
// first: rows 0, 2, 4 ... earlier; lower first: rows 1, 3, 5 ... earlier), so
// the box sits at two places, one per field, as a camera would have seen it.
// Alpha variants give every pixel the pattern's opacity; premultiplied variants
// store round((a * c + (255 - a) * matte) / 255) per colour channel.

#include "BE/MediaStatus.h"
#include "BE/VideoSources.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "VideoSourceBase.h"
#include "mvxcore/utility/Strings.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <string>

namespace BE
{

using detail::FrameRef;
using mvxmediatypes::PixelFormat;

namespace
{

struct Rgb
{
    std::uint8_t mRed;
    std::uint8_t mGreen;
    std::uint8_t mBlue;
};

constexpr Rgb FromRgb24(std::uint32_t inColor)
{
    return Rgb{static_cast<std::uint8_t>(inColor >> 16), static_cast<std::uint8_t>(inColor >> 8),
               static_cast<std::uint8_t>(inColor)};
}

constexpr std::array<Rgb, 7> kBars = {{
    {191, 191, 191},
    {191, 191, 0},
    {0, 191, 191},
    {0, 191, 0},
    {191, 0, 191},
    {191, 0, 0},
    {0, 0, 191},
}};
constexpr Rgb kBackground{48, 48, 48};
constexpr Rgb kBox{224, 224, 224};
constexpr Rgb kDigit{255, 255, 0};

// 3 x 5 glyphs, one row per entry, bit 2 the left column. Index 10 is '-'.
constexpr std::array<std::array<std::uint8_t, 5>, 11> kGlyphs = {{
    {7, 5, 5, 5, 7}, // 0
    {2, 6, 2, 2, 7}, // 1
    {7, 1, 7, 4, 7}, // 2
    {7, 1, 7, 1, 7}, // 3
    {5, 5, 7, 1, 1}, // 4
    {7, 4, 7, 1, 7}, // 5
    {7, 4, 7, 5, 7}, // 6
    {7, 1, 1, 1, 1}, // 7
    {7, 5, 7, 5, 7}, // 8
    {7, 5, 7, 1, 7}, // 9
    {0, 0, 7, 0, 0}, // -
}};
constexpr std::size_t kMinusGlyph = 10;

inline void PutPixel(std::uint8_t* ioRow, std::uint32_t inX, const Rgb& inColor)
{
    std::uint8_t* pixel = ioRow + std::size_t{inX} * 4;
    pixel[0] = inColor.mBlue;
    pixel[1] = inColor.mGreen;
    pixel[2] = inColor.mRed;
    pixel[3] = 255;
}

void FillSpan(std::uint8_t* ioRow, std::uint32_t inFrom, std::uint32_t inTo, const Rgb& inColor)
{
    for (std::uint32_t x = inFrom; x < inTo; ++x)
        PutPixel(ioRow, x, inColor);
}

std::uint8_t Lerp(std::uint8_t inFrom, std::uint8_t inTo, std::uint32_t inX, std::uint32_t inLast)
{
    if (inLast == 0)
        return inFrom;
    const std::int64_t delta = std::int64_t{inTo} - inFrom;
    // Rounded to nearest, halves away from zero, symmetric for falling ramps.
    const std::int64_t scaled = delta * inX * 2 + (delta >= 0 ? inLast : -std::int64_t{inLast});
    return static_cast<std::uint8_t>(inFrom + scaled / (2 * std::int64_t{inLast}));
}

class PatternSource : public detail::VideoSourceBase
{
public:
    explicit PatternSource(const PatternSettings& inSettings)
        : VideoSourceBase(Describe(inSettings))
        , mSettings(inSettings)
    {
    }

protected:
    QRT::Result ProduceFrame(std::int64_t inIndex, PixelFormat inFormat,
                             FrameRef& outFrame) override
    {
        FrameRef frame;
        const QRT::Result created =
            VF::CreateVideoFrame(inFormat, mSettings.mWidth, mSettings.mHeight,
                                 mSettings.mPixelAspectRatio, false, false, frame);
        if (QRT::Failed(created))
            return created;
        auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
        const std::int32_t rowBytes = frame->GetRowBytes();
        for (std::uint32_t y = 0; y < mSettings.mHeight; ++y)
        {
            std::uint8_t* row = base + std::size_t{y} * rowBytes;
            DrawRow(row, y, inIndex);
            ApplyAlpha(row);
        }
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    QRT::InterfaceRef<Deprecated::IMediaInfo> Reopen() const override
    {
        return CreatePatternSource(mSettings);
    }

private:
    static detail::SourceDescription Describe(const PatternSettings& inSettings)
    {
        detail::SourceDescription description;
        description.mMediaPath = inSettings.ToText();
        description.mIdentity = description.mMediaPath;
        description.mName = mvxcore::utility::UTF8to16(description.mMediaPath);
        description.mWidth = inSettings.mWidth;
        description.mHeight = inSettings.mHeight;
        description.mFrameRate = inSettings.mFrameRate;
        description.mFieldType = inSettings.mFieldType;
        description.mPixelAspectRatio = inSettings.mPixelAspectRatio;
        description.mAlpha = inSettings.mAlpha;
        if (inSettings.mAlpha == mvxmediatypes::kAlphaChannel_Premultiplied)
        {
            const Rgb matte = FromRgb24(inSettings.mMatte);
            // Alpha byte 0, so that a black matte reads as the colour 0.
            description.mMatte =
                QRT::ParamColor::FromRGBA(matte.mRed, matte.mGreen, matte.mBlue, 0);
        }
        description.mStill = inSettings.IsTimeInvariant();
        description.mImage = false;
        // Drawing a pattern is cheaper than scheduling a read ahead.
        description.mPrefetchWanted = false;
        description.mKind = inSettings.IsTimeInvariant() ? Deprecated::kMediaInfoKind_TimeInvariant
                                                         : Deprecated::kMediaInfoKind_Clip;
        description.mFrameCount = -1;
        description.mPixelFormats = {mvxmediatypes::kPixelFormat_BGRA_4444_8u};
        description.mColorProfile.mName = "sRGB";
        return description;
    }

    void DrawRow(std::uint8_t* ioRow, std::uint32_t inY, std::int64_t inIndex) const
    {
        const std::uint32_t width = mSettings.mWidth;
        switch (mSettings.mKind)
        {
        case PatternKind::kBars:
            for (std::uint32_t bar = 0; bar < kBars.size(); ++bar)
            {
                const auto from = static_cast<std::uint32_t>(std::uint64_t{bar} * width / 7);
                const auto to = static_cast<std::uint32_t>(std::uint64_t{bar + 1} * width / 7);
                FillSpan(ioRow, from, to, kBars[bar]);
            }
            break;
        case PatternKind::kSolid:
            FillSpan(ioRow, 0, width, FromRgb24(mSettings.mColor));
            break;
        case PatternKind::kGradient:
        {
            const Rgb from = FromRgb24(mSettings.mFrom);
            const Rgb to = FromRgb24(mSettings.mTo);
            for (std::uint32_t x = 0; x < width; ++x)
                PutPixel(ioRow, x,
                         Rgb{Lerp(from.mRed, to.mRed, x, width - 1),
                             Lerp(from.mGreen, to.mGreen, x, width - 1),
                             Lerp(from.mBlue, to.mBlue, x, width - 1)});
            break;
        }
        case PatternKind::kMoving:
            DrawMovingRow(ioRow, inY, inIndex);
            break;
        }
    }

    void DrawMovingRow(std::uint8_t* ioRow, std::uint32_t inY, std::int64_t inIndex) const
    {
        const std::uint32_t width = mSettings.mWidth;
        const std::uint32_t height = mSettings.mHeight;
        // The row's field decides its moment: the earlier field at phase 2n,
        // the later one at 2n + 1.
        std::int64_t phase = inIndex * 2;
        const bool oddRow = (inY & 1) != 0;
        if ((mSettings.mFieldType == mvxmediatypes::kFieldType_UpperFirst && oddRow) ||
            (mSettings.mFieldType == mvxmediatypes::kFieldType_LowerFirst && !oddRow))
            phase += 1;

        FillSpan(ioRow, 0, width, kBackground);

        const std::uint32_t boxSize = std::max<std::uint32_t>(1, std::min(width, height) / 4);
        if (inY >= height - boxSize)
        {
            const std::int64_t step = std::max<std::uint32_t>(1, width / 32);
            const std::int64_t range = std::int64_t{width} - boxSize + 1;
            std::int64_t left = (phase * step) % range;
            if (left < 0)
                left += range;
            FillSpan(ioRow, static_cast<std::uint32_t>(left),
                     static_cast<std::uint32_t>(left) + boxSize, kBox);
        }

        const std::uint32_t cell = std::max<std::uint32_t>(1, height / 16);
        if (inY < cell || inY >= cell * 6)
            return;
        const std::uint32_t glyphRow = (inY - cell) / cell;
        // The digits of the frame number, most significant first.
        std::array<std::size_t, 24> glyphs{};
        std::size_t count = 0;
        std::uint64_t magnitude = inIndex < 0 ? 0 - static_cast<std::uint64_t>(inIndex)
                                              : static_cast<std::uint64_t>(inIndex);
        do
        {
            glyphs[count++] = static_cast<std::size_t>(magnitude % 10);
            magnitude /= 10;
        } while (magnitude != 0);
        if (inIndex < 0)
            glyphs[count++] = kMinusGlyph;
        std::reverse(glyphs.begin(), glyphs.begin() + static_cast<std::ptrdiff_t>(count));

        for (std::size_t character = 0; character < count; ++character)
        {
            const std::uint8_t bits = kGlyphs[glyphs[character]][glyphRow];
            const std::uint64_t left = cell + std::uint64_t{character} * cell * 4;
            for (std::uint32_t column = 0; column < 3; ++column)
            {
                if ((bits & (4u >> column)) == 0)
                    continue;
                const std::uint64_t from = left + std::uint64_t{column} * cell;
                if (from >= width)
                    break;
                const std::uint64_t to = std::min<std::uint64_t>(from + cell, width);
                FillSpan(ioRow, static_cast<std::uint32_t>(from), static_cast<std::uint32_t>(to),
                         kDigit);
            }
        }
    }

    void ApplyAlpha(std::uint8_t* ioRow) const
    {
        if (mSettings.mAlpha == mvxmediatypes::kAlphaChannel_None)
            return;
        const std::uint32_t alpha = mSettings.mOpacity;
        const Rgb matte = FromRgb24(mSettings.mMatte);
        const std::uint32_t matteBgr[3] = {matte.mBlue, matte.mGreen, matte.mRed};
        const bool premultiply = mSettings.mAlpha == mvxmediatypes::kAlphaChannel_Premultiplied;
        for (std::uint32_t x = 0; x < mSettings.mWidth; ++x)
        {
            std::uint8_t* pixel = ioRow + std::size_t{x} * 4;
            if (premultiply)
                for (int channel = 0; channel < 3; ++channel)
                    pixel[channel] = static_cast<std::uint8_t>(
                        (alpha * pixel[channel] + (255 - alpha) * matteBgr[channel] + 127) / 255);
            pixel[3] = static_cast<std::uint8_t>(alpha);
        }
    }

    const PatternSettings mSettings;
};

} // namespace

VideoSourceRef CreatePatternSource(const PatternSettings& inSettings)
{
    MVX_INPUT_CONTRACT(inSettings.mWidth > 0 && inSettings.mWidth <= VF::kMaxFrameDimension);
    MVX_INPUT_CONTRACT(inSettings.mHeight > 0 && inSettings.mHeight <= VF::kMaxFrameDimension);
    MVX_INPUT_CONTRACT(!inSettings.mFrameRate.IsZero());
    MVX_INPUT_CONTRACT(inSettings.mPixelAspectRatio.IsValid());
    return QRT::Allocated<PatternSource>::Create<Deprecated::IVideoSource>(inSettings);
}

} // namespace BE
