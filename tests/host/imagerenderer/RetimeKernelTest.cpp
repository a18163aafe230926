// Linear-light accumulation (quality 5) against the double-precision reference: every
// 8-bit format it takes, widths covering every vector tail, misaligned padded rows, one
// to three sources, weights that sum to one and weights that do not.

#include "ImageTestSupport.h"
#include "ReferenceKernels.h"

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

struct WeightCase
{
    const char* name;
    std::vector<double> weights;
};

const WeightCase kWeightCases[] = {
    {"Halves", {0.5, 0.5}},   {"Thirds", {0.2, 0.5, 0.3}},
    {"Single", {1.0}},        {"SingleAmongZeros", {0.0, 1.0, 0.0}},
    {"AllZero", {0.0, 0.0}},  {"AboveOne", {0.8, 0.7}},
    {"BelowOne", {0.3, 0.2}}, {"Negative", {1.4, -0.4}},
    {"ScaledSingle", {0.6}},
};

class AccumulateLinearTest : public ::testing::TestWithParam<std::tuple<IR_PixelFormat, WeightCase>>
{
};

TEST_P(AccumulateLinearTest, MatchesReferenceAtEveryTailLength)
{
    const auto& [format, weightCase] = GetParam();
    const bool premultiplied = (format & kIR_FormatBit_PremultipliedAlpha) != 0;
    const auto count = static_cast<std::int32_t>(weightCase.weights.size());
    std::mt19937 random(static_cast<std::uint32_t>(format) * 31 +
                        static_cast<std::uint32_t>(count));
    for (std::int32_t width : {1, 2, 3, 4, 5, 7, 15, 16, 17, 31, 33, 63, 65, 130})
    {
        SCOPED_TRACE(testing::Message() << "width " << width);
        std::vector<Image> sources;
        std::vector<const void*> bases;
        std::vector<std::int32_t> rowBytes;
        for (std::int32_t i = 0; i < count; ++i)
        {
            sources.emplace_back(format, width, 3, (width + i) % 4);
            sources.back().Randomise(random);
            // Extremes and a transparent pixel in every source.
            sources.back().Set(0, 0, {0, 0, 0, 0});
            sources.back().Set(width - 1, 2, {255, 255, 255, 255});
            sources.back().Set(width / 2, 1, {1, 10, 12, 255});
        }
        for (const Image& source : sources)
        {
            bases.push_back(source.Data());
            rowBytes.push_back(source.RowBytes());
        }
        Image got(format, width, 3, 3), expected(format, width, 3);
        const auto used = static_cast<std::size_t>(IR_MinimumRowBytes(format, width));
        for (std::int32_t y = 0; y < 3; ++y)
            std::memset(got.Row(y) + used, 0xA5, Image::kPadding);
        ASSERT_EQ(IR_Accumulate(bases.data(), rowBytes.data(), weightCase.weights.data(), count,
                                got.Data(), got.RowBytes(), format, width, 3, 5),
                  kIR_NoError);
        IR::Reference::AccumulateLinear8(bases.data(), rowBytes.data(), weightCase.weights.data(),
                                         count, expected.Data(), expected.RowBytes(), premultiplied,
                                         width, 3);
        EXPECT_LE(MaxDifference(got, expected), 1);
        for (std::int32_t y = 0; y < 3; ++y)
            for (std::int32_t i = 0; i < Image::kPadding; ++i)
                ASSERT_EQ(got.Row(y)[used + static_cast<std::size_t>(i)], 0xA5);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Formats, AccumulateLinearTest,
    ::testing::Combine(::testing::Values(kBGRA8, kBGRP8, kBGRA8 | kIR_FormatBit_BottomLeft,
                                         kBGRP8 | kIR_FormatBit_BottomLeft),
                       ::testing::ValuesIn(kWeightCases)),
    [](const auto& inInfo)
    {
        const IR_PixelFormat format = std::get<0>(inInfo.param);
        return std::string((format & kIR_FormatBit_PremultipliedAlpha) ? "BGRP" : "BGRA") +
               ((format & kIR_FormatBit_BottomLeft) ? "BottomLeft" : "") +
               std::get<1>(inInfo.param).name;
    });

// A half-way mix in linear light is brighter than the mix of the codes, and the transfer
// there and back leaves every code where it was, whatever the association.
TEST(AccumulateLinearValues, MixesInLinearLightAndRoundTripsEveryCode)
{
    for (IR_PixelFormat format : {kBGRA8, kBGRP8})
    {
        SCOPED_TRACE(format);
        Image black(format, 256, 1), white(format, 256, 1), codes(format, 256, 1);
        for (std::int32_t x = 0; x < 256; ++x)
        {
            black.Set(x, 0, {0, 0, 0, 255});
            white.Set(x, 0, {255, 255, 255, 255});
            codes.Set(x, 0, {std::uint8_t(x), std::uint8_t(x), std::uint8_t(255 - x), 255});
        }
        const void* pair[] = {black.Data(), white.Data()};
        const std::int32_t rows[] = {black.RowBytes(), white.RowBytes()};
        const double halves[] = {0.5, 0.5};
        Image mixed(format, 256, 1);
        ASSERT_EQ(
            IR_Accumulate(pair, rows, halves, 2, mixed.Data(), mixed.RowBytes(), format, 256, 1, 5),
            kIR_NoError);
        // Half of linear white encodes to code 188 (0.7354 of full scale).
        EXPECT_EQ(mixed.Get(17, 0), (Pixel{188, 188, 188, 255}));
        // Three sources of the same codes with weights summing to one give the codes back.
        const void* same[] = {codes.Data(), codes.Data(), codes.Data()};
        const std::int32_t sameRows[] = {codes.RowBytes(), codes.RowBytes(), codes.RowBytes()};
        const double thirds[] = {0.25, 0.5, 0.25};
        ASSERT_EQ(IR_Accumulate(same, sameRows, thirds, 3, mixed.Data(), mixed.RowBytes(), format,
                                256, 1, 5),
                  kIR_NoError);
        EXPECT_EQ(MaxDifference(mixed, codes), 0);
    }
}

} // namespace
