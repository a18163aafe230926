#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "QRT/Message.h"
#include "QRT/StationRegistry.h"
#include "QRT/StationUtils.h"
#include "QRT/UIThread.h"
#include "QRT/WaitableObject.h"
#include "mvxcore/config/Error.h"
#include "mvxcore/debug/Contract.h"

#include <atomic>
#include <chrono>
#include <cstring>
#include <memory>
#include <mutex>
#include <numeric>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <xxhash.h>

namespace
{

using namespace std::chrono_literals;
using QRT::StationRegistry;
using QRT::UIThread;

constexpr auto kLongWait = std::chrono::milliseconds(60000);

struct NumberMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTTest::NumberMessage";
    int mValue = 0;
};

struct OtherMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTTest::OtherMessage";
    std::string mText;
};

class IToken : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{4e2b8c61-7d3a-4f95-b1c0-9a8e7f6d5c41}");
};

class Token : public QRT::Implements<IToken>
{
};

struct TokenMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTTest::TokenMessage";
    QRT::InterfaceRef<IToken> mToken;
};

using Number = QRT::MessageImpl<NumberMessage>;

int ValueOf(const QRT::Message& inMessage)
{
    const NumberMessage* payload = inMessage.GetPayloadIf<NumberMessage>();
    return payload ? payload->mValue : -1;
}

QRT::Result Post(const QRT::ImmutableString& inStation, int inValue, bool inCoalesce = false)
{
    return QRT::StationUtils::PostMessageToUIThread(inStation, Number(NumberMessage{inValue}),
                                                    inCoalesce);
}

// Records what a station received, from whichever thread delivers.
struct Recorder
{
    std::mutex mMutex; // guards the members below
    std::vector<int> mValues;
    std::set<std::thread::id> mThreads;
    bool mAlwaysOnUIThread = true;

    QRT::StationHandler Handler()
    {
        return [this](const QRT::Message& inMessage)
        {
            std::lock_guard lock(mMutex);
            mValues.push_back(ValueOf(inMessage));
            mThreads.insert(std::this_thread::get_id());
            mAlwaysOnUIThread = mAlwaysOnUIThread && UIThread::IsUIThread();
        };
    }
    std::vector<int> Values()
    {
        std::lock_guard lock(mMutex);
        return mValues;
    }
};

// Every case starts and ends with no dispatcher, no queued message and no
// allocator block left behind.
class MessagingTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        UIThread::Stop();
        UIThread::PumpMessages();
        mBlocksBefore = QRT::Allocator::GetLiveBlockCount();
    }

    void TearDown() override
    {
        UIThread::Stop();
        for (const QRT::ImmutableString& name : mStations)
            StationRegistry::DisposeStation(name);
        UIThread::PumpMessages();
        EXPECT_EQ(UIThread::GetPendingMessageCount(), 0u);
        mStations.clear();
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore);
    }

    QRT::ImmutableString AddStation(QRT::StationHandler inHandler = {})
    {
        QRT::ImmutableString name = StationRegistry::RegisterUniqueStation(std::move(inHandler));
        mStations.push_back(name);
        return name;
    }

    // Posts a marker behind everything queued and waits until the running
    // dispatcher delivered it.
    static void WaitForDispatcher()
    {
        auto delivered = QRT::WaitableObject::Create();
        const QRT::ImmutableString marker = StationRegistry::RegisterUniqueStation(
            [delivered](const QRT::Message&) { delivered->Signal(); });
        ASSERT_EQ(Post(marker, 0), QRT::kResult_Success);
        ASSERT_TRUE(delivered->WaitForSignal(kLongWait));
        StationRegistry::DisposeStation(marker);
    }

    // A station whose receiver signals mEntered and then blocks until
    // mRelease is signalled.
    QRT::ImmutableString AddBlockingStation()
    {
        return AddStation(
            [entered = mEntered, release = mRelease](const QRT::Message&)
            {
                entered->Signal();
                release->WaitForSignal();
            });
    }

    std::vector<QRT::ImmutableString> mStations;
    int64_t mBlocksBefore = 0;
    const QRT::InterfaceRef<QRT::WaitableObject> mEntered = QRT::WaitableObject::Create();
    const QRT::InterfaceRef<QRT::WaitableObject> mRelease = QRT::WaitableObject::Create();
};

