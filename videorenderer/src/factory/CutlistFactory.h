#pragma once

// The module's cutlist factory (MF::IRenderableCutlistFactory): every
// renderable cutlist of the host is built by it. The module creates one at
// start-up and publishes it with MF::SetCutlistFactory; the last shutdown
// withdraws it.
//
// A sequence or track group becomes one segment per maximal interval over
// which its set of active items does not change (factory/SegmentSweep.h).
// Each segment's tree is a compositor over one clip subtree per active item,
// bottom track first; each clip is a clip node over its media node. Where a
// transition covers a cut (factory/TransitionPlacement.h), the track's layer
// is a transition node over the outgoing and the incoming clip. Nodes
// are sealed bottom-up, so every hash is computed once, and each item's
// subtree is built once per call however many segments it spans. A tree's
// time is sequence time less its origin, the earliest start among the
// segment's items, so that a tree depends on where its items lie relative to
// each other and not on where they lie in the sequence: moving a lone clip
// in time keeps its frames' hashes, and with them its cached frames.
//
// The factory keeps no state: operations may run on several threads at once.

#include "MF/RenderableCutlistFactory.h"
#include "QRT/InterfaceRef.h"

namespace ML
{

QRT::InterfaceRef<MF::IRenderableCutlistFactory> CreateCutlistFactory();

} // namespace ML
