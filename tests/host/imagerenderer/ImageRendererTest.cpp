#include "IR/ImageRenderer.h"

#include "ReferenceKernels.h"
#include "mvxcore/config/Error.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <random>
#include <set>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using Pixel = std::array<std::uint8_t, 4>;

// A pixel buffer whose first byte sits at a chosen misalignment inside its storage,
// with row bytes larger than a row so that row padding is exercised.
class Image
{
public:
    Image(IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
          std::int32_t inMisalign = 0, std::int32_t inPadding = 8)
        : mFormat(inFormat)
        , mWidth(inWidth)
        , mHeight(inHeight)
        , mRowBytes(static_cast<std::int32_t>(IR_MinimumRowBytes(inFormat, inWidth)) + inPadding)
        // Float buffers must be 4-byte aligned; they are still misaligned for vectors.
        , mMisalign((inFormat & kIR_FormatBit_Float) ? 4 * inMisalign : inMisalign)
        , mStorage(static_cast<std::size_t>(mRowBytes) * (inHeight + 2) + 64 + mMisalign, 0)
    {
    }

    std::uint8_t* Data() { return mStorage.data() + mMisalign; }
    const std::uint8_t* Data() const { return mStorage.data() + mMisalign; }
    std::int32_t RowBytes() const { return mRowBytes; }
    std::int32_t Width() const { return mWidth; }
    std::int32_t Height() const { return mHeight; }
    IR_PixelFormat Format() const { return mFormat; }

    std::uint8_t* Row(std::int32_t inY)
    {
        return Data() + static_cast<std::ptrdiff_t>(inY) * mRowBytes;
    }
    const std::uint8_t* Row(std::int32_t inY) const
    {
        return Data() + static_cast<std::ptrdiff_t>(inY) * mRowBytes;
    }

    Pixel Get(std::int32_t inX, std::int32_t inY) const
    {
        Pixel p;
        std::memcpy(p.data(), Row(inY) + 4 * inX, 4);
        return p;
    }
    void Set(std::int32_t inX, std::int32_t inY, Pixel inP)
    {
        std::memcpy(Row(inY) + 4 * inX, inP.data(), 4);
    }
    std::array<float, 4> GetF(std::int32_t inX, std::int32_t inY) const
    {
        std::array<float, 4> p;
        std::memcpy(p.data(), Row(inY) + 16 * inX, 16);
        return p;
    }
    void SetF(std::int32_t inX, std::int32_t inY, std::array<float, 4> inP)
    {
        std::memcpy(Row(inY) + 16 * inX, inP.data(), 16);
    }
    void Fill(Pixel inP)
    {
        for (std::int32_t y = 0; y < mHeight; ++y)
            for (std::int32_t x = 0; x < mWidth; ++x)
                Set(x, y, inP);
    }
    // Random 8-bit pixels; premultiplied formats get colour <= alpha.
    void Randomise(std::mt19937& ioRandom)
    {
        std::uniform_int_distribution<int> byte(0, 255);
        const bool premultiplied = (mFormat & kIR_FormatBit_PremultipliedAlpha) != 0;
        for (std::int32_t y = 0; y < mHeight; ++y)
            for (std::int32_t x = 0; x < mWidth; ++x)
            {
                if (mFormat & kIR_FormatBit_Float)
                {
                    std::uniform_real_distribution<float> unit(0.0f, 1.0f);
                    const float a = unit(ioRandom);
                    const float k = premultiplied ? a : 1.0f;
                    SetF(x, y, {unit(ioRandom) * k, unit(ioRandom) * k, unit(ioRandom) * k, a});
                    continue;
                }
                const int a = byte(ioRandom) < 64 ? 255 : byte(ioRandom);
                auto c = [&]() {
                    return static_cast<std::uint8_t>(premultiplied ? byte(ioRandom) * a / 255
                                                                   : byte(ioRandom));
                };
                Set(x, y, {c(), c(), c(), static_cast<std::uint8_t>(a)});
            }
    }

private:
    IR_PixelFormat mFormat;
    std::int32_t mWidth;
    std::int32_t mHeight;
    std::int32_t mRowBytes;
    std::int32_t mMisalign;
    std::vector<std::uint8_t> mStorage;
};

// Largest difference between two 8-bit images' pixels (padding ignored).
int MaxDifference(const Image& inA, const Image& inB)
{
    int worst = 0;
    for (std::int32_t y = 0; y < inA.Height(); ++y)
        for (std::int32_t x = 0; x < inA.Width(); ++x)
            for (int c = 0; c < 4; ++c)
                worst = std::max(worst, std::abs(inA.Get(x, y)[c] - inB.Get(x, y)[c]));
    return worst;
}

float MaxDifferenceF(const Image& inA, const Image& inB)
{
    float worst = 0.0f;
    for (std::int32_t y = 0; y < inA.Height(); ++y)
        for (std::int32_t x = 0; x < inA.Width(); ++x)
            for (int c = 0; c < 4; ++c)
                worst = std::max(worst, std::fabs(inA.GetF(x, y)[c] - inB.GetF(x, y)[c]));
    return worst;
}

Image Copy(const Image& inImage, std::int32_t inMisalign)
{
    Image out(inImage.Format(), inImage.Width(), inImage.Height(), inMisalign);
    const std::size_t bytes =
        static_cast<std::size_t>(IR_MinimumRowBytes(inImage.Format(), inImage.Width()));
    for (std::int32_t y = 0; y < inImage.Height(); ++y)
        std::memcpy(out.Row(y), inImage.Row(y), bytes);
    return out;
}

// The contract error's expression text, or empty when no contract failed.
template <typename F>
std::string ContractText(F&& inCall)
{
    try
    {
        inCall();
    }
    catch (const mvxcore::config::Error& error)
    {
        EXPECT_EQ(error.GetMajor(), 105);
        EXPECT_EQ(error.GetMinor(), 25);
        return error.GetExpression();
    }
    return {};
}

// ---------------------------------------------------------------------------

class CompositeTest : public ::testing::Test
{
};

TEST_F(CompositeTest, PremultipliedOverWithHalfOpacityMatchesHandValues)
{
    Image src(kIR_PixelFormat_BGRP_8u, 1, 1), dst(kIR_PixelFormat_BGRP_8u, 1, 1);
    src.Set(0, 0, {100, 50, 0, 128});
    dst.Set(0, 0, {200, 200, 200, 255});
    ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                           kIR_PixelFormat_BGRP_8u, 1, 1, 0.5f, 4),
              kIR_NoError);
    // s * 0.5 + d * (1 - 128 * 0.5 / 255) = 50 + 149.8, 25 + 149.8, 0 + 149.8; alpha stays opaque.
    EXPECT_EQ(dst.Get(0, 0), (Pixel{200, 175, 150, 255}));
}

TEST_F(CompositeTest, StraightOverStraightMatchesHandValues)
{
    Image src(kIR_PixelFormat_BGRA_8u, 2, 1), dst(kIR_PixelFormat_BGRA_8u, 2, 1);
    src.Set(0, 0, {255, 0, 0, 128});
    dst.Set(0, 0, {0, 0, 255, 255});
    // Onto a fully transparent destination the straight source comes through unchanged.
    src.Set(1, 0, {10, 20, 30, 100});
    dst.Set(1, 0, {90, 90, 90, 0});
    ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                           kIR_PixelFormat_BGRA_8u, 2, 1, 1.0f, 4),
              kIR_NoError);
    EXPECT_EQ(dst.Get(0, 0), (Pixel{128, 0, 127, 255}));
    EXPECT_EQ(dst.Get(1, 0), (Pixel{10, 20, 30, 100}));
}

TEST_F(CompositeTest, FloatPremultipliedIsExact)
{
    Image src(kIR_PixelFormat_BGRP_32f, 1, 1), dst(kIR_PixelFormat_BGRP_32f, 1, 1);
    src.SetF(0, 0, {0.25f, 0.5f, 0.0f, 0.5f});
    dst.SetF(0, 0, {1.0f, 0.0f, 0.5f, 1.0f});
    ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                           kIR_PixelFormat_BGRP_32f, 1, 1, 1.0f, 4),
              kIR_NoError);
    const auto p = dst.GetF(0, 0);
    EXPECT_FLOAT_EQ(p[0], 0.75f);
    EXPECT_FLOAT_EQ(p[1], 0.5f);
    EXPECT_FLOAT_EQ(p[2], 0.25f);
    EXPECT_FLOAT_EQ(p[3], 1.0f);
}

TEST_F(CompositeTest, BestQualityBlendsInLinearLight)
{
    Image src(kIR_PixelFormat_BGRP_8u, 1, 1), dst(kIR_PixelFormat_BGRP_8u, 1, 1);
    src.Set(0, 0, {128, 128, 128, 128});
    dst.Set(0, 0, {0, 0, 0, 255});
    Image dst4 = Copy(dst, 0);
    IR_Composite(src.Data(), src.RowBytes(), dst4.Data(), dst4.RowBytes(), kIR_PixelFormat_BGRP_8u,
                 1, 1, 1.0f, 4);
    IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(), kIR_PixelFormat_BGRP_8u, 1,
                 1, 1.0f, 5);
    EXPECT_EQ(dst4.Get(0, 0), (Pixel{128, 128, 128, 255}));
    // Half-covered white over black is 0.502 in linear light, 188 once encoded.
    EXPECT_EQ(dst.Get(0, 0), (Pixel{188, 188, 188, 255}));
}

TEST_F(CompositeTest, FastKernelsMatchReferenceOnMisalignedOddRows)
{
    std::mt19937 random(7);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRA_8u, kIR_PixelFormat_BGRP_8u})
        for (float opacity : {1.0f, 0.37f})
            for (std::int32_t misalign : {1, 3})
            {
                Image src(format, 37, 5, misalign), dst(format, 37, 5, misalign + 1);
                src.Randomise(random);
                dst.Randomise(random);
                Image expected = Copy(dst, 0);
                IR::Reference::Composite(src.Data(), src.RowBytes(), expected.Data(),
                                         expected.RowBytes(), format, 37, 5, opacity);
                ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                                       format, 37, 5, opacity, 4),
                          kIR_NoError);
                EXPECT_LE(MaxDifference(dst, expected), 1) << format << " " << opacity;
            }
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRA_32f, kIR_PixelFormat_BGRP_32f})
    {
        Image src(format, 21, 3, 4), dst(format, 21, 3, 12);
        src.Randomise(random);
        dst.Randomise(random);
        Image expected = Copy(dst, 0);
        IR::Reference::Composite(src.Data(), src.RowBytes(), expected.Data(), expected.RowBytes(),
                                 format, 21, 3, 0.6);
        IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(), format, 21, 3, 0.6f,
                     4);
        EXPECT_LE(MaxDifferenceF(dst, expected), 1e-5f);
    }
}

