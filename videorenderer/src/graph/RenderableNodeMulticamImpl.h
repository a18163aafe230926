#pragma once

// RenderableNodeMulticamImpl: a multicam media in a clip's subtree, in the
// place of a media node. One input per camera angle (each the angle's media
// node, or a solid, at offset 0), so the node's time is the angles' media
// time. SetMulticam writes the hashed keys "MulticamNode::IsNonMultiCam",
// "MulticamNode::ShowProgram" and, for a multicam proper,
// "MulticamNode::SelectedTrack" and "MulticamNode::Recording". Render flags
// 0. Built and sealed by one thread (CreateMulticamNode), read by any.
//
// Its producer, MulticamNodeProducer, renders the angles at the request and
// puts them together with VF::RenderMulticam (the selected angle, or with
// show program the grid outlined at the selected one), or for a node that
// is not a multicam with VF::RenderNonMulticam. Without show program only
// the selected angle is rendered: the others would not be seen.
//
// Frame hash: "RenderableNodeMulticamImpl", each input producer's frame hash
// at the request in input order (the nil hash for an input without one), the
// selected track (8 bytes), then one byte each for show program, recording
// and non-multicam.

#include "BE/SequenceInterfaces.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"

#include <cstdint>
#include <vector>

namespace ML
{

class RenderableNodeMulticamImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider>
{
public:
    RenderableNodeMulticamImpl() = default;

    QRT::ImmutableString GetNodeType() const override;
    std::uint32_t ComputeRenderFlags() const override;

    // A new reference to this node.
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // Stores the values and writes the keys (above). inSource may be empty
    // for a node that is not a multicam. Input contract "mMutable".
    void SetMulticam(const QRT::InterfaceRef<BE::IMulticamMedia>& inSource,
                     std::uint64_t inSelectedTrack, bool inShowProgram, bool inRecording,
                     bool inIsNonMultiCam);

    const QRT::InterfaceRef<BE::IMulticamMedia>& GetSource() const { return mSource; }

    // --- IRenderableNodeProducerProvider ---------------------------------------------
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // The shown angle's still ranges; without show program only it is seen.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

protected:
    ~RenderableNodeMulticamImpl() = default;

private:
    QRT::InterfaceRef<BE::IMulticamMedia> mSource;
    std::uint64_t mSelectedTrack = 0;
    bool mShowProgram = false;
    bool mRecording = false;
    bool mIsNonMultiCam = false;
};

struct MulticamNodeSetup
{
    // The multicam media; empty for material that is not a multicam.
    QRT::InterfaceRef<BE::IMulticamMedia> mSource;
    // Sealed, one per angle, in angle order; at least one. An empty one
    // throws QRT::NullInterfaceException.
    std::vector<QRT::InterfaceRef<MF::IRenderableNode>> mAngles;
    std::uint64_t mSelectedTrack = 0;
    bool mShowProgram = false;
    bool mRecording = false;
    bool mIsNonMultiCam = false;
};

// A sealed "RenderableNodeMulticamImpl". Input contracts: at least one
// angle, mSelectedTrack below their number.
QRT::InterfaceRef<MF::IRenderableNode> CreateMulticamNode(const MulticamNodeSetup& inSetup);

} // namespace ML
