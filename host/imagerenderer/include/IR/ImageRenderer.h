#pragma once

// The image renderer: the host's pixel operations on raw pixel buffers.
//
// Conventions of the whole family (said once here, not on every function):
//
// Buffers. A buffer is a base address, row bytes, an IR pixel format, a width
// and a height. The base address is the first byte of the first row in memory;
// row bytes is the distance between the starts of two rows in memory and must be
// at least the bytes of one row (IR_MinimumRowBytes). 8-bit buffers need no particular
// alignment; float buffers need 4-byte aligned base addresses and row bytes. For a bottom-left
// format the first row in memory is the bottom row of the picture; every geometric argument
// (motion, field selection, rectangles) is in picture coordinates with the origin at the top left,
// and the functions translate.
//
// Bad input. Null pointers, negative sizes, row bytes smaller than a row, format
// words that are not in the table below, unknown blend modes, opacities or
// weights outside 0..1, negative qualities and field selectors other than 0, 1, 2
// are programming errors: they raise the input-contract error of mvxcore
// (MVX_INPUT_CONTRACT, an mvxcore::config::Error exception) before any pixel is
// written. A valid format that an operation cannot handle (for example a
// composite of packed 4:2:2 pixels) is answered with kIR_UnsupportedFormat and
// nothing is written. A zero width or height does nothing and succeeds.
//
// Quality. 0 to 5 (higher values act as 5). Sampling: nearest below 3,
// bilinear at 3 and 4, best (2x2 supersampled bilinear) at 5. At quality 5 the
// blending operations (composite, motion, blend modes, dissolve, accumulate)
// work in 32-bit float linear light and re-encode the result; below 5 they work
// in the buffer's own encoding.
//
// Threads. Every function may be called from any thread at the same time on
// different buffers; none keeps state between calls except the transient memory
// pool, which is thread-safe. Nothing allocates per call once the pool is warm.
//
// Colours. Packed 32-bit colours are 0xAARRGGBB, straight (un-associated) alpha,
// gamma-encoded 8-bit components.

#include <cstddef>
#include <cstdint>

// ---------------------------------------------------------------------------
// Pixel formats
//
// An IR pixel format is a 32-bit word of these bits:
//
//   bit 0      components are 32-bit float (clear: 8-bit unsigned)
//   bit 1      linear light (clear: gamma-encoded with the sRGB transfer, IEC
//              61966-2-1: linear = c / 12.92 for c <= 0.04045, else
//              ((c + 0.055) / 1.055)^2.4); only with bit 0 and the BGRA layout
//   bit 2      straight (un-associated) alpha
//   bit 3      premultiplied (associated) alpha; bits 2 and 3 are never both set
//   bit 4      bottom-left origin (first row in memory is the bottom row); BGRA only
//   bits 8-11  layout: 0 BGRA interleaved (memory order B, G, R, A),
//              1 VUYA 4:4:4 interleaved 8-bit (memory order V, U, Y, A),
//              2 YUYV packed 4:2:2 8-bit (Y0, U, Y1, V per pixel pair),
//              3 planar 4:2:0 8-bit (Y plane, then U plane, then V plane)
//   bit 12     YUV matrix BT.601 (forced)
//   bit 13     YUV matrix BT.709 (forced)
//
// BGRA formats carry exactly one of bits 2 and 3. The YUV layouts are 8-bit,
// video range (Y 16..235, U and V 16..240), gamma-encoded; VUYA carries bit 2
// (its alpha is straight), YUYV and 4:2:0 carry no alpha bit (opaque). A YUV
// format without bit 12 or 13 uses BT.709 when the picture is at least 720 rows
// high and BT.601 otherwise.
//
// Planar 4:2:0 buffers are contiguous: the Y plane at the base address with the
// given row bytes, the U plane right after the Y plane (base + rowBytes * height)
// with rowBytes / 2 row bytes and (height + 1) / 2 rows, then the V plane the same
// way. Row bytes must be even. Chroma samples are centred between their 2x2 luma
// samples. 4:2:0 is a source format only (converted into other formats).
// ---------------------------------------------------------------------------

using IR_PixelFormat = std::uint32_t;

