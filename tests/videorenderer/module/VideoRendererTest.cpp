#include "ML/VideoRenderer.h"

#include "../sources/ScriptedSources.h"
#include "BrambleSupport/BrambleSupport.h"
#include "ContractExpect.h"
#include "ImporterHost/ImporterHost.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderFrameQueue.h"
#include "ML/RenderableVideoSources.h"
#include "RecordingClient.h"
#include "TestSource.h"
#include "VF/SharedVideoFrameCache.h"
#include "module/ModuleInternals.h"
#include "mvxcore/debug/Contract.h"

#include <mutex>
#include <string>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace vrtest;
using mvxmediatypes::TickTime;

// Prefetch polls of NewSource that are no prefetch, or one that never arrives.
constexpr int kNoPrefetch = -1;
constexpr int kNeverArrives = 0;

class VideoRendererTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(ML::ModuleInternals::GetInitializationCount(), 0);
        ASSERT_EQ(BrambleSupport::GetInitializeCount(), 0);
        mConstructions = ML::RenderFrameQueue::GetConstructionCount();
        mSessions = ImporterHost::GetSessionCount();
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
        mvxcore::debug::SetAssertHook(mPreviousAssertHook);
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), 0);
    }

    // A source whose prefetch frame arrives after inPolls polls (or never,
    // or that has no prefetch).
    static QRT::InterfaceRef<TestSource> NewSource(int inPolls)
    {
        auto source = QRT::Allocated<TestSource>::CreateInstance();
        if (inPolls == kNoPrefetch)
            return source;
        source->mPrefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
        source->mPrefetch->mPollsUntilComplete = inPolls;
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

    // Renders one frame of a source whose prefetch arrives after inPolls
    // polls and checks its pixels.
    void RenderOneFrameAndCheck(int inPolls)
    {
        auto source = NewSource(inPolls);
        const unsigned int id = ML::GetNextRequestID();
        Initiate(source, id);
        const Delivery answer = Answer(id, source);
        EXPECT_EQ(answer.mKind, Delivery::kComplete);
        EXPECT_TRUE(IsFilledWith(answer.mFrame, source->mColor));
        // Rendered once, after the prefetch, at the parameters' frame time.
        EXPECT_EQ(source->mRenderCount.load(), 1);
        EXPECT_TRUE(source->mPrefetchCompleteBeforeRender);
        EXPECT_EQ(source->mRenderTime, MF::FrameTime(TickTime::TicksToTime(1000)));
    }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    std::uint64_t mConstructions = 0;
    std::uint32_t mSessions = 0;
    DeliveryRecorder mRecorder;
    // Guards mAsserts.
    std::mutex mAssertMutex;
    std::vector<std::string> mAsserts;
    mvxcore::debug::AssertHook mPreviousAssertHook;
};

// --- Start-up and shutdown ----------------------------------------------------

