#include "ML/VideoRenderer.h"

#include "BE/VideoSources.h"
#include "BrambleSupport/BrambleSupport.h"
#include "ContractExpect.h"
#include "ImporterHost/ImporterHost.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderableVideoSources.h"
#include "RecordingClient.h"
#include "TestSource.h"
#include "module/ModuleInternals.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace vrtest;
using mvxmediatypes::TickTime;

// Prefetch delays of NewSource that are no delay.
constexpr int kNoPrefetch = -2;
constexpr int kNeverArrives = -1;

class VideoRendererTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(ML::ModuleInternals::GetInitializationCount(), 0);
        ASSERT_EQ(BrambleSupport::GetInitializeCount(), 0);
        mConstructions = ML::RenderFrameQueue::GetConstructionCount();
        mSessions = ImporterHost::GetSessionCount();
        mPrefetchExecutor = mvxcore::threads::CreateThreadPoolExecutor(1);
        mPreviousAssertHook = mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                std::lock_guard lock(mAssertMutex);
                mAsserts.emplace_back(std::string(inFailure.condition) + " | " +
                                      std::string(inFailure.message));
            });
    }

    void TearDown() override
    {
        while (ML::ModuleInternals::GetInitializationCount() > 0)
            ML::VideoRenderer::Shutdown();
        // Pending arrivals hold their handles: drop them before the handles'
        // owners go.
        mPrefetchExecutor->BeginShutdown();
        mPrefetchExecutor->DiscardPendingTasks();
        mPrefetchExecutor->WaitForRunningTasks();
        mvxcore::debug::SetAssertHook(mPreviousAssertHook);
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), 0);
    }

    // A source whose prefetch frame arrives inDelayMs after it is started
    // (or never, or that has no prefetch).
    QRT::InterfaceRef<TestSource> NewSource(int inDelayMs)
    {
        auto source = QRT::Allocated<TestSource>::CreateInstance();
        if (inDelayMs == kNeverArrives)
            source->mPrefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
        else if (inDelayMs >= 0)
            source->mPrefetch = QRT::Allocated<TestPrefetch>::CreateInstance(
                mPrefetchExecutor, std::chrono::milliseconds(inDelayMs));
        if (source->mPrefetch)
            source->mPrefetch->mWantMoreTime = true;
        return source;
    }

    // Starts an inWidth x inHeight render of inSource at inTime, recorded by
    // mRecorder.
    void Initiate(const QRT::InterfaceRef<TestSource>& inSource, unsigned int inRequestID,
                  const MF::FrameTime& inTime = MF::FrameTime(TickTime::TicksToTime(1000)),
                  std::uint32_t inWidth = 8, std::uint32_t inHeight = 8)
    {
        ML::InitiateRender(inSource, inTime, MakeParams(inWidth, inHeight, inTime), inRequestID,
                           mRecorder.Callback());
    }

    // The one callback of inRequestID, waited for (bounded), checked for the
    // identifier, the source and status 0.
    Delivery Answer(unsigned int inRequestID, const QRT::InterfaceRef<TestSource>& inSource)
    {
        EXPECT_TRUE(WaitUntil([&] { return !mRecorder.Of(inRequestID).empty(); }));
        const auto answers = mRecorder.Of(inRequestID);
        if (answers.size() != 1)
        {
            ADD_FAILURE() << answers.size() << " answers to " << inRequestID;
            return {};
        }
        EXPECT_EQ(answers[0].mSource.Get(), static_cast<ML::IRenderableSource*>(inSource.Get()));
        EXPECT_EQ(answers[0].mStatus, 0);
        return answers[0];
    }

    // Renders one 16x8 frame of a source with a prefetch arriving after
    // inDelayMs and checks everything the callback receives.
    void RenderOneFrameAndCheck(int inDelayMs)
    {
        auto source = NewSource(inDelayMs);
        const unsigned int id = ML::GetNextRequestID();
        Initiate(source, id, MF::FrameTime(TickTime::TicksToTime(5000)), 16, 8);
        const Delivery answer = Answer(id, source);
        EXPECT_EQ(answer.mKind, Delivery::kComplete);
        EXPECT_TRUE(IsFilledWith(answer.mFrame, source->mColor));
        EXPECT_EQ(source->mRenderCount.load(), 1);
    }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    std::uint64_t mConstructions = 0;
    std::uint32_t mSessions = 0;
    boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> mPrefetchExecutor;
    DeliveryRecorder mRecorder;
    // Guards mAsserts.
    std::mutex mAssertMutex;
    std::vector<std::string> mAsserts;
    mvxcore::debug::AssertHook mPreviousAssertHook;
};

