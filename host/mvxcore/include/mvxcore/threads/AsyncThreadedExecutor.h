#pragma once

// Asynchronous executors: the worker threads of the host. Every asynchronous
// operation of the renderer (render workers, housekeeping, prefetch reads,
// timed polls) runs as a task posted to one of these.
//
// Conventions for the whole family:
// - Executors are shared objects held by boost::shared_ptr and made by the
//   factory functions of "mvxcore/threads/ExecutorFactories.h". Every member
//   function may be called from any thread, also from the executor's own tasks.
// - A task is a boost::function<void()>, usually a boost::bind result. It is
//   destroyed on the thread that ran it, right after it ran, or on the thread
//   that discards it at shutdown; whatever it holds is released then.
// - A task that throws is caught and reported through
//   mvxcore::debug::BreakAfterAssertDialog; it never ends the process and the
//   executor keeps working.
//
// Shutdown is three calls made in this fixed order:
//   1. BeginShutdown()        the executor refuses new tasks and starts no
//                             queued or delayed task any more;
//   2. DiscardPendingTasks()  the queued and delayed tasks are destroyed
//                             without running, releasing what they hold;
//   3. WaitForRunningTasks()  returns once no task of this executor is running
//                             (called from one of the executor's own tasks, it
//                             waits for the other tasks only).
// The first two alone guarantee that no further task starts; the third makes
// sure none is still in flight. Dropping the last reference to an executor
// makes the three calls itself.

#include <boost/function.hpp>

namespace mvxcore::threads
{

using Task = boost::function<void()>;

// Scheduling argument of Post: run as soon as a thread is free.
inline constexpr int kRunAsSoonAsPossible = 0;
// The delay, in milliseconds, that timed pollers pass so that they never spin.
inline constexpr int kPollingDelayMilliseconds = 5;

class AsyncThreadedExecutor
{
public:
    AsyncThreadedExecutor() = default;
    AsyncThreadedExecutor(const AsyncThreadedExecutor&) = delete;
    AsyncThreadedExecutor& operator=(const AsyncThreadedExecutor&) = delete;
    virtual ~AsyncThreadedExecutor() = default;

    // Queues inTask. inScheduling 0 runs it as soon as a thread is free, in
    // post order among the ready tasks; a positive value N runs it no sooner
    // than N milliseconds from now. Answers false, and destroys the task at
    // once, when the executor has been shut down.
    // Input contracts: "!inTask.empty()" and "inScheduling >= 0".
    virtual bool Post(Task inTask, int inScheduling = kRunAsSoonAsPossible) = 0;

    // True on one of the executor's own threads (for a sub-executor: while the
    // calling thread is running one of its tasks), and true once the executor
    // has been shut down. A caller that gets true must not post and wait for
    // the result: it would wait for itself or for nothing.
    virtual bool IsCurrentThreadOrShutDown() const = 0;

    // True while the calling thread is one of the executor's own threads (for
    // a sub-executor: is running one of its tasks).
    virtual bool IsCurrentThread() const = 0;

    // True once BeginShutdown has been called (for a sub-executor, also once
    // its parent has dropped its work).
    virtual bool IsShutDown() const = 0;

    // Shutdown step 1: refuse new tasks, start no pending task.
    virtual void BeginShutdown() = 0;
    // Shutdown step 2: destroy the queued and delayed tasks without running them.
    virtual void DiscardPendingTasks() = 0;
    // Shutdown step 3: wait until no task of this executor is running, except
    // the ones the calling thread is itself running.
    virtual void WaitForRunningTasks() = 0;
};

} // namespace mvxcore::threads
