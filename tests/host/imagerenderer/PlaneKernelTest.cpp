// The kernels of 8-bit planes on every instruction set, with widths covering every
// vector tail and rows of their own lengths and misalignments: weighted sums against
// the exact weighted sum computed in double (also in place, with more sources than
// the stack holds, and the contract on the weights), and halving against the exact
// mean of each 2x2 block.

#include "ContractExpect.h"
#include "IR/PlaneAccumulate.h"
#include "IR/PlaneHalve.h"

#include <cmath>
#include <random>
#include <vector>

#include <gtest/gtest.h>
#include <hwy/targets.h>

namespace
{

constexpr std::uint8_t kPad = 0xA5;
constexpr std::int32_t kHeight = 3;
constexpr std::int32_t kWidths[] = {1, 2, 3, 7, 15, 16, 17, 31, 33, 63, 65, 130};

// A plane of inRows rows of inWidth samples, inSlack padding bytes after each row
// and inMisalign bytes before the first.
struct Plane
{
    Plane(std::int32_t inWidth, std::int32_t inSlack, std::int32_t inMisalign,
          std::int32_t inRows = kHeight)
        : rowBytes(inWidth + inSlack)
        , misalign(inMisalign)
        , storage(static_cast<std::size_t>(rowBytes * inRows + inMisalign), kPad)
    {
    }
    std::uint8_t* Data() { return storage.data() + misalign; }
    std::uint8_t& At(std::int32_t inX, std::int32_t inY) { return Data()[inY * rowBytes + inX]; }
    std::uint8_t At(std::int32_t inX, std::int32_t inY) const
    {
        return storage[static_cast<std::size_t>(misalign + inY * rowBytes + inX)];
    }

