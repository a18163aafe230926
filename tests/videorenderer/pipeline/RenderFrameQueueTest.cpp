#include "ML/RenderFrameQueue.h"

#include "ML/RenderExecutors.h"
#include "ML/RenderFrameMessages.h"
#include "ML/RenderStatus.h"
#include "PipelineTestSupport.h"
#include "QRT/StationRegistry.h"
#include "QRT/UIThread.h"
#include "QRT/WaitableObject.h"
#include "RecordingClient.h"
#include "TestAcceleratedRenderer.h"
#include "TestCutlists.h"
#include "TestFrames.h"
#include "TestNode.h"
#include "TestPrefetch.h"
#include "TestProducer.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"

#include <map>
#include <random>
#include <string>
#include <thread>
#include <tuple>

#include <gtest/gtest.h>

using namespace vrtest;
using mvxmediatypes::TickTime;

namespace
{

constexpr auto kDeep = mvxmediatypes::kPixelFormat_BGRA_4444_32f;
constexpr auto kBGRA = mvxmediatypes::kPixelFormat_BGRA_4444_8u;

// A clock that tests move on by hand.
struct ManualClock
{
    std::chrono::steady_clock::time_point mBase = std::chrono::steady_clock::now();
    std::atomic<std::int64_t> mOffsetMilliseconds{0};
};

// Raises ioPeak to inValue when that is higher.
void RaisePeak(std::atomic<int>& ioPeak, int inValue)
{
    int seen = ioPeak.load();
    while (inValue > seen && !ioPeak.compare_exchange_weak(seen, inValue))
    {
    }
}

class RenderFrameQueueTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ML::Foundation::StartUp();
        VF::SharedVideoFrameCache::Clear();
        mConstructions = ML::RenderFrameQueue::GetConstructionCount();
        mQueue = ML::RenderFrameQueue::Create();
        mPreviousAssertHook = mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                std::lock_guard lock(mAssertMutex);
                mAsserts.emplace_back(std::string(inFailure.condition) + " | " +
                                      std::string(inFailure.file) + " | " +
                                      std::string(inFailure.function));
            });
    }

    void TearDown() override
    {
        mQueue->Shutdown();
        mQueue.Reset();
        ML::RenderFrameQueue::SetClock({});
        mvxcore::debug::SetAssertHook(mPreviousAssertHook);
        ML::Foundation::ShutDown();
        // The queue is gone with its last reference and built afresh later.
        EXPECT_EQ(ML::RenderFrameQueue::GetConstructionCount(), mConstructions + 1);
    }

    static QRT::InterfaceRef<TestProducer> NewProducer(std::uint32_t inHashSeed,
                                                       std::shared_ptr<Gate> inGate = {})
    {
        auto producer = QRT::Allocated<TestProducer>::CreateInstance();
        producer->mHash = QRT::Guid(inHashSeed, 1, 2, {3, 4, 5, 6, 7, 8, 9, 10});
        producer->mGate = std::move(inGate);
        return producer;
    }

    // Queues the request of inSettings, its completion recorded by mRecorder.
    ML::RenderFrameRequest Add(ML::RenderFrameRequestSettings inSettings)
    {
        inSettings.mCompletion = mRecorder.For(inSettings.mRequestID);
        const ML::RenderFrameRequest request = MakeRequest(inSettings);
        mQueue->AddRenderRequest(request);
        return request;
    }

    void UseManualClock()
    {
        ML::RenderFrameQueue::SetClock(
            [this] {
                return mClock.mBase + std::chrono::milliseconds(mClock.mOffsetMilliseconds.load());
            });
    }

    ML::RenderFrameQueueStatistics Stats() { return mQueue->GetStatistics(); }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    QRT::InterfaceRef<ML::RenderFrameQueue> mQueue;
    std::uint64_t mConstructions = 0;
    DeliveryRecorder mRecorder;
    ManualClock mClock;
    // Guards mAsserts.
    std::mutex mAssertMutex;
    std::vector<std::string> mAsserts;
    mvxcore::debug::AssertHook mPreviousAssertHook;
};