TEST_F(MessagingTest, MessageIDIsTheFirstWordOfTheNameHash)
{
    // Independent computation: XXH3-128 over the zero value with the running
    // length set to the name's size, followed by the name; word 0 is the low
    // 32 bits of the digest's low half.
    const std::string name = "QRTTest::NumberMessage";
    std::vector<uint8_t> input(16, 0);
    const uint32_t length = static_cast<uint32_t>(name.size());
    std::memcpy(&input[12], &length, 4);
    input.insert(input.end(), name.begin(), name.end());
    const XXH128_hash_t digest = XXH3_128bits(input.data(), input.size());
    const auto expected = static_cast<QRT::MessageID>(digest.low64);

    EXPECT_EQ(QRT::HashMessageTypeNameToMessageID(name), expected);
    EXPECT_EQ(Number::GetStaticMessageID(), expected);
    EXPECT_EQ(Number(NumberMessage{3}).GetMessageID(), expected);
    EXPECT_NE(QRT::MessageImpl<OtherMessage>::GetStaticMessageID(), expected);
}

TEST_F(MessagingTest, CloneCopiesThePayloadWithItsOwnReferences)
{
    const QRT::InterfaceRef<Token> token = QRT::Allocated<Token>::CreateInstance();
    auto* counted = static_cast<QRT::Allocated<Token>*>(token.Get());
    const QRT::MessageImpl<TokenMessage> message(TokenMessage{QRT::InterfaceRef<IToken>(token)});
    EXPECT_EQ(counted->GetRefCountForTesting(), 2u);
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    {
        const QRT::MessagePtr clone = message.Clone();
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before + 1);
        EXPECT_EQ(counted->GetRefCountForTesting(), 3u);
        EXPECT_EQ(clone->GetMessageID(), message.GetMessageID());
        EXPECT_EQ(clone->GetTypeName(), "QRTTest::TokenMessage");
        const TokenMessage* payload = clone->GetPayloadIf<TokenMessage>();
        ASSERT_NE(payload, nullptr);
        EXPECT_EQ(payload->mToken.Get(), token.Get());
        EXPECT_EQ(clone->GetPayloadIf<NumberMessage>(), nullptr);
    }
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
    EXPECT_EQ(counted->GetRefCountForTesting(), 2u);
}

TEST_F(MessagingTest, RegistrationRefusesTakenAndEmptyNamesAndUnknownStationsDropMessages)
{
    const QRT::ImmutableString name = QRT::ImmutableString::CreateStatic("QRTTest.Station");
    ASSERT_EQ(StationRegistry::RegisterStation(name), QRT::kResult_Success);
    mStations.push_back(name);
    EXPECT_EQ(StationRegistry::RegisterStation(name), QRT::kResult_AlreadyExists);
    EXPECT_TRUE(StationRegistry::IsStationRegistered(name));
    EXPECT_THROW(StationRegistry::RegisterStation(QRT::ImmutableString()), mvxcore::config::Error);
    EXPECT_EQ(StationRegistry::DisposeStation(name), QRT::kResult_Success);
    EXPECT_EQ(StationRegistry::DisposeStation(name), QRT::kResult_NotFound);

    // Unique identifiers are distinct GUID texts, not registered by themselves.
    const StationRegistry::UniqueStationID first;
    const StationRegistry::UniqueStationID second;
    EXPECT_FALSE(first.empty());
    EXPECT_NE(first, second);
    EXPECT_FALSE(StationRegistry::IsStationRegistered(first));
    EXPECT_TRUE(QRT::Guid::Parse(first.ToStringView()).has_value());
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    EXPECT_EQ(Post(first, 1), QRT::kResult_NotFound);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 0u);
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
}

TEST_F(MessagingTest, DispatcherDeliversOnItsOwnThreadInPostOrder)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    ASSERT_TRUE(UIThread::Start());
    EXPECT_FALSE(UIThread::Start());
    // Pumping beside a running dispatcher is a contract violation.
    EXPECT_THROW(UIThread::PumpMessages(), mvxcore::config::Error);
    EXPECT_THROW(UIThread::PumpMessagesFor(1ms), mvxcore::config::Error);

    std::thread poster(
        [&]
        {
            for (int i = 0; i < 200; ++i)
                EXPECT_EQ(Post(station, i), QRT::kResult_Success);
        });
    poster.join();
    WaitForDispatcher();
    std::vector<int> expected(200);
    std::iota(expected.begin(), expected.end(), 0);
    EXPECT_EQ(recorder.Values(), expected);
    ASSERT_EQ(recorder.mThreads.size(), 1u);
    EXPECT_NE(*recorder.mThreads.begin(), std::this_thread::get_id());
    EXPECT_NE(*recorder.mThreads.begin(), poster.get_id());
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_FALSE(UIThread::IsUIThread());
    EXPECT_TRUE(UIThread::Stop());
    EXPECT_FALSE(UIThread::Stop());
}

