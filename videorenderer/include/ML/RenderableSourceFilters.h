#pragma once

// Frame filters: renderable sources stacked on another renderable source
// that change how its fields are delivered, scale it to the requested size and
// pixel aspect ratio, re-time it, or remove film pulldown.
//
// Each creation function holds a reference to inSource for the filter's life
// and answers the filter through ML::IRenderableSource (empty when the
// interface query fails). Filters are immutable after creation, hold no lock
// and may be used from any number of render and prefetch threads at once. An
// empty inSource is accepted here and raises QRT::NullInterfaceException at
// the filter's first use. Upstream failures pass through unchanged.

#include "MF/TimeTransform.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/Pulldown.h"

namespace ML
{

// Progressive frames made from one field of each upstream frame: the field
// that lies at the requested time.
QRT::InterfaceRef<IRenderableSource>
DeinterlaceSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Renders upstream at the swapped frame time and exchanges the frame's two
// fields, so that the picture's field order is reversed.
QRT::InterfaceRef<IRenderableSource>
FieldReverseSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Swaps the two times of every frame time passed upstream and leaves the
// pixels alone: the source's field dominance is reversed.
QRT::InterfaceRef<IRenderableSource>
ReverseFieldDominanceOfSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Interlaced frames whose fields come from two consecutive upstream frames:
// the output field at time f is taken from the upstream frame at time 2f.
QRT::InterfaceRef<IRenderableSource>
InterlaceConsecutiveFramesFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Progressive frames filtered vertically (rows weighted 1, 2, 1) against
// interlace flicker.
QRT::InterfaceRef<IRenderableSource>
RemoveFlickerFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Delivers the upstream frame at exactly the requested size and pixel aspect
// ratio, scaling interlaced material field by field.
QRT::InterfaceRef<IRenderableSource>
ScaleAndPARCorrectSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Frame blending: each output field is a weighted sum of the upstream fields
// around or inside the media time it covers. inRate is the playback rate that
// sizes the media span of an output field; inTimeTransform is held for the
// filter's life. At a low quality, or when nothing needs blending, the filter
// answers as TimeMixSource.
QRT::InterfaceRef<IRenderableSource>
TimeBlendSource(const QRT::InterfaceRef<IRenderableSource>& inSource,
                const QRT::InterfaceRef<MF::ITimeTransform>& inTimeTransform, const double& inRate);

// Builds each output field from the nearest earlier upstream field, mixing
// fields of different upstream frames into one frame without blending pixels.
QRT::InterfaceRef<IRenderableSource>
TimeMixSource(const QRT::InterfaceRef<IRenderableSource>& inSource);

// Turns material that carries 2:3 pulldown in inCadence back into progressive
// film frames at four fifths of the upstream frame rate.
QRT::InterfaceRef<IRenderableSource>
RemovePulldownFromSource(const QRT::InterfaceRef<IRenderableSource>& inSource,
                         mvxmediatypes::PulldownCadence inCadence);

} // namespace ML