TEST_F(CompositeTest, ToBlackMakesOpaqueAndReportsSourceAlpha)
{
    Image frame(kIR_PixelFormat_BGRA_8u, 2, 1);
    frame.Set(0, 0, {100, 200, 50, 128});
    frame.Set(1, 0, {10, 20, 30, 255});
    bool below = false;
    ASSERT_EQ(IR_CompositeToBlackAndTestSourceAlpha(frame.Data(), frame.RowBytes(),
                                                    kIR_PixelFormat_BGRA_8u, 2, 1, 1.0f, &below),
              kIR_NoError);
    EXPECT_TRUE(below);
    EXPECT_EQ(frame.Get(0, 0), (Pixel{50, 100, 25, 255}));
    EXPECT_EQ(frame.Get(1, 0), (Pixel{10, 20, 30, 255}));
    // Now everything is opaque: a second pass reports no transparency and changes nothing.
    ASSERT_EQ(IR_CompositeToBlackAndTestSourceAlpha(frame.Data(), frame.RowBytes(),
                                                    kIR_PixelFormat_BGRA_8u, 2, 1, 1.0f, &below),
              kIR_NoError);
    EXPECT_FALSE(below);
    EXPECT_EQ(frame.Get(0, 0), (Pixel{50, 100, 25, 255}));

    Image premultiplied(kIR_PixelFormat_BGRP_8u, 1, 1);
    premultiplied.Set(0, 0, {100, 60, 20, 100});
    ASSERT_EQ(IR_CompositeToBlack(premultiplied.Data(), premultiplied.RowBytes(),
                                  kIR_PixelFormat_BGRP_8u, 1, 1, 0.5f),
              kIR_NoError);
    EXPECT_EQ(premultiplied.Get(0, 0), (Pixel{50, 30, 10, 255}));
}

TEST_F(CompositeTest, BadInputRaisesContractsAndUnsupportedFormatsAStatus)
{
    Image a(kIR_PixelFormat_BGRA_8u, 4, 2), b(kIR_PixelFormat_BGRA_8u, 4, 2);
    const Pixel sentinel{1, 2, 3, 4};
    b.Fill(sentinel);
    EXPECT_EQ(
        ContractText(
            [&]
            { IR_Composite(nullptr, 16, b.Data(), 16, kIR_PixelFormat_BGRA_8u, 4, 2, 1.0f, 4); }),
        "inBase != nullptr");
    EXPECT_EQ(
        ContractText(
            [&]
            { IR_Composite(a.Data(), 15, b.Data(), 16, kIR_PixelFormat_BGRA_8u, 4, 2, 1.0f, 4); }),
        "inRowBytes >= IR_MinimumRowBytes(inFormat, inWidth)");
    EXPECT_EQ(
        ContractText(
            [&]
            { IR_Composite(a.Data(), 16, b.Data(), 16, kIR_PixelFormat_BGRA_8u, -1, 2, 1.0f, 4); }),
        "inWidth >= 0 && inHeight >= 0");
    // A BGRA word with no alpha bit, and one with both, are not formats.
    EXPECT_EQ(ContractText([&] { IR_Composite(a.Data(), 16, b.Data(), 16, 0u, 4, 2, 1.0f, 4); }),
              "DescribeFormat(inFormat, info)");
    EXPECT_FALSE(
        IR_IsValidPixelFormat(kIR_FormatBit_StraightAlpha | kIR_FormatBit_PremultipliedAlpha));
    EXPECT_EQ(
        ContractText(
            [&]
            { IR_Composite(a.Data(), 16, b.Data(), 16, kIR_PixelFormat_BGRA_8u, 4, 2, 1.5f, 4); }),
        "inValue >= 0.0f && inValue <= 1.0f");
    EXPECT_EQ(
        ContractText(
            [&]
            { IR_Composite(a.Data(), 16, b.Data(), 16, kIR_PixelFormat_BGRA_8u, 4, 2, NAN, 4); }),
        "inValue >= 0.0f && inValue <= 1.0f");
    EXPECT_EQ(IR_Composite(a.Data(), 16, b.Data(), 16, kIR_PixelFormat_YUYV_422_8u, 4, 2, 1.0f, 4),
              kIR_UnsupportedFormat);
    // Float pixels must sit at float-aligned addresses.
    EXPECT_EQ(ContractText(
                  [&] {
                      IR_Composite(a.Data() + 1, 16, b.Data(), 16, kIR_PixelFormat_BGRA_32f, 1, 1,
                                   1.0f, 4);
                  }),
              "(inFormat & kIR_FormatBit_Float) == 0 || (reinterpret_cast<std::uintptr_t>(inBase) "
              "% 4 == 0 && inRowBytes % 4 == 0)");
    // None of the refused calls wrote anything.
    EXPECT_EQ(b.Get(3, 1), sentinel);
    EXPECT_EQ(b.Get(0, 0), sentinel);
}

// ---------------------------------------------------------------------------

class BlendModeTest : public ::testing::Test
{
protected:
    // Draws one float premultiplied source pixel over one backdrop pixel with identity motion.
    std::array<float, 4> Blend(std::uint32_t inMode, std::array<float, 4> inSrc,
                               std::array<float, 4> inDst, std::int32_t inQuality = 4)
    {
        Image src(kIR_PixelFormat_BGRP_32f, 1, 1), dst(kIR_PixelFormat_BGRP_32f, 1, 1);
        src.SetF(0, 0, inSrc);
        dst.SetF(0, 0, inDst);
        const IR_AffineMatrix identity;
        EXPECT_EQ(IR_MotionWithBlendMode(src.Data(), src.RowBytes(), kIR_PixelFormat_BGRP_32f, 1, 1,
                                         dst.Data(), dst.RowBytes(), kIR_PixelFormat_BGRP_32f, 1, 1,
                                         &identity, 1.0f, inQuality, kIR_Field_All, true, inMode),
                  kIR_NoError);
        return dst.GetF(0, 0);
    }
};

TEST_F(BlendModeTest, EachModeOnOpaquePixelsGivesItsFormula)
{
    const std::array<float, 4> s{0.2f, 0.5f, 0.5f, 1.0f};
    const std::array<float, 4> d{0.6f, 0.25f, 0.75f, 1.0f};
    struct Case
    {
        std::uint32_t mode;
        std::array<float, 3> expected;
    };
    const Case cases[] = {
        {kIR_BlendMode_Normal, {0.2f, 0.5f, 0.5f}},
        {kIR_BlendMode_Multiply, {0.12f, 0.125f, 0.375f}},
        {kIR_BlendMode_Screen, {0.68f, 0.625f, 0.875f}},
        {kIR_BlendMode_Darken, {0.2f, 0.25f, 0.5f}},
        {kIR_BlendMode_Lighten, {0.6f, 0.5f, 0.75f}},
        {kIR_BlendMode_Add, {0.8f, 0.75f, 1.0f}},
        {kIR_BlendMode_Subtract, {0.4f, 0.0f, 0.25f}},
        {kIR_BlendMode_Difference, {0.4f, 0.25f, 0.25f}},
        // Overlay: backdrop 0.6 > 0.5 -> 1 - 2 * 0.4 * 0.8; 0.25 -> 2 * 0.25 * 0.5; 0.75 -> 1 - 2 *
        // 0.25 * 0.5.
        {kIR_BlendMode_Overlay, {0.36f, 0.25f, 0.75f}},
    };
    for (const Case& c : cases)
    {
        const auto r = Blend(c.mode, s, d);
        for (int i = 0; i < 3; ++i)
            EXPECT_NEAR(r[i], c.expected[i], 1e-6f) << "mode " << c.mode << " channel " << i;
        EXPECT_FLOAT_EQ(r[3], 1.0f);
    }
}

TEST_F(BlendModeTest, TranslucentPixelsMatchTheTextbookFormula)
{
    const double s[4] = {0.3, 0.9, 0.6, 0.4};
    const double d[4] = {0.7, 0.2, 0.45, 0.8};
    for (std::uint32_t mode : {1u, 2u, 5u, 6u, 9u, 11u, 15u, 17u, 18u})
    {
        double expected[4];
        IR::Reference::BlendPixel(mode, s, d, expected);
        const auto pm = [](const double* p)
        {
            return std::array<float, 4>{static_cast<float>(p[0] * p[3]),
                                        static_cast<float>(p[1] * p[3]),
                                        static_cast<float>(p[2] * p[3]), static_cast<float>(p[3])};
        };
        const auto r = Blend(mode, pm(s), pm(d));
        for (int i = 0; i < 4; ++i)
            EXPECT_NEAR(r[i], expected[i], 1e-6) << "mode " << mode << " channel " << i;
    }
}

TEST_F(BlendModeTest, EightBitMultiplyIsWithinOneCodeValue)
{
    Image src(kIR_PixelFormat_BGRA_8u, 1, 1), dst(kIR_PixelFormat_BGRA_8u, 1, 1);
    src.Set(0, 0, {128, 64, 255, 255});
    dst.Set(0, 0, {200, 100, 10, 255});
    const IR_AffineMatrix identity;
    ASSERT_EQ(IR_MotionWithBlendMode(src.Data(), src.RowBytes(), kIR_PixelFormat_BGRA_8u, 1, 1,
                                     dst.Data(), dst.RowBytes(), kIR_PixelFormat_BGRA_8u, 1, 1,
                                     &identity, 1.0f, 4, kIR_Field_All, true,
                                     kIR_BlendMode_Multiply),
              kIR_NoError);
    // 128 * 200 / 255 = 100.4, 64 * 100 / 255 = 25.1, 255 * 10 / 255 = 10.
    EXPECT_EQ(dst.Get(0, 0), (Pixel{100, 25, 10, 255}));
}

TEST_F(BlendModeTest, UnknownModeIsAContractError)
{
    Image src(kIR_PixelFormat_BGRA_8u, 1, 1), dst(kIR_PixelFormat_BGRA_8u, 1, 1);
    const IR_AffineMatrix identity;
    EXPECT_EQ(ContractText(
                  [&]
                  {
                      IR_MotionWithBlendMode(src.Data(), src.RowBytes(), kIR_PixelFormat_BGRA_8u, 1,
                                             1, dst.Data(), dst.RowBytes(), kIR_PixelFormat_BGRA_8u,
                                             1, 1, &identity, 1.0f, 4, 0, true, 3u);
                  }),
              "IR_IsValidBlendMode(inCall.mode)");
    EXPECT_TRUE(IR_IsValidBlendMode(18));
    EXPECT_FALSE(IR_IsValidBlendMode(0));
}

