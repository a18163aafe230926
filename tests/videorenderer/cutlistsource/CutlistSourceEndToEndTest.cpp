// A sequence of solid-colour segments with a gap, rendered through the
// cutlist source and InitiateRender with the module running.

#include "BE/CutlistProvider.h"
#include "ML/IMutableCutlist.h"
#include "ML/RenderableCutlistSource.h"
#include "ML/RenderableNodes.h"
#include "ML/VideoRenderer.h"
#include "VF/SharedVideoFrameCache.h"

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using mvxmediatypes::TickTime;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

constexpr std::int64_t kFrameTicks = 28'224'000; // 25 fps

TickTime Frame(std::int64_t inFrame)
{
    return TickTime::TicksToTime(inFrame * kFrameTicks);
}

// Bytes in memory order (blue, green, red, alpha) of every pixel, or false.
bool IsFilledWith(const FrameRef& inFrame, std::uint8_t inB, std::uint8_t inG, std::uint8_t inR)
{
    if (!inFrame)
        return false;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
    {
        const std::uint8_t* row = base + y * inFrame->GetRowBytes();
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
        {
            if (row[4 * x] != inB || row[4 * x + 1] != inG || row[4 * x + 2] != inR)
            {
                ADD_FAILURE() << "pixel " << x << "," << y << " is " << int(row[4 * x]) << " "
                              << int(row[4 * x + 1]) << " " << int(row[4 * x + 2]);
                return false;
            }
        }
    }
    return true;
}

class CutlistSourceEndToEndTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(ML::VideoRenderer::Initialize(), 0);
        VF::SharedVideoFrameCache::Clear();

        // Main: red over frames [0, 10), a gap, blue over [20, 30).
        auto main = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("main"));
        main->AddSegment(Frame(0), Frame(10), Frame(0), ML::CreateSolidColorNode(0xFFFF0000u));
        main->AddSegment(Frame(20), Frame(30), Frame(0), ML::CreateSolidColorNode(0xFF0000FFu));
        main->MakeImmutable();
        // Alternate: green over [0, 30).
        auto alternate = ML::CreateMutableCutlist(QRT::ImmutableString::CreateStatic("alt"));
        alternate->AddSegment(Frame(0), Frame(30), Frame(0), ML::CreateSolidColorNode(0xFF00FF00u));
        alternate->MakeImmutable();

        BE::CutlistProviderSettings settings;
        settings.mRight = 16;
        settings.mBottom = 8;
        settings.mFrameRate = mvxmediatypes::kFrameRate_Video25;
        auto provider = BE::CreateCutlistProvider(settings);
        provider->SetCutlists(mName, {QRT::InterfaceRef<MF::IRenderableCutlist>(main),
                                      QRT::InterfaceRef<MF::IRenderableCutlist>(alternate),
                                      {}});
        mSource = ML::CreateRenderableCutlistSource(
            QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider),
            mvxmediatypes::kFrameRate_Video25, mName);

        mParams.mWidth = 16;
        mParams.mHeight = 8;
        mParams.mFullFrameWidth = 16;
        mParams.mFullFrameHeight = 8;
        mParams.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
        mParams.mQuality = 4;
    }

    void TearDown() override
    {
        mSource.Reset();
        VF::SharedVideoFrameCache::Clear();
        ML::VideoRenderer::Shutdown();
    }

    struct Result
    {
        bool mArrived = false;
        FrameRef mFrame;
        unsigned int mRequestID = 0;
        bool mCancelled = true;
        int mStatus = -1;
    };

    // Renders one frame through InitiateRender and waits (bounded) for it.
    Result Render(TickTime inTime)
    {
        std::mutex mutex;
        std::condition_variable arrived;
        Result result;
        const unsigned int id = ML::GetNextRequestID();
        // The parameters carry the frame time that is rendered.
        ML::CutlistRenderParams params = mParams;
        params.SetFrameTime(MF::FrameTime(inTime));
        ML::InitiateRender(mSource, MF::FrameTime(inTime), params, id,
                           [&](FrameRef inFrame, unsigned int inID,
                               QRT::InterfaceRef<ML::IRenderableSource>, bool inCancelled,
                               int inStatus)
                           {
                               std::lock_guard lock(mutex);
                               result.mFrame = inFrame;
                               result.mRequestID = inID;
                               result.mCancelled = inCancelled;
                               result.mStatus = inStatus;
                               result.mArrived = true;
                               arrived.notify_all();
                           });
        std::unique_lock lock(mutex);
        arrived.wait_for(lock, std::chrono::seconds(20), [&] { return result.mArrived; });
        EXPECT_TRUE(result.mArrived);
        EXPECT_EQ(result.mRequestID, id);
        EXPECT_FALSE(result.mCancelled);
        return result;
    }

    const QRT::ImmutableString mName = QRT::ImmutableString::CreateStatic("Sequence 01");
    QRT::InterfaceRef<ML::IRenderableSource> mSource;
    ML::CutlistRenderParams mParams;
};

