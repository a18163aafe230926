#include "mvxmediatypes/PixelAspectRatio.h"

#include <numeric>

namespace mvxmediatypes
{

double PixelAspectRatio::ToDouble() const
{
    if (mDenominator == 0)
        return 0.0;
    return static_cast<double>(mNumerator) / static_cast<double>(mDenominator);
}

PixelAspectRatio PixelAspectRatio::Reduced() const
{
    if (!IsValid())
        return *this;
    const std::uint32_t divisor = std::gcd(mNumerator, mDenominator);
    return PixelAspectRatio(mNumerator / divisor, mDenominator / divisor);
}

} // namespace mvxmediatypes
