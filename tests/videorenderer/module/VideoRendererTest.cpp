#include "ML/VideoRenderer.h"

#include "BE/VideoSources.h"
#include "BrambleSupport/BrambleSupport.h"
#include "ContractExpect.h"
#include "ImporterHost/ImporterHost.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderableVideoSources.h"
#include "ModuleTestSupport.h"
#include "module/ModuleInternals.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace modtest;
using mvxmediatypes::TickTime;

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

    QRT::InterfaceRef<DelayedPrefetch> NewPrefetch(std::chrono::milliseconds inDelay)
    {
        return QRT::Allocated<DelayedPrefetch>::CreateInstance(mPrefetchExecutor, inDelay);
    }

    QRT::InterfaceRef<ColorSource> NewSource(QRT::InterfaceRef<DelayedPrefetch> inPrefetch = {})
    {
        auto source = QRT::Allocated<ColorSource>::CreateInstance();
        source->mPrefetch = inPrefetch;
        return source;
    }

    static SourceRef AsSource(const QRT::InterfaceRef<ColorSource>& inSource)
    {
        return SourceRef(inSource);
    }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    // Renders one 16x8 frame of a source with a prefetch arriving after
    // inDelay and checks everything the callback receives.
    void RenderOneFrameAndCheck(std::chrono::milliseconds inDelay)
    {
        auto prefetch = NewPrefetch(inDelay);
        auto source = NewSource(prefetch);
        const unsigned int id = ML::GetNextRequestID();
        CallbackRecorder recorder;
        ML::InitiateRender(AsSource(source), MF::FrameTime(TickTime::TicksToTime(5000)),
                           MakeParams(MF::FrameTime(TickTime::TicksToTime(5000)), 16, 8), id,
                           recorder.Callback());
        ASSERT_TRUE(recorder.WaitForCount(1));
        const CallbackCall call = recorder.Get()[0];
        EXPECT_TRUE(IsFilledWith(call.mFrame, source->mColor));
        EXPECT_EQ(call.mRequestID, id);
        EXPECT_EQ(call.mSource.Get(), AsSource(source).Get());
        EXPECT_FALSE(call.mCancelled);
        EXPECT_EQ(call.mStatus, 0);
        EXPECT_EQ(source->mRenderCount.load(), 1);
    }

    std::uint64_t mConstructions = 0;
    std::uint32_t mSessions = 0;
    boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> mPrefetchExecutor;
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
    // Only the first call brought the module up.
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 1);
    EXPECT_FALSE(ML::IsRenderModuleShuttingDown());

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);
    // Still up: the queue is running and the importer host open.
    EXPECT_FALSE(ML::IsRenderModuleShuttingDown());
    EXPECT_TRUE(ImporterHost::IsSessionOpen());
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 0);
    EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, SuiteSupportCountFollowsEveryCallOneForOne)
{
    for (int i = 1; i <= 3; ++i)
    {
        ML::VideoRenderer::Initialize();
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), i);
    }
    for (int i = 2; i >= 0; --i)
    {
        ML::VideoRenderer::Shutdown();
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), i);
    }
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
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    BrambleSupport::Shutdown();
}

TEST_F(VideoRendererTest, LastShutdownStopsTheSharedExecutorsAndInitializeReplacesThem)
{
    ML::VideoRenderer::Initialize();
    const ML::ExecutorRef normal = boost::atomic_load(&ML::sNormalPriorityRenderQueue);
    const ML::ExecutorRef video = boost::atomic_load(&ML::sVideoSourcePrefetcherQueue);
    ASSERT_TRUE(normal && video);
    ML::VideoRenderer::Shutdown();
    // The queue stopped the render executors, the prefetch flush the
    // prefetch executors.
    for (const ML::ExecutorRef* slot :
         {&ML::sNormalPriorityRenderQueue, &ML::sLowPriorityRenderQueue,
          &ML::sVideoSourcePrefetcherQueue, &ML::sImageSourcePrefetcherQueue})
    {
        const ML::ExecutorRef executor = boost::atomic_load(slot);
        EXPECT_TRUE(!executor || executor->IsShutDown());
    }

    ML::VideoRenderer::Initialize();
    for (const ML::ExecutorRef* slot :
         {&ML::sNormalPriorityRenderQueue, &ML::sLowPriorityRenderQueue,
          &ML::sVideoSourcePrefetcherQueue, &ML::sImageSourcePrefetcherQueue})
    {
        const ML::ExecutorRef executor = boost::atomic_load(slot);
        ASSERT_TRUE(executor);
        EXPECT_FALSE(executor->IsShutDown());
    }
    EXPECT_NE(boost::atomic_load(&ML::sNormalPriorityRenderQueue), normal);
    EXPECT_NE(boost::atomic_load(&ML::sVideoSourcePrefetcherQueue), video);
    ML::VideoRenderer::Shutdown();
}

