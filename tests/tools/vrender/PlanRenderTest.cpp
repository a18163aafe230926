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

// A machine of inCores with memory to spare.
vrender::HostFacts Host(unsigned inCores = 1)
{
    return {inCores, std::uint64_t{1} << 40};
}

vrender::RenderPlan Plan(const vrender::RenderOptions& inOptions,
                         const vrender::SourceFacts& inFacts, unsigned inCores = 1)
{
    vrender::RenderPlan plan;
    std::string error;
    EXPECT_TRUE(vrender::PlanRender(inOptions, inFacts, Host(inCores), plan, error)) << error;
    return plan;
}

// The error of a plan that must be refused.
std::string Refusal(const vrender::RenderOptions& inOptions, const vrender::SourceFacts& inFacts,
                    const vrender::HostFacts& inHost = Host())
{
    vrender::RenderPlan plan;
    std::string error;
    EXPECT_FALSE(vrender::PlanRender(inOptions, inFacts, inHost, plan, error));
    return error;
}

// The first frame, count, size, aspect, field order and jobs of inPlan.
auto Summary(const vrender::RenderPlan& inPlan)
{
    const vrender::StreamInfo& stream = inPlan.mStream;
    return std::tuple(inPlan.mFirst, inPlan.mCount, stream.mWidth, stream.mHeight,
                      stream.mPixelAspectRatio, stream.mFieldType, inPlan.mJobs);
}

using PlanRenderTest = ::testing::Test;

TEST_F(PlanRenderTest, DefaultsComeFromTheSource)
{
    const vrender::RenderPlan plan = Plan({}, Clip(), 4);
    EXPECT_EQ(Summary(plan), std::tuple(0, 100, 640u, 360u, mt::PixelAspectRatio(4, 3),
                                        mt::kFieldType_Progressive, 8u));
    EXPECT_EQ(plan.mPixelFormat, mt::kPixelFormat_BGRA_4444_8u);
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
    // The count runs to the end of the media.
    EXPECT_EQ(
        Summary(Plan(options, Clip(), 64)),
        std::tuple(90, 10, 100u, 50u, mt::kPixelAspectRatio_Square, mt::kFieldType_UpperFirst, 3u));
    options.mJobs = 0;
    EXPECT_EQ(Plan(options, Clip(), 64).mJobs, vrender::kMaxJobs) << "bounded";
    // Another output rate counts the media on its own grid: 4 seconds at 50 fps.
    vrender::RenderOptions fifty;
    fifty.mFrameRate = mt::kFrameRate_Video50;
    EXPECT_EQ(Plan(fifty, Clip()).mCount, 200);
}

TEST_F(PlanRenderTest, RangesBeyondTheMediaAreRefused)
{
    vrender::RenderOptions options;
    std::tie(options.mStart, options.mCount) = std::pair(90, 31);
    EXPECT_EQ(Refusal(options, Clip()), "frames 90 to 120: the media has 100 frames (0 to 99)");
    std::tie(options.mStart, options.mCount) = std::pair(100, std::nullopt);
    EXPECT_EQ(Refusal(options, Clip()), "--start 100: the media has 100 frames (0 to 99)");
    options.mStart = 50;
    options.mFilters.mSpeed = -2;
    EXPECT_EQ(Refusal(options, Clip()),
              "--start 50: the media has 50 frames (0 to 49) at speed -2");
}

TEST_F(PlanRenderTest, EndlessAndStillMedia)
{
    vrender::SourceFacts pattern = Clip();
    pattern.mDuration = mt::kTime_Max;
    vrender::RenderPlan plan = Plan({}, pattern);
    EXPECT_EQ(std::pair(plan.mCount, plan.mJobs),
              std::pair(vrender::kDefaultEndlessFrameCount, 2u));

    vrender::SourceFacts still = pattern;
    still.mIsStill = true;
    still.mFrameRate = mt::kFrameRate_Video1000;
    plan = Plan({}, still);
    EXPECT_EQ(std::pair(plan.mCount, plan.mStream.mFrameRate),
              std::pair(std::int64_t{1}, vrender::kDefaultStillFrameRate));
    vrender::RenderOptions options;
    options.mCount = 12;
    options.mFrameRate = mt::kFrameRate_Video50;
    plan = Plan(options, still);
    EXPECT_EQ(std::pair(plan.mCount, plan.mStream.mFrameRate),
              std::pair(std::int64_t{12}, mt::kFrameRate_Video50));
}

