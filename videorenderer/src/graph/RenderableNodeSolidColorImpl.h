#pragma once

// RenderableNodeSolidColorImpl: a node whose picture is one colour over the
// whole requested frame. The colour lives in the hashed property
// "SolidColorNode::Color" (unsigned decimal of 0xAARRGGBB); the node has no
// inputs. Built and sealed by one thread (the cutlist factory, or
// CreateSolidColorNode), read by any afterwards.
//
// Its producer (made per request) resolves the colour from the property:
// 0xFFFFFFFF (opaque white) when the key is absent, 0 (transparent black)
// when the text is not an unsigned 32-bit number.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"

#include <cstdint>

namespace ML
{

class RenderableNodeSolidColorImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider>
{
public:
    RenderableNodeSolidColorImpl() = default;

    QRT::ImmutableString GetNodeType() const override;

    // A new reference to this node.
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // Writes "SolidColorNode::Color" (hashed). Input contract "mMutable".
    void SetColor(std::uint32_t inColor);

    // The colour the producers fill with (the resolution rules above).
    std::uint32_t GetResolvedColor() const;

    // --- IRenderableNodeProducerProvider ---------------------------------------------
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // A solid colour reports no still ranges of its own: the segment's flags decide.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

protected:
    ~RenderableNodeSolidColorImpl() = default;
};

} // namespace ML