// --- Start-up and shutdown ----------------------------------------------------

TEST_F(VideoRendererTest, TwoInitializeCallsNeedTwoShutdownCalls)
{
    EXPECT_EQ(ML::VideoRenderer::Initialize(), 0);
    EXPECT_EQ(ML::VideoRenderer::Initialize(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 2);
    // The suite support library follows every call one for one.
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 2);
    // Only the first call brought the module up.
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 1);
    EXPECT_FALSE(ML::IsRenderModuleShuttingDown());

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    // Still up: the queue is running and the importer host open.
    EXPECT_FALSE(ML::IsRenderModuleShuttingDown());
    EXPECT_TRUE(ImporterHost::IsSessionOpen());
    RenderOneFrameAndCheck(1);

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 0);
    EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, UnbalancedShutdownLeavesEverythingAsItWasAndReports)
{
    // Another user of the suite support library, whose count must survive.
    BrambleSupport::Initialize();
    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 0);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    ASSERT_EQ(Asserts().size(), 1u);
    EXPECT_EQ(Asserts()[0],
              "sInitializationCount > 0 | VideoRenderer::Shutdown without a matching Initialize.");

    // The count did not go negative: the next Initialize brings the module up.
    ML::VideoRenderer::Initialize();
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    RenderOneFrameAndCheck(1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    BrambleSupport::Shutdown();
}

