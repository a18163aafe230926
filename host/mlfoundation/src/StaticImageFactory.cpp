#include "ML/StaticImageFactory.h"

#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string_view>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;

// 0xAARRGGBB.
constexpr uint32_t kBars[7] = {0xFFBFBFBF, 0xFFBFBF00, 0xFF00BFBF, 0xFF00BF00,
                               0xFFBF00BF, 0xFFBF0000, 0xFF0000BF};
constexpr uint32_t kBlack = 0xFF000000;
constexpr uint32_t kWhite = 0xFFFFFFFF;
constexpr uint32_t kMidGrey = 0xFF808080;
constexpr uint32_t kOfflineBackground = 0xFF6E1010;
constexpr uint32_t kPendingBackground = 0xFF102A6E;

// A glyph of the built-in font: seven rows of five columns, bit 4 leftmost.
struct Glyph
{
    char mCharacter;
    std::array<uint8_t, 7> mRows;
};

constexpr Glyph kFont[] = {
    {'A', {0x0E, 0x11, 0x11, 0x1F, 0x11, 0x11, 0x11}},
    {'D', {0x1E, 0x11, 0x11, 0x11, 0x11, 0x11, 0x1E}},
    {'E', {0x1F, 0x10, 0x10, 0x1E, 0x10, 0x10, 0x1F}},
    {'F', {0x1F, 0x10, 0x10, 0x1E, 0x10, 0x10, 0x10}},
    {'G', {0x0E, 0x11, 0x10, 0x17, 0x11, 0x11, 0x0F}},
    {'I', {0x0E, 0x04, 0x04, 0x04, 0x04, 0x04, 0x0E}},
    {'L', {0x10, 0x10, 0x10, 0x10, 0x10, 0x10, 0x1F}},
    {'M', {0x11, 0x1B, 0x15, 0x15, 0x11, 0x11, 0x11}},
    {'N', {0x11, 0x19, 0x15, 0x13, 0x11, 0x11, 0x11}},
    {'O', {0x0E, 0x11, 0x11, 0x11, 0x11, 0x11, 0x0E}},
    {'P', {0x1E, 0x11, 0x11, 0x1E, 0x10, 0x10, 0x10}},
};
constexpr int32_t kGlyphColumns = 5;
constexpr int32_t kGlyphRows = 7;
// A character cell is the glyph and one column of space.
constexpr int32_t kCellColumns = kGlyphColumns + 1;

const Glyph* FindGlyph(char inCharacter)
{
    for (const Glyph& glyph : kFont)
        if (glyph.mCharacter == inCharacter)
            return &glyph;
    return nullptr; // a space
}

// Writes one 8-bit BGRA pixel.
void Put(uint8_t* inPixel, uint32_t inColor)
{
    inPixel[0] = static_cast<uint8_t>(inColor);
    inPixel[1] = static_cast<uint8_t>(inColor >> 8);
    inPixel[2] = static_cast<uint8_t>(inColor >> 16);
    inPixel[3] = static_cast<uint8_t>(inColor >> 24);
}

class Canvas
{
public:
    explicit Canvas(MF::IVideoFrame& inFrame)
        : mBase(static_cast<uint8_t*>(inFrame.GetWritableBaseAddress()))
        , mRowBytes(static_cast<size_t>(inFrame.GetRowBytes()))
        , mWidth(inFrame.GetBounds().Width())
        , mHeight(inFrame.GetBounds().Height())
    {
    }

    void Fill(int32_t inLeft, int32_t inTop, int32_t inRight, int32_t inBottom, uint32_t inColor)
    {
        inLeft = std::max(0, inLeft);
        inTop = std::max(0, inTop);
        inRight = std::min(mWidth, inRight);
        inBottom = std::min(mHeight, inBottom);
        for (int32_t y = inTop; y < inBottom; ++y)
            for (int32_t x = inLeft; x < inRight; ++x)
                Put(mBase + y * mRowBytes + 4 * static_cast<size_t>(x), inColor);
    }