// ---------------------------------------------------------------------------

class MotionTest : public ::testing::Test
{
protected:
    static std::int32_t Draw(const Image& inSrc, Image& ioDst, const IR_AffineMatrix& inMatrix,
                             std::int32_t inQuality, std::int32_t inField = kIR_Field_All,
                             bool inLower = false, float inOpacity = 1.0f)
    {
        return IR_Motion(inSrc.Data(), inSrc.RowBytes(), inSrc.Format(), inSrc.Width(),
                         inSrc.Height(), ioDst.Data(), ioDst.RowBytes(), ioDst.Format(),
                         ioDst.Width(), ioDst.Height(), &inMatrix, inOpacity, inQuality, inField,
                         inLower);
    }
};

TEST_F(MotionTest, IdentityEqualsACopyAtEveryQuality)
{
    std::mt19937 random(3);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u})
        for (std::int32_t quality : {0, 3, 5})
        {
            Image src(format, 13, 7, 1);
            src.Randomise(random);
            Image dst(format, 13, 7, 2);
            dst.Fill({9, 9, 9, 9});
            IR_AffineMatrix matrix;
            IR_BuildMotionMatrix(IR_MotionGeometry{}, 13, 7, 13, 7, &matrix);
            ASSERT_EQ(Draw(src, dst, matrix, quality), kIR_NoError);
            // Straight pixels of alpha 0 come back as 0 (they carry no colour).
            for (std::int32_t y = 0; y < 7; ++y)
                for (std::int32_t x = 0; x < 13; ++x)
                {
                    Pixel expected = src.Get(x, y);
                    if (expected[3] == 0)
                        expected = {0, 0, 0, 0};
                    const Pixel got = dst.Get(x, y);
                    for (int c = 0; c < 4; ++c)
                        EXPECT_LE(std::abs(got[c] - expected[c]),
                                  format == kIR_PixelFormat_BGRA_8u ? 1 : 0)
                            << x << "," << y << " q" << quality;
                }
        }
}

TEST_F(MotionTest, NinetyDegreeRotationLandsPixelsClockwise)
{
    Image src(kIR_PixelFormat_BGRP_8u, 3, 2);
    for (std::int32_t y = 0; y < 2; ++y)
        for (std::int32_t x = 0; x < 3; ++x)
            src.Set(x, y, {static_cast<std::uint8_t>(10 * x + y), 0, 0, 255});
    IR_MotionGeometry geometry;
    geometry.rotationDegrees = 90.0;
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(geometry, 3, 2, 2, 3, &matrix);
    for (std::int32_t quality : {0, 4})
    {
        Image dst(kIR_PixelFormat_BGRP_8u, 2, 3);
        ASSERT_EQ(Draw(src, dst, matrix, quality), kIR_NoError);
        // Clockwise: source (x, y) lands at (1 - y, x); the top-left corner goes top-right.
        for (std::int32_t y = 0; y < 2; ++y)
            for (std::int32_t x = 0; x < 3; ++x)
                EXPECT_EQ(dst.Get(1 - y, x), src.Get(x, y)) << x << "," << y << " q" << quality;
    }
}

TEST_F(MotionTest, TwiceTheSizeRepeatsPixelsWithNearestSampling)
{
    Image src(kIR_PixelFormat_BGRP_8u, 2, 2);
    src.Set(0, 0, {255, 0, 0, 255});
    src.Set(1, 0, {0, 255, 0, 255});
    src.Set(0, 1, {0, 0, 255, 255});
    src.Set(1, 1, {40, 40, 40, 255});
    IR_MotionGeometry geometry;
    geometry.scaleX = geometry.scaleY = 2.0f;
    IR_AffineMatrix matrix;
    IR_BuildMotionMatrix(geometry, 2, 2, 4, 4, &matrix);
    EXPECT_DOUBLE_EQ(matrix.a, 2.0);
    EXPECT_DOUBLE_EQ(matrix.tx, 0.0);
    Image dst(kIR_PixelFormat_BGRP_8u, 4, 4);
    ASSERT_EQ(Draw(src, dst, matrix, 0), kIR_NoError);
    for (std::int32_t y = 0; y < 4; ++y)
        for (std::int32_t x = 0; x < 4; ++x)
            EXPECT_EQ(dst.Get(x, y), src.Get(x / 2, y / 2)) << x << "," << y;
    // Bilinear: the pixel at (1, 1) sits a quarter of the way from source (0, 0) towards (1, 1).
    ASSERT_EQ(Draw(src, dst, matrix, 3), kIR_NoError);
    const Pixel p = dst.Get(1, 1);
    // B: 255 * 9/16 + 40 * 1/16 = 145.9; G: 255 * 3/16 + 2.5 = 50.3; R: 255 * 3/16 + 2.5 = 50.3.
    EXPECT_NEAR(p[0], 146, 1);
    EXPECT_NEAR(p[1], 50, 1);
    EXPECT_NEAR(p[2], 50, 1);
    EXPECT_EQ(p[3], 255);
}

TEST_F(MotionTest, FieldPassTouchesOnlyItsRows)
{
    Image src(kIR_PixelFormat_BGRP_8u, 5, 6);
    src.Fill({100, 100, 100, 255});
    const Pixel sentinel{1, 2, 3, 4};
    const IR_AffineMatrix identity;
    for (std::int32_t field : {kIR_Field_First, kIR_Field_Second})
        for (bool lower : {false, true})
        {
            Image dst(kIR_PixelFormat_BGRP_8u, 5, 6);
            dst.Fill(sentinel);
            ASSERT_EQ(Draw(src, dst, identity, 3, field, lower), kIR_NoError);
            for (std::int32_t y = 0; y < 6; ++y)
            {
                const bool inField = (y % 2) == (field == kIR_Field_First ? 0 : 1);
                for (std::int32_t x = 0; x < 5; ++x)
                    EXPECT_EQ(dst.Get(x, y), (inField ? Pixel{100, 100, 100, 255} : sentinel))
                        << "field " << field << " row " << y;
            }
        }
}

TEST_F(MotionTest, ClearedDestinationOutsideTheSourceIsTransparent)
{
    Image src(kIR_PixelFormat_BGRP_8u, 2, 2);
    src.Fill({50, 60, 70, 255});
    IR_AffineMatrix shift;
    shift.tx = 3.0;
    shift.ty = 1.0;
    Image dst(kIR_PixelFormat_BGRP_8u, 6, 4);
    dst.Fill({9, 9, 9, 9});
    ASSERT_EQ(Draw(src, dst, shift, 0, kIR_Field_All, false, 0.5f), kIR_NoError);
    for (std::int32_t y = 0; y < 4; ++y)
        for (std::int32_t x = 0; x < 6; ++x)
        {
            const bool inside = x >= 3 && x < 5 && y >= 1 && y < 3;
            EXPECT_EQ(dst.Get(x, y), (inside ? Pixel{25, 30, 35, 128} : Pixel{0, 0, 0, 0}))
                << x << "," << y;
        }
    // A singular matrix draws nothing: the cleared destination stays clear, a lower frame intact.
    IR_AffineMatrix flat;
    flat.a = 0.0;
    dst.Fill({9, 9, 9, 9});
    ASSERT_EQ(Draw(src, dst, flat, 3, kIR_Field_All, true), kIR_NoError);
    EXPECT_EQ(dst.Get(0, 0), (Pixel{9, 9, 9, 9}));
    ASSERT_EQ(Draw(src, dst, flat, 3, kIR_Field_All, false), kIR_NoError);
    EXPECT_EQ(dst.Get(0, 0), (Pixel{0, 0, 0, 0}));
}

TEST_F(MotionTest, BottomLeftBuffersUsePictureCoordinates)
{
    const IR_PixelFormat bottomLeft = kIR_PixelFormat_BGRP_8u | kIR_FormatBit_BottomLeft;
    Image src(bottomLeft, 1, 2);
    // Picture row 0 (the top) is the last row in memory.
    src.Set(0, 1, {200, 0, 0, 255});
    src.Set(0, 0, {0, 200, 0, 255});
    Image dst(kIR_PixelFormat_BGRP_8u, 1, 2);
    const IR_AffineMatrix identity;
    ASSERT_EQ(Draw(src, dst, identity, 0), kIR_NoError);
    EXPECT_EQ(dst.Get(0, 0), (Pixel{200, 0, 0, 255}));
    EXPECT_EQ(dst.Get(0, 1), (Pixel{0, 200, 0, 255}));
    EXPECT_TRUE(IR_IsOriginBottomLeft(bottomLeft));
    EXPECT_FALSE(IR_IsOriginTopLeft(bottomLeft));
    EXPECT_TRUE(IR_IsOriginTopLeft(kIR_PixelFormat_YUYV_422_8u));
}

TEST_F(MotionTest, FastKernelsMatchReferenceOnMisalignedOddFrames)
{
    std::mt19937 random(11);
    IR_MotionGeometry scaled;
    scaled.scaleX = 0.75f;
    scaled.scaleY = 0.75f;
    scaled.positionX = 0.45f;
    IR_MotionGeometry rotated;
    rotated.rotationDegrees = 17.0;
    rotated.scaleX = 1.3f;
    rotated.scaleY = 0.8f;
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u})
        for (bool lower : {false, true})
            for (std::int32_t quality : {0, 3})
                for (const IR_MotionGeometry* geometry : {&scaled, &rotated})
                {
                    // Nearest sampling of a rotation is compared elsewhere (exact quarter turns):
                    // at pixel boundaries fixed and double positions may pick neighbours.
                    if (quality == 0 && geometry == &rotated)
                        continue;
                    Image src(format, 23, 17, 3);
                    src.Randomise(random);
                    Image dst(format, 29, 19, 1);
                    dst.Randomise(random);
                    Image expected = Copy(dst, 0);
                    IR_AffineMatrix matrix;
                    IR_BuildMotionMatrix(*geometry, 23, 17, 29, 19, &matrix);
                    IR::Reference::Motion8(
                        src.Data(), src.RowBytes(), 23, 17, expected.Data(), expected.RowBytes(),
                        29, 19, format == kIR_PixelFormat_BGRA_8u, matrix, 0.8, quality, lower);
                    ASSERT_EQ(Draw(src, dst, matrix, quality, kIR_Field_All, lower, 0.8f),
                              kIR_NoError);
                    // Bilinear weights are 8-bit: two roundings and the weight step stay within 2.
                    // Straight destinations divide by small alphas, which magnifies that error.
                    int worst = 0;
                    for (std::int32_t y = 0; y < 19; ++y)
                        for (std::int32_t x = 0; x < 29; ++x)
                        {
                            const Pixel a = dst.Get(x, y), b = expected.Get(x, y);
                            const int alpha = std::max<int>(b[3], 1);
                            for (int c = 0; c < 4; ++c)
                            {
                                int diff = std::abs(a[c] - b[c]);
                                if (c < 3 && format == kIR_PixelFormat_BGRA_8u && alpha < 255)
                                    diff = diff * alpha / 255;
                                worst = std::max(worst, diff);
                            }
                        }
                    EXPECT_LE(worst, quality == 0 ? 1 : 2)
                        << "format " << format << " lower " << lower << " q" << quality;
                }
}