TEST_F(VideoRendererTest, SeveralCyclesInOneProcessRenderInEveryCycle)
{
    for (int cycle = 1; cycle <= 3; ++cycle)
    {
        SCOPED_TRACE(cycle);
        ASSERT_EQ(ML::VideoRenderer::Initialize(), 0);
        EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + cycle);
        EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + cycle);
        RenderOneFrameAndCheck(std::chrono::milliseconds(5 * cycle));
        RenderOneFrameAndCheck(std::chrono::milliseconds(0));
        ASSERT_EQ(ML::VideoRenderer::Shutdown(), 0);
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
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));
    ML::VideoRenderer::Shutdown();
}

TEST_F(VideoRendererTest, EnableAcceleratedRenderingLeavesTheModuleAsItWas)
{
    ML::VideoRenderer::Initialize();
    ML::VideoRenderer::EnableAcceleratedRendering();
    ML::VideoRenderer::EnableAcceleratedRendering();
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));
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
    auto prefetch = NewPrefetch(std::chrono::milliseconds(30));
    auto source = NewSource(prefetch);
    source->mColor[0] = 0x11;
    source->mColor[1] = 0x22;
    source->mColor[2] = 0x33;
    source->mColor[3] = 0x44;
    // An interlaced frame time: the request goes by the earlier field.
    const MF::FrameTime frameTime(TickTime::TicksToTime(8000), TickTime::TicksToTime(6000));
    const ML::CutlistRenderParams params = MakeParams(frameTime, 16, 8);
    CallbackRecorder recorder;
    ML::InitiateRender(AsSource(source), frameTime, params, 4242, recorder.Callback());
    EXPECT_EQ(source->mCollectCount.load(), 1);
    EXPECT_EQ(source->mCollectTime, frameTime);

    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    ASSERT_TRUE(call.mFrame);
    EXPECT_EQ(call.mFrame->GetBounds().Width(), 16);
    EXPECT_EQ(call.mFrame->GetBounds().Height(), 8);
    EXPECT_TRUE(IsFilledWith(call.mFrame, source->mColor));
    EXPECT_EQ(call.mRequestID, 4242u);
    EXPECT_EQ(call.mSource.Get(), AsSource(source).Get());
    EXPECT_FALSE(call.mCancelled);
    EXPECT_EQ(call.mStatus, 0);

    // Rendered once, after the prefetch, with the parameters' own frame time.
    EXPECT_EQ(prefetch->mInitiateCount.load(), 1);
    EXPECT_EQ(source->mRenderCount.load(), 1);
    EXPECT_TRUE(source->mPrefetchArrivedBeforeRender);
    EXPECT_EQ(source->mRenderTime, frameTime);
    EXPECT_EQ(source->mRenderWidth, 16u);

    // Exactly once: nothing more arrives by the time the module is down.
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, SourceWithoutPrefetchesIsStillRendered)
{
    // A source whose reads are cheap collects no prefetch; the queue then
    // completes the request with no frame and status 0, and the source is
    // rendered on the delivering thread all the same.
    ML::VideoRenderer::Initialize();
    auto source = NewSource();
    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(1000));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), 77,
                       recorder.Callback());
    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    ASSERT_TRUE(call.mFrame);
    EXPECT_TRUE(IsFilledWith(call.mFrame, source->mColor));
    EXPECT_EQ(call.mRequestID, 77u);
    EXPECT_EQ(call.mSource.Get(), AsSource(source).Get());
    EXPECT_FALSE(call.mCancelled);
    EXPECT_EQ(call.mStatus, 0);
    EXPECT_EQ(source->mRenderCount.load(), 1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
}

