// Composite, blend modes, dissolve and accumulate: exact pixel values of small frames.

#include "ContractExpect.h"
#include "ImageTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

using CompositeTest = ::testing::Test;

TEST_F(CompositeTest, OverMatchesHandValuesAndBlendsInLinearLightAtQualityFive)
{
    // (format, source, destination, opacity, quality, result)
    const std::tuple<IR_PixelFormat, Pixel, Pixel, float, std::int32_t, Pixel> cases[] = {
        // s * 0.5 + d * (1 - 128 * 0.5 / 255) = 50 + 149.8, 25 + 149.8, 0 + 149.8.
        {kBGRP8, {100, 50, 0, 128}, {200, 200, 200, 255}, 0.5f, 4, {200, 175, 150, 255}},
        {kBGRA8, {255, 0, 0, 128}, {0, 0, 255, 255}, 1.0f, 4, {128, 0, 127, 255}},
        // Onto a fully transparent destination the straight source comes through unchanged.
        {kBGRA8, {10, 20, 30, 100}, {90, 90, 90, 0}, 1.0f, 4, {10, 20, 30, 100}},
        // Half-covered white over black is 0.502 in linear light, 188 once encoded; qualities
        // above 5 act as 5.
        {kBGRP8, {128, 128, 128, 128}, {0, 0, 0, 255}, 1.0f, 9, {188, 188, 188, 255}},
    };
    for (const auto& [format, source, destination, opacity, quality, result] : cases)
    {
        Image dst = One(format, destination);
        ASSERT_EQ(Composite(One(format, source), dst, opacity, quality), kIR_NoError);
        EXPECT_EQ(dst.Get(0, 0), result) << int{source[0]};
    }
}

TEST_F(CompositeTest, ToBlackMakesOpaqueAndReportsSourceAlpha)
{
    Image frame(kBGRA8, 2, 1);
    frame.Set(0, 0, {100, 200, 50, 128});
    frame.Set(1, 0, {10, 20, 30, 255});
    for (const bool expectBelow : {true, false})
    {
        // The second pass finds everything opaque and changes nothing.
        bool below = !expectBelow;
        ASSERT_EQ(IR_CompositeToBlackAndTestSourceAlpha(frame.Data(), frame.RowBytes(), kBGRA8, 2,
                                                        1, 1.0f, &below),
                  kIR_NoError);
        EXPECT_EQ(below, expectBelow);
        EXPECT_EQ(frame.Get(0, 0), (Pixel{50, 100, 25, 255}));
        EXPECT_EQ(frame.Get(1, 0), (Pixel{10, 20, 30, 255}));
    }
    Image premultiplied = One(kBGRP8, {100, 60, 20, 100});
    ASSERT_EQ(IR_CompositeToBlack(premultiplied.Data(), 4, kBGRP8, 1, 1, 0.5f), kIR_NoError);
    EXPECT_EQ(premultiplied.Get(0, 0), (Pixel{50, 30, 10, 255}));
}

TEST_F(CompositeTest, BadInputRaisesContractsAndUnsupportedFormatsAStatus)
{
    Image a(kBGRA8, 4, 2), b(kBGRA8, 4, 2);
    const Pixel sentinel{1, 2, 3, 4};
    b.Fill(sentinel);
    auto composite = [&](const void* inSrc, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                         std::int32_t inWidth, float inOpacity = 1.0f)
    {
        return IR_Composite(inSrc, inRowBytes, b.Data(), 16, inFormat, inWidth, inWidth > 1 ? 2 : 1,
                            inOpacity, 4);
    };
    EXPECT_INPUT_CONTRACT(composite(nullptr, 16, kBGRA8, 4), "inBase != nullptr");
    // A BGRA word with no alpha bit is not a format.
    EXPECT_INPUT_CONTRACT(composite(a.Data(), 16, 0u, 4), "DescribeFormat(inFormat, info)");
    EXPECT_EQ(composite(a.Data(), 16, kIR_PixelFormat_YUYV_422_8u, 4), kIR_UnsupportedFormat);
    // Float pixels must sit at float-aligned addresses.
    EXPECT_INPUT_CONTRACT(
        composite(a.Data() + 1, 16, kBGRA32f, 1),
        "(inFormat & kIR_FormatBit_Float) == 0 || "
        "(reinterpret_cast<std::uintptr_t>(inBase) % 4 == 0 && inRowBytes % 4 == 0)");
    // None of the refused calls wrote anything.
    EXPECT_EQ(b.Get(3, 1), sentinel);
}

// Each mode with its separable blend function B(backdrop, source) of straight colours.
struct BlendModeCase
{
    std::uint32_t mode;
    double (*blend)(double inB, double inS);
};
const BlendModeCase kBlendModes[] = {
    {kIR_BlendMode_Darken, [](double b, double s) { return std::min(b, s); }},
    {kIR_BlendMode_Multiply, [](double b, double s) { return b * s; }},
    {kIR_BlendMode_Lighten, [](double b, double s) { return std::max(b, s); }},
    {kIR_BlendMode_Screen, [](double b, double s) { return b + s - b * s; }},
    {kIR_BlendMode_Add, [](double b, double s) { return std::min(1.0, b + s); }},
    {kIR_BlendMode_Overlay,
     [](double b, double s) { return b <= 0.5 ? 2 * b * s : 1 - 2 * (1 - b) * (1 - s); }},
    {kIR_BlendMode_Difference, [](double b, double s) { return std::fabs(b - s); }},
    {kIR_BlendMode_Subtract, [](double b, double s) { return std::max(0.0, b - s); }},
    {kIR_BlendMode_Normal, [](double, double s) { return s; }},
};