inline constexpr IR_PixelFormat kIR_FormatBit_Float = 1u << 0;
inline constexpr IR_PixelFormat kIR_FormatBit_Linear = 1u << 1;
inline constexpr IR_PixelFormat kIR_FormatBit_StraightAlpha = 1u << 2;
inline constexpr IR_PixelFormat kIR_FormatBit_PremultipliedAlpha = 1u << 3;
inline constexpr IR_PixelFormat kIR_FormatBit_BottomLeft = 1u << 4;
inline constexpr IR_PixelFormat kIR_FormatMask_Layout = 0xFu << 8;
inline constexpr IR_PixelFormat kIR_FormatLayout_BGRA = 0u << 8;
inline constexpr IR_PixelFormat kIR_FormatLayout_VUYA = 1u << 8;
inline constexpr IR_PixelFormat kIR_FormatLayout_YUYV = 2u << 8;
inline constexpr IR_PixelFormat kIR_FormatLayout_YUV420Planar = 3u << 8;
inline constexpr IR_PixelFormat kIR_FormatBit_BT601 = 1u << 12;
inline constexpr IR_PixelFormat kIR_FormatBit_BT709 = 1u << 13;

inline constexpr IR_PixelFormat kIR_PixelFormat_BGRA_8u = kIR_FormatBit_StraightAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_BGRP_8u = kIR_FormatBit_PremultipliedAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_BGRA_32f =
    kIR_FormatBit_Float | kIR_FormatBit_StraightAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_BGRP_32f =
    kIR_FormatBit_Float | kIR_FormatBit_PremultipliedAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_BGRA_32f_Linear =
    kIR_FormatBit_Float | kIR_FormatBit_Linear | kIR_FormatBit_StraightAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_BGRP_32f_Linear =
    kIR_FormatBit_Float | kIR_FormatBit_Linear | kIR_FormatBit_PremultipliedAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_VUYA_4444_8u =
    kIR_FormatLayout_VUYA | kIR_FormatBit_StraightAlpha;
inline constexpr IR_PixelFormat kIR_PixelFormat_YUYV_422_8u = kIR_FormatLayout_YUYV;
inline constexpr IR_PixelFormat kIR_PixelFormat_YUV_420_Planar_8u = kIR_FormatLayout_YUV420Planar;

// Statuses: 0 success, negative failure.
inline constexpr std::int32_t kIR_NoError = 0;
// The format (or the pair of formats) is valid but the operation does not handle it.
inline constexpr std::int32_t kIR_UnsupportedFormat = static_cast<std::int32_t>(0xA0140001u);
// Scratch memory could not be obtained.
inline constexpr std::int32_t kIR_OutOfMemory = static_cast<std::int32_t>(0xA0140002u);

// True when the word is one of the formats described above.
bool IR_IsValidPixelFormat(IR_PixelFormat inFormat);
// Bytes of one row of inWidth pixels (for 4:2:0, of one luma row). Contract: valid format,
// inWidth >= 0.
std::int64_t IR_MinimumRowBytes(IR_PixelFormat inFormat, std::int32_t inWidth);
// Origin tests. Contract: valid format.
bool IR_IsOriginTopLeft(IR_PixelFormat inFormat);
bool IR_IsOriginBottomLeft(IR_PixelFormat inFormat);

// ---------------------------------------------------------------------------
// Compositing. Formats: the BGRA layout only (8-bit or float, straight or
// premultiplied, gamma or linear); source and destination share one format.
// Over: result = source + destination * (1 - source alpha) in premultiplied
// terms, the source first scaled by the opacity; straight buffers are
// associated for the arithmetic and written back straight (alpha 0 gives 0).
// 8-bit results are within one code value of the exact result.
// ---------------------------------------------------------------------------

// Source over destination, same size, in place on the destination.
std::int32_t IR_Composite(const void* inSrc, std::int32_t inSrcRowBytes, void* ioDst,
                          std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
                          std::int32_t inHeight, float inOpacity, std::int32_t inQuality);

// The frame, scaled by the opacity, over opaque black, in place: every alpha becomes
// opaque and every colour becomes colour * alpha * opacity (straight) or
// colour * opacity (premultiplied).
std::int32_t IR_CompositeToBlack(void* ioBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                                 std::int32_t inWidth, std::int32_t inHeight, float inOpacity);