TEST_F(MessagingTest, PumpingThreadIsTheUIThreadAndGetsClonesOfTheCallersMessages)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    {
        const Number message(NumberMessage{41});
        ASSERT_EQ(QRT::StationUtils::PostMessageToUIThread(station, message), QRT::kResult_Success);
    }
    for (int i = 0; i < 2; ++i)
        Post(station, i);
    EXPECT_TRUE(recorder.Values().empty());
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 3u);
    EXPECT_EQ(UIThread::PumpMessages(), 3u);
    EXPECT_EQ(recorder.Values(), (std::vector<int>{41, 0, 1}));
    EXPECT_EQ(recorder.mThreads, std::set<std::thread::id>{std::this_thread::get_id()});
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_EQ(UIThread::PumpMessages(), 0u);
}

TEST_F(MessagingTest, PumpForDeliversMessagesPostedWhileWaiting)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    std::thread poster(
        [&]
        {
            std::this_thread::sleep_for(10ms);
            Post(station, 5);
        });
    size_t handled = 0;
    while (handled == 0)
        handled += UIThread::PumpMessagesFor(50ms);
    poster.join();
    EXPECT_EQ(recorder.Values(), std::vector<int>{5});
}

TEST_F(MessagingTest, PumpDoesNotChaseMessagesPostedByReceivers)
{
    int calls = 0;
    QRT::ImmutableString station;
    station = AddStation(
        [&](const QRT::Message&)
        {
            ++calls;
            Post(station, 1);
        });
    Post(station, 1);
    EXPECT_EQ(UIThread::PumpMessages(), 1u);
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 1u);
}

TEST_F(MessagingTest, StationDisposedBeforeDeliveryGetsNothingEvenWhenItsNameIsTakenAgain)
{
    const QRT::ImmutableString blocker = AddBlockingStation();
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    ASSERT_TRUE(UIThread::Start());
    Post(blocker, 0);
    ASSERT_TRUE(mEntered->WaitForSignal(kLongWait));
    Post(station, 1);
    ASSERT_EQ(StationRegistry::DisposeStation(station), QRT::kResult_Success);
    Recorder newcomer;
    ASSERT_EQ(StationRegistry::RegisterStation(station, newcomer.Handler()), QRT::kResult_Success);
    mRelease->Signal();
    WaitForDispatcher();
    EXPECT_TRUE(recorder.Values().empty());
    EXPECT_TRUE(newcomer.Values().empty());
}

TEST_F(MessagingTest, DisposeWaitsForTheRunningReceiver)
{
    const QRT::ImmutableString station = AddBlockingStation();
    ASSERT_TRUE(UIThread::Start());
    Post(station, 0);
    ASSERT_TRUE(mEntered->WaitForSignal(kLongWait));
    std::atomic<bool> disposed{false};
    std::thread disposer(
        [&]
        {
            EXPECT_EQ(StationRegistry::DisposeStation(station), QRT::kResult_Success);
            disposed = true;
        });
    std::this_thread::sleep_for(30ms);
    EXPECT_FALSE(disposed.load());
    mRelease->Signal();
    disposer.join();
    EXPECT_TRUE(disposed.load());
}

TEST_F(MessagingTest, DisposeFromTheReceiverReturnsAndStopsFurtherDelivery)
{
    std::vector<std::string> calls;
    QRT::ImmutableString station;
    station = AddStation(
        [&](const QRT::Message& inMessage)
        {
            calls.push_back("first " + std::to_string(ValueOf(inMessage)));
            EXPECT_EQ(StationRegistry::DisposeStation(station), QRT::kResult_Success);
        });
    QRT::ReceiverID second = 0;
    ASSERT_EQ(StationRegistry::AddReceiver(
                  station, [&](const QRT::Message&) { calls.push_back("second"); }, second),
              QRT::kResult_Success);
    Post(station, 1);
    Post(station, 2);
    EXPECT_EQ(UIThread::PumpMessages(), 2u);
    EXPECT_EQ(calls, std::vector<std::string>{"first 1"});
}

TEST_F(MessagingTest, ReceiversAddedLaterAreCalledInOrderUntilRemoved)
{
    const QRT::ImmutableString station = AddStation();
    Post(station, 1);
    EXPECT_EQ(UIThread::PumpMessages(), 1u); // no receiver yet: dropped

    std::vector<std::string> calls;
    QRT::ReceiverID ids[2] = {0, 0};
    for (const char* prefix : {"a", "b"})
    {
        ASSERT_EQ(StationRegistry::AddReceiver(
                      station,
                      [&calls, prefix](const QRT::Message& inMessage)
                      { calls.push_back(prefix + std::to_string(ValueOf(inMessage))); },
                      ids[*prefix - 'a']),
                  QRT::kResult_Success);
    }
    EXPECT_NE(ids[0], ids[1]);
    Post(station, 2);
    UIThread::PumpMessages();
    EXPECT_EQ(StationRegistry::RemoveReceiver(station, ids[0]), QRT::kResult_Success);
    EXPECT_EQ(StationRegistry::RemoveReceiver(station, ids[0]), QRT::kResult_NotFound);
    Post(station, 3);
    UIThread::PumpMessages();
    EXPECT_EQ(calls, (std::vector<std::string>{"a2", "b2", "b3"}));

    QRT::ReceiverID none = 7;
    EXPECT_EQ(StationRegistry::AddReceiver(
                  StationRegistry::UniqueStationID(), [](const QRT::Message&) {}, none),
              QRT::kResult_NotFound);
    EXPECT_EQ(none, 0u);
    EXPECT_THROW(StationRegistry::AddReceiver(station, nullptr, none), mvxcore::config::Error);
}

