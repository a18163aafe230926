#include "prefetch/VideoSourcePrefetcher.h"

#include "ML/RenderExecutors.h"
#include "ML/RenderStatus.h"
#include "QRT/CriticalSection.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cstdint>
#include <map>
#include <utility>
#include <vector>

#include <boost/shared_ptr.hpp>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;
using SourceRef = QRT::InterfaceRef<BE::Deprecated::IVideoSource>;

// One queued read.
struct PrefetchJob
{
    TickTime mTime;
    SourceRef mSource;
    BE::VideoFrameRequest mRequest;
    MF::BinaryData mBinaryData;
    BE::ColorProfile mColorProfile;
    mvxcore::utility::Guid mFrameKey;
    std::int32_t mCachePriority = VF::kCachePriority_High;
    VideoSourcePrefetchCallback mCallback;
    // Names this job among its source's jobs, so that an enqueue whose task
    // could not be posted takes back exactly the job it added.
    uint64_t mSerial = 0;
};

// The heap order: the job with the earliest frame time on top.
struct LaterTime
{
    bool operator()(const PrefetchJob& inLeft, const PrefetchJob& inRight) const
    {
        return inLeft.mTime > inRight.mTime;
    }
};

using JobHeap = std::vector<PrefetchJob>;
// Keyed by the source's root interface: object identity, whichever interface
// pointer the caller holds.
using JobTable = std::map<const QRT::QRTUnknown*, JobHeap>;

// The pending-job table and its lock. Created on first use and never destroyed,
// so that executor tasks still finishing while the library unloads find it.
struct PrefetchTable
{
    QRT::CriticalSection mLock;
    JobTable mJobs;
    uint64_t mNextSerial = 1;
    size_t mQueuedCount = 0;
};

PrefetchTable& GetTable()
{
    static PrefetchTable* const sTable = new PrefetchTable;
    return *sTable;
}

ExecutorRef LoadExecutor(ExecutorRef& inExecutor)
{
    return boost::atomic_load(&inExecutor);
}

// Takes the job the predicate picks out of ioHeap, keeping the heap order.
template <class Predicate>
bool TakeJob(JobHeap& ioHeap, Predicate inPredicate, PrefetchJob& outJob)
{
    const auto found = std::find_if(ioHeap.begin(), ioHeap.end(), inPredicate);
    if (found == ioHeap.end())
        return false;
    outJob = std::move(*found);
    ioHeap.erase(found);
    if (ioHeap.size() >= 2)
        std::make_heap(ioHeap.begin(), ioHeap.end(), LaterTime());
    return true;
}

// The body of every posted task: runs the earliest queued read of inSource.
void RunNextJob(const SourceRef& inSource)
{
    PrefetchTable& table = GetTable();
    PrefetchJob job;
    {
        QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::RunNextJob");
        const auto entry = table.mJobs.find(inSource.GetRootForComparison());
        if (entry == table.mJobs.end() || entry->second.empty())
            return;
        JobHeap& heap = entry->second;
        std::pop_heap(heap.begin(), heap.end(), LaterTime());
        job = std::move(heap.back());
        heap.pop_back();
        if (heap.empty())
            table.mJobs.erase(entry);
        --table.mQueuedCount;
    }

    // The read, the cache insertion and the callback run without the lock:
    // reads are slow, and the cache and the callback may call back into the
    // prefetchers.
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    const QRT::Result status =
        job.mSource->GetVideoFrame(job.mTime, job.mRequest, job.mBinaryData, job.mColorProfile,
                                   BE::Deprecated::kFrameRequestFlag_Read, frame);
    if (QRT::Succeeded(status) && !job.mFrameKey.IsNil() && frame)
        VF::SharedVideoFrameCache::InsertIntoCache(frame, job.mFrameKey, job.mCachePriority);
    if (job.mCallback)
        job.mCallback(status);
}

} // namespace