TEST_F(MotionTest, BadInputIsRefused)
{
    Image src(kIR_PixelFormat_BGRA_8u, 2, 2), dst(kIR_PixelFormat_BGRA_8u, 2, 2);
    const IR_AffineMatrix identity;
    EXPECT_EQ(ContractText([&] { Draw(src, dst, identity, 3, 3); }),
              "inCall.field >= kIR_Field_All && inCall.field <= kIR_Field_Second");
    EXPECT_EQ(ContractText([&] { Draw(src, dst, identity, -1); }), "inQuality >= 0");
    EXPECT_EQ(ContractText(
                  [&]
                  {
                      IR_Motion(src.Data(), src.RowBytes(), src.Format(), 2, 2, dst.Data(),
                                dst.RowBytes(), dst.Format(), 2, 2, nullptr, 1.0f, 3, 0, true);
                  }),
              "inCall.matrix != nullptr");
    IR_AffineMatrix broken;
    broken.tx = std::numeric_limits<double>::infinity();
    EXPECT_FALSE(ContractText([&] { Draw(src, dst, broken, 3); }).empty());
    Image other(kIR_PixelFormat_BGRP_8u, 2, 2);
    EXPECT_EQ(Draw(src, other, identity, 3), kIR_UnsupportedFormat);
}

// ---------------------------------------------------------------------------

class MixTest : public ::testing::Test
{
};

TEST_F(MixTest, CrossDissolveWeighsBothSources)
{
    Image a(kIR_PixelFormat_BGRA_8u, 1, 1), b(kIR_PixelFormat_BGRA_8u, 1, 1),
        d(kIR_PixelFormat_BGRA_8u, 1, 1);
    a.Set(0, 0, {0, 100, 200, 255});
    b.Set(0, 0, {200, 100, 0, 55});
    for (auto [weight, expected] :
         {std::pair{0.0f, Pixel{0, 100, 200, 255}}, std::pair{1.0f, Pixel{200, 100, 0, 55}},
          std::pair{0.25f, Pixel{50, 100, 150, 205}}})
    {
        ASSERT_EQ(IR_CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(), d.Data(),
                                   d.RowBytes(), kIR_PixelFormat_BGRA_8u, 1, 1, weight, 4),
                  kIR_NoError);
        EXPECT_EQ(d.Get(0, 0), expected) << weight;
    }
    EXPECT_EQ(ContractText(
                  [&]
                  {
                      IR_CrossDissolve(a.Data(), 4, b.Data(), 4, d.Data(), 4,
                                       kIR_PixelFormat_BGRA_8u, 1, 1, -0.1f, 4);
                  }),
              "inValue >= 0.0f && inValue <= 1.0f");
}

TEST_F(MixTest, AccumulateSumsRoundsAndClamps)
{
    Image s0(kIR_PixelFormat_BGRA_8u, 1, 1), s1(kIR_PixelFormat_BGRA_8u, 1, 1),
        s2(kIR_PixelFormat_BGRA_8u, 1, 1), d(kIR_PixelFormat_BGRA_8u, 1, 1);
    s0.Set(0, 0, {100, 101, 200, 255});
    s1.Set(0, 0, {200, 0, 200, 255});
    s2.Set(0, 0, {40, 0, 200, 255});
    const void* srcs[] = {s0.Data(), s1.Data(), s2.Data()};
    const std::int32_t rows[] = {s0.RowBytes(), s1.RowBytes(), s2.RowBytes()};
    const double weights[] = {0.5, 0.25, 0.25};
    ASSERT_EQ(IR_Accumulate(srcs, rows, weights, 3, d.Data(), d.RowBytes(), kIR_PixelFormat_BGRA_8u,
                            1, 1, 4),
              kIR_NoError);
    // 50 + 50 + 10; 50.5 rounds up; 200; 255.
    EXPECT_EQ(d.Get(0, 0), (Pixel{110, 51, 200, 255}));
    const double heavy[] = {2.0, -1.0, 0.0};
    IR_Accumulate(srcs, rows, heavy, 3, d.Data(), d.RowBytes(), kIR_PixelFormat_BGRA_8u, 1, 1, 4);
    EXPECT_EQ(d.Get(0, 0), (Pixel{0, 202, 200, 255}));
    EXPECT_EQ(ContractText(
                  [&] {
                      IR_Accumulate(srcs, rows, weights, 0, d.Data(), 4, kIR_PixelFormat_BGRA_8u, 1,
                                    1, 4);
                  }),
              "inCount >= 1");
}

TEST_F(MixTest, FastKernelsMatchReferenceOnMisalignedOddRows)
{
    std::mt19937 random(5);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRA_8u, kIR_PixelFormat_BGRP_32f})
    {
        Image a(format, 31, 4, 1), b(format, 31, 4, 2), d(format, 31, 4, 3), e(format, 31, 4, 0);
        a.Randomise(random);
        b.Randomise(random);
        IR_CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(), d.Data(), d.RowBytes(),
                         format, 31, 4, 0.3f, 4);
        IR::Reference::CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(), e.Data(),
                                     e.RowBytes(), format, 31, 4, 0.3);
        if (format & kIR_FormatBit_Float)
            EXPECT_LE(MaxDifferenceF(d, e), 1e-6f);
        else
            EXPECT_LE(MaxDifference(d, e), 1);
        const void* srcs[] = {a.Data(), b.Data(), a.Data()};
        const std::int32_t rows[] = {a.RowBytes(), b.RowBytes(), a.RowBytes()};
        const double weights[] = {0.2, 0.7, 0.3};
        IR_Accumulate(srcs, rows, weights, 3, d.Data(), d.RowBytes(), format, 31, 4, 4);
        IR::Reference::Accumulate(srcs, rows, weights, 3, e.Data(), e.RowBytes(), format, 31, 4);
        if (format & kIR_FormatBit_Float)
            EXPECT_LE(MaxDifferenceF(d, e), 1e-6f);
        else
            EXPECT_LE(MaxDifference(d, e), 1);
    }
}

TEST_F(MixTest, BestQualityDissolvesInLinearLight)
{
    Image a(kIR_PixelFormat_BGRA_8u, 1, 1), b(kIR_PixelFormat_BGRA_8u, 1, 1),
        d(kIR_PixelFormat_BGRA_8u, 1, 1);
    a.Set(0, 0, {0, 0, 0, 255});
    b.Set(0, 0, {255, 255, 255, 255});
    IR_CrossDissolve(a.Data(), 4, b.Data(), 4, d.Data(), 4, kIR_PixelFormat_BGRA_8u, 1, 1, 0.5f, 5);
    EXPECT_EQ(d.Get(0, 0), (Pixel{188, 188, 188, 255}));
}

// ---------------------------------------------------------------------------

class ConvertTest : public ::testing::Test
{
};

TEST_F(ConvertTest, EightBitToFloatAndBackIsExact)
{
    std::mt19937 random(1);
    Image src(kIR_PixelFormat_BGRA_8u, 17, 3, 1);
    src.Randomise(random);
    Image f(kIR_PixelFormat_BGRA_32f, 17, 3, 4), back(kIR_PixelFormat_BGRA_8u, 17, 3, 2);
    ASSERT_EQ(IR_Convert(src.Data(), src.RowBytes(), src.Format(), f.Data(), f.RowBytes(),
                         f.Format(), 17, 3, 4),
              kIR_NoError);
    EXPECT_FLOAT_EQ(f.GetF(5, 1)[2], src.Get(5, 1)[2] / 255.0f);
    ASSERT_EQ(IR_Convert(f.Data(), f.RowBytes(), f.Format(), back.Data(), back.RowBytes(),
                         back.Format(), 17, 3, 4),
              kIR_NoError);
    EXPECT_EQ(MaxDifference(src, back), 0);
    // Through float linear premultiplied light and back, opaque pixels survive to within one.
    Image opaque(kIR_PixelFormat_BGRA_8u, 256, 1);
    for (int x = 0; x < 256; ++x)
        opaque.Set(x, 0,
                   {static_cast<std::uint8_t>(x), static_cast<std::uint8_t>(255 - x), 7, 255});
    Image linear(kIR_PixelFormat_BGRP_32f_Linear, 256, 1), again(kIR_PixelFormat_BGRA_8u, 256, 1);
    IR_Convert(opaque.Data(), opaque.RowBytes(), opaque.Format(), linear.Data(), linear.RowBytes(),
               linear.Format(), 256, 1, 5);
    EXPECT_NEAR(linear.GetF(128, 0)[0], 0.2158605f, 1e-5f);
    IR_Convert(linear.Data(), linear.RowBytes(), linear.Format(), again.Data(), again.RowBytes(),
               again.Format(), 256, 1, 5);
    EXPECT_EQ(MaxDifference(opaque, again), 0);
}

TEST_F(ConvertTest, PremultipliedToStraightInPlaceWithTheAlphaBits)
{
    Image frame(kIR_PixelFormat_BGRA_8u, 3, 1);
    frame.Set(0, 0, {64, 32, 0, 128});
    frame.Set(1, 0, {9, 9, 9, 0});
    frame.Set(2, 0, {200, 100, 50, 255});
    const IR_PixelFormat format = kIR_PixelFormat_BGRA_8u;
    const IR_PixelFormat asPremultiplied =
        (format & ~kIR_FormatBit_StraightAlpha) | kIR_FormatBit_PremultipliedAlpha;
    ASSERT_EQ(IR_Convert(frame.Data(), frame.RowBytes(), asPremultiplied, frame.Data(),
                         frame.RowBytes(), format, 3, 1, 4),
              kIR_NoError);
    EXPECT_EQ(frame.Get(0, 0), (Pixel{128, 64, 0, 128}));
    EXPECT_EQ(frame.Get(1, 0), (Pixel{0, 0, 0, 0}));
    EXPECT_EQ(frame.Get(2, 0), (Pixel{200, 100, 50, 255}));
}