TEST_F(VideoRendererTest, TwoInitializeCallsNeedTwoShutdownCalls)
{
    // The last shutdown stops the shared executors (every case starts the
    // module afresh).
    const ML::ExecutorRef* slots[] = {&ML::sNormalPriorityRenderQueue, &ML::sLowPriorityRenderQueue,
                                      &ML::sVideoSourcePrefetcherQueue,
                                      &ML::sImageSourcePrefetcherQueue};
    EXPECT_EQ(ML::VideoRenderer::Initialize(), 0);
    EXPECT_EQ(ML::VideoRenderer::Initialize(), 0);
    // The suite support library follows every call one for one; only the
    // first call brought the module up.
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 2);
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 1);
    for (const ML::ExecutorRef* slot : slots)
    {
        const ML::ExecutorRef executor = boost::atomic_load(slot);
        EXPECT_TRUE(executor && !executor->IsShutDown());
    }

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    // Still up: the queue is running and the importer host open.
    EXPECT_FALSE(ML::IsRenderModuleShuttingDown());
    EXPECT_TRUE(ImporterHost::IsSessionOpen());
    RenderOneFrameAndCheck(2);
    // Enabling accelerated rendering leaves the module as it was.
    ML::VideoRenderer::EnableAcceleratedRendering();
    EXPECT_EQ(ML::ModuleInternals::GetInitializationCount(), 1);

    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
    for (const ML::ExecutorRef* slot : slots)
    {
        const ML::ExecutorRef executor = boost::atomic_load(slot);
        EXPECT_TRUE(!executor || executor->IsShutDown());
    }
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(VideoRendererTest, UnbalancedShutdownLeavesEverythingAsItWasAndReports)
{
    // Another user of the suite support library, whose count must survive.
    BrambleSupport::Initialize();
    EXPECT_EQ(ML::VideoRenderer::Shutdown(), 0);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    EXPECT_EQ(Asserts(), std::vector<std::string>{"sInitializationCount > 0 | VideoRenderer::"
                                                  "Shutdown without a matching Initialize."});
    // The count did not go negative: the next Initialize brings the module up.
    ML::VideoRenderer::Initialize();
    EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 1);
    BrambleSupport::Shutdown();
}

// --- Suite families -----------------------------------------------------------

// A suite table stands for itself: only its address is registered.
const int kTestSuiteTable = 0;

TEST_F(VideoRendererTest, SuiteFamilyRegistersEveryVersionAndChecksTheLastResult)
{
    ML::VideoRenderer::Initialize();
    EXPECT_EQ(ML::ModuleInternals::RegisterSuiteVersions("Test Family Suite", {2, 3, 4},
                                                         &kTestSuiteTable),
              0);
    for (const std::int32_t version : {2, 3, 4})
        EXPECT_EQ(BrambleSupport_AcquireSuite("Test Family Suite", version), &kTestSuiteTable);
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
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 5u);

    // The module's last shutdown is the suite support library's last: every
    // suite is withdrawn and the next session can register them again.
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Family Suite", 2), nullptr);
    ML::VideoRenderer::Initialize();
    EXPECT_NO_THROW(
        ML::ModuleInternals::RegisterSuiteFamily("Test Family Suite", {2, 3}, &kTestSuiteTable));
}

// --- InitiateRender and CancelRender ------------------------------------------

TEST_F(VideoRendererTest, SourceOutcomesReachTheCallbackOnce)
{
    // A source without prefetches is still rendered (on the delivering
    // thread); a render request exception of the source gives no frame; any
    // other failure gives no frame and is reported by the executor that
    // delivered, and the queue keeps working.
    const std::tuple<int, SourceFailure, const char*> cases[] = {
        {kNoPrefetch, SourceFailure::kNone, nullptr},
        {1, SourceFailure::kRenderRequestException, nullptr},
        {1, SourceFailure::kStdException, "source failed"}};
    ML::VideoRenderer::Initialize();
    // An empty source or callback is never called back.
    ML::InitiateRender(QRT::InterfaceRef<ML::IRenderableSource>(), MF::FrameTime(),
                       MakeParams(8, 8), 90, mRecorder.Callback());
    auto silent = NewSource(1);
    ML::InitiateRender(silent, MF::FrameTime(), MakeParams(8, 8), 63, ML::InitiateRenderCallback());
    ASSERT_TRUE(WaitUntil([&] { return silent->mRenderCount.load() == 1; }));
    unsigned int id = 60;
    for (const auto& [polls, failure, reported] : cases)
    {
        SCOPED_TRACE(id);
        auto source = NewSource(polls);
        source->mFailure = failure;
        Initiate(source, ++id);
        const Delivery answer = Answer(id, source);
        const bool framed = failure == SourceFailure::kNone;
        EXPECT_EQ(answer.mKind, framed ? Delivery::kComplete : Delivery::kError);
        EXPECT_TRUE(framed ? IsFilledWith(answer.mFrame, source->mColor) : !answer.mFrame);
        EXPECT_EQ(source->mRenderCount.load(), 1);
        if (!reported)
            continue;
        ASSERT_TRUE(WaitUntil([this] { return !Asserts().empty(); }));
        EXPECT_NE(Asserts()[0].find(reported), std::string::npos) << Asserts()[0];
    }
    RenderOneFrameAndCheck(1);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 4u);
    EXPECT_EQ(Asserts().size(), 1u);
}

