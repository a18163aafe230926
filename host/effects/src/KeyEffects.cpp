// Keys: effects that make parts of the picture transparent by how far each
// pixel is from what is keyed out. Each computes a distance d per pixel (0
// for a pixel that is exactly the key) and multiplies the alpha by
//   0 when d <= threshold; min(1, (d - threshold) / softness) above it
//   (1 with no softness)
// with threshold and softness as fractions of full scale. Colours are
// gamma-encoded, distances measured on them directly.

#include "EffectBase.h"
#include "FX/EffectCatalogue.h"
#include "IR/ImageRenderer.h"

#include <algorithm>
#include <cmath>

namespace FX::detail
{
namespace
{

// Without branches: no softness is a slope so steep that any distance above
// the threshold reaches 1.
class Ramp
{
public:
    Ramp(float inThreshold, float inSoftness)
        : mThreshold(inThreshold)
        , mSlope(inSoftness > 0.0f ? 1.0f / inSoftness : 1.0e30f)
    {
    }

    float operator()(float inDistance) const
    {
        return std::min(1.0f, std::max(0.0f, (inDistance - mThreshold) * mSlope));
    }

private:
    float mThreshold;
    float mSlope;
};

struct Rgb
{
    float mR;
    float mG;
    float mB;
};

Rgb RgbOf(double inColor)
{
    const auto color = static_cast<std::uint32_t>(inColor);
    return {kUnit8[(color >> 16) & 0xFFu], kUnit8[(color >> 8) & 0xFFu], kUnit8[color & 0xFFu]};
}

// A key of two per-cent parameters at kThreshold and kThreshold + 1 and a
// distance function Distance(b, g, r) of the effect's own values.
template <class Derived, std::uint32_t kThreshold>
class KeyEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const Ramp ramp{static_cast<float>(Value(kThreshold, inContext) / 100.0),
                        static_cast<float>(Value(kThreshold + 1, inContext) / 100.0)};
        const auto distance = static_cast<const Derived&>(*this).MakeDistance(inContext);
        ScaleAlpha(inPixels, [&](float b, float g, float r) { return ramp(distance(b, g, r)); });
        return QRT::kResult_Success;
    }
};

constexpr ParamSpec kLumaParams[] = {
    {"threshold", ParamType::kNumber, 10.0, 0.0, 100.0},
    {"softness", ParamType::kNumber, 0.0, 0.0, 100.0},
};

// Luma key: d is the BT.709 luma; dark areas are keyed out.
class LumaKeyEffect : public KeyEffect<LumaKeyEffect, 0>
{
public:
    using KeyEffect::KeyEffect;
    auto MakeDistance(const RenderContext&) const
    {
        return [](float b, float g, float r) { return Luma(r, g, b); };
    }
};

constexpr ParamSpec kColorKeyParams[] = {
    {"color", ParamType::kColor, 0xFF00FF00u},
    {"similarity", ParamType::kNumber, 10.0, 0.0, 100.0},
    {"blend", ParamType::kNumber, 0.0, 0.0, 100.0},
};

// Chroma key: d is the distance in the BT.709 colour-difference plane
// (Cb, Cr) from the key colour, so a key colour is keyed at any brightness.
class ChromaKeyEffect : public KeyEffect<ChromaKeyEffect, 1>
{
public:
    using KeyEffect::KeyEffect;
    auto MakeDistance(const RenderContext& inContext) const
    {
        const Rgb key = RgbOf(Value(0, inContext));
        const float keyY = Luma(key.mR, key.mG, key.mB);
        const float keyCb = (key.mB - keyY) / 1.8556f, keyCr = (key.mR - keyY) / 1.5748f;
        return [=](float b, float g, float r)
        {
            const float y = Luma(r, g, b);
            const float cb = (b - y) / 1.8556f - keyCb, cr = (r - y) / 1.5748f - keyCr;
            return std::sqrt(cb * cb + cr * cr);
        };
    }
};

// RGB difference key: d is the distance in RGB from the key colour, over
// the length of the cube's diagonal.
class RGBDifferenceKeyEffect : public KeyEffect<RGBDifferenceKeyEffect, 1>
{
public:
    using KeyEffect::KeyEffect;
    auto MakeDistance(const RenderContext& inContext) const
    {
        const Rgb key = RgbOf(Value(0, inContext));
        return [=](float b, float g, float r)
        {
            const float dr = r - key.mR, dg = g - key.mG, db = b - key.mB;
            return std::sqrt((dr * dr + dg * dg + db * db) / 3.0f);
        };
    }
};

