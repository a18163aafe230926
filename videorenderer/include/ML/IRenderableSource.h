#pragma once

// ML::IRenderableSource: everything the module renders is reached through
// this interface. Media adaptors wrap back-end video sources, the cutlist
// source wraps a sequence, and every frame filter wraps another renderable
// source, so any chain of an adaptor and filters is itself a source.
//
// Sources are immutable after creation and shared between threads without
// locks: the render queue's workers, the prefetch paths and callers may call
// any operation concurrently. Failures of RenderFrame are thrown
// (ML::RenderRequestException with a status, or the foundation's
// exceptions); the other operations do not fail.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodePrefetch.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/FrameRate.h"

namespace ML
{

class IRenderableSource : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{30b624ba-3de0-4757-a17e-e5a00f8a5c46}");

    // The frame time the source will really deliver for inRequested. Filters
    // pass inParams on; the media adaptors ignore it.
    virtual void ConformFrameTime(const MF::FrameTime& inRequested,
                                  const CutlistRenderParams& inParams,
                                  MF::FrameTime& outConformed) = 0;

    // Starts the prefetches that rendering inTime with inParams needs and
    // appends one handle per prefetch started (nothing when none is needed).
    virtual void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                                   RenderableNodePrefetchList& ioPrefetches) = 0;

    // Renders the frame. outFrame is emptied first; failures are thrown.
    virtual void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) = 0;

    // The source's frame rate.
    virtual void GetFrameRate(mvxmediatypes::FrameRate& outRate) = 0;

    // The source's field rate: the frame rate doubled when the source is
    // interlaced, else the frame rate.
    virtual void GetFieldRate(mvxmediatypes::FrameRate& outRate) = 0;

protected:
    ~IRenderableSource() = default;
};

} // namespace ML
