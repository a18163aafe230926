#pragma once

// ML::IRenderableNodeProducerProvider: a sealed node that makes producers
// for itself and answers questions about how its picture changes over time.
// Nodes are immutable, so every operation may be called from any thread.

#include "MF/FrameTime.h"
#include "MF/RenderableCutlist.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodeProducer.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/TickTime.h"

#include <set>

namespace ML
{

class IRenderableNodeProducerProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{45e16471-808f-43a5-a470-5bcbae8297ba}");

    // A new producer for inTime (in the node's own time) and inParams, or an
    // empty reference when the node renders nothing at that time.
    virtual void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                             const MF::FrameTime& inTime,
                             const CutlistRenderParams& inParams) const = 0;

    // Appends the sub-ranges of [inStart, inEnd] over which the node's picture
    // does not change.
    virtual void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                                MF::TickTimeRangeList& ioRanges) const = 0;

    // Adds the times at which smart rendering must start a new piece within
    // [inStart, inEnd] for frames of inFrameRate.
    virtual void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                                     const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                                     std::set<mvxmediatypes::TickTime>& ioTimes) const = 0;

protected:
    ~IRenderableNodeProducerProvider() = default;
};

} // namespace ML
