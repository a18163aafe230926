#pragma once

// The fixture of the prefetcher tests: private prefetch executors (one thread
// each, so that tasks run one by one in post order) for the length of a test,
// the host's restored afterwards; the debug assertions raised meanwhile; and a
// scripted source that prefetches, making a new frame per read.

#include "../sources/ScriptedSources.h"
#include "ML/RenderExecutors.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "prefetch/MediaNodePrefetcher.h"
#include "prefetch/VideoSourcePrefetcher.h"

#include <string>

namespace ML::Test
{

using VideoSourceRef = QRT::InterfaceRef<BE::Deprecated::IVideoSource>;

class PrefetchFixture : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mSavedVideo = boost::atomic_load(&sVideoSourcePrefetcherQueue);
        mSavedImage = boost::atomic_load(&sImageSourcePrefetcherQueue);
        boost::atomic_store(&sVideoSourcePrefetcherQueue, mVideo);
        boost::atomic_store(&sImageSourcePrefetcherQueue, mImage);
        mSavedAssertHook = mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                std::lock_guard lock(mAssertMutex);
                mAsserts.push_back(std::string(inFailure.condition) + "|" +
                                   std::string(inFailure.message));
            });
        mSource->mNewFrames = true;
        mSource->mPrefetchWanted = true;
    }

    void TearDown() override
    {
        // What a test left queued or registered goes, as at module shutdown.
        FlushMediaNodePrefetchRegistry();
        FlushVideoSourcePrefetcher();
        for (const ExecutorRef& executor : {mVideo, mImage})
        {
            executor->BeginShutdown();
            executor->DiscardPendingTasks();
            executor->WaitForRunningTasks();
        }
        boost::atomic_store(&sVideoSourcePrefetcherQueue, mSavedVideo);
        boost::atomic_store(&sImageSourcePrefetcherQueue, mSavedImage);
        mvxcore::debug::SetAssertHook(mSavedAssertHook);
        SilenceMediaNodePrefetchTimeoutAssertion(false);
    }

    std::vector<std::string> Asserts()
    {
        std::lock_guard lock(mAssertMutex);
        return mAsserts;
    }

    // Blocks until every task posted to inExecutor before this call has run.
    static void Drain(const ExecutorRef& inExecutor)
    {
        auto done = std::make_shared<Gate>();
        ASSERT_TRUE(inExecutor->Post([done] { done->Open(); }));
        done->Wait();
    }

    // Holds the video executor's only thread until the gate opens, so that
    // everything enqueued meanwhile is queued before any task runs.
    std::shared_ptr<Gate> BlockVideoExecutor()
    {
        auto gate = std::make_shared<Gate>();
        EXPECT_TRUE(mVideo->Post([gate] { gate->Wait(); }));
        return gate;
    }

    // Replaces the video executor by one of two threads, for the concurrent cases.
    static ExecutorRef UseTwoVideoThreads()
    {
        ExecutorRef video = mvxcore::threads::CreateThreadPoolExecutor(2);
        boost::atomic_store(&sVideoSourcePrefetcherQueue, video);
        return video;
    }

    const ExecutorRef mVideo = mvxcore::threads::CreateThreadPoolExecutor(1);
    const ExecutorRef mImage = mvxcore::threads::CreateThreadPoolExecutor(1);
    const ScriptedSourceRef mSource = MakeScriptedSource();

private:
    ExecutorRef mSavedVideo;
    ExecutorRef mSavedImage;
    mvxcore::debug::AssertHook mSavedAssertHook;
    std::mutex mAssertMutex; // guards mAsserts
    std::vector<std::string> mAsserts;
};

} // namespace ML::Test
