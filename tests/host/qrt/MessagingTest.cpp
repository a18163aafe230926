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
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>
#include <xxhash.h>

namespace
{

using namespace std::chrono_literals;

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
            mAlwaysOnUIThread = mAlwaysOnUIThread && QRT::UIThread::IsUIThread();
        };
    }
    std::vector<int> Values()
    {
        std::lock_guard lock(mMutex);
        return mValues;
    }
};

class MessagingTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        QRT::UIThread::Stop();
        QRT::UIThread::PumpMessages();
        mBlocksBefore = QRT::Allocator::GetLiveBlockCount();
    }

    void TearDown() override
    {
        QRT::UIThread::Stop();
        for (const QRT::ImmutableString& name : mStations)
            QRT::StationRegistry::DisposeStation(name);
        QRT::UIThread::PumpMessages();
        EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 0u);
        mStations.clear();
        EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), mBlocksBefore);
    }

    QRT::ImmutableString AddStation(QRT::StationHandler inHandler)
    {
        QRT::ImmutableString name =
            QRT::StationRegistry::RegisterUniqueStation(std::move(inHandler));
        mStations.push_back(name);
        return name;
    }

    // Posts a marker behind everything queued and waits until the running
    // dispatcher delivered it.
    void WaitForDispatcher()
    {
        auto delivered = QRT::WaitableObject::Create();
        const QRT::ImmutableString marker = QRT::StationRegistry::RegisterUniqueStation(
            [delivered](const QRT::Message&) { delivered->Signal(); });
        ASSERT_EQ(QRT::StationUtils::PostMessageToUIThread(marker, Number(NumberMessage{0})),
                  QRT::kResult_Success);
        ASSERT_TRUE(delivered->WaitForSignal(kLongWait));
        QRT::StationRegistry::DisposeStation(marker);
    }

    std::vector<QRT::ImmutableString> mStations;
    int64_t mBlocksBefore = 0;
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

TEST_F(MessagingTest, RegistrationRefusesTakenNamesAndEmptyNames)
{
    const QRT::ImmutableString name = QRT::ImmutableString::CreateStatic("QRTTest.Station");
    ASSERT_EQ(QRT::StationRegistry::RegisterStation(name), QRT::kResult_Success);
    mStations.push_back(name);
    EXPECT_EQ(QRT::StationRegistry::RegisterStation(name), QRT::kResult_AlreadyExists);
    EXPECT_TRUE(QRT::StationRegistry::IsStationRegistered(name));
    EXPECT_THROW(QRT::StationRegistry::RegisterStation(QRT::ImmutableString()),
                 mvxcore::config::Error);
    EXPECT_EQ(QRT::StationRegistry::DisposeStation(name), QRT::kResult_Success);
    EXPECT_EQ(QRT::StationRegistry::DisposeStation(name), QRT::kResult_NotFound);
}

TEST_F(MessagingTest, UniqueStationIDsDifferAndAreNotRegisteredByThemselves)
{
    const QRT::StationRegistry::UniqueStationID first;
    const QRT::StationRegistry::UniqueStationID second;
    EXPECT_FALSE(first.empty());
    EXPECT_NE(first, second);
    EXPECT_FALSE(QRT::StationRegistry::IsStationRegistered(first));
    EXPECT_TRUE(QRT::Guid::Parse(first.ToStringView()).has_value());
}

TEST_F(MessagingTest, DispatcherDeliversOnItsOwnThreadInPostOrder)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    ASSERT_TRUE(QRT::UIThread::Start());
    EXPECT_FALSE(QRT::UIThread::Start());

    std::thread poster(
        [&]
        {
            for (int i = 1; i <= 200; ++i)
                EXPECT_EQ(
                    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{i})),
                    QRT::kResult_Success);
        });
    poster.join();
    WaitForDispatcher();

    std::vector<int> expected;
    for (int i = 1; i <= 200; ++i)
        expected.push_back(i);
    EXPECT_EQ(recorder.Values(), expected);
    ASSERT_EQ(recorder.mThreads.size(), 1u);
    EXPECT_NE(*recorder.mThreads.begin(), std::this_thread::get_id());
    EXPECT_NE(*recorder.mThreads.begin(), poster.get_id());
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_FALSE(QRT::UIThread::IsUIThread());
    EXPECT_TRUE(QRT::UIThread::Stop());
    EXPECT_FALSE(QRT::UIThread::Stop());
}

TEST_F(MessagingTest, PostingKeepsTheCallersMessage)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    {
        const Number message(NumberMessage{41});
        ASSERT_EQ(QRT::StationUtils::PostMessageToUIThread(station, message), QRT::kResult_Success);
    }
    // The caller's message is gone; the queued clone is delivered.
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 1u);
    EXPECT_EQ(recorder.Values(), std::vector<int>{41});
}

TEST_F(MessagingTest, PumpingThreadIsTheUIThread)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    for (int i = 0; i < 3; ++i)
        QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{i}));
    EXPECT_TRUE(recorder.Values().empty());
    EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 3u);
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 3u);
    EXPECT_EQ(recorder.Values(), (std::vector<int>{0, 1, 2}));
    EXPECT_EQ(recorder.mThreads, std::set<std::thread::id>{std::this_thread::get_id()});
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 0u);
}

