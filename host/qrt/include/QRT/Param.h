#pragma once

// Small parameter values shared by the host's libraries.
//
// QRT::ParamRect: a rectangle of signed 32-bit edges; right and bottom are
// exclusive, so Width() = right - left and Height() = bottom - top. An
// inverted rectangle has a negative width or height; differences that do not
// fit 32 bits wrap instead of being undefined.
//
// QRT::ParamColor: a colour packed in an unsigned 32-bit value as
// 0xAABBGGRR, so that in memory (little-endian) byte 0 is red, byte 1 green,
// byte 2 blue and byte 3 alpha. Reading the first three bytes as one 24-bit
// colour with byte 0 most significant (GetRGB24) gives 0xRRGGBB.

#include <cstdint>

namespace QRT
{

struct ParamRect
{
    int32_t mLeft = 0;
    int32_t mTop = 0;
    int32_t mRight = 0;
    int32_t mBottom = 0;

    constexpr ParamRect() = default;
    constexpr ParamRect(int32_t inLeft, int32_t inTop, int32_t inRight, int32_t inBottom)
        : mLeft(inLeft)
        , mTop(inTop)
        , mRight(inRight)
        , mBottom(inBottom)
    {
    }

    constexpr int32_t Width() const noexcept { return Difference(mRight, mLeft); }
    constexpr int32_t Height() const noexcept { return Difference(mBottom, mTop); }
    // True when the rectangle covers no pixel.
    constexpr bool IsEmpty() const noexcept { return mRight <= mLeft || mBottom <= mTop; }

    friend constexpr bool operator==(const ParamRect&, const ParamRect&) = default;

private:
    static constexpr int32_t Difference(int32_t inHigh, int32_t inLow) noexcept
    {
        return static_cast<int32_t>(static_cast<uint32_t>(inHigh) - static_cast<uint32_t>(inLow));
    }
};

struct ParamColor
{
    uint32_t mValue = 0;

    constexpr ParamColor() = default;
    constexpr explicit ParamColor(uint32_t inValue)
        : mValue(inValue)
    {
    }

    static constexpr ParamColor FromRGBA(uint8_t inRed, uint8_t inGreen, uint8_t inBlue,
                                         uint8_t inAlpha = 0xFF) noexcept
    {
        return ParamColor(static_cast<uint32_t>(inRed) | (static_cast<uint32_t>(inGreen) << 8) |
                          (static_cast<uint32_t>(inBlue) << 16) |
                          (static_cast<uint32_t>(inAlpha) << 24));
    }

    constexpr uint8_t Red() const noexcept { return static_cast<uint8_t>(mValue); }
    constexpr uint8_t Green() const noexcept { return static_cast<uint8_t>(mValue >> 8); }
    constexpr uint8_t Blue() const noexcept { return static_cast<uint8_t>(mValue >> 16); }
    constexpr uint8_t Alpha() const noexcept { return static_cast<uint8_t>(mValue >> 24); }
    // 0xRRGGBB: bytes 0..2 with byte 0 most significant.
    constexpr uint32_t GetRGB24() const noexcept
    {
        return (static_cast<uint32_t>(Red()) << 16) | (static_cast<uint32_t>(Green()) << 8) |
               Blue();
    }
    constexpr uint32_t GetValue() const noexcept { return mValue; }

    friend constexpr bool operator==(const ParamColor&, const ParamColor&) = default;
};

} // namespace QRT
