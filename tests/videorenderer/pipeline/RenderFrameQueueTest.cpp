#include "ML/RenderFrameQueue.h"

#include "ML/RenderExecutors.h"
#include "ML/RenderFrameMessages.h"
#include "ML/RenderStatus.h"
#include "PipelineTestSupport.h"
#include "QRT/StationRegistry.h"
#include "QRT/UIThread.h"
#include "QRT/WaitableObject.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <map>
#include <random>
#include <set>
#include <string>
#include <thread>

#include <gtest/gtest.h>

using namespace pltest;
using mvxmediatypes::TickTime;

namespace
{

// A clock that tests move on by hand.
struct ManualClock
{
    std::chrono::steady_clock::time_point mBase = std::chrono::steady_clock::now();
    std::atomic<std::int64_t> mOffsetMilliseconds{0};

    std::chrono::steady_clock::time_point Now() const
    {
        return mBase + std::chrono::milliseconds(mOffsetMilliseconds.load());
    }
};

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
                std::lock_guard<std::mutex> lock(mAssertMutex);
                mAsserts.emplace_back(inFailure.condition);
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

    QRT::InterfaceRef<TestProducer> NewProducer(std::uint32_t inHashSeed)
    {
        auto producer = QRT::Allocated<TestProducer>::CreateInstance();
        producer->mHash = QRT::Guid(inHashSeed, 1, 2, {3, 4, 5, 6, 7, 8, 9, 10});
        return producer;
    }

    static QRT::InterfaceRef<ML::IRenderableNodeProducer>
    AsProducer(const QRT::InterfaceRef<TestProducer>& inProducer)
    {
        return QRT::InterfaceRef<ML::IRenderableNodeProducer>(inProducer);
    }

    ML::RenderFrameQueueStatistics Stats() { return mQueue->GetStatistics(); }

    std::vector<std::string> Asserts()
    {
        std::lock_guard<std::mutex> lock(mAssertMutex);
        return mAsserts;
    }

    QRT::InterfaceRef<ML::RenderFrameQueue> mQueue;
    std::uint64_t mConstructions = 0;
    CompletionRecorder mRecorder;
    std::mutex mAssertMutex;
    std::vector<std::string> mAsserts;
    mvxcore::debug::AssertHook mPreviousAssertHook;
};

TEST_F(RenderFrameQueueTest, SingletonIsSharedAndAnswersItsInterfaces)
{
    const auto second = ML::RenderFrameQueue::Create();
    EXPECT_EQ(second.Get(), mQueue.Get());
    void* found = nullptr;
    EXPECT_EQ(mQueue->QueryInterface(ML::IRenderFrameClient::kIID, &found), QRT::kResult_Success);
    EXPECT_NE(found, nullptr);
    mQueue->Release();
    EXPECT_EQ(mQueue->QueryInterface(QRT::Guid("{41e72d71-6dab-4c6e-ae5c-708ccd909cf1}"), &found),
              QRT::kResult_Success);
    mQueue->Release();
    EXPECT_EQ(mQueue->QueryInterface(QRT::Guid("{00000000-0000-0000-0000-000000000001}"), &found),
              QRT::kResult_NoInterface);
    EXPECT_EQ(found, nullptr);
}

TEST_F(RenderFrameQueueTest, RenderedRequestIsDeliveredToClientThenCompletion)
{
    auto producer = NewProducer(1);
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto settings = MakeSettings(5, AsProducer(producer));
    settings.mClient = QRT::InterfaceRef<ML::IRenderFrameClient>(client);
    settings.mContext = 1234;
    settings.mCompletion = mRecorder.For(5);
    ML::RenderFrameRequest request = MakeRequest(settings);
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    const auto clientDeliveries = client->Get();
    ASSERT_EQ(clientDeliveries.size(), 1u);
    EXPECT_EQ(clientDeliveries[0].mKind, Delivery::kComplete);
    EXPECT_EQ(clientDeliveries[0].mRequestID, 5u);
    EXPECT_EQ(clientDeliveries[0].mContext, 1234);
    const auto completions = mRecorder.Get();
    EXPECT_EQ(completions[0].mKind, Delivery::kComplete);
    EXPECT_EQ(completions[0].mStatus, 0);
    EXPECT_EQ(completions[0].mFrame, clientDeliveries[0].mFrame);
    EXPECT_EQ(request.GetResult(), completions[0].mFrame);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
}

