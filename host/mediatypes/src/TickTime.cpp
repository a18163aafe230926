#include "mvxmediatypes/TickTime.h"

#include "TimeArithmetic.h"
#include "mvxcore/debug/Contract.h"

#include <cmath>
#include <limits>

namespace mvxmediatypes
{

using namespace detail;

TickTime TickTime::FromFrame(std::int64_t inFrame, const FrameRate& inRate)
{
    MVX_INPUT_CONTRACT(inRate.GetTicksPerFrame() > 0);
    return TickTime(SaturatingMultiply(inFrame, inRate.GetTicksPerFrame()));
}

TickTime TickTime::FromSeconds(double inSeconds)
{
    if (std::isnan(inSeconds))
        return kTime_Invalid;
    const double ticks = std::round(inSeconds * static_cast<double>(kTicksPerSecond));
    // 2^63 is the first double beyond the int64 range; anything at or past it saturates.
    constexpr double kLimit = 9223372036854775808.0;
    if (ticks >= kLimit)
        return kTime_Max;
    if (ticks <= -kLimit)
        return kTime_Min;
    return TickTime(Clamp(static_cast<std::int64_t>(ticks)));
}

double TickTime::ToSeconds() const
{
    if (!IsValid())
        return std::numeric_limits<double>::quiet_NaN();
    // Whole seconds and the remainder separately keep full precision for large times.
    const std::int64_t seconds = mTicks / kTicksPerSecond;
    const std::int64_t rest = mTicks % kTicksPerSecond;
    return static_cast<double>(seconds) +
           static_cast<double>(rest) / static_cast<double>(kTicksPerSecond);
}

std::int64_t TickTime::ToFrame64(const FrameRate& inRate) const
{
    MVX_INPUT_CONTRACT(IsValid());
    MVX_INPUT_CONTRACT(inRate.GetTicksPerFrame() > 0);
    return FloorDivide(mTicks, inRate.GetTicksPerFrame());
}

std::int32_t TickTime::ToFrame32(const FrameRate& inRate) const
{
    const std::int64_t frame = ToFrame64(inRate);
    if (frame > std::numeric_limits<std::int32_t>::max())
        return std::numeric_limits<std::int32_t>::max();
    if (frame < std::numeric_limits<std::int32_t>::min())
        return std::numeric_limits<std::int32_t>::min();
    return static_cast<std::int32_t>(frame);
}

TickTime TickTime::AlignToFrame(const FrameRate& inRate) const
{
    MVX_INPUT_CONTRACT(IsValid());
    MVX_INPUT_CONTRACT(inRate.GetTicksPerFrame() > 0);
    const std::int64_t remainder = FloorModulo(mTicks, inRate.GetTicksPerFrame());
    return TickTime(SaturatingSubtract(mTicks, remainder));
}

TickTime TickTime::AlignToFrameCeil(const FrameRate& inRate) const
{
    MVX_INPUT_CONTRACT(IsValid());
    MVX_INPUT_CONTRACT(inRate.GetTicksPerFrame() > 0);
    const std::int64_t remainder = FloorModulo(mTicks, inRate.GetTicksPerFrame());
    if (remainder == 0)
        return *this;
    return TickTime(SaturatingAdd(mTicks, inRate.GetTicksPerFrame() - remainder));
}

TickTime TickTime::AddFrames(std::int64_t inFrames, const FrameRate& inRate) const
{
    MVX_INPUT_CONTRACT(inRate.GetTicksPerFrame() > 0);
    if (!IsValid())
        return kTime_Invalid;
    return TickTime(SaturatingAdd(mTicks, SaturatingMultiply(inFrames, inRate.GetTicksPerFrame())));
}

TickTime TickTime::operator-() const
{
    if (!IsValid())
        return kTime_Invalid;
    // kTime_Min is -kTime_Max, so negation never overflows.
    return TickTime(-mTicks);
}

TickTime& TickTime::operator+=(const TickTime& inOther)
{
    if (!IsValid() || !inOther.IsValid())
        mTicks = kInvalidTicks;
    else
        mTicks = SaturatingAdd(mTicks, inOther.mTicks);
    return *this;
}

TickTime& TickTime::operator-=(const TickTime& inOther)
{
    if (!IsValid() || !inOther.IsValid())
        mTicks = kInvalidTicks;
    else
        mTicks = SaturatingSubtract(mTicks, inOther.mTicks);
    return *this;
}

TickTime& TickTime::operator*=(std::int64_t inFactor)
{
    if (IsValid())
        mTicks = SaturatingMultiply(mTicks, inFactor);
    return *this;
}

TickTime& TickTime::operator/=(std::int64_t inDivisor)
{
    MVX_INPUT_CONTRACT(inDivisor != 0);
    // Valid times lie in [-INT64_MAX, INT64_MAX], so dividing by -1 cannot overflow.
    if (IsValid())
        mTicks /= inDivisor;
    return *this;
}

} // namespace mvxmediatypes
