// The progress line, the closing summary and the display that draws them.

#include "Progress.h"

#include <cstdio>
#include <string>
#include <tuple>

#include <gtest/gtest.h>

namespace
{

using ProgressTest = ::testing::Test;

TEST_F(ProgressTest, LineShowsBarCountRateAndEtaAndSurvivesOddInput)
{
    const std::tuple<int, int, double, int, const char*> cases[] = {
        {0, 100, 0.0, 10, "[----------]   0/100"},
        {50, 100, 2.0, 10, "[#####-----]  50/100    25.0 fps  ETA 2.0 s"},
        {100, 100, 4.0, 10, "[##########] 100/100    25.0 fps  ETA 0.0 s"},
        {1, 3, 0.5, 3, "[#--] 1/3     2.0 fps  ETA 1.0 s"},
        {5, 0, 1.0, 4, "[####] 5/0     1.0 fps  ETA 0.0 s"},
        {-1, 10, 1.0, 4, "[----] -1/10"}};
    for (const auto& [done, total, seconds, width, line] : cases)
        EXPECT_EQ(vrender::FormatProgressLine(done, total, seconds, width), line);
}

TEST_F(ProgressTest, SummaryAndCancelCountOneFrameInTheSingular)
{
    EXPECT_EQ(vrender::FormatSummary(1, 0.5, "standard output"),
              "Rendered 1 frame in 0.50 s (2.0 fps) to standard output");
    EXPECT_EQ(vrender::FormatCancelled(1), "cancelled after 1 frame");
}

TEST_F(ProgressTest, DisabledDisplayWritesNothingEnabledOneErasesItsLine)
{
    std::FILE* file = std::tmpfile();
    ASSERT_NE(file, nullptr);
    {
        vrender::ProgressDisplay quiet(file, false, 10);
        quiet.Update(5);
        quiet.Clear();
    }
    EXPECT_EQ(std::ftell(file), 0);
    vrender::ProgressDisplay shown(file, true, 10);
    shown.Update(10);
    shown.Clear();
    std::rewind(file);
    char text[256] = {};
    const std::string written(text, std::fread(text, 1, sizeof(text) - 1, file));
    std::fclose(file);
    EXPECT_EQ(written.rfind("\r[##############################] 10/10", 0), 0u) << written;
    EXPECT_EQ(written.substr(written.size() - 4), "\r\x1b[K");
}

} // namespace
