#pragma once

// FrameRate: a frame rate held as the duration of one frame in ticks
// (TickTime.h: 705,600,000 ticks per second).
//
// Meaning of the operators: they act on the RATE, as a reader of
// "field rate = frame rate * 2" expects. `rate * n` is n times as many frames
// per second, so its duration is the duration divided by n; `rate / n` is n
// times fewer frames per second, so its duration is multiplied by n. Thus
// 29.97 * 2 is the 59.94 field rate, and 29.97 * 4 / 5 (evaluated left to
// right) is 23.976, exactly. A duration that does not divide evenly by n is
// rounded to the nearest tick (halves away from zero). A factor or divisor
// below 1, or a result beyond the int64 range, violates an input contract.
//
// Ordering compares rates, not durations: a < b when a has fewer frames per
// second (a longer frame). kFrameRate_Zero (a duration of 0, "no rate") is
// below every real rate, so "inRate > kFrameRate_Zero" asks for a real rate
// and "inRate >= kFrameRate_Video1000" finds still-image rates. A FrameRate
// never holds a negative duration: Create refuses one.
// Equality is equality of durations.
//
// Value type, trivially copyable, 8 bytes; safe to use from any thread.

#include "mvxcore/debug/Contract.h"
#include "mvxmediatypes/TickTime.h"

#include <compare>
#include <cstdint>

namespace mvxmediatypes
{

class FrameRate
{
public:
    // kFrameRate_Zero.
    constexpr FrameRate() = default;

    // The rate whose frame lasts inTicksPerFrame ticks; 0 gives kFrameRate_Zero.
    // A negative duration violates an input contract.
    static constexpr FrameRate Create(std::int64_t inTicksPerFrame)
    {
        MVX_INPUT_CONTRACT(inTicksPerFrame >= 0);
        return FrameRate(inTicksPerFrame);
    }
    // The rate of inNumerator / inDenominator frames per second (30000 / 1001
    // is 29.97), rounded to the nearest tick. A negative numerator, a
    // denominator below 1 or a rate faster than one frame per tick violates an
    // input contract; 0 / d gives kFrameRate_Zero.
    static FrameRate Create(std::int64_t inNumerator, std::int64_t inDenominator);
    // The rate of inFramesPerSecond frames per second, rounded to the nearest
    // tick; 0 gives kFrameRate_Zero. Negative, NaN or unrepresentably small
    // rates violate an input contract.
    static FrameRate FromValue(double inFramesPerSecond);

    constexpr std::int64_t GetTicksPerFrame() const { return mTicksPerFrame; }
    // Frames per second; 0.0 for kFrameRate_Zero.
    double GetValue() const;
    // The duration of one frame as a time.
    constexpr TickTime GetFrameDuration() const { return TickTime::TicksToTime(mTicksPerFrame); }
    // The start of frame inFrame (same as TickTime::FromFrame).
    TickTime FrameToTime(std::int64_t inFrame) const;

    constexpr bool IsZero() const { return mTicksPerFrame == 0; }

    FrameRate operator*(std::int64_t inFactor) const;
    FrameRate operator/(std::int64_t inDivisor) const;

    friend constexpr bool operator==(const FrameRate&, const FrameRate&) = default;
    friend constexpr std::strong_ordering operator<=>(const FrameRate& inLeft,
                                                      const FrameRate& inRight)
    {
        const int leftClass = ClassOf(inLeft.mTicksPerFrame);
        const int rightClass = ClassOf(inRight.mTicksPerFrame);
        if (leftClass != rightClass)
            return leftClass <=> rightClass;
        // Among real rates the longer frame is the lower rate.
        return inRight.mTicksPerFrame <=> inLeft.mTicksPerFrame;
    }

private:
    explicit constexpr FrameRate(std::int64_t inTicksPerFrame)
        : mTicksPerFrame(inTicksPerFrame)
    {
    }

    // 0: kFrameRate_Zero, 1: a real rate.
    static constexpr int ClassOf(std::int64_t inTicks) { return inTicks == 0 ? 0 : 1; }

    std::int64_t mTicksPerFrame = 0;
};

inline constexpr FrameRate kFrameRate_Zero = FrameRate::Create(0);
// Still images and other "one frame per millisecond" sources.
inline constexpr FrameRate kFrameRate_Video1000 = FrameRate::Create(705'600);
inline constexpr FrameRate kFrameRate_Video2398 = FrameRate::Create(29'429'400); // 24000/1001
inline constexpr FrameRate kFrameRate_Video24 = FrameRate::Create(29'400'000);
inline constexpr FrameRate kFrameRate_Video25 = FrameRate::Create(28'224'000);
inline constexpr FrameRate kFrameRate_Video2997 = FrameRate::Create(23'543'520); // 30000/1001
inline constexpr FrameRate kFrameRate_Video30 = FrameRate::Create(23'520'000);
inline constexpr FrameRate kFrameRate_Video50 = FrameRate::Create(14'112'000);
inline constexpr FrameRate kFrameRate_Video5994 = FrameRate::Create(11'771'760); // 60000/1001
inline constexpr FrameRate kFrameRate_Video60 = FrameRate::Create(11'760'000);
inline constexpr FrameRate kFrameRate_Audio48000 = FrameRate::Create(14'700);

} // namespace mvxmediatypes