TEST_F(RenderFrameQueueTest, ThreeDeepFullHDRequestsRenderTwoAtATime)
{
    auto gate = std::make_shared<Gate>();
    std::atomic<int> running{0};
    std::atomic<int> maxRunning{0};
    std::vector<QRT::InterfaceRef<TestProducer>> producers;
    for (std::uint32_t id = 1; id <= 3; ++id)
    {
        auto producer = NewProducer(id);
        producer->mFormat = mvxmediatypes::kPixelFormat_BGRA_4444_32f;
        producer->mGate = gate;
        producer->mObserver = [&](bool inStarting)
        {
            const int now = inStarting ? ++running : --running;
            int seen = maxRunning.load();
            while (now > seen && !maxRunning.compare_exchange_weak(seen, now))
            {
            }
        };
        auto settings = MakeSettings(id, AsProducer(producer), 1920, 1080,
                                     mvxmediatypes::kPixelFormat_BGRA_4444_32f);
        settings.mCompletion = mRecorder.For(id);
        const ML::RenderFrameRequest request = MakeRequest(settings);
        EXPECT_EQ(ML::RenderFrameQueue::RequestCost(request), 24);
        mQueue->AddRenderRequest(request);
        producers.push_back(producer);
    }
    ASSERT_TRUE(WaitUntil([&] { return running.load() == 2 && Stats().mNormalReady == 1; }));
    EXPECT_EQ(Stats().mMemoryAvailable, 2u);
    EXPECT_EQ(producers[2]->mProduceCount.load(), 0);
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(3));
    EXPECT_EQ(maxRunning.load(), 2);
    EXPECT_TRUE(WaitUntil([&] { return Stats().mMemoryAvailable == 50; }));
}

TEST_F(RenderFrameQueueTest, LowPriorityWaitsWhileNormalRequestIsReady)
{
    auto gate = std::make_shared<Gate>();
    // Two gated deep frames hold 48 of the 50 units.
    for (std::uint32_t id = 1; id <= 2; ++id)
    {
        auto producer = NewProducer(id);
        producer->mGate = gate;
        auto settings = MakeSettings(id, AsProducer(producer), 1920, 1080,
                                     mvxmediatypes::kPixelFormat_BGRA_4444_32f);
        settings.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(MakeRequest(settings));
    }
    ASSERT_TRUE(WaitUntil([&] { return Stats().mMemoryAvailable == 2; }));
    // A normal request costing 6 cannot start; a low one costing 1 could.
    auto normal = NewProducer(3);
    auto normalSettings = MakeSettings(3, AsProducer(normal), 1920, 1080);
    normalSettings.mCompletion = mRecorder.For(3);
    mQueue->AddRenderRequest(MakeRequest(normalSettings));
    auto low = NewProducer(4);
    std::atomic<std::size_t> normalReadyWhenLowStarted{999};
    low->mObserver = [&](bool inStarting)
    {
        if (inStarting)
            normalReadyWhenLowStarted = Stats().mNormalReady;
    };
    auto lowSettings =
        MakeSettings(4, AsProducer(low), 64, 32, mvxmediatypes::kPixelFormat_BGRA_4444_8u, 100);
    lowSettings.mCompletion = mRecorder.For(4);
    mQueue->AddRenderRequest(MakeRequest(lowSettings));
    ASSERT_TRUE(WaitUntil([&] { return Stats().mNormalReady == 1 && Stats().mLowReady == 1; }));
    std::this_thread::sleep_for(std::chrono::milliseconds(30));
    EXPECT_EQ(low->mProduceCount.load(), 0);
    EXPECT_EQ(Stats().mLowReady, 1u);
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(4));
    // The low request started only once no normal request was ready.
    EXPECT_EQ(normalReadyWhenLowStarted.load(), 0u);
    EXPECT_EQ(normal->mProduceCount.load(), 1);
}

