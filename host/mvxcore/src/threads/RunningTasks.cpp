#include "threads/RunningTasks.h"

#include "mvxcore/debug/Contract.h"

#include <exception>
#include <string>

namespace mvxcore::threads::detail
{
namespace
{

// The innermost mark of the calling thread; the marks link to the outer ones.
thread_local ScopedRunningMark* tTopMark = nullptr;

void ReportTaskFailure(std::string_view inMessage) noexcept
{
    try
    {
        mvxcore::debug::BreakAfterAssertDialog("executor task did not throw", inMessage, __FILE__,
                                               __LINE__, __func__);
    }
    catch (...)
    {
        // A report hook that throws must not take the worker down either.
    }
}

} // namespace

ScopedRunningMark::ScopedRunningMark(const void* inOwner)
    : mOwner(inOwner)
    , mPrevious(tTopMark)
{
    tTopMark = this;
}

ScopedRunningMark::~ScopedRunningMark()
{
    tTopMark = mPrevious;
}

unsigned CountRunningMarks(const void* inOwner)
{
    unsigned count = 0;
    for (const ScopedRunningMark* mark = tTopMark; mark; mark = mark->mPrevious)
    {
        if (mark->mOwner == inOwner)
            ++count;
    }
    return count;
}

void RunTaskReportingFailures(Task& inTask) noexcept
{
    try
    {
        inTask();
    }
    catch (const std::exception& inError)
    {
        std::string message;
        try
        {
            message = std::string("An executor task threw: ") + inError.what();
        }
        catch (...)
        {
            message.clear();
        }
        ReportTaskFailure(message.empty() ? std::string_view("An executor task threw.")
                                          : std::string_view(message));
    }
    catch (...)
    {
        ReportTaskFailure("An executor task threw a non-standard exception.");
    }
}

} // namespace mvxcore::threads::detail
