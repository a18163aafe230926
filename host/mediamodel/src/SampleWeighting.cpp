#include "MF/SampleWeighting.h"

#include "ExactArithmetic.h"
#include "MF/TimeTransform.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cmath>

namespace MF
{
namespace
{

using detail::Int128;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// inDuration * |inRate| rounded to the nearest tick, exact for rates that are
// short fractions (see SpeedToRatio).
TickTime ScaleDuration(std::int64_t inDuration, double inRate)
{
    const SpeedRatio ratio = SpeedToRatio(std::fabs(inRate));
    const Int128 scaled =
        detail::RoundDivide(Int128{inDuration} * ratio.mNumerator, ratio.mDenominator);
    return detail::SaturateToTime(scaled);
}

// The grid point at or below inTime.
Int128 SampleAtOrBelow(TickTime inTime, std::int64_t inPeriod)
{
    return detail::FloorDivide(inTime.GetTicks(), inPeriod) * inPeriod;
}

void SamplesAround(TickTime inTime, std::int64_t inPeriod, TickTime& outA, TickTime& outB)
{
    const Int128 below = SampleAtOrBelow(inTime, inPeriod);
    outA = detail::SaturateToTime(below);
    outB = below == inTime.GetTicks() ? outA : detail::SaturateToTime(below + inPeriod);
}

} // namespace

void CalculateDurationsInMediaTime(const FrameRate& inUpstreamFieldRate,
                                   const FrameRate& inSequenceFrameRate,
                                   const FrameTime& inFrameTime, double inRate,
                                   TickTime& outReferenceDuration, TickTime& outFirstFieldDuration,
                                   TickTime& outSecondFieldDuration)
{
    MVX_INPUT_CONTRACT(inUpstreamFieldRate.GetTicksPerFrame() > 0);
    MVX_INPUT_CONTRACT(inSequenceFrameRate.GetTicksPerFrame() > 0);
    MVX_INPUT_CONTRACT(std::isfinite(inRate));

    const std::int64_t frame = inSequenceFrameRate.GetTicksPerFrame();
    std::int64_t firstSlot = frame;
    std::int64_t secondSlot = frame;
    if (inFrameTime.IsInterlaced())
    {
        // The earlier field ends where the later begins; an odd frame gives
        // the spare tick to the later field.
        const std::int64_t earlier = frame / 2;
        const std::int64_t later = frame - earlier;
        const bool firstIsEarlier =
            inFrameTime.GetFieldOrder() == mvxmediatypes::kFieldType_UpperFirst;
        firstSlot = firstIsEarlier ? earlier : later;
        secondSlot = firstIsEarlier ? later : earlier;
    }

    outReferenceDuration = TickTime::TicksToTime(inUpstreamFieldRate.GetTicksPerFrame());
    outFirstFieldDuration = ScaleDuration(firstSlot, inRate);
    outSecondFieldDuration = ScaleDuration(secondSlot, inRate);
}

void GetSamplesAroundTime(const FrameTime& inFrameTime, const FrameRate& inUpstreamFieldRate,
                          TickTime& outT1a, TickTime& outT1b, TickTime& outT2a, TickTime& outT2b)
{
    MVX_INPUT_CONTRACT(inFrameTime.IsValid());
    MVX_INPUT_CONTRACT(inUpstreamFieldRate.GetTicksPerFrame() > 0);
    const std::int64_t period = inUpstreamFieldRate.GetTicksPerFrame();
    SamplesAround(inFrameTime.GetFirstFieldTime(), period, outT1a, outT1b);
    SamplesAround(inFrameTime.GetSecondFieldTime(), period, outT2a, outT2b);
}

float CalculateSampleWeight(TickTime inFieldTime, TickTime inSampleA, TickTime inSampleB)
{
    MVX_INPUT_CONTRACT(inFieldTime.IsValid());
    MVX_INPUT_CONTRACT(inSampleA.IsValid());
    MVX_INPUT_CONTRACT(inSampleB.IsValid());
    if (inSampleA == inSampleB)
        return 0.0f;
    // 128-bit differences: the extreme times are 2^64 ticks apart.
    const Int128 offset = Int128{inFieldTime.GetTicks()} - inSampleA.GetTicks();
    const Int128 span = Int128{inSampleB.GetTicks()} - inSampleA.GetTicks();
    const double weight = static_cast<double>(offset) / static_cast<double>(span);
    return static_cast<float>(std::clamp(weight, 0.0, 1.0));
}

void GetWeightedSamplesForRange(TickTime inStart, TickTime inEnd,
                                const FrameRate& inUpstreamFieldRate, std::int32_t inFieldNumber,
                                WeightedSampleList& outSamples)
{
    MVX_INPUT_CONTRACT(inStart.IsValid());
    MVX_INPUT_CONTRACT(inEnd.IsValid());
    MVX_INPUT_CONTRACT(inStart <= inEnd);
    MVX_INPUT_CONTRACT(inUpstreamFieldRate.GetTicksPerFrame() > 0);
    MVX_INPUT_CONTRACT(inFieldNumber == 1 || inFieldNumber == 2);

    const std::int64_t period = inUpstreamFieldRate.GetTicksPerFrame();
    const Int128 start = inStart.GetTicks();
    const Int128 end = inEnd.GetTicks();
    const Int128 first = SampleAtOrBelow(inStart, period);

    outSamples.clear();
    if (start == end)
    {
        outSamples.push_back({{detail::SaturateToTime(first), inFieldNumber}, 1.0});
        return;
    }

    // Samples first, first + P, ... up to the last one that begins before end.
    const Int128 count = detail::FloorDivide(end - 1 - first, period) + 1;
    MVX_INPUT_CONTRACT(count <= static_cast<Int128>(kMaxSamplesPerRange));
    outSamples.reserve(static_cast<std::size_t>(count));
    for (Int128 sample = first; sample < end; sample += period)
    {
        const Int128 overlap = std::min(end, sample + period) - std::max(start, sample);
        const double weight = static_cast<double>(overlap) / static_cast<double>(period);
        outSamples.push_back({{detail::SaturateToTime(sample), inFieldNumber}, weight});
    }
}

void NormalizeSampleWeights(WeightedSampleList& ioSamples)
{
    double sum = 0.0;
    for (const WeightedSample& sample : ioSamples)
    {
        MVX_INPUT_CONTRACT(std::isfinite(sample.second) && sample.second >= 0.0);
        sum += sample.second;
    }
    MVX_INPUT_CONTRACT(std::isfinite(sum));
    if (ioSamples.empty())
        return;
    if (sum == 0.0)
    {
        const double share = 1.0 / static_cast<double>(ioSamples.size());
        for (WeightedSample& sample : ioSamples)
            sample.second = share;
        return;
    }
    for (WeightedSample& sample : ioSamples)
        sample.second /= sum;
}

} // namespace MF