TEST_F(RenderFrameQueueTest, LowestIdentifierGoesFirstWithinClass)
{
    // One gate request keeps 25 units; each other costs 25, so they run one
    // by one in the order they are taken.
    auto gate = std::make_shared<Gate>();
    auto blocker = NewProducer(1000);
    blocker->mGate = gate;
    auto blockerSettings = MakeSettings(1000, AsProducer(blocker), 4000, 4000);
    blockerSettings.mCompletion = mRecorder.For(1000);
    mQueue->AddRenderRequest(MakeRequest(blockerSettings));
    ASSERT_TRUE(WaitUntil([&] { return blocker->mProduceCount.load() == 1; }));

    auto holdOthers = std::make_shared<Gate>();
    auto first = NewProducer(999);
    first->mGate = holdOthers;
    auto firstSettings = MakeSettings(999, AsProducer(first), 4000, 4000);
    firstSettings.mCompletion = mRecorder.For(999);
    mQueue->AddRenderRequest(MakeRequest(firstSettings));
    ASSERT_TRUE(WaitUntil([&] { return first->mProduceCount.load() == 1; }));

    std::vector<std::uint32_t> ids{17, 3, 42, 8, 25, 11, 1, 30};
    std::vector<std::uint32_t> order;
    std::mutex orderMutex;
    std::vector<QRT::InterfaceRef<TestProducer>> producers;
    for (std::uint32_t id : ids)
    {
        auto producer = NewProducer(id);
        producer->mObserver = [&, id](bool inStarting)
        {
            if (!inStarting)
                return;
            std::lock_guard<std::mutex> lock(orderMutex);
            order.push_back(id);
        };
        auto settings = MakeSettings(id, AsProducer(producer), 4000, 4000);
        settings.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(MakeRequest(settings));
        producers.push_back(producer);
    }
    ASSERT_TRUE(WaitUntil([&] { return Stats().mNormalReady == ids.size(); }));
    holdOthers->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(ids.size() + 1));
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(ids.size() + 2));
    std::sort(ids.begin(), ids.end());
    std::lock_guard<std::mutex> lock(orderMutex);
    EXPECT_EQ(order, ids);
}

TEST_F(RenderFrameQueueTest, EqualKeysRenderOnceAndDeliverInIdentifierOrder)
{
    auto gate = std::make_shared<Gate>();
    auto leader = NewProducer(77);
    leader->mGate = gate;
    auto leaderSettings = MakeSettings(10, AsProducer(leader));
    leaderSettings.mCompletion = mRecorder.For(10);
    mQueue->AddRenderRequest(MakeRequest(leaderSettings));
    ASSERT_TRUE(WaitUntil([&] { return leader->mProduceCount.load() == 1; }));

    // Same hash, same formats and qualities: the same key.
    auto duplicateProducer = NewProducer(77);
    for (std::uint32_t id : {12u, 11u})
    {
        auto settings = MakeSettings(id, AsProducer(duplicateProducer));
        settings.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(MakeRequest(settings));
    }
    ASSERT_TRUE(WaitUntil([&] { return Stats().mRedundant == 3; }));
    EXPECT_EQ(Stats().mMemoryAvailable, 49u);
    gate->Open();
    ASSERT_TRUE(mRecorder.WaitForCount(3));
    const auto deliveries = mRecorder.Get();
    ASSERT_EQ(deliveries.size(), 3u);
    EXPECT_EQ(deliveries[0].mRequestID, 10u);
    EXPECT_EQ(deliveries[1].mRequestID, 11u);
    EXPECT_EQ(deliveries[2].mRequestID, 12u);
    for (const auto& delivery : deliveries)
    {
        EXPECT_EQ(delivery.mKind, Delivery::kComplete);
        EXPECT_EQ(delivery.mFrame, deliveries[0].mFrame);
    }
    EXPECT_EQ(leader->mProduceCount.load() + duplicateProducer->mProduceCount.load(), 1);
    EXPECT_TRUE(WaitUntil([&] { return Stats().mRedundant == 0; }));
}

TEST_F(RenderFrameQueueTest, CachedKeyIsServedWithoutRendering)
{
    auto producer = NewProducer(5);
    auto settings = MakeSettings(1, AsProducer(producer));
    settings.mRenderFlags = ML::kRenderFlag_AlwaysCache;
    settings.mCompletion = mRecorder.For(1);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    settings.mRequestID = 2;
    settings.mCompletion = mRecorder.For(2);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_TRUE(mRecorder.WaitForCount(2));
    const auto deliveries = mRecorder.Get();
    EXPECT_EQ(deliveries[1].mFrame, deliveries[0].mFrame);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
}

