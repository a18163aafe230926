#pragma once

// RenderableNodeCompositorImpl: the node that stacks the layers of a segment,
// one input per active track (bottom first), each with its track index. Its
// producer, CompositorProducer, renders the layers bottom-up and draws each
// through its motion onto the result of the layers below
// (render/VideoFrameCompositeUtilities.h).
//
// Lifecycle and threads: built mutable by the cutlist factory with Create(),
// one AddTrackInput per track and MakeImmutable(); read by any thread
// afterwards. Producers are made per request and used by one thread at a
// time. Both classes may be derived from (the adjustment node and its
// producer build on them).
//
// Render flags: the AND of all inputs' flags with kRenderFlagMask_Compositor,
// that mask itself without inputs; an empty input throws
// QRT::NullInterfaceException.

#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/MotionRecord.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "QRT/Guid.h"
#include "QRT/InterfaceRef.h"

#include <cstddef>
#include <cstdint>
#include <vector>

namespace ML
{

class CompositorProducer;

class RenderableNodeCompositorImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider>
{
public:
    RenderableNodeCompositorImpl() = default;

    // A new mutable compositor.
    static QRT::InterfaceRef<RenderableNodeCompositorImpl> Create();

    QRT::ImmutableString GetNodeType() const override;
    std::uint32_t ComputeRenderFlags() const override;

    // A new reference to this node.
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // Appends inNode at inOffset as the next layer up, from track inTrackIndex.
    // Input contract "mMutable".
    void AddTrackInput(const QRT::InterfaceRef<MF::IRenderableNode>& inNode,
                       mvxmediatypes::TickTime inOffset, std::uint32_t inTrackIndex);

    const std::vector<std::uint32_t>& GetTrackIndices() const { return mTrackIndices; }

    // --- IRenderableNodeProducerProvider ---------------------------------------------
    // A CompositorProducer with one layer per input that makes producers. When
    // the parameters' cutlist parameter is not all ones, only inputs whose
    // track index is at or below it become layers.
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // The union over the inputs, each asked in its own time and answered back
    // in the compositor's.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    // Forwarded to the input when there is exactly one, in its time; the
    // times are answered in the compositor's.
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

protected:
    ~RenderableNodeCompositorImpl() = default;

    // Adds to ioProducer one layer for each input that hands out a producer
    // at inTime, bottom first, after the track-index limit, with the motion
    // of inputs that answer IRenderableNodeIntrinsicParameterProvider.
    void AddLayers(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                   CompositorProducer& ioProducer) const;

private:
    // Parallel to the inputs ("mInputs.size() == mTrackIndices.size()").
    std::vector<std::uint32_t> mTrackIndices;
};

// Renders a compositor's layers for one request.
//
// Frame hash: "RenderableNodeCompositorProducer", then per layer bottom first
// its two motion records (72 bytes each) and its producer's frame hash at
// the layer's time (16), then the compositor node hash (16), the pixel
// aspect ratio (8), width, height, quality, single-field value and secondary
// quality (4 each) and the pixel format (8). Without layers: the black-frame
// hash of the parameters.
class CompositorProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    struct Layer
    {
        // The layer's start in the compositor's time.
        mvxmediatypes::TickTime mOffset;
        MotionRecord mFirstFieldMotion = kIdentityMotionRecord;
        MotionRecord mSecondFieldMotion = kIdentityMotionRecord;
        QRT::InterfaceRef<IRenderableNodeProducer> mProducer;
    };

    explicit CompositorProducer(const QRT::Guid& inNodeHash);

    void AddLayer(Layer inLayer) { mLayers.push_back(std::move(inLayer)); }
    const std::vector<Layer>& GetLayers() const { return mLayers; }

    // The layers composited bottom-up; the black frame without layers. A
    // failing layer answers its status and discards the layers drawn so far;
    // a failed draw answers kResult_RenderFailed. The bottom layer is drawn
    // alone through its geometry and opacity (ApplyMotion when it is opaque).
    // When only one field is needed, an interlaced result is reduced to it.
    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override;
    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override;

protected:
    ~CompositorProducer() = default;

    // The first inLayerCount layers composited bottom-up, without the
    // single-field step.
    QRT::Result CompositeLayers(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                                QRT::InterfaceRef<MF::IVideoFrame>& outFrame,
                                std::size_t inLayerCount = SIZE_MAX);
    // The single-field step: when only one field is needed, an interlaced
    // inFrame reduced to it; otherwise inFrame.
    static QRT::InterfaceRef<MF::IVideoFrame>
    KeepNeededField(QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                    const CutlistRenderParams& inParams);

private:
    const QRT::Guid mNodeHash;
    std::vector<Layer> mLayers;
};

} // namespace ML
