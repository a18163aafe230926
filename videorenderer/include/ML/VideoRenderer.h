#pragma once

// The module's outer frame: start-up and shutdown, the request-identifier
// counter, the current accelerated sequence renderer, and the two entry
// points that render one frame of any renderable source asynchronously.
//
// Initialize and Shutdown are counted and serialised on the module lock: only
// the first Initialize brings the module up and only the matching last
// Shutdown takes it down. Every other function may be called from any thread.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "mvxcore/utility/Guid.h"

#include <boost/function.hpp>

namespace ML
{

class VideoRenderer
{
public:
    // Brings the module up on the first call; counts every call. Returns 0.
    static int Initialize();
    // Takes the module down on the call that balances the first Initialize.
    // Returns 0.
    static int Shutdown();
    // Registers the accelerated renderer module factory (each call registers
    // a new one).
    static void EnableAcceleratedRendering();
};

// The accelerated sequence renderer that plug-in renderers ask for; nil
// until set. Guarded by its own lock; any thread.
void SetCurrentAcceleratedSequenceRendererID(mvxcore::utility::Guid inID);
mvxcore::utility::Guid GetCurrentAcceleratedSequenceRendererID();

// A new request identifier: 2 first, then 3, ...; lock-free. Never 0 (the
// counter skips 0 when it wraps), since 0 means "no request" to plug-ins.
unsigned int GetNextRequestID();

// Called once per InitiateRender with the rendered frame (empty when the
// request failed or was cancelled), the request identifier, the source, the
// cancelled flag and the status.
using InitiateRenderCallback =
    boost::function<void(QRT::InterfaceRef<MF::IVideoFrame>, unsigned int,
                         QRT::InterfaceRef<IRenderableSource>, bool, int)>;

// Renders one frame of inSource asynchronously: collects the source's
// prefetches for inFrameTime, queues a prefetch-only request, and when the
// prefetches are done renders the source on the delivering thread and calls
// inCallback. The render uses the frame time held by inParams (its leading
// MF::FrameTime), so callers set it to inFrameTime.
// An empty source does nothing and never calls back.
void InitiateRender(QRT::InterfaceRef<IRenderableSource> inSource, const MF::FrameTime& inFrameTime,
                    const CutlistRenderParams& inParams, unsigned int inRequestID,
                    const InitiateRenderCallback& inCallback);

// Cancels the request with that identifier; an unknown identifier is ignored.
void CancelRender(unsigned int inRequestID);

} // namespace ML
