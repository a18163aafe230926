#pragma once

// ML::IRenderableTimeTransformOwner: a sealed node that maps its own time to
// its inputs' time (a clip). Nodes are immutable, so it may be asked from any
// thread.

#include "MF/TimeTransform.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"

namespace ML
{

class IRenderableTimeTransformOwner : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{434da63a-8a50-47bc-b4ac-62d5e7e56abb}");

    // The mapping from this node's time to its inputs' time; empty when the
    // node does not re-time.
    virtual QRT::InterfaceRef<MF::ITimeTransform> GetTimeTransform() const = 0;

protected:
    ~IRenderableTimeTransformOwner() = default;
};

} // namespace ML
