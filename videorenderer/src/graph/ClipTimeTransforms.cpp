// The clip's chain, time-remapping and frame-hold transforms.

#include "graph/ClipTimeTransforms.h"

#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cmath>
#include <string_view>
#include <utility>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

bool IsSpecial(TickTime inTime)
{
    return !inTime.IsValid() || inTime == mvxmediatypes::kTime_Max ||
           inTime == mvxmediatypes::kTime_Min;
}

class MultiTimeTransform : public QRT::Implements<MF::ITimeTransform>
{
public:
    explicit MultiTimeTransform(std::vector<TimeTransformRef> inSteps)
        : mSteps(std::move(inSteps))
    {
    }

    TickTime Transform(TickTime inTime) const override
    {
        for (const TimeTransformRef& step : mSteps)
            inTime = step->Transform(inTime);
        return inTime;
    }
    TickTime InverseTransform(TickTime inTime) const override
    {
        for (auto step = mSteps.rbegin(); step != mSteps.rend(); ++step)
            inTime = (*step)->InverseTransform(inTime);
        return inTime;
    }
    double GetSpeed() const override
    {
        double speed = 1.0;
        for (const TimeTransformRef& step : mSteps)
            speed *= step->GetSpeed();
        return speed;
    }
    void MixIntoHash(QRT::HashValue& ioHash) const override
    {
        QRT::MixHash::MixInString(ioHash, std::string_view("MultiTimeTransform"));
        QRT::MixHash::MixInValue(ioHash, static_cast<std::uint32_t>(mSteps.size()));
        for (const TimeTransformRef& step : mSteps)
            step->MixIntoHash(ioHash);
    }

protected:
    ~MultiTimeTransform() = default;

private:
    const std::vector<TimeTransformRef> mSteps;
};

class RemapTimeTransform : public QRT::Implements<MF::ITimeTransform>
{
public:
    explicit RemapTimeTransform(BE::KeyframeCurve inCurve)
        : mCurve(std::move(inCurve))
    {
    }

    TickTime Transform(TickTime inTime) const override
    {
        if (IsSpecial(inTime))
            return inTime;
        return TickTime::FromSeconds(mCurve.ValueAt(inTime).mX);
    }

    // Bisection over the keyed span: the earliest outer time whose media time
    // reaches inTime (in the curve's direction).
    TickTime InverseTransform(TickTime inTime) const override
    {
        if (IsSpecial(inTime))
            return inTime;
        const auto& keys = mCurve.GetKeys();
        std::int64_t low = keys.front().mTime.GetTicks();
        std::int64_t high = keys.back().mTime.GetTicks();
        const TickTime first = Transform(keys.front().mTime);
        const TickTime last = Transform(keys.back().mTime);
        const bool rising = last >= first;
        if (!Monotonic(rising) || inTime < std::min(first, last) || inTime > std::max(first, last))
            return mvxmediatypes::kTime_Invalid;
        const auto reached = [&](std::int64_t inTicks)
        {
            const TickTime media = Transform(TickTime::TicksToTime(inTicks));
            return rising ? media >= inTime : media <= inTime;
        };
        while (low < high)
        {
            const std::int64_t middle = low + (high - low) / 2;
            if (reached(middle))
                high = middle;
            else
                low = middle + 1;
        }
        return TickTime::TicksToTime(low);
    }

    // The mean speed over the keyed span.
    double GetSpeed() const override
    {
        const auto& keys = mCurve.GetKeys();
        const double span =
            static_cast<double>((keys.back().mTime - keys.front().mTime).GetTicks());
        if (span <= 0)
            return 0.0;
        return (keys.back().mValue.mX - keys.front().mValue.mX) *
               static_cast<double>(mvxmediatypes::kTicksPerSecond) / span;
    }

