#pragma once

// Video-range Y'CbCr <-> R'G'B' for BT.601 and BT.709 (8-bit codes; R'G'B' as
// gamma-encoded floats 0..1). Y' = Kr R' + Kg G' + Kb B', Cb = (B' - Y') / (2 (1 - Kb)),
// Cr = (R' - Y') / (2 (1 - Kr)); Y code = 16 + 219 Y', chroma code = 128 + 224 C.

#include <algorithm>
#include <cmath>

namespace IR
{

struct YUVCoefficients
{
    float kr, kg, kb;
    // Inverse: R = y + crR * cr; G = y - cbG * cb - crG * cr; B = y + cbB * cb.
    float crR, cbG, crG, cbB;
};

inline constexpr YUVCoefficients MakeYUVCoefficients(float inKr, float inKb)
{
    const float kg = 1.0f - inKr - inKb;
    return {inKr,
            kg,
            inKb,
            2.0f * (1.0f - inKr),
            2.0f * inKb * (1.0f - inKb) / kg,
            2.0f * inKr * (1.0f - inKr) / kg,
            2.0f * (1.0f - inKb)};
}

inline constexpr YUVCoefficients kBT601 = MakeYUVCoefficients(0.299f, 0.114f);
inline constexpr YUVCoefficients kBT709 = MakeYUVCoefficients(0.2126f, 0.0722f);

inline const YUVCoefficients& YUVCoefficientsFor(bool inMatrix601)
{
    return inMatrix601 ? kBT601 : kBT709;
}

inline void YUVToRGB(const YUVCoefficients& inK, int inY, int inU, int inV, float& outR,
                     float& outG, float& outB)
{
    const float y = (inY - 16) * (1.0f / 219.0f);
    const float cb = (inU - 128) * (1.0f / 224.0f);
    const float cr = (inV - 128) * (1.0f / 224.0f);
    outR = std::clamp(y + inK.crR * cr, 0.0f, 1.0f);
    outG = std::clamp(y - inK.cbG * cb - inK.crG * cr, 0.0f, 1.0f);
    outB = std::clamp(y + inK.cbB * cb, 0.0f, 1.0f);
}

inline void RGBToYUV(const YUVCoefficients& inK, float inR, float inG, float inB, int& outY,
                     int& outU, int& outV)
{
    const float r = std::clamp(inR, 0.0f, 1.0f);
    const float g = std::clamp(inG, 0.0f, 1.0f);
    const float b = std::clamp(inB, 0.0f, 1.0f);
    const float y = inK.kr * r + inK.kg * g + inK.kb * b;
    const float cb = (b - y) / inK.cbB;
    const float cr = (r - y) / inK.crR;
    outY = std::clamp(static_cast<int>(std::lround(16.0f + 219.0f * y)), 0, 255);
    outU = std::clamp(static_cast<int>(std::lround(128.0f + 224.0f * cb)), 0, 255);
    outV = std::clamp(static_cast<int>(std::lround(128.0f + 224.0f * cr)), 0, 255);
}

} // namespace IR