TEST_F(ConvertTest, AssociationKernelsMatchReferenceAndRoundTrip)
{
    std::mt19937 random(2);
    Image straight(kIR_PixelFormat_BGRA_8u, 33, 5, 3);
    straight.Randomise(random);
    Image premultiplied(kIR_PixelFormat_BGRP_8u, 33, 5, 1),
        expected(kIR_PixelFormat_BGRP_8u, 33, 5);
    IR_Convert(straight.Data(), straight.RowBytes(), straight.Format(), premultiplied.Data(),
               premultiplied.RowBytes(), premultiplied.Format(), 33, 5, 4);
    IR::Reference::StraightToPremultiplied8(straight.Data(), straight.RowBytes(), expected.Data(),
                                            expected.RowBytes(), 33, 5);
    EXPECT_LE(MaxDifference(premultiplied, expected), 1);
    Image back(kIR_PixelFormat_BGRA_8u, 33, 5, 2), backExpected(kIR_PixelFormat_BGRA_8u, 33, 5);
    IR_Convert(premultiplied.Data(), premultiplied.RowBytes(), premultiplied.Format(), back.Data(),
               back.RowBytes(), back.Format(), 33, 5, 4);
    IR::Reference::PremultipliedToStraight8(premultiplied.Data(), premultiplied.RowBytes(),
                                            backExpected.Data(), backExpected.RowBytes(), 33, 5);
    EXPECT_LE(MaxDifference(back, backExpected), 1);
    // Round trip: exact for opaque pixels, within one code value from alpha 128 up.
    for (std::int32_t y = 0; y < 5; ++y)
        for (std::int32_t x = 0; x < 33; ++x)
        {
            const Pixel a = straight.Get(x, y), b = back.Get(x, y);
            if (a[3] < 128)
                continue;
            for (int c = 0; c < 4; ++c)
                EXPECT_LE(std::abs(a[c] - b[c]), a[3] == 255 ? 0 : 1);
        }
}

TEST_F(ConvertTest, YUV420ToBGRAMatchesReferenceAndKnownColours)
{
    std::mt19937 random(4);
    const std::int32_t w = 19, h = 7, rowBytes = 22;
    std::vector<std::uint8_t> planes(static_cast<std::size_t>(rowBytes) * h +
                                     2 * (rowBytes / 2) * 4 + 1);
    std::uniform_int_distribution<int> code(16, 240);
    for (auto& v : planes)
        v = static_cast<std::uint8_t>(code(random));
    // Odd start address.
    std::vector<std::uint8_t> shifted(planes.size() + 1);
    std::memcpy(shifted.data() + 1, planes.data(), planes.size());
    Image dst(kIR_PixelFormat_BGRA_8u, w, h, 1), expected(kIR_PixelFormat_BGRA_8u, w, h);
    ASSERT_EQ(IR_Convert(shifted.data() + 1, rowBytes, kIR_PixelFormat_YUV_420_Planar_8u,
                         dst.Data(), dst.RowBytes(), dst.Format(), w, h, 4),
              kIR_NoError);
    IR::Reference::YUV420ToBGRA8(shifted.data() + 1, rowBytes, true, expected.Data(),
                                 expected.RowBytes(), w, h);
    EXPECT_LE(MaxDifference(dst, expected), 1);

    // BT.601 red (81, 90, 240), white and black, one 2x2 block each.
    const std::uint8_t yuv[] = {81,  81, 235, 235, 16,  16,  81,  81,  235,
                                235, 16, 16,  90,  128, 128, 240, 128, 128};
    Image rgb(kIR_PixelFormat_BGRA_8u, 6, 2);
    IR_Convert(yuv, 6, kIR_PixelFormat_YUV_420_Planar_8u, rgb.Data(), rgb.RowBytes(), rgb.Format(),
               6, 2, 4);
    const Pixel red = rgb.Get(1, 1);
    EXPECT_LE(red[0], 1);
    EXPECT_LE(red[1], 1);
    EXPECT_GE(red[2], 254);
    EXPECT_EQ(rgb.Get(2, 0), (Pixel{255, 255, 255, 255}));
    EXPECT_EQ(rgb.Get(5, 1), (Pixel{0, 0, 0, 255}));
    // The same codes forced to BT.709 give another red.
    Image rgb709(kIR_PixelFormat_BGRA_8u, 6, 2);
    IR_Convert(yuv, 6, kIR_PixelFormat_YUV_420_Planar_8u | kIR_FormatBit_BT709, rgb709.Data(),
               rgb709.RowBytes(), rgb709.Format(), 6, 2, 4);
    EXPECT_NE(rgb709.Get(0, 0), red);
}

TEST_F(ConvertTest, YUVInterleavedRoundTripsAndPicksMatrixByHeight)
{
    std::mt19937 random(6);
    for (IR_PixelFormat yuvFormat : {kIR_PixelFormat_VUYA_4444_8u, kIR_PixelFormat_YUYV_422_8u})
    {
        // Grey-ish pairs survive 4:2:2 chroma averaging; colours get a tolerance of 2 codes.
        Image src(kIR_PixelFormat_BGRA_8u, 9, 2, 1);
        std::uniform_int_distribution<int> byte(0, 255);
        for (std::int32_t y = 0; y < 2; ++y)
            for (std::int32_t x = 0; x < 9; x += 1)
            {
                const auto v = static_cast<std::uint8_t>(byte(random));
                src.Set(x, y, {v, v, v, 255});
            }
        Image yuv(yuvFormat, 9, 2, 3), back(kIR_PixelFormat_BGRA_8u, 9, 2);
        ASSERT_EQ(IR_Convert(src.Data(), src.RowBytes(), src.Format(), yuv.Data(), yuv.RowBytes(),
                             yuvFormat, 9, 2, 4),
                  kIR_NoError);
        ASSERT_EQ(IR_Convert(yuv.Data(), yuv.RowBytes(), yuvFormat, back.Data(), back.RowBytes(),
                             back.Format(), 9, 2, 4),
                  kIR_NoError);
        EXPECT_LE(MaxDifference(src, back), 1) << yuvFormat;
    }
    // One pure red pixel: Cr differs between BT.601 (SD, below 720 rows) and BT.709.
    std::vector<std::uint8_t> red(4 * 720);
    for (int y = 0; y < 720; ++y)
    {
        red[4 * y + 2] = 255;
        red[4 * y + 3] = 255;
    }
    std::vector<std::uint8_t> out(4 * 720);
    IR_Convert(red.data(), 4, kIR_PixelFormat_BGRA_8u, out.data(), 4, kIR_PixelFormat_VUYA_4444_8u,
               1, 719, 4);
    EXPECT_EQ(out[2], 81); // BT.601 luma of red
    IR_Convert(red.data(), 4, kIR_PixelFormat_BGRA_8u, out.data(), 4, kIR_PixelFormat_VUYA_4444_8u,
               1, 720, 4);
    EXPECT_EQ(out[2], 63); // BT.709 luma of red
}

TEST_F(ConvertTest, BottomLeftFlipsRowsAndPlanarOutputIsUnsupported)
{
    Image src(kIR_PixelFormat_BGRA_8u, 1, 3),
        dst(kIR_PixelFormat_BGRA_8u | kIR_FormatBit_BottomLeft, 1, 3);
    for (std::int32_t y = 0; y < 3; ++y)
        src.Set(0, y, {static_cast<std::uint8_t>(y), 0, 0, 255});
    ASSERT_EQ(IR_Convert(src.Data(), src.RowBytes(), src.Format(), dst.Data(), dst.RowBytes(),
                         dst.Format(), 1, 3, 4),
              kIR_NoError);
    for (std::int32_t y = 0; y < 3; ++y)
        EXPECT_EQ(dst.Get(0, 2 - y)[0], y);
    Image planar(kIR_PixelFormat_YUV_420_Planar_8u, 2, 2);
    EXPECT_EQ(IR_Convert(src.Data(), src.RowBytes(), src.Format(), planar.Data(), 4,
                         kIR_PixelFormat_YUV_420_Planar_8u, 1, 2, 4),
              kIR_UnsupportedFormat);
}

TEST_F(ConvertTest, ScaleConvertHalvesByAreaNearestAndBilinear)
{
    Image src(kIR_PixelFormat_BGRA_8u, 4, 4);
    for (std::int32_t y = 0; y < 4; ++y)
        for (std::int32_t x = 0; x < 4; ++x)
            src.Set(x, y, {static_cast<std::uint8_t>(40 * x + 10 * y), 0, 0, 255});
    Image area(kIR_PixelFormat_BGRA_8u, 2, 2), nearest(kIR_PixelFormat_BGRA_8u, 2, 2);
    Image linear(kIR_PixelFormat_BGRA_32f, 2, 2);
    ASSERT_EQ(IR_ScaleConvert(src.Data(), src.RowBytes(), src.Format(), 4, 4, area.Data(),
                              area.RowBytes(), area.Format(), 2, 2, 5),
              kIR_NoError);
    ASSERT_EQ(IR_ScaleConvert(src.Data(), src.RowBytes(), src.Format(), 4, 4, nearest.Data(),
                              nearest.RowBytes(), nearest.Format(), 2, 2, 0),
              kIR_NoError);
    ASSERT_EQ(IR_ScaleConvert(src.Data(), src.RowBytes(), src.Format(), 4, 4, linear.Data(),
                              linear.RowBytes(), linear.Format(), 2, 2, 3),
              kIR_NoError);
    // Block (0,0): 0, 40, 10, 50 -> 25; block (1,1): 100, 140, 110, 150 -> 125.
    EXPECT_EQ(area.Get(0, 0)[0], 25);
    EXPECT_EQ(area.Get(1, 1)[0], 125);
    // Nearest takes the pixel under each output centre: source (1, 1) and (3, 3).
    EXPECT_EQ(nearest.Get(0, 0)[0], 50);
    EXPECT_EQ(nearest.Get(1, 1)[0], 150);
    // Bilinear at half size averages the same 2x2 blocks: (80 + 120 + 90 + 130) / 4 = 105.
    EXPECT_NEAR(linear.GetF(1, 0)[0], 105.0f / 255.0f, 1e-5f);
    EXPECT_EQ(area.Get(0, 0)[3], 255);
}

// ---------------------------------------------------------------------------

class FieldTest : public ::testing::Test
{
protected:
    static Image Rows(std::int32_t inHeight)
    {
        Image image(kIR_PixelFormat_BGRA_8u, 3, inHeight, 1);
        for (std::int32_t y = 0; y < inHeight; ++y)
            for (std::int32_t x = 0; x < 3; ++x)
                image.Set(
                    x, y,
                    {static_cast<std::uint8_t>(10 * y), static_cast<std::uint8_t>(x), 0, 255});
        return image;
    }
};