std::int32_t BlendMotion(const Image& inSrc, Image& ioDst, std::uint32_t inMode)
{
    const IR_AffineMatrix identity;
    return IR_MotionWithBlendMode(inSrc.Data(), inSrc.RowBytes(), inSrc.Format(), 1, 1,
                                  ioDst.Data(), ioDst.RowBytes(), ioDst.Format(), 1, 1, &identity,
                                  1.0f, 4, kIR_Field_All, true, inMode);
}

using BlendModeTest = ::testing::Test;

TEST_F(BlendModeTest, EachModeGivesItsFunctionUnderTheAlphaRule)
{
    // Straight colours with alpha, as (source, backdrop). The opaque pair drives both overlay
    // branches and the clamps of add and subtract; the translucent pair the alpha rule
    // (1 - ab) Cs + (1 - as) Cb + as ab B(cb, cs), alpha as + ab - as ab.
    const std::array<PixelF, 2> pairs[] = {
        {PixelF{0.2f, 0.5f, 0.5f, 1.0f}, PixelF{0.6f, 0.25f, 0.75f, 1.0f}},
        {PixelF{0.3f, 0.9f, 0.6f, 0.4f}, PixelF{0.7f, 0.2f, 0.45f, 0.8f}},
    };
    auto premultiply = [](PixelF p) { return PixelF{p[0] * p[3], p[1] * p[3], p[2] * p[3], p[3]}; };
    for (const BlendModeCase& c : kBlendModes)
        for (const auto& [s, d] : pairs)
        {
            Image dst = OneF(kBGRP32f, premultiply(d));
            ASSERT_EQ(BlendMotion(OneF(kBGRP32f, premultiply(s)), dst, c.mode), kIR_NoError);
            const double as = s[3], ab = d[3];
            PixelF expected{0, 0, 0, float(as + ab - as * ab)};
            for (int i = 0; i < 3; ++i)
                expected[i] = float((1 - ab) * as * s[i] + (1 - as) * ab * d[i] +
                                    as * ab * c.blend(d[i], s[i]));
            for (int i = 0; i < 4; ++i)
                EXPECT_NEAR(dst.GetF(0, 0)[i], expected[i], 1e-6)
                    << "mode " << c.mode << " source alpha " << s[3] << " channel " << i;
        }
}

TEST_F(BlendModeTest, OnlyTheListedModesAreValid)
{
    for (std::uint32_t mode = 0; mode <= 20; ++mode)
        EXPECT_EQ(IR_IsValidBlendMode(mode),
                  std::any_of(std::begin(kBlendModes), std::end(kBlendModes),
                              [&](const BlendModeCase& c) { return c.mode == mode; }))
            << mode;
    Image dst(kBGRA8, 1, 1);
    EXPECT_INPUT_CONTRACT(BlendMotion(Image(kBGRA8, 1, 1), dst, 3u),
                          "IR_IsValidBlendMode(inCall.mode)");
}

using MixTest = ::testing::Test;

TEST_F(MixTest, CrossDissolveWeighsBothSourcesAndAtQualityFiveInLinearLight)
{
    // (a, b, weight, quality, result)
    const std::tuple<Pixel, Pixel, float, std::int32_t, Pixel> cases[] = {
        {{0, 100, 200, 255}, {200, 100, 0, 55}, 1.0f, 4, {200, 100, 0, 55}},
        {{0, 100, 200, 255}, {200, 100, 0, 55}, 0.25f, 4, {50, 100, 150, 205}},
        {{0, 0, 0, 255}, {255, 255, 255, 255}, 0.5f, 5, {188, 188, 188, 255}},
    };
    Image d(kBGRA8, 1, 1);
    for (const auto& [a, b, weight, quality, result] : cases)
    {
        ASSERT_EQ(IR_CrossDissolve(One(kBGRA8, a).Data(), 4, One(kBGRA8, b).Data(), 4, d.Data(), 4,
                                   kBGRA8, 1, 1, weight, quality),
                  kIR_NoError);
        EXPECT_EQ(d.Get(0, 0), result) << weight << " q" << quality;
    }
    EXPECT_INPUT_CONTRACT(
        IR_CrossDissolve(d.Data(), 4, d.Data(), 4, d.Data(), 4, kBGRA8, 1, 1, -0.1f, 4),
        "inValue >= 0.0f && inValue <= 1.0f");
}

TEST_F(MixTest, AccumulateSumsRoundsAndClamps)
{
    const Image s0 = One(kBGRA8, {100, 101, 200, 255}), s1 = One(kBGRA8, {200, 0, 200, 255}),
                s2 = One(kBGRA8, {40, 0, 200, 255});
    Image d(kBGRA8, 1, 1);
    const void* srcs[] = {s0.Data(), s1.Data(), s2.Data()};
    const std::int32_t rows[] = {4, 4, 4};
    auto accumulate = [&](std::array<double, 3> inWeights, std::int32_t inCount = 3)
    {
        EXPECT_EQ(
            IR_Accumulate(srcs, rows, inWeights.data(), inCount, d.Data(), 4, kBGRA8, 1, 1, 4),
            kIR_NoError);
        return d.Get(0, 0);
    };
    // 50 + 50 + 10; 50.5 rounds up; 200; 255.
    EXPECT_EQ(accumulate({0.5, 0.25, 0.25}), (Pixel{110, 51, 200, 255}));
    EXPECT_EQ(accumulate({2.0, -1.0, 0.0}), (Pixel{0, 202, 200, 255}));
    EXPECT_INPUT_CONTRACT(accumulate({0.5, 0.25, 0.25}, 0), "inCount >= 1");
}

} // namespace
