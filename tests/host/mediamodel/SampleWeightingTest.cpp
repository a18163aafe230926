#include "MF/SampleWeighting.h"

#include "ContractExpect.h"

#include <limits>
#include <numeric>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// Interlaced 29.97 material: 23,543,520 ticks per frame, P = 11,771,760 per field.
constexpr std::int64_t kFrame = 23'543'520;
constexpr std::int64_t kField = kFrame / 2;
const FrameRate kFieldRate = mvxmediatypes::kFrameRate_Video5994;
const FrameRate kSequenceRate = mvxmediatypes::kFrameRate_Video2997;

TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// inHalves half fields: Fields(5) is 2.5 P.
TickTime HalfFields(std::int64_t inHalves)
{
    return Ticks(inHalves * kField / 2);
}

TickTime Fields(std::int64_t inFields)
{
    return Ticks(inFields * kField);
}

double SumOf(const MF::WeightedSampleList& inSamples)
{
    return std::accumulate(inSamples.begin(), inSamples.end(), 0.0,
                           [](double inSum, const MF::WeightedSample& inSample)
                           { return inSum + inSample.second; });
}

class SampleWeightingTest : public ::testing::Test
{
protected:
    struct Durations
    {
        TickTime mReference;
        TickTime mFirst;
        TickTime mSecond;
    };

    static Durations DurationsFor(const FrameRate& inUpstream, const MF::FrameTime& inTime,
                                  double inRate)
    {
        Durations durations;
        MF::CalculateDurationsInMediaTime(inUpstream, kSequenceRate, inTime, inRate,
                                          durations.mReference, durations.mFirst,
                                          durations.mSecond);
        return durations;
    }
};

TEST_F(SampleWeightingTest, SpeedOneOnTheGridGivesThreeEqualDurations)
{
    const MF::FrameTime request(Fields(8), Fields(9));
    const Durations durations = DurationsFor(kFieldRate, request, 1.0);
    EXPECT_EQ(durations.mReference, Fields(1));
    EXPECT_EQ(durations.mFirst, Fields(1));
    EXPECT_EQ(durations.mSecond, Fields(1));
}

TEST_F(SampleWeightingTest, DurationsScaleWithTheRateAndIgnoreItsSign)
{
    const MF::FrameTime request(Fields(20), HalfFields(45));
    Durations durations = DurationsFor(kFieldRate, request, 2.5);
    EXPECT_EQ(durations.mReference, Fields(1));
    EXPECT_EQ(durations.mFirst, Ticks(29'429'400));
    EXPECT_EQ(durations.mSecond, Ticks(29'429'400));

    durations = DurationsFor(kFieldRate, request, 0.5);
    EXPECT_EQ(durations.mFirst, Ticks(5'885'880));
    EXPECT_EQ(durations.mSecond, Ticks(5'885'880));

    durations = DurationsFor(kFieldRate, request, -2.5);
    EXPECT_EQ(durations.mFirst, Ticks(29'429'400));
}

TEST_F(SampleWeightingTest, ProgressiveOutputCoversTheWholeFrame)
{
    // 29.97p upstream, progressive request at speed 1: nothing to blend.
    Durations durations =
        DurationsFor(mvxmediatypes::kFrameRate_Video2997, MF::FrameTime(Fields(8)), 1.0);
    EXPECT_EQ(durations.mReference, Ticks(kFrame));
    EXPECT_EQ(durations.mFirst, Ticks(kFrame));
    EXPECT_EQ(durations.mSecond, Ticks(kFrame));

    // Interlaced upstream, progressive output at 2.5: five fields per frame.
    durations = DurationsFor(kFieldRate, MF::FrameTime(Fields(8)), 2.5);
    EXPECT_EQ(durations.mSecond, Fields(5));
}