// The same, and outSourceAlphaBelowOpaque tells whether any alpha before the operation was
// below opaque (255, or 1.0 for float). Contract: outSourceAlphaBelowOpaque != nullptr.
std::int32_t IR_CompositeToBlackAndTestSourceAlpha(void* ioBase, std::int32_t inRowBytes,
                                                   IR_PixelFormat inFormat, std::int32_t inWidth,
                                                   std::int32_t inHeight, float inOpacity,
                                                   bool* outSourceAlphaBelowOpaque);

// ---------------------------------------------------------------------------
// Motion: a source drawn through a 2D affine transform.
// ---------------------------------------------------------------------------

// Maps source picture coordinates to destination picture coordinates:
//   xd = a * xs + c * ys + tx,  yd = b * xs + d * ys + ty.
// Coordinates are continuous: pixel (i, j) covers [i, i + 1) x [j, j + 1), so the
// identity matrix maps every pixel onto the same pixel.
struct IR_AffineMatrix
{
    double a = 1.0;
    double b = 0.0;
    double c = 0.0;
    double d = 1.0;
    double tx = 0.0;
    double ty = 0.0;
};

// Motion geometry in frame-relative units (0.5, 0.5 is the centre of a frame).
// The anchor point of the source (a point of the source picture) lands on the
// position in the destination; around it the source is scaled (1 is the source's
// own size) and then rotated by the rotation in degrees, clockwise on screen.
struct IR_MotionGeometry
{
    float anchorX = 0.5f;
    float anchorY = 0.5f;
    float positionX = 0.5f;
    float positionY = 0.5f;
    float scaleX = 1.0f;
    float scaleY = 1.0f;
    double rotationDegrees = 0.0;
};

// Builds the matrix of a motion for a source and a destination of the given
// sizes. Contract: outMatrix != nullptr, sizes >= 0, all values finite.
void IR_BuildMotionMatrix(const IR_MotionGeometry& inGeometry, std::int32_t inSrcWidth,
                          std::int32_t inSrcHeight, std::int32_t inDstWidth,
                          std::int32_t inDstHeight, IR_AffineMatrix* outMatrix);

// Blend modes. Separable modes on colour channels; B(cb, cs) is the blend of
// backdrop colour cb and source colour cs (straight, 0..1), composited with the
// usual alpha rule: result = (1 - ab) * Cs + (1 - as) * Cb + as * ab * B(cb, cs)
// in premultiplied terms, alpha = as + ab - as * ab. They apply in premultiplied
// arithmetic whatever the buffers' alpha kind; at quality 5 in linear light.
enum IR_BlendMode : std::uint32_t
{
    kIR_BlendMode_Darken = 1,      // min(cb, cs)
    kIR_BlendMode_Multiply = 2,    // cb * cs
    kIR_BlendMode_Lighten = 5,     // max(cb, cs)
    kIR_BlendMode_Screen = 6,      // cb + cs - cb * cs
    kIR_BlendMode_Add = 9,         // min(1, cb + cs)
    kIR_BlendMode_Overlay = 11,    // cb <= 0.5 ? 2 cb cs : 1 - 2 (1 - cb)(1 - cs)
    kIR_BlendMode_Difference = 15, // |cb - cs|
    kIR_BlendMode_Subtract = 17,   // max(0, cb - cs): the source is taken from the backdrop
    kIR_BlendMode_Normal = 18,     // cs (plain over)
};

// True for the values of IR_BlendMode.
bool IR_IsValidBlendMode(std::uint32_t inBlendMode);

// Field selectors of the motion calls.
inline constexpr std::int32_t kIR_Field_All = 0;
inline constexpr std::int32_t kIR_Field_First = 1;  // destination rows 0, 2, 4, ... (picture rows)
inline constexpr std::int32_t kIR_Field_Second = 2; // destination rows 1, 3, 5, ...

