#pragma once

// Render flags: the bit set every renderable node computes once, when it is
// sealed (RenderableNodeCommonImpl::ComputeRenderFlags), and that others read
// with MF::IRenderableNode::GetRenderFlags.
//
// How each kind derives its flags:
//   common default, multicam, solid colour   0
//   media                                     84, plus 8 for a still, plus 1 when opaque
//   compositor, adjustment                    AND of all inputs' flags with 92 (92 without inputs)
//   transition                                AND of the non-empty inputs' flags with 68
//                                             (68 without inputs)
//   disabled                                  the first input's flags (0 without inputs)
//   effect                                    4, plus 8 unless time-variant, plus 64 unless
//                                             it has layer inputs
//   clip                                      the input's flags, with 4, 8 and 64 kept only
//                                             when every operator has them, and 1 cleared
//                                             when there is any operator
//
// Plain constants; usable from any thread.

#include <cstdint>

namespace ML
{

// The node's frames have no transparency.
inline constexpr std::uint32_t kRenderFlag_Opaque = 1;
// Carried through compositors, transitions and clips; with kRenderFlag_TimeInvariant it
// makes a whole cutlist segment a still range.
inline constexpr std::uint32_t kRenderFlag_4 = 4;
// The node's frames do not change with time.
inline constexpr std::uint32_t kRenderFlag_TimeInvariant = 8;
// Set by media nodes; the cutlist factory treats an input with it as unbounded in time.
inline constexpr std::uint32_t kRenderFlag_16 = 16;
// The node reads no other layer.
inline constexpr std::uint32_t kRenderFlag_NoLayerInputs = 64;
// Set by a clip whose picture depends on more than its input's frame at the mapped time.
inline constexpr std::uint32_t kRenderFlag_128 = 128;

// The bits a compositor keeps from its inputs (64 + 16 + 8 + 4).
inline constexpr std::uint32_t kRenderFlagMask_Compositor =
    kRenderFlag_NoLayerInputs | kRenderFlag_16 | kRenderFlag_TimeInvariant | kRenderFlag_4;
// The bits a transition keeps from its inputs (64 + 4).
inline constexpr std::uint32_t kRenderFlagMask_Transition =
    kRenderFlag_NoLayerInputs | kRenderFlag_4;
// The bits a clip keeps only when all of its operators carry them (64 + 8 + 4).
inline constexpr std::uint32_t kRenderFlagMask_Operators =
    kRenderFlag_NoLayerInputs | kRenderFlag_TimeInvariant | kRenderFlag_4;
// A media node's fixed bits (64 + 16 + 4).
inline constexpr std::uint32_t kRenderFlags_Media =
    kRenderFlag_NoLayerInputs | kRenderFlag_16 | kRenderFlag_4;

} // namespace ML
