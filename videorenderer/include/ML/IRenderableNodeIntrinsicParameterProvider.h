#pragma once

// ML::IRenderableNodeIntrinsicParameterProvider: a sealed node (clip or
// transition) that fills its built-in geometry (motion and opacity) at a
// time, which the compositor and the subtree renderer apply when drawing the
// node's frame. Nodes are immutable, so it may be asked from any thread.

#include "ML/CutlistRenderParams.h"
#include "ML/MotionRecord.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

namespace ML
{

class IRenderableNodeIntrinsicParameterProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{fbe50f60-c6fa-4f0b-81fa-6cd095305211}");

    // Fills ioRecord with the node's motion, blend mode and opacity at
    // inLayerTime (the node's own time: the compositor's time minus the
    // layer's offset) for the request inParams. The caller starts ioRecord
    // at kIdentityMotionRecord and asks once per field. Answers 0.
    virtual QRT::Result GetIntrinsicParameters(mvxmediatypes::TickTime inLayerTime,
                                               const CutlistRenderParams& inParams,
                                               MotionRecord& ioRecord) const = 0;

protected:
    ~IRenderableNodeIntrinsicParameterProvider() = default;
};

} // namespace ML
