#pragma once

// Small enumerations of the media types: field order, alpha kind, render
// quality. They are unscoped enumerations with fixed 32-bit underlying types
// because renderer code stores and compares them as plain 32-bit numbers
// (field type 4, quality 3 or more); the numbers below are part of the API.

#include <cstdint>

namespace mvxmediatypes
{

// Field order of a frame or a stream. In a frame time (two field times, one
// per slot) kFieldType_UpperFirst is the order in which the first slot's field
// is the earlier one, kFieldType_LowerFirst the order in which it is the later.
enum FieldType : std::int32_t
{
    kFieldType_Invalid = -1,
    kFieldType_Progressive = 0,
    kFieldType_UpperFirst = 1,
    kFieldType_LowerFirst = 2,
    // The stream declares no field order; renderers treat it as progressive.
    kFieldType_Unknown = 3,
    // Take whatever field order the wrapped source reports.
    kFieldType_AsSource = 4,
};

// True for the two interlaced orders (1 and 2).
constexpr bool IsInterlaced(FieldType inFieldType)
{
    return inFieldType == kFieldType_UpperFirst || inFieldType == kFieldType_LowerFirst;
}

// Kind of the alpha channel of a frame or stream.
enum AlphaChannel : std::int32_t
{
    // No alpha channel (opaque).
    kAlphaChannel_None = 0,
    // Colour is independent of alpha.
    kAlphaChannel_Straight = 1,
    // Colour is already multiplied by alpha (against a matte colour).
    kAlphaChannel_Premultiplied = 2,
    // An alpha channel is present but must be treated as opaque.
    kAlphaChannel_Ignore = 3,
};

// Render quality, numbered upward from the fastest. Renderers compare the
// numbers: from kRenderQuality_Medium (3) upward field order is kept exact
// and full processing is applied; kRenderQuality_Max (5) also composites in
// linear 32-bit float. Plug-in numbering maps 2, 3, 4, 5 to its 1 to 4.
enum RenderQuality : std::uint32_t
{
    kRenderQuality_Draft = 0,
    kRenderQuality_Preview = 1,
    kRenderQuality_Low = 2,
    kRenderQuality_Medium = 3,
    kRenderQuality_High = 4,
    kRenderQuality_Max = 5,
};

} // namespace mvxmediatypes
