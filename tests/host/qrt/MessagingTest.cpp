#include "QRT/Allocator.h"
#include "QRT/Message.h"
#include "QRT/StationRegistry.h"
#include "QRT/StationUtils.h"
#include "QRT/UIThread.h"
#include "QRT/WaitableObject.h"
#include "mvxcore/config/Error.h"
#include "mvxcore/debug/Contract.h"

#include <atomic>
#include <chrono>
#include <mutex>
#include <numeric>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using namespace std::chrono_literals;
using QRT::StationRegistry;
using QRT::UIThread;
using Values = std::vector<int>;

constexpr auto kLongWait = std::chrono::milliseconds(60000);

struct NumberMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTTest::NumberMessage";
    int mValue = 0;
};

struct OtherMessage
{
    static constexpr std::string_view kMessageTypeName = "QRTTest::OtherMessage";
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
    Values mValues;
    bool mAlwaysOnUIThread = true;

    QRT::StationHandler Handler()
    {
        return [this](const QRT::Message& inMessage)
        {
            std::lock_guard lock(mMutex);
            mValues.push_back(ValueOf(inMessage));
            mAlwaysOnUIThread = mAlwaysOnUIThread && UIThread::IsUIThread();
        };
    }
    Values Get()
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

    std::vector<QRT::ImmutableString> mStations;
    int64_t mBlocksBefore = 0;
};

TEST_F(MessagingTest, RegistrationRefusesTakenAndEmptyNamesAndUnknownStationsDropMessages)
{
    const QRT::ImmutableString name = QRT::ImmutableString::CreateStatic("QRTTest.Station");
    ASSERT_EQ(StationRegistry::RegisterStation(name), QRT::kResult_Success);
    mStations.push_back(name);
    EXPECT_EQ(StationRegistry::RegisterStation(name), QRT::kResult_AlreadyExists);
    EXPECT_THROW(StationRegistry::RegisterStation(QRT::ImmutableString()), mvxcore::config::Error);
    EXPECT_EQ(StationRegistry::DisposeStation(name), QRT::kResult_Success);
    EXPECT_EQ(StationRegistry::DisposeStation(name), QRT::kResult_NotFound);

    // Unique identifiers are distinct GUID texts, not registered by themselves.
    const StationRegistry::UniqueStationID first;
    EXPECT_NE(first, StationRegistry::UniqueStationID());
    EXPECT_FALSE(StationRegistry::IsStationRegistered(first));
    EXPECT_TRUE(QRT::Guid::Parse(first.ToStringView()).has_value());
    EXPECT_EQ(Post(first, 1), QRT::kResult_NotFound);
    EXPECT_EQ(UIThread::PumpMessagesFor(1ms), 0u);
}

TEST_F(MessagingTest, DispatcherDeliversOnItsOwnThreadInPostOrderAndStopKeepsQueuedMessages)
{
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    std::atomic<bool> refused{false};
    const QRT::ImmutableString stopper = AddStation(
        [&refused](const QRT::Message&)
        {
            EXPECT_THROW(UIThread::Stop(), mvxcore::config::Error);
            refused = true;
        });
    ASSERT_TRUE(UIThread::Start());
    EXPECT_FALSE(UIThread::Start());
    // Pumping beside a running dispatcher is a contract violation.
    EXPECT_THROW(UIThread::PumpMessages(), mvxcore::config::Error);
    EXPECT_THROW(UIThread::PumpMessagesFor(1ms), mvxcore::config::Error);
    for (int i = 0; i < 200; ++i)
        Post(station, i);
    Post(stopper, 0);
    WaitForDispatcher();
    EXPECT_TRUE(refused.load());
    Values expected(200);
    std::iota(expected.begin(), expected.end(), 0);
    EXPECT_EQ(recorder.Get(), expected);
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_FALSE(UIThread::IsUIThread());
    EXPECT_TRUE(UIThread::Stop());
    EXPECT_FALSE(UIThread::Stop());

    Post(station, 200);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 1u);
    ASSERT_TRUE(UIThread::Start());
    WaitForDispatcher();
    EXPECT_EQ(recorder.Get().back(), 200);
}