TEST_F(VideoRendererTest, EmptySourceIsNeverQueuedNorCalledBack)
{
    ML::VideoRenderer::Initialize();
    CallbackRecorder emptyRecorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(1000));
    ML::InitiateRender(SourceRef(), frameTime, MakeParams(frameTime, 8, 8), 90,
                       emptyRecorder.Callback());
    EXPECT_EQ(ML::RenderFrameQueue::Create()->GetStatistics().mIncoming, 0u);

    // A render queued after it has gone all the way through the queue: had the
    // empty one been queued, it would have been answered first.
    CallbackRecorder recorder;
    auto source = NewSource(NewPrefetch(std::chrono::milliseconds(1)));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), 91,
                       recorder.Callback());
    ASSERT_TRUE(recorder.WaitForCount(1));
    EXPECT_EQ(recorder.Get()[0].mRequestID, 91u);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(emptyRecorder.Count(), 0u);
}

TEST_F(VideoRendererTest, CancelWhilePrefetchIsInFlightReachesTheCallbackAsCancelled)
{
    ML::VideoRenderer::Initialize();
    auto prefetch = NewPrefetch(std::chrono::milliseconds(-1));
    auto source = NewSource(prefetch);
    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(2000));
    const unsigned int id = ML::GetNextRequestID();
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), id,
                       recorder.Callback());
    ASSERT_TRUE(WaitUntil(
        [] { return ML::RenderFrameQueue::Create()->GetStatistics().mPrefetchWaiting == 1; }));
    EXPECT_EQ(prefetch->mInitiateCount.load(), 1);
    EXPECT_EQ(recorder.Count(), 0u);

    ML::CancelRender(id);
    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    EXPECT_FALSE(call.mFrame);
    EXPECT_EQ(call.mRequestID, id);
    EXPECT_EQ(call.mSource.Get(), AsSource(source).Get());
    EXPECT_TRUE(call.mCancelled);
    EXPECT_EQ(call.mStatus, 0);
    EXPECT_EQ(source->mRenderCount.load(), 0);
    EXPECT_GE(prefetch->mCancelCount.load(), 1);

    // A second cancel of the same identifier finds nothing.
    ML::CancelRender(id);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
}

TEST_F(VideoRendererTest, CancellingAnUnknownIdentifierChangesNothing)
{
    ML::VideoRenderer::Initialize();
    auto prefetch = NewPrefetch(std::chrono::milliseconds(20));
    auto source = NewSource(prefetch);
    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(3000));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 4), 500,
                       recorder.Callback());
    ML::CancelRender(501);
    ML::CancelRender(0);
    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    EXPECT_FALSE(call.mCancelled);
    EXPECT_EQ(call.mRequestID, 500u);
    EXPECT_TRUE(IsFilledWith(call.mFrame, source->mColor));
    EXPECT_EQ(prefetch->mCancelCount.load(), 0);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
}

TEST_F(VideoRendererTest, RenderRequestExceptionOfTheSourceGivesNoFrame)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(NewPrefetch(std::chrono::milliseconds(1)));
    source->mFailure = SourceFailure::kRenderRequestException;
    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(1000));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), 61,
                       recorder.Callback());
    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    EXPECT_FALSE(call.mFrame);
    EXPECT_EQ(call.mRequestID, 61u);
    EXPECT_FALSE(call.mCancelled);
    EXPECT_EQ(call.mStatus, 0);
    EXPECT_EQ(source->mRenderCount.load(), 1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, OtherSourceFailureCallsBackThenReachesTheDeliveringThread)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(NewPrefetch(std::chrono::milliseconds(1)));
    source->mFailure = SourceFailure::kStdException;
    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(1000));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), 62,
                       recorder.Callback());
    ASSERT_TRUE(recorder.WaitForCount(1));
    const CallbackCall call = recorder.Get()[0];
    EXPECT_FALSE(call.mFrame);
    EXPECT_EQ(call.mRequestID, 62u);
    EXPECT_FALSE(call.mCancelled);
    EXPECT_EQ(call.mStatus, 0);
    // The executor that delivered reports the escaped failure.
    ASSERT_TRUE(WaitUntil([this] { return !Asserts().empty(); }));
    EXPECT_NE(Asserts()[0].find("source failed"), std::string::npos) << Asserts()[0];

    // The queue keeps working.
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), 1u);
}

