#include "RenderJob.h"

#include <gtest/gtest.h>

namespace
{

namespace mt = mvxmediatypes;

class PlanRenderTest : public ::testing::Test
{
protected:
    // A 100-frame 25 fps 640x360 clip.
    static vrender::SourceFacts Clip()
    {
        vrender::SourceFacts facts;
        facts.mWidth = 640;
        facts.mHeight = 360;
        facts.mFrameRate = mt::kFrameRate_Video25;
        facts.mPixelAspectRatio = mt::PixelAspectRatio(4, 3);
        facts.mDuration = mt::TickTime::FromFrame(100, mt::kFrameRate_Video25);
        return facts;
    }

    static std::string Error(const vrender::RenderOptions& inOptions,
                             const vrender::SourceFacts& inFacts)
    {
        vrender::RenderPlan plan;
        std::string error;
        EXPECT_FALSE(vrender::PlanRender(inOptions, inFacts, 2, plan, error));
        return error;
    }
};

TEST_F(PlanRenderTest, DefaultsComeFromTheSource)
{
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(vrender::RenderOptions{}, Clip(), 4, plan, error)) << error;
    EXPECT_EQ(plan.mFirst, 0);
    EXPECT_EQ(plan.mCount, 100);
    EXPECT_EQ(plan.mStream.mWidth, 640u);
    EXPECT_EQ(plan.mStream.mHeight, 360u);
    EXPECT_EQ(plan.mStream.mPixelAspectRatio, mt::PixelAspectRatio(4, 3));
    EXPECT_EQ(plan.mStream.mFrameRate, mt::kFrameRate_Video25);
    EXPECT_EQ(plan.mStream.mFieldType, mt::kFieldType_Progressive);
    EXPECT_EQ(plan.mPixelFormat, mt::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(plan.mJobs, 8u) << "twice the cores";
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
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(options, Clip(), 64, plan, error)) << error;
    EXPECT_EQ(plan.mFirst, 90);
    EXPECT_EQ(plan.mCount, 10) << "to the end of the media";
    EXPECT_EQ(plan.mStream.mWidth, 100u);
    EXPECT_EQ(plan.mStream.mPixelAspectRatio, mt::kPixelAspectRatio_Square);
    EXPECT_EQ(plan.mStream.mFieldType, mt::kFieldType_UpperFirst);
    EXPECT_EQ(plan.mJobs, 3u);
    options.mJobs = 0;
    ASSERT_TRUE(vrender::PlanRender(options, Clip(), 64, plan, error));
    EXPECT_EQ(plan.mJobs, vrender::kMaxJobs) << "bounded";
}

TEST_F(PlanRenderTest, RangesBeyondTheMediaAreRefused)
{
    vrender::RenderOptions options;
    options.mStart = 90;
    options.mCount = 31;
    EXPECT_EQ(Error(options, Clip()), "frames 90 to 120: the media has 100 frames (0 to 99)");
    options.mCount.reset();
    options.mStart = 100;
    EXPECT_EQ(Error(options, Clip()), "--start 100: the media has 100 frames (0 to 99)");
}

TEST_F(PlanRenderTest, EndlessAndStillMedia)
{
    vrender::SourceFacts pattern = Clip();
    pattern.mDuration = mt::kTime_Max;
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(vrender::RenderOptions{}, pattern, 1, plan, error));
    EXPECT_EQ(plan.mCount, vrender::kDefaultEndlessFrameCount);
    EXPECT_EQ(plan.mJobs, 2u);

    vrender::SourceFacts still = pattern;
    still.mIsStill = true;
    still.mFrameRate = mt::kFrameRate_Video1000;
    ASSERT_TRUE(vrender::PlanRender(vrender::RenderOptions{}, still, 1, plan, error));
    EXPECT_EQ(plan.mCount, 1);
    EXPECT_EQ(plan.mStream.mFrameRate, vrender::kDefaultStillFrameRate);
    vrender::RenderOptions options;
    options.mCount = 12;
    options.mFrameRate = mt::kFrameRate_Video50;
    ASSERT_TRUE(vrender::PlanRender(options, still, 1, plan, error));
    EXPECT_EQ(plan.mCount, 12);
    EXPECT_EQ(plan.mStream.mFrameRate, mt::kFrameRate_Video50);
}

TEST_F(PlanRenderTest, InterlacedSourcesKeepTheirFieldOrder)
{
    vrender::SourceFacts facts = Clip();
    facts.mFieldType = mt::kFieldType_LowerFirst;
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(vrender::RenderOptions{}, facts, 1, plan, error));
    EXPECT_EQ(plan.mStream.mFieldType, mt::kFieldType_LowerFirst);
}

TEST_F(PlanRenderTest, OtherOutputRatesCountTheMediaOnTheirOwnGrid)
{
    vrender::RenderOptions options;
    options.mFrameRate = mt::kFrameRate_Video50;
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(options, Clip(), 1, plan, error));
    EXPECT_EQ(plan.mCount, 200) << "4 seconds at 50 fps";
}

} // namespace