TEST_F(RenderFrameQueueTest, ThreeDeepFullHDRequestsRenderTwoAtATimeAndLowPriorityWaits)
{
    // Two gated deep frames of 24 units hold 48 of the 50: the third cannot
    // start, and a low request costing 1, which could, waits while a normal
    // request is ready.
    auto gate = std::make_shared<Gate>();
    std::atomic<int> running{0};
    std::atomic<int> maxRunning{0};
    std::vector<QRT::InterfaceRef<TestProducer>> producers;
    for (std::uint32_t id = 1; id <= 3; ++id)
    {
        auto producer = NewProducer(id, gate);
        producer->mFormat = kDeep;
        producer->mObserver = [&](bool inStarting)
        { RaisePeak(maxRunning, inStarting ? ++running : --running); };
        const auto settings = MakeSettings(id, producer, 1920, 1080, kDeep);
        EXPECT_EQ(ML::RenderFrameQueue::RequestCost(MakeRequest(settings)), 24);
        Add(settings);
        producers.push_back(producer);
    }
    ASSERT_TRUE(WaitUntil([&] { return running.load() == 2 && Stats().mNormalReady == 1; }));
    EXPECT_EQ(Stats().mMemoryAvailable, 2u);
    auto low = NewProducer(4);
    std::atomic<std::size_t> normalReadyWhenLowStarted{999};
    low->mObserver = [&](bool inStarting)
    {
        if (inStarting)
            normalReadyWhenLowStarted = Stats().mNormalReady;
    };
    Add(MakeSettings(4, low, 64, 32, kBGRA, 100));
    ASSERT_TRUE(WaitUntil([&] { return Stats().mLowReady == 1; }));
    std::this_thread::sleep_for(std::chrono::milliseconds(30));
    EXPECT_EQ(low->mProduceCount.load(), 0);
    EXPECT_EQ(producers[2]->mProduceCount.load(), 0);
    EXPECT_EQ(Stats().mNormalReady, 1u);
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(4));
    EXPECT_EQ(maxRunning.load(), 2);
    // The low request started only once no normal request was ready.
    EXPECT_EQ(normalReadyWhenLowStarted.load(), 0u);
    EXPECT_TRUE(WaitUntil([&] { return Stats().mMemoryAvailable == 50; }));
}

TEST_F(RenderFrameQueueTest, EqualKeysRenderOnceAndDeliverInIdentifierOrder)
{
    auto gate = std::make_shared<Gate>();
    auto leader = NewProducer(77, gate);
    Add(MakeSettings(10, leader));
    ASSERT_TRUE(WaitUntil([&] { return leader->mProduceCount.load() == 1; }));
    // Same hash, same formats and qualities: the same key.
    auto duplicate = NewProducer(77);
    for (std::uint32_t id : {12u, 11u})
        Add(MakeSettings(id, duplicate));
    ASSERT_TRUE(WaitUntil([&] { return Stats().mRedundant == 3; }));
    EXPECT_EQ(Stats().mMemoryAvailable, 49u);
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(3));
    const auto deliveries = mRecorder.Get();
    ASSERT_EQ(deliveries.size(), 3u);
    for (std::size_t i = 0; i < 3; ++i)
    {
        EXPECT_EQ(deliveries[i].mRequestID, 10u + i);
        EXPECT_EQ(deliveries[i].mKind, Delivery::kComplete);
        EXPECT_EQ(deliveries[i].mFrame, deliveries[0].mFrame);
    }
    EXPECT_EQ(leader->mProduceCount.load() + duplicate->mProduceCount.load(), 1);
    EXPECT_TRUE(WaitUntil([&] { return Stats().mRedundant == 0; }));
}

