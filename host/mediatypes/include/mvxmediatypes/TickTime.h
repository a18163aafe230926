#pragma once

// TickTime: a point or span of media time as a signed 64-bit count of ticks.
//
// One second is kTicksPerSecond = 705,600,000 ticks. That rate is a common
// multiple of every frame duration and sample period the host works with, so
// 23.976, 24, 25, 29.97, 30, 50, 59.94 and 60 frames per second and 48 kHz
// audio are all whole numbers of ticks and frame arithmetic is exact over any
// span (29.97 fps: 23,543,520 ticks per frame; 48 kHz: 14,700 ticks).
//
// Value type, trivially copyable, 8 bytes (hashed as its 8 bytes); safe to
// use from any thread.
//
// Special values:
//   kTime_Zero     0
//   kTime_Max      INT64_MAX      "no end"; the largest ordinary time
//   kTime_Min      -INT64_MAX     "no beginning"; the smallest ordinary time
//   kTime_Invalid  INT64_MIN      "no time"; sorts below kTime_Min
//
// Arithmetic (+, -, unary -, * and / by an integer, AddFrames) saturates: a
// result beyond [kTime_Min, kTime_Max] becomes kTime_Min or kTime_Max, so sums
// with kTime_Max stay at kTime_Max instead of wrapping. kTime_Max is not sticky:
// kTime_Max - 1 is kTime_Max - 1 tick. An operation with kTime_Invalid as an
// operand answers kTime_Invalid. Comparisons compare raw tick counts.
//
// Frame arithmetic (ToFrame32, ToFrame64, AlignToFrame, AlignToFrameCeil,
// AddFrames, FromFrame) takes a FrameRate, which is a frame duration in ticks
// (FrameRate.h, included at the end of this header). Frame numbers are floor
// divisions: frame n covers [n * d, (n + 1) * d), so -1 tick is in frame -1.
// Each of them violates an input contract for kTime_Invalid (except AddFrames,
// which keeps it) and for a frame rate that is not positive (kFrameRate_Zero
// has no frames).

#include <compare>
#include <cstdint>

namespace mvxmediatypes
{

class FrameRate;

class TickTime
{
public:
    static constexpr std::int64_t kTicksPerSecond = 705'600'000;

    // kTime_Zero.
    constexpr TickTime() = default;

    // The time of the given tick count (any value, kTime_Invalid's included).
    static constexpr TickTime TicksToTime(std::int64_t inTicks) { return TickTime(inTicks); }

    // The time of the start of frame inFrame at inRate (saturating).
    static TickTime FromFrame(std::int64_t inFrame, const FrameRate& inRate);

    // Seconds rounded to the nearest tick; beyond the range saturates to
    // kTime_Min / kTime_Max; NaN gives kTime_Invalid.
    static TickTime FromSeconds(double inSeconds);

    constexpr std::int64_t GetTicks() const { return mTicks; }

    // Seconds as a double; kTime_Invalid gives a quiet NaN.
    double ToSeconds() const;

    constexpr bool IsValid() const { return mTicks != kInvalidTicks; }

    // Frame number (floor division). ToFrame32 saturates to the int32 range,
    // so kTime_Max gives INT32_MAX.
    std::int32_t ToFrame32(const FrameRate& inRate) const;
    std::int64_t ToFrame64(const FrameRate& inRate) const;

    // Start of the frame that contains this time (round down to the frame grid,
    // also for negative times). A result below kTime_Min saturates to kTime_Min.
    TickTime AlignToFrame(const FrameRate& inRate) const;
    // The smallest frame start at or after this time. A result above kTime_Max
    // saturates to kTime_Max.
    TickTime AlignToFrameCeil(const FrameRate& inRate) const;
    // This time moved by inFrames whole frames (saturating); kTime_Invalid stays.
    TickTime AddFrames(std::int64_t inFrames, const FrameRate& inRate) const;

    TickTime operator-() const;
    TickTime& operator+=(const TickTime& inOther);
    TickTime& operator-=(const TickTime& inOther);
    TickTime& operator*=(std::int64_t inFactor);
    // Truncates toward zero; a zero divisor violates an input contract.
    TickTime& operator/=(std::int64_t inDivisor);

    friend TickTime operator+(TickTime inLeft, const TickTime& inRight)
    {
        return inLeft += inRight;
    }
    friend TickTime operator-(TickTime inLeft, const TickTime& inRight)
    {
        return inLeft -= inRight;
    }
    friend TickTime operator*(TickTime inLeft, std::int64_t inFactor) { return inLeft *= inFactor; }
    friend TickTime operator*(std::int64_t inFactor, TickTime inRight)
    {
        return inRight *= inFactor;
    }
    friend TickTime operator/(TickTime inLeft, std::int64_t inDivisor)
    {
        return inLeft /= inDivisor;
    }

    friend constexpr bool operator==(const TickTime&, const TickTime&) = default;
    friend constexpr auto operator<=>(const TickTime&, const TickTime&) = default;

private:
    static constexpr std::int64_t kInvalidTicks = INT64_MIN;

    explicit constexpr TickTime(std::int64_t inTicks)
        : mTicks(inTicks)
    {
    }

    std::int64_t mTicks = 0;
};

inline constexpr TickTime kTime_Zero = TickTime::TicksToTime(0);
inline constexpr TickTime kTime_Max = TickTime::TicksToTime(INT64_MAX);
inline constexpr TickTime kTime_Min = TickTime::TicksToTime(-INT64_MAX);
inline constexpr TickTime kTime_Invalid = TickTime::TicksToTime(INT64_MIN);
inline constexpr std::int64_t kTicksPerSecond = TickTime::kTicksPerSecond;

} // namespace mvxmediatypes

// Frame arithmetic above takes FrameRate; make it available to every user.
#include "mvxmediatypes/FrameRate.h"
