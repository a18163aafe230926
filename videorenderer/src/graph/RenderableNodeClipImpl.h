#pragma once

// RenderableNodeClipImpl: one track item placed in sequence time over its
// only input (the item's media node, or the tree of a nested sequence) at
// offset 0. Clip time 0 is the item's start; the clip's time transform maps
// clip time to the input's time (speed, reverse, time remapping, frame
// hold). The item's effects are the clip's operators, applied in order; its
// motion and opacity are not operators but intrinsic parameters that the
// compositor asks for when it draws the clip's frame.
//
// Built and sealed by CreateClipNode on one thread, read by any afterwards.
//
// Render flags: the input's, with 16 cleared when the clip re-times its
// input (its input no longer runs at the clip's own pace), 4, 8 and 64 kept
// only when every operator carries them, 128 set when frame blending makes
// the picture depend on several input frames, and 1 cleared when there is
// any operator.

#include "BE/SequenceTypes.h"
#include "ML/IRenderableKeyframeOwner.h"
#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/IRenderableNodeOperator.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/IRenderableTimeTransformOwner.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "graph/SequenceNodes.h"

#include <cstdint>
#include <set>
#include <vector>

namespace ML
{

// The keyframes a clip evaluates itself: its motion and its opacity (per
// cent), in clip time.
struct ClipKeyframeStore
{
    BE::MotionKeyframes mMotion;
    BE::KeyframeCurve mOpacity = BE::KeyframeCurve::Scalar(100.0);
};

// What a clip producer is made of.
struct ClipProducerSetup
{
    // Subtracted from requested times (the input's offset).
    mvxmediatypes::TickTime mOffset = mvxmediatypes::kTime_Zero;
    // Clip time to input time; may be empty (the identity).
    QRT::InterfaceRef<MF::ITimeTransform> mTransform;
    QRT::Guid mNodeHash;
    // The input's frames do not change with time: it is asked for time 0.
    bool mInputTimeInvariant = false;
    // May be empty (the input renders nothing).
    QRT::InterfaceRef<IRenderableNodeProducer> mInput;
    // In application order.
    std::vector<QRT::InterfaceRef<IRenderableNodeOperator>> mOperators;
    // Parallel to mOperators: the layers each operator reads (missing
    // entries read none).
    std::vector<SubTreeRenderList> mLayerInputs;
    // With a frame hold whose filters apply: the clip time the operators are
    // evaluated at (as the motion is); kTime_Invalid otherwise.
    mvxmediatypes::TickTime mOperatorHoldTime = mvxmediatypes::kTime_Invalid;
    // Set only by GetProducerForOperatorsWithFixedInput: the frame the
    // operators run on in place of the input's.
    QRT::InterfaceRef<MF::IVideoFrame> mFixedFrame;
};

// A clip producer (ClipNodeProducer).
QRT::InterfaceRef<IRenderableNodeProducer> CreateClipNodeProducer(ClipProducerSetup inSetup);

// The input's time for clip time inTime: minus the offset (not below 0 when
// the offset is positive), through the transform; time 0 for a
// time-invariant input.
MF::FrameTime MapClipTime(const ClipProducerSetup& inSetup, const MF::FrameTime& inTime);

class RenderableNodeClipImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider,
                                          IRenderableKeyframeOwner, IRenderableTimeTransformOwner,
                                          IRenderableNodeIntrinsicParameterProvider>
{
public:
    // Reads the item, writes the clip keys and adds the input and operators;
    // the node is left mutable. An empty item or input throws
    // QRT::NullInterfaceException.
    explicit RenderableNodeClipImpl(const ClipNodeSetup& inSetup);

    QRT::ImmutableString GetNodeType() const override;
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // The type, then the time transform: clips that play other parts of
    // their input (another in point, say) are not interchangeable, so their
    // hashes differ even where every key is equal.
    void MixKindIntoHash(QRT::HashValue& ioHash) const override;
    std::uint32_t ComputeRenderFlags() const override;
    QRT::InterfaceRef<MF::ITimeTransform> GetTimeTransform() const override;

    // --- IRenderableNodeProducerProvider -----------------------------------------
    // Empty unless the clip has exactly one input.
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // The input's still ranges, when the operators keep flags 4 and 8 and
    // the clip plays its input unchanged in time.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

    // A producer that applies operators [inFirst, inFirst + inCount) to
    // inFrame. Empty unless the clip has exactly one input and the range
    // lies within the operators.
    void GetProducerForOperatorsWithFixedInput(
        QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, std::uint32_t inFirst,
        std::uint32_t inCount, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
        const MF::TickTimeRange& inRange, std::uint32_t inQuality) const;

    // --- IRenderableKeyframeOwner ------------------------------------------------
    const ClipKeyframeStore& GetKeyframeStore() const { return mKeyframes; }

    // --- IRenderableNodeIntrinsicParameterProvider ---------------------------------
    // The item's motion (frame-relative: positions over the full frame,
    // anchors over the media's picture), opacity and blend mode at
    // inLayerTime; at the held time for a frame hold with filters.
    QRT::Result GetIntrinsicParameters(mvxmediatypes::TickTime inLayerTime,
                                       const CutlistRenderParams& inParams,
                                       MotionRecord& ioRecord) const override;

protected:
    ~RenderableNodeClipImpl() = default;

private:
    // The AND of every operator's flags with 76 (76 without operators).
    std::uint32_t OperatorFlags() const;

    ClipKeyframeStore mKeyframes;
    QRT::InterfaceRef<MF::ITimeTransform> mTransform;
    // Clip time of the held frame, for motion with frame-hold filters;
    // kTime_Invalid without.
    mvxmediatypes::TickTime mHoldClipTime = mvxmediatypes::kTime_Invalid;
    bool mTimeChanged = false;
    bool mClearsFlag16 = false;
    bool mSetsFlag128 = false;
    IR_BlendMode mBlendMode = kIR_BlendMode_Normal;
};

} // namespace ML