TEST_F(RenderFrameQueueTest, RenderedFrameGoesToClientThenCompletionAndIsServedFromTheCache)
{
    EXPECT_EQ(ML::RenderFrameQueue::Create().Get(), mQueue.Get());
    auto producer = NewProducer(5);
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto settings = MakeSettings(1, producer);
    settings.mRenderFlags = ML::kRenderFlag_AlwaysCache;
    settings.mClient = client;
    settings.mContext = 1234;
    const ML::RenderFrameRequest first = Add(settings);
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    const auto byClient = client->mRecorder.Get();
    ASSERT_EQ(byClient.size(), 1u);
    EXPECT_EQ(std::tuple(byClient[0].mKind, byClient[0].mRequestID, byClient[0].mContext),
              std::tuple(Delivery::kComplete, 1u, 1234));
    EXPECT_EQ(std::tuple(mRecorder.Get()[0].mKind, mRecorder.Get()[0].mStatus),
              std::tuple(Delivery::kComplete, 0));
    EXPECT_EQ(mRecorder.Get()[0].mFrame, byClient[0].mFrame);
    EXPECT_EQ(first.GetResult(), byClient[0].mFrame);
    settings.mClient.Reset();
    settings.mRequestID = 2;
    Add(settings);
    ASSERT_TRUE(mRecorder.WaitForCount(2));
    EXPECT_EQ(mRecorder.Get()[1].mFrame, mRecorder.Get()[0].mFrame);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
    // A waitable request only wakes its waiter, telling neither client nor
    // completion.
    settings.mRequestID = 3;
    settings.mClient = client;
    settings.mWaitable = QRT::WaitableObject::Create();
    const ML::RenderFrameRequest request = Add(settings);
    ASSERT_TRUE(settings.mWaitable->WaitForSignal(std::chrono::seconds(20)));
    EXPECT_EQ(request.GetResult(), mRecorder.Get()[0].mFrame);
    EXPECT_EQ(client->mRecorder.Count() + mRecorder.Count(), 3u);
    // Results go into the cache at the priority the request's class gives them.
    std::size_t delivered = mRecorder.Count();
    for (const auto& [priority, cachePriority] :
         {std::pair{900u, VF::kCachePriority_High}, std::pair{810u, VF::kCachePriority_Low}})
    {
        auto ranked = MakeSettings(priority, NewProducer(priority), 64, 32,
                                   mvxmediatypes::kPixelFormat_BGRA_4444_8u, priority);
        ranked.mRenderFlags = ML::kRenderFlag_AlwaysCache;
        ML::RenderFrameRequest probe = MakeRequest(ranked);
        probe.ComputeKey(true);
        Add(ranked);
        ASSERT_TRUE(mRecorder.WaitForCount(++delivered));
        EXPECT_EQ(VF::SharedVideoFrameCache::GetInstance().GetCachedPriority(probe.mKey),
                  cachePriority);
    }
}

TEST_F(RenderFrameQueueTest, AcceleratedRequestIsAnsweredByItsRendererOrCancelledAtOnce)
{
    auto renderer = QRT::Allocated<TestAcceleratedRenderer>::CreateInstance();
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    for (std::uint32_t id : {21u, 22u})
    {
        auto settings = MakeSettings(id, NewProducer(1));
        settings.mAcceleratedRenderer = renderer;
        settings.mClient = client;
        Add(settings);
    }
    ASSERT_EQ(renderer->mInitiated, (std::vector<std::uint32_t>{21, 22}));
    EXPECT_TRUE(renderer->mLastRenderBothFields);
    EXPECT_EQ(Stats().mAccelerated, 2u);
    const auto frame = MakeFrame(4, 4);
    renderer->mClient->OnRenderFrameComplete(0, 22, TickTime(), frame, 9);
    ASSERT_EQ(client->mRecorder.Count(), 1u);
    EXPECT_EQ(client->mRecorder.Get()[0].mFrame, frame);

    mQueue->CancelOne(21);
    // Delivered on the cancelling thread, before CancelOne returns.
    ASSERT_EQ(mRecorder.Of(21).size(), 1u);
    EXPECT_EQ(mRecorder.Of(21)[0].mKind, Delivery::kCancelled);
    EXPECT_EQ(renderer->mCancelled, std::vector<std::uint32_t>{21});
    // A late answer finds no request.
    renderer->mClient->OnRenderFrameComplete(0, 21, TickTime(), frame, 9);
    renderer->mClient->OnRenderFrameError(0, 21, TickTime(), ML::kResult_RenderFailed);
    EXPECT_EQ(mRecorder.Count(), 2u);
    EXPECT_EQ(client->mRecorder.Count(), 2u);
    EXPECT_EQ(Stats().mAccelerated, 0u);

    // A refused render is rendered by the queue.
    renderer->mAnswer = QRT::kResult_NotFound;
    auto producer = NewProducer(1);
    auto settings = MakeSettings(23, producer);
    settings.mAcceleratedRenderer = renderer;
    Add(settings);
    ASSERT_TRUE(mRecorder.WaitForCount(3));
    EXPECT_EQ(mRecorder.Of(23).at(0).mKind, Delivery::kComplete);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
}

