// Colour effects: ProcAmp, Alpha Adjust and Video Limiter. Components are
// gamma-encoded, straight alpha; 8-bit pixels go through 256-entry tables
// where each component maps on its own.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"

#include <array>
#include <cmath>
#include <numbers>

namespace FX::detail
{
namespace
{

using Table = std::array<std::uint8_t, 256>;

template <class Function>
Table MakeTable(Function&& inFunction)
{
    Table table{};
    for (std::size_t i = 0; i < 256; ++i)
        table[i] = ToByte(inFunction(kUnit8[i]));
    return table;
}

// The colour components of 8-bit pixels through inTable, alpha unchanged.
void MapColor8(const Pixels& inPixels, const Table& inTable)
{
    for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
    {
        std::uint8_t* row = inPixels.Row<std::uint8_t>(y);
        for (std::int32_t x = 0; x < inPixels.mWidth; ++x, row += 4)
        {
            row[0] = inTable[row[0]];
            row[1] = inTable[row[1]];
            row[2] = inTable[row[2]];
        }
    }
}

// ProcAmp: brightness (per cent of full scale added), contrast (per cent,
// around mid grey), then hue (degrees) and saturation (per cent) as a turn
// and a scale of the BT.709 colour-difference plane, which keeps luma.
//   v' = (v - 0.5) * contrast / 100 + 0.5 + brightness / 100
constexpr ParamSpec kProcAmpParams[] = {
    {"brightness", ParamType::kNumber, 0.0, -100.0, 100.0},
    {"contrast", ParamType::kNumber, 100.0, 0.0, 200.0},
    {"hue", ParamType::kNumber, 0.0, -180.0, 180.0},
    {"saturation", ParamType::kNumber, 100.0, 0.0, 200.0},
};

class ProcAmpEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const float brightness = static_cast<float>(Value(0, inContext) / 100.0);
        const float contrast = static_cast<float>(Value(1, inContext) / 100.0);
        const double hue = Value(2, inContext) * std::numbers::pi / 180.0;
        const double saturation = Value(3, inContext) / 100.0;
        auto level = [=](float inV) { return (inV - 0.5f) * contrast + 0.5f + brightness; };
        const bool colorTurn = hue != 0.0 || saturation != 1.0;
        if (!inPixels.mFloat && !colorTurn)
        {
            MapColor8(inPixels, MakeTable(level));
            return QRT::kResult_Success;
        }
        const std::array<float, 9> m = ColorMatrix(hue, saturation);
        ForEachPixel(inPixels,
                     [&](float& b, float& g, float& r, float& /*a*/)
                     {
                         const float r0 = level(r), g0 = level(g), b0 = level(b);
                         r = m[0] * r0 + m[1] * g0 + m[2] * b0;
                         g = m[3] * r0 + m[4] * g0 + m[5] * b0;
                         b = m[6] * r0 + m[7] * g0 + m[8] * b0;
                     });
        return QRT::kResult_Success;
    }

private:
    // Row-major RGB matrix: to Y, Cb, Cr (BT.709), turn and scale Cb and Cr, back.
    static std::array<float, 9> ColorMatrix(double inHue, double inSaturation)
    {
        constexpr double kR = 0.2126, kG = 0.7152, kB = 0.0722;
        const double c = std::cos(inHue) * inSaturation, s = std::sin(inHue) * inSaturation;
        std::array<float, 9> m{};
        for (int column = 0; column < 3; ++column)
        {
            const double rgb[3] = {column == 0 ? 1.0 : 0.0, column == 1 ? 1.0 : 0.0,
                                   column == 2 ? 1.0 : 0.0};
            const double y = kR * rgb[0] + kG * rgb[1] + kB * rgb[2];
            const double cb = (rgb[2] - y) / 1.8556, cr = (rgb[0] - y) / 1.5748;
            const double cb2 = c * cb - s * cr, cr2 = s * cb + c * cr;
            const double r = y + 1.5748 * cr2, b = y + 1.8556 * cb2;
            const double g = (y - kR * r - kB * b) / kG;
            m[static_cast<std::size_t>(column)] = static_cast<float>(r);
            m[static_cast<std::size_t>(3 + column)] = static_cast<float>(g);
            m[static_cast<std::size_t>(6 + column)] = static_cast<float>(b);
        }
        return m;
    }
};

// Alpha Adjust: the alpha scaled by opacity (per cent), after it is
// ignored (taken as opaque) or inverted; "mask" shows the result as grey
// over an opaque picture.
constexpr ParamSpec kAlphaAdjustParams[] = {
    {"opacity", ParamType::kNumber, 100.0, 0.0, 100.0},
    {"ignore", ParamType::kBool, 0.0},
    {"invert", ParamType::kBool, 0.0},
    {"mask", ParamType::kBool, 0.0},
};

class AlphaAdjustEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const float opacity = static_cast<float>(Value(0, inContext) / 100.0);
        const bool ignore = Value(1, inContext) != 0.0;
        const bool invert = Value(2, inContext) != 0.0;
        const bool mask = Value(3, inContext) != 0.0;
        ForEachPixel(inPixels,
                     [&](float& b, float& g, float& r, float& a)
                     {
                         float alpha = ignore ? 1.0f : a;
                         alpha = (invert ? 1.0f - alpha : alpha) * opacity;
                         if (mask)
                         {
                             b = g = r = alpha;
                             alpha = 1.0f;
                         }
                         a = alpha;
                     });
        return QRT::kResult_Success;
    }
};

// Video Limiter: every colour component held within [minimum, maximum]
// (per cent of full scale).
constexpr ParamSpec kVideoLimiterParams[] = {
    {"minimum", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"maximum", ParamType::kNumber, 100.0, 0.0, 100.0},
};

class VideoLimiterEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const float low = static_cast<float>(Value(0, inContext) / 100.0);
        const float high = std::max(low, static_cast<float>(Value(1, inContext) / 100.0));
        auto limit = [=](float inV) { return inV < low ? low : (inV > high ? high : inV); };
        if (!inPixels.mFloat)
        {
            MapColor8(inPixels, MakeTable(limit));
            return QRT::kResult_Success;
        }
        ForEachPixel(inPixels,
                     [&](float& b, float& g, float& r, float& /*a*/)
                     {
                         b = limit(b);
                         g = limit(g);
                         r = limit(r);
                     });
        return QRT::kResult_Success;
    }
};

} // namespace

void AddColorEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_ProcAmp, kProcAmpParams, &Make<ProcAmpEffect>});
    ioEntries.push_back({kMatch_AlphaAdjust, kAlphaAdjustParams, &Make<AlphaAdjustEffect>});
    ioEntries.push_back({kMatch_VideoLimiter, kVideoLimiterParams, &Make<VideoLimiterEffect>});
}

} // namespace FX::detail
