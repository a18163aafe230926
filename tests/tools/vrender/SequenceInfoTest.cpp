// `vrender info TIMELINE`: the printed form of a sequence.

#include "BE/TimelineFile.h"
#include "CutlistInfo.h"
#include "VrenderTestSupport.h"

#include <gtest/gtest.h>

namespace
{

TEST(SequenceInfoTest, PrintsTracksItemsMediaAndNestedSequences)
{
    const BE::TimelineLoadResult loaded = BE::ParseTimeline(R"({"main": "Top", "sequences": [
        {"name": "In", "rate": 50, "size": [64, 36], "tracks": [{"items": [
            {"end": 1, "media": {"pattern": "pattern:bars?size=64x36"}}]}]},
        {"name": "Top", "rate": "30000/1001", "size": [64, 36], "tracks": [
            {"items": [{"end": 2, "media": {"sequence": "In"}, "clip": {"speed": -2}},
                       {"gap": 1}, {"duration": 1, "media": {"sequence": "In"}, "blend": "screen"}]},
            {"muted": true, "items": [{"start": 0.5, "end": 1, "media": {"file": "/nope.y4m"},
                                       "adjustment": true, "opacity": 50}]}]}]})",
                                                            "info.json", "/");
    ASSERT_TRUE(loaded.Succeeded()) << loaded.mError;
    const std::string kStream = "1920x1080, 25 fps, pixel aspect 1:1, progressive";
    EXPECT_EQ(vrender::DescribeSequence(loaded.mMain),
              "Sequence \"Top\": 64x36, 29.970 fps (30000/1001), pixel aspect 1:1, progressive, "
              "ends at 4.000 s\n"
              "  Track 0: 2 items\n"
              "    0.000 s to 2.000 s: media 1, speed -2\n"
              "    3.000 s to 4.000 s: media 1, blend screen\n"
              "  Track 1 muted: 1 item\n"
              "    0.500 s to 1.000 s: media 2, adjustment layer, opacity set\n"
              "  Media:\n"
              "    1 sequence \"In\", duration 1.000 s\n"
              "      video stream 0: 64x36, 50 fps, pixel aspect 1:1, progressive, no source\n"
              "    2 file \"/nope.y4m\" [offline], duration endless\n"
              "      video stream 0: " +
                  kStream +
                  ", no source\n"
                  "Sequence \"In\": 64x36, 50 fps, pixel aspect 1:1, progressive, ends at 1.000 s\n"
                  "  Track 0: 1 item\n"
                  "    0.000 s to 1.000 s: media 1\n"
                  "  Media:\n"
                  "    1 pattern:bars?size=64x36 [still], duration endless\n"
                  "      video stream 0: 64x36, 25 fps, pixel aspect 1:1, progressive\n");
}

using SequenceInfoRunTest = vrendertest::ScratchDirectoryTest;

TEST_F(SequenceInfoRunTest, WarnsOncePerMissingFileAndRefusesABadTimeline)
{
    const std::string good = (mDirectory / "good.json").string();
    std::ofstream(good) << R"({"sequences": [{"name": "S", "tracks": [{"items": [
        {"end": 1, "media": {"file": "gone.y4m"}}, {"duration": 1, "media": {"file": "gone.y4m"}},
        {"duration": 1, "media": {"still": "lost.png"}}]}]}]})";
    const vrendertest::RunResult run = Run({"info", good});
    EXPECT_EQ(run.mExitCode, 0);
    EXPECT_EQ(run.mErr, "vrender: warning: " + (mDirectory / "gone.y4m").string() +
                            ": media file not found; it plays as offline\n"
                            "vrender: warning: " +
                            (mDirectory / "lost.png").string() +
                            ": media file not found; it plays as offline\n");
    EXPECT_EQ(run.mOut.rfind("Sequence \"S\": ", 0), 0u) << run.mOut;

    const std::string bad = (mDirectory / "bad.json").string();
    std::ofstream(bad) << "{\"sequences\": [{\"name\": \"S\",\n \"tracks\": 3}]}";
    const vrendertest::RunResult refused = Run({"info", bad});
    EXPECT_EQ(refused.mExitCode, 2);
    EXPECT_EQ(refused.mErr,
              "vrender: " + bad + ":2: /sequences/0/tracks: expected an array, got a number\n");
    EXPECT_EQ(refused.mOut, "");
}

// Transitions are checked at load: a clamped parameter is warned of, an
// unknown transition refuses the file, each naming the file, line and place.
TEST_F(SequenceInfoRunTest, TransitionsAreCheckedAtLoad)
{
    const std::string place = ":3: /sequences/0/tracks/0/items/0/transitions/0";
    const struct
    {
        const char* mTransition;
        int mExitCode;
        std::string mErr;
    } cases[] = {
        {R"("TX.Wipe", "params": {"start": "150"})", 0,
         "vrender: warning: " + place +
             ": transition \"TX.Wipe\": parameter \"start\" 150 clamped to 100\n"},
        {R"("TX.Spin")", 2,
         "vrender: " + place + "/match: unknown transition match name \"TX.Spin\"\n"},
    };
    for (const auto& c : cases)
    {
        const std::string path = (mDirectory / "t.json").string();
        std::ofstream(path) << "{\"sequences\": [{\"name\": \"S\", \"tracks\": [{\"items\": [\n"
                               "  {\"end\": 1, \"media\": {\"color\": \"#102030\"},\n"
                               "   \"transitions\": [{\"start\": 0.5, \"end\": 1, \"match\": "
                            << c.mTransition << "}]}]}]}]}";
        const vrendertest::RunResult run = Run({"info", path});
        EXPECT_EQ(run.mExitCode, c.mExitCode);
        std::string expected = c.mErr;
        expected.insert(expected.find(place), path);
        EXPECT_EQ(run.mErr, expected);
    }
}

} // namespace
