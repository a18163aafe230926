// Re-timing and field kernels. Linear-light accumulation (quality 5) against the
// double-precision reference: every 8-bit format it takes, widths covering every vector
// tail, misaligned padded rows, one to three sources, weights that sum to one and
// weights that do not.

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
    {"Halves", {0.5, 0.5}},
    {"Quarter", {0.75, 0.25}},
    {"Thirds", {0.2, 0.5, 0.3}},
    {"Single", {1.0}},
    {"SingleAmongZeros", {0.0, 1.0, 0.0}},
    {"AllZero", {0.0, 0.0}},
    {"AboveOne", {0.8, 0.7}},
    {"BelowOne", {0.3, 0.2}},
    {"Negative", {1.4, -0.4}},
    {"ScaledSingle", {0.6}},
};

using AccumulateLinearTest = ::testing::TestWithParam<std::tuple<IR_PixelFormat, WeightCase>>;

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
            Image& source = sources.emplace_back(format, width, 3, (width + i) % 4);
            source.Randomise(random);
            source.Set(0, 0, {0, 0, 0, 0}); // a transparent pixel and the extremes
            source.Set(width - 1, 2, {255, 255, 255, 255});
            source.Set(width / 2, 1, {1, 10, 12, 255});
            bases.push_back(source.Data()); // moving an image keeps its storage
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
        for (std::int32_t i = 0; i < 3 * Image::kPadding; ++i) // nothing written past the rows
            ASSERT_EQ(got.Row(i / Image::kPadding)[used + std::size_t(i % Image::kPadding)], 0xA5);
        // A pair of weights 1 - w and w in 0..1 is also a dissolve, mixed the same way.
        const std::vector<double>& w = weightCase.weights;
        if (count != 2 || w[1] < 0.0 || w[0] < 0.0 || w[0] + w[1] != 1.0)
            continue;
        ASSERT_EQ(IR_CrossDissolve(bases[0], rowBytes[0], bases[1], rowBytes[1], got.Data(),
                                   got.RowBytes(), format, width, 3, float(w[1]), 5),
                  kIR_NoError);
        EXPECT_LE(MaxDifference(got, expected), 1);
    }
}

INSTANTIATE_TEST_SUITE_P(Formats, AccumulateLinearTest,
                         ::testing::Combine(::testing::Values(kBGRA8, kBGRP8,
                                                              kBGRA8 | kIR_FormatBit_BottomLeft,
                                                              kBGRP8 | kIR_FormatBit_BottomLeft),
                                            ::testing::ValuesIn(kWeightCases)));

// A half-way mix in linear light is brighter than the mix of the codes, and the transfer
// there and back leaves every code where it was, whatever the association.
TEST(AccumulateLinearValues, MixesInLinearLightAndRoundTripsEveryCode)
{
    for (IR_PixelFormat format : {kBGRA8, kBGRP8})
    {
        SCOPED_TRACE(format);
        Image codes(format, 256, 1), white = One(format, {255, 255, 255, 255}),
                                     mixed(format, 256, 1);
        for (std::int32_t x = 0; x < 256; ++x)
            codes.Set(x, 0, {std::uint8_t(x), std::uint8_t(x), std::uint8_t(255 - x), 255});
        // Codes 0 and 255 in equal parts: half of linear white, code 188 (0.7354 of full scale).
        const void* pair[] = {codes.Data(), white.Data()};
        const std::int32_t rows[] = {codes.RowBytes(), white.RowBytes()};
        const double halves[] = {0.5, 0.5};
        ASSERT_EQ(
            IR_Accumulate(pair, rows, halves, 2, mixed.Data(), mixed.RowBytes(), format, 1, 1, 5),
            kIR_NoError);
        EXPECT_EQ(mixed.Get(0, 0), (Pixel{188, 188, 255, 255}));
        // Three sources of the same codes with weights summing to one give the codes back.
        const void* same[] = {codes.Data(), codes.Data(), codes.Data()};
        const std::int32_t sameRows[] = {codes.RowBytes(), codes.RowBytes(), codes.RowBytes()};
        const double parts[] = {0.25, 0.5, 0.25};
        ASSERT_EQ(IR_Accumulate(same, sameRows, parts, 3, mixed.Data(), mixed.RowBytes(), format,
                                256, 1, 5),
                  kIR_NoError);
        EXPECT_EQ(MaxDifference(mixed, codes), 0);
    }
}

// Deinterlacing against means computed here, byte by byte or float by float: every
// interleaved layout, widths covering every vector tail, either field kept, in place
// and by quarter-height field copy.
using DeinterlaceKernelTest = ::testing::TestWithParam<IR_PixelFormat>;

TEST_P(DeinterlaceKernelTest, RebuildsRowsAsTheMeanOfTheKeptRowsAroundThem)
{
    const IR_PixelFormat format = GetParam();
    const bool isFloat = (format & kIR_FormatBit_Float) != 0;
    std::mt19937 random(format);
    // Component k of row y of an image, and the mean the kernels must give.
    const auto at = [&](const Image& inImage, std::int32_t inY, std::size_t inK)
    {
        float f = inImage.Row(inY)[inK];
        if (isFloat)
            std::memcpy(&f, inImage.Row(inY) + 4 * inK, 4);
        return f;
    };
    const auto mean = [&](float inA, float inB)
    { return isFloat ? 0.5f * (inA + inB) : std::floor((inA + inB + 1) / 2); };
    for (std::int32_t width = 1; width <= 67; width += (width < 20 ? 1 : 11))
        for (bool keepSecond : {false, true})
        {
            SCOPED_TRACE(testing::Message() << "width " << width << " second " << keepSecond);
            const std::int32_t height = 7;
            Image source(format, width, height, width % 3);
            const auto bytes = static_cast<std::size_t>(IR_MinimumRowBytes(format, width));
            for (std::int32_t y = 0; y < height && !isFloat; ++y)
                std::generate_n(source.Row(y), bytes, [&] { return std::uint8_t(random()); });
            if (isFloat)
                source.Randomise(random);
            Image frame = Copy(source, 1);
            ASSERT_EQ(IR_Deinterlace(frame.Data(), frame.RowBytes(), format, width, height,
                                     keepSecond, 5),
                      kIR_NoError);
            // Quarter height from the first four rows: the mean of the kept field's two rows.
            Image quarter(format, width, 1, 2);
            ASSERT_EQ(IR_DeinterlaceCopy(source.Data(), source.RowBytes(), 4, quarter.Data(),
                                         quarter.RowBytes(), 1, format, width, keepSecond, 5),
                      kIR_NoError);
            const std::int32_t field = keepSecond ? 1 : 0;
            for (std::size_t k = 0; k < (isFloat ? bytes / 4 : bytes); ++k)
            {
                ASSERT_EQ(at(quarter, 0, k), mean(at(source, field, k), at(source, field + 2, k)));
                for (std::int32_t y = 0; y < height; ++y)
                {
                    const bool kept = (y % 2 == 1) == keepSecond;
                    const float expected =
                        kept ? at(source, y, k)
                             : (y > 0 && y + 1 < height
                                    ? mean(at(source, y - 1, k), at(source, y + 1, k))
                                    : at(source, y > 0 ? y - 1 : y + 1, k));
                    ASSERT_EQ(at(frame, y, k), expected) << "row " << y << " value " << k;
                }
            }
        }
}

INSTANTIATE_TEST_SUITE_P(Layouts, DeinterlaceKernelTest,
                         ::testing::Values(kBGRA8, kBGRP32f, kIR_PixelFormat_VUYA_4444_8u,
                                           kIR_PixelFormat_YUYV_422_8u));

} // namespace
