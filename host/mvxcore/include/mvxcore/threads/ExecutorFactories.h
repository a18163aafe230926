#pragma once

// Creation of executors. Every factory answers a new executor that nobody else
// holds; the caller's reference (and any copies) keep it alive, and dropping
// the last one shuts it down (see AsyncThreadedExecutor.h) and ends its threads.

#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <boost/shared_ptr.hpp>

namespace mvxcore::threads
{

// A pool with one worker per processor core (at least one). Workers are
// started when work arrives and there is no idle worker, up to that number.
boost::shared_ptr<AsyncThreadedExecutor> CreateCPUBoundExecutor();

// A pool of exactly up to inThreadCount workers, started as work arrives.
// Input contract: "inThreadCount > 0".
boost::shared_ptr<AsyncThreadedExecutor> CreateThreadPoolExecutor(unsigned inThreadCount);

// An executor that runs its tasks on inParent's threads with at most
// inMaxConcurrency of them running at once; 1 makes a serial executor that
// runs its tasks one by one in post order. The sub-executor holds inParent
// alive. Shutting the sub-executor down leaves the parent running; shutting
// the parent down (or discarding its pending tasks) shuts the sub-executor
// down too, since it can no longer run anything.
// Input contracts: "inParent != nullptr" and "inMaxConcurrency > 0".
boost::shared_ptr<AsyncThreadedExecutor>
CreateSubExecutor(boost::shared_ptr<AsyncThreadedExecutor> inParent, unsigned inMaxConcurrency);

// The number of workers CreateCPUBoundExecutor uses.
unsigned GetCPUCoreCount();

} // namespace mvxcore::threads
