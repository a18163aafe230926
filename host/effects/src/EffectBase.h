#pragma once

// The common part of every catalogue effect: the values fixed at creation
// (match name, parameters, duration, opaque data, instance number), the
// staging of frames the kernels cannot address, and the pixel helpers the
// kernels share. Private to the effects library.

#include "FX/Effect.h"
#include "QRT/QRTUnknown.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

namespace FX::detail
{

// A parameter as an effect declares it. Choices are numbered from 0 in
// mChoices order.
struct ParamSpec
{
    std::string_view mName;
    ParamType mType = ParamType::kNumber;
    double mDefault = 0.0;
    double mMin = 0.0;
    double mMax = 0.0;
    double mDefaultY = 0.0;
    std::span<const std::string_view> mChoices = {};
};

// What an effect is made of.
struct EffectSetup
{
    std::string mMatchName;
    std::vector<EffectParam> mParams;
    std::optional<mvxmediatypes::TickTime> mDuration;
    MF::BinaryData mOpaqueData;
    std::uint32_t mInstanceID = 0;
    // The folder relative file names of the settings are taken from.
    std::string mBaseFolder;
};

// A writable BGRA picture with straight alpha, 8-bit or float components.
struct Pixels
{
    void* mBase = nullptr;
    std::int32_t mRowBytes = 0;
    std::int32_t mWidth = 0;
    std::int32_t mHeight = 0;
    bool mFloat = false;

    template <class T>
    T* Row(std::int32_t inY) const
    {
        return reinterpret_cast<T*>(static_cast<std::uint8_t*>(mBase) +
                                    static_cast<std::ptrdiff_t>(inY) * mRowBytes);
    }
};

class EffectBase : public QRT::Implements<IEffect>
{
public:
    explicit EffectBase(EffectSetup inSetup);

    const std::string& GetMatchName() const override { return mSetup.mMatchName; }
    bool GetOpaqueData(MF::BinaryData& outData) const override;
    std::uint32_t GetParamCount() const override;
    const EffectParam& GetParam(std::uint32_t inIndex) const override;
    bool HasDuration() const override { return mSetup.mDuration.has_value(); }
    mvxmediatypes::TickTime GetDuration() const override;
    bool IsTimeVariant() const override { return false; }
    bool IsReentrant() const override { return true; }
    std::uint32_t GetInstanceID() const override { return mSetup.mInstanceID; }
    const std::string& GetBaseFolder() const { return mSetup.mBaseFolder; }
    // Stages a frame of another format as BGRA float, renders it with
    // RenderStaged and converts the result back.
    QRT::Result Render(const RenderContext& inContext, QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                       const LayerInputs& inLayers) override;

    // A render on a BGRA 8-bit or float frame (straight alpha).
    using StagedRender = std::function<QRT::Result(QRT::InterfaceRef<MF::IVideoFrame>&)>;
    // Runs inRender on ioFrame itself when it is BGRA, otherwise on a float
    // BGRA copy that is converted back into a new frame of ioFrame's format.
    static QRT::Result Stage(const RenderContext& inContext,
                             QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                             const StagedRender& inRender);

protected:
    ~EffectBase() = default;

    // Renders a BGRA 8-bit or float frame (straight alpha). By default makes
    // it writable and calls RenderInPlace.
    virtual QRT::Result RenderStaged(const RenderContext& inContext,
                                     QRT::InterfaceRef<MF::IVideoFrame>& ioFrame);
    virtual QRT::Result RenderInPlace(const RenderContext& inContext, const Pixels& inPixels);