TEST_F(FieldTest, DeinterlaceKeepsTheChosenField)
{
    Image first = Rows(5);
    ASSERT_EQ(IR_Deinterlace(first.Data(), first.RowBytes(), first.Format(), 3, 5, false, 3),
              kIR_NoError);
    // Kept rows 0, 2, 4 unchanged; rows 1 and 3 are averages of their neighbours.
    const std::uint8_t expected[] = {0, 10, 20, 30, 40};
    for (std::int32_t y = 0; y < 5; ++y)
        EXPECT_EQ(first.Get(2, y), (Pixel{expected[y], 2, 0, 255})) << y;
    Image second = Rows(5);
    ASSERT_EQ(IR_Deinterlace(second.Data(), second.RowBytes(), second.Format(), 3, 5, true, 0),
              kIR_NoError);
    // Low quality repeats the kept row above (row 0 has none and takes row 1).
    const std::uint8_t repeated[] = {10, 10, 10, 30, 30};
    for (std::int32_t y = 0; y < 5; ++y)
        EXPECT_EQ(second.Get(0, y)[0], repeated[y]) << y;
}

TEST_F(FieldTest, DeinterlaceCopyTakesTheFieldAtHalfAndQuarterHeight)
{
    Image src = Rows(8);
    Image half(kIR_PixelFormat_BGRA_8u, 3, 4, 2), quarter(kIR_PixelFormat_BGRA_8u, 3, 2, 3);
    ASSERT_EQ(IR_DeinterlaceCopy(src.Data(), src.RowBytes(), 8, half.Data(), half.RowBytes(), 4,
                                 src.Format(), 3, true, 4),
              kIR_NoError);
    for (std::int32_t y = 0; y < 4; ++y)
        EXPECT_EQ(half.Get(1, y)[0], 10 * (2 * y + 1));
    ASSERT_EQ(IR_DeinterlaceCopy(src.Data(), src.RowBytes(), 8, quarter.Data(), quarter.RowBytes(),
                                 2, src.Format(), 3, false, 4),
              kIR_NoError);
    // Field rows 0 and 2 (picture rows 0 and 2 -> average 10), then rows 4 and 6 -> 50.
    EXPECT_EQ(quarter.Get(0, 0)[0], 10);
    EXPECT_EQ(quarter.Get(0, 1)[0], 50);
    EXPECT_EQ(ContractText(
                  [&]
                  {
                      IR_DeinterlaceCopy(src.Data(), src.RowBytes(), 8, quarter.Data(),
                                         quarter.RowBytes(), 3, src.Format(), 3, false, 4);
                  }),
              "inSrcHeight == 2 * inDstHeight || inSrcHeight == 4 * inDstHeight");
}

// ---------------------------------------------------------------------------

class FillAndMatteTest : public ::testing::Test
{
};

TEST_F(FillAndMatteTest, FillWritesTheColourInEachFormat)
{
    Image straight(kIR_PixelFormat_BGRA_8u, 4, 3);
    straight.Fill({1, 1, 1, 1});
    // The 2x1 rectangle at (1, 1), addressed by offsetting the base.
    ASSERT_EQ(IR_FillWithColor(straight.Row(1) + 4, straight.RowBytes(), straight.Format(), 2, 1,
                               0x80FF0000u, 4),
              kIR_NoError);
    EXPECT_EQ(straight.Get(1, 1), (Pixel{0, 0, 255, 128}));
    EXPECT_EQ(straight.Get(2, 1), (Pixel{0, 0, 255, 128}));
    EXPECT_EQ(straight.Get(0, 1), (Pixel{1, 1, 1, 1}));
    EXPECT_EQ(straight.Get(3, 1), (Pixel{1, 1, 1, 1}));
    EXPECT_EQ(straight.Get(1, 0), (Pixel{1, 1, 1, 1}));
    Image premultiplied(kIR_PixelFormat_BGRP_8u, 1, 1);
    IR_FillWithColor(premultiplied.Data(), 4, premultiplied.Format(), 1, 1, 0x80FF0000u, 4);
    EXPECT_EQ(premultiplied.Get(0, 0), (Pixel{0, 0, 128, 128}));
    Image f(kIR_PixelFormat_BGRA_32f, 1, 1);
    IR_FillWithColor(f.Data(), 16, f.Format(), 1, 1, 0x80FF0000u, 4);
    EXPECT_FLOAT_EQ(f.GetF(0, 0)[2], 1.0f);
    EXPECT_FLOAT_EQ(f.GetF(0, 0)[3], 128.0f / 255.0f);
    Image vuya(kIR_PixelFormat_VUYA_4444_8u, 1, 1);
    IR_FillWithColor(vuya.Data(), 4, vuya.Format(), 1, 1, 0xFFFFFFFFu, 4);
    EXPECT_EQ(vuya.Get(0, 0), (Pixel{128, 128, 235, 255}));
}

TEST_F(FillAndMatteTest, UnPremultiplyAgainstBlackAndColouredMattes)
{
    // Against black the result equals the plain premultiplied -> straight conversion.
    Image frame(kIR_PixelFormat_BGRA_8u, 2, 1);
    frame.Set(0, 0, {64, 32, 0, 128});
    frame.Set(1, 0, {50, 50, 50, 0});
    ASSERT_EQ(IR_UnPremultiplyAgainstMatteColor(frame.Data(), 8, frame.Data(), 8, frame.Format(), 2,
                                                1, 0u, kIR_FormatBit_StraightAlpha, 4),
              kIR_NoError);
    EXPECT_EQ(frame.Get(0, 0), (Pixel{128, 64, 0, 128}));
    EXPECT_EQ(frame.Get(1, 0), (Pixel{0, 0, 0, 0}));
    // Colour 51 (0.2) at alpha 128 over a white matte was stored as 153.
    Image white(kIR_PixelFormat_BGRA_8u, 1, 1), out(kIR_PixelFormat_BGRA_8u, 1, 1);
    white.Set(0, 0, {153, 255, 128, 128});
    IR_UnPremultiplyAgainstMatteColor(white.Data(), 4, out.Data(), 4, white.Format(), 1, 1,
                                      0xFFFFFFFFu, kIR_FormatBit_StraightAlpha, 4);
    const Pixel p = out.Get(0, 0);
    EXPECT_NEAR(p[0], 51, 1);
    EXPECT_EQ(p[1], 255);
    EXPECT_EQ(p[2], 2); // (128 - 127) / 128 of full scale: 1.99
    EXPECT_EQ(p[3], 128);
    IR_UnPremultiplyAgainstMatteColor(white.Data(), 4, out.Data(), 4, white.Format(), 1, 1,
                                      0xFFFFFFFFu, kIR_FormatBit_PremultipliedAlpha, 4);
    EXPECT_NEAR(out.Get(0, 0)[0], 26, 1);
    EXPECT_EQ(ContractText(
                  [&]
                  {
                      IR_UnPremultiplyAgainstMatteColor(white.Data(), 4, out.Data(), 4,
                                                        white.Format(), 1, 1, 0u, 1u, 4);
                  }),
              "inOutputAlpha == kIR_FormatBit_StraightAlpha || inOutputAlpha == "
              "kIR_FormatBit_PremultipliedAlpha");
}

// ---------------------------------------------------------------------------

class TransientMemoryTest : public ::testing::Test
{
};

TEST_F(TransientMemoryTest, BlocksAreAlignedAndReusedBySizeClass)
{
    void* a = IR_AllocateTransientMemoryBlock(1000000);
    ASSERT_NE(a, nullptr);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(a) % 64, 0u);
    std::memset(a, 0xAB, 1000000);
    const std::size_t before = IR_TransientMemoryCachedBytes();
    IR_FreeTransientMemoryBlock(a);
    EXPECT_GE(IR_TransientMemoryCachedBytes(), before + 1000000);
    // A slightly different size of the same class gets the same block back.
    void* b = IR_AllocateTransientMemoryBlock(999000);
    EXPECT_EQ(b, a);
    IR_FreeTransientMemoryBlock(b);
    IR_FreeTransientMemoryBlock(nullptr);
    EXPECT_EQ(ContractText([] { IR_AllocateTransientMemoryBlock(0); }), "inSize > 0");
}

TEST_F(TransientMemoryTest, ForeignAndDoubleFreedBlocksAreRefused)
{
    std::vector<std::uint8_t> foreign(256, 0);
    EXPECT_EQ(ContractText([&] { IR_FreeTransientMemoryBlock(foreign.data() + 128); }),
              "header->guard == kGuardLive");
    void* block = IR_AllocateTransientMemoryBlock(4096);
    IR_FreeTransientMemoryBlock(block);
    EXPECT_EQ(ContractText([&] { IR_FreeTransientMemoryBlock(block); }),
              "header->guard == kGuardLive");
}

TEST_F(TransientMemoryTest, ConcurrentThreadsNeverShareABlock)
{
    constexpr int kThreads = 4;
    constexpr int kRounds = 2000;
    std::vector<std::thread> threads;
    std::vector<int> failures(kThreads, 0);
    for (int t = 0; t < kThreads; ++t)
        threads.emplace_back(
            [t, &failures]
            {
                for (int i = 0; i < kRounds; ++i)
                {
                    const std::size_t size = 64 + static_cast<std::size_t>((i * 37 + t) % 5) * 3000;
                    auto* block = static_cast<std::uint8_t*>(IR_AllocateTransientMemoryBlock(size));
                    std::memset(block, t + 1, size);
                    std::this_thread::yield();
                    for (std::size_t k = 0; k < size; k += 97)
                        failures[t] += block[k] != t + 1;
                    IR_FreeTransientMemoryBlock(block);
                }
            });
    for (auto& thread : threads)
        thread.join();
    for (int t = 0; t < kThreads; ++t)
        EXPECT_EQ(failures[t], 0) << t;
}

