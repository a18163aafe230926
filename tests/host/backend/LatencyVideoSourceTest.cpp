#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"
#include "ContractExpect.h"

#include <atomic>
#include <chrono>
#include <thread>

#include <gtest/gtest.h>

namespace
{

using namespace betest;
using namespace std::chrono_literals;
using BE::Deprecated::IAsyncVideoSource;
using BE::Deprecated::kFrameRequestFlag_NoBlock;

TickTime Frame(std::int64_t inIndex)
{
    return TickTime::FromFrame(inIndex, mvxmediatypes::kFrameRate_Video25);
}

// A latency no test could sit out: reaching the end of a test proves that
// nothing slept it.
constexpr auto kForever = std::chrono::hours(1);

class LatencyVideoSourceTest : public ::testing::Test
{
protected:
    BE::VideoSourceRef mInner = OpenOrFail("pattern:moving?size=32x16");
};

TEST_F(LatencyVideoSourceTest, NoBlockRequestNeverSleeps)
{
    const BE::VideoSourceRef slow = BE::CreateLatencyVideoSource(mInner, kForever);
    FrameRef frame;
    EXPECT_EQ(ReadFrame(slow, Frame(1), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    EXPECT_FALSE(frame);
    // Once the inner source holds the frame, even a blocking read is immediate.
    const FrameRef read = ReadFrameOrFail(mInner, Frame(1));
    EXPECT_EQ(ReadFrame(slow, Frame(1), frame), QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), read.Get());
    EXPECT_EQ(ReadFrame(slow, Frame(1), frame, kFrameRequestFlag_NoBlock), QRT::kResult_Success);
}

TEST_F(LatencyVideoSourceTest, ReadOfAnUnheldFrameWaitsTheLatency)
{
    const BE::VideoSourceRef slow = BE::CreateLatencyVideoSource(mInner, 20ms);
    const auto start = std::chrono::steady_clock::now();
    const FrameRef frame = ReadFrameOrFail(slow, Frame(2));
    EXPECT_GE(std::chrono::steady_clock::now() - start, 20ms);
    EXPECT_EQ(slow->GetFrameKey(Frame(2), {}, {}, {}), mInner->GetFrameKey(Frame(2), {}, {}, {}));
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(slow);
    ASSERT_TRUE(info);
    EXPECT_EQ(info->GetVideoSource(BE::Deprecated::kMediaType_Video, 0), slow);
    EXPECT_TRUE(info->Copy());
    vrtest::ExpectInputContract([] { BE::CreateLatencyVideoSource({}, 1ms); },
                                "inSource != nullptr");
}

class AsyncVideoSourceTest : public LatencyVideoSourceTest
{
protected:
    static QRT::InterfaceRef<IAsyncVideoSource> Async(const BE::VideoSourceRef& inSource)
    {
        auto async = QRT::QueryRef<IAsyncVideoSource>(inSource);
        EXPECT_TRUE(async);
        return async;
    }
};

TEST_F(AsyncVideoSourceTest, StartedReadCompletesOnTheWorkerAndIsTakenOnce)
{
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, 5ms);
    const auto async = Async(source);
    EXPECT_TRUE(async->IsAsyncEnabled());
    ASSERT_EQ(async->StartAsyncRead(Frame(7), {}, {}, {}), QRT::kResult_Success);
    FrameRef frame;
    // Poll with NoBlock as the prefetcher does, waiting between polls.
    double elapsed = 0;
    while (QRT::Failed(ReadFrame(source, Frame(7), frame, kFrameRequestFlag_NoBlock)))
    {
        ASSERT_TRUE(async->WaitForAsyncRead(Frame(7), {}, {}, {}, elapsed));
        elapsed += 0.05;
    }
    ASSERT_TRUE(frame);
    FrameRef direct = ReadFrameOrFail(mInner, Frame(7));
    EXPECT_EQ(frame.Get(), direct.Get()) << "the worker read through the inner source";
    // Taken: the read is over, so waiting for it is pointless.
    EXPECT_FALSE(async->WaitForAsyncRead(Frame(7), {}, {}, {}, 0.0));
}

TEST_F(AsyncVideoSourceTest, CancelWhileInFlightAbandonsTheRead)
{
    {
        const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, kForever);
        const auto async = Async(source);
        ASSERT_EQ(async->StartAsyncRead(Frame(3), {}, {}, {}), QRT::kResult_Success);
        // The read is in flight (queued or sleeping): a wait blocks a slice and keeps going.
        EXPECT_TRUE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.0));
        async->CancelAsyncRead(Frame(3), {}, {}, {});
        EXPECT_FALSE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.0))
            << "nothing is in flight after the cancel";
        FrameRef frame;
        EXPECT_EQ(ReadFrame(source, Frame(3), frame, kFrameRequestFlag_NoBlock),
                  BE::kResult_FrameNotReady);
        // Cancelling again, or something never started, is harmless.
        async->CancelAsyncRead(Frame(3), {}, {}, {});
        async->CancelAsyncRead(Frame(4), {}, {}, {});
    }
    // The destructor joined the worker although its read would have slept an hour.
    FrameRef frame;
    EXPECT_EQ(ReadFrame(mInner, Frame(3), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady)
        << "the abandoned read never reached the inner source";
}

