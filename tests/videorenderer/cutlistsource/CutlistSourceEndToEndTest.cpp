// A sequence of solid-colour segments with a gap, rendered through the
// cutlist source and InitiateRender with the module running.

#include "BE/CutlistProvider.h"
#include "ML/IMutableCutlist.h"
#include "ML/RenderableCutlistSource.h"
#include "ML/RenderableNodes.h"
#include "ML/VideoRenderer.h"
#include "RecordingClient.h"
#include "TestFrames.h"
#include "VF/SharedVideoFrameCache.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace vrtest;
using mvxmediatypes::TickTime;

TickTime Frame(std::int64_t inFrame)
{
    return TickTime::TicksToTime(inFrame * 28'224'000); // 25 fps
}

const Bgra kRed = {0x00, 0x00, 0xFF, 0xFF};
const Bgra kGreen = {0x00, 0xFF, 0x00, 0xFF};
const Bgra kBlue = {0xFF, 0x00, 0x00, 0xFF};
const Bgra kBlack = {0x00, 0x00, 0x00, 0x00}; // a gap is transparent black

// The colour the sequence shows at inFrame: main is red over [0, 10), a gap,
// blue over [20, 30); the alternate is green over [0, 30).
Bgra Expected(std::int64_t inFrame, std::uint32_t inChoice)
{
    if (inChoice & 1)
        return kGreen;
    return inFrame < 10 ? kRed : inFrame < 20 || inFrame >= 30 ? kBlack : kBlue;
}

class CutlistSourceEndToEndTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(ML::VideoRenderer::Initialize(), 0);
        VF::SharedVideoFrameCache::Clear();
        auto main = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("main"));
        main->AddSegment(Frame(0), Frame(10), Frame(0), ML::CreateSolidColorNode(0xFFFF0000u));
        main->AddSegment(Frame(20), Frame(30), Frame(0), ML::CreateSolidColorNode(0xFF0000FFu));
        main->MakeImmutable();
        auto alternate = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("alt"));
        alternate->AddSegment(Frame(0), Frame(30), Frame(0), ML::CreateSolidColorNode(0xFF00FF00u));
        alternate->MakeImmutable();

        BE::CutlistProviderSettings settings;
        settings.mRight = 16;
        settings.mBottom = 8;
        settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
        auto provider = BE::CreateCutlistProvider(settings);
        const auto name = QRT::ImmutableString::CreateStatic("Sequence 01");
        provider->SetCutlists(name, {main, alternate, {}});
        mSource =
            ML::CreateRenderableCutlistSource(provider, mvxmediatypes::kFrameRate_Video25, name);
        mParams.mQuality = 4;
    }

    void TearDown() override
    {
        mSource.Reset();
        VF::SharedVideoFrameCache::Clear();
        ML::VideoRenderer::Shutdown();
    }

    // Renders one frame through InitiateRender and waits (bounded) for it.
    FrameRef Render(TickTime inTime)
    {
        DeliveryRecorder recorder;
        const unsigned int id = ML::GetNextRequestID();
        // The parameters carry the frame time that is rendered.
        ML::CutlistRenderParams params = mParams;
        params.SetFrameTime(MF::FrameTime(inTime));
        ML::InitiateRender(mSource, MF::FrameTime(inTime), params, id, recorder.Callback());
        EXPECT_TRUE(recorder.WaitForCount(1));
        const auto delivered = recorder.Get();
        if (delivered.empty())
            return {};
        EXPECT_EQ(delivered[0].mRequestID, id);
        EXPECT_EQ(delivered[0].mKind, Delivery::kComplete);
        EXPECT_EQ(delivered[0].mStatus, 0);
        return delivered[0].mFrame;
    }

    QRT::InterfaceRef<ML::IRenderableSource> mSource;
    ML::CutlistRenderParams mParams = MakeParams(16, 8);
};

TEST_F(CutlistSourceEndToEndTest, EachSegmentOfEitherCutlistHasItsColourAndTheGapIsBlack)
{
    const struct
    {
        TickTime mTime;
        std::uint32_t mChoice;
    } cases[] = {{Frame(3) + TickTime::TicksToTime(5), 0},
                 {Frame(15), 0},
                 {Frame(29), 0},
                 {Frame(40), 0},
                 {Frame(4), 1},
                 {Frame(15), 1}};
    for (const auto& testCase : cases)
    {
        const std::int64_t frame = testCase.mTime.GetTicks() / 28'224'000;
        SCOPED_TRACE(testing::Message() << "frame " << frame << " choice " << testCase.mChoice);
        mParams.mCutlistChoiceBit = testCase.mChoice;
        const FrameRef rendered = Render(testCase.mTime);
        EXPECT_TRUE(IsFilledWith(rendered, Expected(frame, testCase.mChoice)));
        ASSERT_TRUE(rendered);
        EXPECT_EQ(rendered->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
    }
}

TEST_F(CutlistSourceEndToEndTest, RepeatGivesTheSameFrameObjectOnlyWithTheCacheFlag)
{
    for (const std::uint32_t flags : {0u, 8u})
    {
        SCOPED_TRACE(flags);
        mParams.mRenderFlags = flags;
        const FrameRef first = Render(Frame(4));
        const FrameRef second = Render(Frame(4));
        ASSERT_TRUE(first && second);
        EXPECT_EQ(first == second, flags == 8);
        EXPECT_TRUE(IsFilledWith(second, kRed));
    }
}

TEST_F(CutlistSourceEndToEndTest, ConcurrentRendersOfOneSourceGetTheirOwnColours)
{
    mParams.mRenderFlags = 8;
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
    {
        threads.emplace_back(
            [&, t]
            {
                ML::CutlistRenderParams params = mParams;
                params.mCutlistChoiceBit = t == 3 ? 1 : 0;
                for (int i = 0; i < 20; ++i)
                {
                    const std::int64_t frame = (t * 7 + i) % 30;
                    FrameRef result;
                    mSource->RenderFrame(MF::FrameTime(Frame(frame)), params, result);
                    EXPECT_TRUE(IsFilledWith(result, Expected(frame, params.mCutlistChoiceBit)));
                }
            });
    }
    for (auto& thread : threads)
        thread.join();
}

} // namespace
