#include "mvxcore/debug/Trace.h"

#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

namespace trace = mvxcore::trace;

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

    std::vector<std::string> mLines;

private:
    std::vector<std::string> mSavedPatterns;
    trace::Sink mPreviousSink;
};

TEST_F(TraceTest, PatternsMatchExactNamesAndTrailingWildcards)
{
    EXPECT_TRUE(trace::MatchesPattern("ML.Queue", "ML.Queue"));
    EXPECT_FALSE(trace::MatchesPattern("ML.Queue", "ML.Queue.Sub"));
    EXPECT_FALSE(trace::MatchesPattern("ML.Queue", "ml.queue"));
    EXPECT_TRUE(trace::MatchesPattern("ML.*", "ML.Queue"));
    EXPECT_TRUE(trace::MatchesPattern("ML.*", "ML.PluginVideoRenderer.RenderVideoFrame"));
    EXPECT_FALSE(trace::MatchesPattern("ML.*", "ML"));
    EXPECT_FALSE(trace::MatchesPattern("ML.*", "MLX.Queue"));
    EXPECT_TRUE(trace::MatchesPattern("*", "anything"));
    EXPECT_TRUE(trace::MatchesPattern("*", ""));
    EXPECT_FALSE(trace::MatchesPattern("", "ML"));
}

TEST_F(TraceTest, NothingIsEnabledAfterDisableAll)
{
    EXPECT_TRUE(trace::GetEnabledCategories().empty());
    EXPECT_FALSE(trace::IsEnabled("ML.Queue"));
    trace::Write("ML.Queue", "dropped");
    EXPECT_TRUE(mLines.empty());
}

TEST_F(TraceTest, EnabledCategoryWritesCategoryColonText)
{
    trace::EnableCategory("ML.*");
    trace::EnableCategory("QRT.Messages");
    trace::Write("ML.PluginVideoRenderer.RenderVideoFrame", "frame 12");
    trace::Write("QRT.Messages", "posted");
    trace::Write("QRT.Other", "dropped");
    trace::Write("ML", "dropped");
    EXPECT_EQ(mLines, (std::vector<std::string>{"ML.PluginVideoRenderer.RenderVideoFrame: frame 12",
                                                "QRT.Messages: posted"}));
}

TEST_F(TraceTest, MacroFormatsOnlyForEnabledCategories)
{
    trace::EnableCategory("ML.Queue");
    int evaluated = 0;
    MVX_TRACE("ML.Queue", "request %u took %d ms", 7u, ++evaluated);
    MVX_TRACE("ML.Other", "request %u took %d ms", 8u, ++evaluated);
    EXPECT_EQ(evaluated, 1);
    EXPECT_EQ(mLines, (std::vector<std::string>{"ML.Queue: request 7 took 1 ms"}));
}

TEST_F(TraceTest, DisablingRemovesOnlyThatPattern)
{
    trace::EnableCategory("ML.*");
    trace::EnableCategory("ML.*");
    trace::EnableCategory("QRT.Messages");
    EXPECT_EQ(trace::GetEnabledCategories(), (std::vector<std::string>{"ML.*", "QRT.Messages"}));
    trace::DisableCategory("ML.*");
    EXPECT_FALSE(trace::IsEnabled("ML.Queue"));
    EXPECT_TRUE(trace::IsEnabled("QRT.Messages"));
}

TEST_F(TraceTest, EnvironmentListIsTrimmedAndDeduplicated)
{
    setenv(trace::kTraceEnvironmentVariable, " ML.* , QRT.Messages,,ML.*, ", 1);
    trace::LoadFromEnvironment();
    EXPECT_EQ(trace::GetEnabledCategories(), (std::vector<std::string>{"ML.*", "QRT.Messages"}));
    EXPECT_TRUE(trace::IsEnabled("ML.Queue"));
    EXPECT_TRUE(trace::IsEnabled("QRT.Messages"));
    EXPECT_FALSE(trace::IsEnabled("QRT.Other"));

    unsetenv(trace::kTraceEnvironmentVariable);
    trace::LoadFromEnvironment();
    EXPECT_TRUE(trace::GetEnabledCategories().empty());
}

TEST_F(TraceTest, SetEnabledCategoriesReplacesThePatterns)
{
    trace::EnableCategory("Old.One");
    trace::SetEnabledCategories("New.*");
    EXPECT_FALSE(trace::IsEnabled("Old.One"));
    EXPECT_TRUE(trace::IsEnabled("New.Thing"));
}

TEST_F(TraceTest, LinesFromManyThreadsArriveWholeAndInEachThreadsOrder)
{
    trace::EnableCategory("Test.Threads");
    constexpr int kThreads = 4;
    constexpr int kLines = 500;
    std::vector<std::thread> writers;
    for (int t = 0; t < kThreads; ++t)
    {
        writers.emplace_back(
            [t]
            {
                for (int i = 0; i < kLines; ++i)
                    MVX_TRACE("Test.Threads", "thread %d line %d", t, i);
            });
    }
    for (std::thread& writer : writers)
        writer.join();

    ASSERT_EQ(mLines.size(), static_cast<size_t>(kThreads * kLines));
    std::vector<int> next(kThreads, 0);
    for (const std::string& line : mLines)
    {
        int thread = -1;
        int index = -1;
        ASSERT_EQ(std::sscanf(line.c_str(), "Test.Threads: thread %d line %d", &thread, &index), 2)
            << line;
        ASSERT_GE(thread, 0);
        ASSERT_LT(thread, kThreads);
        EXPECT_EQ(line, "Test.Threads: thread " + std::to_string(thread) + " line " +
                            std::to_string(index));
        EXPECT_EQ(index, next[thread]++);
    }
}

TEST_F(TraceTest, LinesWrittenFromInsideTheSinkAreDropped)
{
    trace::EnableCategory("Outer");
    trace::EnableCategory("Inner");
    trace::SetSink(
        [this](std::string_view inLine)
        {
            mLines.emplace_back(inLine);
            trace::Write("Inner", "nested");
        });
    trace::Write("Outer", "text");
    EXPECT_EQ(mLines, (std::vector<std::string>{"Outer: text"}));
}

} // namespace
