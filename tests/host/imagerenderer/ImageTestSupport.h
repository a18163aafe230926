#pragma once

// Pixel buffers and comparisons shared by the image renderer's tests.

#include "IR/ImageRenderer.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <random>
#include <vector>

namespace irtest
{

using Pixel = std::array<std::uint8_t, 4>;
using PixelF = std::array<float, 4>;

inline constexpr IR_PixelFormat kBGRA8 = kIR_PixelFormat_BGRA_8u;
inline constexpr IR_PixelFormat kBGRP8 = kIR_PixelFormat_BGRP_8u;
inline constexpr IR_PixelFormat kBGRA32f = kIR_PixelFormat_BGRA_32f;
inline constexpr IR_PixelFormat kBGRP32f = kIR_PixelFormat_BGRP_32f;

// A pixel buffer whose first byte sits at a chosen misalignment inside its storage,
// with kPadding bytes after every row so that row padding is exercised.
class Image
{
public:
    static constexpr std::int32_t kPadding = 8;

    Image(IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
          std::int32_t inMisalign = 0)
        : mFormat(inFormat)
        , mWidth(inWidth)
        , mHeight(inHeight)
        , mRowBytes(static_cast<std::int32_t>(IR_MinimumRowBytes(inFormat, inWidth)) + kPadding)
        // Float buffers must be 4-byte aligned; they are still misaligned for vectors.
        , mMisalign(IsFloat() ? 4 * inMisalign : inMisalign)
        , mStorage(static_cast<std::size_t>(mRowBytes) * (inHeight + 2) + 64 + mMisalign, 0)
    {
    }

    bool IsFloat() const { return (mFormat & kIR_FormatBit_Float) != 0; }
    std::uint8_t* Data() { return mStorage.data() + mMisalign; }
    const std::uint8_t* Data() const { return mStorage.data() + mMisalign; }
    std::int32_t RowBytes() const { return mRowBytes; }
    std::int32_t Width() const { return mWidth; }
    std::int32_t Height() const { return mHeight; }
    IR_PixelFormat Format() const { return mFormat; }
    std::uint8_t* Row(std::int32_t inY) { return Data() + std::ptrdiff_t{inY} * mRowBytes; }
    const std::uint8_t* Row(std::int32_t inY) const
    {
        return Data() + std::ptrdiff_t{inY} * mRowBytes;
    }

    Pixel Get(std::int32_t inX, std::int32_t inY) const { return Read<Pixel>(inX, inY); }
    void Set(std::int32_t inX, std::int32_t inY, Pixel inP) { Write(inX, inY, inP); }
    PixelF GetF(std::int32_t inX, std::int32_t inY) const { return Read<PixelF>(inX, inY); }
    void SetF(std::int32_t inX, std::int32_t inY, PixelF inP) { Write(inX, inY, inP); }
    void Fill(Pixel inP)
    {
        for (std::int32_t y = 0; y < mHeight; ++y)
            for (std::int32_t x = 0; x < mWidth; ++x)
                Set(x, y, inP);
    }

    // Random pixels; premultiplied formats get colour <= alpha, a quarter are opaque.
    void Randomise(std::mt19937& ioRandom)
    {
        std::uniform_int_distribution<int> byte(0, 255);
        std::uniform_real_distribution<float> unit(0.0f, 1.0f);
        const bool premultiplied = (mFormat & kIR_FormatBit_PremultipliedAlpha) != 0;
        for (std::int32_t y = 0; y < mHeight; ++y)
            for (std::int32_t x = 0; x < mWidth; ++x)
            {
                if (IsFloat())
                {
                    const float a = unit(ioRandom), k = premultiplied ? a : 1.0f;
                    SetF(x, y, {unit(ioRandom) * k, unit(ioRandom) * k, unit(ioRandom) * k, a});
                    continue;
                }
                const int a = byte(ioRandom) < 64 ? 255 : byte(ioRandom);
                auto c = [&] {
                    return static_cast<std::uint8_t>(premultiplied ? byte(ioRandom) * a / 255
                                                                   : byte(ioRandom));
                };
                Set(x, y, {c(), c(), c(), static_cast<std::uint8_t>(a)});
            }
    }

private:
    template <typename P>
    P Read(std::int32_t inX, std::int32_t inY) const
    {
        P p;
        std::memcpy(p.data(), Row(inY) + sizeof(P) * inX, sizeof(P));
        return p;
    }
    template <typename P>
    void Write(std::int32_t inX, std::int32_t inY, const P& inP)
    {
        std::memcpy(Row(inY) + sizeof(P) * inX, inP.data(), sizeof(P));
    }