TEST_F(RenderFrameQueueTest, CancellingAcceleratedRequestDeliversAtOnceAndIgnoresLateAnswer)
{
    auto renderer = QRT::Allocated<TestAcceleratedRenderer>::CreateInstance();
    auto settings = MakeSettings(21, AsProducer(NewProducer(1)));
    settings.mAcceleratedRenderer = QRT::InterfaceRef<ML::IAcceleratedSequenceRenderer>(renderer);
    settings.mCompletion = mRecorder.For(21);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_EQ(renderer->mInitiated, std::vector<std::uint32_t>{21});
    EXPECT_TRUE(renderer->mLastRenderBothFields);
    EXPECT_EQ(Stats().mAccelerated, 1u);

    mQueue->CancelOne(21);
    // Delivered on the cancelling thread, before CancelOne returns.
    ASSERT_EQ(mRecorder.Count(), 1u);
    EXPECT_EQ(mRecorder.GetCancelledFlags()[0], true);
    EXPECT_EQ(mRecorder.Get()[0].mStatus, 0);
    EXPECT_FALSE(mRecorder.Get()[0].mFrame);
    EXPECT_EQ(renderer->mCancelled, std::vector<std::uint32_t>{21});

    const auto frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4, 4,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    renderer->mClient->OnRenderFrameComplete(0, 21, TickTime(), frame, 9);
    renderer->mClient->OnRenderFrameError(0, 21, TickTime(), ML::kResult_RenderFailed);
    EXPECT_EQ(mRecorder.Count(), 1u);
    EXPECT_EQ(Stats().mAccelerated, 0u);
}

TEST_F(RenderFrameQueueTest, AcceleratedAnswerIsDeliveredWithItsMilliseconds)
{
    auto renderer = QRT::Allocated<TestAcceleratedRenderer>::CreateInstance();
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto settings = MakeSettings(22, AsProducer(NewProducer(1)));
    settings.mAcceleratedRenderer = QRT::InterfaceRef<ML::IAcceleratedSequenceRenderer>(renderer);
    settings.mClient = QRT::InterfaceRef<ML::IRenderFrameClient>(client);
    mQueue->AddRenderRequest(MakeRequest(settings));
    const auto frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4, 4,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    renderer->mClient->OnRenderFrameComplete(0, 22, TickTime(), frame, 9);
    const auto deliveries = client->Get();
    ASSERT_EQ(deliveries.size(), 1u);
    EXPECT_EQ(deliveries[0].mMilliseconds, 9);
    EXPECT_EQ(deliveries[0].mFrame, frame);
}

TEST_F(RenderFrameQueueTest, RefusedAcceleratedRenderIsRenderedByQueue)
{
    auto renderer = QRT::Allocated<TestAcceleratedRenderer>::CreateInstance();
    renderer->mAnswer = QRT::kResult_NotFound;
    auto producer = NewProducer(1);
    auto settings = MakeSettings(23, AsProducer(producer));
    settings.mAcceleratedRenderer = QRT::InterfaceRef<ML::IAcceleratedSequenceRenderer>(renderer);
    settings.mCompletion = mRecorder.For(23);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    EXPECT_EQ(mRecorder.Get()[0].mKind, Delivery::kComplete);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
    EXPECT_EQ(Stats().mAccelerated, 0u);
}