// Reverse speeds play endless media's default range back down to time zero
// (clips: EndToEndTest checks the frames by their content).
TEST_F(PlanRenderTest, ReverseEndlessMediaEndsAtTimeZero)
{
    vrender::SourceFacts pattern = Clip();
    pattern.mDuration = mt::kTime_Max;
    vrender::RenderOptions reverse;
    reverse.mFilters.mSpeed = -2;
    EXPECT_EQ(Plan(reverse, pattern).mMediaStart,
              mt::TickTime::FromFrame(2 * (vrender::kDefaultEndlessFrameCount - 1),
                                      mt::kFrameRate_Video25));
}

// Y4M output of the source's size without filters asks for the stream's own
// sampling, so that a source with it hands its samples over; so does 4:2:0
// output re-timing or scaling progressive frames, which work on 4:2:0 planes.
// Everything else renders in BGRA unless --format says otherwise.
TEST_F(PlanRenderTest, Y4MWithoutFiltersAsksForTheStreamsSampling)
{
    using K = vrender::OutputKind;
    const auto c420 = vrender::Y4MChroma::k420, c444 = vrender::Y4MChroma::k444;
    enum : int
    {
        kDeinterlace = 1,
        kSpeed = 2,
        kInterlacedSource = 4,
        kScale = 8,
    };
    // (output, chroma, filters and source, output width, --format, expected)
    const std::tuple<K, vrender::Y4MChroma, int, std::uint32_t, std::optional<mt::PixelFormat>,
                     mt::PixelFormat>
        cases[] = {
            {K::kY4MStream, c420, 0, 0, {}, mt::kPixelFormat_YUV_420_8u_Planar},
            {K::kY4MFile, c420, 0, 640, {}, mt::kPixelFormat_YUV_420_8u_Planar},
            {K::kY4MStream, c444, 0, 0, {}, mt::kPixelFormat_VUYA_4444_8u},
            {K::kPngSequence, c420, 0, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kY4MStream, c420, kDeinterlace, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kY4MStream, c420, 0, 320, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kY4MStream, c420, 0, 0, mt::kPixelFormat_BGRA_4444_16u,
             mt::kPixelFormat_BGRA_4444_16u},
            {K::kY4MStream, c420, kSpeed, 0, {}, mt::kPixelFormat_YUV_420_8u_Planar},
            {K::kY4MStream, c444, kSpeed, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kPngSequence, c420, kSpeed, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kY4MStream, c420, kSpeed | kDeinterlace, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
            {K::kY4MStream, c420, kSpeed | kInterlacedSource, 0, {}, mt::kPixelFormat_BGRA_4444_8u},
        };
    for (std::size_t i = 0; i < std::size(cases); ++i)
    {
        const auto& [kind, chroma, filters, width, format, expected] = cases[i];
        vrender::RenderOptions options;
        std::tie(options.mOutputKind, options.mChroma, options.mPixelFormat) =
            std::tuple(kind, chroma, format);
        options.mFilters.mDeinterlace = (filters & kDeinterlace) != 0;
        options.mFilters.mScale = (filters & kScale) != 0;
        if ((filters & kSpeed) != 0)
            std::tie(options.mFilters.mSpeed, options.mFilters.mFrameBlend) = std::pair(0.5, true);
        std::tie(options.mWidth, options.mHeight) = std::pair(width, width * 9 / 16);
        vrender::SourceFacts source = Clip();
        if ((filters & kInterlacedSource) != 0)
            source.mFieldType = mt::kFieldType_UpperFirst;
        EXPECT_EQ(Plan(options, source).mPixelFormat, expected) << "case " << i;
    }
}

// The frames in flight are as many as fit the memory budget (half the
// physical memory unless --memory says otherwise); a frame that does not
// fit alone is refused.
TEST_F(PlanRenderTest, MemoryBoundsTheFramesInFlight)
{
    vrender::RenderOptions options;
    const std::uint64_t frameBytes = Plan(options, Clip()).mFrameBytes;
    options.mPixelFormat = mt::kPixelFormat_BGRA_4444_32f;
    EXPECT_GT(Plan(options, Clip()).mFrameBytes, frameBytes + 640 * 360 * 12);
    options.mPixelFormat = mt::kPixelFormat_BGRA_4444_8u;
    vrender::RenderPlan plan;
    std::string error;
    ASSERT_TRUE(vrender::PlanRender(options, Clip(), {8, 6 * frameBytes}, plan, error));
    EXPECT_EQ(plan.mJobs, 3u);
    options.mMemoryBudget = 2 * frameBytes;
    EXPECT_EQ(Plan(options, Clip(), 8).mJobs, 2u);
    options.mMemoryBudget = frameBytes - 1;
    EXPECT_EQ(Refusal(options, Clip()).rfind("a 640x360 frame needs about ", 0), 0u);
    options.mMemoryBudget.reset();
    EXPECT_NE(Refusal(options, Clip(), {8, frameBytes}).find("(half the physical memory"),
              std::string::npos);
}

} // namespace
