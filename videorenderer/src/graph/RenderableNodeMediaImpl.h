#pragma once

// RenderableNodeMediaImpl: the leaf of a clip's subtree: one video stream of
// one media (a file, a pattern, a solid, a still or a nested sequence), read
// through the clip settings of the item that plays it.
//
// Built by CreateMediaNode on one thread: it reads the host's media, stream
// and clip objects once, fills the media keys, and builds the chain of
// renderable sources that delivers the stream's frames already conformed
// (base source, pulldown removal or field filters, scaler, time filter).
// Sealed there and read by any thread afterwards; the source chain is shared
// by every producer of the node and is safe for concurrent rendering.
//
// Media without a chain render by their state: muted media, and media with
// neither a source nor a reason to show a placeholder, as the request's
// black frame; offline media as the offline picture, pending media as the
// pending picture.
//
// Size. A media plays at its native pixel size in the sequence, corrected
// to the request's pixel aspect ratio, unless scale-to-frame fits it into
// the request; a reduced render (scales below 1) renders it at that size
// times the scales.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/IRenderableSource.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "QRT/Guid.h"
#include "graph/SequenceNodes.h"
#include "mvxmediatypes/PixelAspectRatio.h"

#include <cstdint>
#include <set>
#include <vector>

namespace ML
{

// Everything a media node's producers need, copied into each of them.
struct MediaNodeRenderState
{
    // Empty when the media has no source chain.
    QRT::InterfaceRef<IRenderableSource> mSource;
    // Added to every requested time.
    mvxmediatypes::TickTime mTimeOrigin = mvxmediatypes::kTime_Zero;
    bool mStill = false;
    // Media time every frame shows; kTime_Max without a frame hold.
    mvxmediatypes::TickTime mFrameHoldAt = mvxmediatypes::kTime_Max;
    bool mFrameHoldDeinterlace = false;
    bool mScaleToFrame = false;
    // The stream's native picture.
    std::int32_t mWidth = 0;
    std::int32_t mHeight = 0;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    // Used without a source chain, in this order.
    bool mBlack = false;
    bool mOfflinePicture = false;
    bool mPendingPicture = false;
    // The hashes of the material the media is rendered from (a nested
    // sequence's cutlist), in order.
    std::vector<QRT::Guid> mMaterialHashes;
};

class RenderableNodeMediaImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider>
{
public:
    // Reads the host objects, fills the keys and builds the source chain;
    // the node is left mutable. Empty required objects throw
    // QRT::NullInterfaceException.
    explicit RenderableNodeMediaImpl(const MediaNodeSetup& inSetup);

    QRT::ImmutableString GetNodeType() const override;
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // 84, plus 8 for a still, plus 1 when opaque.
    std::uint32_t ComputeRenderFlags() const override;
    // Prefetches through a producer for the range, unless a placeholder shows.
    void PrefetchSelf(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                      RenderableNodePrefetchList& ioPrefetches) const override;

    // --- IRenderableNodeProducerProvider -----------------------------------------
    // Always a MediaNodeProducer (sealed nodes only).
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // The stored still ranges that overlap [inStart, inEnd], clipped to it.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

    // The native picture of the stream, for the clip's motion record.
    const MediaNodeRenderState& GetRenderState() const { return mState; }
    bool IsOpaque() const { return mOpaque; }

protected:
    ~RenderableNodeMediaImpl() = default;

private:
    void BuildSourceChain(const MediaNodeSetup& inSetup);

    MediaNodeRenderState mState;
    bool mOpaque = false;
    MF::TickTimeRangeList mStillRanges;
};

// The producer of a media node for one request: renders through inState's
// chain (or its placeholder) with inNodeHash as its identity. inFixedTime,
// when valid, is the media time every frame of the producer shows.
QRT::InterfaceRef<IRenderableNodeProducer>
CreateMediaNodeProducer(const MediaNodeRenderState& inState, const QRT::Guid& inNodeHash,
                        mvxmediatypes::TickTime inFixedTime);

} // namespace ML
