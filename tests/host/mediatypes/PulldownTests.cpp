#include "ContractExpect.h"
#include "mvxmediatypes/Pulldown.h"

#include <cstdint>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

using vrtest::ExpectInputContract;

// Simulates telecined material field by field, independently of the library:
// the 2:3 pattern "AABBBCCDDD" repeats, and video frame 0 of the material
// starts at field 2 x phase of a cycle.
class PulldownTest : public ::testing::Test
{
protected:
    struct FilmFrame
    {
        std::int64_t firstField; // field 0 is the first field of video frame 0
        std::int64_t fieldCount;
    };

    struct Expectation
    {
        std::int64_t videoFrame;
        bool split;
    };

    static constexpr const char* kPattern = "AABBBCCDDD";

    static std::int64_t FloorDiv(std::int64_t inValue, std::int64_t inDivisor)
    {
        return inValue >= 0 ? inValue / inDivisor : -((-inValue + inDivisor - 1) / inDivisor);
    }

    // Letter and cycle of material field inField at the given phase, as one
    // number: cycle x 4 + letter index.
    static std::int64_t FilmIdentity(std::int64_t inField, int inPhase)
    {
        const std::int64_t position = 2 * inPhase + inField;
        const std::int64_t cycle = FloorDiv(position, 10);
        const char letter = kPattern[position - cycle * 10];
        return cycle * 4 + (letter - 'A');
    }

    // The film frames of fields [inFrom, inTo), in order; film frame 0 is the
    // first whose first field is at or after field 0. outZero is its index.
    static std::vector<FilmFrame> FilmFrames(int inPhase, std::int64_t inFrom, std::int64_t inTo,
                                             std::size_t& outZero)
    {
        std::vector<FilmFrame> frames;
        for (std::int64_t field = inFrom; field < inTo; ++field)
        {
            if (field > inFrom && FilmIdentity(field, inPhase) == FilmIdentity(field - 1, inPhase))
                ++frames.back().fieldCount;
            else
                frames.push_back({field, 1});
        }
        // The first group may be cut by the window; drop it.
        frames.erase(frames.begin());
        outZero = 0;
        while (frames[outZero].firstField < 0)
            ++outZero;
        return frames;
    }

    // Where a film frame's two fields are: in one video frame (fields 2v and
    // 2v + 1 both belong to it), or straddling two, answered by the later one.
    static Expectation Locate(const FilmFrame& inFrame)
    {
        for (std::int64_t field = inFrame.firstField;
             field + 1 < inFrame.firstField + inFrame.fieldCount; ++field)
            if (field % 2 == 0)
                return {field / 2, false};
        EXPECT_EQ(inFrame.fieldCount, 2);
        return {(inFrame.firstField + 1) / 2, true};
    }

    // W when video frame v holds two fields of one film frame, else S.
    static std::string Kinds(int inPhase)
    {
        std::string kinds;
        for (std::int64_t frame = 0; frame < 5; ++frame)
            kinds += FilmIdentity(2 * frame, inPhase) == FilmIdentity(2 * frame + 1, inPhase) ? 'W'
                                                                                              : 'S';
        return kinds;
    }
};

TEST_F(PulldownTest, CadenceNamesMatchTheirFieldPatterns)
{
    // The enum's documented video-frame kinds, phase = cadence - 1.
    EXPECT_EQ(Kinds(kPulldownCadence_23_AA - 1), "WWSSW");
    EXPECT_EQ(Kinds(kPulldownCadence_23_BB - 1), "WSSWW");
    EXPECT_EQ(Kinds(kPulldownCadence_23_BC - 1), "SSWWW");
    EXPECT_EQ(Kinds(kPulldownCadence_23_CD - 1), "SWWWS");
    EXPECT_EQ(Kinds(kPulldownCadence_23_DD - 1), "WWWSS");
}

