#pragma once

// Format descriptions, transfer functions and the float row pipeline shared by
// the image renderer's operations. Every operation describes its formats once
// per call, then works row by row through RowReader / RowWriter (general path)
// or through a fast kernel chosen once for the call (Kernels.h).

#include "IR/ImageRenderer.h"

#include <cstddef>
#include <cstdint>

namespace IR
{

enum class Layout
{
    kBGRA,
    kVUYA,
    kYUYV,
    kYUV420,
};

enum class Alpha
{
    kNone,
    kStraight,
    kPremultiplied,
};

struct FormatInfo
{
    Layout layout = Layout::kBGRA;
    bool isFloat = false;
    bool linear = false;
    Alpha alpha = Alpha::kNone;
    bool bottomLeft = false;
    // Bytes per pixel of interleaved layouts (YUYV: 2; 4:2:0: 1 for the luma plane).
    int bytesPerPixel = 4;
};

// Describes a format word; false when it is not a valid format.
bool DescribeFormat(IR_PixelFormat inFormat, FormatInfo& outInfo);
// Whether a YUV format of this height uses BT.601 (else BT.709).
bool UsesBT601(IR_PixelFormat inFormat, std::int32_t inHeight);

// A buffer seen top row first: for bottom-left formats the base moves to the last
// row in memory and the row step becomes negative.
struct View
{
    std::uint8_t* base = nullptr;
    std::ptrdiff_t step = 0;

    std::uint8_t* Row(std::int32_t inY) const { return base + inY * step; }
};

View MakeView(const void* inBase, std::int32_t inRowBytes, const FormatInfo& inInfo,
              std::int32_t inHeight);

// The sRGB transfer (IEC 61966-2-1), through interpolated tables inside 0..1 and
// the exact formula outside.
float ToLinear(float inEncoded);
float ToEncoded(float inLinear);
// 8-bit code to linear light.
const float* ToLinearTable8();
// Linear light to the nearest 8-bit code: index round(linear * 65535).
const std::uint8_t* ToEncoded8Table();

// Transient scratch memory owned by one call.
class ScratchBlock
{
public:
    explicit ScratchBlock(std::size_t inBytes);
    ~ScratchBlock();
    ScratchBlock(const ScratchBlock&) = delete;
    ScratchBlock& operator=(const ScratchBlock&) = delete;

    bool Valid() const { return mBlock != nullptr; }
    float* Floats() const { return static_cast<float*>(mBlock); }
    std::uint8_t* Bytes() const { return static_cast<std::uint8_t*>(mBlock); }

private:
    void* mBlock;
};

// Reads rows of any readable format as float B, G, R, A (4 floats per pixel) in the
// wanted alpha association and transfer. Alpha of opaque formats reads as 1.
class RowReader
{
public:
    RowReader(const void* inBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
              std::int32_t inWidth, std::int32_t inHeight, bool inWantLinear,
              bool inWantPremultiplied);

    // Fills outPixels with inWidth pixels of picture row inY.
    void Read(std::int32_t inY, float* outPixels) const;

private:
    FormatInfo mInfo;
    View mView;
    std::int32_t mWidth;
    std::int32_t mHeight;
    bool mWantLinear;
    bool mWantPremultiplied;
    bool mMatrix601;
    const std::uint8_t* mPlaneU = nullptr;
    const std::uint8_t* mPlaneV = nullptr;
    std::ptrdiff_t mChromaStep = 0;
};

// Writes float B, G, R, A rows (in the stated association and transfer) into any
// writable format; 8-bit values are rounded to nearest and clamped.
class RowWriter
{
public:
    RowWriter(void* inBase, std::int32_t inRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
              std::int32_t inHeight, bool inHaveLinear, bool inHavePremultiplied);

    // Writes pixels [inX0, inX1) of picture row inY from ioPixels (indexed from
    // pixel 0 of the row); ioPixels is scratch and may be changed.
    void Write(std::int32_t inY, float* ioPixels, std::int32_t inX0, std::int32_t inX1) const;
    void Write(std::int32_t inY, float* ioPixels) const { Write(inY, ioPixels, 0, mWidth); }

private:
    FormatInfo mInfo;
    View mView;
    std::int32_t mWidth;
    bool mHaveLinear;
    bool mHavePremultiplied;
    bool mMatrix601;
};

// Colour association and transfer steps on float rows.
void PremultiplyRow(float* ioPixels, std::int32_t inCount);
void UnpremultiplyRow(float* ioPixels, std::int32_t inCount);
void LinearizeRow(float* ioPixels, std::int32_t inCount);
void EncodeRow(float* ioPixels, std::int32_t inCount);

} // namespace IR