TEST_F(RenderFrameQueueTest, ShutdownDropsQueuedRequestsSilentlyAndWakesWaiters)
{
    std::vector<QRT::InterfaceRef<QRT::WaitableObject>> waitables;
    std::vector<ML::RenderFrameRequest> requests;
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    for (std::uint32_t id = 1; id <= 4; ++id)
    {
        // Prefetches that never finish keep the requests queued.
        ML::RenderFrameRequest request =
            PrefetchOnly(id, QRT::Allocated<TestPrefetch>::CreateInstance());
        if (id % 2 == 0)
            request.mWaitable = waitables.emplace_back(QRT::WaitableObject::Create());
        request.mClient = QRT::WeakReference<ML::IRenderFrameClient>(
            QRT::InterfaceRef<ML::IRenderFrameClient>(client));
        request.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(request);
        requests.push_back(request);
    }
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 4; }));
    mQueue->Shutdown();
    EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
    for (const auto& waitable : waitables)
        EXPECT_TRUE(waitable->WaitForSignal(std::chrono::milliseconds(0)));
    for (const auto& request : requests)
        EXPECT_FALSE(request.GetResult());
    EXPECT_EQ(mRecorder.Count() + client->mRecorder.Count(), 0u);
    EXPECT_EQ(Stats().mPrefetchWaiting, 0u);

    // After shutdown a new request is refused at once.
    Add(MakeSettings(50, NewProducer(1)));
    ASSERT_EQ(mRecorder.Count(), 1u);
    EXPECT_EQ(mRecorder.Get()[0].mStatus, ML::kResult_RenderFailed);
}

