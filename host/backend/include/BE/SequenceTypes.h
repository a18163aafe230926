#pragma once

// The plain settings behind the back end's sequence objects (BE/Sequence.h):
// what a sequence, a track, a track item, its clip and its media are set to.
// Value types with equality, so that two models can be compared field by
// field; safe to copy between threads.
//
// Times are in sequence time unless a field says media time. Colours are
// 0xAARRGGBB.

#include "BE/ColorProfile.h"
#include "BE/Keyframes.h"
#include "IR/ImageRenderer.h"
#include "MF/BinaryData.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/Pulldown.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace BE
{

// Limits that every sequence and stream keeps.
inline constexpr std::int32_t kMaxFrameDimension = 32768;
inline constexpr double kMinFramesPerSecond = 0.01;
inline constexpr double kMaxFramesPerSecond = 1000.0;
inline constexpr double kMaxClipSpeed = 1000.0;

struct SequenceSettings
{
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    std::int32_t mWidth = 1920;
    std::int32_t mHeight = 1080;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;

    friend bool operator==(const SequenceSettings&, const SequenceSettings&) = default;
};

struct TrackSettings
{
    bool mMuted = false;
    bool mLocked = false;

    friend bool operator==(const TrackSettings&, const TrackSettings&) = default;
};

// How a clip reads its media's alpha channel.
struct AlphaSettings
{
    // kAlphaChannel_None: as the stream says.
    mvxmediatypes::AlphaChannel mType = mvxmediatypes::kAlphaChannel_None;
    bool mIgnore = false;
    bool mInvert = false;
    // The colour premultiplied material was premultiplied over.
    std::uint32_t mMatteColor = 0xFF000000u;

    friend bool operator==(const AlphaSettings&, const AlphaSettings&) = default;
};

struct PulldownSettings
{
    bool mRemove = false;
    mvxmediatypes::PulldownCadence mCadence = mvxmediatypes::kPulldownCadence_None;

    friend bool operator==(const PulldownSettings&, const PulldownSettings&) = default;
};

enum class FieldProcessing : std::int32_t
{
    kNone = 0,
    kInterlaceConsecutiveFrames = 1,
    kDeinterlaceAlways = 2,
    kRemoveFlicker = 3,
};

struct FrameHold
{
    // Media time held; kTime_Max when the clip does not hold a frame.
    mvxmediatypes::TickTime mAt = mvxmediatypes::kTime_Max;
    // Effects and motion are evaluated at the held time too.
    bool mFilters = false;
    bool mDeinterlace = false;

    bool IsSet() const { return mAt != mvxmediatypes::kTime_Max; }
    friend bool operator==(const FrameHold&, const FrameHold&) = default;
};

struct ClipSettings
{
    // Media times of the first frame used and of the end of the used range.
    mvxmediatypes::TickTime mInPoint = mvxmediatypes::kTime_Zero;
    mvxmediatypes::TickTime mOutPoint = mvxmediatypes::kTime_Max;
    double mSpeed = 1.0;
    bool mReverse = false;
    // Media time in seconds as a function of clip time; in use when keyed
    // (its default value plays no part).
    KeyframeCurve mTimeRemapping;
    FrameHold mFrameHold;
    FieldProcessing mFieldProcessing = FieldProcessing::kNone;
    bool mReverseFieldDominance = false;
    bool mFrameBlend = false;
    bool mScaleToFrame = false;
    AlphaSettings mAlpha;
    PulldownSettings mPulldown;

    bool IsTimeRemapped() const { return !mTimeRemapping.GetKeys().empty(); }
    // The text the clip node hashes for the remapping: "seconds=value" per
    // key with its interpolation; empty when not in use.
    std::string GetTimeRemappingText() const;
    friend bool operator==(const ClipSettings&, const ClipSettings&) = default;
};

struct MotionKeyframes
{
    // Offset of the layer's anchor from the frame centre, in sequence pixels.
    KeyframeCurve mPosition = KeyframeCurve::Point({0.0, 0.0});
    // Per cent.
    KeyframeCurve mScale = KeyframeCurve::Scalar(100.0);
    // Degrees, clockwise.
    KeyframeCurve mRotation = KeyframeCurve::Scalar(0.0);
    // Offset of the anchor from the media's centre, in media pixels.
    KeyframeCurve mAnchor = KeyframeCurve::Point({0.0, 0.0});

    friend bool operator==(const MotionKeyframes&, const MotionKeyframes&) = default;
};

struct EffectSettings
{
    std::string mMatchName;
    // Parameters given as text (choices, colours, flags, numbers as text).
    std::map<std::string, std::string> mParams;
    MF::BinaryData mOpaqueData;
    // Numeric parameters given as numbers or points, constant or keyed, in
    // the item's time.
    std::map<std::string, KeyframeCurve> mKeyframedParams;
    // The folder that relative file names in the settings (an image matte's
    // picture) are taken from: the timeline file's. Where the settings came
    // from, not what they say, so not compared.
    std::string mBaseFolder;

    friend bool operator==(const EffectSettings& inA, const EffectSettings& inB)
    {
        return inA.mMatchName == inB.mMatchName && inA.mParams == inB.mParams &&
               inA.mOpaqueData == inB.mOpaqueData && inA.mKeyframedParams == inB.mKeyframedParams;
    }
};

struct TransitionSettings
{
    std::string mMatchName;
    mvxmediatypes::TickTime mStart;
    mvxmediatypes::TickTime mEnd;
    bool mReverse = false;
    std::map<std::string, std::string> mParams;

    friend bool operator==(const TransitionSettings&, const TransitionSettings&) = default;
};

// Track item flags.
inline constexpr std::uint32_t kTrackItemFlag_AdjustmentLayer = 128;

struct TrackItemSettings
{
    mvxmediatypes::TickTime mStart = mvxmediatypes::kTime_Zero;
    mvxmediatypes::TickTime mEnd = mvxmediatypes::kTime_Zero;
    std::uint32_t mFlags = 0;
    IR_BlendMode mBlendMode = kIR_BlendMode_Normal;
    ClipSettings mClip;
    KeyframeCurve mOpacity = KeyframeCurve::Scalar(100.0);
    MotionKeyframes mMotion;
    std::vector<EffectSettings> mEffects;
    std::vector<TransitionSettings> mTransitions;

    bool IsAdjustmentLayer() const { return (mFlags & kTrackItemFlag_AdjustmentLayer) != 0; }
    friend bool operator==(const TrackItemSettings&, const TrackItemSettings&) = default;
};

struct StreamSettings
{
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    std::int32_t mWidth = 1920;
    std::int32_t mHeight = 1080;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::AlphaChannel mAlpha = mvxmediatypes::kAlphaChannel_None;

    friend bool operator==(const StreamSettings&, const StreamSettings&) = default;
};

// The stream of media made to fit a sequence (solids, nested sequences).
inline StreamSettings StreamOfSequence(const SequenceSettings& inSequence,
                                       mvxmediatypes::AlphaChannel inAlpha)
{
    return {inSequence.mFrameRate,        inSequence.mWidth,     inSequence.mHeight,
            inSequence.mPixelAspectRatio, inSequence.mFieldType, inAlpha};
}

enum class MediaKind
{
    kFile,
    kStill,
    kPattern,
    kSolid,
    kSequence,
    // Camera angles (each a media of its own) of which one is shown.
    kMulticam,
};

// How a multicam media shows its angles.
struct MulticamSettings
{
    // The angle shown (an index into the angles).
    std::uint64_t mSelected = 0;
    // Show every angle in a grid, the selected one outlined, instead of the
    // selected angle alone.
    bool mShowProgram = false;
    // The editor is recording angle switches.
    bool mRecording = false;

    friend bool operator==(const MulticamSettings&, const MulticamSettings&) = default;
};

struct MediaSettings
{
    MediaKind mKind = MediaKind::kFile;
    // kFile, kStill: the path as given; kPattern: the "pattern:" text;
    // kSequence: the nested sequence's name; kSolid, kMulticam: empty.
    // Solids: the colour is mColor; the picture made is opaque, the alpha
    // byte is kept for the renderer to apply.
    std::string mLocation;
    // kFile, kStill: the path opened (mLocation resolved against the
    // timeline file's folder).
    std::string mResolvedPath;
    std::uint32_t mColor = 0xFF000000u;
    bool mOffline = false;
    bool mPending = false;
    bool mDraft = false;
    MF::BinaryData mOpaqueData;
    ColorProfile mColorProfile;
    // What the stream is when the material cannot tell (offline files,
    // solids) or should be taken as something else. A solid always has one
    // once made (1920x1080 at 25 frames per second when none is given;
    // timeline files give it its sequence's picture).
    std::optional<StreamSettings> mStream;
    // The media's length when the material cannot tell or is to be cut.
    std::optional<mvxmediatypes::TickTime> mDuration;
    // kMulticam: the angle shown and how (the angles are IMulticamMedia's).
    MulticamSettings mMulticam;

    friend bool operator==(const MediaSettings&, const MediaSettings&) = default;
};

} // namespace BE
