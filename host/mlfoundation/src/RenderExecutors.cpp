#include "ML/RenderExecutors.h"

#include "mvxcore/threads/ExecutorFactories.h"

#include <algorithm>
#include <array>
#include <mutex>

#include <boost/smart_ptr/shared_ptr.hpp>

namespace ML
{

ExecutorRef sNormalPriorityRenderQueue;
ExecutorRef sLowPriorityRenderQueue;
ExecutorRef sVideoSourcePrefetcherQueue;
ExecutorRef sImageSourcePrefetcherQueue;

namespace Foundation
{
namespace
{

// Serialises StartUp and ShutDown (the writers of the four pointers).
std::mutex sLifecycleMutex;

bool IsUsable(const ExecutorRef& inExecutor)
{
    return inExecutor && !inExecutor->IsShutDown();
}

// Creates *inSlot anew unless it holds a running executor. The replaced one
// (shut down) goes to outReleased, to be dropped outside the lock.
template <typename Factory>
void EnsureExecutorLocked(ExecutorRef* inSlot, Factory inFactory, ExecutorRef& outReleased)
{
    ExecutorRef current = boost::atomic_load(inSlot);
    if (IsUsable(current))
        return;
    outReleased = boost::atomic_exchange(inSlot, inFactory());
}

} // namespace

unsigned GetLowPriorityRenderThreadCount()
{
    return std::max(1u, mvxcore::threads::GetCPUCoreCount() / 2);
}

void StartUp()
{
    using namespace mvxcore::threads;
    std::array<ExecutorRef, 4> released;
    {
        std::lock_guard lock(sLifecycleMutex);
        EnsureExecutorLocked(&sNormalPriorityRenderQueue, &CreateCPUBoundExecutor, released[0]);
        EnsureExecutorLocked(
            &sLowPriorityRenderQueue,
            [] { return CreateThreadPoolExecutor(GetLowPriorityRenderThreadCount()); },
            released[1]);
        EnsureExecutorLocked(
            &sVideoSourcePrefetcherQueue,
            [] { return CreateThreadPoolExecutor(kSourcePrefetcherThreadCount); }, released[2]);
        EnsureExecutorLocked(
            &sImageSourcePrefetcherQueue,
            [] { return CreateThreadPoolExecutor(kSourcePrefetcherThreadCount); }, released[3]);
    }
    // Dropping a replaced executor may join its threads: not under the lock.
}

void ShutDown()
{
    std::array<ExecutorRef, 4> executors;
    {
        std::lock_guard lock(sLifecycleMutex);
        executors = {boost::atomic_exchange(&sNormalPriorityRenderQueue, ExecutorRef()),
                     boost::atomic_exchange(&sLowPriorityRenderQueue, ExecutorRef()),
                     boost::atomic_exchange(&sVideoSourcePrefetcherQueue, ExecutorRef()),
                     boost::atomic_exchange(&sImageSourcePrefetcherQueue, ExecutorRef())};
    }
    // Each executor gets the three calls in order; every executor stops
    // accepting before any is drained, so none can hand work to another.
    for (const ExecutorRef& executor : executors)
    {
        if (executor)
            executor->BeginShutdown();
    }
    for (const ExecutorRef& executor : executors)
    {
        if (executor)
            executor->DiscardPendingTasks();
    }
    for (const ExecutorRef& executor : executors)
    {
        if (executor)
            executor->WaitForRunningTasks();
    }
    // The last references go here, outside the lock; the pools end their threads.
}

} // namespace Foundation
} // namespace ML
