#pragma once

// Integer helpers shared by the media model's time and ratio arithmetic.
// Products of a tick count (up to 2^64 apart) and a speed term (up to 2^53)
// fit 128-bit integers with room to spare, so no step here can overflow for
// the inputs its callers admit.

#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace MF::detail
{

using Int128 = __int128;

// Floor of inNumerator / inDenominator; inDenominator > 0.
inline Int128 FloorDivide(Int128 inNumerator, Int128 inDenominator)
{
    Int128 quotient = inNumerator / inDenominator;
    if (inNumerator % inDenominator != 0 && inNumerator < 0)
        --quotient;
    return quotient;
}

// inNumerator / inDenominator rounded to the nearest integer, halves upward;
// inDenominator > 0.
inline Int128 RoundDivide(Int128 inNumerator, Int128 inDenominator)
{
    return FloorDivide(2 * inNumerator + inDenominator, 2 * inDenominator);
}

// A tick count clamped into [kTime_Min, kTime_Max].
inline mvxmediatypes::TickTime SaturateToTime(Int128 inTicks)
{
    const Int128 maxTicks = mvxmediatypes::kTime_Max.GetTicks();
    const Int128 minTicks = mvxmediatypes::kTime_Min.GetTicks();
    if (inTicks > maxTicks)
        return mvxmediatypes::kTime_Max;
    if (inTicks < minTicks)
        return mvxmediatypes::kTime_Min;
    return mvxmediatypes::TickTime::TicksToTime(static_cast<std::int64_t>(inTicks));
}

inline Int128 Gcd(Int128 inA, Int128 inB)
{
    if (inA < 0)
        inA = -inA;
    if (inB < 0)
        inB = -inB;
    while (inB != 0)
    {
        const Int128 rest = inA % inB;
        inA = inB;
        inB = rest;
    }
    return inA;
}

} // namespace MF::detail
