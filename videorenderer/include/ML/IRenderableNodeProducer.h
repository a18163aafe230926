#pragma once

// ML::IRenderableNodeProducer: renders one node of a cutlist's tree for one
// frame time and one set of render parameters.
//
// Producers are short-lived objects made per frame request by
// IRenderableNodeProducerProvider::GetProducer; a producer is used by one
// thread at a time (the render request hands it from the housekeeping thread
// that computed the key to the worker thread that renders).

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "QRT/Guid.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

namespace ML
{

class IRenderableNodeProducer : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{84942b79-1c58-41c9-8526-ab7dfc12e3dd}");

    // Renders the frame at inTime (in the node's own time). Answers 0 with the
    // frame in outFrame (which may be empty), or a negative status. Failures
    // of the source chain may also be thrown (RenderRequestException or
    // another exception).
    virtual QRT::Result ProduceFrame(const MF::FrameTime& inTime,
                                     const CutlistRenderParams& inParams,
                                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) = 0;

    // The hash of the frame that ProduceFrame would answer for the same
    // arguments, computed without rendering. Equal hashes mean
    // interchangeable frames; the shared frame cache is keyed by it. A nil
    // hash means "no frame at this time".
    virtual void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                              const CutlistRenderParams& inParams) = 0;

protected:
    ~IRenderableNodeProducer() = default;
};

} // namespace ML