TEST_F(TransientMemoryTest, ConcurrentCompositesOnSeparateFramesAgree)
{
    // Operations take scratch rows from the pool; run them on several threads at once.
    std::mt19937 random(9);
    Image src(kIR_PixelFormat_BGRA_8u, 64, 16);
    src.Randomise(random);
    Image base(kIR_PixelFormat_BGRA_8u, 64, 16);
    base.Randomise(random);
    Image expected = Copy(base, 0);
    IR_Composite(src.Data(), src.RowBytes(), expected.Data(), expected.RowBytes(), src.Format(), 64,
                 16, 1.0f, 5);
    std::vector<Image> outputs;
    for (int t = 0; t < 4; ++t)
        outputs.push_back(Copy(base, t));
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < 20; ++i)
                {
                    Image work = Copy(base, 0);
                    IR_Composite(src.Data(), src.RowBytes(), work.Data(), work.RowBytes(),
                                 src.Format(), 64, 16, 1.0f, 5);
                    if (i == 19)
                        outputs[t] = Copy(work, t);
                }
            });
    for (auto& thread : threads)
        thread.join();
    for (const Image& out : outputs)
        EXPECT_EQ(MaxDifference(out, expected), 0);
}

// ---------------------------------------------------------------------------
// The vectorised kernels against the plain reference on every tail length of the
// widest vectors (up to 64 pixels), odd misalignments and padded rows.

class FastKernelTest : public ::testing::Test
{
protected:
    // Widths that cover an empty body, every partial last vector and several whole ones.
    static std::vector<std::int32_t> Widths()
    {
        std::vector<std::int32_t> widths;
        for (std::int32_t w = 1; w <= 67; ++w)
            widths.push_back(w);
        widths.push_back(131);
        return widths;
    }

    // Largest difference of a motion result from the reference; straight colour is
    // weighed by alpha, since un-premultiplying magnifies the error of small alphas.
    static int MotionDifference(const Image& inGot, const Image& inExpected, bool inStraight)
    {
        int worst = 0;
        for (std::int32_t y = 0; y < inGot.Height(); ++y)
            for (std::int32_t x = 0; x < inGot.Width(); ++x)
            {
                const Pixel a = inGot.Get(x, y), b = inExpected.Get(x, y);
                const int alpha = std::max<int>(b[3], 1);
                for (int c = 0; c < 4; ++c)
                {
                    int diff = std::abs(a[c] - b[c]);
                    if (c < 3 && inStraight && alpha < 255)
                        diff = diff * alpha / 255;
                    worst = std::max(worst, diff);
                }
            }
        return worst;
    }
};

TEST_F(FastKernelTest, CompositeMatchesReferenceAtEveryTailLength)
{
    std::mt19937 random(21);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRA_8u, kIR_PixelFormat_BGRP_8u})
        for (float opacity : {1.0f, 0.61f, 0.0f})
            for (std::int32_t width : Widths())
            {
                const std::int32_t misalign = width % 4;
                Image src(format, width, 2, misalign), dst(format, width, 2, 3 - misalign);
                src.Randomise(random);
                dst.Randomise(random);
                Image expected = Copy(dst, 0);
                IR::Reference::Composite(src.Data(), src.RowBytes(), expected.Data(),
                                         expected.RowBytes(), format, width, 2, opacity);
                ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                                       format, width, 2, opacity, 4),
                          kIR_NoError);
                ASSERT_LE(MaxDifference(dst, expected), 1)
                    << "format " << format << " opacity " << opacity << " width " << width;
            }
}

TEST_F(FastKernelTest, CompositeLeavesBytesBeyondTheRowUntouched)
{
    std::mt19937 random(22);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRA_8u, kIR_PixelFormat_BGRP_8u})
        for (std::int32_t width : {1, 5, 13, 29})
        {
            // Rows padded by 8 bytes: the vector tails must not write into the padding.
            Image src(format, width, 3, 1), dst(format, width, 3, 2);
            src.Randomise(random);
            dst.Randomise(random);
            for (std::int32_t y = 0; y < 3; ++y)
                std::memset(dst.Row(y) + 4 * width, 0xA5, 8);
            IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(), format, width, 3,
                         0.5f, 4);
            for (std::int32_t y = 0; y < 3; ++y)
                for (int i = 0; i < 8; ++i)
                    ASSERT_EQ(dst.Row(y)[4 * width + i], 0xA5) << width << " row " << y;
        }
}

TEST_F(FastKernelTest, OpaqueAndTransparentSourcesGiveExactResults)
{
    // An opaque straight source replaces the destination exactly; a transparent one
    // leaves it exactly as it was (at full opacity, whatever the destination).
    std::mt19937 random(23);
    Image dst(kIR_PixelFormat_BGRA_8u, 45, 2, 1);
    dst.Randomise(random);
    Image opaque(kIR_PixelFormat_BGRA_8u, 45, 2, 3), clear(kIR_PixelFormat_BGRA_8u, 45, 2);
    opaque.Randomise(random);
    for (std::int32_t y = 0; y < 2; ++y)
        for (std::int32_t x = 0; x < 45; ++x)
        {
            Pixel p = opaque.Get(x, y);
            p[3] = 255;
            opaque.Set(x, y, p);
        }
    Image kept = Copy(dst, 2);
    IR_Composite(clear.Data(), clear.RowBytes(), kept.Data(), kept.RowBytes(),
                 kIR_PixelFormat_BGRA_8u, 45, 2, 1.0f, 4);
    for (std::int32_t y = 0; y < 2; ++y)
        for (std::int32_t x = 0; x < 45; ++x)
        {
            // Straight pixels of alpha 0 carry no colour: only they may change (to 0).
            const Pixel before = dst.Get(x, y);
            EXPECT_EQ(kept.Get(x, y), (before[3] == 0 ? Pixel{0, 0, 0, 0} : before)) << x;
        }
    IR_Composite(opaque.Data(), opaque.RowBytes(), dst.Data(), dst.RowBytes(),
                 kIR_PixelFormat_BGRA_8u, 45, 2, 1.0f, 4);
    EXPECT_EQ(MaxDifference(dst, opaque), 0);
}

TEST_F(FastKernelTest, StraightCompositeCoversEveryAlphaPair)
{
    // Source alpha runs along x, destination alpha along y: all 65536 pairs, with colours
    // far apart (the weight error shows most) and close together.
    for (float opacity : {1.0f, 0.5f, 0.03f})
    {
        Image src(kIR_PixelFormat_BGRA_8u, 256, 256, 1), dst(kIR_PixelFormat_BGRA_8u, 256, 256, 3);
        for (std::int32_t y = 0; y < 256; ++y)
            for (std::int32_t x = 0; x < 256; ++x)
            {
                src.Set(x, y,
                        {255, 0, static_cast<std::uint8_t>((x * 7 + y) % 256),
                         static_cast<std::uint8_t>(x)});
                dst.Set(x, y,
                        {0, 255, static_cast<std::uint8_t>((x + y * 5) % 256),
                         static_cast<std::uint8_t>(y)});
            }
        Image expected = Copy(dst, 0);
        IR::Reference::Composite(src.Data(), src.RowBytes(), expected.Data(), expected.RowBytes(),
                                 kIR_PixelFormat_BGRA_8u, 256, 256, opacity);
        ASSERT_EQ(IR_Composite(src.Data(), src.RowBytes(), dst.Data(), dst.RowBytes(),
                               kIR_PixelFormat_BGRA_8u, 256, 256, opacity, 4),
                  kIR_NoError);
        EXPECT_LE(MaxDifference(dst, expected), 1) << opacity;
        if (opacity < 1.0f)
            continue;
        // At full opacity the alpha is exact, and so is the colour over a destination of
        // alpha 0 (the source's own colour) and of an opaque source.
        for (std::int32_t y = 0; y < 256; ++y)
            for (std::int32_t x = 0; x < 256; ++x)
            {
                ASSERT_EQ(dst.Get(x, y)[3], expected.Get(x, y)[3]) << x << "," << y;
                if (y == 0 || x == 255)
                {
                    ASSERT_EQ(dst.Get(x, y), expected.Get(x, y)) << x << "," << y;
                }
            }
    }
}

TEST_F(FastKernelTest, AssociationChangesMatchReferenceAtEveryTailLengthAndInPlace)
{
    std::mt19937 random(24);
    for (std::int32_t width : Widths())
    {
        Image straight(kIR_PixelFormat_BGRA_8u, width, 2, width % 3);
        straight.Randomise(random);
        Image premultiplied(kIR_PixelFormat_BGRP_8u, width, 2, 1),
            expected(kIR_PixelFormat_BGRP_8u, width, 2);
        IR_Convert(straight.Data(), straight.RowBytes(), straight.Format(), premultiplied.Data(),
                   premultiplied.RowBytes(), premultiplied.Format(), width, 2, 4);
        IR::Reference::StraightToPremultiplied8(straight.Data(), straight.RowBytes(),
                                                expected.Data(), expected.RowBytes(), width, 2);
        // The fixed-point product is exactly rounded: no difference at all.
        ASSERT_EQ(MaxDifference(premultiplied, expected), 0) << width;

        // Un-premultiplying arbitrary bytes (colour above alpha included) clamps to 255.
        Image any(kIR_PixelFormat_BGRP_8u, width, 2, 3);
        any.Randomise(random);
        for (std::int32_t x = 0; x < width; x += 3)
            any.Set(x, 0, {200, 17, 90, static_cast<std::uint8_t>(x % 7 == 0 ? 0 : 60)});
        Image back(kIR_PixelFormat_BGRA_8u, width, 2, 2),
            backExpected(kIR_PixelFormat_BGRA_8u, width, 2);
        IR_Convert(any.Data(), any.RowBytes(), any.Format(), back.Data(), back.RowBytes(),
                   back.Format(), width, 2, 4);
        IR::Reference::PremultipliedToStraight8(any.Data(), any.RowBytes(), backExpected.Data(),
                                                backExpected.RowBytes(), width, 2);
        ASSERT_LE(MaxDifference(back, backExpected), 1) << width;
        // In place, with the alpha bits of the same memory.
        Image inPlace = Copy(any, 1);
        const IR_PixelFormat asStraight = kIR_PixelFormat_BGRA_8u;
        ASSERT_EQ(IR_Convert(inPlace.Data(), inPlace.RowBytes(), kIR_PixelFormat_BGRP_8u,
                             inPlace.Data(), inPlace.RowBytes(), asStraight, width, 2, 4),
                  kIR_NoError);
        ASSERT_EQ(MaxDifference(inPlace, back), 0) << width;
    }
}

