#pragma once

// Which executors the calling thread is working for. A pool worker marks its
// thread with the pool for its whole life; a sub-executor marks the thread
// while it runs one of its tasks there. The marks are a per-thread stack, so a
// sub-executor of a sub-executor is seen by both. Private to the executors.

#include "mvxcore/threads/AsyncThreadedExecutor.h"

namespace mvxcore::threads::detail
{

class ScopedRunningMark
{
public:
    explicit ScopedRunningMark(const void* inOwner);
    ~ScopedRunningMark();
    ScopedRunningMark(const ScopedRunningMark&) = delete;
    ScopedRunningMark& operator=(const ScopedRunningMark&) = delete;

private:
    friend unsigned CountRunningMarks(const void* inOwner);

    const void* mOwner;
    ScopedRunningMark* mPrevious;
};

// How many marks of inOwner the calling thread carries (0 when it works for
// someone else).
unsigned CountRunningMarks(const void* inOwner);

// Runs inTask, catching and reporting whatever it throws, so that a failing
// task neither ends the process nor the worker that ran it.
void RunTaskReportingFailures(Task& inTask) noexcept;

} // namespace mvxcore::threads::detail
