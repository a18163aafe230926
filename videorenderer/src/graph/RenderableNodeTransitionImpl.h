#pragma once

// RenderableNodeTransitionImpl: the change from an outgoing subtree (input 0,
// A) to an incoming one (input 1, B) through a host transition object. Node
// time 0 is the transition's start; each input sits at its own offset (an
// outgoing clip usually started before the transition, so its offset is
// negative). Either input may be an empty reference: a transition at the
// start or the end of a lone clip changes from or to nothing.
//
// Built and sealed by CreateTransitionNode on one thread, read by any
// afterwards. Its producer (TransitionNodeProducer, made per request) draws
// each input through its own geometry, then hands both pictures, the
// progress (node time over the duration, per field) and the settings to the
// host transition's render entry.
//
// Render flags: the AND of the non-empty inputs' flags with 68 (64 + 4); 68
// without inputs. A transition always changes with time.

#include "ML/IRenderableNodeIntrinsicParameterProvider.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/MotionRecord.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "TX/Transition.h"

#include <cstdint>
#include <set>

namespace ML
{

struct TransitionNodeSetup
{
    // Required (an empty one throws QRT::NullInterfaceException).
    QRT::InterfaceRef<TX::ITransition> mTransition;
    // Sealed subtrees; either may be empty.
    QRT::InterfaceRef<MF::IRenderableNode> mOutgoing;
    mvxmediatypes::TickTime mOutgoingOffset = mvxmediatypes::kTime_Zero;
    QRT::InterfaceRef<MF::IRenderableNode> mIncoming;
    mvxmediatypes::TickTime mIncomingOffset = mvxmediatypes::kTime_Zero;
};

// A sealed "RenderableNodeTransitionImpl".
QRT::InterfaceRef<MF::IRenderableNode> CreateTransitionNode(const TransitionNodeSetup& inSetup);

// What a transition producer is made of: per input its offset, its producer
// (may be empty) and its geometry per field; the host transition, its
// settings and the node hash. In fixed mode the two inputs are the frames
// the caller supplies (either may be empty) instead of producers, and every
// frame hash is fresh, so a fixed render is never shared or cached.
struct TransitionProducerSetup
{
    struct Side
    {
        mvxmediatypes::TickTime mOffset = mvxmediatypes::kTime_Zero;
        QRT::InterfaceRef<IRenderableNodeProducer> mProducer;
        QRT::InterfaceRef<MF::IVideoFrame> mFixedFrame;
        MotionRecord mFirstField;
        MotionRecord mSecondField;
    };
    Side mSides[2];
    bool mFixed = false;
    QRT::InterfaceRef<TX::ITransition> mTransition;
    TX::TransitionParameters mParameters;
    QRT::Guid mNodeHash;
};

QRT::InterfaceRef<IRenderableNodeProducer>
CreateTransitionNodeProducer(TransitionProducerSetup inSetup);

class RenderableNodeTransitionImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider,
                                          IRenderableNodeIntrinsicParameterProvider>
{
public:
    // Writes the transition keys and adds the two inputs; the node is left
    // mutable.
    explicit RenderableNodeTransitionImpl(const TransitionNodeSetup& inSetup);

    QRT::ImmutableString GetNodeType() const override;
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();
    std::uint32_t ComputeRenderFlags() const override;

    const TX::TransitionParameters& GetParameters() const { return mParameters; }

    // --- IRenderableNodeProducerProvider -----------------------------------------
    // Input contract "inInputs.size() == 2".
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // None: the picture changes at every time.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

    // --- IRenderableNodeIntrinsicParameterProvider ---------------------------------
    // The transition as a whole is drawn where it stands: it fills the full
    // frame, each input already drawn through its own motion, so the record
    // is left as given.
    QRT::Result GetIntrinsicParameters(mvxmediatypes::TickTime inLayerTime,
                                       const CutlistRenderParams& inParams,
                                       MotionRecord& ioRecord) const override;

protected:
    ~RenderableNodeTransitionImpl() = default;

private:
    QRT::InterfaceRef<TX::ITransition> mTransition;
    TX::TransitionParameters mParameters;
};

} // namespace ML
