#pragma once

// ML::IRenderableNodeOperatorProvider: a sealed effect node that makes
// operators for the clips it modifies. Nodes are immutable, so it may be
// asked from any thread.

#include "MF/FrameTime.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodeOperator.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"

namespace ML
{

class IRenderableNodeOperatorProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{65ab418c-feec-4ef7-88ef-82e38e4b5d63}");

    // A new operator for inTime and inParams, or an empty reference when the
    // effect is not applied as an operator (opacity and motion, which the
    // clip evaluates itself).
    virtual void CreateOperator(QRT::InterfaceRef<IRenderableNodeOperator>& outOperator,
                                const MF::FrameTime& inTime,
                                const CutlistRenderParams& inParams) const = 0;

protected:
    ~IRenderableNodeOperatorProvider() = default;
};

} // namespace ML
