#pragma once

// ML::IRenderableNodeIntrinsicParameterProvider: a sealed node (clip or
// transition) that fills its built-in geometry (motion and opacity) at a
// time, which the compositor and the subtree renderer apply when drawing the
// node's frame. Nodes are immutable, so it may be asked from any thread.
//
// The identifier is fixed here; the operation is declared together with the
// compositor's motion record.

#include "QRT/QRTUnknown.h"

namespace ML
{

class IRenderableNodeIntrinsicParameterProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{fbe50f60-c6fa-4f0b-81fa-6cd095305211}");

protected:
    ~IRenderableNodeIntrinsicParameterProvider() = default;
};

} // namespace ML