constexpr ParamSpec kScreenParams[] = {
    {"threshold", ParamType::kNumber, 60.0, 0.0, 100.0},
    {"softness", ParamType::kNumber, 20.0, 0.0, 100.0},
};

// Blue screen, green screen, non-red: d is 1 minus how far the keyed
// components stand above the others (a pure backdrop has d = 0).
enum class Backdrop
{
    kBlue,
    kGreen,
    kNonRed,
};

template <Backdrop kBackdrop>
class BackdropKeyEffect : public KeyEffect<BackdropKeyEffect<kBackdrop>, 0>
{
public:
    using KeyEffect<BackdropKeyEffect<kBackdrop>, 0>::KeyEffect;
    auto MakeDistance(const RenderContext&) const
    {
        return [](float b, float g, float r)
        {
            // Plain selections rather than std::max, so that the row loop vectorises.
            float excess = 0.0f;
            if constexpr (kBackdrop == Backdrop::kBlue)
                excess = b - (r > g ? r : g);
            else if constexpr (kBackdrop == Backdrop::kGreen)
                excess = g - (r > b ? r : b);
            else
                excess = (g > b ? g : b) - r;
            return 1.0f - (excess > 0.0f ? excess : 0.0f);
        };
    }
};

constexpr ParamSpec kBlendKeyParams[] = {
    {"cutoff", ParamType::kNumber, 0.0, 0.0, 100.0},
    {"softness", ParamType::kNumber, 100.0, 0.0, 100.0},
};

// Multiply key: d is 1 minus luma (bright areas are keyed out, as a
// multiply lets them through); screen key: d is luma (dark areas are keyed
// out, as a screen lets them through). The default softness gives an alpha
// proportional to d.
template <bool kBright>
class BlendKeyEffect : public KeyEffect<BlendKeyEffect<kBright>, 0>
{
public:
    using KeyEffect<BlendKeyEffect<kBright>, 0>::KeyEffect;
    auto MakeDistance(const RenderContext&) const
    {
        return [](float b, float g, float r)
        {
            const float y = Luma(r, g, b);
            return kBright ? 1.0f - y : y;
        };
    }
};

constexpr std::string_view kMattes[] = {"black", "white"};

constexpr ParamSpec kRemoveMatteParams[] = {
    {"matte", ParamType::kChoice, 0.0, 0.0, 1.0, 0.0, kMattes},
};

// Remove Matte: colour that was premultiplied over black or white is taken
// back to straight colour, c = (p - (1 - a) * matte) / a, so that keyed
// edges lose the fringe of the matte.
class RemoveMatteEffect : public EffectBase
{
public:
    using EffectBase::EffectBase;

protected:
    QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels) override
    {
        const std::uint32_t matte = Value(0, inContext) == 0.0 ? 0xFF000000u : 0xFFFFFFFFu;
        const IR_PixelFormat format =
            inPixels.mFloat ? kIR_PixelFormat_BGRA_32f : kIR_PixelFormat_BGRA_8u;
        return IR_UnPremultiplyAgainstMatteColor(
            inPixels.mBase, inPixels.mRowBytes, inPixels.mBase, inPixels.mRowBytes, format,
            inPixels.mWidth, inPixels.mHeight, matte, kIR_FormatBit_StraightAlpha,
            static_cast<std::int32_t>(inContext.mQuality));
    }
};

} // namespace

void AddKeyEffects(std::vector<EffectEntry>& ioEntries)
{
    ioEntries.push_back({kMatch_LumaKey, kLumaParams, &Make<LumaKeyEffect>});
    ioEntries.push_back({kMatch_ChromaKey, kColorKeyParams, &Make<ChromaKeyEffect>});
    ioEntries.push_back({kMatch_RGBDifferenceKey, kColorKeyParams, &Make<RGBDifferenceKeyEffect>});
    ioEntries.push_back(
        {kMatch_BlueScreenKey, kScreenParams, &Make<BackdropKeyEffect<Backdrop::kBlue>>});
    ioEntries.push_back(
        {kMatch_GreenScreenKey, kScreenParams, &Make<BackdropKeyEffect<Backdrop::kGreen>>});
    ioEntries.push_back(
        {kMatch_NonRedKey, kScreenParams, &Make<BackdropKeyEffect<Backdrop::kNonRed>>});
    ioEntries.push_back({kMatch_MultiplyKey, kBlendKeyParams, &Make<BlendKeyEffect<true>>});
    ioEntries.push_back({kMatch_ScreenKey, kBlendKeyParams, &Make<BlendKeyEffect<false>>});
    ioEntries.push_back({kMatch_RemoveMatte, kRemoveMatteParams, &Make<RemoveMatteEffect>});
}

} // namespace FX::detail
