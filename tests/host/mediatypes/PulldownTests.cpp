#include "ContractExpect.h"
#include "mvxmediatypes/Pulldown.h"

#include <cstdint>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using vrtest::ExpectInputContract;

struct Placement
{
    std::int64_t videoFrame;
    bool split; // the film frame's two fields straddle videoFrame - 1 and
                // videoFrame
};

// Where film frames 0..3 of each cycle land, by cadence. The 2:3 field pattern
// AABBBCCDDD repeats every ten fields; video frame 0 starts at field 2 x
// (cadence - 1) of the pattern, and film frame 0 is the first whose first field
// is at or after field 0. A film frame lies in the video frame that holds two
// of its fields, or straddles two and is answered by the later one.
//   AA: AA BB BC CD DD    BB: BB BC CD DD AA    BC: BC CD DD AA BB
//   CD: CD DD AA BB BC    DD: DD AA BB BC CD
const Placement kCycle[5][4] = {
    {{0, false}, {1, false}, {3, true}, {4, false}}, // AA: A B C D
    {{0, false}, {2, true}, {3, false}, {4, false}}, // BB: B C D A
    {{1, true}, {2, false}, {3, false}, {4, false}}, // BC: C D A B
    {{1, false}, {2, false}, {3, false}, {5, true}}, // CD: D A B C
    {{1, false}, {2, false}, {4, true}, {5, false}}, // DD: A B C D
};

const auto FloorDiv = [](std::int64_t inValue, std::int64_t inDivisor)
{ return inValue >= 0 ? inValue / inDivisor : -((-inValue + inDivisor - 1) / inDivisor); };

using PulldownTest = ::testing::Test;

TEST_F(PulldownTest, EveryFilmFrameMapsToTheVideoFrameHoldingItAndBadInputIsRefused)
{
    for (const FrameRate videoRate : {kFrameRate_Video2997, kFrameRate_Video30})
    {
        const FrameRate filmRate = videoRate * 4 / 5;
        for (int cadence = kPulldownCadence_23_AA; cadence <= kPulldownCadence_23_DD; ++cadence)
            for (std::int64_t filmFrame = -8; filmFrame <= 12; ++filmFrame)
            {
                SCOPED_TRACE(::testing::Message() << "cadence " << cadence << " film frame "
                                                  << filmFrame << " rate " << videoRate.GetValue());
                const std::int64_t cycle = FloorDiv(filmFrame, 4);
                const Placement& place = kCycle[cadence - 1][filmFrame - 4 * cycle];
                const TickTime filmStart = filmRate.FrameToTime(filmFrame);
                const TickTime filmLast =
                    filmRate.FrameToTime(filmFrame + 1) - TickTime::TicksToTime(1);
                for (const TickTime time : {filmStart, filmLast})
                {
                    bool split = !place.split;
                    const TickTime mapped = MapPulldownFrameTo2997Frame(
                        time, videoRate, static_cast<PulldownCadence>(cadence), split);
                    EXPECT_EQ(mapped, videoRate.FrameToTime(5 * cycle + place.videoFrame));
                    EXPECT_EQ(split, place.split);
                }
            }
    }
    // Bad input violates contracts.
    bool split = false;
    const auto map = [&](TickTime inTime, FrameRate inRate, int inCadence)
    {
        return [=, &split]
        {
            (void)MapPulldownFrameTo2997Frame(inTime, inRate,
                                              static_cast<PulldownCadence>(inCadence), split);
        };
    };
    ExpectInputContract(map(kTime_Zero, kFrameRate_Zero, kPulldownCadence_23_AA),
                        "inVideoRate.GetTicksPerFrame() > 0");
    for (const int cadence : {0, 6})
        ExpectInputContract(map(kTime_Zero, kFrameRate_Video2997, cadence),
                            "inCadence >= kPulldownCadence_23_AA && inCadence <= "
                            "kPulldownCadence_23_DD");
    ExpectInputContract(map(kTime_Invalid, kFrameRate_Video2997, kPulldownCadence_23_AA),
                        "inFilmTime.IsValid()");
}

} // namespace
} // namespace mvxmediatypes
