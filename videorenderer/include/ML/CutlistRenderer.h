#pragma once

// ML::CutlistRenderer: renders one frame of a cutlist through the producers
// of its node tree, with the frame-level policy around that: the shared frame
// cache keyed by frame hashes, the black frame where the cutlist has nothing,
// conforming results to the requested output, and collecting the prefetches
// of a cutlist frame.
//
// Stateless: every function may be called from any number of threads at
// once (render workers, the render queue's housekeeping thread). The shared
// frame cache is the video frame library's and safe for concurrent use.
// Producers are made per call and not shared.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "MF/RenderableCutlist.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableNodeProducer.h"
#include "QRT/Guid.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelFormat.h"

#include <vector>

namespace ML
{

// The text mixed first into the hash of a black frame.
inline constexpr char kBlackFrameHashPrefix[] = "BlackVideoFrame from RenderFrameFromCutlist";

class CutlistRenderer
{
public:
    // The producer of the node at the parameters' frame time and that time in
    // the node's own time. outProducer is empty when no node covers the time
    // or the node makes no producers. Answers the lookup's negative status, or
    // 0. Throws QRT::NullInterfaceException for an empty cutlist.
    static QRT::Result
    GetProducerForCutlist(const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist,
                          const CutlistRenderParams& inParams,
                          QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                          MF::FrameTime& outLocalFrameTime);

    // The frame of inProducer at inLocalFrameTime, from the shared cache when
    // its hash is cached, else produced; conformed to the output. Empty when
    // the producer fails. With inInsertIntoCache the conformed frame is cached
    // under the producer's hash at the parameters' cache priority. Without a
    // producer: the black frame.
    static QRT::InterfaceRef<MF::IVideoFrame> RenderFrameFromCutlist(
        const QRT::InterfaceRef<IRenderableNodeProducer>& inProducer,
        const CutlistRenderParams& inParams, const MF::FrameTime& inLocalFrameTime,
        const std::vector<mvxmediatypes::PixelFormat>& inAcceptableFormats, bool inInsertIntoCache);

    // The black frame of the parameters' size, ratio and format, made once
    // and then shared through the cache. Empty when it cannot be made.
    static QRT::InterfaceRef<MF::IVideoFrame> GetBlackFrame(const CutlistRenderParams& inParams);
    // The cache key of that black frame.
    static QRT::Guid GetBlackFrameHash(const CutlistRenderParams& inParams);

    // The frame hash of the cutlist at the parameters' frame time: the
    // producer's hash, or the black-frame hash where there is no producer.
    // Answers the lookup's negative status, or 0.
    static QRT::Result
    GetCutlistFrameHash(QRT::Guid& outHash,
                        const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist,
                        const CutlistRenderParams& inParams);

    // inFrame itself when it is already in the format chosen for it, else a
    // converted copy (of the requested size when UseRequestedSize holds). The
    // unconverted frame when the copy cannot be made.
    static QRT::InterfaceRef<MF::IVideoFrame>
    ConformFrameToOutput(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                         const CutlistRenderParams& inParams,
                         mvxmediatypes::PixelFormat inPreferredFormat,
                         const std::vector<mvxmediatypes::PixelFormat>& inAcceptableFormats);

    // True when inFrame may be delivered for the parameters as it is (field
    // type, origin offset, pixel aspect ratio, bounds).
    static bool FrameAlreadyConformsToOutput(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                                             const CutlistRenderParams& inParams);

    // True when inFrame is a full-frame rendering that should be conformed to
    // the requested size rather than kept at its own.
    static bool UseRequestedSize(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                                 const CutlistRenderParams& inParams);

    // Appends the prefetch handles of the node at the parameters' frame time
    // (not started). Answers the lookup's negative status, or 0.
    static QRT::Result
    CollectCutlistPrefetches(const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist,
                             const CutlistRenderParams& inParams,
                             RenderableNodePrefetchList& ioPrefetches);
};

} // namespace ML