TEST_F(RenderFrameQueueTest, ShutdownDropsQueuedRequestsSilentlyAndWakesWaiters)
{
    std::vector<QRT::InterfaceRef<QRT::WaitableObject>> waitables;
    std::vector<ML::RenderFrameRequest> requests;
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    for (std::uint32_t id = 1; id <= 6; ++id)
    {
        // Prefetches that never finish keep the requests queued.
        auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
        ML::RenderFrameRequest request(
            TickTime::TicksToTime(id),
            ML::RenderableNodePrefetchList{
                QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch)},
            id);
        if (id % 2 == 0)
        {
            waitables.push_back(QRT::WaitableObject::Create());
            request.mWaitable = QRT::InterfaceRef<QRT::IWaitableObject>(waitables.back());
        }
        request.mClient = QRT::WeakReference<ML::IRenderFrameClient>(
            QRT::InterfaceRef<ML::IRenderFrameClient>(client));
        request.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(request);
        requests.push_back(request);
    }
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 6; }));
    mQueue->Shutdown();
    EXPECT_TRUE(ML::IsRenderModuleShuttingDown());
    for (const auto& waitable : waitables)
        EXPECT_TRUE(waitable->WaitForSignal(std::chrono::milliseconds(0)));
    for (const auto& request : requests)
        EXPECT_FALSE(request.GetResult());
    EXPECT_EQ(mRecorder.Count(), 0u);
    EXPECT_TRUE(client->Get().empty());
    const auto stats = Stats();
    EXPECT_EQ(stats.mPrefetchWaiting + stats.mNormalReady + stats.mLowReady + stats.mIncoming, 0u);

    // After shutdown a new request is refused at once.
    auto late = MakeSettings(50, AsProducer(NewProducer(1)));
    late.mCompletion = mRecorder.For(50);
    mQueue->AddRenderRequest(MakeRequest(late));
    ASSERT_EQ(mRecorder.Count(), 1u);
    EXPECT_EQ(mRecorder.Get()[0].mStatus, ML::kResult_RenderFailed);
}

TEST_F(RenderFrameQueueTest, WaitableRequestNotifiesNobody)
{
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto waitable = QRT::WaitableObject::Create();
    auto settings = MakeSettings(31, AsProducer(NewProducer(1)));
    settings.mClient = QRT::InterfaceRef<ML::IRenderFrameClient>(client);
    settings.mStationName = QRT::ImmutableString::CreateStatic("NoSuchStation");
    settings.mCompletion = mRecorder.For(31);
    settings.mWaitable = QRT::InterfaceRef<QRT::IWaitableObject>(waitable);
    const ML::RenderFrameRequest request = MakeRequest(settings);
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(waitable->WaitForSignal(std::chrono::seconds(20)));
    EXPECT_TRUE(request.GetResult());
    EXPECT_TRUE(client->Get().empty());
    EXPECT_EQ(mRecorder.Count(), 0u);
}

TEST_F(RenderFrameQueueTest, CancelledWaitableRequestWakesWaiterWithEmptyResult)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    auto waitable = QRT::WaitableObject::Create();
    ML::RenderFrameRequest request(
        TickTime::TicksToTime(1),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch)},
        32);
    request.mWaitable = QRT::InterfaceRef<QRT::IWaitableObject>(waitable);
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 1; }));
    mQueue->CancelOne(32);
    ASSERT_TRUE(waitable->WaitForSignal(std::chrono::seconds(20)));
    EXPECT_FALSE(request.GetResult());
    EXPECT_TRUE(WaitUntil([&] { return prefetch->mCancelCount.load() == 1; }));
}

TEST_F(RenderFrameQueueTest, ReleasedClientWithStationGivesExactlyOneMessage)
{
    std::mutex messagesMutex;
    std::vector<ML::RenderFrameCompletionMessageData> messages;
    int otherMessages = 0;
    const auto station = QRT::StationRegistry::RegisterUniqueStation(
        [&](const QRT::Message& inMessage)
        {
            std::lock_guard<std::mutex> lock(messagesMutex);
            if (const auto* payload =
                    inMessage.GetPayloadIf<ML::RenderFrameCompletionMessageData>())
                messages.push_back(*payload);
            else
                ++otherMessages;
        });
    auto client = QRT::Allocated<TestClient>::CreateInstance();
    auto settings = MakeSettings(41, AsProducer(NewProducer(1)));
    settings.mClient = QRT::InterfaceRef<ML::IRenderFrameClient>(client);
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
            std::lock_guard<std::mutex> lock(messagesMutex);
            return !messages.empty();
        }));
    QRT::UIThread::PumpMessages();
    std::lock_guard<std::mutex> lock(messagesMutex);
    ASSERT_EQ(messages.size(), 1u);
    EXPECT_EQ(otherMessages, 0);
    EXPECT_EQ(messages[0].mRequestID, 41u);
    EXPECT_EQ(messages[0].mContext, 77);
    EXPECT_EQ(messages[0].mFrame, mRecorder.Get()[0].mFrame);
    QRT::StationRegistry::DisposeStation(station);
}

