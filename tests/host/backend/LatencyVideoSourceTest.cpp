#include "BE/MediaStatus.h"
#include "BackendTestSupport.h"
#include "ContractExpect.h"

#include <chrono>

#include <gtest/gtest.h>

namespace
{

using namespace betest;
using namespace mvxmediatypes;
using namespace std::chrono_literals;
using BE::Deprecated::IAsyncVideoSource;
using BE::Deprecated::kFrameRequestFlag_NoBlock;

TickTime Frame(std::int64_t inIndex)
{
    return TickTime::FromFrame(inIndex, kFrameRate_Video25);
}

// A latency no test could sit out: reaching the end of a test proves that
// nothing slept it.
constexpr auto kForever = std::chrono::hours(1);

class LatencyVideoSourceTest : public ::testing::Test
{
protected:
    static QRT::InterfaceRef<IAsyncVideoSource> Async(const BE::VideoSourceRef& inSource)
    {
        auto async = QRT::QueryRef<IAsyncVideoSource>(inSource);
        EXPECT_TRUE(async);
        return async;
    }
    // Polls with NoBlock as the prefetcher does, waiting between polls, until
    // the frame is taken or the wait says stop.
    static FrameRef Collect(const BE::VideoSourceRef& inSource, IAsyncVideoSource& inAsync,
                            TickTime inTime)
    {
        FrameRef frame;
        double elapsed = 0;
        while (QRT::Failed(ReadFrame(inSource, inTime, frame, kFrameRequestFlag_NoBlock)) &&
               inAsync.WaitForAsyncRead(inTime, {}, {}, {}, elapsed))
            elapsed += 0.05;
        return frame;
    }

    BE::VideoSourceRef mInner = OpenOrFail("pattern:moving?size=32x16");
};

TEST_F(LatencyVideoSourceTest, HeldFramesAnswerAtOnceAndOthersAreReadThroughTheInner)
{
    const BE::VideoSourceRef slow = BE::CreateLatencyVideoSource(mInner, kForever);
    FrameRef frame;
    EXPECT_EQ(ReadFrame(slow, Frame(1), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady);
    // Once the inner source holds the frame, even a blocking read is immediate.
    const FrameRef read = ReadFrameOrFail(mInner, Frame(1));
    EXPECT_EQ(ReadFrame(slow, Frame(1), frame), QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), read.Get());

    // A frame not held is read by the inner source after the delay, which then holds it.
    const BE::VideoSourceRef delayed = BE::CreateLatencyVideoSource(mInner, 1ms);
    const FrameRef second = ReadFrameOrFail(delayed, Frame(2));
    EXPECT_EQ(ReadFrame(mInner, Frame(2), frame, kFrameRequestFlag_NoBlock), QRT::kResult_Success);
    EXPECT_EQ(frame.Get(), second.Get());
    EXPECT_EQ(delayed->GetFrameKey(Frame(2), {}, {}, {}),
              mInner->GetFrameKey(Frame(2), {}, {}, {}));
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(delayed);
    ASSERT_TRUE(info);
    EXPECT_EQ(info->GetVideoSource(BE::Deprecated::kMediaType_Video, 0), delayed);
    EXPECT_TRUE(info->Copy());
    EXPECT_INPUT_CONTRACT(BE::CreateLatencyVideoSource({}, 1ms), "inSource != nullptr");
}

TEST_F(LatencyVideoSourceTest, StartedReadCompletesOnTheWorkerAndIsTakenOnce)
{
    const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, 5ms);
    const auto async = Async(source);
    EXPECT_TRUE(async->IsAsyncEnabled());
    ASSERT_EQ(async->StartAsyncRead(Frame(7), {}, {}, {}), QRT::kResult_Success);
    const FrameRef frame = Collect(source, *async, Frame(7));
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame.Get(), ReadFrameOrFail(mInner, Frame(7)).Get()) << "read through the inner";
    // Taken: the read is over, so waiting for it is pointless.
    EXPECT_FALSE(async->WaitForAsyncRead(Frame(7), {}, {}, {}, 0.0));
    // A frame the inner source holds needs no read: it is done at once.
    ASSERT_EQ(async->StartAsyncRead(Frame(7), {}, {}, {}), QRT::kResult_Success);
    EXPECT_TRUE(async->WaitForAsyncRead(Frame(7), {}, {}, {}, 0.0));
    EXPECT_EQ(async->StartAsyncRead(kTime_Invalid, {}, {}, {}), BE::kResult_FrameOutOfRange);
    EXPECT_FALSE(Async(BE::CreateAsyncVideoSource(mInner, 1ms, 1s, false))->IsAsyncEnabled());

    // A one-frame file has no frame 9: the read fails and the wait then says stop.
    TempDirectory directory;
    const std::string path = directory.File("one.y4m");
    WriteBytes(path, "YUV4MPEG2 W2 H2 F25:1 C444\nFRAME\n" + std::string(12, '\x80'));
    const BE::VideoSourceRef file = BE::CreateAsyncVideoSource(OpenOrFail(path), 1ms);
    ASSERT_EQ(Async(file)->StartAsyncRead(Frame(9), {}, {}, {}), QRT::kResult_Success);
    EXPECT_FALSE(Collect(file, *Async(file), Frame(9)));
}

TEST_F(LatencyVideoSourceTest, CancelsBalanceStartsAndAbandonTheRead)
{
    {
        const BE::VideoSourceRef source = BE::CreateAsyncVideoSource(mInner, kForever, 100ms);
        const auto async = Async(source);
        ASSERT_EQ(async->StartAsyncRead(Frame(3), {}, {}, {}), QRT::kResult_Success);
        ASSERT_EQ(async->StartAsyncRead(Frame(3), {}, {}, {}), QRT::kResult_Success);
        // In flight (queued or sleeping): a wait blocks a slice and keeps going,
        // until the caller has waited too long.
        EXPECT_TRUE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.0));
        EXPECT_FALSE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.5));
        async->CancelAsyncRead(Frame(3), {}, {}, {});
        EXPECT_TRUE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.0)) << "two starts, one cancel";
        async->CancelAsyncRead(Frame(3), {}, {}, {});
        EXPECT_FALSE(async->WaitForAsyncRead(Frame(3), {}, {}, {}, 0.0));
        FrameRef frame;
        EXPECT_EQ(ReadFrame(source, Frame(3), frame, kFrameRequestFlag_NoBlock),
                  BE::kResult_FrameNotReady);
        // Cancelling something never started is harmless.
        async->CancelAsyncRead(Frame(4), {}, {}, {});
    }
    // The destructor joined the worker although its read would have slept an hour.
    FrameRef frame;
    EXPECT_EQ(ReadFrame(mInner, Frame(3), frame, kFrameRequestFlag_NoBlock),
              BE::kResult_FrameNotReady)
        << "the abandoned read never reached the inner source";
}

} // namespace