    void MixIntoHash(QRT::HashValue& ioHash) const override
    {
        QRT::MixHash::MixInString(ioHash, std::string_view("RemapTimeTransform"));
        for (const BE::CurveKey& key : mCurve.GetKeys())
        {
            QRT::MixHash::MixInValue(ioHash, key.mTime.GetTicks());
            QRT::MixHash::MixInValue(ioHash, key.mValue.mX);
            QRT::MixHash::MixInValue(ioHash, static_cast<std::int32_t>(key.mInterpolation));
            QRT::MixHash::MixInValue(ioHash, key.mInSlope.mX);
            QRT::MixHash::MixInValue(ioHash, key.mOutSlope.mX);
        }
    }

protected:
    ~RemapTimeTransform() = default;

private:
    // True when no span between keys runs against the curve's direction
    // (bezier spans are checked at their control values).
    bool Monotonic(bool inRising) const
    {
        const auto& keys = mCurve.GetKeys();
        for (std::size_t i = 0; i + 1 < keys.size(); ++i)
        {
            const double from = keys[i].mValue.mX;
            const double to = keys[i + 1].mValue.mX;
            if (keys[i].mInterpolation == BE::KeyframeInterpolation::kBezier)
            {
                const double span = (keys[i + 1].mTime - keys[i].mTime).ToSeconds();
                const double c0 = from + keys[i].mOutSlope.mX * span / 3;
                const double c1 = to - keys[i + 1].mInSlope.mX * span / 3;
                if (inRising ? !(from <= c0 && c0 <= c1 && c1 <= to)
                             : !(from >= c0 && c0 >= c1 && c1 >= to))
                    return false;
            }
            if (inRising ? to < from : to > from)
                return false;
        }
        return true;
    }

    const BE::KeyframeCurve mCurve;
};

class HoldTimeTransform : public QRT::Implements<MF::ITimeTransform>
{
public:
    explicit HoldTimeTransform(TickTime inHeldTime)
        : mHeldTime(inHeldTime)
    {
    }

    TickTime Transform(TickTime inTime) const override
    {
        return inTime.IsValid() ? mHeldTime : inTime;
    }
    TickTime InverseTransform(TickTime /*inTime*/) const override
    {
        return mvxmediatypes::kTime_Invalid;
    }
    double GetSpeed() const override { return 0.0; }
    void MixIntoHash(QRT::HashValue& ioHash) const override
    {
        QRT::MixHash::MixInString(ioHash, std::string_view("HoldTimeTransform"));
        QRT::MixHash::MixInValue(ioHash, mHeldTime.GetTicks());
    }

protected:
    ~HoldTimeTransform() = default;

private:
    const TickTime mHeldTime;
};

} // namespace

TimeTransformRef CreateMultiTimeTransform(std::vector<TimeTransformRef> inSteps)
{
    for (const TimeTransformRef& step : inSteps)
        MVX_INPUT_CONTRACT(step);
    return QRT::Allocated<MultiTimeTransform>::Create<MF::ITimeTransform>(std::move(inSteps));
}

TimeTransformRef CreateRemapTimeTransform(const BE::KeyframeCurve& inCurve)
{
    MVX_INPUT_CONTRACT(!inCurve.GetKeys().empty());
    return QRT::Allocated<RemapTimeTransform>::Create<MF::ITimeTransform>(inCurve);
}

TimeTransformRef CreateHoldTimeTransform(mvxmediatypes::TickTime inHeldTime)
{
    MVX_INPUT_CONTRACT(inHeldTime.IsValid());
    return QRT::Allocated<HoldTimeTransform>::Create<MF::ITimeTransform>(inHeldTime);
}

TimeTransformRef CreatePlaybackTimeTransform(const BE::TrackItemSettings& inItem)
{
    const BE::ClipSettings& clip = inItem.mClip;
    const double speed = std::abs(clip.mSpeed);
    std::vector<TimeTransformRef> steps;
    if (clip.IsTimeRemapped())
    {
        steps.push_back(MF::CreateTimeTransform(speed));
        steps.push_back(CreateRemapTimeTransform(clip.mTimeRemapping));
    }
    else if (clip.mReverse == (clip.mSpeed < 0))
    {
        steps.push_back(MF::CreateTimeTransform(speed, mvxmediatypes::kTime_Zero, clip.mInPoint));
    }
    else
    {
        const TickTime length = inItem.mEnd - inItem.mStart;
        const TickTime end =
            clip.mOutPoint != mvxmediatypes::kTime_Max
                ? clip.mOutPoint
                : clip.mInPoint + TickTime::TicksToTime(static_cast<std::int64_t>(std::llround(
                                      static_cast<double>(length.GetTicks()) * speed)));
        // One tick before the end, so that clip time 0 lands in the last
        // frame of the used range rather than on the first frame after it.
        steps.push_back(MF::CreateTimeTransform(-speed, mvxmediatypes::kTime_Zero,
                                                end - TickTime::TicksToTime(1)));
    }
    return CreateMultiTimeTransform(std::move(steps));
}

TimeTransformRef CreateClipTimeTransform(const BE::TrackItemSettings& inItem)
{
    TimeTransformRef playback = CreatePlaybackTimeTransform(inItem);
    if (!inItem.mClip.mFrameHold.IsSet())
        return playback;
    return CreateMultiTimeTransform(
        {playback, CreateHoldTimeTransform(inItem.mClip.mFrameHold.mAt)});
}

} // namespace ML