TEST_F(MessagingTest, CoalescedMessagesReplaceTheWaitingOneInPlace)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    Recorder other;
    const QRT::ImmutableString otherStation = AddStation(other.Handler());
    Post(station, 1, true);
    Post(station, 2, false);
    Post(otherStation, 3, true);
    Post(station, 4, true);
    QRT::StationUtils::PostMessageToUIThread(
        station, QRT::MessageImpl<OtherMessage>(OtherMessage{"x"}), true);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 4u);
    EXPECT_EQ(UIThread::PumpMessages(), 4u);
    // 4 took the place of 1; the other type arrives as itself (-1 here).
    EXPECT_EQ(recorder.Values(), (std::vector<int>{4, 2, -1}));
    EXPECT_EQ(other.Values(), std::vector<int>{3});
}

TEST_F(MessagingTest, ThrowingReceiverIsReportedAndTheNextOneStillRuns)
{
    std::vector<std::string> reports;
    auto previous =
        mvxcore::debug::SetAssertHook([&](const mvxcore::debug::AssertFailure& inFailure)
                                      { reports.emplace_back(inFailure.message); });
    const QRT::ImmutableString station =
        AddStation([](const QRT::Message&) { throw std::runtime_error("receiver broke"); });
    bool secondCalled = false;
    QRT::ReceiverID id = 0;
    StationRegistry::AddReceiver(
        station, [&](const QRT::Message&) { secondCalled = true; }, id);
    Post(station, 1);
    UIThread::PumpMessages();
    mvxcore::debug::SetAssertHook(previous);
    EXPECT_EQ(reports, std::vector<std::string>{"receiver broke"});
    EXPECT_TRUE(secondCalled);
}

TEST_F(MessagingTest, StopFromAReceiverIsRefusedAndStopKeepsQueuedMessages)
{
    std::atomic<bool> refused{false};
    auto done = QRT::WaitableObject::Create();
    const QRT::ImmutableString stopper = AddStation(
        [&refused, done](const QRT::Message&)
        {
            try
            {
                UIThread::Stop();
            }
            catch (const mvxcore::config::Error&)
            {
                refused = true;
            }
            done->Signal();
        });
    ASSERT_TRUE(UIThread::Start());
    Post(stopper, 0);
    ASSERT_TRUE(done->WaitForSignal(kLongWait));
    EXPECT_TRUE(refused.load());
    EXPECT_TRUE(UIThread::Stop());

    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    Post(station, 8);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 1u);
    ASSERT_TRUE(UIThread::Start());
    WaitForDispatcher();
    EXPECT_EQ(recorder.Values(), std::vector<int>{8});
}

TEST_F(MessagingTest, DisposeRacingDeliveryNeverCallsAFreedReceiver)
{
    ASSERT_TRUE(UIThread::Start());
    for (int round = 0; round < 200; ++round)
    {
        // State the receiver reads; freed right after DisposeStation returns,
        // so a receiver still running (or called later) reads freed memory,
        // which the sanitizer runs catch.
        auto state = std::make_unique<std::vector<int>>(64, round);
        const QRT::ImmutableString station = StationRegistry::RegisterUniqueStation(
            [raw = state.get(), round](const QRT::Message&)
            {
                // Several passes with yields widen the window in which a
                // premature return from DisposeStation would free the state.
                for (int pass = 0; pass < 4; ++pass)
                {
                    EXPECT_EQ(std::accumulate(raw->begin(), raw->end(), 0), 64 * round);
                    std::this_thread::yield();
                }
            });
        std::vector<std::thread> threads;
        for (int p = 0; p < 2; ++p)
        {
            threads.emplace_back(
                [&station]
                {
                    for (int i = 0; i < 20; ++i)
                        Post(station, i);
                });
        }
        threads.emplace_back(
            [&station, &state]
            {
                std::this_thread::yield();
                StationRegistry::DisposeStation(station);
                state.reset();
            });
        for (std::thread& thread : threads)
            thread.join();
    }
    WaitForDispatcher();
}

} // namespace
