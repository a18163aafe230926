// Effects that draw over the picture: Timecode (the frame's time in hours,
// minutes, seconds and frames, drawn with a digit font of our own) and
// Multicam Hilite (a border that marks the selected camera).

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>

namespace FX::detail
{
namespace
{

// Draws inColor (0xAARRGGBB, its alpha ignored) at inOpacity over the pixels
// of [inX0, inX1) x [inY0, inY1), clipped to the picture.
void BlendRect(const Pixels& inPixels, int inX0, int inY0, int inX1, int inY1,
               std::uint32_t inColor, float inOpacity)
{
    const int x0 = std::max(inX0, 0), x1 = std::min(inX1, inPixels.mWidth);
    const int y0 = std::max(inY0, 0), y1 = std::min(inY1, inPixels.mHeight);
    const float color[3] = {kUnit8[inColor & 0xFFu], kUnit8[(inColor >> 8) & 0xFFu],
                            kUnit8[(inColor >> 16) & 0xFFu]};
    auto blend = [&](float& ioB, float& ioG, float& ioR, float& ioA)
    {
        // Straight colour over straight colour.
        const float alpha = inOpacity + ioA * (1.0f - inOpacity);
        const float keep = alpha > 0.0f ? ioA * (1.0f - inOpacity) / alpha : 0.0f;
        const float add = alpha > 0.0f ? inOpacity / alpha : 0.0f;
        ioB = ioB * keep + color[0] * add;
        ioG = ioG * keep + color[1] * add;
        ioR = ioR * keep + color[2] * add;
        ioA = alpha;
    };
    for (int y = y0; y < y1; ++y)
        for (int x = x0; x < x1; ++x)
        {
            if (inPixels.mFloat)
            {
                float* p = inPixels.Row<float>(y) + x * 4;
                blend(p[0], p[1], p[2], p[3]);
                continue;
            }
            std::uint8_t* p = inPixels.Row<std::uint8_t>(y) + x * 4;
            float b = kUnit8[p[0]], g = kUnit8[p[1]], r = kUnit8[p[2]], a = kUnit8[p[3]];
            blend(b, g, r, a);
            p[0] = ToByte(b), p[1] = ToByte(g), p[2] = ToByte(r), p[3] = ToByte(a);
        }
}

// The digits 0 to 9 and the colon, 5 columns by 7 rows, one row per byte,
// the leftmost column in bit 4.
constexpr std::uint8_t kGlyphs[11][7] = {
    {0x0E, 0x11, 0x13, 0x15, 0x19, 0x11, 0x0E}, {0x04, 0x0C, 0x04, 0x04, 0x04, 0x04, 0x0E},
    {0x0E, 0x11, 0x01, 0x02, 0x04, 0x08, 0x1F}, {0x1F, 0x02, 0x04, 0x02, 0x01, 0x11, 0x0E},
    {0x02, 0x06, 0x0A, 0x12, 0x1F, 0x02, 0x02}, {0x1F, 0x10, 0x1E, 0x01, 0x01, 0x11, 0x0E},
    {0x06, 0x08, 0x10, 0x1E, 0x11, 0x11, 0x0E}, {0x1F, 0x01, 0x02, 0x04, 0x08, 0x08, 0x08},
    {0x0E, 0x11, 0x11, 0x0E, 0x11, 0x11, 0x0E}, {0x0E, 0x11, 0x11, 0x0F, 0x01, 0x02, 0x0C},
    {0x00, 0x0C, 0x0C, 0x00, 0x0C, 0x0C, 0x00},
};

// Timecode: "HH:MM:SS:FF" of the frame (counted from the item's start at the
// effect's rate, plus the offset in frames; frames counted at the rate rounded
// to whole frames per second), centred on (x, y) per cent of the frame, its
// digits size per cent of the frame's height tall, in the colour over a box of
// black at the background opacity.
constexpr ParamSpec kTimecodeParams[] = {
    {"x", ParamType::kNumber, 50.0, 0.0, 100.0},
    {"y", ParamType::kNumber, 85.0, 0.0, 100.0},
    {"size", ParamType::kNumber, 10.0, 1.0, 100.0},
    {"offset", ParamType::kNumber, 0.0, -1.0e9, 1.0e9},
    {"color", ParamType::kColor, 0xFFFFFFFFu},
    {"background", ParamType::kNumber, 60.0, 0.0, 100.0},
};

class TimecodeEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;
    bool IsTimeVariant() const override { return true; }

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const std::int64_t rate =
            std::max<std::int64_t>(1, std::llround(inContext.mFrameRate.GetValue()));
        const std::int64_t frame =
            std::max<std::int64_t>(0, inContext.mFrame + std::llround(Value(3, inContext)));
        char text[48];
        std::snprintf(text, sizeof text, "%02lld:%02lld:%02lld:%02lld",
                      static_cast<long long>(frame / (rate * 3600) % 100),
                      static_cast<long long>(frame / (rate * 60) % 60),
                      static_cast<long long>(frame / rate % 60),
                      static_cast<long long>(frame % rate));
        const int length = static_cast<int>(std::strlen(text));
        // A glyph cell is 6 by 9 font pixels: the glyph, a column and two rows of space.
        const double unit = std::max(1.0, Value(2, inContext) / 100.0 * inPixels.mHeight / 9.0);
        const int cellW = static_cast<int>(std::lround(unit * 6)),
                  cellH = static_cast<int>(std::lround(unit * 9));
        const int left =
            static_cast<int>(std::lround(Value(0, inContext) / 100.0 * inPixels.mWidth)) -
            cellW * length / 2;
        const int top =
            static_cast<int>(std::lround(Value(1, inContext) / 100.0 * inPixels.mHeight)) -
            cellH / 2;
        BlendRect(inPixels, left, top, left + cellW * length + static_cast<int>(unit), top + cellH,
                  0xFF000000u, static_cast<float>(Value(5, inContext) / 100.0));
        const auto color = static_cast<std::uint32_t>(Value(4, inContext));
        for (int i = 0; i < length; ++i)
        {
            const std::uint8_t* glyph = kGlyphs[text[i] == ':' ? 10 : text[i] - '0'];
            for (int row = 0; row < 7; ++row)
                for (int column = 0; column < 5; ++column)
                    if (glyph[row] & (0x10 >> column))
                    {
                        const auto x =
                            static_cast<int>(std::lround(left + i * cellW + (column + 1) * unit));
                        const auto y = static_cast<int>(std::lround(top + (row + 1) * unit));
                        BlendRect(inPixels, x, y, x + static_cast<int>(std::lround(unit)),
                                  y + static_cast<int>(std::lround(unit)), color, 1.0f);
                    }
        }
        return QRT::kResult_Success;
    }
};

// Multicam Hilite: an opaque border of the colour, width pixels wide (full
// frame pixels), inside the frame's edges.
constexpr ParamSpec kHiliteParams[] = {
    {"color", ParamType::kColor, 0xFFFF0000u},
    {"width", ParamType::kNumber, 8.0, 0.0, 1000.0},
};

class MulticamHiliteEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const auto color = static_cast<std::uint32_t>(Value(0, inContext));
        const int width = static_cast<int>(std::lround(Value(1, inContext) * inContext.mScale));
        const int w = inPixels.mWidth, h = inPixels.mHeight;
        BlendRect(inPixels, 0, 0, w, width, color, 1.0f);
        BlendRect(inPixels, 0, h - width, w, h, color, 1.0f);
        BlendRect(inPixels, 0, width, width, h - width, color, 1.0f);
        BlendRect(inPixels, w - width, width, w, h - width, color, 1.0f);
        return QRT::kResult_Success;
    }
};

} // namespace

void AddOverlayEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_Timecode, kTimecodeParams, &Make<TimecodeEffect>});
    ioEntries.push_back({kMatch_MulticamHilite, kHiliteParams, &Make<MulticamHiliteEffect>});
}

} // namespace FX::detail