TEST_F(VideoRendererTest, SeveralCyclesInOneProcessRenderInEveryCycleOnNewExecutors)
{
    // The last shutdown stops the shared executors (the queue the render
    // executors, the prefetch flush the prefetch executors); the next
    // Initialize makes new ones.
    const auto expectShutDown = [](bool inShutDown)
    {
        for (const ML::ExecutorRef* slot :
             {&ML::sNormalPriorityRenderQueue, &ML::sLowPriorityRenderQueue,
              &ML::sVideoSourcePrefetcherQueue, &ML::sImageSourcePrefetcherQueue})
        {
            const ML::ExecutorRef executor = boost::atomic_load(slot);
            EXPECT_TRUE(inShutDown ? !executor || executor->IsShutDown()
                                   : executor && !executor->IsShutDown());
        }
    };
    ML::ExecutorRef previous[2];
    for (int cycle = 1; cycle <= 3; ++cycle)
    {
        SCOPED_TRACE(cycle);
        ASSERT_EQ(ML::VideoRenderer::Initialize(), 0);
        expectShutDown(false);
        const ML::ExecutorRef current[2] = {boost::atomic_load(&ML::sNormalPriorityRenderQueue),
                                            boost::atomic_load(&ML::sVideoSourcePrefetcherQueue)};
        EXPECT_NE(current[0], previous[0]);
        EXPECT_NE(current[1], previous[1]);
        previous[0] = current[0];
        previous[1] = current[1];
        EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + cycle);
        EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + cycle);
        RenderOneFrameAndCheck(5 * cycle);
        RenderOneFrameAndCheck(0);
        ASSERT_EQ(ML::VideoRenderer::Shutdown(), 0);
        expectShutDown(true);
        EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), 0);
    }
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, ConcurrentBalancedCallsKeepTheModuleUp)
{
    ML::VideoRenderer::Initialize();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
    {
        threads.emplace_back(
            []
            {
                for (int i = 0; i < 200; ++i)
                {
                    EXPECT_EQ(ML::VideoRenderer::Initialize(), 0);
                    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    // The first caller held the module up throughout: one queue, one session.
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    // Enabling accelerated rendering leaves the module as it was.
    ML::VideoRenderer::EnableAcceleratedRendering();
    ML::VideoRenderer::EnableAcceleratedRendering();
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);
    RenderOneFrameAndCheck(1);
    ML::VideoRenderer::Shutdown();
}

// --- Suite families -----------------------------------------------------------

struct TestSuiteTable
{
    int (*mFunction)(int);
};
int Negate(int inValue)
{
    return -inValue;
}
const TestSuiteTable kTestSuiteTable = {&Negate};

TEST_F(VideoRendererTest, SuiteFamilyRegistersEveryVersionAndChecksTheLastResult)
{
    ML::VideoRenderer::Initialize();
    EXPECT_EQ(ML::ModuleInternals::RegisterSuiteVersions("Test Family Suite", {2, 3, 4},
                                                         &kTestSuiteTable),
              0);
    for (const std::int32_t version : {2, 3, 4})
    {
        EXPECT_EQ(BrambleSupport_AcquireSuite("Test Family Suite", version), &kTestSuiteTable);
        EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Family Suite", version), 0);
    }
    // Only the last registration counts: a duplicate first version is not seen.
    EXPECT_EQ(
        ML::ModuleInternals::RegisterSuiteVersions("Test Family Suite", {2, 5}, &kTestSuiteTable),
        0);
    EXPECT_EQ(
        ML::ModuleInternals::RegisterSuiteVersions("Test Family Suite", {6, 5}, &kTestSuiteTable),
        BrambleSupport::kResult_SuiteAlreadyRegistered);
    EXPECT_OUTPUT_CONTRACT(
        ML::ModuleInternals::RegisterSuiteFamily("Test Family Suite", {4}, &kTestSuiteTable),
        "result == 0");
    EXPECT_OUTPUT_CONTRACT(ML::ModuleInternals::RegisterSuiteFamily("", {1}, &kTestSuiteTable),
                           "result == 0");
    EXPECT_NO_THROW(
        ML::ModuleInternals::RegisterSuiteFamily("Second Family Suite", {1}, &kTestSuiteTable));
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 6u);

    // The module's last shutdown is the suite support library's last: every
    // suite is withdrawn and the next session can register them again.
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Family Suite", 2), nullptr);
    ML::VideoRenderer::Initialize();
    EXPECT_NO_THROW(
        ML::ModuleInternals::RegisterSuiteFamily("Test Family Suite", {2, 3}, &kTestSuiteTable));
    ML::VideoRenderer::Shutdown();
}

// --- InitiateRender and CancelRender ------------------------------------------

TEST_F(VideoRendererTest, RendersTheSourceOnceItsPrefetchHasArrived)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(30);
    source->mColor = {0x11, 0x22, 0x33, 0x44};
    // An interlaced frame time: the request goes by the earlier field.
    const MF::FrameTime frameTime(TickTime::TicksToTime(8000), TickTime::TicksToTime(6000));
    Initiate(source, 4242, frameTime, 16, 8);
    EXPECT_EQ(source->mCollectCount.load(), 1);
    EXPECT_EQ(source->mCollectTime, frameTime);
    const Delivery answer = Answer(4242, source);
    EXPECT_EQ(answer.mKind, Delivery::kComplete);
    EXPECT_TRUE(IsFilledWith(answer.mFrame, source->mColor));
    ASSERT_TRUE(answer.mFrame);
    EXPECT_EQ(answer.mFrame->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
    // Rendered once, after the prefetch, with the parameters' own frame time.
    EXPECT_EQ(source->mPrefetch->mInitiateCount.load(), 1);
    EXPECT_EQ(source->mRenderCount.load(), 1);
    EXPECT_TRUE(source->mPrefetchCompleteBeforeRender);
    EXPECT_EQ(source->mRenderTime, frameTime);
    EXPECT_EQ(source->mRenderWidth, 16u);
    // Exactly once: nothing more arrives by the time the module is down.
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 1u);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, SourceOutcomesReachTheCallbackOnce)
{
    // A source without prefetches is still rendered (on the delivering
    // thread); a render request exception of the source gives no frame; any
    // other failure gives no frame and is reported by the executor that
    // delivered, and the queue keeps working.
    const struct
    {
        int mDelayMs;
        SourceFailure mFailure;
        bool mFrame;
        const char* mReported;
    } cases[] = {
        {kNoPrefetch, SourceFailure::kNone, true, nullptr},
        {1, SourceFailure::kRenderRequestException, false, nullptr},
        {1, SourceFailure::kStdException, false, "source failed"},
    };
    ML::VideoRenderer::Initialize();
    unsigned int id = 60;
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(id);
        auto source = NewSource(testCase.mDelayMs);
        source->mFailure = testCase.mFailure;
        Initiate(source, ++id);
        const Delivery answer = Answer(id, source);
        EXPECT_EQ(answer.mKind, testCase.mFrame ? Delivery::kComplete : Delivery::kError);
        EXPECT_TRUE(testCase.mFrame ? IsFilledWith(answer.mFrame, source->mColor) : !answer.mFrame);
        EXPECT_EQ(source->mRenderCount.load(), 1);
        if (!testCase.mReported)
        {
            EXPECT_TRUE(Asserts().empty());
            continue;
        }
        ASSERT_TRUE(WaitUntil([this] { return !Asserts().empty(); }));
        EXPECT_NE(Asserts()[0].find(testCase.mReported), std::string::npos) << Asserts()[0];
    }
    RenderOneFrameAndCheck(1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 4u);
}

