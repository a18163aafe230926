#pragma once

// PixelFormat: a 64-bit pixel format value. The low 32 bits are the format's
// code (four characters, first character in the lowest byte, e.g. "BGRA");
// the high 32 bits are its properties word, which renderers test bit by bit.
// Two formats are equal when all 64 bits are equal; hashes mix the 8 bytes.
//
// Properties word (bit 0 is the least significant bit of the high 32 bits):
//
//   bit  0      colour model: 1 = Y'CbCr ("YUV"), 0 = RGB
//   bits 1-3    sample kind, which sizes the bytes of a pixel:
//                 0 = 8-bit unsigned      1 = compressed (no fixed size)
//                 2 = 16-bit unsigned     3 = 16-bit float
//                 4 = 10-bit packed       5 = 32-bit float      6, 7 reserved
//   bits 4-7    channel count (components, alpha included: B G R A = 4)
//   bit  8      has an alpha channel
//   bit  9      colour is premultiplied by alpha
//   bits 10-11  chroma sampling:
//                 0 = 4:4:4, every pixel stored whole
//                 1 = 4:2:2, two neighbouring pixels share one chroma pair
//                 2 = 4:2:0
//                 3 = 4:2:2 stored as pixel pairs: one stored element holds
//                     two pixels, so a row is half the picture width wide
//   bit  12     linear light (no transfer curve)
//   bit  13     reserved, 0
//   bits 14-17  field layout:
//                 0 = one raster, fields interleaved line by line
//                 1 = the two fields stored one after the other, upper first
//                 2 = the two fields stored one after the other, lower first
//                 9, 10 = as 1, 2, in half-width pixel-pair storage
//                 3-8, 11, 12 reserved (11 and 12 also half-width)
//               a raster format with any of these bits set is copied field by
//               field (with scaling when heights differ)
//   bits 18-19  storage: 0 = none (kPixelFormat_Invalid, kPixelFormat_Any),
//               1 = uncompressed addressable raster, 2 = compressed,
//               3 reserved
//   bits 20-23  reserved, 0
//   bits 24-31  bits per component of the decoded pixel (8, 10, 16, 32)
//
// Tests made on the word by the renderer:
//   render format:        (word & 0xC0000) == 0x40000 && (word & 0xC00) == 0
//   field-by-field:       (word & 0xC0000) == 0x40000 && (word & 0x3C000) != 0
//   horizontally halved:  bit 0 set, ((word >> 14) & 0xF) in 9..12,
//                         ((word >> 10) & 3) == 3
//   bytes per pixel:      0 unless storage is 1; kind = (word >> 1) & 7,
//                         packed = (word & 0xC00) == 0: kind 0 gives 4 packed
//                         else 2; kinds 2 and 3 give 8; kind 5 gives 16 packed
//                         else 8; every other kind gives 0.
//
// Catalogue (name, properties word, bytes per pixel):
//   BGRA_4444_8u               0x08040140   4   RGB, straight alpha
//   BGRA_4444_16u              0x10040144   8
//   BGRA_4444_16f              0x10040146   8
//   BGRA_4444_32f              0x2004014A  16
//   BGRP_4444_32f_Linear       0x2004134A  16   premultiplied, linear light
//   VUYA_4444_8u               0x08040141   4   Y'CbCr with alpha
//   VUYA_4444_32f              0x2004014B  16
//   YUYV_422_8u                0x08040431   2   4:2:2, no alpha
//   YUYV_422_8u_Fields         0x08044431   2   4:2:2, fields stored apart
//   YUYV_422_8u_HalfWidthFields 0x08064C31  2   pixel pairs, fields apart
//   MJPG_422_Compressed        0x08080433   0   compressed 4:2:2
//   YUV_420_8u_Planar          0x08040831   2   planar 4:2:0, no alpha (below)
//   Any                        0            0   wildcard: "any format"
//   Invalid                    0            0   no format (the value 0)
//
// Planar 4:2:0 (the only planar layout): one buffer holding the Y plane, then
// the Cb plane, then the Cr plane, the chroma planes (width + 1) / 2 samples
// wide and (height + 1) / 2 rows high; VF::ComputeFrameLayout places them.
// Such a format is a raster but not a render format: the code that walks
// packed rows (filters, compositing, staging) refuses it, so nearest-format
// selection answers it only to a request for a planar format.
//
// Value type, trivially copyable; every function here is safe from any thread.

