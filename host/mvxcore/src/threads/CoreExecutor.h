#pragma once

// The executor as callers hold it, over a shared core that does the work
// (the thread pool's or the sub-executor's). Every operation forwards to the
// core; the core outlives this object while tasks still refer to it.
// Dropping the last reference shuts the core down with the three calls in
// their fixed order, then lets the core end what it owns (a pool's workers).

#include "mvxcore/threads/AsyncThreadedExecutor.h"

#include <memory>
#include <utility>

namespace mvxcore::threads
{

template <class Core>
class CoreExecutor final : public AsyncThreadedExecutor
{
public:
    explicit CoreExecutor(std::shared_ptr<Core> inCore)
        : mCore(std::move(inCore))
    {
    }

    ~CoreExecutor() override
    {
        mCore->BeginShutdown();
        mCore->DiscardPendingTasks();
        mCore->WaitForRunningTasks();
        if constexpr (requires { mCore->StopWorkers(); })
            mCore->StopWorkers();
    }

    bool Post(Task inTask, int inScheduling) override
    {
        return mCore->Post(std::move(inTask), inScheduling);
    }
    bool IsCurrentThreadOrShutDown() const override
    {
        return mCore->IsShutDown() || mCore->IsCurrentThread();
    }
    bool IsCurrentThread() const override { return mCore->IsCurrentThread(); }
    bool IsShutDown() const override { return mCore->IsShutDown(); }
    void BeginShutdown() override { mCore->BeginShutdown(); }
    void DiscardPendingTasks() override { mCore->DiscardPendingTasks(); }
    void WaitForRunningTasks() override { mCore->WaitForRunningTasks(); }

private:
    const std::shared_ptr<Core> mCore;
};

} // namespace mvxcore::threads