TEST_F(RenderFrameQueueTest, CancelsEndWaitingRequestsEmptyAndDeliverOutsideTheQueueLocks)
{
    // Each waits for a prefetch that never completes. A waitable one
    // cancelled by identifier wakes its waiter with no result; the others
    // reach their completions as (empty, cancelled, 0), on the cancelling
    // thread. One completion calls back into the queue, which works only
    // when the queue holds none of its locks while it delivers.
    std::vector<QRT::InterfaceRef<TestPrefetch>> prefetches;
    const auto wait = [&](std::uint32_t inID)
    {
        ML::RenderFrameRequest request = PrefetchOnly(
            inID, prefetches.emplace_back(QRT::Allocated<TestPrefetch>::CreateInstance()));
        request.mCompletion = mRecorder.For(inID);
        request.mCaller = this;
        return request;
    };
    auto waitable = QRT::WaitableObject::Create();
    ML::RenderFrameRequest byID = wait(32);
    byID.mCompletion.clear();
    byID.mWaitable = waitable;
    mQueue->AddRenderRequest(byID);
    ML::RenderFrameRequest reentrant = wait(33);
    std::size_t waitingSeen = 0;
    reentrant.mCompletion = [&](FrameRef, bool inCancelled, int inStatus)
    {
        waitingSeen = mQueue->GetStatistics().mPrefetchWaiting;
        mQueue->CancelOne(51);
        Add(MakeSettings(34, nullptr));
        mRecorder.Add(
            {inCancelled ? Delivery::kCancelled : Delivery::kError, 33, 0, {}, inStatus, {}});
    };
    for (const ML::RenderFrameRequest& request : {reentrant, wait(51), wait(52)})
        mQueue->AddRenderRequest(request);
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 4; }));

    mQueue->CancelOne(32);
    ASSERT_TRUE(waitable->WaitForSignal(std::chrono::seconds(20)));
    EXPECT_FALSE(byID.GetResult());
    mQueue->CancelOne(33);
    EXPECT_EQ(waitingSeen, 2u);
    EXPECT_EQ(mRecorder.Of(51).size(), 1u);
    mQueue->CancelCallersRequests(this);
    for (std::uint32_t id : {33u, 51u, 52u})
    {
        ASSERT_EQ(mRecorder.Of(id).size(), 1u) << id;
        const Delivery delivery = mRecorder.Of(id)[0];
        EXPECT_EQ(std::tuple(delivery.mKind, delivery.mStatus, delivery.mFrame.Get()),
                  std::tuple(Delivery::kCancelled, 0, nullptr));
    }
    for (const auto& prefetch : prefetches)
        EXPECT_TRUE(WaitUntil([&] { return prefetch->mCancelCount.load() == 1; }));
    // The request added from inside a delivery is answered too; a second
    // cancel of the same identifier finds nothing.
    ASSERT_TRUE(mRecorder.WaitForCount(4));
    EXPECT_EQ(mRecorder.Of(34).at(0).mKind, Delivery::kError);
    mQueue->CancelOne(51);
    EXPECT_EQ(mRecorder.Count(), 4u);
}

TEST_F(RenderFrameQueueTest, ReleasedClientWithStationGivesExactlyOneMessage)
{
    std::mutex messagesMutex;
    std::vector<ML::RenderFrameCompletionMessageData> messages;
    // Any other message is recorded as an empty completion.
    const auto station = QRT::StationRegistry::RegisterUniqueStation(
        [&](const QRT::Message& inMessage)
        {
            const auto* payload = inMessage.GetPayloadIf<ML::RenderFrameCompletionMessageData>();
            std::lock_guard lock(messagesMutex);
            messages.push_back(payload ? *payload : ML::RenderFrameCompletionMessageData{});
        });
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto settings = MakeSettings(41, NewProducer(1));
    settings.mClient = client;
    settings.mStationName = station;
    settings.mContext = 77;
    settings.mCompletion = mRecorder.For(41);
    const ML::RenderFrameRequest request = MakeRequest(settings);
    settings.mClient.Reset();
    client.Reset();
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    ASSERT_TRUE(WaitUntil(
        [&]
        {
            QRT::UIThread::PumpMessages();
            std::lock_guard lock(messagesMutex);
            return !messages.empty();
        }));
    QRT::UIThread::PumpMessages();
    std::lock_guard lock(messagesMutex);
    ASSERT_EQ(messages.size(), 1u);
    EXPECT_EQ(std::tuple(messages[0].mRequestID, messages[0].mContext, messages[0].mFrame),
              std::tuple(41u, 77, mRecorder.Get()[0].mFrame));
    QRT::StationRegistry::DisposeStation(station);
}

