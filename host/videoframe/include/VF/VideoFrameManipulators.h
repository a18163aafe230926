#pragma once

// VF::VideoFrameManipulators: whole-frame pixel operations of the renderer:
// format conversion with scaling, field-correct scaling, rectangle copies,
// colour fills, field exchange, the vertical flicker filter, pulldown field merging, and the
// alpha fixes made when a stream's alpha is to be ignored or inverted.
//
// Conventions of the whole family:
// - Threads: plain static functions, callable from any thread at once on
//   different frames. A source frame may be shared (read by other threads).
// - Writing: a destination is never a shared frame (input contract
//   "!inDestination->IsShared()"): take VF::MakeWriteableVideoFrame first.
//   A source and its destination are different frames.
// - Contracts: null frames, a destination that is the source, and frames
//   whose formats or sizes must match and do not are input contract errors
//   (mvxcore::config::Error). A format an operation cannot handle answers
//   kResult_UnsupportedPixelFormat and writes nothing.
// - Formats: every raster format of the catalogue. Those the image renderer
//   cannot address (16-bit BGRA, float VUYA, fields stored apart) are worked
//   on through a staging copy in transient memory.
// - Rows and fields: the first field is picture rows 0, 2, 4, ..., the second
//   rows 1, 3, 5, ... (for formats that store fields apart, picture rows, not
//   memory rows). Frame field types say which field is earlier in time:
//   kFieldType_UpperFirst makes rows 0, 2, 4 the earlier field,
//   kFieldType_LowerFirst rows 1, 3, 5.
// - Quality (mvxmediatypes::RenderQuality): nearest sampling below 3,
//   bilinear at 3 and 4, area averaging at 5 (bilinear where it enlarges).
//   Scaling works on premultiplied values.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>

namespace VF
{

// The operation cannot read or write a frame of this pixel format.
inline constexpr QRT::Result kResult_UnsupportedPixelFormat = static_cast<QRT::Result>(0xA0100004u);

// Field selections of CopyFrameWithFields.
inline constexpr int32_t kFieldSelection_Frame = 0;
inline constexpr int32_t kFieldSelection_First = 1;
inline constexpr int32_t kFieldSelection_Second = 2;

// Channel masks of CopyRect.
inline constexpr uint32_t kCopyChannels_Color = 1;
inline constexpr uint32_t kCopyChannels_Alpha = 2;
inline constexpr uint32_t kCopyChannels_All = kCopyChannels_Color | kCopyChannels_Alpha;

class VideoFrameManipulators
{
public:
    using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

    // Copies the whole source onto the whole destination, converting the
    // pixel format and scaling when the sizes differ. Pixels only: the
    // destination keeps its own attributes. Equal format and size is an exact
    // copy.
    static QRT::Result CopyFrame(const FrameRef& inSource, const FrameRef& inDestination,
                                 mvxmediatypes::RenderQuality inQuality);

    // CopyFrame that keeps interlaced material field-correct:
    // - kFieldSelection_Frame: the whole frame is scaled (CopyFrame);
    // - otherwise, a destination whose field type is interlaced gets each
    //   field scaled on its own: its first-field rows from the source's
    //   first-field rows, its second-field rows from the second-field rows;
    // - otherwise (progressive destination) the destination is made from one
    //   field of the source alone: field 1 is the source's earlier field in
    //   time, field 2 its later one (rows by the source's field type; a
    //   source that is not interlaced counts as upper first).
    // A source of a single row is scaled as a frame. Input contract: the
    // selection is 0, 1 or 2.
    static QRT::Result CopyFrameWithFields(const FrameRef& inSource, const FrameRef& inDestination,
                                           mvxmediatypes::RenderQuality inQuality,
                                           int32_t inFieldSelection);

    // Copies the source rectangle onto the destination rectangle, scaling
    // when their sizes differ; destination pixels outside the rectangle are
    // kept. inChannels (kCopyChannels_*) picks colour, alpha or both; the
    // alpha bit is ignored for formats without alpha. Input contracts: both
    // rectangles non-empty and inside their frames, inChannels not 0 and
    // within kCopyChannels_All, an even left edge for 4:2:2 formats.
    static QRT::Result CopyRect(const FrameRef& inSource, const QRT::ParamRect& inSourceRect,
                                const FrameRef& inDestination,
                                const QRT::ParamRect& inDestinationRect,
                                mvxmediatypes::RenderQuality inQuality, uint32_t inChannels);

    // The destination gets the source's pixels with the two fields exchanged:
    // each first-field row takes the source's next row, each second-field
    // row the row before it. The last row of an odd-height frame has no
    // partner below and takes the row above. Input contracts: same format and
    // bounds.
    static QRT::Result SwapFields(const FrameRef& inSource, const FrameRef& inDestination);

    // The vertical flicker filter: every destination row is the source's
    // rows above, at and below weighted 1, 2, 1 (divided by 4, rounded to
    // nearest for integer samples); the edges repeat their outermost row.
    // Every channel, alpha included. Input contracts: same format and bounds.
    static QRT::Result VerticalConvolve(const FrameRef& inSource, const FrameRef& inDestination);

    // Completes the destination (the current video frame of a split film
    // frame) with the field it is missing, taken from the previous video
    // frame: for frames up to 576 rows high the first-field rows (0, 2, 4, ...)
    // come from the previous frame, for taller frames the second-field rows
    // (1, 3, 5, ...); the other rows stay as they are. Input contracts: same
    // format and bounds.
    static QRT::Result MergePulldownFrames(const FrameRef& inDestination,
                                           const FrameRef& inPreviousFrame);

    // In place: every alpha becomes opaque. Colour is kept (premultiplied
    // colour then reads as the picture over black). Formats without alpha are
    // left alone.
    static QRT::Result OpaqueAlpha(const FrameRef& ioFrame);
    // In place: every alpha a becomes 1 - a (straight colour is kept;
    // premultiplied colour is re-associated with the new alpha, and colour
    // under alpha 0 becomes 0). Formats without alpha are left alone.
    static QRT::Result InvertAlpha(const FrameRef& ioFrame);

    // Fills the whole frame with the colour 0xAARRGGBB (straight alpha,
    // gamma-encoded 8-bit components), converted to the frame's format as
    // IR_FillWithColor converts it: premultiplied, linearised or Y'CbCr as the
    // format asks. Formats the image renderer fills directly are written in
    // place; every other raster format is filled in a staging copy and
    // converted into the frame. Input contracts: frame given and not shared.
    static QRT::Result FillWithColor(const FrameRef& ioFrame, uint32_t inColor);

    // A frame whose pixels can be addressed directly in inFormat: the frame
    // itself when it offers the base-address interface (MF::IVideoFrameBaseAddress)
    // and already has that format (or inFormat is kPixelFormat_Any or
    // kPixelFormat_Invalid); otherwise a new frame of the same size and
    // attributes converted with CopyFrame. Empty when no copy can be made.
    static FrameRef MakeAddressableVideoFrame(const FrameRef& inFrame,
                                              mvxmediatypes::PixelFormat inFormat,
                                              mvxmediatypes::RenderQuality inQuality);
};

} // namespace VF
