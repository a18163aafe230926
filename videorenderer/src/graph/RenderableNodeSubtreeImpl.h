#pragma once

// The layer inputs of effects. A layer input is a sealed node (a clip
// subtree of another track) held as an input of the effect node that reads
// it, at the offset of the layer's time origin from the effect's clip time.
//
// RenderableNodeClipSubTreeImpl provides the producers of such a subtree in
// the effect's clip time; RenderableNodeSubtreeImpl (an ML::SubTreeRender)
// renders it for one request: the subtree's frame at the asked time through
// the cutlist renderer with caching on, drawn with the subtree root's motion
// when the root has one.
//
// Both are made per request by the clip producer and used by the thread
// that renders it.

#include "MF/RenderableNode.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodeOperator.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/SubTreeRender.h"

#include <vector>

namespace ML
{

class RenderableNodeClipSubTreeImpl : public QRT::Implements<IRenderableNodeProducerProvider>
{
public:
    // inNode must answer IRenderableNodeProducerProvider to make producers;
    // an empty inNode throws QRT::NullInterfaceException.
    RenderableNodeClipSubTreeImpl(QRT::InterfaceRef<MF::IRenderableNode> inNode,
                                  mvxmediatypes::TickTime inOffset);

    // The subtree's producer at inTime minus the offset; empty when the
    // subtree makes none.
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

    const QRT::InterfaceRef<MF::IRenderableNode>& GetNode() const { return mNode; }
    mvxmediatypes::TickTime GetOffset() const { return mOffset; }

protected:
    ~RenderableNodeClipSubTreeImpl() = default;

private:
    const QRT::InterfaceRef<MF::IRenderableNode> mNode;
    const mvxmediatypes::TickTime mOffset;
};

// The subtree renderers of every input of inEffectNode, in input order, for
// the request inParams.
SubTreeRenderList CreateLayerInputs(const MF::IRenderableNode& inEffectNode,
                                    const CutlistRenderParams& inParams);

} // namespace ML