TEST_F(AsyncVideoSourceTest, TwoStartsNeedTwoCancels)
{
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, kForever);
    const auto async = Async(source);
    ASSERT_EQ(async->StartAsyncRead(Frame(5), {}, {}, {}), QRT::kResult_Success);
    ASSERT_EQ(async->StartAsyncRead(Frame(5), {}, {}, {}), QRT::kResult_Success);
    async->CancelAsyncRead(Frame(5), {}, {}, {});
    EXPECT_TRUE(async->WaitForAsyncRead(Frame(5), {}, {}, {}, 0.0));
    async->CancelAsyncRead(Frame(5), {}, {}, {});
    EXPECT_FALSE(async->WaitForAsyncRead(Frame(5), {}, {}, {}, 0.0));
}

TEST_F(AsyncVideoSourceTest, WaitTimesOutAfterTheCallerWaitedTooLong)
{
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, kForever, 100ms);
    const auto async = Async(source);
    ASSERT_EQ(async->StartAsyncRead(Frame(1), {}, {}, {}), QRT::kResult_Success);
    EXPECT_TRUE(async->WaitForAsyncRead(Frame(1), {}, {}, {}, 0.0));
    EXPECT_FALSE(async->WaitForAsyncRead(Frame(1), {}, {}, {}, 0.5));
    async->CancelAsyncRead(Frame(1), {}, {}, {});
    EXPECT_FALSE(Async(BE::CreateAsyncVideoSource(mInner, 1ms, 1s, false))->IsAsyncEnabled());
}

TEST_F(AsyncVideoSourceTest, FailedReadEndsTheWait)
{
    TempDirectory directory;
    const std::string path = directory.File("one.y4m");
    WriteBytes(path, "YUV4MPEG2 W2 H2 F25:1 C444\nFRAME\n" + std::string(12, '\x80'));
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(OpenOrFail(path), 1ms);
    const auto async = Async(source);
    ASSERT_EQ(async->StartAsyncRead(Frame(9), {}, {}, {}), QRT::kResult_Success);
    // The read of a frame the file does not have fails; the wait then says stop.
    double elapsed = 0;
    while (async->WaitForAsyncRead(Frame(9), {}, {}, {}, elapsed))
        elapsed += 0.05;
    FrameRef frame;
    EXPECT_TRUE(QRT::Failed(ReadFrame(source, Frame(9), frame, kFrameRequestFlag_NoBlock)));
    EXPECT_FALSE(frame);
    async->CancelAsyncRead(Frame(9), {}, {}, {});
}

TEST_F(AsyncVideoSourceTest, ConcurrentStartsWaitsAndCancelsFromManyThreads)
{
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, 200us);
    const auto async = Async(source);
    constexpr int kThreads = 4;
    constexpr int kFramesPerThread = 12;
    std::atomic<int> taken{0};
    std::atomic<int> cancelled{0};
    std::vector<std::thread> threads;
    for (int thread = 0; thread < kThreads; ++thread)
    {
        threads.emplace_back(
            [&, thread]
            {
                for (int index = 0; index < kFramesPerThread; ++index)
                {
                    const TickTime time = Frame(thread * 100 + index);
                    if (QRT::Failed(async->StartAsyncRead(time, {}, {}, {})))
                        continue;
                    if (index % 3 == 2)
                    {
                        async->CancelAsyncRead(time, {}, {}, {});
                        ++cancelled;
                        continue;
                    }
                    FrameRef frame;
                    double elapsed = 0;
                    while (QRT::Failed(ReadFrame(source, time, frame, kFrameRequestFlag_NoBlock)) &&
                           async->WaitForAsyncRead(time, {}, {}, {}, elapsed))
                        elapsed += 0.05;
                    if (frame)
                        ++taken;
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(taken.load(), kThreads * kFramesPerThread * 2 / 3);
    EXPECT_EQ(cancelled.load(), kThreads * kFramesPerThread / 3);
}

} // namespace
