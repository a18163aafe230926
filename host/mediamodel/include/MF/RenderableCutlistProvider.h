#pragma once

// MF::IRenderableCutlistProvider: an object (a sequence, a stream of a
// sequence) that hands out renderable cutlists of itself, and
// MF::IRenderableCutlistProviderProperties, the provider's description of
// the picture it renders.
//
// A provider may be asked from any thread; every getter answers a sealed,
// immutable cutlist (or an empty reference when none can be built), which
// the caller may keep and share.

#include "MF/RenderableCutlist.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"

#include <cstdint>

namespace MF
{

class IRenderableCutlistProvider : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{0d42bf86-6937-4917-9342-b55da56a0cc8}");

    // The three getters take the name the cutlist is to carry and a flag that
    // renderers pass as true. Each answers a sealed cutlist or an empty
    // reference.

    // The main cutlist.
    virtual QRT::InterfaceRef<IRenderableCutlist> GetMainCutlist(const QRT::ImmutableString& inName,
                                                                 bool inFlag) = 0;

    // The alternate cutlist.
    virtual QRT::InterfaceRef<IRenderableCutlist>
    GetAlternateCutlist(const QRT::ImmutableString& inName, bool inFlag) = 0;

    // The third cutlist (the choice used when neither the main nor the
    // alternate cutlist is asked for).
    virtual QRT::InterfaceRef<IRenderableCutlist>
    GetThirdCutlist(const QRT::ImmutableString& inName, bool inFlag) = 0;

protected:
    ~IRenderableCutlistProvider() = default;
};

// The picture a cutlist provider renders: frame bounds, pixel aspect ratio,
// field type and frame rate. Queried from the provider by its identifier.
class IRenderableCutlistProviderProperties : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{dd0d9eea-2665-4332-af1b-8c9e56ece56d}");

    // The sequence bounds; width is right minus left, height bottom minus top.
    virtual void GetBounds(std::int32_t& outLeft, std::int32_t& outTop, std::int32_t& outRight,
                           std::int32_t& outBottom) const = 0;

    virtual mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const = 0;

    virtual mvxmediatypes::FieldType GetFieldType() const = 0;

    virtual mvxmediatypes::FrameRate GetFrameRate() const = 0;

protected:
    ~IRenderableCutlistProviderProperties() = default;
};

} // namespace MF
