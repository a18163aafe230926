#pragma once

// ML::RenderRequestException: thrown by a render (a request, a cutlist
// adaptor, a producer chain) to report a specific status. The render queue
// catches it and delivers the status it carries as the request's error.
// what() answers "RenderRequestException"; GetStatus() the status.

#include "QRT/Exception.h"
#include "QRT/Result.h"

namespace ML
{

class RenderRequestException : public QRT::Exception
{
public:
    explicit RenderRequestException(QRT::Result inStatus)
        : QRT::Exception("RenderRequestException", inStatus)
    {
    }
};

} // namespace ML