#include "mvxmediatypes/FieldType.h"

#include <compare>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

namespace mvxmediatypes
{

// Field masks and values of the properties word.
inline constexpr std::uint32_t kPixelProperty_YUV = 0x1;
inline constexpr std::uint32_t kPixelProperty_KindMask = 0xE;
inline constexpr std::uint32_t kPixelProperty_ChannelsMask = 0xF0;
inline constexpr std::uint32_t kPixelProperty_Alpha = 0x100;
inline constexpr std::uint32_t kPixelProperty_Premultiplied = 0x200;
inline constexpr std::uint32_t kPixelProperty_ChromaMask = 0xC00;
inline constexpr std::uint32_t kPixelProperty_Linear = 0x1000;
inline constexpr std::uint32_t kPixelProperty_LayoutMask = 0x3C000;
inline constexpr std::uint32_t kPixelProperty_StorageMask = 0xC0000;
inline constexpr std::uint32_t kPixelProperty_StorageRaster = 0x40000;
inline constexpr std::uint32_t kPixelProperty_StorageCompressed = 0x80000;
inline constexpr std::uint32_t kPixelProperty_DepthMask = 0xFF000000;

// Sample kinds (bits 1-3), chroma sampling (bits 10-11) and field layouts
// (bits 14-17) as numbers, after shifting.
enum PixelSampleKind : std::uint32_t
{
    kPixelSampleKind_8u = 0,
    kPixelSampleKind_Compressed = 1,
    kPixelSampleKind_16u = 2,
    kPixelSampleKind_16f = 3,
    kPixelSampleKind_10uPacked = 4,
    kPixelSampleKind_32f = 5,
};

enum PixelChroma : std::uint32_t
{
    kPixelChroma_444 = 0,
    kPixelChroma_422 = 1,
    kPixelChroma_420 = 2,
    kPixelChroma_422Pairs = 3,
};

enum PixelFieldLayout : std::uint32_t
{
    kPixelFieldLayout_Interleaved = 0,
    kPixelFieldLayout_FieldsUpperFirst = 1,
    kPixelFieldLayout_FieldsLowerFirst = 2,
    kPixelFieldLayout_HalfWidthFieldsUpperFirst = 9,
    kPixelFieldLayout_HalfWidthFieldsLowerFirst = 10,
};

// The low-word code of four characters, first character in the lowest byte.
constexpr std::uint32_t MakePixelFormatCode(char inA, char inB, char inC, char inD)
{
    return std::uint32_t{static_cast<unsigned char>(inA)} |
           (std::uint32_t{static_cast<unsigned char>(inB)} << 8) |
           (std::uint32_t{static_cast<unsigned char>(inC)} << 16) |
           (std::uint32_t{static_cast<unsigned char>(inD)} << 24);
}

// A properties word from its fields.
constexpr std::uint32_t MakePixelProperties(bool inYUV, PixelSampleKind inKind,
                                            std::uint32_t inChannels, bool inAlpha,
                                            bool inPremultiplied, PixelChroma inChroma,
                                            bool inLinear, PixelFieldLayout inLayout,
                                            std::uint32_t inStorage, std::uint32_t inBitDepth)
{
    return (inYUV ? kPixelProperty_YUV : 0u) | (std::uint32_t{inKind} << 1) |
           ((inChannels & 0xF) << 4) | (inAlpha ? kPixelProperty_Alpha : 0u) |
           (inPremultiplied ? kPixelProperty_Premultiplied : 0u) | (std::uint32_t{inChroma} << 10) |
           (inLinear ? kPixelProperty_Linear : 0u) | (std::uint32_t{inLayout} << 14) |
           ((inStorage & 3) << 18) | ((inBitDepth & 0xFF) << 24);
}

class PixelFormat
{
public:
    // kPixelFormat_Invalid.
    constexpr PixelFormat() = default;
    explicit constexpr PixelFormat(std::uint64_t inValue)
        : mValue(inValue)
    {
    }
    static constexpr PixelFormat Make(std::uint32_t inCode, std::uint32_t inProperties)
    {
        return PixelFormat((std::uint64_t{inProperties} << 32) | inCode);
    }