TEST_F(RenderFrameQueueTest, CancellationReachesCompletionAsEmptyCancelledZero)
{
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    ML::RenderFrameRequest request(
        TickTime::TicksToTime(1),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch)},
        51);
    request.mCaller = this;
    request.mCompletion = mRecorder.For(51);
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 1; }));
    mQueue->CancelCallersRequests(this);
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    const auto delivery = mRecorder.Get()[0];
    EXPECT_TRUE(mRecorder.GetCancelledFlags()[0]);
    EXPECT_FALSE(delivery.mFrame);
    EXPECT_EQ(delivery.mStatus, 0);
    // A second cancel of the same identifier finds nothing.
    mQueue->CancelOne(51);
    EXPECT_EQ(mRecorder.Count(), 1u);
}

TEST_F(RenderFrameQueueTest, FailuresBecomeSignedStatuses)
{
    const struct
    {
        ProducerFailure mFailure;
        QRT::Result mExpected;
    } cases[] = {
        {ProducerFailure::kBadAlloc, ML::kResult_OutOfMemory},
        {ProducerFailure::kRenderRequestException, static_cast<QRT::Result>(0xA0990001u)},
        {ProducerFailure::kStdException, ML::kResult_RenderFailed},
        {ProducerFailure::kStatus, ML::kResult_RenderFailed},
    };
    std::uint32_t id = 60;
    for (const auto& testCase : cases)
    {
        auto producer = NewProducer(id);
        producer->mFailure = testCase.mFailure;
        auto settings = MakeSettings(id, AsProducer(producer));
        settings.mCompletion = mRecorder.For(id);
        mQueue->AddRenderRequest(MakeRequest(settings));
        ASSERT_TRUE(mRecorder.WaitForCount(id - 59));
        const auto delivery = mRecorder.Get().back();
        EXPECT_EQ(delivery.mRequestID, id);
        EXPECT_FALSE(mRecorder.GetCancelledFlags().back());
        EXPECT_FALSE(delivery.mFrame);
        EXPECT_EQ(delivery.mStatus, testCase.mExpected);
        ++id;
    }
    EXPECT_EQ(static_cast<int>(ML::kResult_OutOfMemory), static_cast<int>(0xA00F0006u));
    EXPECT_LT(ML::kResult_OutOfMemory, 0);
}

TEST_F(RenderFrameQueueTest, NilKeyRequestFailsWithRenderFailed)
{
    auto settings = MakeSettings(70, nullptr);
    settings.mCompletion = mRecorder.For(70);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    EXPECT_EQ(mRecorder.Get()[0].mStatus, ML::kResult_RenderFailed);
}

TEST_F(RenderFrameQueueTest, PrefetchOnlyRequestCompletesWithPrefetchedFrame)
{
    ManualClock clock;
    ML::RenderFrameQueue::SetClock([&clock] { return clock.Now(); });
    auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
    ML::RenderFrameRequest request(
        TickTime::TicksToTime(1),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch)},
        81);
    request.mCompletion = mRecorder.For(81);
    mQueue->AddRenderRequest(request);
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 1; }));
    EXPECT_EQ(prefetch->mInitiateCount.load(), 1);
    // Polled (timed) but not complete: nothing delivered.
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_EQ(mRecorder.Count(), 0u);
    prefetch->mFrame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 2, 2,
                                            mvxmediatypes::kPixelAspectRatio_Square, true, false);
    prefetch->mComplete = true;
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    EXPECT_EQ(mRecorder.Get()[0].mFrame, prefetch->mFrame);
    EXPECT_EQ(request.GetResult(), prefetch->mFrame);
    EXPECT_TRUE(Asserts().empty());
}

