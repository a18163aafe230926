#pragma once

// RenderableNodeEffectImpl: one effect of a clip, held by the clip as an
// operator (never as an input). It carries the host's effect object, the
// frame rate effect time is counted at, the effect's duration and the label
// of the stream it applies to; SetEffect writes its keys from the effect:
//   "EffectNode::FilterMatchName", "EffectNode::StreamLabel" (when not
//   empty), "EffectNode::EffectDuration" (when the effect has one),
//   "EffectNode::FilterOpaqueData" (when it has some), "EffectNode::FilterParams"
//   (the parameter count and a line feed, then each parameter's text and a
//   line feed), "EffectNode::RuntimeInstanceID" (unhashed); SetLayerInputs
//   then "EffectNode::LayerInputHashes" (one line per layer the effect
//   reads: the layer node's hash, "@" and its offset in ticks), only when
//   there is a layer.
//
// Layer inputs are the node's inputs: each a sealed subtree of another
// track at the offset of its time origin from the clip's time. The clip
// producer hands them to the operator as subtree renderers.
//
// Render flags: 4, plus 8 unless the effect varies with time (the effect
// says so, a parameter is animated, or a layer parameter reads a layer at
// time 0), plus 64 unless the node has "EffectNode::LayerInputHashes".
//
// Built and sealed by one thread (CreateEffectNode), read by any afterwards.
// Operators are made per request. An effect that may not render several
// frames at once is serialised through the node's render lock, which every
// operator of the node shares.

#include "FX/Effect.h"
#include "ML/IRenderableKeyframeOwner.h"
#include "ML/IRenderableNodeOperatorProvider.h"
#include "ML/RenderableNodeCommonImpl.h"

#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace ML
{

// A layer an effect reads: the layer's sealed subtree and the offset of its
// time origin from the effect's clip time.
struct EffectLayerInput
{
    QRT::InterfaceRef<MF::IRenderableNode> mNode;
    mvxmediatypes::TickTime mOffset = mvxmediatypes::kTime_Zero;
};

class RenderableNodeEffectImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeOperatorProvider,
                                          IRenderableKeyframeOwner>
{
public:
    RenderableNodeEffectImpl() = default;

    QRT::ImmutableString GetNodeType() const override;
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();
    std::uint32_t ComputeRenderFlags() const override;

    // Reads inEffect and writes the keys above. An empty effect throws
    // QRT::NullInterfaceException. Input contract "mMutable".
    void SetEffect(const QRT::InterfaceRef<FX::IEffect>& inEffect,
                   mvxmediatypes::FrameRate inFrameRate, const std::string& inStreamLabel);

    // Adds inLayers as the node's inputs and writes
    // "EffectNode::LayerInputHashes" (nothing without layers). An empty node
    // throws QRT::NullInterfaceException. Input contract "mMutable".
    void SetLayerInputs(const std::vector<EffectLayerInput>& inLayers);

    // --- IRenderableNodeOperatorProvider ---------------------------------------------
    // Empty for opacity and motion; otherwise a new EffectNodeOperator.
    void CreateOperator(QRT::InterfaceRef<IRenderableNodeOperator>& outOperator,
                        const MF::FrameTime& inTime,
                        const CutlistRenderParams& inParams) const override;

    // --- IRenderableKeyframeOwner ------------------------------------------------
    // The effect, whose parameters hold the keyframes.
    const FX::IEffect& GetKeyframeStore() const;

    // The effect varies with time (the rule above).
    bool IsTimeVariant() const;

protected:
    ~RenderableNodeEffectImpl() = default;

private:
    QRT::InterfaceRef<FX::IEffect> mEffect;
    mvxmediatypes::FrameRate mFrameRate;
    mvxmediatypes::TickTime mDuration = mvxmediatypes::kTime_Zero;
    std::string mStreamLabel;
    // Held around every render of a non-re-entrant effect; shared with the
    // operators, which may outlive a request's reference to the node.
    std::shared_ptr<std::mutex> mRenderLock;
};

struct EffectNodeSetup
{
    // Required (an empty one throws QRT::NullInterfaceException).
    QRT::InterfaceRef<FX::IEffect> mEffect;
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    std::string mStreamLabel;
    // The layers the effect reads, in its layer order.
    std::vector<EffectLayerInput> mLayerInputs;
};

// A sealed "RenderableNodeEffectImpl".
QRT::InterfaceRef<MF::IRenderableNode> CreateEffectNode(const EffectNodeSetup& inSetup);

} // namespace ML
