#pragma once

// MF::FrameTime: the two field times of one frame, one per field slot.
//
// The pair also carries the frame's field order:
//   first slot earlier than the second  -> kFieldType_UpperFirst (1)
//   first slot later than the second    -> kFieldType_LowerFirst (2)
//   both equal                          -> kFieldType_Progressive (0)
// The frame's own time is the earlier of the two field times.
//
// A value type (two TickTimes); safe to copy between threads. Render
// parameters begin with their frame time, so they can be passed wherever a
// FrameTime is asked for.

#include "mvxcore/debug/Contract.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/TickTime.h"

#include <algorithm>
#include <cstdint>

namespace MF
{

class FrameTime
{
public:
    // A progressive frame at kTime_Zero.
    constexpr FrameTime() = default;

    // A progressive frame at inTime.
    constexpr explicit FrameTime(mvxmediatypes::TickTime inTime)
        : mFirstFieldTime(inTime)
        , mSecondFieldTime(inTime)
    {
    }

    // A frame with the given field times; their order gives the field order.
    constexpr FrameTime(mvxmediatypes::TickTime inFirstFieldTime,
                        mvxmediatypes::TickTime inSecondFieldTime)
        : mFirstFieldTime(inFirstFieldTime)
        , mSecondFieldTime(inSecondFieldTime)
    {
    }

    // The frame at inTime in field order inOrder whose fields are
    // inFieldDuration apart: (t, t + d) for order 1, (t + d, t) for order 2,
    // (t, t) for a progressive frame. Input contracts: inOrder is 0, 1 or 2;
    // inFieldDuration is positive for an interlaced order.
    static FrameTime Make(mvxmediatypes::TickTime inTime, mvxmediatypes::FieldType inOrder,
                          mvxmediatypes::TickTime inFieldDuration)
    {
        MVX_INPUT_CONTRACT(inOrder == mvxmediatypes::kFieldType_Progressive ||
                           mvxmediatypes::IsInterlaced(inOrder));
        if (inOrder == mvxmediatypes::kFieldType_Progressive)
            return FrameTime(inTime);
        MVX_INPUT_CONTRACT(inFieldDuration > mvxmediatypes::kTime_Zero);
        const mvxmediatypes::TickTime later = inTime + inFieldDuration;
        return inOrder == mvxmediatypes::kFieldType_UpperFirst ? FrameTime(inTime, later)
                                                               : FrameTime(later, inTime);
    }

    constexpr mvxmediatypes::TickTime GetFirstFieldTime() const { return mFirstFieldTime; }
    constexpr mvxmediatypes::TickTime GetSecondFieldTime() const { return mSecondFieldTime; }

    // The time of field slot inField (1 or 2; input contract).
    mvxmediatypes::TickTime GetFieldTime(std::int32_t inField) const
    {
        MVX_INPUT_CONTRACT(inField == 1 || inField == 2);
        return inField == 1 ? mFirstFieldTime : mSecondFieldTime;
    }

    // The frame's time: the earlier field time.
    constexpr mvxmediatypes::TickTime GetTime() const
    {
        return std::min(mFirstFieldTime, mSecondFieldTime);
    }

    // The later field time (the frame's time for a progressive frame).
    constexpr mvxmediatypes::TickTime GetLaterTime() const
    {
        return std::max(mFirstFieldTime, mSecondFieldTime);
    }

    constexpr mvxmediatypes::FieldType GetFieldOrder() const
    {
        if (mFirstFieldTime < mSecondFieldTime)
            return mvxmediatypes::kFieldType_UpperFirst;
        if (mSecondFieldTime < mFirstFieldTime)
            return mvxmediatypes::kFieldType_LowerFirst;
        return mvxmediatypes::kFieldType_Progressive;
    }

    constexpr bool IsProgressive() const { return mFirstFieldTime == mSecondFieldTime; }
    constexpr bool IsInterlaced() const { return !IsProgressive(); }
    constexpr bool IsValid() const
    {
        return mFirstFieldTime.IsValid() && mSecondFieldTime.IsValid();
    }

    constexpr void SetFirstFieldTime(mvxmediatypes::TickTime inTime) { mFirstFieldTime = inTime; }
    constexpr void SetSecondFieldTime(mvxmediatypes::TickTime inTime) { mSecondFieldTime = inTime; }
    // Makes the frame progressive at inTime.
    constexpr void SetTime(mvxmediatypes::TickTime inTime)
    {
        mFirstFieldTime = inTime;
        mSecondFieldTime = inTime;
    }

    // The same fields with the slots exchanged (the other field order).
    constexpr FrameTime Swapped() const { return FrameTime(mSecondFieldTime, mFirstFieldTime); }

    friend constexpr bool operator==(const FrameTime&, const FrameTime&) = default;

private:
    mvxmediatypes::TickTime mFirstFieldTime;
    mvxmediatypes::TickTime mSecondFieldTime;
};

} // namespace MF
