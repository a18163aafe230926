#pragma once

// RenderableNodePreviewImpl: a leaf over the host's preview material (frames
// of a part of a sequence rendered ahead of time into a file, BE/Preview.h),
// rendered as a media node renders its stream: through a chain of
// renderable sources and the media node's producer. It answers the material
// it was built over as BE::IPreviewNode.
//
// Two render paths. The new path reads the file through the media adaptor
// that makes its own frames, removes the file's pulldown when the material
// names a cadence, and scales the result to the request. The older path,
// taken when the debug switch "DisableNewMediaNodeRenderer" is on or either
// legacy flag of the material is set, has the file draw into a frame the
// adaptor makes at the request's size and pixel aspect ratio; its frames
// already fit, so it is not scaled, and it removes no pulldown.
//
// File time: the node shows file frame 0 at its time zero; the factory
// places it in sequence time.
//
// Built by CreatePreviewNode on one thread and sealed there; read by any
// thread afterwards. The source chain is shared by every producer.

#include "BE/Preview.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "ML/RenderableNodeCommonImpl.h"
#include "graph/RenderableNodeMediaImpl.h"

#include <set>

namespace ML
{

class RenderableNodePreviewImpl
    : public RenderableNodeWithInterfaces<RenderableNodeCommonImpl, IRenderableNodeProducerProvider,
                                          BE::IPreviewNode>
{
public:
    // Reads the material, fills the keys and builds the source chain; the
    // node is left mutable. An empty material or source throws
    // QRT::NullInterfaceException.
    explicit RenderableNodePreviewImpl(const QRT::InterfaceRef<BE::IPreviewNode>& inPreview);

    QRT::ImmutableString GetNodeType() const override;
    QRT::InterfaceRef<MF::IRenderableNode> GetSelfReference();

    // 84, plus 8 for a still image, plus 1 when the material has no alpha.
    std::uint32_t ComputeRenderFlags() const override;
    // Forwards to the prefetch of its own producer.
    void PrefetchSelf(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                      RenderableNodePrefetchList& ioPrefetches) const override;

    // --- IRenderableNodeProducerProvider -----------------------------------------
    // Always a media node producer (sealed nodes only).
    void GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                     const MF::FrameTime& inTime,
                     const CutlistRenderParams& inParams) const override;
    // None: a preview's frames are all rendered.
    void GetStillRanges(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                        MF::TickTimeRangeList& ioRanges) const override;
    void GetSmartRenderTimes(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                             const mvxmediatypes::FrameRate& inFrameRate, bool inFlag,
                             std::set<mvxmediatypes::TickTime>& ioTimes) const override;

    // --- BE::IPreviewNode: the material's ----------------------------------------
    const BE::PreviewSettings& GetPreviewSettings() const noexcept override;
    QRT::InterfaceRef<BE::Deprecated::IVideoSource> GetVideoSource() const override;

    // True when the node renders on the new path.
    bool UsesNewRenderer() const { return mNewRenderer; }

protected:
    ~RenderableNodePreviewImpl() = default;

private:
    const QRT::InterfaceRef<BE::IPreviewNode> mPreview;
    MediaNodeRenderState mState;
    bool mNewRenderer = true;
};

// A sealed "RenderableNodePreviewImpl" over inPreview.
QRT::InterfaceRef<MF::IRenderableNode>
CreatePreviewNode(const QRT::InterfaceRef<BE::IPreviewNode>& inPreview);

} // namespace ML
