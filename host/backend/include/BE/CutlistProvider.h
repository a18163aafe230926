#pragma once

// BE::ICutlistProvider: the host's cutlist provider. It stands for a sequence
// towards the renderer: it hands out the sequence's main, alternate and third
// cutlists and describes the picture they render (bounds, pixel aspect ratio,
// field type, frame rate) through MF::IRenderableCutlistProviderProperties.
//
// The host builds and seals the cutlists and registers them under a name;
// the getters answer the cutlists registered under the name asked for, or,
// when nothing is registered under it, those registered under the empty name
// (the provider's default set). Owned through InterfaceRef by the host and by
// every renderable source made from it. Every operation may be called from
// any thread at once: readers share a lock, setters take it alone, and a
// getter answers either the old or the new value of a concurrent setter,
// never a mix.

#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"

#include <cstdint>

namespace BE
{

// The picture a provider describes.
struct CutlistProviderSettings
{
    // Sequence bounds; right is not before left, bottom not before top.
    std::int32_t mLeft = 0;
    std::int32_t mTop = 0;
    std::int32_t mRight = 0;
    std::int32_t mBottom = 0;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    // Progressive, upper first, lower first, unknown or as source.
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Zero;
};

// The three cutlists registered under one name; any of them may be empty.
struct CutlistSet
{
    QRT::InterfaceRef<MF::IRenderableCutlist> mMain;
    QRT::InterfaceRef<MF::IRenderableCutlist> mAlternate;
    QRT::InterfaceRef<MF::IRenderableCutlist> mThird;
};

class ICutlistProvider : public MF::IRenderableCutlistProvider
{
public:
    QRT_INTERFACE_ID("{73342b1b-0db9-47ce-a4ee-a0254d497e66}");
    QRT_INTERFACE_PARENT(MF::IRenderableCutlistProvider);

    // Replaces the description. Input contracts: right >= left, bottom >= top,
    // a field type from progressive to as source, a valid pixel aspect ratio.
    // A rejected description leaves the old one in place.
    virtual void SetSettings(const CutlistProviderSettings& inSettings) = 0;
    virtual CutlistProviderSettings GetSettings() const = 0;

    // Registers (or replaces) the cutlists answered for inName. The cutlists
    // must be sealed: the provider hands them out as they are.
    virtual void SetCutlists(const QRT::ImmutableString& inName, const CutlistSet& inCutlists) = 0;
    // Forgets the cutlists of inName; an unknown name is ignored.
    virtual void RemoveCutlists(const QRT::ImmutableString& inName) = 0;

protected:
    ~ICutlistProvider() = default;
};

// A provider with inSettings and no cutlists (input contracts as SetSettings).
QRT::InterfaceRef<ICutlistProvider>
CreateCutlistProvider(const CutlistProviderSettings& inSettings);

} // namespace BE
