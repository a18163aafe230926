#pragma once

// The merge of two sealed cutlists into a new one: the segments of inWinner
// are taken whole, and inFiller's segments fill the time inWinner leaves
// uncovered, each piece's offset moved by the time trimmed from its start so
// that every sequence time keeps its node time. Nodes are taken over by
// hash. Answers the sealed result named inName. Any thread.

#include "MF/RenderableCutlist.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"

namespace ML
{

QRT::InterfaceRef<MF::IRenderableCutlist> MergeCutlists(const MF::IRenderableCutlist& inWinner,
                                                        const MF::IRenderableCutlist& inFiller,
                                                        const QRT::ImmutableString& inName);

} // namespace ML