    constexpr std::uint64_t GetValue() const { return mValue; }
    // The high 32 bits.
    constexpr std::uint32_t GetProperties() const
    {
        return static_cast<std::uint32_t>(mValue >> 32);
    }
    // The low 32 bits.
    constexpr std::uint32_t GetCode() const { return static_cast<std::uint32_t>(mValue); }

    constexpr std::uint32_t GetSampleKind() const { return (GetProperties() >> 1) & 7; }
    constexpr std::uint32_t GetChroma() const { return (GetProperties() >> 10) & 3; }
    constexpr std::uint32_t GetFieldLayout() const { return (GetProperties() >> 14) & 0xF; }
    constexpr std::uint32_t GetStorage() const { return (GetProperties() >> 18) & 3; }

    // Neither kPixelFormat_Invalid nor kPixelFormat_Any.
    constexpr bool IsValid() const;
    constexpr bool IsAny() const;

    constexpr bool IsRaster() const { return GetStorage() == 1; }
    constexpr bool IsCompressed() const { return GetStorage() == 2; }
    constexpr bool IsYUV() const
    {
        return GetStorage() != 0 && (GetProperties() & kPixelProperty_YUV);
    }
    constexpr bool IsRGB() const
    {
        return GetStorage() != 0 && !(GetProperties() & kPixelProperty_YUV);
    }
    constexpr bool HasAlpha() const { return (GetProperties() & kPixelProperty_Alpha) != 0; }
    constexpr bool IsPremultiplied() const
    {
        return (GetProperties() & kPixelProperty_Premultiplied) != 0;
    }
    constexpr bool IsLinear() const { return (GetProperties() & kPixelProperty_Linear) != 0; }
    constexpr bool IsFloat() const
    {
        return GetSampleKind() == kPixelSampleKind_16f || GetSampleKind() == kPixelSampleKind_32f;
    }
    constexpr std::uint32_t GetChannelCount() const { return (GetProperties() >> 4) & 0xF; }
    constexpr std::uint32_t GetBitDepth() const { return GetProperties() >> 24; }

    // A format the renderer renders in: an uncompressed raster with 4:4:4 sampling.
    constexpr bool IsRenderFormat() const
    {
        return (GetProperties() & kPixelProperty_StorageMask) == kPixelProperty_StorageRaster &&
               (GetProperties() & kPixelProperty_ChromaMask) == 0;
    }
    // A raster whose samples lie in separate planes (4:2:0) rather than in
    // packed rows.
    constexpr bool IsPlanar() const { return IsRaster() && GetChroma() == kPixelChroma_420; }
    // A raster format whose fields are copied one by one.
    constexpr bool IsFieldByField() const
    {
        return (GetProperties() & kPixelProperty_StorageMask) == kPixelProperty_StorageRaster &&
               (GetProperties() & kPixelProperty_LayoutMask) != 0;
    }
    // A format whose rows hold pixel pairs, so a full frame is half as wide.
    constexpr bool IsHorizontallyHalved() const
    {
        return (GetProperties() & kPixelProperty_YUV) != 0 && GetFieldLayout() >= 9 &&
               GetFieldLayout() <= 12 && GetChroma() == kPixelChroma_422Pairs;
    }
    // Average bytes one pixel occupies, by the rule in the header comment
    // (0 for compressed and unsized formats).
    constexpr std::uint32_t GetBytesPerPixel() const
    {
        if (GetStorage() != 1)
            return 0;
        const bool packed = GetChroma() == 0;
        switch (GetSampleKind())
        {
        case 0:
            return packed ? 4 : 2;
        case 2:
        case 3:
            return 8;
        case 5:
            return packed ? 16 : 8;
        default:
            return 0;
        }
    }