    double Value(std::uint32_t inIndex, const RenderContext& inContext) const
    {
        return mSetup.mParams[inIndex].ValueAt(inContext.mTime);
    }
    double ValueY(std::uint32_t inIndex, const RenderContext& inContext) const
    {
        return mSetup.mParams[inIndex].YAt(inContext.mTime);
    }

private:
    EffectSetup mSetup;
};

// The writable BGRA pixels of a frame that is not shared; mBase is null for
// another format.
Pixels PixelsOf(MF::IVideoFrame& inFrame);

// Straight 8-bit component to 0..1.
constexpr std::array<float, 256> MakeUnit8Table()
{
    std::array<float, 256> table{};
    for (int i = 0; i < 256; ++i)
        table[static_cast<std::size_t>(i)] = static_cast<float>(i) / 255.0f;
    return table;
}
inline constexpr std::array<float, 256> kUnit8 = MakeUnit8Table();

// 0..1 to an 8-bit component, rounded and clamped in integers, which compiles
// to conditional moves (pixel data is too unpredictable for branches).
// Input contract: a finite value of at most a few million (every kernel's
// arithmetic stays far inside that).
inline std::uint8_t ToByte(float inValue)
{
    const auto scaled = static_cast<std::int32_t>(inValue * 255.0f + 0.5f);
    return static_cast<std::uint8_t>(std::clamp(scaled, 0, 255));
}

// BT.709 luma of gamma-encoded components.
inline float Luma(float inR, float inG, float inB)
{
    return 0.2126f * inR + 0.7152f * inG + 0.0722f * inB;
}

// Calls inFunction(b, g, r, a) on every pixel as floats (0..1 for 8-bit
// pixels, which are written back rounded and clamped). Each row is split
// into one array per component first, so that the loop over a row runs on
// contiguous values and vectorises.
template <class Function>
void ForEachPixel(const Pixels& inPixels, Function&& inFunction)
{
    const auto width = static_cast<std::size_t>(inPixels.mWidth);
    std::vector<float> planes(width * 4);
    float* const b = planes.data();
    float* const g = b + width;
    float* const r = g + width;
    float* const a = r + width;
    for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
    {
        if (inPixels.mFloat)
        {
            float* row = inPixels.Row<float>(y);
            for (std::size_t x = 0; x < width; ++x)
                b[x] = row[4 * x], g[x] = row[4 * x + 1], r[x] = row[4 * x + 2],
                a[x] = row[4 * x + 3];
            for (std::size_t x = 0; x < width; ++x)
                inFunction(b[x], g[x], r[x], a[x]);
            for (std::size_t x = 0; x < width; ++x)
                row[4 * x] = b[x], row[4 * x + 1] = g[x], row[4 * x + 2] = r[x],
                        row[4 * x + 3] = a[x];
            continue;
        }
        std::uint8_t* row = inPixels.Row<std::uint8_t>(y);
        for (std::size_t x = 0; x < width; ++x)
        {
            b[x] = kUnit8[row[4 * x]], g[x] = kUnit8[row[4 * x + 1]];
            r[x] = kUnit8[row[4 * x + 2]], a[x] = kUnit8[row[4 * x + 3]];
        }
        for (std::size_t x = 0; x < width; ++x)
            inFunction(b[x], g[x], r[x], a[x]);
        for (std::size_t x = 0; x < width; ++x)
        {
            row[4 * x] = ToByte(b[x]), row[4 * x + 1] = ToByte(g[x]);
            row[4 * x + 2] = ToByte(r[x]), row[4 * x + 3] = ToByte(a[x]);
        }
    }
}

// The same for kernels that change only the alpha: inFunction(b, g, r) answers
// the factor the alpha is multiplied by. 8-bit colour is left as it is.
template <class Function>
void ScaleAlpha(const Pixels& inPixels, Function&& inFunction)
{
    if (inPixels.mFloat)
    {
        ForEachPixel(inPixels, [&](float& ioB, float& ioG, float& ioR, float& ioA)
                     { ioA *= inFunction(ioB, ioG, ioR); });
        return;
    }
    const auto width = static_cast<std::size_t>(inPixels.mWidth);
    std::vector<float> planes(width * 4);
    float* const b = planes.data();
    float* const g = b + width;
    float* const r = g + width;
    float* const a = r + width;
    for (std::int32_t y = 0; y < inPixels.mHeight; ++y)
    {
        std::uint8_t* row = inPixels.Row<std::uint8_t>(y);
        for (std::size_t x = 0; x < width; ++x)
        {
            b[x] = kUnit8[row[4 * x]], g[x] = kUnit8[row[4 * x + 1]];
            r[x] = kUnit8[row[4 * x + 2]], a[x] = kUnit8[row[4 * x + 3]];
        }
        for (std::size_t x = 0; x < width; ++x)
            a[x] *= inFunction(b[x], g[x], r[x]);
        for (std::size_t x = 0; x < width; ++x)
            row[4 * x + 3] = ToByte(a[x]);
    }
}

// One catalogue entry: the match name, the declared parameters and the maker.
struct EffectEntry
{
    std::string_view mMatchName;
    std::span<const ParamSpec> mParams;
    QRT::InterfaceRef<IEffect> (*mMake)(EffectSetup&& inSetup);
};

template <class T>
QRT::InterfaceRef<IEffect> Make(EffectSetup&& inSetup);

// The entries of each family, in catalogue order.
void AddColorEffects(std::vector<EffectEntry>& ioEntries);
void AddKeyEffects(std::vector<EffectEntry>& ioEntries);
void AddGeometryEffects(std::vector<EffectEntry>& ioEntries);
void AddBlurEffects(std::vector<EffectEntry>& ioEntries);
void AddOverlayEffects(std::vector<EffectEntry>& ioEntries);
void AddPinEffects(std::vector<EffectEntry>& ioEntries);
void AddMatteEffects(std::vector<EffectEntry>& ioEntries);

} // namespace FX::detail

#include "QRT/Allocated.h"

template <class T>
QRT::InterfaceRef<FX::IEffect> FX::detail::Make(EffectSetup&& inSetup)
{
    return QRT::Allocated<T>::template Create<IEffect>(std::move(inSetup));
}
