#include "mvxmediatypes/FrameRate.h"

#include "mvxcore/debug/Contract.h"

#include <cmath>
#include <limits>

namespace mvxmediatypes
{

namespace
{

constexpr std::int64_t kMaxTicksPerFrame = std::numeric_limits<std::int64_t>::max();

// inValue / inDivisor rounded to nearest, halves away from zero; inValue >= 0, inDivisor > 0.
constexpr unsigned __int128 RoundedDivide(unsigned __int128 inValue, unsigned __int128 inDivisor)
{
    return (inValue + inDivisor / 2) / inDivisor;
}

} // namespace

FrameRate FrameRate::Create(std::int64_t inNumerator, std::int64_t inDenominator)
{
    MVX_INPUT_CONTRACT(inNumerator >= 0);
    MVX_INPUT_CONTRACT(inDenominator > 0);
    if (inNumerator == 0)
        return FrameRate(0);
    // Ticks per frame = ticks per second x denominator / numerator, computed wide
    // so that rates such as 30000/1001 never overflow on the way.
    const unsigned __int128 ticks =
        RoundedDivide(static_cast<unsigned __int128>(TickTime::kTicksPerSecond) *
                          static_cast<unsigned __int128>(inDenominator),
                      static_cast<unsigned __int128>(inNumerator));
    MVX_INPUT_CONTRACT(ticks >= 1);
    MVX_INPUT_CONTRACT(ticks <= static_cast<unsigned __int128>(kMaxTicksPerFrame));
    return FrameRate(static_cast<std::int64_t>(ticks));
}

FrameRate FrameRate::FromValue(double inFramesPerSecond)
{
    MVX_INPUT_CONTRACT(!std::isnan(inFramesPerSecond));
    MVX_INPUT_CONTRACT(inFramesPerSecond >= 0.0);
    if (inFramesPerSecond == 0.0)
        return FrameRate(0);
    const double ticks =
        std::round(static_cast<double>(TickTime::kTicksPerSecond) / inFramesPerSecond);
    MVX_INPUT_CONTRACT(ticks >= 1.0);
    // 2^63 is the first double past the int64 range.
    MVX_INPUT_CONTRACT(ticks < 9223372036854775808.0);
    return FrameRate(static_cast<std::int64_t>(ticks));
}

double FrameRate::GetValue() const
{
    if (mTicksPerFrame <= 0)
        return 0.0;
    return static_cast<double>(TickTime::kTicksPerSecond) / static_cast<double>(mTicksPerFrame);
}

TickTime FrameRate::FrameToTime(std::int64_t inFrame) const
{
    return TickTime::FromFrame(inFrame, *this);
}

FrameRate FrameRate::operator*(std::int64_t inFactor) const
{
    MVX_INPUT_CONTRACT(inFactor >= 1);
    return FrameRate(static_cast<std::int64_t>(RoundedDivide(
        static_cast<unsigned __int128>(mTicksPerFrame), static_cast<unsigned __int128>(inFactor))));
}

FrameRate FrameRate::operator/(std::int64_t inDivisor) const
{
    MVX_INPUT_CONTRACT(inDivisor >= 1);
    std::int64_t ticks = 0;
    const bool overflow = __builtin_mul_overflow(mTicksPerFrame, inDivisor, &ticks);
    MVX_INPUT_CONTRACT(!overflow);
    return FrameRate(ticks);
}

} // namespace mvxmediatypes