TEST_F(SampleWeightingTest, OddSequenceFrameGivesTheSpareTickToTheLaterField)
{
    const FrameRate oddRate = FrameRate::Create(1001);
    TickTime reference, first, second;
    MF::CalculateDurationsInMediaTime(kFieldRate, oddRate, MF::FrameTime(Ticks(0), Ticks(500)), 1.0,
                                      reference, first, second);
    EXPECT_EQ(first, Ticks(500));
    EXPECT_EQ(second, Ticks(501));
    // Lower field first: the first slot is the later field.
    MF::CalculateDurationsInMediaTime(kFieldRate, oddRate, MF::FrameTime(Ticks(500), Ticks(0)), 1.0,
                                      reference, first, second);
    EXPECT_EQ(first, Ticks(501));
    EXPECT_EQ(second, Ticks(500));
}

TEST_F(SampleWeightingTest, HalfSpeedBlendsTheTwoFieldsAroundEachFieldTime)
{
    // Output frame 9 of an upper-first 29.97i sequence at speed 0.5: clip time
    // (18P, 19P) is media time (9P, 9.5P).
    const MF::FrameTime request(Fields(9), HalfFields(19));
    TickTime t1a, t1b, t2a, t2b;
    MF::GetSamplesAroundTime(request, kFieldRate, t1a, t1b, t2a, t2b);
    // The first field lies on upstream field 9: one sample, nothing to blend.
    EXPECT_EQ(t1a, Fields(9));
    EXPECT_EQ(t1b, Fields(9));
    EXPECT_EQ(MF::CalculateSampleWeight(request.GetFirstFieldTime(), t1a, t1b), 0.0f);
    // The second field lies half-way between fields 9 and 10.
    EXPECT_EQ(t2a, Fields(9));
    EXPECT_EQ(t2b, Fields(10));
    EXPECT_EQ(MF::CalculateSampleWeight(request.GetSecondFieldTime(), t2a, t2b), 0.5f);
}

TEST_F(SampleWeightingTest, SampleWeightIsTheShareOfTheLaterSample)
{
    EXPECT_EQ(MF::CalculateSampleWeight(Ticks(4 * kField + kField / 4), Fields(4), Fields(5)),
              0.25f);
    EXPECT_EQ(MF::CalculateSampleWeight(Fields(4), Fields(4), Fields(5)), 0.0f);
    EXPECT_EQ(MF::CalculateSampleWeight(Fields(5), Fields(4), Fields(5)), 1.0f);
    // Outside the pair the weight is clamped.
    EXPECT_EQ(MF::CalculateSampleWeight(Fields(7), Fields(4), Fields(5)), 1.0f);
    EXPECT_EQ(MF::CalculateSampleWeight(Fields(2), Fields(4), Fields(5)), 0.0f);
}

TEST_F(SampleWeightingTest, SamplesAroundNegativeTimesRoundDown)
{
    TickTime t1a, t1b, t2a, t2b;
    MF::GetSamplesAroundTime(MF::FrameTime(Ticks(-1), Ticks(kField - 1)), kFieldRate, t1a, t1b, t2a,
                             t2b);
    EXPECT_EQ(t1a, Fields(-1));
    EXPECT_EQ(t1b, Fields(0));
    EXPECT_EQ(t2a, Fields(0));
    EXPECT_EQ(t2b, Fields(1));
}

