#pragma once

// ML::IMutableCutlist: the building side of the module's renderable cutlist.
//
// The cutlist factory creates a cutlist with CreateMutableCutlist, adds its
// segments with AddSegment on one thread and seals it with MakeImmutable.
// Sealing sorts the segments by start, trims overlaps (a segment that starts
// inside its predecessor starts at the predecessor's end, its offset moved by
// the same amount), merges continuous segments of one node tree, fixes the
// cutlist hash and computes the still ranges. Sealed, the cutlist is
// immutable and may be read from any number of threads without locks; it
// also answers MF::IRenderableExtendedStillInfo and MF::ISmartRenderSegmentInfo.
//
// The cutlist owns its node trees: one reference per distinct node hash.

#include "MF/RenderableCutlist.h"
#include "MF/RenderableNode.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/TickTime.h"

namespace ML
{

class IMutableCutlist : public MF::IRenderableCutlist
{
public:
    QRT_INTERFACE_ID("{57729015-90f9-43f8-ab91-4f9ac0b1809f}");
    QRT_INTERFACE_PARENT(MF::IRenderableCutlist);

    // Maps [inStart, inEnd) of sequence time onto inNode, whose time at inStart
    // is inOffset. Ignored unless inEnd is after inStart. An empty inNode
    // throws QRT::NullInterfaceException. Input contract "mMutable".
    virtual void AddSegment(mvxmediatypes::TickTime inStart, mvxmediatypes::TickTime inEnd,
                            mvxmediatypes::TickTime inOffset,
                            const QRT::InterfaceRef<MF::IRenderableNode>& inNode) = 0;

    // Seals the cutlist. Input contract "mMutable".
    virtual void MakeImmutable() = 0;

protected:
    ~IMutableCutlist() = default;
};

// A new, empty, mutable cutlist named inName.
QRT::InterfaceRef<IMutableCutlist> CreateMutableCutlist(const QRT::ImmutableString& inName);

} // namespace ML
