#include "mvxcore/debug/Trace.h"

#include <cstdlib>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace trace = mvxcore::trace;
using Lines = std::vector<std::string>;

// Captures the lines in mLines (the sink is called one line at a time, so no
// lock of its own is needed) and restores the sink, the patterns and the
// environment afterwards.
class TraceTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mSavedPatterns = trace::GetEnabledCategories();
        mPreviousSink =
            trace::SetSink([this](std::string_view inLine) { mLines.emplace_back(inLine); });
        trace::DisableAll();
    }

    void TearDown() override
    {
        unsetenv(trace::kTraceEnvironmentVariable);
        trace::SetSink(mPreviousSink);
        std::string list;
        for (const std::string& pattern : mSavedPatterns)
            list += pattern + ",";
        trace::SetEnabledCategories(list);
    }

    Lines mLines;

private:
    Lines mSavedPatterns;
    trace::Sink mPreviousSink;
};

TEST_F(TraceTest, PatternsMatchExactNamesAndTrailingWildcards)
{
    const std::tuple<const char*, const char*, bool> cases[] = {{"ML.Queue", "ML.Queue", true},
                                                                {"ML.Queue", "ML.Queue.Sub", false},
                                                                {"ML.*", "ML.A.RenderFrame", true},
                                                                {"ML.*", "MLX.Queue", false},
                                                                {"", "ML", false}};
    for (const auto& [pattern, category, matches] : cases)
        EXPECT_EQ(trace::MatchesPattern(pattern, category), matches)
            << pattern << " / " << category;
}

TEST_F(TraceTest, OnlyEnabledCategoriesWriteCategoryColonTextAndTheMacroFormatsOnlyThen)
{
    trace::Write("ML.Queue", "dropped");
    trace::EnableCategory("ML.*");
    trace::EnableCategory("QRT.Messages");
    trace::Write("QRT.Messages", "posted");
    trace::Write("QRT.Other", "dropped");
    int evaluated = 0;
    MVX_TRACE("ML.Queue", "request %u took %d ms", 7u, ++evaluated);
    MVX_TRACE("Other", "request %u took %d ms", 8u, ++evaluated);
    EXPECT_EQ(evaluated, 1);
    EXPECT_EQ(mLines, (Lines{"QRT.Messages: posted", "ML.Queue: request 7 took 1 ms"}));
}

TEST_F(TraceTest, PatternsAreKeptOnceAndDisabledOrReplacedOneByOne)
{
    trace::EnableCategory("ML.*");
    trace::EnableCategory("ML.*");
    trace::EnableCategory("QRT.Messages");
    EXPECT_EQ(trace::GetEnabledCategories(), (Lines{"ML.*", "QRT.Messages"}));
    trace::DisableCategory("ML.*");
    EXPECT_EQ(trace::GetEnabledCategories(), Lines{"QRT.Messages"});
    trace::SetEnabledCategories("New.*");
    EXPECT_EQ(trace::GetEnabledCategories(), Lines{"New.*"});

    setenv(trace::kTraceEnvironmentVariable, " ML.* , QRT.Messages,,ML.*, ", 1);
    trace::LoadFromEnvironment();
    EXPECT_EQ(trace::GetEnabledCategories(), (Lines{"ML.*", "QRT.Messages"}));
    unsetenv(trace::kTraceEnvironmentVariable);
    trace::LoadFromEnvironment();
    EXPECT_TRUE(trace::GetEnabledCategories().empty());
}

TEST_F(TraceTest, LinesWrittenFromInsideTheSinkAreDropped)
{
    trace::EnableCategory("*");
    trace::SetSink(
        [this](std::string_view inLine)
        {
            mLines.emplace_back(inLine);
            trace::Write("Inner", "nested");
        });
    trace::Write("Outer", "text");
    EXPECT_EQ(mLines, Lines{"Outer: text"});
}

} // namespace