TEST_F(PulldownTest, EveryFilmFrameOfEveryPhaseMapsToTheVideoFrameHoldingIt)
{
    for (const FrameRate videoRate : {kFrameRate_Video2997, kFrameRate_Video30})
    {
        const FrameRate filmRate = videoRate * 4 / 5;
        for (int cadence = kPulldownCadence_23_AA; cadence <= kPulldownCadence_23_DD; ++cadence)
        {
            std::size_t zero = 0;
            const std::vector<FilmFrame> frames = FilmFrames(cadence - 1, -60, 200, zero);
            int splits = 0;
            for (std::size_t i = 0; i < frames.size(); ++i)
            {
                const std::int64_t filmFrame =
                    static_cast<std::int64_t>(i) - static_cast<std::int64_t>(zero);
                if (filmFrame < -16 || filmFrame > 60)
                    continue;
                SCOPED_TRACE(::testing::Message()
                             << "cadence " << cadence << " film frame " << filmFrame << " rate "
                             << videoRate.GetTicksPerFrame());
                const Expectation expected = Locate(frames[i]);
                const TickTime filmStart = filmRate.FrameToTime(filmFrame);
                const TickTime filmLast =
                    filmRate.FrameToTime(filmFrame + 1) - TickTime::TicksToTime(1);
                for (const TickTime time : {filmStart, filmLast})
                {
                    bool split = !expected.split;
                    const TickTime mapped = MapPulldownFrameTo2997Frame(
                        time, videoRate, static_cast<PulldownCadence>(cadence), split);
                    EXPECT_EQ(mapped.GetTicks(),
                              expected.videoFrame * videoRate.GetTicksPerFrame());
                    EXPECT_EQ(split, expected.split);
                }
                splits += expected.split ? 1 : 0;
            }
            // One film frame in four is split.
            EXPECT_GE(splits, 18);
            EXPECT_LE(splits, 20);
        }
    }
}

TEST_F(PulldownTest, StandardCadenceFromFrameZero)
{
    // A A | B B | B C | C D | D D : A in 0, B in 1, C split over 2 and 3, D in 4.
    const FrameRate film = kFrameRate_Video2398;
    const std::int64_t video = kFrameRate_Video2997.GetTicksPerFrame();
    const Expectation expected[] = {{0, false}, {1, false}, {3, true}, {4, false},
                                    {5, false}, {6, false}, {8, true}, {9, false}};
    for (std::int64_t n = 0; n < 8; ++n)
    {
        bool split = false;
        const TickTime mapped = MapPulldownFrameTo2997Frame(
            film.FrameToTime(n), kFrameRate_Video2997, kPulldownCadence_23_AA, split);
        EXPECT_EQ(mapped.GetTicks(), expected[n].videoFrame * video) << n;
        EXPECT_EQ(split, expected[n].split) << n;
    }
}

TEST_F(PulldownTest, FarTimesStayExact)
{
    // One million cycles on: film frame 4,000,002 is C, split over 5,000,002 and 5,000,003.
    bool split = false;
    const TickTime mapped =
        MapPulldownFrameTo2997Frame(kFrameRate_Video2398.FrameToTime(4'000'002),
                                    kFrameRate_Video2997, kPulldownCadence_23_AA, split);
    EXPECT_EQ(mapped, kFrameRate_Video2997.FrameToTime(5'000'003));
    EXPECT_TRUE(split);
    // The end of time maps without overflow to a time no later than kTime_Max.
    const TickTime last =
        MapPulldownFrameTo2997Frame(kTime_Max, kFrameRate_Video2997, kPulldownCadence_23_DD, split);
    EXPECT_LE(last, kTime_Max);
    EXPECT_GT(last, kTime_Max - TickTime::TicksToTime(3 * kFrameRate_Video2997.GetTicksPerFrame()));
}

TEST_F(PulldownTest, BadInputViolatesContracts)
{
    bool split = false;
    ExpectInputContract(
        [&] {
            (void)MapPulldownFrameTo2997Frame(kTime_Zero, kFrameRate_Zero, kPulldownCadence_23_AA,
                                              split);
        },
        "inVideoRate.GetTicksPerFrame() > 0");
    for (const int cadence : {0, 6, -1})
        ExpectInputContract(
            [&]
            {
                (void)MapPulldownFrameTo2997Frame(kTime_Zero, kFrameRate_Video2997,
                                                  static_cast<PulldownCadence>(cadence), split);
            },
            "inCadence >= kPulldownCadence_23_AA && inCadence <= kPulldownCadence_23_DD");
    ExpectInputContract(
        [&]
        {
            (void)MapPulldownFrameTo2997Frame(kTime_Invalid, kFrameRate_Video2997,
                                              kPulldownCadence_23_AA, split);
        },
        "inFilmTime.IsValid()");
}

} // namespace
} // namespace mvxmediatypes