TEST_F(VideoRendererTest, CancelWhilePrefetchIsInFlightReachesTheCallbackAsCancelled)
{
    ML::VideoRenderer::Initialize();
    auto source = NewSource(kNeverArrives);
    const unsigned int id = ML::GetNextRequestID();
    Initiate(source, id);
    ASSERT_TRUE(WaitUntil(
        [] { return ML::RenderFrameQueue::Create()->GetStatistics().mPrefetchWaiting == 1; }));
    EXPECT_EQ(mRecorder.Count(), 0u);
    ML::CancelRender(id);
    const Delivery answer = Answer(id, source);
    EXPECT_EQ(answer.mKind, Delivery::kCancelled);
    EXPECT_FALSE(answer.mFrame);
    EXPECT_EQ(source->mRenderCount.load(), 0);
    EXPECT_GE(source->mPrefetch->mCancelCount.load(), 1);
    // A second cancel of the same identifier, or of unknown ones, finds nothing.
    ML::CancelRender(id);
    auto other = NewSource(4);
    Initiate(other, 500);
    ML::CancelRender(501);
    ML::CancelRender(0);
    EXPECT_EQ(Answer(500, other).mKind, Delivery::kComplete);
    EXPECT_EQ(other->mPrefetch->mCancelCount.load(), 0);
    ML::VideoRenderer::Shutdown();
    EXPECT_EQ(mRecorder.Count(), 2u);
}

TEST_F(VideoRendererTest, SourceFramesGoIntoTheCacheAtTheRendersCachePriority)
{
    // An export reads its source frame at the low priority; playback of the same frame raises
    // it to the high one, and a later export leaves it there.
    const struct
    {
        std::int32_t mRender;
        std::int32_t mCached;
    } steps[] = {{VF::kCachePriority_Low, VF::kCachePriority_Low},
                 {VF::kCachePriority_High, VF::kCachePriority_High},
                 {VF::kCachePriority_Low, VF::kCachePriority_High}};
    ML::VideoRenderer::Initialize();
    VF::SharedVideoFrameCache::Clear();
    const ML::Test::ScriptedSourceRef scripted = ML::Test::MakeScriptedSource();
    scripted->mPrefetchWanted = scripted->mNewFrames = true;
    const auto source = ML::CreateRenderableSource(
        QRT::InterfaceRef<BE::Deprecated::IVideoSource>(scripted), {},
        mvxmediatypes::kAlphaChannel_Straight, {}, false, false, mvxmediatypes::kFrameRate_Video25,
        mvxmediatypes::kFieldType_Progressive, mvxmediatypes::kPixelAspectRatio_Square, {});
    const MF::FrameTime time(TickTime::TicksToTime(0));
    for (const auto& step : steps)
    {
        ML::CutlistRenderParams params = MakeParams(8, 8, time);
        params.mCachePriority = step.mRender;
        const unsigned int id = ML::GetNextRequestID();
        ML::InitiateRender(source, time, params, id, mRecorder.Callback());
        ASSERT_TRUE(WaitUntil([&] { return !mRecorder.Of(id).empty(); }));
        EXPECT_EQ(mRecorder.Of(id)[0].mKind, Delivery::kComplete);
        EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetCachedPriority(
                      scripted->KeyFor(time.GetTime())),
                  step.mCached);
    }
    ML::VideoRenderer::Shutdown();
}

} // namespace
