#pragma once

// MF::IRenderableCutlistFactory: the builder of every renderable cutlist of
// the host, and its process-wide publication.
//
// The renderer module creates one factory at start-up and publishes it with
// SetCutlistFactory; cutlist providers find it with GetCutlistFactory. The
// operations take host objects through their root interface and ask them for
// the host interface they need; an object that does not answer it yields an
// empty cutlist and QRT::kResult_NotFound. Operations may run on several
// threads at once; each answers a sealed cutlist that nobody else holds yet.

#include "MF/RenderableCutlist.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"

#include <vector>

namespace MF
{

using HostObjectRef = QRT::InterfaceRef<QRT::QRTUnknown>;
using RenderableCutlistRef = QRT::InterfaceRef<IRenderableCutlist>;

class IRenderableCutlistFactory : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{38a8d1b6-1bb9-4a1e-a071-911005b622cd}");

    // 1. The whole sequence over [kTime_Min, kTime_Max].
    virtual QRT::Result CreateSequenceCutlist(const HostObjectRef& inSequence,
                                              const QRT::ImmutableString& inName,
                                              RenderableCutlistRef& outCutlist) = 0;

    // 2. The sequence restricted to inRanges.
    virtual QRT::Result CreateSequenceCutlistForRanges(const HostObjectRef& inSequence,
                                                       const TickTimeRangeList& inRanges,
                                                       const QRT::ImmutableString& inName,
                                                       RenderableCutlistRef& outCutlist) = 0;

    // 3. A group of tracks over [kTime_Min, kTime_Max].
    virtual QRT::Result CreateTrackGroupCutlist(const HostObjectRef& inTrackGroup,
                                                const QRT::ImmutableString& inName,
                                                RenderableCutlistRef& outCutlist) = 0;

    // 4. A group of tracks restricted to inRanges.
    virtual QRT::Result CreateTrackGroupCutlistForRanges(const HostObjectRef& inTrackGroup,
                                                         const TickTimeRangeList& inRanges,
                                                         const QRT::ImmutableString& inName,
                                                         RenderableCutlistRef& outCutlist) = 0;

    // 5. One clip over its track item.
    virtual QRT::Result CreateTrackItemCutlist(const HostObjectRef& inTrackItem,
                                               RenderableCutlistRef& outCutlist) = 0;

    // 6. One media: a single segment from time zero to its duration
    //    (to kTime_Max for a still).
    virtual QRT::Result CreateMediaCutlist(const HostObjectRef& inMedia,
                                           RenderableCutlistRef& outCutlist) = 0;

    // 7. One preview node.
    virtual QRT::Result CreatePreviewCutlist(const HostObjectRef& inPreview,
                                             RenderableCutlistRef& outCutlist) = 0;

    // 8. One preview node of the second kind of preview source.
    virtual QRT::Result CreatePreviewSourceCutlist(const HostObjectRef& inPreviewSource,
                                                   RenderableCutlistRef& outCutlist) = 0;

    // 9. A cutlist assembled from inCutlists; earlier cutlists win where
    //    their segments overlap later ones.
    virtual QRT::Result CreateMergedCutlist(const std::vector<RenderableCutlistRef>& inCutlists,
                                            const QRT::ImmutableString& inName,
                                            RenderableCutlistRef& outCutlist) = 0;

    // 10. The sequence's cutlist with inExtra applied.
    virtual QRT::Result CreateSequenceCutlistWithObject(const HostObjectRef& inExtra,
                                                        const HostObjectRef& inSequence,
                                                        const QRT::ImmutableString& inName,
                                                        RenderableCutlistRef& outCutlist) = 0;

protected:
    ~IRenderableCutlistFactory() = default;
};

// Publishes inFactory as the process's cutlist factory, replacing (and
// releasing) the one published before; an empty reference withdraws it.
// Thread-safe; the previous factory is released outside the publication lock,
// so its destruction may itself call GetCutlistFactory.
void SetCutlistFactory(const QRT::InterfaceRef<IRenderableCutlistFactory>& inFactory);

// The factory published last (a new reference), or an empty reference.
// Thread-safe; a caller keeps the factory it got alive even when another
// thread replaces it meanwhile.
QRT::InterfaceRef<IRenderableCutlistFactory> GetCutlistFactory();

} // namespace MF
