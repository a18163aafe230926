#pragma once

// The cutlist source: a sequence as a renderable source, so that it can be
// rendered through InitiateRender and wrapped by the frame filters like any
// media source.

#include "MF/RenderableCutlistProvider.h"
#include "ML/IRenderableSource.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/FrameRate.h"

namespace ML
{

// A renderable source over inProvider's main and alternate cutlists (fetched
// once, now, under inName) at inFrameRate, with the field type the provider's
// properties report (progressive when it has none). Frames are rendered by
// the cutlist renderer; the render parameters' cutlist choice bit picks the
// alternate cutlist. An empty provider throws QRT::NullInterfaceException.
QRT::InterfaceRef<IRenderableSource>
CreateRenderableCutlistSource(const QRT::InterfaceRef<MF::IRenderableCutlistProvider>& inProvider,
                              const mvxmediatypes::FrameRate& inFrameRate,
                              const QRT::ImmutableString& inName);

} // namespace ML