    // The text centred, as large as fits in four fifths of the width and a
    // third of the height; nothing when even the smallest size does not fit.
    void DrawText(std::string_view inText, uint32_t inColor)
    {
        const auto textColumns = static_cast<int32_t>(inText.size()) * kCellColumns - 1;
        const int32_t scale = std::min(mWidth * 4 / 5 / textColumns, mHeight / 3 / kGlyphRows);
        if (scale < 1)
            return;
        const int32_t left = (mWidth - textColumns * scale) / 2;
        const int32_t top = (mHeight - kGlyphRows * scale) / 2;
        for (size_t i = 0; i < inText.size(); ++i)
        {
            const Glyph* glyph = FindGlyph(inText[i]);
            if (glyph == nullptr)
                continue;
            const int32_t cellLeft = left + static_cast<int32_t>(i) * kCellColumns * scale;
            for (int32_t row = 0; row < kGlyphRows; ++row)
                for (int32_t column = 0; column < kGlyphColumns; ++column)
                    if (glyph->mRows[row] & (0x10 >> column))
                        Fill(cellLeft + column * scale, top + row * scale,
                             cellLeft + (column + 1) * scale, top + (row + 1) * scale, inColor);
        }
    }

    int32_t Width() const { return mWidth; }
    int32_t Height() const { return mHeight; }

private:
    uint8_t* mBase;
    size_t mRowBytes;
    int32_t mWidth;
    int32_t mHeight;
};

void Draw(int32_t inImageNumber, Canvas& ioCanvas)
{
    const int32_t width = ioCanvas.Width();
    const int32_t height = ioCanvas.Height();
    switch (inImageNumber)
    {
    case kStaticImage_MediaOffline:
        ioCanvas.Fill(0, 0, width, height, kOfflineBackground);
        ioCanvas.DrawText("MEDIA OFFLINE", kWhite);
        break;
    case kStaticImage_MediaPending:
        ioCanvas.Fill(0, 0, width, height, kPendingBackground);
        ioCanvas.DrawText("MEDIA PENDING", kWhite);
        break;
    case kStaticImage_ColorBars:
        for (int32_t bar = 0; bar < 7; ++bar)
            ioCanvas.Fill(bar * width / 7, 0, (bar + 1) * width / 7, height, kBars[bar]);
        break;
    case kStaticImage_Black:
        ioCanvas.Fill(0, 0, width, height, kBlack);
        break;
    case kStaticImage_White:
        ioCanvas.Fill(0, 0, width, height, kWhite);
        break;
    default:
        ioCanvas.Fill(0, 0, width, height, kMidGrey);
        break;
    }
}

} // namespace

QRT::InterfaceRef<MF::IVideoFrame> StaticImageFactory::LoadImageW(int32_t inImageNumber,
                                                                  int32_t inWidth, int32_t inHeight,
                                                                  mt::PixelFormat inFormat,
                                                                  mt::PixelAspectRatio inRatio,
                                                                  mt::RenderQuality inQuality)
{
    if (inImageNumber < kStaticImage_MediaOffline || inImageNumber > kStaticImage_MidGrey)
        return {};
    if (inWidth < 1 || inHeight < 1 || inWidth > static_cast<int32_t>(VF::kMaxFrameDimension) ||
        inHeight > static_cast<int32_t>(VF::kMaxFrameDimension))
        return {};
    const auto width = static_cast<uint32_t>(inWidth);
    const auto height = static_cast<uint32_t>(inHeight);
    // Every picture is drawn in 8-bit BGRA and converted once at the end.
    QRT::InterfaceRef<MF::IVideoFrame> drawn =
        VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, width, height, inRatio, false, false);
    if (!drawn)
        return {};
    Canvas canvas(*drawn);
    Draw(inImageNumber, canvas);
    if (inFormat == mt::kPixelFormat_BGRA_4444_8u)
        return drawn;
    QRT::InterfaceRef<MF::IVideoFrame> converted =
        VF::CreateVideoFrame(inFormat, width, height, inRatio, false, false);
    if (!converted ||
        QRT::Failed(VF::VideoFrameManipulators::CopyFrame(drawn, converted, inQuality)))
        return {};
    return converted;
}

} // namespace ML