TEST_F(MessagingTest, PumpingThreadIsTheUIThreadAndDoesNotChaseMessagesPostedByReceivers)
{
    Recorder recorder;
    QRT::ImmutableString station;
    station = AddStation(
        [&, record = recorder.Handler()](const QRT::Message& inMessage)
        {
            record(inMessage);
            Post(station, 9);
        });
    ASSERT_EQ(Post(station, 41), QRT::kResult_Success);
    Post(station, 0);
    EXPECT_EQ(UIThread::PumpMessages(), 2u);
    EXPECT_EQ(recorder.Get(), (Values{41, 0}));
    EXPECT_TRUE(recorder.mAlwaysOnUIThread);
    EXPECT_EQ(UIThread::GetPendingMessageCount(), 2u);
    // Timed pumping delivers what receivers queued.
    size_t handled = 0;
    while (handled < 2)
        handled += UIThread::PumpMessagesFor(50ms);
}

TEST_F(MessagingTest, ReceiversAreCalledInOrderUntilRemovedOrTheStationDisposed)
{
    const QRT::ImmutableString station = AddStation();
    Post(station, 1);
    EXPECT_EQ(UIThread::PumpMessages(), 1u); // no receiver yet: dropped
    // A message queued before a disposal is not delivered when the name is
    // taken again.
    Recorder recorder;
    Post(station, 1);
    ASSERT_EQ(StationRegistry::DisposeStation(station), QRT::kResult_Success);
    ASSERT_EQ(StationRegistry::RegisterStation(station, recorder.Handler()), QRT::kResult_Success);
    UIThread::PumpMessages();
    EXPECT_TRUE(recorder.Get().empty());

    std::vector<std::string> calls;
    QRT::ReceiverID ids[3] = {0, 0, 0};
    for (int i = 0; i < 3; ++i)
    {
        ASSERT_EQ(
            StationRegistry::AddReceiver(
                station,
                [&, i](const QRT::Message& inMessage)
                {
                    calls.push_back(std::to_string(i) + ":" + std::to_string(ValueOf(inMessage)));
                    if (ValueOf(inMessage) == 3 && i == 1)
                    {
                        EXPECT_EQ(StationRegistry::DisposeStation(station), QRT::kResult_Success);
                    }
                },
                ids[i]),
            QRT::kResult_Success);
    }
    EXPECT_NE(ids[0], ids[1]);
    Post(station, 2);
    UIThread::PumpMessages();
    EXPECT_EQ(StationRegistry::RemoveReceiver(station, ids[0]), QRT::kResult_Success);
    EXPECT_EQ(StationRegistry::RemoveReceiver(station, ids[0]), QRT::kResult_NotFound);
    // The disposal from receiver 1 returns and stops further delivery.
    Post(station, 3);
    Post(station, 4);
    EXPECT_EQ(UIThread::PumpMessages(), 2u);
    EXPECT_EQ(calls, (std::vector<std::string>{"0:2", "1:2", "2:2", "1:3"}));

    QRT::ReceiverID none = 7;
    EXPECT_EQ(StationRegistry::AddReceiver(
                  StationRegistry::UniqueStationID(), [](const QRT::Message&) {}, none),
              QRT::kResult_NotFound);
    EXPECT_EQ(none, 0u);
    EXPECT_THROW(StationRegistry::AddReceiver(station, nullptr, none), mvxcore::config::Error);
}

TEST_F(MessagingTest, CoalescedMessagesReplaceTheWaitingOneAndAThrowingReceiverIsReported)
{
    std::vector<std::string> reports;
    auto previous =
        mvxcore::debug::SetAssertHook([&](const mvxcore::debug::AssertFailure& inFailure)
                                      { reports.emplace_back(inFailure.message); });
    Recorder recorder;
    const QRT::ImmutableString station = AddStation(recorder.Handler());
    const QRT::ImmutableString thrower =
        AddStation([](const QRT::Message&) { throw std::runtime_error("receiver broke"); });
    QRT::ReceiverID id = 0;
    StationRegistry::AddReceiver(thrower, recorder.Handler(), id);
    Post(station, 1, true);
    Post(station, 2, false);
    Post(thrower, 3, true);
    Post(station, 4, true);
    QRT::StationUtils::PostMessageToUIThread(station, QRT::MessageImpl<OtherMessage>({}), true);
    EXPECT_EQ(UIThread::PumpMessages(), 4u);
    mvxcore::debug::SetAssertHook(previous);
    // 4 took the place of 1; the other type arrives as itself (-1 here); the
    // receiver after the throwing one still ran.
    EXPECT_EQ(recorder.Get(), (Values{4, 2, 3, -1}));
    EXPECT_EQ(reports, std::vector<std::string>{"receiver broke"});
}

} // namespace
