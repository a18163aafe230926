#include "MF/SampleWeighting.h"

#include "ContractExpect.h"

#include <tuple>

#include <gtest/gtest.h>

namespace
{

using namespace mvxmediatypes;

using Weighted = MF::WeightedSample;

// Interlaced 29.97 material: 23,543,520 ticks per frame, P = 11,771,760 per field.
constexpr std::int64_t kFrame = 23'543'520;
constexpr std::int64_t kField = kFrame / 2;
const FrameRate kFieldRate = kFrameRate_Video5994;
const FrameRate kSequenceRate = kFrameRate_Video2997;
constexpr auto Ticks = &TickTime::TicksToTime;

// Whole and half field periods: HalfFields(5) is 2.5 P.
const auto Fields = [](std::int64_t inFields) { return Ticks(inFields * kField); };
const auto HalfFields = [](std::int64_t inHalves) { return Ticks(inHalves * kField / 2); };

// The reference, first-field and second-field durations in media time.
std::tuple<TickTime, TickTime, TickTime> Durations(const FrameRate& inUpstream,
                                                   const FrameRate& inSequence,
                                                   const MF::FrameTime& inTime, double inRate)
{
    TickTime reference, first, second;
    MF::CalculateDurationsInMediaTime(inUpstream, inSequence, inTime, inRate, reference, first,
                                      second);
    return {reference, first, second};
}

MF::WeightedSampleList Range(TickTime inStart, TickTime inEnd, const FrameRate& inRate, int inField)
{
    MF::WeightedSampleList samples{{{Fields(99), 1}, 3.0}}; // replaced, not appended to
    MF::GetWeightedSamplesForRange(inStart, inEnd, inRate, inField, samples);
    return samples;
}

using SampleWeightingTest = ::testing::Test;

TEST_F(SampleWeightingTest, RangesWeighEachSampleByTheShareItCovers)
{
    // Output frame 4 at speed 2.5: media (20P, 22.5P); each output field spans
    // 2.5 upstream fields.
    MF::WeightedSampleList first = Range(Fields(20), HalfFields(45), kFieldRate, 1);
    EXPECT_EQ(first, (MF::WeightedSampleList{
                         {{Fields(20), 1}, 1.0}, {{Fields(21), 1}, 1.0}, {{Fields(22), 1}, 0.5}}));
    MF::NormalizeSampleWeights(first);
    EXPECT_EQ(std::tuple(first[0].second, first[1].second, first[2].second),
              std::tuple(0.4, 0.4, 0.2));
    EXPECT_EQ(Range(HalfFields(45), Fields(25), kFieldRate, 2),
              (MF::WeightedSampleList{
                  {{Fields(22), 2}, 0.5}, {{Fields(23), 2}, 1.0}, {{Fields(24), 2}, 1.0}}));
    // An empty range is the sample holding it.
    const TickTime inside = Ticks(7 * kField + 10);
    EXPECT_EQ(Range(inside, inside, kFieldRate, 1),
              (MF::WeightedSampleList{{{Fields(7), 1}, 1.0}}));
    // Across zero the range starts at the sample below.
    EXPECT_EQ(Range(HalfFields(-1), HalfFields(1), kFieldRate, 1),
              (MF::WeightedSampleList{{{Fields(-1), 1}, 0.5}, {{Fields(0), 1}, 0.5}}));
    // All zero weights: equal shares; none: nothing.
    MF::WeightedSampleList samples(4, {{Fields(1), 1}, 0.0});
    MF::NormalizeSampleWeights(samples);
    for (const Weighted& sample : samples)
        EXPECT_EQ(sample.second, 0.25);
    samples.clear();
    MF::NormalizeSampleWeights(samples);
    EXPECT_TRUE(samples.empty());
}

TEST_F(SampleWeightingTest, AnOddFrameGivesTheSpareTickToTheLaterFieldAlsoWhenItComesFirst)
{
    EXPECT_EQ(
        Durations(kFieldRate, FrameRate::Create(1001), MF::FrameTime(Ticks(500), Ticks(0)), 1.0),
        std::tuple(Fields(1), Ticks(501), Ticks(500)));
}

TEST_F(SampleWeightingTest, BadArgumentsBreakContracts)
{
    MF::WeightedSampleList samples;
    EXPECT_INPUT_CONTRACT(
        MF::GetWeightedSamplesForRange(Fields(2), Fields(1), kFieldRate, 1, samples),
        "inStart <= inEnd");
    EXPECT_INPUT_CONTRACT(
        MF::GetWeightedSamplesForRange(Fields(1), Fields(2), kFieldRate, 3, samples),
        "inFieldNumber == 1 || inFieldNumber == 2");
    // A range of the whole time line would be 10^12 samples: refused.
    EXPECT_INPUT_CONTRACT(
        MF::GetWeightedSamplesForRange(kTime_Min, kTime_Max, kFieldRate, 1, samples),
        "count <= static_cast<Int128>(kMaxSamplesPerRange)");
    MF::WeightedSampleList negative{{{Fields(1), 1}, -0.5}};
    EXPECT_INPUT_CONTRACT(MF::NormalizeSampleWeights(negative),
                          "std::isfinite(sample.second) && sample.second >= 0.0");
    EXPECT_INPUT_CONTRACT(Durations(kFrameRate_Zero, kSequenceRate, MF::FrameTime(), 1.0),
                          "inUpstreamFieldRate.GetTicksPerFrame() > 0");
    TickTime a, b;
    EXPECT_INPUT_CONTRACT(
        MF::GetSamplesAroundTime(MF::FrameTime(kTime_Invalid), kFieldRate, a, b, a, b),
        "inFrameTime.IsValid()");
    EXPECT_INPUT_CONTRACT(MF::CalculateSampleWeight(kTime_Invalid, a, b), "inFieldTime.IsValid()");
}

} // namespace