TEST_F(MessagingTest, PumpForDeliversMessagesPostedWhileWaiting)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    std::thread poster(
        [&]
        {
            std::this_thread::sleep_for(10ms);
            QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{5}));
        });
    size_t handled = 0;
    while (handled == 0)
        handled += QRT::UIThread::PumpMessagesFor(50ms);
    poster.join();
    EXPECT_EQ(recorder.Values(), std::vector<int>{5});
}

TEST_F(MessagingTest, PumpDoesNotChaseMessagesPostedByReceivers)
{
    std::atomic<int> calls{0};
    QRT::ImmutableString station;
    station = AddStation(
        [&](const QRT::Message&)
        {
            ++calls;
            QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
        });
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 1u);
    EXPECT_EQ(calls.load(), 1);
    EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 1u);
    QRT::StationRegistry::DisposeStation(station);
}

TEST_F(MessagingTest, UnknownStationDropsTheMessage)
{
    const QRT::StationRegistry::UniqueStationID nobody;
    const int64_t before = QRT::Allocator::GetLiveBlockCount();
    EXPECT_EQ(QRT::StationUtils::PostMessageToUIThread(nobody, Number(NumberMessage{1})),
              QRT::kResult_NotFound);
    EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 0u);
    EXPECT_EQ(QRT::Allocator::GetLiveBlockCount(), before);
}

TEST_F(MessagingTest, StationDisposedBeforeDeliveryGetsNothing)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    ASSERT_EQ(QRT::StationRegistry::DisposeStation(station), QRT::kResult_Success);
    // Registering the name again does not revive the old station's messages.
    Recorder newcomer;
    ASSERT_EQ(QRT::StationRegistry::RegisterStation(station, newcomer.Handler()),
              QRT::kResult_Success);
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 1u);
    EXPECT_TRUE(recorder.Values().empty());
    EXPECT_TRUE(newcomer.Values().empty());
}

TEST_F(MessagingTest, StationDisposedWhileTheDispatcherIsBusyGetsNothing)
{
    auto entered = QRT::WaitableObject::Create();
    auto release = QRT::WaitableObject::Create();
    const QRT::ImmutableString blocker = AddStation(
        [entered, release](const QRT::Message&)
        {
            entered->Signal();
            release->WaitForSignal();
        });
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    ASSERT_TRUE(QRT::UIThread::Start());
    QRT::StationUtils::PostMessageToUIThread(blocker, Number(NumberMessage{0}));
    ASSERT_TRUE(entered->WaitForSignal(kLongWait));
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    QRT::StationRegistry::DisposeStation(station);
    release->Signal();
    WaitForDispatcher();
    EXPECT_TRUE(recorder.Values().empty());
}

TEST_F(MessagingTest, DisposeWaitsForTheRunningReceiver)
{
    auto entered = QRT::WaitableObject::Create();
    std::atomic<bool> finished{false};
    const QRT::ImmutableString station = AddStation(
        [entered, &finished](const QRT::Message&)
        {
            entered->Signal();
            std::this_thread::sleep_for(30ms);
            finished = true;
        });
    ASSERT_TRUE(QRT::UIThread::Start());
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{0}));
    ASSERT_TRUE(entered->WaitForSignal(kLongWait));
    EXPECT_EQ(QRT::StationRegistry::DisposeStation(station), QRT::kResult_Success);
    EXPECT_TRUE(finished.load());
}

TEST_F(MessagingTest, DisposeFromTheReceiverReturnsAndStopsFurtherDelivery)
{
    std::vector<std::string> calls;
    QRT::ImmutableString station;
    station = AddStation(
        [&](const QRT::Message& inMessage)
        {
            calls.push_back("first " + std::to_string(ValueOf(inMessage)));
            EXPECT_EQ(QRT::StationRegistry::DisposeStation(station), QRT::kResult_Success);
        });
    QRT::ReceiverID second = 0;
    ASSERT_EQ(QRT::StationRegistry::AddReceiver(
                  station, [&](const QRT::Message&) { calls.push_back("second"); }, second),
              QRT::kResult_Success);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{2}));
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 2u);
    EXPECT_EQ(calls, std::vector<std::string>{"first 1"});
}

