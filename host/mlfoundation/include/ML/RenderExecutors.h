#pragma once

// The four shared executors of the host's renderer, and their start-up and
// shutdown.
//
// - sNormalPriorityRenderQueue: render workers, one thread per core.
// - sLowPriorityRenderQueue: low-priority render workers, a pool of its own
//   with half as many threads (at least one), so that low-priority work never
//   waits behind normal work in one queue and never takes every core.
// - sVideoSourcePrefetcherQueue, sImageSourcePrefetcherQueue: source reads
//   ahead of rendering, two threads each; still images have their own pool so
//   that slow decoding does not hold up video reads.
//
// The executors exist between Foundation::StartUp and Foundation::ShutDown.
// Only those two functions write the four pointers, with boost::atomic_store;
// a thread that may run while the host starts up or shuts down reads them
// with boost::atomic_load(&ML::sNormalPriorityRenderQueue), any other thread
// may read them directly. StartUp and ShutDown may be called from any thread
// (also from a task of one of the executors) and are serialised.

#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <boost/shared_ptr.hpp>

namespace ML
{

using ExecutorRef = boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor>;

extern ExecutorRef sNormalPriorityRenderQueue;
extern ExecutorRef sLowPriorityRenderQueue;
extern ExecutorRef sVideoSourcePrefetcherQueue;
extern ExecutorRef sImageSourcePrefetcherQueue;

inline constexpr unsigned kSourcePrefetcherThreadCount = 2;

namespace Foundation
{

// Creates each of the four executors that is missing or has been shut down,
// and keeps the others. Called when the renderer is brought up, also after a
// ShutDown.
void StartUp();

// Shuts the four executors down (BeginShutdown on all, then
// DiscardPendingTasks on all, then WaitForRunningTasks on all, so none of them
// accepts work from another while they drain) and resets the pointers. Their
// pending tasks are dropped without running. Idempotent.
void ShutDown();

// The number of threads of sLowPriorityRenderQueue.
unsigned GetLowPriorityRenderThreadCount();

} // namespace Foundation
} // namespace ML