TEST_F(FastKernelTest, YUV420MatchesReferenceAtEveryTailLength)
{
    std::mt19937 random(25);
    std::uniform_int_distribution<int> code(0, 255);
    for (std::int32_t width : Widths())
        for (bool bt601 : {true, false})
        {
            const std::int32_t height = 3;
            const std::int32_t rowBytes = (width + 3) & ~1;
            std::vector<std::uint8_t> planes(static_cast<std::size_t>(rowBytes) * height +
                                             2 * (rowBytes / 2) * ((height + 1) / 2) + 1);
            // Every code, including those outside video range (they clamp).
            for (auto& v : planes)
                v = static_cast<std::uint8_t>(code(random));
            const IR_PixelFormat format = kIR_PixelFormat_YUV_420_Planar_8u |
                                          (bt601 ? kIR_FormatBit_BT601 : kIR_FormatBit_BT709);
            Image dst(kIR_PixelFormat_BGRA_8u, width, height, 1),
                expected(kIR_PixelFormat_BGRA_8u, width, height);
            ASSERT_EQ(IR_Convert(planes.data(), rowBytes, format, dst.Data(), dst.RowBytes(),
                                 dst.Format(), width, height, 4),
                      kIR_NoError);
            IR::Reference::YUV420ToBGRA8(planes.data(), rowBytes, bt601, expected.Data(),
                                         expected.RowBytes(), width, height);
            ASSERT_LE(MaxDifference(dst, expected), 1) << width << (bt601 ? " 601" : " 709");
        }
}

TEST_F(FastKernelTest, WholePixelTranslationMatchesReference)
{
    std::mt19937 random(26);
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u})
        for (bool lower : {false, true})
            for (std::int32_t quality : {0, 4})
                for (const auto& [tx, ty] : std::vector<std::pair<double, double>>{
                         {0, 0}, {3, -2}, {-5, 4}, {40, 0}, {0, -30}})
                {
                    Image src(format, 21, 13, 3);
                    src.Randomise(random);
                    // Some straight pixels of alpha 0 with colour: they must come out as 0.
                    src.Set(2, 2, {50, 60, 70, 0});
                    Image dst(format, 25, 11, 1);
                    dst.Randomise(random);
                    Image expected = Copy(dst, 0);
                    IR_AffineMatrix matrix;
                    matrix.tx = tx;
                    matrix.ty = ty;
                    const bool straight = format == kIR_PixelFormat_BGRA_8u;
                    IR::Reference::Motion8(src.Data(), src.RowBytes(), 21, 13, expected.Data(),
                                           expected.RowBytes(), 25, 11, straight, matrix, 0.7,
                                           quality, lower);
                    ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), format, 21, 13, dst.Data(),
                                        dst.RowBytes(), format, 25, 11, &matrix, 0.7f, quality,
                                        kIR_Field_All, lower),
                              kIR_NoError);
                    EXPECT_LE(MotionDifference(dst, expected, straight), 1)
                        << format << " lower " << lower << " q" << quality << " " << tx << ","
                        << ty;
                }
}

TEST_F(FastKernelTest, WholePixelTranslationTouchesOnlyItsField)
{
    Image src(kIR_PixelFormat_BGRP_8u, 4, 4);
    src.Fill({80, 80, 80, 255});
    IR_AffineMatrix shift;
    shift.tx = 1.0;
    shift.ty = 1.0;
    const Pixel sentinel{1, 2, 3, 4};
    for (bool lower : {false, true})
    {
        Image dst(kIR_PixelFormat_BGRP_8u, 6, 6);
        dst.Fill(sentinel);
        ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), src.Format(), 4, 4, dst.Data(),
                            dst.RowBytes(), dst.Format(), 6, 6, &shift, 1.0f, 4, kIR_Field_Second,
                            lower),
                  kIR_NoError);
        for (std::int32_t y = 0; y < 6; ++y)
            for (std::int32_t x = 0; x < 6; ++x)
            {
                const bool covered = x >= 1 && x < 5 && y >= 1 && y < 5;
                Pixel want = sentinel;
                if (y % 2 == 1)
                    want =
                        covered ? Pixel{80, 80, 80, 255} : (lower ? sentinel : Pixel{0, 0, 0, 0});
                EXPECT_EQ(dst.Get(x, y), want) << x << "," << y << " lower " << lower;
            }
    }
}

TEST_F(FastKernelTest, ScaledBilinearMotionMatchesReference)
{
    std::mt19937 random(27);
    struct Case
    {
        float scaleX, scaleY, positionX, positionY;
    };
    // Shrinking, enlarging, unequal axes, mirrored, and a source hanging over every edge.
    const Case cases[] = {{0.5f, 0.5f, 0.37f, 0.41f}, {1.7f, 1.3f, 0.5f, 0.5f},
                          {0.33f, 0.9f, 0.1f, 0.9f},  {-0.8f, 0.6f, 0.5f, 0.5f},
                          {1.0f, 1.0f, 0.52f, 0.47f}, {2.5f, 2.5f, 0.0f, 1.0f}};
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u})
        for (bool lower : {false, true})
            for (const Case& c : cases)
                for (float opacity : {1.0f, 0.55f})
                {
                    Image src(format, 37, 23, 1);
                    src.Randomise(random);
                    Image dst(format, 41, 27, 2);
                    dst.Randomise(random);
                    Image expected = Copy(dst, 0);
                    IR_MotionGeometry geometry;
                    geometry.scaleX = c.scaleX;
                    geometry.scaleY = c.scaleY;
                    geometry.positionX = c.positionX;
                    geometry.positionY = c.positionY;
                    IR_AffineMatrix matrix;
                    IR_BuildMotionMatrix(geometry, 37, 23, 41, 27, &matrix);
                    const bool straight = format == kIR_PixelFormat_BGRA_8u;
                    IR::Reference::Motion8(src.Data(), src.RowBytes(), 37, 23, expected.Data(),
                                           expected.RowBytes(), 41, 27, straight, matrix, opacity,
                                           4, lower);
                    ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), format, 37, 23, dst.Data(),
                                        dst.RowBytes(), format, 41, 27, &matrix, opacity, 4,
                                        kIR_Field_All, lower),
                              kIR_NoError);
                    EXPECT_LE(MotionDifference(dst, expected, straight), 2)
                        << format << " lower " << lower << " scale " << c.scaleX << "x" << c.scaleY
                        << " opacity " << opacity;
                }
}

TEST_F(FastKernelTest, SeparableMotionMatchesReferenceAtEveryWidth)
{
    // Exactly half size with the taps on pixel pairs (w = 128) and between them, the same
    // size moved by a fraction (stride 1), and a general scale (gathered taps); sources
    // twice as wide plus one (odd) hang over both edges of the destination.
    std::mt19937 random(28);
    struct Case
    {
        double scale, tx, ty;
    };
    const Case cases[] = {{0.5, 1.0, 0.0}, {0.5, 0.3, 0.45}, {1.0, -0.35, 0.2}, {0.8, 0.6, -0.3}};
    for (IR_PixelFormat format : {kIR_PixelFormat_BGRP_8u, kIR_PixelFormat_BGRA_8u})
        for (const Case& c : cases)
            for (std::int32_t width : Widths())
                for (bool lower : {false, true})
                    for (float opacity : {1.0f, 0.6f})
                    {
                        const std::int32_t srcW = 2 * width + 1;
                        Image src(format, srcW, 9, width % 4);
                        src.Randomise(random);
                        Image dst(format, width, 5, 3 - width % 4);
                        dst.Randomise(random);
                        Image expected = Copy(dst, 0);
                        IR_AffineMatrix matrix;
                        matrix.a = matrix.d = c.scale;
                        matrix.tx = c.tx;
                        matrix.ty = c.ty;
                        const bool straight = format == kIR_PixelFormat_BGRA_8u;
                        IR::Reference::Motion8(src.Data(), src.RowBytes(), srcW, 9, expected.Data(),
                                               expected.RowBytes(), width, 5, straight, matrix,
                                               opacity, 4, lower);
                        ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), format, srcW, 9, dst.Data(),
                                            dst.RowBytes(), format, width, 5, &matrix, opacity, 4,
                                            kIR_Field_All, lower),
                                  kIR_NoError);
                        ASSERT_LE(MotionDifference(dst, expected, straight), 2)
                            << format << " scale " << c.scale << " tx " << c.tx << " width "
                            << width << " lower " << lower << " opacity " << opacity;
                    }
}

TEST_F(FastKernelTest, AlignedHalfSizeAveragesEachTwoByTwoBlock)
{
    // A 5 x 3 opaque source halved from the origin: each destination pixel is the mean of
    // a 2 x 2 block; the last column and row take half of a block that is transparent
    // outside the source; the rest of the cleared destination stays transparent.
    Image src(kIR_PixelFormat_BGRP_8u, 5, 3, 1);
    src.Fill({200, 200, 200, 255});
    src.Set(0, 0, {10, 100, 0, 255});
    src.Set(1, 0, {20, 110, 4, 255});
    src.Set(0, 1, {30, 120, 8, 255});
    src.Set(1, 1, {40, 130, 12, 255});
    Image dst(kIR_PixelFormat_BGRP_8u, 4, 3, 2);
    dst.Fill({9, 9, 9, 9});
    IR_AffineMatrix half;
    half.a = half.d = 0.5;
    ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), src.Format(), 5, 3, dst.Data(), dst.RowBytes(),
                        dst.Format(), 4, 3, &half, 1.0f, 4, kIR_Field_All, false),
              kIR_NoError);
    EXPECT_EQ(dst.Get(0, 0), (Pixel{25, 115, 6, 255}));
    EXPECT_EQ(dst.Get(1, 0), (Pixel{200, 200, 200, 255}));
    EXPECT_EQ(dst.Get(2, 0), (Pixel{100, 100, 100, 128}));
    EXPECT_EQ(dst.Get(1, 1), (Pixel{100, 100, 100, 128}));
    EXPECT_EQ(dst.Get(2, 1), (Pixel{50, 50, 50, 64}));
    for (std::int32_t y = 0; y < 3; ++y)
        EXPECT_EQ(dst.Get(3, y), (Pixel{0, 0, 0, 0})) << y;
    for (std::int32_t x = 0; x < 4; ++x)
        EXPECT_EQ(dst.Get(x, 2), (Pixel{0, 0, 0, 0})) << x;

    // The same halving onto an opaque lower frame composites the averages over it.
    Image lower(kIR_PixelFormat_BGRP_8u, 4, 3, 1);
    lower.Fill({0, 0, 0, 255});
    ASSERT_EQ(IR_Motion(src.Data(), src.RowBytes(), src.Format(), 5, 3, lower.Data(),
                        lower.RowBytes(), lower.Format(), 4, 3, &half, 1.0f, 4, kIR_Field_All,
                        true),
              kIR_NoError);
    EXPECT_EQ(lower.Get(0, 0), (Pixel{25, 115, 6, 255}));
    EXPECT_EQ(lower.Get(2, 0), (Pixel{100, 100, 100, 255}));
    EXPECT_EQ(lower.Get(3, 0), (Pixel{0, 0, 0, 255}));
}

} // namespace