TEST_F(MessagingTest, ReceiversAddedLaterAreCalledInOrderUntilRemoved)
{
    const QRT::ImmutableString station = QRT::StationRegistry::RegisterUniqueStation();
    mStations.push_back(station);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 1u); // no receiver yet: dropped

    std::vector<std::string> calls;
    QRT::ReceiverID first = 0;
    QRT::ReceiverID second = 0;
    ASSERT_EQ(QRT::StationRegistry::AddReceiver(
                  station,
                  [&](const QRT::Message& inMessage)
                  { calls.push_back("a" + std::to_string(ValueOf(inMessage))); },
                  first),
              QRT::kResult_Success);
    ASSERT_EQ(QRT::StationRegistry::AddReceiver(
                  station,
                  [&](const QRT::Message& inMessage)
                  { calls.push_back("b" + std::to_string(ValueOf(inMessage))); },
                  second),
              QRT::kResult_Success);
    EXPECT_NE(first, second);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{2}));
    QRT::UIThread::PumpMessages();
    EXPECT_EQ(QRT::StationRegistry::RemoveReceiver(station, first), QRT::kResult_Success);
    EXPECT_EQ(QRT::StationRegistry::RemoveReceiver(station, first), QRT::kResult_NotFound);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{3}));
    QRT::UIThread::PumpMessages();
    EXPECT_EQ(calls, (std::vector<std::string>{"a2", "b2", "b3"}));

    QRT::ReceiverID none = 7;
    const QRT::StationRegistry::UniqueStationID nobody;
    EXPECT_EQ(QRT::StationRegistry::AddReceiver(
                  nobody, [](const QRT::Message&) {}, none),
              QRT::kResult_NotFound);
    EXPECT_EQ(none, 0u);
    EXPECT_THROW(QRT::StationRegistry::AddReceiver(station, nullptr, none), mvxcore::config::Error);
}

TEST_F(MessagingTest, CoalescedMessagesReplaceTheWaitingOneInPlace)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    Recorder other;
    const QRT::ImmutableString otherStation = AddStation(other.Handler());

    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}), true);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{2}), false);
    QRT::StationUtils::PostMessageToUIThread(otherStation, Number(NumberMessage{3}), true);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{4}), true);
    QRT::StationUtils::PostMessageToUIThread(
        station, QRT::MessageImpl<OtherMessage>(OtherMessage{"x"}), true);
    EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 4u);
    EXPECT_EQ(QRT::UIThread::PumpMessages(), 4u);
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
    QRT::StationRegistry::AddReceiver(
        station, [&](const QRT::Message&) { secondCalled = true; }, id);
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{1}));
    QRT::UIThread::PumpMessages();
    mvxcore::debug::SetAssertHook(previous);
    EXPECT_EQ(reports, std::vector<std::string>{"receiver broke"});
    EXPECT_TRUE(secondCalled);
}

TEST_F(MessagingTest, PumpingBesideARunningDispatcherIsAContractViolation)
{
    ASSERT_TRUE(QRT::UIThread::Start());
    EXPECT_THROW(QRT::UIThread::PumpMessages(), mvxcore::config::Error);
    EXPECT_THROW(QRT::UIThread::PumpMessagesFor(1ms), mvxcore::config::Error);
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
                QRT::UIThread::Stop();
            }
            catch (const mvxcore::config::Error&)
            {
                refused = true;
            }
            done->Signal();
        });
    ASSERT_TRUE(QRT::UIThread::Start());
    QRT::StationUtils::PostMessageToUIThread(stopper, Number(NumberMessage{0}));
    ASSERT_TRUE(done->WaitForSignal(kLongWait));
    EXPECT_TRUE(refused.load());
    EXPECT_TRUE(QRT::UIThread::Stop());

    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{8}));
    EXPECT_EQ(QRT::UIThread::GetPendingMessageCount(), 1u);
    ASSERT_TRUE(QRT::UIThread::Start());
    WaitForDispatcher();
    EXPECT_EQ(recorder.Values(), std::vector<int>{8});
}

TEST_F(MessagingTest, DisposeRacingDeliveryNeverCallsAFreedReceiver)
{
    ASSERT_TRUE(QRT::UIThread::Start());
    constexpr int kRounds = 200;
    std::atomic<int> deliveries{0};
    for (int round = 0; round < kRounds; ++round)
    {
        // State the receiver reads; freed right after DisposeStation returns,
        // so a receiver still running (or called later) reads freed memory,
        // which the sanitizer runs catch.
        auto state = std::make_unique<std::vector<int>>(64, round);
        std::vector<int>* raw = state.get();
        const QRT::ImmutableString station = QRT::StationRegistry::RegisterUniqueStation(
            [raw, &deliveries, round](const QRT::Message&)
            {
                // Reading in several passes with yields widens the window in
                // which a premature return from DisposeStation would free it.
                for (int pass = 0; pass < 4; ++pass)
                {
                    int sum = 0;
                    for (int value : *raw)
                        sum += value;
                    EXPECT_EQ(sum, 64 * round);
                    std::this_thread::yield();
                }
                ++deliveries;
            });
        std::vector<std::thread> posters;
        for (int p = 0; p < 2; ++p)
        {
            posters.emplace_back(
                [&station]
                {
                    for (int i = 0; i < 20; ++i)
                        QRT::StationUtils::PostMessageToUIThread(station, Number(NumberMessage{i}));
                });
        }
        std::thread disposer(
            [&station, &state]
            {
                std::this_thread::yield();
                QRT::StationRegistry::DisposeStation(station);
                state.reset();
            });
        for (std::thread& poster : posters)
            poster.join();
        disposer.join();
    }
    WaitForDispatcher();
    EXPECT_LE(deliveries.load(), kRounds * 40);
}

} // namespace
