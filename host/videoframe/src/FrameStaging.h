#pragma once

// Staging of frames for the image renderer (private to the video frame
// library). The image renderer addresses 8-bit and 32-bit float BGRA, 8-bit
// VUYA and interleaved 8-bit YUYV. The other raster formats of the catalogue
// are worked on through a copy in one of those formats:
//   BGRA_4444_16u, BGRA_4444_16f  <-> BGRA 32f straight (exact for 16f,
//                                     within 1/65535 for 16u)
//   VUYA_4444_32f                 <-> BGRA 32f straight, through the Y'CbCr
//                                     matrix (see kVUYAFloat below)
//   YUYV_422_8u_Fields,
//   YUYV_422_8u_HalfWidthFields   <-> interleaved YUYV (rows reordered; the
//                                     half-width format's picture is twice
//                                     its stored width)
// Staging memory comes from the image renderer's transient pool, so
// steady-state work touches no fresh pages. A StagedImage belongs to the one
// thread that made it.

#include "IR/ImageRenderer.h"
#include "MF/IVideoFrame.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstddef>
#include <cstdint>

namespace VF::detail
{

// Float Y'CbCr (VUYA_4444_32f): Y' 0..1 full range, Cb and Cr -0.5..0.5,
// alpha 0..1 straight; BT.709 for pictures of 720 rows or more, BT.601 below
// (the image renderer's rule for 8-bit Y'CbCr).
inline constexpr int32_t kMatrix709MinimumRows = 720;

enum class StagingKind
{
    kDirect,      // the frame's memory is an IR buffer
    kSixteenBit,  // 16-bit unsigned or half float BGRA
    kVUYAFloat,   // 32-bit float Y'CbCr with alpha
    kFieldsApart, // 8-bit YUYV with the fields stored one after the other
    kUnsupported, // nothing the image renderer can be given
};

struct StagingPlan
{
    StagingKind mKind = StagingKind::kUnsupported;
    IR_PixelFormat mFormat = 0; // the IR format worked in
    int32_t mWidth = 0;         // picture width (twice the stored width for pixel pairs)
    int32_t mHeight = 0;
};

StagingPlan GetStagingPlan(mvxmediatypes::PixelFormat inFormat, int32_t inWidth, int32_t inHeight);

// The memory row that holds picture row inRow of a single-plane frame of
// inHeight rows (differs from inRow only for formats whose fields are stored
// apart).
int32_t MemoryRowOfPictureRow(mvxmediatypes::PixelFormat inFormat, int32_t inHeight, int32_t inRow);

// Bytes of one row of pixels of a single-plane frame (without padding);
// 0 for formats that are not one plane of fixed-size samples.
size_t ActiveRowBytes(mvxmediatypes::PixelFormat inFormat, int32_t inWidth);

// Half float <-> float, rounding to nearest even.
float HalfToFloat(uint16_t inHalf);
uint16_t FloatToHalf(float inValue);

// A frame's pixels as an IR buffer: the frame's own memory when its format is
// direct, else a staging copy. Opened for writing, Commit writes a staging
// copy back into the frame (a direct buffer needs no commit).
class StagedImage
{
public:
    StagedImage() = default;
    ~StagedImage();
    StagedImage(const StagedImage&) = delete;
    StagedImage& operator=(const StagedImage&) = delete;

    // kResult_UnsupportedPixelFormat when the format cannot be staged,
    // kIR_OutOfMemory when staging memory is short.
    QRT::Result OpenForReading(const MF::IVideoFrame& inFrame);
    // inKeepContent: the staging copy starts with the frame's pixels (needed
    // when only part of it will be written). Input contract: frame not shared.
    QRT::Result OpenForWriting(MF::IVideoFrame& inFrame, bool inKeepContent);
    void Commit();

    const void* GetBase() const { return mBase; }
    void* GetWritableBase() const { return mBase; }
    int32_t GetRowBytes() const { return mRowBytes; }
    IR_PixelFormat GetFormat() const { return mPlan.mFormat; }
    int32_t GetWidth() const { return mPlan.mWidth; }
    int32_t GetHeight() const { return mPlan.mHeight; }
    bool IsStaged() const { return mBlock != nullptr; }

private:
    QRT::Result Open(const MF::IVideoFrame& inFrame, bool inUnpack);

    StagingPlan mPlan;
    MF::IVideoFrame* mWriteFrame = nullptr;
    void* mBlock = nullptr;
    void* mBase = nullptr;
    int32_t mRowBytes = 0;
};

} // namespace VF::detail
