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

// A pixel buffer whose first byte sits at a chosen misalignment inside its storage, with
// kPadding bytes after every row so that row padding is exercised.
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
    std::uint8_t* Data() const { return const_cast<std::uint8_t*>(mStorage.data()) + mMisalign; }
    std::uint8_t* Row(std::int32_t inY) const { return Data() + std::ptrdiff_t{inY} * mRowBytes; }
    std::int32_t RowBytes() const { return mRowBytes; }
    std::int32_t Width() const { return mWidth; }
    std::int32_t Height() const { return mHeight; }
    IR_PixelFormat Format() const { return mFormat; }

    Pixel Get(std::int32_t inX, std::int32_t inY) const { return Read<Pixel>(inX, inY); }
    PixelF GetF(std::int32_t inX, std::int32_t inY) const { return Read<PixelF>(inX, inY); }
    void Set(std::int32_t inX, std::int32_t inY, Pixel inP)
    {
        std::memcpy(Row(inY) + 4 * inX, &inP, 4);
    }
    void SetF(std::int32_t inX, std::int32_t inY, PixelF inP)
    {
        std::memcpy(Row(inY) + 16 * inX, &inP, 16);
    }
    void Fill(Pixel inP)
    {
        for (std::int32_t i = 0; i < mWidth * mHeight; ++i)
            Set(i % mWidth, i / mWidth, inP);
    }

    // Random pixels; premultiplied formats get colour <= alpha, a quarter are opaque.
    void Randomise(std::mt19937& ioRandom)
    {
        std::uniform_int_distribution<int> byte(0, 255);
        std::uniform_real_distribution<float> unit(0.0f, 1.0f);
        const bool premultiplied = (mFormat & kIR_FormatBit_PremultipliedAlpha) != 0;
        for (std::int32_t i = 0; i < mWidth * mHeight; ++i)
        {
            const float a = IsFloat() ? unit(ioRandom) : byte(ioRandom) < 64 ? 255 : byte(ioRandom);
            const float k = premultiplied ? a / (IsFloat() ? 1.0f : 255.0f) : 1.0f;
            if (IsFloat())
                SetF(i % mWidth, i / mWidth,
                     {unit(ioRandom) * k, unit(ioRandom) * k, unit(ioRandom) * k, a});
            else
                Set(i % mWidth, i / mWidth,
                    {std::uint8_t(byte(ioRandom) * k), std::uint8_t(byte(ioRandom) * k),
                     std::uint8_t(byte(ioRandom) * k), std::uint8_t(a)});
        }
    }

private:
    template <typename P>
    P Read(std::int32_t inX, std::int32_t inY) const
    {
        P p;
        std::memcpy(&p, Row(inY) + sizeof(P) * inX, sizeof(P));
        return p;
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

// Largest difference between two images' components (padding ignored): code values for
// 8-bit images, component values for float ones. With inWeighByAlpha straight 8-bit colour
// differences are weighed by the expected alpha, since un-premultiplying magnifies the
// error of small alphas.
inline double MaxDifference(const Image& inGot, const Image& inExpected,
                            bool inWeighByAlpha = false)
{
    double worst = 0.0;
    for (std::int32_t i = 0; i < inGot.Width() * inGot.Height(); ++i)
        for (int c = 0; c < 4; ++c)
        {
            const std::int32_t x = i % inGot.Width(), y = i / inGot.Width();
            if (inGot.IsFloat())
            {
                worst = std::max(worst,
                                 std::fabs(double{inGot.GetF(x, y)[c]} - inExpected.GetF(x, y)[c]));
                continue;
            }
            const int diff = std::abs(inGot.Get(x, y)[c] - inExpected.Get(x, y)[c]);
            const int alpha = std::max<int>(inExpected.Get(x, y)[3], 1);
            worst = std::max<double>(worst, c < 3 && inWeighByAlpha ? diff * alpha / 255 : diff);
        }
    return worst;
}

inline Image Copy(const Image& inImage, std::int32_t inMisalign)
{
    Image out(inImage.Format(), inImage.Width(), inImage.Height(), inMisalign);
    const auto bytes = std::size_t(IR_MinimumRowBytes(inImage.Format(), inImage.Width()));
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