TEST_F(CutlistSourceEndToEndTest, EachSegmentHasItsColourAndTheGapIsBlack)
{
    const Result red = Render(Frame(3) + TickTime::TicksToTime(5));
    EXPECT_TRUE(IsFilledWith(red.mFrame, 0x00, 0x00, 0xFF));
    const Result gap = Render(Frame(15));
    EXPECT_TRUE(IsFilledWith(gap.mFrame, 0x00, 0x00, 0x00));
    const Result blue = Render(Frame(29));
    EXPECT_TRUE(IsFilledWith(blue.mFrame, 0xFF, 0x00, 0x00));
    const Result after = Render(Frame(40));
    EXPECT_TRUE(IsFilledWith(after.mFrame, 0x00, 0x00, 0x00));
    ASSERT_TRUE(red.mFrame);
    EXPECT_EQ(red.mFrame->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
    EXPECT_EQ(red.mFrame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
}

TEST_F(CutlistSourceEndToEndTest, RepeatWithCacheFlagGivesTheSameFrameObject)
{
    mParams.mRenderFlags = 8;
    const Result first = Render(Frame(4));
    const Result second = Render(Frame(4));
    ASSERT_TRUE(first.mFrame);
    EXPECT_EQ(first.mFrame, second.mFrame);
    EXPECT_TRUE(IsFilledWith(second.mFrame, 0x00, 0x00, 0xFF));
}

TEST_F(CutlistSourceEndToEndTest, RepeatWithoutCacheFlagRendersAgain)
{
    const Result first = Render(Frame(4));
    const Result second = Render(Frame(4));
    ASSERT_TRUE(first.mFrame);
    ASSERT_TRUE(second.mFrame);
    EXPECT_NE(first.mFrame, second.mFrame);
    EXPECT_TRUE(IsFilledWith(second.mFrame, 0x00, 0x00, 0xFF));
}

TEST_F(CutlistSourceEndToEndTest, ChoiceBitRendersTheAlternateCutlist)
{
    mParams.mCutlistChoiceBit = 1;
    EXPECT_TRUE(IsFilledWith(Render(Frame(4)).mFrame, 0x00, 0xFF, 0x00));
    // The alternate cutlist has no gap.
    EXPECT_TRUE(IsFilledWith(Render(Frame(15)).mFrame, 0x00, 0xFF, 0x00));
    mParams.mCutlistChoiceBit = 0;
    EXPECT_TRUE(IsFilledWith(Render(Frame(15)).mFrame, 0x00, 0x00, 0x00));
}

TEST_F(CutlistSourceEndToEndTest, ConcurrentRendersOfOneSourceGetTheirOwnColours)
{
    mParams.mRenderFlags = 8;
    std::vector<std::thread> threads;
    std::atomic<int> wrong{0};
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
                    bool ok;
                    if (t == 3)
                        ok = IsFilledWith(result, 0x00, 0xFF, 0x00);
                    else if (frame < 10)
                        ok = IsFilledWith(result, 0x00, 0x00, 0xFF);
                    else if (frame < 20)
                        ok = IsFilledWith(result, 0x00, 0x00, 0x00);
                    else
                        ok = IsFilledWith(result, 0xFF, 0x00, 0x00);
                    if (!ok)
                        ++wrong;
                }
            });
    }
    for (auto& thread : threads)
        thread.join();
    EXPECT_EQ(wrong.load(), 0);
}

} // namespace
