#pragma once

// Saturating and floor arithmetic on tick counts shared by the time, frame
// rate and pulldown code. Results are clamped to [kTime_Min, kTime_Max]
// (INT64_MIN is kept for kTime_Invalid and never produced here).

#include <cstdint>
#include <limits>

namespace mvxmediatypes::detail
{

inline constexpr std::int64_t kMaxTicks = std::numeric_limits<std::int64_t>::max();
inline constexpr std::int64_t kMinTicks = -kMaxTicks;

constexpr std::int64_t Clamp(std::int64_t inValue)
{
    return inValue < kMinTicks ? kMinTicks : inValue;
}

constexpr std::int64_t SaturatingAdd(std::int64_t inLeft, std::int64_t inRight)
{
    std::int64_t result = 0;
    if (__builtin_add_overflow(inLeft, inRight, &result))
        return inRight > 0 ? kMaxTicks : kMinTicks;
    return Clamp(result);
}

constexpr std::int64_t SaturatingSubtract(std::int64_t inLeft, std::int64_t inRight)
{
    std::int64_t result = 0;
    if (__builtin_sub_overflow(inLeft, inRight, &result))
        return inRight < 0 ? kMaxTicks : kMinTicks;
    return Clamp(result);
}

constexpr std::int64_t SaturatingMultiply(std::int64_t inLeft, std::int64_t inRight)
{
    std::int64_t result = 0;
    if (__builtin_mul_overflow(inLeft, inRight, &result))
        return ((inLeft < 0) != (inRight < 0)) ? kMinTicks : kMaxTicks;
    return Clamp(result);
}

// Floor division and the matching non-negative remainder; inDivisor > 0.
constexpr std::int64_t FloorDivide(std::int64_t inValue, std::int64_t inDivisor)
{
    const std::int64_t quotient = inValue / inDivisor;
    return (inValue % inDivisor < 0) ? quotient - 1 : quotient;
}

constexpr std::int64_t FloorModulo(std::int64_t inValue, std::int64_t inDivisor)
{
    const std::int64_t remainder = inValue % inDivisor;
    return remainder < 0 ? remainder + inDivisor : remainder;
}

} // namespace mvxmediatypes::detail
