#pragma once

// The foundation's exceptions. Failures inside rendering are thrown as
// QRT::Exception or a subclass and turned into statuses at the pipeline's
// edges. what() answers the exact text given at construction.

#include "QRT/Result.h"

#include <exception>
#include <string>

namespace QRT
{

class Exception : public std::exception
{
public:
    explicit Exception(std::string inText, Result inStatus = kResult_Success)
        : mText(std::move(inText))
        , mStatus(inStatus)
    {
    }

    const char* what() const noexcept override { return mText.c_str(); }
    // The status the failure maps to at the pipeline's edges (0 when none).
    Result GetStatus() const noexcept { return mStatus; }

private:
    std::string mText;
    Result mStatus;
};

// A reference was converted to an interface that its object does not implement.
class InterfaceNotFoundException : public Exception
{
public:
    InterfaceNotFoundException()
        : Exception("The requested interface has not been registered.", kResult_NoInterface)
    {
    }
};

// An empty reference was dereferenced.
class NullInterfaceException : public Exception
{
public:
    NullInterfaceException()
        : Exception("A NULL interface pointer has been dereferenced.")
    {
    }
};

// Two references could not be compared because one has no root interface.
class IllegalComparisonException : public Exception
{
public:
    IllegalComparisonException()
        : Exception("A comparison of two refs has failed because we are unable to convert one of "
                    "them to QRTUnknown.")
    {
    }
};

} // namespace QRT