TEST_F(VideoRendererTest, EmptyCallbackIsNotCalled)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(NewPrefetch(std::chrono::milliseconds(1)));
    const MF::FrameTime frameTime(TickTime::TicksToTime(1000));
    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), 63,
                       ML::InitiateRenderCallback());
    ASSERT_TRUE(WaitUntil([&] { return source->mRenderCount.load() == 1; }));
    // A render queued after it is answered normally, and nothing was reported.
    RenderOneFrameAndCheck(std::chrono::milliseconds(1));
    ML::VideoRenderer::Shutdown();
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, ConcurrentRendersAndCancelsAreEachAnsweredExactlyOnce)
{
    ML::VideoRenderer::Initialize();
    constexpr int kThreads = 4;
    constexpr int kPerThread = 20;
    CallbackRecorder recorder;
    std::mutex idsMutex;
    std::vector<unsigned int> ids;
    std::vector<QRT::InterfaceRef<ColorSource>> sources;
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
                    auto source =
                        NewSource(NewPrefetch(std::chrono::milliseconds(hung ? -1 : i % 4)));
                    source->mColor[0] = static_cast<std::uint8_t>(t);
                    const unsigned int id = ML::GetNextRequestID();
                    const MF::FrameTime frameTime(TickTime::TicksToTime(1000 * i));
                    ML::InitiateRender(AsSource(source), frameTime, MakeParams(frameTime, 8, 8), id,
                                       recorder.Callback());
                    if (hung || i % 3 == 0)
                        ML::CancelRender(id);
                    std::lock_guard lock(idsMutex);
                    ids.push_back(id);
                    sources.push_back(source);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    ASSERT_TRUE(recorder.WaitForCount(kThreads * kPerThread));

    for (std::size_t i = 0; i < ids.size(); ++i)
    {
        const std::vector<CallbackCall> calls = recorder.For(ids[i]);
        ASSERT_EQ(calls.size(), 1u) << "request " << ids[i];
        const CallbackCall& call = calls[0];
        EXPECT_EQ(call.mSource.Get(), AsSource(sources[i]).Get());
        EXPECT_EQ(call.mStatus, 0);
        if (call.mCancelled)
        {
            EXPECT_FALSE(call.mFrame);
            EXPECT_EQ(sources[i]->mRenderCount.load(), 0);
        }
        else
        {
            // A completed one is one whose prefetch arrived: it was rendered.
            EXPECT_TRUE(sources[i]->mPrefetch &&
                        static_cast<DelayedPrefetch*>(sources[i]->mPrefetch.Get())->IsComplete());
            EXPECT_TRUE(IsFilledWith(call.mFrame, sources[i]->mColor));
        }
    }
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(recorder.Count(), static_cast<std::size_t>(kThreads * kPerThread));
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

    CallbackRecorder recorder;
    const MF::FrameTime frameTime(TickTime::TicksToTime(0));
    ML::InitiateRender(source, frameTime, MakeParams(frameTime, 16, 8), 501, recorder.Callback());
    ML::InitiateRender(source, frameTime, MakeParams(frameTime, 64, 36), 502, recorder.Callback());
    ASSERT_TRUE(recorder.WaitForCount(2));
    const std::uint8_t expected[4] = {0xCC, 0x66, 0x33, 0xFF}; // B, G, R, A
    for (const CallbackCall& call : recorder.Get())
    {
        ASSERT_TRUE(call.mFrame) << call.mRequestID;
        EXPECT_FALSE(call.mCancelled);
        EXPECT_EQ(call.mStatus, 0);
        EXPECT_EQ(call.mFrame->GetBounds().Width(), call.mRequestID == 501 ? 16 : 64);
        EXPECT_TRUE(IsFilledWith(call.mFrame, expected)) << call.mRequestID;
    }
    ML::VideoRenderer::Shutdown();
}