TEST_F(RenderFrameQueueTest, FailuresBecomeSignedStatuses)
{
    const struct
    {
        ProducerFailure mFailure;
        bool mProducer;
        QRT::Result mExpected;
    } cases[] = {
        {ProducerFailure::kBadAlloc, true, ML::kResult_OutOfMemory},
        {ProducerFailure::kRenderRequestException, true, static_cast<QRT::Result>(0xA0990001u)},
        {ProducerFailure::kStdException, true, ML::kResult_RenderFailed},
        {ProducerFailure::kStatus, true, ML::kResult_RenderFailed},
        // No producer: the key stays nil.
        {ProducerFailure::kNone, false, ML::kResult_RenderFailed},
    };
    std::uint32_t id = 60;
    for (const auto& testCase : cases)
    {
        SCOPED_TRACE(id);
        auto producer = NewProducer(id);
        producer->mFailure = testCase.mFailure;
        Add(MakeSettings(id, testCase.mProducer ? producer : nullptr));
        ASSERT_TRUE(mRecorder.WaitForCount(id - 59));
        const Delivery delivery = mRecorder.Get().back();
        EXPECT_EQ(std::tuple(delivery.mRequestID, delivery.mKind, delivery.mStatus),
                  std::tuple(id, Delivery::kError, testCase.mExpected));
        ++id;
    }
}

TEST_F(RenderFrameQueueTest, PrefetchOnlyRequestsEndWithTheirFrameOrTimeOutAfterFifteenSeconds)
{
    // On the clock of the test: one handle completes, one hangs, one that
    // hangs asks for more time. A render whose node prefetch hangs is
    // rendered once the wait is up.
    UseManualClock();
    auto producer = NewProducer(3);
    auto node = NewNode(producer);
    node->mPrefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    auto provider = QRT::Allocated<BareCutlistProvider>::CreateInstance();
    provider->mCutlists[0] = OneSegment(node);
    auto settings = MakeSettings(95, nullptr);
    settings.mCutlistProvider = provider;
    Add(settings);
    const auto add = [&](std::uint32_t inID)
    {
        auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
        ML::RenderFrameRequest request = PrefetchOnly(inID, prefetch);
        request.mCompletion = mRecorder.For(inID);
        mQueue->AddRenderRequest(request);
        return std::pair(prefetch, request);
    };
    const auto [done, request] = add(81);
    add(91);
    const auto patient = add(92).first;
    patient->mWantMoreTime = true;
    add(93).first->mCompleteWhenAsked = true;
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 5; }));
    EXPECT_EQ(done->mInitiateCount.load(), 1);
    const auto frame = MakeFrame(2, 2);
    done->Complete(frame);
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    EXPECT_EQ(mRecorder.Get()[0].mFrame, frame);
    EXPECT_EQ(request.GetResult(), frame);

    mClock.mOffsetMilliseconds = 14'900;
    std::this_thread::sleep_for(std::chrono::milliseconds(30));
    EXPECT_EQ(mRecorder.Count(), 1u);
    EXPECT_EQ(producer->mProduceCount.load(), 0);
    mClock.mOffsetMilliseconds = 15'100;
    ASSERT_TRUE(mRecorder.WaitForCount(4));
    // A handle that finishes as it is asked for more time has not timed out.
    EXPECT_EQ(mRecorder.Of(93).at(0).mStatus, 0);
    EXPECT_EQ(std::tuple(mRecorder.Of(91).at(0).mKind, mRecorder.Of(91)[0].mStatus),
              std::tuple(Delivery::kError, ML::kResult_PrefetchIncomplete));
    EXPECT_EQ(mRecorder.Of(95).at(0).mKind, Delivery::kComplete);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
    // Both hung handles are reported.
    EXPECT_EQ(Asserts(),
              std::vector<std::string>(2, "prefetchCompleted || !prefetchTimeout | "
                                          "RenderFrameQueue | "
                                          "ML::RenderFrameQueue::ProcessPrefetchRequests"));
    // The handle that asks for more time keeps its request waiting.
    EXPECT_GE(patient->mLastElapsed.load(), 15.0);
    EXPECT_EQ(Stats().mPrefetchWaiting, 1u);
    patient->Complete({});
    ASSERT_TRUE(mRecorder.WaitForCount(5));
    EXPECT_EQ(mRecorder.Of(92).at(0).mStatus, 0);
}

