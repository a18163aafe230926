#pragma once

// PixelAspectRatio: the shape of one pixel as width : height, two unsigned
// 32-bit integers stored as given (numerator first; hashed as those 8 bytes).
//
// kPixelAspectRatio_Any is 0:0 and means "any ratio will do" (a request that
// does not care). A ratio is valid when both terms are positive.
//
// Equality compares values, not spellings: 20:22 == 10:11 (cross products
// are compared in 64 bits). A ratio with a zero term (Any included) equals
// only the same two terms, so Any equals Any and nothing else. Use Reduced()
// for a canonical spelling.
//
// Value type, trivially copyable; safe to use from any thread.

#include <cstdint>

namespace mvxmediatypes
{

class PixelAspectRatio
{
public:
    // kPixelAspectRatio_Square.
    constexpr PixelAspectRatio() = default;
    constexpr PixelAspectRatio(std::uint32_t inNumerator, std::uint32_t inDenominator)
        : mNumerator(inNumerator)
        , mDenominator(inDenominator)
    {
    }

    constexpr std::uint32_t GetNumerator() const { return mNumerator; }
    constexpr std::uint32_t GetDenominator() const { return mDenominator; }

    constexpr bool IsValid() const { return mNumerator != 0 && mDenominator != 0; }
    constexpr bool IsAny() const { return mNumerator == 0 && mDenominator == 0; }

    // Numerator / denominator; 0.0 when the denominator is 0 (Any included).
    double ToDouble() const;
    // The same ratio in lowest terms (10:11 for 20:22); a ratio with a zero
    // term is answered unchanged.
    PixelAspectRatio Reduced() const;

    friend constexpr bool operator==(const PixelAspectRatio& inLeft,
                                     const PixelAspectRatio& inRight)
    {
        if (!inLeft.IsValid() || !inRight.IsValid())
            return inLeft.mNumerator == inRight.mNumerator &&
                   inLeft.mDenominator == inRight.mDenominator;
        return std::uint64_t{inLeft.mNumerator} * inRight.mDenominator ==
               std::uint64_t{inRight.mNumerator} * inLeft.mDenominator;
    }

private:
    std::uint32_t mNumerator = 1;
    std::uint32_t mDenominator = 1;
};

inline constexpr PixelAspectRatio kPixelAspectRatio_Square{1, 1};
inline constexpr PixelAspectRatio kPixelAspectRatio_Any{0, 0};
// Standard-definition 525-line (NTSC) frames, 4:3 and 16:9.
inline constexpr PixelAspectRatio kPixelAspectRatio_D1NTSC{10, 11};
inline constexpr PixelAspectRatio kPixelAspectRatio_D1NTSCWide{40, 33};
// Standard-definition 625-line (PAL) frames, 4:3 and 16:9.
inline constexpr PixelAspectRatio kPixelAspectRatio_D1PAL{59, 54};
inline constexpr PixelAspectRatio kPixelAspectRatio_D1PALWide{118, 81};
// 2:1 anamorphic lenses.
inline constexpr PixelAspectRatio kPixelAspectRatio_Anamorphic{2, 1};
// 1440-wide high-definition frames shown 1920 wide.
inline constexpr PixelAspectRatio kPixelAspectRatio_HD1440{4, 3};
// 1280-wide high-definition frames shown 1920 wide.
inline constexpr PixelAspectRatio kPixelAspectRatio_HD1280{3, 2};

} // namespace mvxmediatypes