// Draws the source through inMatrix onto the destination. Formats: BGRA layout,
// both buffers in the same format (else kIR_UnsupportedFormat). Only destination
// rows of the selected field are touched. With inHasLowerFrame the source, scaled
// by the opacity, is composited over the destination's pixels; without it the
// touched rows are first cleared to transparent black, so they end up holding the
// transformed source times the opacity. Source pixels outside the source are
// transparent (bilinear and best sampling give soft edges). A singular matrix
// draws nothing. Contract: inMatrix != nullptr with finite entries.
std::int32_t IR_Motion(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                       std::int32_t inSrcWidth, std::int32_t inSrcHeight, void* ioDst,
                       std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                       std::int32_t inDstWidth, std::int32_t inDstHeight,
                       const IR_AffineMatrix* inMatrix, float inOpacity, std::int32_t inQuality,
                       std::int32_t inFieldSelector, bool inHasLowerFrame);

// IR_Motion with a blend mode (IR_BlendMode; contract: IR_IsValidBlendMode).
std::int32_t IR_MotionWithBlendMode(const void* inSrc, std::int32_t inSrcRowBytes,
                                    IR_PixelFormat inSrcFormat, std::int32_t inSrcWidth,
                                    std::int32_t inSrcHeight, void* ioDst,
                                    std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                                    std::int32_t inDstWidth, std::int32_t inDstHeight,
                                    const IR_AffineMatrix* inMatrix, float inOpacity,
                                    std::int32_t inQuality, std::int32_t inFieldSelector,
                                    bool inHasLowerFrame, std::uint32_t inBlendMode);

// ---------------------------------------------------------------------------
// Mixing. Formats: BGRA layout; all buffers share one format. Every channel
// (alpha included) is mixed as stored; at quality 5 gamma-encoded colour is mixed
// in linear light. 8-bit results are rounded to nearest and clamped to 0..255.
// ---------------------------------------------------------------------------

// dst = (1 - w) * a + w * b. Contract: 0 <= inWeight <= 1.
std::int32_t IR_CrossDissolve(const void* inSrcA, std::int32_t inSrcARowBytes, const void* inSrcB,
                              std::int32_t inSrcBRowBytes, void* outDst, std::int32_t inDstRowBytes,
                              IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
                              float inWeight, std::int32_t inQuality);

// dst = sum of inWeights[i] * inSrcs[i] over inCount sources (weights may be any finite
// values; float results are not clamped except alpha to 0..1). Contract: inCount >= 1, the
// three arrays and every source non-null.
std::int32_t IR_Accumulate(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                           const double* inWeights, std::int32_t inCount, void* outDst,
                           std::int32_t inDstRowBytes, IR_PixelFormat inFormat,
                           std::int32_t inWidth, std::int32_t inHeight, std::int32_t inQuality);

// ---------------------------------------------------------------------------
// Conversion and scaling.
// ---------------------------------------------------------------------------

// Converts between two formats of the same size: depth, alpha association, transfer,
// YUV <-> BGRA, 4:2:0 -> anything else, bottom-left <-> top-left. The source and the
// destination may be the same memory when both formats have the same bytes per pixel
// (in-place premultiplied -> straight: source format with bit 2 cleared and bit 3 set,
// destination format with bit 2). Converting to 4:2:0 answers kIR_UnsupportedFormat.
// Opaque formats read alpha as 1 and drop it when written.
std::int32_t IR_Convert(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                        void* outDst, std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                        std::int32_t inWidth, std::int32_t inHeight, std::int32_t inQuality);

// Planar 4:2:0 with separate planes into a BGRA-layout destination (U and V planes
// have (width + 1) / 2 samples per row and (height + 1) / 2 rows). inMatrix601 picks
// BT.601 (true) or BT.709 (false).
std::int32_t IR_ConvertYUV420Planes(const std::uint8_t* inY, std::int32_t inYRowBytes,
                                    const std::uint8_t* inU, std::int32_t inURowBytes,
                                    const std::uint8_t* inV, std::int32_t inVRowBytes,
                                    bool inMatrix601, void* outDst, std::int32_t inDstRowBytes,
                                    IR_PixelFormat inDstFormat, std::int32_t inWidth,
                                    std::int32_t inHeight);

// Scales the whole source onto the whole destination and converts the format.
// Nearest below quality 3, bilinear at 3 and 4, area averaging at 5 (bilinear
// where it enlarges). Scaling works on premultiplied values; 8-bit results are within one
// code value of exact arithmetic.
std::int32_t IR_ScaleConvert(const void* inSrc, std::int32_t inSrcRowBytes,
                             IR_PixelFormat inSrcFormat, std::int32_t inSrcWidth,
                             std::int32_t inSrcHeight, void* outDst, std::int32_t inDstRowBytes,
                             IR_PixelFormat inDstFormat, std::int32_t inDstWidth,
                             std::int32_t inDstHeight, std::int32_t inQuality);