TEST_F(RenderFrameQueueTest, StressEveryRequestDeliveredOnceWithinBudget)
{
    // Adders queue requests of random priorities, sizes, formats, keys (a few
    // only, so that identical renders meet), latencies and failures; some
    // wait a few polls for their prefetch. One in eight is held in its
    // prefetch wait by a handle that never completes and cancelled by its
    // identifier right after it is queued, so only that cancel ends it. The
    // odd ones have a caller, whose requests are cancelled every so often;
    // the other even ones must be rendered.
    constexpr int kAdders = 3;
    constexpr int kPerAdder = 400;
    std::atomic<int> memoryInUse{0};
    std::atomic<int> memoryPeak{0};
    std::atomic<std::uint32_t> nextID{1};
    std::atomic<int> addersLeft{kAdders};
    std::vector<std::thread> threads;
    for (int adder = 0; adder < kAdders; ++adder)
    {
        threads.emplace_back(
            [&, adder]
            {
                std::mt19937 random(1234u + static_cast<unsigned>(adder));
                for (int i = 0; i < kPerAdder; ++i)
                {
                    const std::uint32_t id = nextID.fetch_add(1);
                    const bool held = id % 8 == 0;
                    auto producer = NewProducer(random() % 40);
                    producer->mLatency = std::chrono::microseconds(random() % 200);
                    if (random() % 10 == 0)
                        producer->mFailure = ProducerFailure::kStatus;
                    const std::int32_t sizes[][2] = {{64, 32}, {1920, 1080}, {4000, 3000}};
                    const auto& size = sizes[random() % 3];
                    producer->mFormat = random() % 2 ? kDeep : kBGRA;
                    auto settings = MakeSettings(id, producer, size[0], size[1], producer->mFormat,
                                                 random() % 2 ? 1000 : 100);
                    settings.mCaller = id % 2 ? this : nullptr;
                    settings.mCompletion = mRecorder.For(id);
                    ML::RenderFrameRequest request = MakeRequest(settings);
                    if (held || random() % 3 == 0)
                    {
                        auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
                        prefetch->mWantMoreTime = held;
                        if (!held)
                            prefetch->mPollsUntilComplete = 1 + static_cast<int>(random() % 4);
                        request.mGivenPrefetches.push_back(prefetch);
                    }
                    const int cost = ML::RenderFrameQueue::RequestCost(request);
                    producer->mObserver = [&, cost](bool inStarting) {
                        RaisePeak(memoryPeak,
                                  inStarting ? memoryInUse += cost : memoryInUse -= cost);
                    };
                    mQueue->AddRenderRequest(request);
                    if (held)
                        mQueue->CancelOne(id);
                }
                --addersLeft;
            });
    }
    while (addersLeft.load() > 0)
    {
        mQueue->CancelCallersRequests(this);
        std::this_thread::sleep_for(std::chrono::microseconds(500));
    }
    for (auto& thread : threads)
        thread.join();

    const std::size_t total = kAdders * kPerAdder;
    ASSERT_TRUE(mRecorder.WaitForCount(total, std::chrono::seconds(120)));
    // Nothing is delivered twice, also after everything has settled.
    ASSERT_TRUE(WaitUntil([&] { return Stats().mMemoryAvailable == 50; }));
    std::map<std::uint32_t, std::vector<Delivery::Kind>> kinds;
    for (const Delivery& delivery : mRecorder.Get())
        kinds[delivery.mRequestID].push_back(delivery.mKind);
    ASSERT_EQ(kinds.size(), total);
    for (const auto& [id, seen] : kinds)
    {
        ASSERT_EQ(seen.size(), 1u) << "request " << id;
        const bool cancelled = seen[0] == Delivery::kCancelled;
        EXPECT_TRUE(id % 8 == 0 ? cancelled : id % 2 || !cancelled) << "request " << id;
    }
    EXPECT_LE(memoryPeak.load(), 50);
    EXPECT_GT(memoryPeak.load(), 0);
    const auto stats = Stats();
    EXPECT_EQ(stats.mNormalReady + stats.mLowReady + stats.mPrefetchWaiting + stats.mRedundant, 0u);
}

} // namespace
