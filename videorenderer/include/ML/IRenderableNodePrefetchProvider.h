#pragma once

// ML::IRenderableNodePrefetchProvider: a sealed node (or a source) that can
// collect the prefetch handles for the frames it will read over a time range.
// Called by the render request (through the cutlist renderer) on the render
// queue's housekeeping thread, and by other nodes for their inputs; nodes are
// immutable, so it may be called from any thread.

#include "MF/RenderableCutlist.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodePrefetch.h"
#include "QRT/QRTUnknown.h"

namespace ML
{

class IRenderableNodePrefetchProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{41ee68df-8689-4689-bddc-3fae9778fb82}");

    // Appends to ioPrefetches a handle for every frame the node will read for
    // inRange (start, end, in the node's own time) at inParams. The handles
    // are not started. Input contract on nodes: "!mMutable".
    virtual void Prefetch(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                          RenderableNodePrefetchList& ioPrefetches) const = 0;

protected:
    ~IRenderableNodePrefetchProvider() = default;
};

} // namespace ML
