#pragma once

// `vrender info`: a cutlist printed in a readable, indented form.
//
// DescribeCutlist walks a sealed cutlist through its read interfaces
// (MF::IRenderableCutlist, MF::IRenderableNode) and answers the text: its
// name and hash, one line per segment (times, offset, node hash), then each
// distinct node tree once, every node with its type, render flags,
// properties (colours as 0xAARRGGBB, other values quoted), inputs and operators, children indented
// under their parent. Sealed cutlists are immutable, so any thread may call it.
//
// DescribeSequence prints a sequence of the back end (`vrender info
// TIMELINE`): its settings, each track with its items and their times, then
// the media the items play with their streams, then each nested sequence the
// same way. Sequences are immutable, so any thread may call it too.

#include "BE/SequenceInterfaces.h"
#include "MF/RenderableCutlist.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string>

namespace vrender
{

// The built-in example: three segments of two seconds each, over a red
// solid-colour node, a disabled node over a green one, and a blue one
// entered one second in.
QRT::InterfaceRef<MF::IRenderableCutlist> CreateExampleCutlist();

std::string DescribeCutlist(const MF::IRenderableCutlist& inCutlist);

std::string DescribeSequence(const QRT::InterfaceRef<BE::ISequence>& inSequence);

// "1.500 s"; "start" and "end" for kTime_Min and kTime_Max.
std::string FormatTime(mvxmediatypes::TickTime inTime);

// "0xFFFF3366": a 32-bit ARGB colour, alpha in the top byte (opaque pink).
std::string FormatColor(std::uint32_t inColor);

// "0x00000059 (Opaque, TimeInvariant, 16, NoLayerInputs)": the value, then
// the set bits, by name where they have one, else by value.
std::string FormatRenderFlags(std::uint32_t inFlags);

} // namespace vrender
