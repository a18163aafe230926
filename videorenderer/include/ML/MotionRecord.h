#pragma once

// ML::MotionRecord: how one layer is drawn onto the layers below it: its
// geometry (anchor, position, scale, rotation), blend mode and opacity. A
// 72-byte value passed between producers and hashed byte for byte into
// compositor frame hashes, so its layout is fixed: the field order and
// offsets below never change, and every padding-free byte is a field.
//
// Geometry is in frame-relative units: the anchor is a point of the layer's
// own frame, the position a point of the destination frame, (0.5, 0.5) the
// centre of either. Around the anchor the layer is scaled (1.0 is its own
// pixel size) and rotated (degrees, clockwise on screen); the anchor lands on
// the position. This is IR_MotionGeometry of the image renderer.

#include "IR/ImageRenderer.h"

#include <cstddef>
#include <cstdint>

namespace ML
{

struct MotionRecord
{
    float mAnchorX = 0.5f;
    float mAnchorY = 0.5f;
    float mPositionX = 0.5f;
    float mPositionY = 0.5f;
    float mScaleX = 1.0f;
    float mScaleY = 1.0f;
    double mRotation = 0.0;
    // Reserved: carried, hashed and compared as geometry, never drawn.
    float mReserved1 = 1.0f;
    // Reserved: carried and hashed, not compared.
    std::uint32_t mReserved2 = 0;
    // Reserved: carried, hashed and compared as geometry, never drawn.
    double mReserved3 = 0.0;
    // The pixel aspect ratio of the layer's media as a number (0 when the
    // layer is not a media); hashed, not compared.
    float mMediaPixelAspect = 0.0f;
    // The layer's media frame size when the layer is moved (0 otherwise);
    // compared as geometry.
    std::uint32_t mMediaWidth = 0;
    std::uint32_t mMediaHeight = 0;
    // Reserved: carried and hashed, not compared.
    std::uint32_t mReserved4 = 0;
    // IR_BlendMode; kIR_BlendMode_Normal (18) is the plain over.
    std::uint32_t mBlendMode = kIR_BlendMode_Normal;
    // 0 to 1.
    float mOpacity = 1.0f;
};

static_assert(sizeof(MotionRecord) == 72, "the motion record crosses producer boundaries");
static_assert(offsetof(MotionRecord, mRotation) == 24 && offsetof(MotionRecord, mReserved3) == 40 &&
                  offsetof(MotionRecord, mMediaWidth) == 52 &&
                  offsetof(MotionRecord, mBlendMode) == 64 &&
                  offsetof(MotionRecord, mOpacity) == 68,
              "the motion record's layout is fixed");

// The identity: every field at its default.
inline constexpr MotionRecord kIdentityMotionRecord{};

// Equal for compositing: the same anchor, position, scale, rotation, the
// reserved geometry values and media size.
bool SameGeometry(const MotionRecord& inA, const MotionRecord& inB);
// SameGeometry, and the same blend mode and opacity: the two fields of a
// frame drawn with these records need no separate passes.
bool SameMotion(const MotionRecord& inA, const MotionRecord& inB);

// The record's geometry as the image renderer takes it.
IR_MotionGeometry ToMotionGeometry(const MotionRecord& inRecord);

} // namespace ML
