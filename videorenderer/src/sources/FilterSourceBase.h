#pragma once

// ML::FilterSourceBase: the part shared by the frame filters that render one
// upstream frame per output frame. It holds the upstream source, renders and
// prefetches upstream at the one time the filter names for a request
// (UpstreamTime), hands the upstream frame to the filter's Filter step, and
// answers the upstream rates (the frame rate as the field rate for filters
// whose output is progressive).
//
// Derived filters stay immutable after creation; the base holds no state
// besides the upstream reference, so filters are used from any number of
// render and prefetch threads at once. An empty upstream raises
// QRT::NullInterfaceException at the first use.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"

namespace ML
{

class FilterSourceBase : public QRT::Implements<IRenderableSource>
{
public:
    // What the filter delivers: fields as upstream has them, or progressive
    // frames (whose field rate is the frame rate).
    enum class Output
    {
        kFieldsAsUpstream,
        kProgressive
    };

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) final;

    // Renders upstream at UpstreamTime(inTime) and answers Filter of the
    // frame; an empty upstream frame gives an empty frame.
    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) final;

    void GetFrameRate(mvxmediatypes::FrameRate& outRate) final;
    void GetFieldRate(mvxmediatypes::FrameRate& outRate) final;

protected:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    FilterSourceBase(const QRT::InterfaceRef<IRenderableSource>& inUpstream, Output inOutput);
    ~FilterSourceBase() = default;

    // The time at which upstream is rendered and prefetched for a request at
    // inTime: upstream's conformed time for inTime unless a filter says otherwise.
    virtual MF::FrameTime UpstreamTime(const MF::FrameTime& inTime,
                                       const CutlistRenderParams& inParams);

    // The output frame made from inFrame (not empty), which upstream rendered
    // at inUpstreamTime for the request at inTime. inFrame is only read; an
    // empty answer is delivered as an empty frame.
    virtual FrameRef Filter(const FrameRef& inFrame, const MF::FrameTime& inTime,
                            const MF::FrameTime& inUpstreamTime,
                            const CutlistRenderParams& inParams) = 0;

    const QRT::InterfaceRef<IRenderableSource> mUpstream;

private:
    const Output mOutput;
};

} // namespace ML