    std::int32_t rowBytes;
    std::int32_t misalign;
    std::vector<std::uint8_t> storage;
};

struct WeightCase
{
    const char* name;
    std::vector<double> weights;
    bool inPlace = false;
};

void PrintTo(const WeightCase& inCase, std::ostream* outStream)
{
    *outStream << inCase.name;
}

const WeightCase kCases[] = {
    {"Halves", {0.5, 0.5}},
    {"Quarter", {0.75, 0.25}},
    {"Thirds", {1.0 / 3, 1.0 / 3, 1.0 / 3}},
    {"Uneven", {0.1, 0.2, 0.3, 0.4}},
    {"BelowOne", {0.3, 0.2}},
    {"Single", {1.0}},
    {"SingleAmongZeros", {0.0, 1.0, 0.0}},
    {"AllZero", {0.0, 0.0}},
    {"HalvesInPlace", {0.5, 0.5}, true},
    {"BeyondTheStack", std::vector<double>(20, 0.05)},
};

void Check(const WeightCase& inCase, std::int32_t inWidth)
{
    const auto count = static_cast<std::int32_t>(inCase.weights.size());
    std::mt19937 random(static_cast<std::uint32_t>(inWidth * 97 + count));
    std::uniform_int_distribution<int> sample(0, 255);
    std::vector<Plane> sources;
    for (std::int32_t k = 0; k < count; ++k)
    {
        Plane& source = sources.emplace_back(inWidth, k + 1, (inWidth + k) % 5);
        for (std::int32_t y = 0; y < kHeight; ++y)
            for (std::int32_t x = 0; x < inWidth; ++x)
                source.At(x, y) = static_cast<std::uint8_t>(sample(random));
        source.At(0, 0) = 255; // the extremes
        source.At(inWidth - 1, kHeight - 1) = 0;
    }
    std::vector<const std::uint8_t*> bases;
    std::vector<std::int32_t> rowBytes;
    for (Plane& source : sources)
    {
        bases.push_back(source.Data());
        rowBytes.push_back(source.rowBytes);
    }
    const std::vector<Plane> originals = sources;
    Plane separate(inWidth, 7, 3);
    Plane& out = inCase.inPlace ? sources[0] : separate;
    ASSERT_EQ(IR_AccumulatePlane8(bases.data(), rowBytes.data(), inCase.weights.data(), count,
                                  out.Data(), out.rowBytes, inWidth, kHeight),
              kIR_NoError);

    const bool halves = inCase.weights == std::vector<double>{0.5, 0.5};
    for (std::int32_t y = 0; y < kHeight; ++y)
    {
        for (std::int32_t x = 0; x < inWidth; ++x)
        {
            double exact = 0.0;
            for (std::int32_t k = 0; k < count; ++k)
                exact += inCase.weights[k] * originals[k].At(x, y);
            const int got = out.At(x, y);
            ASSERT_LE(std::fabs(got - exact), 0.5 + count / 128.0) << "x " << x << " y " << y;
            if (halves)
            {
                ASSERT_EQ(got, static_cast<int>(std::floor(exact + 0.5))) << "x " << x;
            }
        }
        for (std::int32_t b = inWidth; b < out.rowBytes; ++b)
            ASSERT_EQ(out.At(b, y), kPad) << "padding of row " << y;
    }
}

using PlaneAccumulateTest = ::testing::TestWithParam<WeightCase>;

TEST_P(PlaneAccumulateTest, MatchesTheExactSumAtEveryTailOnEveryInstructionSet)
{
    for (const std::int64_t target : hwy::SupportedAndGeneratedTargets())
    {
        SCOPED_TRACE(hwy::TargetName(target));
        hwy::SetSupportedTargetsForTest(target);
        for (std::int32_t width : kWidths)
        {
            SCOPED_TRACE(testing::Message() << "width " << width);
            Check(GetParam(), width);
        }
    }
    hwy::SetSupportedTargetsForTest(0);
}

INSTANTIATE_TEST_SUITE_P(Weights, PlaneAccumulateTest, ::testing::ValuesIn(kCases),
                         [](const auto& inInfo) { return std::string(inInfo.param.name); });

TEST(PlaneHalveTest, EverySampleIsTheRoundedMeanOfItsBlockOnEveryInstructionSet)
{
    for (const std::int64_t target : hwy::SupportedAndGeneratedTargets())
    {
        SCOPED_TRACE(hwy::TargetName(target));
        hwy::SetSupportedTargetsForTest(target);
        for (std::int32_t width : kWidths)
        {
            SCOPED_TRACE(testing::Message() << "width " << width);
            std::mt19937 random(static_cast<std::uint32_t>(width));
            Plane source(2 * width, 3, width % 4, 2 * kHeight);
            for (std::uint8_t& sample : source.storage)
                sample = static_cast<std::uint8_t>(random());
            Plane out(width, 5, 1);
            ASSERT_EQ(IR_HalvePlane8(source.Data(), source.rowBytes, out.Data(), out.rowBytes,
                                     width, kHeight),
                      kIR_NoError);
            for (std::int32_t y = 0; y < kHeight; ++y)
            {
                for (std::int32_t x = 0; x < width; ++x)
                {
                    const double mean =
                        (source.At(2 * x, 2 * y) + source.At(2 * x + 1, 2 * y) +
                         source.At(2 * x, 2 * y + 1) + source.At(2 * x + 1, 2 * y + 1)) /
                        4.0;
                    ASSERT_EQ(out.At(x, y), std::floor(mean + 0.5)) << "x " << x << " y " << y;
                }
                for (std::int32_t b = width; b < out.rowBytes; ++b)
                    ASSERT_EQ(out.At(b, y), kPad) << "padding of row " << y;
            }
        }
    }
    hwy::SetSupportedTargetsForTest(0);
}

TEST(PlaneAccumulateContractTest, RejectsWeightsOutsideOneAndMissingPlanes)
{
    std::uint8_t a[4] = {}, out[4] = {};
    const std::uint8_t* sources[2] = {a, a};
    const std::int32_t rowBytes[2] = {4, 4};
    const auto call = [&](std::vector<double> inWeights, const std::uint8_t* inSecond)
    {
        sources[1] = inSecond;
        IR_AccumulatePlane8(sources, rowBytes, inWeights.data(), 2, out, 4, 4, 1);
    };
    EXPECT_INPUT_CONTRACT(call({0.6, 0.6}, a), "total <= 1.0 + 1e-6");
    EXPECT_INPUT_CONTRACT(call({1.2, -0.2}, a),
                          "std::isfinite(inWeights[k]) && inWeights[k] >= 0.0 && inWeights[k] <= "
                          "1.0");
    EXPECT_INPUT_CONTRACT(call({0.5, 0.5}, nullptr),
                          "inSrcs[k] != nullptr && inSrcRowBytes[k] >= inWidth");
}

} // namespace