    friend constexpr bool operator==(const PixelFormat&, const PixelFormat&) = default;
    friend constexpr auto operator<=>(const PixelFormat&, const PixelFormat&) = default;

private:
    std::uint64_t mValue = 0;
};

inline constexpr PixelFormat kPixelFormat_Invalid{};
inline constexpr PixelFormat kPixelFormat_Any =
    PixelFormat::Make(MakePixelFormatCode('*', '*', '*', '*'), 0);

inline constexpr PixelFormat kPixelFormat_BGRA_4444_8u = PixelFormat::Make(
    MakePixelFormatCode('B', 'G', 'R', 'A'),
    MakePixelProperties(false, kPixelSampleKind_8u, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 8));
inline constexpr PixelFormat kPixelFormat_BGRA_4444_16u = PixelFormat::Make(
    MakePixelFormatCode('B', 'G', 'A', '6'),
    MakePixelProperties(false, kPixelSampleKind_16u, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 16));
inline constexpr PixelFormat kPixelFormat_BGRA_4444_16f = PixelFormat::Make(
    MakePixelFormatCode('B', 'G', 'A', 'h'),
    MakePixelProperties(false, kPixelSampleKind_16f, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 16));
inline constexpr PixelFormat kPixelFormat_BGRA_4444_32f = PixelFormat::Make(
    MakePixelFormatCode('B', 'G', 'A', 'f'),
    MakePixelProperties(false, kPixelSampleKind_32f, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 32));
inline constexpr PixelFormat kPixelFormat_BGRP_4444_32f_Linear = PixelFormat::Make(
    MakePixelFormatCode('B', 'G', 'P', 'l'),
    MakePixelProperties(false, kPixelSampleKind_32f, 4, true, true, kPixelChroma_444, true,
                        kPixelFieldLayout_Interleaved, 1, 32));
inline constexpr PixelFormat kPixelFormat_VUYA_4444_8u = PixelFormat::Make(
    MakePixelFormatCode('V', 'U', 'Y', 'A'),
    MakePixelProperties(true, kPixelSampleKind_8u, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 8));
inline constexpr PixelFormat kPixelFormat_VUYA_4444_32f = PixelFormat::Make(
    MakePixelFormatCode('V', 'U', 'A', 'f'),
    MakePixelProperties(true, kPixelSampleKind_32f, 4, true, false, kPixelChroma_444, false,
                        kPixelFieldLayout_Interleaved, 1, 32));
inline constexpr PixelFormat kPixelFormat_YUYV_422_8u = PixelFormat::Make(
    MakePixelFormatCode('Y', 'U', 'Y', 'V'),
    MakePixelProperties(true, kPixelSampleKind_8u, 3, false, false, kPixelChroma_422, false,
                        kPixelFieldLayout_Interleaved, 1, 8));
inline constexpr PixelFormat kPixelFormat_YUYV_422_8u_Fields = PixelFormat::Make(
    MakePixelFormatCode('Y', 'U', 'F', 'd'),
    MakePixelProperties(true, kPixelSampleKind_8u, 3, false, false, kPixelChroma_422, false,
                        kPixelFieldLayout_FieldsUpperFirst, 1, 8));
inline constexpr PixelFormat kPixelFormat_YUYV_422_8u_HalfWidthFields = PixelFormat::Make(
    MakePixelFormatCode('Y', 'U', 'F', 'h'),
    MakePixelProperties(true, kPixelSampleKind_8u, 3, false, false, kPixelChroma_422Pairs, false,
                        kPixelFieldLayout_HalfWidthFieldsUpperFirst, 1, 8));
inline constexpr PixelFormat kPixelFormat_YUV_420_8u_Planar = PixelFormat::Make(
    MakePixelFormatCode('I', '4', '2', '0'),
    MakePixelProperties(true, kPixelSampleKind_8u, 3, false, false, kPixelChroma_420, false,
                        kPixelFieldLayout_Interleaved, 1, 8));
inline constexpr PixelFormat kPixelFormat_MJPG_422_Compressed = PixelFormat::Make(
    MakePixelFormatCode('M', 'J', 'P', 'G'),
    MakePixelProperties(true, kPixelSampleKind_Compressed, 3, false, false, kPixelChroma_422, false,
                        kPixelFieldLayout_Interleaved, 2, 8));

constexpr bool PixelFormat::IsValid() const
{
    return *this != kPixelFormat_Invalid && *this != kPixelFormat_Any;
}

constexpr bool PixelFormat::IsAny() const
{
    return *this == kPixelFormat_Any;
}

// Every catalogued format, Any and Invalid last.
std::span<const PixelFormat> GetPixelFormatCatalogue();

// The catalogue name ("BGRA_4444_8u", "Any", "Invalid"); empty for a format
// outside the catalogue.
std::string_view GetPixelFormatName(PixelFormat inFormat);

// The catalogued format of that exact name (case-sensitive); nothing for an
// unknown name.
std::optional<PixelFormat> PixelFormatFromName(std::string_view inName);

// Nearest-format selection.
//
// The answer for one requested format r and a list of acceptable formats:
//   1. an empty list answers kPixelFormat_Invalid; so does an invalid r;
//   2. r itself when the list holds r, or holds kPixelFormat_Any;
//   3. r == kPixelFormat_Any: the first concrete format of the list;
//   4. otherwise the closest concrete format of the list, ranked by, in order:
//      same storage (raster or compressed, then planar or packed); same colour model (RGB or YUV);
//      depth (below); same alpha presence; same premultiplication; same
//      linearity; same float-ness; same chroma sampling; same field layout;
//      earlier in the list;
//   never a format the list does not hold (Any and Invalid entries are never
//   answered by rule 4).
// Depth: at quality kRenderQuality_Medium (3) or more, an equal depth first,
// then the shallowest depth above r's (no precision is lost), then the
// deepest below; under Medium, the nearest depth either way, the shallower
// on a tie (draft renders favour cheap formats). The two-argument form uses
// the quality rule of kRenderQuality_Max.
PixelFormat SelectNearestPixelFormat(PixelFormat inRequested,
                                     const std::vector<PixelFormat>& inAcceptable);
PixelFormat SelectNearestPixelFormat(PixelFormat inRequested,
                                     const std::vector<PixelFormat>& inAcceptable,
                                     std::uint32_t inQuality);

// The format to use when a caller ranks several formats (inRequested, best
// first), already has or defaults to inFallback, and may only use formats of
// inAvailable:
//   1. walking inRequested in order: a concrete format that inAvailable holds
//      exactly is the answer; a kPixelFormat_Any entry ("anything will do") is
//      answered with inFallback when that is concrete and available (exactly
//      or through Any), else with the first concrete format of inAvailable;
//      kPixelFormat_Invalid entries are skipped;
//   2. when inAvailable holds kPixelFormat_Any: inFallback when inAllowNearest
//      and inFallback is a concrete format (it needs no conversion), else the
//      first concrete requested format, else inFallback;
//   3. without inAllowNearest: inFallback;
//   4. inFallback when inAvailable holds it (no conversion is needed);
//   5. the nearest format to the first concrete requested format (rules above,
//      at inQuality) when there is one;
//   6. inFallback.
// An empty inAvailable therefore answers inFallback.
PixelFormat SelectNearestPixelFormat(const std::vector<PixelFormat>& inRequested,
                                     PixelFormat inFallback,
                                     const std::vector<PixelFormat>& inAvailable,
                                     std::uint32_t inQuality, bool inAllowNearest);

} // namespace mvxmediatypes
