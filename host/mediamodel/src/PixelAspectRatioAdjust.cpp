#include "MF/PixelAspectRatioAdjust.h"

#include "ExactArithmetic.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <limits>

namespace MF
{
namespace
{

using detail::Int128;
using mvxmediatypes::PixelAspectRatio;

constexpr Int128 kMaxTerm = std::numeric_limits<std::uint32_t>::max();

// The best approximation of inNumerator / inDenominator (both positive, in
// lowest terms) with both terms within 32 bits: the closer of the last
// fitting convergent and the best semiconvergent after it.
PixelAspectRatio NearestFittingRatio(Int128 inNumerator, Int128 inDenominator)
{
    Int128 previousNumerator = 0;
    Int128 previousDenominator = 1;
    Int128 numerator = 1;
    Int128 denominator = 0;
    Int128 top = inNumerator;
    Int128 bottom = inDenominator;
    while (bottom != 0)
    {
        const Int128 term = top / bottom;
        const Int128 nextNumerator = term * numerator + previousNumerator;
        const Int128 nextDenominator = term * denominator + previousDenominator;
        if (nextNumerator > kMaxTerm || nextDenominator > kMaxTerm)
        {
            // The largest partial step that still fits.
            Int128 step = term;
            if (numerator != 0)
                step = std::min(step, (kMaxTerm - previousNumerator) / numerator);
            if (denominator != 0)
                step = std::min(step, (kMaxTerm - previousDenominator) / denominator);
            const Int128 semiNumerator = step * numerator + previousNumerator;
            const Int128 semiDenominator = step * denominator + previousDenominator;
            // Compare |semi - x| with |convergent - x| by cross-multiplying.
            auto distance = [&](Int128 inP, Int128 inQ)
            {
                const Int128 difference = inP * inDenominator - inNumerator * inQ;
                return (difference < 0 ? -difference : difference);
            };
            const bool semiFits = semiNumerator > 0 && semiDenominator > 0;
            if (semiFits && distance(semiNumerator, semiDenominator) * denominator <
                                distance(numerator, denominator) * semiDenominator)
                return PixelAspectRatio(static_cast<std::uint32_t>(semiNumerator),
                                        static_cast<std::uint32_t>(semiDenominator));
            break;
        }
        previousNumerator = numerator;
        previousDenominator = denominator;
        numerator = nextNumerator;
        denominator = nextDenominator;
        const Int128 rest = top % bottom;
        top = bottom;
        bottom = rest;
    }
    // A ratio below 1 / 2^32 has no fitting convergent with a denominator:
    // the smallest representable ratio is the nearest.
    if (denominator == 0 || numerator == 0)
        return numerator == 0 ? PixelAspectRatio(1, static_cast<std::uint32_t>(kMaxTerm))
                              : PixelAspectRatio(static_cast<std::uint32_t>(kMaxTerm), 1);
    return PixelAspectRatio(static_cast<std::uint32_t>(numerator),
                            static_cast<std::uint32_t>(denominator));
}

} // namespace

PixelAspectRatio AdjustPixelAspectRatioForNonUniformDownsample(
    const PixelAspectRatio& inPixelAspectRatio, std::int32_t inRequestedWidth,
    std::int32_t inRequestedHeight, std::int32_t inFrameWidth, std::int32_t inFrameHeight)
{
    MVX_INPUT_CONTRACT(inPixelAspectRatio.IsValid() || inPixelAspectRatio.IsAny());
    MVX_INPUT_CONTRACT(inRequestedWidth > 0 && inRequestedHeight > 0);
    MVX_INPUT_CONTRACT(inFrameWidth > 0 && inFrameHeight > 0);
    if (inPixelAspectRatio.IsAny())
        return inPixelAspectRatio;

    // 32-bit term times two 31-bit sizes: at most 94 bits.
    Int128 numerator = Int128{inPixelAspectRatio.GetNumerator()} * inRequestedWidth * inFrameHeight;
    Int128 denominator =
        Int128{inPixelAspectRatio.GetDenominator()} * inFrameWidth * inRequestedHeight;
    const Int128 divisor = detail::Gcd(numerator, denominator);
    numerator /= divisor;
    denominator /= divisor;
    if (numerator <= kMaxTerm && denominator <= kMaxTerm)
        return PixelAspectRatio(static_cast<std::uint32_t>(numerator),
                                static_cast<std::uint32_t>(denominator));
    return NearestFittingRatio(numerator, denominator);
}

} // namespace MF