TEST_F(VideoRendererTest, EmptySourceOrCallbackIsNeverCalledBack)
{
    ML::VideoRenderer::Initialize();
    ML::InitiateRender(QRT::InterfaceRef<ML::IRenderableSource>(), MF::FrameTime(),
                       MakeParams(8, 8), 90, mRecorder.Callback());
    EXPECT_EQ(ML::RenderFrameQueue::Create()->GetStatistics().mIncoming, 0u);
    auto source = NewSource(1);
    ML::InitiateRender(source, MF::FrameTime(), MakeParams(8, 8), 63, ML::InitiateRenderCallback());
    ASSERT_TRUE(WaitUntil([&] { return source->mRenderCount.load() == 1; }));
    // A render queued after both goes all the way through the queue: had the
    // empty source been queued, it would have been answered first.
    RenderOneFrameAndCheck(1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 1u);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, CancelWhilePrefetchIsInFlightReachesTheCallbackAsCancelled)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(kNeverArrives);
    const unsigned int id = ML::GetNextRequestID();
    Initiate(source, id);
    ASSERT_TRUE(WaitUntil(
        [] { return ML::RenderFrameQueue::Create()->GetStatistics().mPrefetchWaiting == 1; }));
    EXPECT_EQ(source->mPrefetch->mInitiateCount.load(), 1);
    EXPECT_EQ(mRecorder.Count(), 0u);
    ML::CancelRender(id);
    const Delivery answer = Answer(id, source);
    EXPECT_EQ(answer.mKind, Delivery::kCancelled);
    EXPECT_FALSE(answer.mFrame);
    EXPECT_EQ(source->mRenderCount.load(), 0);
    EXPECT_GE(source->mPrefetch->mCancelCount.load(), 1);
    // A second cancel of the same identifier, or of unknown ones, finds nothing.
    ML::CancelRender(id);
    auto other = NewSource(20);
    Initiate(other, 500);
    ML::CancelRender(501);
    ML::CancelRender(0);
    const Delivery answer500 = Answer(500, other);
    EXPECT_EQ(answer500.mKind, Delivery::kComplete);
    EXPECT_TRUE(IsFilledWith(answer500.mFrame, other->mColor));
    EXPECT_EQ(other->mPrefetch->mCancelCount.load(), 0);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 2u);
}