TEST_F(SampleWeightingTest, TwoAndAHalfSpeedAccumulatesEveryFieldInTheSpan)
{
    // Output frame 4 (clip time 8P, 9P) at speed 2.5: media (20P, 22.5P); each
    // output field spans 2.5 upstream fields.
    const MF::FrameTime request(Fields(20), HalfFields(45));
    const Durations durations = DurationsFor(kFieldRate, request, 2.5);
    ASSERT_GT(durations.mFirst, durations.mReference);

    MF::WeightedSampleList first;
    MF::GetWeightedSamplesForRange(request.GetFirstFieldTime(),
                                   request.GetFirstFieldTime() + durations.mFirst, kFieldRate, 1,
                                   first);
    ASSERT_EQ(first.size(), 3u);
    EXPECT_EQ(first[0], (MF::WeightedSample{{Fields(20), 1}, 1.0}));
    EXPECT_EQ(first[1], (MF::WeightedSample{{Fields(21), 1}, 1.0}));
    EXPECT_EQ(first[2], (MF::WeightedSample{{Fields(22), 1}, 0.5}));
    MF::NormalizeSampleWeights(first);
    EXPECT_DOUBLE_EQ(first[0].second, 0.4);
    EXPECT_DOUBLE_EQ(first[1].second, 0.4);
    EXPECT_DOUBLE_EQ(first[2].second, 0.2);
    EXPECT_NEAR(SumOf(first), 1.0, 1e-15);

    MF::WeightedSampleList second;
    MF::GetWeightedSamplesForRange(request.GetSecondFieldTime(),
                                   request.GetSecondFieldTime() + durations.mSecond, kFieldRate, 2,
                                   second);
    ASSERT_EQ(second.size(), 3u);
    EXPECT_EQ(second[0], (MF::WeightedSample{{Fields(22), 2}, 0.5}));
    EXPECT_EQ(second[1], (MF::WeightedSample{{Fields(23), 2}, 1.0}));
    EXPECT_EQ(second[2], (MF::WeightedSample{{Fields(24), 2}, 1.0}));
    MF::NormalizeSampleWeights(second);
    EXPECT_DOUBLE_EQ(second[0].second, 0.2);
    EXPECT_DOUBLE_EQ(second[2].second, 0.4);
}

TEST_F(SampleWeightingTest, RangeOnExactlyOneSampleGivesOneSampleOfWeightOne)
{
    MF::WeightedSampleList samples{{{Fields(99), 1}, 3.0}}; // replaced, not appended to
    MF::GetWeightedSamplesForRange(Fields(7), Fields(8), kFieldRate, 2, samples);
    ASSERT_EQ(samples.size(), 1u);
    EXPECT_EQ(samples[0], (MF::WeightedSample{{Fields(7), 2}, 1.0}));
    MF::NormalizeSampleWeights(samples);
    EXPECT_EQ(samples[0].second, 1.0);
}

TEST_F(SampleWeightingTest, RangeInsideOneSampleGivesThatSample)
{
    MF::WeightedSampleList samples;
    MF::GetWeightedSamplesForRange(Ticks(7 * kField + 10), Ticks(7 * kField + 20), kFieldRate, 1,
                                   samples);
    ASSERT_EQ(samples.size(), 1u);
    EXPECT_EQ(samples[0].first, (MF::Sample{Fields(7), 1}));
    EXPECT_DOUBLE_EQ(samples[0].second, 10.0 / kField);

    // An empty range is a point: the sample that contains it.
    MF::GetWeightedSamplesForRange(Ticks(7 * kField + 10), Ticks(7 * kField + 10), kFieldRate, 1,
                                   samples);
    ASSERT_EQ(samples.size(), 1u);
    EXPECT_EQ(samples[0], (MF::WeightedSample{{Fields(7), 1}, 1.0}));
}

TEST_F(SampleWeightingTest, RangeAcrossZeroStartsAtTheSampleBelow)
{
    MF::WeightedSampleList samples;
    MF::GetWeightedSamplesForRange(HalfFields(-1), HalfFields(1), kFieldRate, 1, samples);
    ASSERT_EQ(samples.size(), 2u);
    EXPECT_EQ(samples[0], (MF::WeightedSample{{Fields(-1), 1}, 0.5}));
    EXPECT_EQ(samples[1], (MF::WeightedSample{{Fields(0), 1}, 0.5}));
}

TEST_F(SampleWeightingTest, NormalizeHandlesEmptyAndAllZeroLists)
{
    MF::WeightedSampleList empty;
    MF::NormalizeSampleWeights(empty);
    EXPECT_TRUE(empty.empty());

    MF::WeightedSampleList zeros{
        {{Fields(1), 1}, 0.0}, {{Fields(2), 1}, 0.0}, {{Fields(3), 1}, 0.0}, {{Fields(4), 1}, 0.0}};
    MF::NormalizeSampleWeights(zeros);
    for (const MF::WeightedSample& sample : zeros)
        EXPECT_EQ(sample.second, 0.25);
}

