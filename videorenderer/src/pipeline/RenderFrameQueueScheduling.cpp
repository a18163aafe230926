// The render queue's ready sets and memory budget: render tasks posted to
// the normal and low executors, the choice of the next request within the
// budget (identical requests wait for the one being rendered), and the
// render of one request, or its cached frame, with its identical requests.

#include "MF/RenderableCutlist.h"
#include "ML/RenderExecutors.h"
#include "ML/RenderStatus.h"
#include "QRT/Exception.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/debug/Contract.h"
#include "pipeline/RenderFrameQueueImpl.h"
#include "pipeline/RenderNotifications.h"

#include <algorithm>
#include <thread>
#include <utility>
#include <vector>

namespace ML
{

namespace
{

constexpr std::uint32_t kLargeFramePixels = 414720;
constexpr std::uint32_t kPixelsPerUnit = 345600;

// Spins 1, 2, 4, 8, 16 rounds, then sleeps a millisecond and starts again.
class Backoff
{
public:
    void Pause()
    {
        if (mRounds > 16)
        {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            mRounds = 1;
            return;
        }
        for (unsigned i = 0; i < mRounds; ++i)
            std::this_thread::yield();
        mRounds *= 2;
    }

private:
    unsigned mRounds = 1;
};

} // namespace

std::uint16_t RenderFrameQueue::RequestCost(const RenderFrameRequest& inRequest)
{
    // Pixel counts in 32-bit signed arithmetic, as the budget has always
    // been counted.
    const std::int32_t pixels =
        static_cast<std::int32_t>(static_cast<std::uint32_t>(inRequest.mOutputRect.Height()) *
                                  static_cast<std::uint32_t>(inRequest.mOutputRect.Width()));
    std::uint32_t cost = 1;
    if (pixels > static_cast<std::int32_t>(kLargeFramePixels))
        cost = (static_cast<std::uint32_t>(pixels) + kPixelsPerUnit - 1) / kPixelsPerUnit;
    const std::uint32_t bytesPerPixel = inRequest.GetRenderPixelFormat().GetBytesPerPixel();
    if (bytesPerPixel > 4)
        cost *= (bytesPerPixel + 3) / 4;
    return static_cast<std::uint16_t>(std::min<std::uint32_t>(kMemoryCapacity / 2, cost));
}

namespace RenderQueueInternals
{

void RenderFrameQueueImpl::ScheduleRenderTasksLocked()
{
    const auto available = static_cast<std::uint16_t>(mMemoryAvailable.load());
    if (!mNormalReady.empty())
    {
        const std::uint16_t cost = RequestCost(mNormalReady.begin()->second.mRequest);
        if (cost <= available)
            PostRenderTask(false);
    }
    if (!mLowReady.empty() && mNormalReady.empty())
    {
        const std::uint16_t cost = RequestCost(mLowReady.begin()->second.mRequest);
        if (cost > available)
            return;
        PostRenderTask(true);
    }
}

void RenderFrameQueueImpl::PostRenderTask(bool inLowSet)
{
    const ExecutorPtr executor =
        LoadExecutor(inLowSet ? sLowPriorityRenderQueue : sNormalPriorityRenderQueue);
    if (!executor)
        return;
    std::atomic<std::uint32_t>& flag = inLowSet ? mLowTaskScheduled : mNormalTaskScheduled;
    std::uint32_t expected = 0;
    if (!flag.compare_exchange_strong(expected, 1))
        return;
    QRT::InterfaceRef<RenderFrameQueueImpl> self(this);
    if (!executor->Post([self, inLowSet] { self->RenderNextRequest(inLowSet); }))
        flag.store(0);
}

bool RenderFrameQueueImpl::ReserveMemory(std::uint16_t inCost)
{
    Backoff backoff;
    for (;;)
    {
        std::uint32_t available = mMemoryAvailable.load();
        if (available < inCost)
            return false;
        if (mMemoryAvailable.compare_exchange_weak(available, available - inCost))
            return true;
        backoff.Pause();
    }
}

void RenderFrameQueueImpl::ReturnMemory(std::uint16_t inCost)
{
    Backoff backoff;
    for (;;)
    {
        std::uint32_t available = mMemoryAvailable.load();
        if (mMemoryAvailable.compare_exchange_weak(available, (available + inCost) & 0xFFFFu))
            return;
        backoff.Pause();
    }
}

bool RenderFrameQueueImpl::GetNextRequestAndAccountForMemory(QueueEntry* outRenderFrameRequest,
                                                             bool inLowSet, std::uint16_t& outCost)
{
    MVX_INPUT_CONTRACT(outRenderFrameRequest);
    QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::GetNextRequestAndAccountForMemory");
    outCost = 0;
    bool taken = false;
    // Normal requests always go first.
    if (!(inLowSet && !mNormalReady.empty()))
    {
        OrderedEntries& set = inLowSet ? mLowReady : mNormalReady;
        while (!taken && !set.empty())
        {
            const auto first = set.begin();
            const std::uint16_t cost = RequestCost(first->second.mRequest);
            if (!ReserveMemory(cost))
                break;
            const QRT::Guid key = first->second.mRequest.mKey;
            // A nil key names no frame: such requests are never merged.
            bool identicalRendering = false;
            if (!key.IsNil())
            {
                QRT::CriticalSectionLock redundantLock(
                    mRedundantLock,
                    "RenderFrameQueue::GetNextRequestAndAccountForMemory RedundantRequestLock");
                identicalRendering = mRedundant.count(key) != 0;
                if (identicalRendering)
                    mRedundant.emplace(
                        key, RedundantEntry{first->second.mSerial, std::move(first->second)});
                else
                    mRedundant.emplace(key, RedundantEntry{first->second.mSerial, {}});
            }
            if (identicalRendering)
            {
                set.erase(first);
                ReturnMemory(cost);
                continue;
            }
            *outRenderFrameRequest = std::move(first->second);
            set.erase(first);
            outCost = cost;
            taken = true;
        }
    }
    ScheduleRenderTasksLocked();
    return taken;
}

void RenderFrameQueueImpl::RenderNextRequest(bool inLowSet)
{
    (inLowSet ? mLowTaskScheduled : mNormalTaskScheduled).store(0);
    DeliveryBatch batch;
    batch.Run([this] { ProcessPendingRequests(false); });
    QueueEntry entry;
    std::uint16_t cost = 0;
    bool taken = false;
    batch.Run([&] { taken = GetNextRequestAndAccountForMemory(&entry, inLowSet, cost); });
    if (taken)
    {
        batch.Run([&] { Render(entry, true); });
        ReturnMemory(cost);
    }
    batch.Run([this] { ProcessPendingRequests(false); });
    batch.RethrowFirst();
}

QRT::Result RenderFrameQueueImpl::Render(QueueEntry& ioEntry, bool inRegistered)
{
    RenderFrameRequest& request = ioEntry.mRequest;
    QRT::Result status = kResult_RenderFailed;
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    std::int32_t renderMilliseconds = 0;
    if (!sShuttingDown.load())
    {
        try
        {
            if (!request.mKey.IsNil())
                frame = VF::SharedVideoFrameCache::RetrieveFromCache(request.mKey);
            if (frame)
            {
                status = kResult_Rendered;
            }
            else
            {
                const auto start = Now();
                const mvxmediatypes::PixelFormat format = request.ChooseRenderPixelFormat();
                request.Render(frame, format);
                if (!frame)
                    throw QRT::NullInterfaceException();
                const double elapsed =
                    std::max(0.0, std::chrono::duration<double>(Now() - start).count());
                renderMilliseconds = static_cast<std::int32_t>(elapsed * 1000.0);
                frame->SetRenderTime(static_cast<std::uint32_t>(renderMilliseconds));
                if (ShouldCache(request))
                    VF::SharedVideoFrameCache::InsertIntoCache(frame, request.mKey,
                                                               request.GetCachePriority());
                status = kResult_Rendered;
            }
        }
        catch (...)
        {
            status = StatusOfCurrentException();
            frame.Reset();
        }
    }

    std::vector<QueueEntry> duplicates;
    if (inRegistered && !request.mKey.IsNil())
    {
        QRT::CriticalSectionLock lock(mRedundantLock,
                                      "RenderFrameQueue::Render RedundantRequestLock");
        const auto range = mRedundant.equal_range(request.mKey);
        for (auto it = range.first; it != range.second; ++it)
            if (it->second.mSerial != ioEntry.mSerial && it->second.mWaiting)
                duplicates.push_back(std::move(*it->second.mWaiting));
        mRedundant.erase(range.first, range.second);
    }
    SortByIdentifier(duplicates);

    DeliveryBatch batch;
    batch.Run([&] { Finish(request, frame, status, renderMilliseconds); });
    for (const QueueEntry& duplicate : duplicates)
        batch.Run([&] { Finish(duplicate.mRequest, frame, status, renderMilliseconds); });
    batch.RethrowFirst();
    return status;
}

bool RenderFrameQueueImpl::ShouldCache(const RenderFrameRequest& inRequest)
{
    if (inRequest.mDoNotCache)
        return false;
    if ((inRequest.mRenderFlags & kRenderFlag_AlwaysCache) != 0)
        return true;
    if ((inRequest.mRenderFlags & kRenderFlag_CacheWhenRangeNotEmpty) == 0 || !inRequest.mCutlist)
        return false;
    const auto stillInfo = QRT::QueryRef<MF::IRenderableExtendedStillInfo>(inRequest.mCutlist);
    if (!stillInfo)
        return false;
    MF::TickTimeRange range;
    return QRT::Succeeded(stillInfo->GetStillRange(inRequest.mTime, range)) &&
           range.first != range.second;
}

} // namespace RenderQueueInternals
} // namespace ML
