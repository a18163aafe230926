// IR_ScaleConvert's BGRA scaler against the double-precision reference scaler: every format
// pair it takes, shrinking and enlarging by whole and fractional factors, odd sizes and every
// tail length of the widest vectors, alpha present and absent, misaligned rows.

#include "ImageTestSupport.h"
#include "ReferenceKernels.h"

#include <gtest/gtest.h>
#include <hwy/targets.h>

namespace
{

using namespace irtest;

struct ScaleCase
{
    IR_PixelFormat src;
    IR_PixelFormat dst;
    std::int32_t srcW, srcH, dstW, dstH;
    std::int32_t quality;
    // Alpha noise, all opaque, or all opaque but for one transparent pixel near the end.
    enum Alpha
    {
        kNoise,
        kOpaque,
        kOneHole
    } alpha;
};

void PrintTo(const ScaleCase& inCase, std::ostream* outStream)
{
    *outStream << std::hex << inCase.src << " -> " << inCase.dst << std::dec << " " << inCase.srcW
               << "x" << inCase.srcH << " -> " << inCase.dstW << "x" << inCase.dstH << " quality "
               << inCase.quality << " alpha " << inCase.alpha;
}

std::vector<ScaleCase> ScaleCases()
{
    constexpr IR_PixelFormat kLinear = kIR_PixelFormat_BGRA_32f_Linear;
    const std::pair<IR_PixelFormat, IR_PixelFormat> formats[] = {
        {kBGRA8, kBGRA8},
        {kBGRP8, kBGRP8},
        {kBGRA8, kBGRP8},
        {kBGRP8, kBGRA8},
        {kBGRA32f, kBGRA32f},
        {kBGRP32f, kBGRA32f},
        {kBGRA8, kBGRP32f},
        {kBGRP32f, kBGRA8},
        {kLinear, kIR_PixelFormat_BGRP_32f_Linear},
        {kBGRA8 | kIR_FormatBit_BottomLeft, kBGRA8}};
    // Halving, thirds, tails of 1 to 67 destination pixels, enlarging, single rows and columns.
    const std::array<std::int32_t, 4> sizes[] = {{66, 34, 33, 17}, {40, 31, 30, 23},
                                                 {131, 5, 67, 3},  {7, 9, 23, 20},
                                                 {1, 6, 5, 3},     {9, 1, 2, 4}};
    std::vector<ScaleCase> cases;
    for (const auto& [src, dst] : formats)
        for (const auto& [sw, sh, dw, dh] : sizes)
            for (std::int32_t quality : {0, 4, 5})
                for (auto alpha : {ScaleCase::kNoise, ScaleCase::kOpaque, ScaleCase::kOneHole})
                    cases.push_back({src, dst, sw, sh, dw, dh, quality, alpha});
    for (std::int32_t dw = 1; dw <= 66; ++dw)
    {
        cases.push_back({kBGRA8, kBGRA8, 70, 4, dw, 3, 5, ScaleCase::kNoise});
        cases.push_back({kBGRA8, kBGRA8, 2 * dw, 4, dw, 2, 4, ScaleCase::kOneHole});
    }
    return cases;
}

class ScaleTest : public ::testing::TestWithParam<ScaleCase>
{
};

// Scales a random source through IR_ScaleConvert and the reference; checks the tolerance and
// that the destination rows' padding is untouched.
void CheckAgainstReference(const ScaleCase& c)
{
    std::mt19937 random(c.srcW * 131 + c.dstW);
    Image src(c.src, c.srcW, c.srcH, c.dstW % 4), got(c.dst, c.dstW, c.dstH, c.srcW % 3);
    Image expected(c.dst, c.dstW, c.dstH);
    src.Randomise(random);
    for (std::int32_t i = 0; c.alpha != ScaleCase::kNoise && i < c.srcW * c.srcH; ++i)
        if (src.IsFloat())
            src.SetF(i % c.srcW, i / c.srcW, {0.2f, 0.5f, src.GetF(i % c.srcW, 0)[2], 1.0f});
        else
            src.Set(i % c.srcW, i / c.srcW, {src.Get(i % c.srcW, i / c.srcW)[0], 7, 250, 255});
    // The hole carries colour only where the format is straight (premultiplied colour <= alpha).
    const std::uint8_t hue = (c.src & kIR_FormatBit_StraightAlpha) ? 90 : 0;
    if (c.alpha == ScaleCase::kOneHole && src.IsFloat())
        src.SetF(std::max(0, c.srcW - 2), c.srcH - 1, {hue / 255.0f, 0.0f, 0.0f, 0.0f});
    else if (c.alpha == ScaleCase::kOneHole)
        src.Set(std::max(0, c.srcW - 2), c.srcH - 1, {hue, 0, 0, 0});
    std::memset(got.Data(), 0xA5, std::size_t(got.RowBytes()) * c.dstH);
    ASSERT_EQ(IR_ScaleConvert(src.Data(), src.RowBytes(), c.src, c.srcW, c.srcH, got.Data(),
                              got.RowBytes(), c.dst, c.dstW, c.dstH, c.quality),
              kIR_NoError);
    IR::Reference::ScaleConvert(src.Data(), src.RowBytes(), c.src, c.srcW, c.srcH, expected.Data(),
                                expected.RowBytes(), c.dst, c.dstW, c.dstH, c.quality);
    // One code value for 8-bit results; straight colour weighed by alpha, since dividing by
    // a small alpha magnifies every rounding before it.
    const bool straight = (c.dst & kIR_FormatBit_StraightAlpha) != 0;
    double worst = 0.0;
    for (std::int32_t i = 0; i < c.dstW * c.dstH; ++i)
    {
        const std::int32_t x = i % c.dstW, y = i / c.dstW;
        const PixelF g = got.IsFloat() ? got.GetF(x, y) : PixelF{};
        const PixelF e = got.IsFloat() ? expected.GetF(x, y) : PixelF{};
        for (int ch = 0; ch < 4; ++ch)
        {
            const double diff = got.IsFloat()
                                    ? std::fabs(g[ch] - e[ch]) * 255.0
                                    : std::abs(got.Get(x, y)[ch] - expected.Get(x, y)[ch]);
            const double alpha = got.IsFloat() ? e[3] : expected.Get(x, y)[3] / 255.0;
            worst = std::max(worst, ch < 3 && straight ? diff * std::min(1.0, alpha) : diff);
        }
    }
    EXPECT_LE(worst, got.IsFloat() ? 0.002 : 1.0);
    const auto rowBytes = std::size_t(IR_MinimumRowBytes(c.dst, c.dstW));
    for (std::int32_t y = 0; y < c.dstH; ++y)
        for (std::size_t b = rowBytes; b < std::size_t(got.RowBytes()); ++b)
            ASSERT_EQ(got.Row(y)[b], 0xA5) << "row " << y << " byte " << b;
}

// Every instruction set the kernels were built for that this processor runs: each has its own
// vector width and so its own row tails.
TEST_P(ScaleTest, MatchesTheReferenceAndKeepsThePaddingOnEveryInstructionSet)
{
    for (const std::int64_t target : hwy::SupportedAndGeneratedTargets())
    {
        SCOPED_TRACE(hwy::TargetName(target));
        hwy::SetSupportedTargetsForTest(target);
        CheckAgainstReference(GetParam());
    }
    hwy::SetSupportedTargetsForTest(0);
}

INSTANTIATE_TEST_SUITE_P(Formats, ScaleTest, ::testing::ValuesIn(ScaleCases()));

} // namespace