TEST_F(VideoRendererTest, ConcurrentRendersAndCancelsAreEachAnsweredExactlyOnce)
{
    ML::VideoRenderer::Initialize();
    constexpr int kThreads = 4;
    constexpr int kPerThread = 20;
    std::mutex sourcesMutex;
    std::vector<std::pair<unsigned int, QRT::InterfaceRef<TestSource>>> sources;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&, t]
            {
                for (int i = 0; i < kPerThread; ++i)
                {
                    // Half never complete: those must end cancelled.
                    const bool hung = i % 2 == 1;
                    auto source = NewSource(hung ? kNeverArrives : i % 4);
                    source->mColor[0] = static_cast<std::uint8_t>(t);
                    const unsigned int id = ML::GetNextRequestID();
                    Initiate(source, id, MF::FrameTime(TickTime::TicksToTime(1000 * i)));
                    if (hung || i % 3 == 0)
                        ML::CancelRender(id);
                    std::lock_guard lock(sourcesMutex);
                    sources.emplace_back(id, source);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    ASSERT_TRUE(mRecorder.WaitForCount(kThreads * kPerThread));
    for (const auto& [id, source] : sources)
    {
        const Delivery answer = Answer(id, source);
        if (answer.mKind == Delivery::kCancelled)
        {
            EXPECT_FALSE(answer.mFrame);
            EXPECT_EQ(source->mRenderCount.load(), 0);
        }
        else
        {
            // A completed one is one whose prefetch arrived: it was rendered.
            EXPECT_TRUE(source->mPrefetch->IsComplete());
            EXPECT_TRUE(IsFilledWith(answer.mFrame, source->mColor));
        }
    }
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), static_cast<std::size_t>(kThreads * kPerThread));
}

} // namespace

TEST_F(VideoRendererTest, PatternSourceRendersEndToEndWithItsPixels)
{
    // A real back-end source (a solid pattern) wrapped by the media adaptor
    // and rendered through InitiateRender at two sizes.
    ML::VideoRenderer::Initialize();
    BE::VideoSourceRef media;
    ASSERT_TRUE(BE::OpenVideoSource("pattern:solid?size=64x36&color=3366CC", media).Succeeded());
    const auto source = ML::CreateRenderableSource(
        media, MF::BinaryData(), media->GetAlphaChannel(), media->GetMatteColor(), false, false,
        media->GetFrameRate(), media->GetFieldType(), media->GetPixelAspectRatio(),
        media->GetColorProfile());
    ASSERT_TRUE(source);
    const MF::FrameTime frameTime(TickTime::TicksToTime(0));
    for (const auto& [id, width, height] : {std::tuple{501u, 16u, 8u}, std::tuple{502u, 64u, 36u}})
        ML::InitiateRender(source, frameTime, MakeParams(width, height, frameTime), id,
                           mRecorder.Callback());
    ASSERT_TRUE(mRecorder.WaitForCount(2));
    for (const Delivery& answer : mRecorder.Get())
    {
        SCOPED_TRACE(answer.mRequestID);
        EXPECT_EQ(answer.mKind, Delivery::kComplete);
        EXPECT_EQ(answer.mStatus, 0);
        EXPECT_TRUE(IsFilledWith(answer.mFrame, {0xCC, 0x66, 0x33, 0xFF}));
        ASSERT_TRUE(answer.mFrame);
        EXPECT_EQ(answer.mFrame->GetBounds().Width(), answer.mRequestID == 501 ? 16 : 64);
    }
    ML::VideoRenderer::Shutdown();
}
