#include "MF/TimeTransform.h"

#include "ExactArithmetic.h"
#include "QRT/Allocated.h"
#include "mvxcore/debug/Contract.h"

#include <cmath>
#include <string_view>

namespace MF
{
namespace
{

using detail::Int128;
using mvxmediatypes::kTime_Invalid;
using mvxmediatypes::kTime_Max;
using mvxmediatypes::kTime_Min;
using mvxmediatypes::TickTime;

constexpr std::string_view kHashTag = "MF::LinearTimeTransform";

// inBase + (inTime - inFrom) * inNumerator / inDenominator, rounded to the
// nearest tick, with the special times kept (see TimeTransform.h).
TickTime MapLinear(TickTime inTime, TickTime inFrom, TickTime inBase, std::int64_t inNumerator,
                   std::int64_t inDenominator)
{
    if (!inTime.IsValid())
        return kTime_Invalid;
    if (inTime == kTime_Max || inTime == kTime_Min)
    {
        const bool forward = inNumerator > 0;
        return (inTime == kTime_Max) == forward ? kTime_Max : kTime_Min;
    }
    const Int128 delta = Int128{inTime.GetTicks()} - inFrom.GetTicks();
    const Int128 scaled = detail::RoundDivide(delta * inNumerator, inDenominator);
    return detail::SaturateToTime(scaled + inBase.GetTicks());
}

// media = start + (t - origin) * numerator / denominator.
class LinearTimeTransform : public QRT::Implements<ITimeTransform>
{
public:
    LinearTimeTransform(SpeedRatio inSpeed, TickTime inOrigin, TickTime inStart)
        : mSpeed(inSpeed)
        , mOrigin(inOrigin)
        , mStart(inStart)
    {
    }

    TickTime Transform(TickTime inTime) const override
    {
        return MapLinear(inTime, mOrigin, mStart, mSpeed.mNumerator, mSpeed.mDenominator);
    }

    TickTime InverseTransform(TickTime inTime) const override
    {
        // The inverse fraction needs a positive denominator too.
        const std::int64_t sign = mSpeed.mNumerator < 0 ? -1 : 1;
        return MapLinear(inTime, mStart, mOrigin, sign * mSpeed.mDenominator,
                         sign * mSpeed.mNumerator);
    }

    double GetSpeed() const override
    {
        return static_cast<double>(mSpeed.mNumerator) / static_cast<double>(mSpeed.mDenominator);
    }

    void MixIntoHash(QRT::HashValue& ioHash) const override
    {
        QRT::MixHash::MixInString(ioHash, kHashTag);
        QRT::MixHash::MixInValue(ioHash, mSpeed.mNumerator);
        QRT::MixHash::MixInValue(ioHash, mSpeed.mDenominator);
        QRT::MixHash::MixInValue(ioHash, mOrigin.GetTicks());
        QRT::MixHash::MixInValue(ioHash, mStart.GetTicks());
    }

private:
    const SpeedRatio mSpeed;
    const TickTime mOrigin;
    const TickTime mStart;
};

bool FitsTerm(Int128 inValue)
{
    return inValue <= kMaxSpeedRatioTerm && inValue >= -Int128{kMaxSpeedRatioTerm};
}

QRT::InterfaceRef<ITimeTransform> MakeTransform(SpeedRatio inSpeed, TickTime inOrigin,
                                                TickTime inStart)
{
    MVX_INPUT_CONTRACT(inOrigin.IsValid());
    MVX_INPUT_CONTRACT(inStart.IsValid());
    return QRT::Allocated<LinearTimeTransform>::Create<ITimeTransform>(inSpeed, inOrigin, inStart);
}

} // namespace

SpeedRatio SpeedToRatio(double inSpeed)
{
    MVX_INPUT_CONTRACT(std::isfinite(inSpeed));
    if (inSpeed == 0.0)
        return SpeedRatio{0, 1};

    const double magnitude = std::fabs(inSpeed);
    const std::int64_t sign = inSpeed < 0 ? -1 : 1;
    MVX_INPUT_CONTRACT(magnitude <= static_cast<double>(kMaxSpeedRatioTerm));

    // The double's exact value whole / 2^shift, in lowest terms.
    int exponent = 0;
    const double mantissa = std::frexp(magnitude, &exponent);
    Int128 whole = static_cast<Int128>(std::ldexp(mantissa, 53));
    int shift = 53 - exponent;
    if (shift < 0)
    {
        whole <<= -shift;
        shift = 0;
    }
    while (shift > 0 && (whole & 1) == 0)
    {
        whole >>= 1;
        --shift;
    }
    // Beyond 2^-120 the exact value does not fit the arithmetic below; no
    // such speed has a short fraction anyway.
    MVX_INPUT_CONTRACT(shift <= 120);
    const Int128 exactDenominator = Int128{1} << shift;

    // Continued-fraction convergents of the exact value give the simplest
    // fractions first; the first whose quotient is this very double is the
    // speed that was meant.
    Int128 previousNumerator = 0;
    Int128 previousDenominator = 1;
    Int128 numerator = 1;
    Int128 denominator = 0;
    Int128 top = whole;
    Int128 bottom = exactDenominator;
    while (bottom != 0)
    {
        const Int128 term = top / bottom;
        const Int128 nextNumerator = term * numerator + previousNumerator;
        const Int128 nextDenominator = term * denominator + previousDenominator;
        if (!FitsTerm(nextNumerator) || !FitsTerm(nextDenominator))
            break;
        previousNumerator = numerator;
        previousDenominator = denominator;
        numerator = nextNumerator;
        denominator = nextDenominator;
        if (static_cast<double>(numerator) / static_cast<double>(denominator) == magnitude)
            return SpeedRatio{sign * static_cast<std::int64_t>(numerator),
                              static_cast<std::int64_t>(denominator)};
        const Int128 rest = top % bottom;
        top = bottom;
        bottom = rest;
    }

    // Only the exact binary value is left; it must fit the term limit.
    MVX_INPUT_CONTRACT(FitsTerm(exactDenominator));
    return SpeedRatio{sign * static_cast<std::int64_t>(whole),
                      static_cast<std::int64_t>(exactDenominator)};
}

QRT::InterfaceRef<ITimeTransform> CreateTimeTransform(double inSpeed, TickTime inOrigin,
                                                      TickTime inStart)
{
    MVX_INPUT_CONTRACT(std::isfinite(inSpeed));
    MVX_INPUT_CONTRACT(inSpeed != 0.0);
    return MakeTransform(SpeedToRatio(inSpeed), inOrigin, inStart);
}

QRT::InterfaceRef<ITimeTransform> CreateRationalTimeTransform(std::int64_t inNumerator,
                                                              std::int64_t inDenominator,
                                                              TickTime inOrigin, TickTime inStart)
{
    MVX_INPUT_CONTRACT(inDenominator != 0);
    MVX_INPUT_CONTRACT(inNumerator != 0);
    Int128 numerator = inNumerator;
    Int128 denominator = inDenominator;
    if (denominator < 0)
    {
        numerator = -numerator;
        denominator = -denominator;
    }
    const Int128 divisor = detail::Gcd(numerator, denominator);
    numerator /= divisor;
    denominator /= divisor;
    MVX_INPUT_CONTRACT(FitsTerm(numerator) && FitsTerm(denominator));
    return MakeTransform(
        SpeedRatio{static_cast<std::int64_t>(numerator), static_cast<std::int64_t>(denominator)},
        inOrigin, inStart);
}

} // namespace MF