    IR_PixelFormat mFormat;
    std::int32_t mWidth;
    std::int32_t mHeight;
    std::int32_t mRowBytes;
    std::int32_t mMisalign;
    std::vector<std::uint8_t> mStorage;
};

// A 1 x 1 image holding one pixel.
inline Image One(IR_PixelFormat inFormat, Pixel inP)
{
    Image image(inFormat, 1, 1);
    image.Set(0, 0, inP);
    return image;
}
inline Image OneF(IR_PixelFormat inFormat, PixelF inP)
{
    Image image(inFormat, 1, 1);
    image.SetF(0, 0, inP);
    return image;
}

// Largest difference between two images' components (padding ignored), in code values
// for 8-bit images and in component values for float ones.
inline double MaxDifference(const Image& inA, const Image& inB)
{
    double worst = 0.0;
    for (std::int32_t y = 0; y < inA.Height(); ++y)
        for (std::int32_t x = 0; x < inA.Width(); ++x)
            for (int c = 0; c < 4; ++c)
                worst = std::max(
                    worst, inA.IsFloat() ? std::fabs(double{inA.GetF(x, y)[c]} - inB.GetF(x, y)[c])
                                         : std::abs(inA.Get(x, y)[c] - inB.Get(x, y)[c]));
    return worst;
}

// The largest difference of an 8-bit motion result from the reference; straight colour is
// weighed by alpha, since un-premultiplying magnifies the error of small alphas.
inline int MotionDifference(const Image& inGot, const Image& inExpected, bool inStraight)
{
    int worst = 0;
    for (std::int32_t y = 0; y < inGot.Height(); ++y)
        for (std::int32_t x = 0; x < inGot.Width(); ++x)
        {
            const Pixel a = inGot.Get(x, y), b = inExpected.Get(x, y);
            const int alpha = std::max<int>(b[3], 1);
            for (int c = 0; c < 4; ++c)
            {
                const int diff = std::abs(a[c] - b[c]);
                worst =
                    std::max(worst, c < 3 && inStraight && alpha < 255 ? diff * alpha / 255 : diff);
            }
        }
    return worst;
}

inline Image Copy(const Image& inImage, std::int32_t inMisalign)
{
    Image out(inImage.Format(), inImage.Width(), inImage.Height(), inMisalign);
    const auto bytes =
        static_cast<std::size_t>(IR_MinimumRowBytes(inImage.Format(), inImage.Width()));
    for (std::int32_t y = 0; y < inImage.Height(); ++y)
        std::memcpy(out.Row(y), inImage.Row(y), bytes);
    return out;
}

// Whole-image calls: the source over the destination, and a conversion of the source's size.
inline std::int32_t Composite(const Image& inSrc, Image& ioDst, float inOpacity = 1.0f,
                              std::int32_t inQuality = 4)
{
    return IR_Composite(inSrc.Data(), inSrc.RowBytes(), ioDst.Data(), ioDst.RowBytes(),
                        inSrc.Format(), inSrc.Width(), inSrc.Height(), inOpacity, inQuality);
}
inline std::int32_t Convert(const Image& inSrc, Image& outDst, std::int32_t inQuality = 4)
{
    return IR_Convert(inSrc.Data(), inSrc.RowBytes(), inSrc.Format(), outDst.Data(),
                      outDst.RowBytes(), outDst.Format(), inSrc.Width(), inSrc.Height(), inQuality);
}

// Normal-mode motion of a whole image onto another.
inline std::int32_t Draw(const Image& inSrc, Image& ioDst, const IR_AffineMatrix& inMatrix,
                         std::int32_t inQuality, std::int32_t inField = kIR_Field_All,
                         bool inLower = false, float inOpacity = 1.0f)
{
    return IR_Motion(inSrc.Data(), inSrc.RowBytes(), inSrc.Format(), inSrc.Width(), inSrc.Height(),
                     ioDst.Data(), ioDst.RowBytes(), ioDst.Format(), ioDst.Width(), ioDst.Height(),
                     &inMatrix, inOpacity, inQuality, inField, inLower);
}

inline IR_AffineMatrix Matrix(const IR_MotionGeometry& inGeometry, const Image& inSrc,
                              const Image& inDst)
{
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(inGeometry, inSrc.Width(), inSrc.Height(), inDst.Width(), inDst.Height(),
                         &matrix);
    return matrix;
}

} // namespace irtest
