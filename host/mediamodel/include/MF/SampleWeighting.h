#pragma once

// Sample weighting for frame blending: which upstream samples (fields, or
// frames of progressive material) make up an output field that falls between
// them, and with which weights.
//
// Conventions of the whole family:
// - All times and durations are TickTimes (705,600,000 ticks per second). The
//   examples below use an interlaced 29.97 upstream: its field rate is
//   kFrameRate_Video5994, P = 11,771,760 ticks per field, so the samples lie
//   at the multiples of P (the field grid is anchored at time zero).
// - A sample is (time on the upstream grid, output field number 1 or 2); the
//   field number says which output field the sample feeds, so the same
//   upstream time may appear once per output field. Sample lists are vectors
//   of (sample, weight).
// - Sample n stands for the half-open span [n * P, (n + 1) * P).
// - The frame times handed in are in media time (already mapped by the clip's
//   speed); the sequence frame rate and the rate value say how much media
//   time one output field covers.
// - Bad arguments (invalid times, a rate that is not positive, a field number
//   other than 1 or 2, a range running backwards or covering more than
//   kMaxSamplesPerRange samples) violate an input contract.
// - Pure functions; safe from any thread.

#include "MF/FrameTime.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/TickTime.h"

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

namespace MF
{

// (time on the upstream sample grid, output field number 1 or 2).
using Sample = std::pair<mvxmediatypes::TickTime, std::int32_t>;
// (sample, weight).
using WeightedSample = std::pair<Sample, double>;
using WeightedSampleList = std::vector<WeightedSample>;

// The most samples one range may produce (a speed of several thousand); a
// longer range is refused rather than filling memory.
inline constexpr std::size_t kMaxSamplesPerRange = 65536;

// The three durations that decide how an output frame is blended:
// - outReferenceDuration: one upstream sample period, P (the ticks per frame
//   of inUpstreamFieldRate);
// - outFirstFieldDuration / outSecondFieldDuration: the media time covered by
//   the output's first-slot and second-slot field, that is the field's
//   duration in sequence time times |inRate|, rounded to the nearest tick.
// An interlaced inFrameTime splits the sequence frame F into an earlier field
// of F / 2 ticks and a later field of F - F / 2 ticks; a progressive one
// covers the whole frame F in both results. The sign of inRate (reverse
// playback) does not change the spans. Input contracts: both rates positive,
// inRate finite.
//
// Example: 29.97i upstream (P = 11,771,760), 29.97i sequence (F =
// 23,543,520), interlaced frame time, rate 2.5: outReferenceDuration = P,
// both field durations 2.5 * P = 29,429,400 (more than P: accumulate every
// sample in the span). Rate 0.5: both 0.5 * P = 5,885,880 (two-sample blend).
// Rate 1: all three equal P.
void CalculateDurationsInMediaTime(const mvxmediatypes::FrameRate& inUpstreamFieldRate,
                                   const mvxmediatypes::FrameRate& inSequenceFrameRate,
                                   const FrameTime& inFrameTime, double inRate,
                                   mvxmediatypes::TickTime& outReferenceDuration,
                                   mvxmediatypes::TickTime& outFirstFieldDuration,
                                   mvxmediatypes::TickTime& outSecondFieldDuration);

// The upstream samples around each field time: outA is the field time
// rounded down to the grid, outB the next sample; a field time that lies on
// the grid gives outA = outB = that time (nothing to blend, one fetch).
//
// Example (P as above): frame time (4.5 * P, 5 * P) gives t1a = 4P, t1b = 5P,
// t2a = t2b = 5P.
void GetSamplesAroundTime(const FrameTime& inFrameTime,
                          const mvxmediatypes::FrameRate& inUpstreamFieldRate,
                          mvxmediatypes::TickTime& outT1a, mvxmediatypes::TickTime& outT1b,
                          mvxmediatypes::TickTime& outT2a, mvxmediatypes::TickTime& outT2b);

// The weight with which sample B is blended over sample A for a field at
// inFieldTime: (inFieldTime - A) / (B - A), clamped to [0, 1]; 0 when A and
// B are the same sample. The result is the share of B; A gets 1 - weight.
//
// Example: CalculateSampleWeight(4.25 * P, 4P, 5P) = 0.25.
float CalculateSampleWeight(mvxmediatypes::TickTime inFieldTime, mvxmediatypes::TickTime inSampleA,
                            mvxmediatypes::TickTime inSampleB);

// Replaces outSamples with the samples whose spans overlap [inStart, inEnd),
// in time order, each tagged with inFieldNumber and weighted by the part of
// its span inside the range (overlap in ticks / P: 1 for a sample wholly
// inside). An empty range (inStart == inEnd) gives the one sample containing
// inStart with weight 1.
//
// Example (P as above): [20P, 22.5P) gives (20P, 1.0), (21P, 1.0), (22P,
// 0.5); [7P, 8P) gives only (7P, 1.0).
void GetWeightedSamplesForRange(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                                const mvxmediatypes::FrameRate& inUpstreamFieldRate,
                                std::int32_t inFieldNumber, WeightedSampleList& outSamples);

// Scales the weights so that they sum to one: (1, 1, 0.5) becomes (0.4, 0.4,
// 0.2). When every weight is zero, each sample gets the same share. An empty
// list stays empty. Input contract: every weight is finite and not negative.
void NormalizeSampleWeights(WeightedSampleList& ioSamples);

} // namespace MF
