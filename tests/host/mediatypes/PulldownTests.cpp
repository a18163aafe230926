#include "ContractExpect.h"
#include "mvxmediatypes/Pulldown.h"

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using vrtest::ExpectInputContract;

using PulldownTest = ::testing::Test;

// Every cadence's mapping is checked end to end by the pulldown removal filter
// tests; here, film times before zero and bad input.
TEST_F(PulldownTest, FilmTimesBeforeZeroRoundDownAndBadInputIsRefused)
{
    // Film frame -1 is the last of cycle -1, letter D of cadence AA: video frame -1, whole.
    const FrameRate filmRate = kFrameRate_Video2997 * 4 / 5;
    bool split = true;
    EXPECT_EQ(MapPulldownFrameTo2997Frame(filmRate.FrameToTime(-1), kFrameRate_Video2997,
                                          kPulldownCadence_23_AA, split),
              kFrameRate_Video2997.FrameToTime(-1));
    EXPECT_FALSE(split);
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
