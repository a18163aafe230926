#pragma once

// ML::IRenderableNodeOperator: one effect applied to a clip's frame, made by
// an effect node (IRenderableNodeOperatorProvider::CreateOperator) for one
// frame request and released with the clip producer that applies it. Used by
// one thread at a time, like the producer that owns it.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/SubTreeRender.h"
#include "QRT/Guid.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

#include <cstdint>
#include <vector>

namespace ML
{

// The layer inputs handed to an operator, in the effect's layer order.
using SubTreeRenderList = std::vector<QRT::InterfaceRef<SubTreeRender>>;

class IRenderableNodeOperator : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{64175004-3605-4749-ae69-3c01cd55e987}");

    // Renders the effect onto ioFrame (the result replaces it). inOutputTime is
    // the clip's time, inInputTime the mapped time of the clip's input.
    // Answers the effect's status; a negative one fails the frame.
    virtual QRT::Result
    ApplyOperator(const MF::FrameTime& inOutputTime, const MF::FrameTime& inInputTime,
                  const CutlistRenderParams& inParams, const SubTreeRenderList& inLayerInputs,
                  QRT::InterfaceRef<MF::IVideoFrame>& ioFrame, std::uint32_t inFlags) = 0;

    // The hash of what ApplyOperator contributes for inTime and inParams,
    // computed without rendering.
    virtual QRT::Result GetOperatorHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                                        const CutlistRenderParams& inParams) = 0;

protected:
    ~IRenderableNodeOperator() = default;
};

} // namespace ML