void EnqueueVideoSourcePrefetch(mvxmediatypes::TickTime inTime, const SourceRef& inSource,
                                const BE::VideoFrameRequest& inRequest,
                                const MF::BinaryData& inBinaryData,
                                const BE::ColorProfile& inColorProfile,
                                const mvxcore::utility::Guid& inFrameKey,
                                std::int32_t inCachePriority,
                                VideoSourcePrefetchCallback inCallback)
{
    const ExecutorRef videoQueue = LoadExecutor(sVideoSourcePrefetcherQueue);
    const ExecutorRef imageQueue = LoadExecutor(sImageSourcePrefetcherQueue);
    if (!videoQueue || !imageQueue)
        mvxcore::debug::ContractViolated(
            mvxcore::debug::ContractKind::kInput,
            "sVideoSourcePrefetcherQueue != NULL && sImageSourcePrefetcherQueue != NULL", __FILE__,
            __LINE__);
    MVX_INPUT_CONTRACT(inSource != nullptr);

    PrefetchTable& table = GetTable();
    const QRT::QRTUnknown* const identity = inSource.GetRootForComparison();
    uint64_t serial = 0;
    {
        PrefetchJob job{inTime,
                        inSource,
                        inRequest,
                        inBinaryData,
                        inColorProfile,
                        inFrameKey,
                        inCachePriority,
                        std::move(inCallback),
                        0};
        QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::Enqueue");
        serial = table.mNextSerial++;
        job.mSerial = serial;
        JobHeap& heap = table.mJobs[identity];
        heap.push_back(std::move(job));
        std::push_heap(heap.begin(), heap.end(), LaterTime());
        ++table.mQueuedCount;
    }

    const ExecutorRef& executor = inSource->IsImage() ? imageQueue : videoQueue;
    SourceRef source = inSource;
    if (executor->Post([source] { RunNextJob(source); }))
        return;

    // The executor has been shut down: no task will ever take the job, so take
    // it back and report it cancelled rather than leave its caller waiting.
    PrefetchJob refused;
    bool found = false;
    {
        QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::Enqueue");
        const auto entry = table.mJobs.find(identity);
        if (entry != table.mJobs.end())
        {
            found = TakeJob(
                entry->second,
                [serial](const PrefetchJob& inJob) { return inJob.mSerial == serial; }, refused);
            if (entry->second.empty())
                table.mJobs.erase(entry);
            if (found)
                --table.mQueuedCount;
        }
    }
    if (found && refused.mCallback)
        refused.mCallback(kResult_Cancelled);
}

void CancelVideoSourcePrefetch(const SourceRef& inSource, const mvxcore::utility::Guid& inFrameKey)
{
    if (!LoadExecutor(sVideoSourcePrefetcherQueue) || !LoadExecutor(sImageSourcePrefetcherQueue))
        return;
    if (inFrameKey.IsNil() || !inSource)
        return;

    PrefetchTable& table = GetTable();
    PrefetchJob cancelled;
    bool found = false;
    {
        QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::Cancel");
        const auto entry = table.mJobs.find(inSource.GetRootForComparison());
        if (entry == table.mJobs.end())
            return;
        found = TakeJob(
            entry->second,
            [&inFrameKey](const PrefetchJob& inJob) { return inJob.mFrameKey == inFrameKey; },
            cancelled);
        if (entry->second.empty())
            table.mJobs.erase(entry);
        if (found)
            --table.mQueuedCount;
    }
    // The task posted for this job stays queued; it runs another job of the
    // source or finds none.
    if (found && cancelled.mCallback)
        cancelled.mCallback(kResult_Cancelled);
}

void FlushVideoSourcePrefetcher()
{
    PrefetchTable& table = GetTable();
    JobTable dropped;
    {
        QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::Flush");
        dropped.swap(table.mJobs);
        table.mQueuedCount = 0;
    }
    // The jobs are destroyed after the lock: their callbacks may hold the last
    // reference to objects whose destruction takes other prefetch locks.
    dropped.clear();

    // A prefetch executor is shut down by two operations, stop then wait, made
    // on the video executor and then on the image executor. On our executors,
    // stop is BeginShutdown followed by DiscardPendingTasks (no queued read
    // starts any more, and the queued tasks are destroyed unrun), and wait is
    // WaitForRunningTasks (it returns once no read of the executor is in
    // flight).
    for (ExecutorRef executor :
         {LoadExecutor(sVideoSourcePrefetcherQueue), LoadExecutor(sImageSourcePrefetcherQueue)})
    {
        if (!executor)
            continue;
        // Stop.
        executor->BeginShutdown();
        executor->DiscardPendingTasks();
        // Wait.
        executor->WaitForRunningTasks();
    }
}

size_t GetQueuedVideoSourcePrefetchCount()
{
    PrefetchTable& table = GetTable();
    QRT::CriticalSectionLock lock(table.mLock, "VideoSourcePrefetcher::GetQueuedCount");
    return table.mQueuedCount;
}

} // namespace ML