TEST_F(RenderFrameQueueTest, HungPrefetchTimesOutAfterFifteenSecondsOfClockTime)
{
    ManualClock clock;
    ML::RenderFrameQueue::SetClock([&clock] { return clock.Now(); });
    auto hung = QRT::Allocated<TestPrefetch>::CreateInstance();
    ML::RenderFrameRequest prefetchOnly(
        TickTime::TicksToTime(1),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(hung)}, 91);
    prefetchOnly.mCompletion = mRecorder.For(91);
    mQueue->AddRenderRequest(prefetchOnly);

    auto patient = QRT::Allocated<TestPrefetch>::CreateInstance();
    patient->mWantMoreTime = true;
    ML::RenderFrameRequest waiting(
        TickTime::TicksToTime(2),
        ML::RenderableNodePrefetchList{QRT::InterfaceRef<ML::IRenderableNodePrefetch>(patient)},
        92);
    waiting.mCompletion = mRecorder.For(92);
    mQueue->AddRenderRequest(waiting);
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 2; }));

    clock.mOffsetMilliseconds = 14'900;
    std::this_thread::sleep_for(std::chrono::milliseconds(30));
    EXPECT_EQ(mRecorder.Count(), 0u);

    clock.mOffsetMilliseconds = 15'100;
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    const auto delivery = mRecorder.Get()[0];
    EXPECT_EQ(delivery.mRequestID, 91u);
    EXPECT_EQ(delivery.mStatus, ML::kResult_PrefetchIncomplete);
    EXPECT_EQ(Asserts(), std::vector<std::string>{"prefetchCompleted || !prefetchTimeout"});
    // The handle that asks for more time keeps its request waiting.
    EXPECT_GE(patient->mLastElapsed.load(), 15.0);
    EXPECT_EQ(Stats().mPrefetchWaiting, 1u);
    patient->mComplete = true;
    ASSERT_TRUE(mRecorder.WaitForCount(2));
    EXPECT_EQ(mRecorder.Get()[1].mRequestID, 92u);
    EXPECT_EQ(mRecorder.Get()[1].mStatus, 0);
}

TEST_F(RenderFrameQueueTest, RequestWithHungPrefetchIsRenderedAfterTimeout)
{
    ManualClock clock;
    ML::RenderFrameQueue::SetClock([&clock] { return clock.Now(); });
    auto hung = QRT::Allocated<TestPrefetch>::CreateInstance();
    auto node = QRT::Allocated<TestNode>::CreateInstance();
    auto producer = NewProducer(3);
    node->mProducer = AsProducer(producer);
    node->mPrefetch = QRT::InterfaceRef<ML::IRenderableNodePrefetch>(hung);
    auto cutlist = QRT::Allocated<TestCutlist>::CreateInstance();
    cutlist->mNode = QRT::InterfaceRef<MF::IRenderableNode>(node);
    auto provider = QRT::Allocated<TestCutlistProvider>::CreateInstance();
    provider->mCutlists[0] = QRT::InterfaceRef<MF::IRenderableCutlist>(cutlist);
    auto settings = MakeSettings(95, nullptr);
    settings.mCutlistProvider = QRT::InterfaceRef<MF::IRenderableCutlistProvider>(provider);
    settings.mCompletion = mRecorder.For(95);
    mQueue->AddRenderRequest(MakeRequest(settings));
    ASSERT_TRUE(WaitUntil([&] { return Stats().mPrefetchWaiting == 1; }));
    EXPECT_EQ(producer->mProduceCount.load(), 0);
    clock.mOffsetMilliseconds = 16'000;
    ASSERT_TRUE(mRecorder.WaitForCount(1));
    EXPECT_EQ(mRecorder.Get()[0].mKind, Delivery::kComplete);
    EXPECT_EQ(producer->mProduceCount.load(), 1);
}

