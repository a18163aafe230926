// The render queue's singleton: its storage and reference count, its
// construction and destruction, the stopwatch clock, shutdown and the
// statistics snapshot.

#include "ML/RenderFrameQueue.h"

#include "ML/RenderExecutors.h"
#include "QRT/CriticalSection.h"
#include "VF/SharedVideoFrameCache.h"
#include "mvxcore/threads/ExecutorFactories.h"
#include "pipeline/RenderFrameQueueImpl.h"
#include "pipeline/RenderNotifications.h"

#include <atomic>
#include <cstring>
#include <exception>
#include <memory>
#include <mutex>
#include <new>
#include <utility>
#include <vector>

namespace ML
{

namespace
{

using RenderQueueInternals::RenderFrameQueueImpl;
using RenderQueueInternals::sShuttingDown;

// The stopwatch clock; replaced by tests.
std::mutex sClockMutex;
std::shared_ptr<const RenderQueueClock> sClock;

constexpr std::int32_t kConstructionBias = 10'000'000;

std::atomic<std::int32_t> sRefCount{-kConstructionBias};
std::atomic<std::uint64_t> sConstructionCount{0};

alignas(RenderFrameQueueImpl) unsigned char sStorage[sizeof(RenderFrameQueueImpl)];
std::atomic<QRT::CriticalSection*> sStaticLock{nullptr};

RenderFrameQueueImpl* GetQueueStorage() noexcept
{
    return std::launder(reinterpret_cast<RenderFrameQueueImpl*>(sStorage));
}

// The lock that serialises construction and destruction of the singleton,
// created on first use and published by compare-and-swap.
QRT::CriticalSection& GetStaticLock()
{
    QRT::CriticalSection* lock = sStaticLock.load();
    if (lock)
        return *lock;
    auto* created = new QRT::CriticalSection();
    if (sStaticLock.compare_exchange_strong(lock, created))
        return *created;
    delete created;
    return *lock;
}

} // namespace

namespace RenderQueueInternals
{

std::atomic<bool> sShuttingDown{false};

std::chrono::steady_clock::time_point Now()
{
    std::shared_ptr<const RenderQueueClock> clock;
    {
        std::lock_guard<std::mutex> lock(sClockMutex);
        clock = sClock;
    }
    return clock ? (*clock)() : std::chrono::steady_clock::now();
}

QRT::InterfaceRef<RenderFrameQueueImpl> TryGetExistingQueue() noexcept
{
    std::int32_t count = sRefCount.load();
    while (count > 0)
    {
        if (sRefCount.compare_exchange_weak(count, count + 1))
            return QRT::InterfaceRef<RenderFrameQueueImpl>::Adopt(GetQueueStorage());
    }
    return {};
}

RenderFrameQueueImpl::RenderFrameQueueImpl()
    : mHousekeeping(
          mvxcore::threads::CreateSubExecutor(mvxcore::threads::CreateCPUBoundExecutor(), 1))
{
    sShuttingDown.store(false);
    VF::SharedVideoFrameCache::SetNotificationFunction(&OnFrameCached);
}

RenderFrameQueueImpl::~RenderFrameQueueImpl()
{
    VF::SharedVideoFrameCache::SetNotificationFunction({});
    // Whatever is still queued can no longer be delivered; a thread that
    // waits for it is woken.
    std::vector<QueueEntry> left = TakeEverythingQueued("RenderFrameQueue::~RenderFrameQueue",
                                                        "RenderFrameQueue::~RenderFrameQueue2");
    for (const QueueEntry& entry : left)
        WakeWaiter(entry.mRequest);
    for (auto& [key, entry] : mRedundant)
        if (entry.mWaiting)
            WakeWaiter(entry.mWaiting->mRequest);
}

std::uint32_t RenderFrameQueueImpl::AddRef() noexcept
{
    return static_cast<std::uint32_t>(sRefCount.fetch_add(1) + 1);
}

std::uint32_t RenderFrameQueueImpl::Release() noexcept
{
    const std::int32_t count = sRefCount.fetch_sub(1) - 1;
    if (count == 0)
        Destroy();
    return static_cast<std::uint32_t>(count);
}

void RenderFrameQueueImpl::Destroy() noexcept
{
    QRT::CriticalSectionLock lock(GetStaticLock(), "RenderFrameQueue::Destroy");
    std::int32_t expected = 0;
    if (!sRefCount.compare_exchange_strong(expected, -kConstructionBias))
        return;
    this->~RenderFrameQueueImpl();
    std::memset(static_cast<void*>(this), 0, sizeof(RenderFrameQueueImpl));
}

void RenderFrameQueueImpl::Shutdown()
{
    try
    {
        sShuttingDown.store(true);
        std::vector<QueueEntry> dropped =
            TakeEverythingQueued("RenderFrameQueue::Shutdown", "RenderFrameQueue::Shutdown2");
        // Dropped without notification; only a waiting thread is woken.
        for (const QueueEntry& entry : dropped)
            WakeWaiter(entry.mRequest);
        dropped.clear();

        for (const ExecutorPtr& executor : {LoadExecutor(sNormalPriorityRenderQueue),
                                            LoadExecutor(sLowPriorityRenderQueue), mHousekeeping})
        {
            if (!executor)
                continue;
            executor->BeginShutdown();
            executor->DiscardPendingTasks();
            executor->WaitForRunningTasks();
        }
    }
    catch (const std::exception&)
    {
    }
}

RenderFrameQueueStatistics RenderFrameQueueImpl::GetStatistics()
{
    RenderFrameQueueStatistics statistics;
    {
        QRT::CriticalSectionLock lock(mMainLock, "RenderFrameQueue::GetStatistics");
        {
            std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
            statistics.mIncoming = mIncoming.size();
        }
        statistics.mPending = mPendingRegistry.size();
        statistics.mPrefetchWaiting = mPrefetchWait.size() + mPrefetchRegistry.size();
        statistics.mNormalReady = mNormalReady.size();
        statistics.mLowReady = mLowReady.size();
        QRT::CriticalSectionLock redundantLock(mRedundantLock,
                                               "RenderFrameQueue::GetStatistics Redundant");
        statistics.mRedundant = mRedundant.size();
    }
    {
        QRT::CriticalSectionLock lock(mAcceleratedLock, "RenderFrameQueue::GetStatistics2");
        statistics.mAccelerated = mAccelerated.size();
    }
    statistics.mMemoryAvailable = mMemoryAvailable.load();
    statistics.mMemoryCapacity = mMemoryCapacity;
    return statistics;
}

std::vector<QueueEntry> RenderFrameQueueImpl::TakeEverythingQueuedLocked()
{
    std::vector<QueueEntry> taken;
    {
        std::lock_guard<std::mutex> incomingLock(mIncomingMutex);
        taken.swap(mIncoming);
    }
    for (QueueEntry& entry : mPrefetchWait)
        taken.push_back(std::move(entry));
    mPrefetchWait.clear();
    for (OrderedEntries* set : {&mNormalReady, &mLowReady})
    {
        for (auto& [key, entry] : *set)
            taken.push_back(std::move(entry));
        set->clear();
    }
    return taken;
}

std::vector<QueueEntry> RenderFrameQueueImpl::TakeEverythingQueued(const char* inMainLabel,
                                                                   const char* inAcceleratedLabel)
{
    std::vector<QueueEntry> taken;
    {
        QRT::CriticalSectionLock lock(mMainLock, inMainLabel);
        taken = TakeEverythingQueuedLocked();
    }
    QRT::CriticalSectionLock lock(mAcceleratedLock, inAcceleratedLabel);
    for (auto& [key, entry] : mAccelerated)
        taken.push_back(std::move(entry));
    mAccelerated.clear();
    return taken;
}

} // namespace RenderQueueInternals

QRT::InterfaceRef<RenderFrameQueue> RenderFrameQueue::Create()
{
    // A temporary reference first: a negative count means there is no queue.
    const std::int32_t count = sRefCount.fetch_add(1) + 1;
    if (count < 0)
    {
        QRT::CriticalSectionLock lock(GetStaticLock(), "RenderFrameQueue::Create");
        if (sRefCount.load() < 0)
        {
            try
            {
                new (sStorage) RenderFrameQueueImpl();
            }
            catch (...)
            {
                sRefCount.fetch_sub(1);
                throw;
            }
            sConstructionCount.fetch_add(1);
            sRefCount.fetch_add(kConstructionBias);
        }
    }
    RenderFrameQueueImpl* queue = GetQueueStorage();
    QRT::InterfaceRef<RenderFrameQueue> result(static_cast<RenderFrameQueue*>(queue));
    queue->Release();
    return result;
}

std::uint64_t RenderFrameQueue::GetConstructionCount()
{
    return sConstructionCount.load();
}

void RenderFrameQueue::SetClock(RenderQueueClock inClock)
{
    std::shared_ptr<const RenderQueueClock> clock;
    if (inClock)
        clock = std::make_shared<const RenderQueueClock>(std::move(inClock));
    std::lock_guard<std::mutex> lock(sClockMutex);
    sClock = std::move(clock);
}

bool IsRenderModuleShuttingDown() noexcept
{
    return sShuttingDown.load();
}

} // namespace ML
