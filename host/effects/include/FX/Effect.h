#pragma once

// FX::IEffect: one effect applied to a clip, as the host's effect catalogue
// (FX/EffectCatalogue.h) makes it from an item's effect settings: its match
// name, opaque data, parameters (each keyed in the item's time), duration,
// time variance, whether it may render several frames at once, its instance
// number, and its render entry.
//
// Threads. Everything but Render reads values fixed at creation and may be
// called from any thread. Render may be called from several threads at once
// only when IsReentrant() says so; otherwise the caller serialises the
// effect's renders (the renderer's effect node holds one lock per effect).
//
// Frames. Render receives the frame to draw onto and may replace it by
// another. A shared frame (IsShared) is never written: the effect takes
// VF::MakeWriteableVideoFrame (or makes a new frame) first. Effects work on
// BGRA frames of 8-bit or float components with straight alpha; other
// formats go through a float staging frame.

#include "BE/Keyframes.h"
#include "MF/BinaryData.h"
#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Param.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string>
#include <vector>

namespace FX
{

// What a parameter holds.
enum class ParamType : std::uint32_t
{
    kNumber = 1,
    kPoint = 2,
    kColor = 3,
    kBool = 4,
    kChoice = 5,
    // A layer of the sequence that the effect reads (a track number; 0xFFFFFFFF for none).
    kLayer = 13,
};

// Value of a kLayer parameter that reads no layer.
inline constexpr double kNoLayer = 4294967295.0;

// One parameter: its name and type, and its value as a curve in the item's
// time (keys with their interpolations, or one constant value). Colours
// (0xAARRGGBB as a number) and flags are constant. A value type, immutable
// once made.
struct EffectParam
{
    std::string mName;
    ParamType mType = ParamType::kNumber;
    BE::KeyframeCurve mCurve;

    // The parameter may change with time (numbers, points, choices, layers).
    bool IsTimeVariant() const;
    // It holds one value throughout.
    bool IsConstant() const { return mCurve.GetKeys().size() <= 1; }
    // The value at inTime (a point's x), and a point's y.
    double ValueAt(mvxmediatypes::TickTime inTime) const { return mCurve.ValueAt(inTime).mX; }
    double YAt(mvxmediatypes::TickTime inTime) const { return mCurve.ValueAt(inTime).mY; }
    // "name=value", or "name=" and one "ticks:value:interpolation:inSlope:outSlope"
    // per key separated by ";", points as "x,y": the text the renderer hashes.
    // Equal texts mean equal parameters.
    std::string GetText() const;
};

// What one render is asked for.
struct RenderContext
{
    // (0, 0, width, height) of the frame to deliver.
    QRT::ParamRect mFrameRect;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    // RenderQuality numbering.
    std::uint32_t mQuality = 0;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    // Delivered size over full size: distances in pixels are multiplied by it.
    float mScale = 1.0f;
    // The earlier field time in the item's time, its frame number at the
    // effect's rate, and the effect's duration in frames (0 without one).
    mvxmediatypes::TickTime mTime = mvxmediatypes::kTime_Zero;
    std::int64_t mFrame = 0;
    std::int64_t mDurationFrames = 0;
    // The rate frames are counted at.
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    std::string mStreamLabel;
    std::uint32_t mFlags = 0;
};

// A layer of the sequence that an effect reads (a track matte's track, say),
// handed to Render by the renderer. Used by the thread that renders the
// effect, during that render only.
class ILayerInput : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{b6e2c04d-58a1-4f3e-9d27-7c1a9e5f0b36}");

    // The layer's picture at inTime (the effect's own item time), drawn
    // through the layer's motion at the render's size and format. outFrame
    // is empty where the layer shows nothing. Answers 0 or the layer's
    // negative status.
    virtual QRT::Result RenderLayer(mvxmediatypes::TickTime inTime,
                                    QRT::InterfaceRef<MF::IVideoFrame>& outFrame) = 0;

protected:
    ~ILayerInput() = default;
};

// The layers an effect reads, in its layer parameters' order.
using LayerInputs = std::vector<QRT::InterfaceRef<ILayerInput>>;

class IEffect : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{3c8f5a1e-7b2d-4e96-a0c4-51d9e2b7f843}");

    virtual const std::string& GetMatchName() const = 0;
    // False when the effect has no opaque data; otherwise outData is set.
    virtual bool GetOpaqueData(MF::BinaryData& outData) const = 0;
    virtual std::uint32_t GetParamCount() const = 0;
    // Input contract: inIndex < GetParamCount().
    virtual const EffectParam& GetParam(std::uint32_t inIndex) const = 0;
    virtual bool HasDuration() const = 0;
    virtual mvxmediatypes::TickTime GetDuration() const = 0;
    // The picture changes with time even where no parameter does.
    virtual bool IsTimeVariant() const = 0;
    // Several frames may render at once.
    virtual bool IsReentrant() const = 0;
    // Unique among the effects of one process.
    virtual std::uint32_t GetInstanceID() const = 0;
    // Renders onto ioFrame (which may be replaced), asking inLayers for the
    // pictures of the layers it reads. Answers 0, or a negative status
    // (kIR_UnsupportedFormat for a format that cannot be staged).
    virtual QRT::Result Render(const RenderContext& inContext,
                               QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                               const LayerInputs& inLayers) = 0;

protected:
    ~IEffect() = default;
};

} // namespace FX
