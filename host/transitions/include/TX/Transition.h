#pragma once

// TX::ITransition: a host transition object, which renders the change from an
// outgoing picture (A) to an incoming one (B) as the transition progresses
// from 0 to 1. Made by the catalogue (TX/TransitionCatalogue.h) from a track
// item's transition settings, immutable afterwards: any number of threads may
// render through one object at once.
//
// Frames. Both inputs and the output share one pixel format and one size;
// formats are the BGRA layout in 8-bit or 32-bit float (straight or
// premultiplied alpha, gamma-encoded or linear). An absent input is
// transparent black: a transition with one input absent fades, wipes or moves
// that input in or out over nothing.

#include "MF/BinaryData.h"
#include "MF/IVideoFrame.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string>

namespace TX
{

// Render answers this when an input's format or size is not the output's.
inline constexpr QRT::Result kResult_FramesDoNotMatch = static_cast<QRT::Result>(0xA0150001u);

// A point in frame-relative units: (0, 0) the top left, (0.5, 0.5) the centre.
struct TransitionPoint
{
    float mX = 0.5f;
    float mY = 0.5f;

    friend bool operator==(const TransitionPoint&, const TransitionPoint&) = default;
};

// Where B enters from (the side the edge starts at).
enum TransitionDirection : std::uint16_t
{
    kTransitionDirection_FromLeft = 0,
    kTransitionDirection_FromRight = 1,
    kTransitionDirection_FromTop = 2,
    kTransitionDirection_FromBottom = 3,
};

// The settings a transition renders with.
struct TransitionParameters
{
    // The iris centre travels from the start to the end position when the
    // two differ, and stands at the centre position when they are equal.
    TransitionPoint mStartPosition;
    TransitionPoint mEndPosition;
    TransitionPoint mCenterPosition;
    // The part of the transition played: progress 0 shows it at the start
    // per cent, progress 1 at the end per cent (0 to 100).
    float mStartPercent = 0.0f;
    float mEndPercent = 100.0f;
    // Pixels of the full frame; drawn between A and B by wipe and iris.
    float mBorderWidth = 0.0f;
    // 0xAARRGGBB.
    std::uint32_t mBorderColor = 0xFFFFFFFFu;
    // B is the outgoing picture and A the incoming one.
    bool mSwitchSources = false;
    // The transition plays backwards: it still starts on A and ends on B,
    // but its edge moves the other way (a wipe from the left becomes one
    // from the right, an iris closes instead of opening).
    bool mReverse = false;
    std::uint16_t mDirection = kTransitionDirection_FromLeft;
    // 0 draws edges at the pixel centres; above 0 edges cover pixels by area.
    std::int32_t mAntiAliasQuality = 1;
    mvxmediatypes::TickTime mDuration = mvxmediatypes::kTime_Zero;
    // A number unique to the object in this process.
    std::uint32_t mInstanceNumber = 0;

    friend bool operator==(const TransitionParameters&, const TransitionParameters&) = default;
};

// How the output frame is laid out and scaled.
struct TransitionFrameSettings
{
    // Interlaced output renders each field at its own progress: the first
    // field (rows 0, 2, ... for field type 1; rows 1, 3, ... for type 2) at
    // the progress handed to Render, the other at mSecondFieldProgress.
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    float mSecondFieldProgress = 0.0f;
    // Output pixels per full-frame pixel (borders and softness scale by it).
    float mScale = 1.0f;
};

// The progress within the played part: inProgress (0 to 1, clamped) mapped
// through the start and end per cent.
float PlayedProgress(const TransitionParameters& inParameters, float inProgress);

class ITransition : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{5d0c6a2e-8f3b-4c71-9e24-b7a1d3f08c59}");

    virtual const std::string& GetMatchName() const = 0;
    // The transition's own settings beyond TransitionParameters (softness,
    // say) in a canonical encoding: equal data, equal pictures.
    virtual const MF::BinaryData& GetOpaqueData() const = 0;
    virtual const TransitionParameters& GetParameters() const = 0;

    // Renders into ioOutput (not shared) from inFrameA and inFrameB (either
    // may be null) at inProgress (0 to 1) with inParameters. Answers 0,
    // kIR_UnsupportedFormat for a format other than BGRA 8-bit or float, or
    // kResult_FramesDoNotMatch for inputs of another format or size. Mixing
    // is linear in the frames' own encoding (linear light for linear
    // formats), so inQuality changes nothing today.
    virtual QRT::Result Render(const MF::IVideoFrame* inFrameA, const MF::IVideoFrame* inFrameB,
                               MF::IVideoFrame& ioOutput, float inProgress,
                               const TransitionParameters& inParameters,
                               const TransitionFrameSettings& inFrame,
                               std::uint32_t inQuality) const = 0;

protected:
    ~ITransition() = default;
};

} // namespace TX
