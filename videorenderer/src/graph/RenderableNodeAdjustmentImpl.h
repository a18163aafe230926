#pragma once

// Adjustment layers. An adjustment item closes the compositor of the tracks
// below it: RenderableNodeAdjustmentImpl ("RenderableNode_AdjustmentImpl", a
// compositor) has two inputs, that sealed compositor (at the lowest of its
// track indices) and the adjustment item's clip, a
// RenderableNodeAdjustmentClipImpl (at the item's track index). Its
// producer, AdjustmentProducer, composites the layers below, runs the
// adjustment clip's effects over that composite and draws the adjusted
// picture over it with the adjustment clip's motion and opacity. The
// adjustment item's own picture is never drawn: only its effects, motion and
// opacity take part. The factory makes the adjustment node the first input
// of a new compositor for the tracks above, which it does not affect.
//
// When the request's track limit leaves out the adjustment clip, the node
// renders the layers below unchanged.
//
// "AdjustmentNode::AdjustmentMediaIsOpaque" (hashed) is "1" exactly when the
// adjustment clip's input carries kRenderFlag_Opaque.
//
// Built and sealed by CreateAdjustmentNode on one thread, read by any
// afterwards; producers are per request. Render flags and frame hash are the
// compositor's.

#include "MF/RenderableNode.h"
#include "ML/RenderableNodeCompositorImpl.h"
#include "QRT/InterfaceRef.h"
#include "graph/RenderableNodeClipImpl.h"
#include "graph/SequenceNodes.h"

#include <cstdint>

namespace ML
{

// The adjustment item's clip: a clip node whose opacity and motion are
// keyframes and whose other effects are operators, which the adjustment
// producer applies to the layers below rather than to the clip's input.
class RenderableNodeAdjustmentClipImpl : public RenderableNodeClipImpl
{
public:
    using RenderableNodeClipImpl::RenderableNodeClipImpl;

protected:
    ~RenderableNodeAdjustmentClipImpl() = default;
};

class RenderableNodeAdjustmentImpl : public RenderableNodeCompositorImpl
{
public:
    RenderableNodeAdjustmentImpl() = default;

    QRT::ImmutableString GetNodeType() const override;

    // Adds the compositor below and the adjustment clip and writes the key.
    // Empty nodes throw QRT::NullInterfaceException. Input contract "mMutable".
    void SetAdjustment(const QRT::InterfaceRef<MF::IRenderableNode>& inBelow,
                       std::uint32_t inBelowTrackIndex,
                       const QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl>& inClip,
                       mvxmediatypes::TickTime inClipOffset, std::uint32_t inClipTrackIndex);

    // An AdjustmentProducer over the inputs that make layers at inTime.
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;

protected:
    ~RenderableNodeAdjustmentImpl() = default;

private:
    QRT::InterfaceRef<RenderableNodeAdjustmentClipImpl> mClip;
};

struct AdjustmentNodeSetup
{
    // The sealed compositor of the tracks below (required).
    QRT::InterfaceRef<MF::IRenderableNode> mBelow;
    std::uint32_t mBelowTrackIndex = 0;
    // The adjustment item's clip, made from these settings (required).
    ClipNodeSetup mClip;
    // The clip's offset in the adjustment node's time.
    mvxmediatypes::TickTime mClipOffset = mvxmediatypes::kTime_Zero;
};

// A sealed "RenderableNode_AdjustmentImpl".
QRT::InterfaceRef<MF::IRenderableNode> CreateAdjustmentNode(const AdjustmentNodeSetup& inSetup);

} // namespace ML