TEST_F(SampleWeightingTest, ManyFieldsSumToOneAfterNormalising)
{
    // Speed 7.3 over a progressive 23.976 upstream: one 29.97 output frame
    // covers 7.3 * 0.8 = 5.84 upstream frames, starting off the grid.
    const FrameRate upstream = mvxmediatypes::kFrameRate_Video2398;
    TickTime reference, first, second;
    MF::CalculateDurationsInMediaTime(upstream, kSequenceRate, MF::FrameTime(Ticks(12345)), 7.3,
                                      reference, first, second);
    MF::WeightedSampleList samples;
    MF::GetWeightedSamplesForRange(Ticks(12345), Ticks(12345) + second, upstream, 2, samples);
    EXPECT_EQ(samples.size(), 6u);
    for (std::size_t index = 1; index < samples.size(); ++index)
        EXPECT_EQ(samples[index].first.first - samples[index - 1].first.first,
                  upstream.GetFrameDuration());
    MF::NormalizeSampleWeights(samples);
    EXPECT_NEAR(SumOf(samples), 1.0, 1e-12);
}

TEST_F(SampleWeightingTest, BadArgumentsBreakContracts)
{
    const double kNaN = std::numeric_limits<double>::quiet_NaN();
    MF::WeightedSampleList samples;
    EXPECT_INPUT_CONTRACT(
        MF::GetWeightedSamplesForRange(Fields(2), Fields(1), kFieldRate, 1, samples),
        "inStart <= inEnd");
    EXPECT_INPUT_CONTRACT(
        MF::GetWeightedSamplesForRange(Fields(1), Fields(2), kFieldRate, 3, samples),
        "inFieldNumber == 1 || inFieldNumber == 2");
    EXPECT_INPUT_CONTRACT(MF::GetWeightedSamplesForRange(
                              Fields(1), Fields(2), mvxmediatypes::kFrameRate_Zero, 1, samples),
                          "inUpstreamFieldRate.GetTicksPerFrame() > 0");
    // A range of the whole time line would be 10^12 samples: refused.
    EXPECT_INPUT_CONTRACT(MF::GetWeightedSamplesForRange(mvxmediatypes::kTime_Min,
                                                         mvxmediatypes::kTime_Max, kFieldRate, 1,
                                                         samples),
                          "count <= static_cast<Int128>(kMaxSamplesPerRange)");
    EXPECT_INPUT_CONTRACT(MF::GetWeightedSamplesForRange(mvxmediatypes::kTime_Invalid, Fields(1),
                                                         kFieldRate, 1, samples),
                          "inStart.IsValid()");

    MF::WeightedSampleList negative{{{Fields(1), 1}, -0.5}};
    EXPECT_INPUT_CONTRACT(MF::NormalizeSampleWeights(negative),
                          "std::isfinite(sample.second) && sample.second >= 0.0");
    EXPECT_EQ(negative[0].second, -0.5);

    TickTime a, b, c;
    EXPECT_INPUT_CONTRACT(MF::CalculateDurationsInMediaTime(kFieldRate, kSequenceRate,
                                                            MF::FrameTime(), kNaN, a, b, c),
                          "std::isfinite(inRate)");
    EXPECT_INPUT_CONTRACT(MF::CalculateDurationsInMediaTime(mvxmediatypes::kFrameRate_Zero,
                                                            kSequenceRate, MF::FrameTime(), 1.0, a,
                                                            b, c),
                          "inUpstreamFieldRate.GetTicksPerFrame() > 0");
    EXPECT_INPUT_CONTRACT(MF::GetSamplesAroundTime(MF::FrameTime(mvxmediatypes::kTime_Invalid),
                                                   kFieldRate, a, b, c, c),
                          "inFrameTime.IsValid()");
    EXPECT_INPUT_CONTRACT(MF::CalculateSampleWeight(mvxmediatypes::kTime_Invalid, a, b),
                          "inFieldTime.IsValid()");
}

} // namespace
