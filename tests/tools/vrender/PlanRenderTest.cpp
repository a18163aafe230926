// Planning a render: what comes from the source, what the options override,
// and the ranges that are refused.

#include "RenderJob.h"

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;

// A 100-frame 25 fps 640x360 clip.
vrender::SourceFacts Clip()
{
    vrender::SourceFacts facts;
    facts.mWidth = 640;
    facts.mHeight = 360;
    facts.mFrameRate = mt::kFrameRate_Video25;
    facts.mPixelAspectRatio = mt::PixelAspectRatio(4, 3);
    facts.mDuration = mt::TickTime::FromFrame(100, mt::kFrameRate_Video25);
    return facts;
}

vrender::RenderPlan Plan(const vrender::RenderOptions& inOptions,
                         const vrender::SourceFacts& inFacts, unsigned inCores = 1)
{
    vrender::RenderPlan plan;
    std::string error;
    EXPECT_TRUE(vrender::PlanRender(inOptions, inFacts, inCores, plan, error)) << error;
    return plan;
}

using PlanRenderTest = ::testing::Test;

TEST_F(PlanRenderTest, DefaultsComeFromTheSource)
{
    const vrender::RenderPlan plan = Plan({}, Clip(), 4);
    EXPECT_EQ(plan.mFirst, 0);
    EXPECT_EQ(plan.mCount, 100);
    EXPECT_EQ(plan.mStream.mWidth, 640u);
    EXPECT_EQ(plan.mStream.mHeight, 360u);
    EXPECT_EQ(plan.mStream.mPixelAspectRatio, mt::PixelAspectRatio(4, 3));
    EXPECT_EQ(plan.mStream.mFrameRate, mt::kFrameRate_Video25);
    EXPECT_EQ(plan.mStream.mFieldType, mt::kFieldType_Progressive);
    EXPECT_EQ(plan.mPixelFormat, mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(plan.mJobs, 8u) << "twice the cores";
    vrender::SourceFacts interlaced = Clip();
    interlaced.mFieldType = mt::kFieldType_LowerFirst;
    EXPECT_EQ(Plan({}, interlaced).mStream.mFieldType, mt::kFieldType_LowerFirst);
}

TEST_F(PlanRenderTest, OptionsOverrideTheSource)
{
    vrender::RenderOptions options;
    options.mStart = 90;
    options.mWidth = 100;
    options.mHeight = 50;
    options.mPixelAspectRatio = mt::kPixelAspectRatio_Square;
    options.mFieldType = mt::kFieldType_UpperFirst;
    options.mJobs = 3;
    vrender::RenderPlan plan = Plan(options, Clip(), 64);
    EXPECT_EQ(plan.mFirst, 90);
    EXPECT_EQ(plan.mCount, 10) << "to the end of the media";
    EXPECT_EQ(plan.mStream.mWidth, 100u);
    EXPECT_EQ(plan.mStream.mPixelAspectRatio, mt::kPixelAspectRatio_Square);
    EXPECT_EQ(plan.mStream.mFieldType, mt::kFieldType_UpperFirst);
    EXPECT_EQ(plan.mJobs, 3u);
    options.mJobs = 0;
    EXPECT_EQ(Plan(options, Clip(), 64).mJobs, vrender::kMaxJobs) << "bounded";
    // Another output rate counts the media on its own grid: 4 seconds at 50 fps.
    vrender::RenderOptions fifty;
    fifty.mFrameRate = mt::kFrameRate_Video50;
    EXPECT_EQ(Plan(fifty, Clip()).mCount, 200);
}

TEST_F(PlanRenderTest, RangesBeyondTheMediaAreRefused)
{
    for (const auto& [start, count, message] :
         {std::tuple<std::int64_t, std::optional<std::int64_t>, const char*>{
              90, 31, "frames 90 to 120: the media has 100 frames (0 to 99)"},
          {100, std::nullopt, "--start 100: the media has 100 frames (0 to 99)"}})
    {
        vrender::RenderOptions options;
        options.mStart = start;
        options.mCount = count;
        vrender::RenderPlan plan;
        std::string error;
        EXPECT_FALSE(vrender::PlanRender(options, Clip(), 2, plan, error));
        EXPECT_EQ(error, message);
    }
}

TEST_F(PlanRenderTest, EndlessAndStillMedia)
{
    vrender::SourceFacts pattern = Clip();
    pattern.mDuration = mt::kTime_Max;
    vrender::RenderPlan plan = Plan({}, pattern);
    EXPECT_EQ(plan.mCount, vrender::kDefaultEndlessFrameCount);
    EXPECT_EQ(plan.mJobs, 2u);

    vrender::SourceFacts still = pattern;
    still.mIsStill = true;
    still.mFrameRate = mt::kFrameRate_Video1000;
    plan = Plan({}, still);
    EXPECT_EQ(plan.mCount, 1);
    EXPECT_EQ(plan.mStream.mFrameRate, vrender::kDefaultStillFrameRate);
    vrender::RenderOptions options;
    options.mCount = 12;
    options.mFrameRate = mt::kFrameRate_Video50;
    plan = Plan(options, still);
    EXPECT_EQ(plan.mCount, 12);
    EXPECT_EQ(plan.mStream.mFrameRate, mt::kFrameRate_Video50);
}

} // namespace
