#include "Blend.h"

#include "IR/ImageRenderer.h"

#include <algorithm>
#include <cmath>

namespace IR
{

namespace
{

// Every mode in premultiplied form: with s, d the premultiplied colours and sa, da
// the alphas, the term as * ab * B(cb, cs) of the compositing rule is written without
// division (for example multiply: s * d).
template <std::uint32_t kMode>
inline float BlendTerm(float s, float sa, float d, float da)
{
    if constexpr (kMode == kIR_BlendMode_Multiply)
        return s * d;
    else if constexpr (kMode == kIR_BlendMode_Screen)
        return s * da + d * sa - s * d;
    else if constexpr (kMode == kIR_BlendMode_Darken)
        return std::min(s * da, d * sa);
    else if constexpr (kMode == kIR_BlendMode_Lighten)
        return std::max(s * da, d * sa);
    else if constexpr (kMode == kIR_BlendMode_Add)
        return std::min(sa * da, s * da + d * sa);
    else if constexpr (kMode == kIR_BlendMode_Subtract)
        return std::max(0.0f, d * sa - s * da);
    else if constexpr (kMode == kIR_BlendMode_Difference)
        return std::fabs(d * sa - s * da);
    else if constexpr (kMode == kIR_BlendMode_Overlay)
        return 2.0f * d <= da ? 2.0f * s * d : sa * da - 2.0f * (da - d) * (sa - s);
    else
        return s * da;
}

template <std::uint32_t kMode>
void BlendRow(const float* inSrc, float* ioDst, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        const float* s = inSrc + 4 * i;
        float* d = ioDst + 4 * i;
        const float sa = s[3];
        const float da = d[3];
        for (int c = 0; c < 3; ++c)
            d[c] = s[c] * (1.0f - da) + d[c] * (1.0f - sa) + BlendTerm<kMode>(s[c], sa, d[c], da);
        d[3] = sa + da - sa * da;
    }
}

} // namespace

void BlendRowF(std::uint32_t inMode, const float* inSrc, float* ioDst, std::int32_t inCount)
{
    switch (inMode)
    {
    case kIR_BlendMode_Multiply:
        return BlendRow<kIR_BlendMode_Multiply>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Screen:
        return BlendRow<kIR_BlendMode_Screen>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Darken:
        return BlendRow<kIR_BlendMode_Darken>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Lighten:
        return BlendRow<kIR_BlendMode_Lighten>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Add:
        return BlendRow<kIR_BlendMode_Add>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Subtract:
        return BlendRow<kIR_BlendMode_Subtract>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Difference:
        return BlendRow<kIR_BlendMode_Difference>(inSrc, ioDst, inCount);
    case kIR_BlendMode_Overlay:
        return BlendRow<kIR_BlendMode_Overlay>(inSrc, ioDst, inCount);
    default:
        return BlendRow<kIR_BlendMode_Normal>(inSrc, ioDst, inCount);
    }
}

} // namespace IR
