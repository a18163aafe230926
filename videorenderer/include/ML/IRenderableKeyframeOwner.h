#pragma once

// ML::IRenderableKeyframeOwner: a sealed node (clip or effect) that carries a
// keyframe store, which its producers and the plug-in suites read. Nodes are
// immutable, so it may be asked from any thread.
//
// The identifier is fixed here; the operation that answers the store is
// declared together with the store's type by the clip and effect nodes.

#include "QRT/QRTUnknown.h"

namespace ML
{

class IRenderableKeyframeOwner : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{8f77cbd2-1dc8-4005-b5c4-2553e9294699}");

protected:
    ~IRenderableKeyframeOwner() = default;
};

} // namespace ML
