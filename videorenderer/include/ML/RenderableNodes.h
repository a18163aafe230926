#pragma once

// Creation of the node kinds that need no host object: the solid-colour node
// (a frame filled with one colour) and the disabled node (a subtree that takes
// part in its parent's hash and flags but renders nothing).
//
// Each function answers a sealed node, ready to be an input of another node
// or a segment of a cutlist; any thread may call them.

#include "MF/RenderableNode.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace ML
{

// The property that holds a solid-colour node's colour (0xAARRGGBB, straight
// alpha) as unsigned decimal text; hashed.
inline constexpr char kSolidColorNodeColorKey[] = "SolidColorNode::Color";

// A sealed solid-colour node ("RenderableNodeSolidColorImpl") of inColor
// (0xAARRGGBB). It answers ML::IRenderableNodeProducerProvider.
QRT::InterfaceRef<MF::IRenderableNode> CreateSolidColorNode(std::uint32_t inColor);

// A sealed disabled node ("RenderableNodeDisabledImpl") over inInput, which
// starts at inOffset in the disabled node's time. Its render flags are
// inInput's; it hands out no producer. An empty inInput throws
// QRT::NullInterfaceException.
QRT::InterfaceRef<MF::IRenderableNode>
CreateDisabledNode(const QRT::InterfaceRef<MF::IRenderableNode>& inInput,
                   mvxmediatypes::TickTime inOffset);

} // namespace ML