TEST_F(RenderFrameQueueTest, StressEveryRequestDeliveredOnceWithinBudget)
{
    constexpr int kAdders = 3;
    constexpr int kPerAdder = 700;
    std::atomic<int> memoryInUse{0};
    std::atomic<int> memoryPeak{0};
    std::atomic<std::uint32_t> nextID{1};
    std::mutex deliveriesMutex;
    std::map<std::uint32_t, int> deliveryCounts;
    std::map<std::uint32_t, bool> cancelledByID;
    const void* callers[2] = {&memoryInUse, &memoryPeak};

    auto deliveryFor = [&](std::uint32_t inID)
    {
        return [&, inID](FrameRef, bool inCancelled, int)
        {
            std::lock_guard<std::mutex> lock(deliveriesMutex);
            ++deliveryCounts[inID];
            cancelledByID[inID] = inCancelled;
        };
    };

    std::vector<std::thread> threads;
    std::atomic<bool> addingDone{false};
    for (int adder = 0; adder < kAdders; ++adder)
    {
        threads.emplace_back(
            [&, adder]
            {
                std::mt19937 random(1234u + static_cast<unsigned>(adder));
                for (int i = 0; i < kPerAdder; ++i)
                {
                    const std::uint32_t id = nextID.fetch_add(1);
                    auto producer = QRT::Allocated<TestProducer>::CreateInstance();
                    // A few keys only, so that identical renders meet.
                    producer->mHash = QRT::Guid(random() % 40, 0, 0, {0, 0, 0, 0, 0, 0, 0, 1});
                    producer->mLatency = std::chrono::microseconds(random() % 200);
                    if (random() % 10 == 0)
                        producer->mFailure = ProducerFailure::kStatus;
                    const std::int32_t sizes[][2] = {{64, 32}, {1920, 1080}, {4000, 3000}};
                    const auto& size = sizes[random() % 3];
                    const auto format = random() % 2 ? mvxmediatypes::kPixelFormat_BGRA_4444_32f
                                                     : mvxmediatypes::kPixelFormat_BGRA_4444_8u;
                    producer->mFormat = format;
                    auto settings = MakeSettings(id, AsProducer(producer), size[0], size[1], format,
                                                 random() % 2 ? 1000 : 100);
                    settings.mCaller = callers[random() % 2];
                    settings.mCompletion = deliveryFor(id);
                    ML::RenderFrameRequest request = MakeRequest(settings);
                    // Some requests wait a few polls for their prefetch, so
                    // that cancels meet them in every list.
                    if (random() % 3 == 0)
                    {
                        auto prefetch = QRT::Allocated<TestPrefetch>::CreateInstance();
                        prefetch->mPollsUntilComplete = 1 + static_cast<int>(random() % 4);
                        request.mGivenPrefetches.push_back(
                            QRT::InterfaceRef<ML::IRenderableNodePrefetch>(prefetch));
                    }
                    const int cost = ML::RenderFrameQueue::RequestCost(request);
                    producer->mObserver = [&, cost](bool inStarting)
                    {
                        const int now = inStarting ? (memoryInUse += cost) : (memoryInUse -= cost);
                        int seen = memoryPeak.load();
                        while (now > seen && !memoryPeak.compare_exchange_weak(seen, now))
                        {
                        }
                    };
                    mQueue->AddRenderRequest(request);
                }
            });
    }
    std::thread cancellerByID(
        [&]
        {
            std::mt19937 random(99);
            while (!addingDone.load())
            {
                const std::uint32_t top = nextID.load();
                mQueue->CancelOne(1 + random() % top);
                std::this_thread::sleep_for(std::chrono::microseconds(100));
            }
        });
    std::thread cancellerByCaller(
        [&]
        {
            int round = 0;
            while (!addingDone.load())
            {
                mQueue->CancelCallersRequests(callers[round++ % 2]);
                std::this_thread::sleep_for(std::chrono::milliseconds(3));
            }
        });
    for (auto& thread : threads)
        thread.join();
    addingDone = true;
    cancellerByID.join();
    cancellerByCaller.join();

    const std::size_t total = kAdders * kPerAdder;
    ASSERT_TRUE(WaitUntil(
        [&]
        {
            std::lock_guard<std::mutex> lock(deliveriesMutex);
            return deliveryCounts.size() == total;
        },
        std::chrono::seconds(120)));
    // Nothing is delivered twice, also after everything has settled.
    ASSERT_TRUE(WaitUntil([&] { return Stats().mMemoryAvailable == 50; }));
    std::lock_guard<std::mutex> lock(deliveriesMutex);
    int cancelled = 0;
    for (const auto& [id, count] : deliveryCounts)
    {
        EXPECT_EQ(count, 1) << "request " << id;
        cancelled += cancelledByID[id] ? 1 : 0;
    }
    EXPECT_GT(cancelled, 0);
    EXPECT_LE(memoryPeak.load(), 50);
    EXPECT_GT(memoryPeak.load(), 0);
    const auto stats = Stats();
    EXPECT_EQ(stats.mNormalReady + stats.mLowReady + stats.mPrefetchWaiting + stats.mRedundant, 0u);
}

} // namespace