// ---------------------------------------------------------------------------
// Fields. Formats: BGRA, VUYA and YUYV layouts (interleaved). The first field is
// picture rows 0, 2, 4, ..., the second rows 1, 3, 5, ...
// ---------------------------------------------------------------------------

// In place: keeps one field (the second when inKeepSecond) and rebuilds the other
// field's rows from it: below quality 3 by repeating the nearest kept row, from 3
// on by averaging the kept rows above and below (the nearest kept row at an edge).
std::int32_t IR_Deinterlace(void* ioBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                            std::int32_t inWidth, std::int32_t inHeight, bool inKeepSecond,
                            std::int32_t inQuality);

// Copies the kept field of a source of inSrcHeight rows into a destination of the same
// width and inDstHeight rows, where inSrcHeight is 2 or 4 times inDstHeight (else a
// contract error). Half height: the field's rows one to one. Quarter height: every other
// row of the field, or at quality 3 and above the average of two consecutive field rows.
std::int32_t IR_DeinterlaceCopy(const void* inSrc, std::int32_t inSrcRowBytes,
                                std::int32_t inSrcHeight, void* outDst, std::int32_t inDstRowBytes,
                                std::int32_t inDstHeight, IR_PixelFormat inFormat,
                                std::int32_t inWidth, bool inKeepSecond, std::int32_t inQuality);

// ---------------------------------------------------------------------------
// Fill and matte.
// ---------------------------------------------------------------------------

// Fills inWidth x inHeight pixels at the base address (a rectangle of a larger buffer
// is addressed by offsetting the base) with the colour 0xAARRGGBB, converted to the
// format (premultiplied, linearised, YUV as the format asks). Formats: BGRA, VUYA,
// YUYV. inQuality is accepted for symmetry and has no effect.
std::int32_t IR_FillWithColor(void* outBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                              std::int32_t inWidth, std::int32_t inHeight, std::uint32_t inColor,
                              std::int32_t inQuality);

// Un-premultiplies pixels premultiplied over a matte colour (the source is
// p = a * c + (1 - a) * matte): c = (p - (1 - a) * matte) / a clamped to 0..1,
// alpha 0 gives colour 0. inMatteColor is 0xAARRGGBB (its alpha is ignored).
// inFormat gives depth and layout (BGRA 8-bit or float, gamma-encoded); the alpha bits
// of inFormat are ignored: inOutputAlpha says what is written, kIR_FormatBit_StraightAlpha
// (4) for straight colour or kIR_FormatBit_PremultipliedAlpha (8) for colour premultiplied
// over black (a * c). Source and destination may be the same memory.
std::int32_t IR_UnPremultiplyAgainstMatteColor(const void* inSrc, std::int32_t inSrcRowBytes,
                                               void* outDst, std::int32_t inDstRowBytes,
                                               IR_PixelFormat inFormat, std::int32_t inWidth,
                                               std::int32_t inHeight, std::uint32_t inMatteColor,
                                               std::uint32_t inOutputAlpha, std::int32_t inQuality);

// ---------------------------------------------------------------------------
// Transient memory: 64-byte aligned scratch blocks for frame-sized work.
// Freed blocks are kept per size class and handed out again, so steady-state use
// touches no fresh pages. Thread-safe. The pool keeps at most 1 GiB of free blocks;
// beyond that freed blocks go back to the system.
// ---------------------------------------------------------------------------

// A block of at least inSize bytes, or nullptr when memory is exhausted.
// Contract: inSize > 0.
void* IR_AllocateTransientMemoryBlock(std::size_t inSize);
// Returns a block; nullptr is ignored. The block must come from
// IR_AllocateTransientMemoryBlock (checked by a guard word: contract error otherwise).
void IR_FreeTransientMemoryBlock(void* inBlock);
// Bytes currently held by the pool in free blocks (for tests and diagnostics).
std::size_t IR_TransientMemoryCachedBytes();
