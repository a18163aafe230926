#pragma once

// Steps shared by the frame filters of this folder: the full-frame test, the
// addressable copy, the deinterlace that keeps one field, the field assembly
// from two upstream renders, and the frame for a set of render parameters.
//
// Plain functions on frames and parameters; they hold no state and may be
// called from any number of render threads at once. Frames handed in are
// only read (they may be shared upstream or cache frames); every frame
// written is one these functions made. Pixel failures are thrown as
// ML::RenderRequestException with the failing status.

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"

#include <cstdint>

namespace ML::FieldFilterSteps
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

// Field slot numbers: slot 1 is picture rows 0, 2, 4, ..., slot 2 rows 1, 3, 5.
inline constexpr std::int32_t kFirstSlot = 1;
inline constexpr std::int32_t kSecondSlot = 2;

// Upstream's conformed time for inRequested.
MF::FrameTime ConformUpstream(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                              const MF::FrameTime& inRequested,
                              const CutlistRenderParams& inParams);

// Renders upstream at inTime (an empty upstream throws
// QRT::NullInterfaceException; upstream failures pass through).
FrameRef RenderUpstream(const QRT::InterfaceRef<IRenderableSource>& inUpstream,
                        const MF::FrameTime& inTime, const CutlistRenderParams& inParams);

// True when inFrame is a full-frame rendering that still has to be reduced to
// the requested size: it can provide the requested rectangle, does not
// already have the requested size, and its bounds are the full frame (or half
// its width for horizontally halved pixel-pair formats).
bool IsFullFrameRendering(const MF::IVideoFrame& inFrame, const CutlistRenderParams& inParams);

// A new frame at the requested size, pixel aspect ratio and format (the
// model's format when the parameters name no concrete one), field type
// progressive. Frame creation failures are thrown with their status.
FrameRef CreateFrameForParams(const CutlistRenderParams& inParams, const FrameRef& inModel);

// A copy of inFrame whose pixels can be addressed in the requested format:
// a reduced copy at the requested size for a full-frame rendering, else the
// frame itself or its conversion. May answer inFrame itself: take
// VF::MakeWriteableVideoFrame before writing.
FrameRef MakeAddressableCopy(const FrameRef& inFrame, const CutlistRenderParams& inParams);

// True when inFrame is exactly two or four times the requested height, so
// that one of its fields (every row of it, or every other one) is a frame of
// the requested height.
bool IsWholeFieldMultiple(const MF::IVideoFrame& inFrame, const CutlistRenderParams& inParams);

// A progressive frame at the requested size, pixel aspect ratio and format
// made from one field of inFrame (its second, rows 1, 3, 5, ..., when
// inKeepSecond) without rebuilding the other: the field's rows are read
// directly (at four times the height every other field row, or from quality
// 3 on the mean of two), then converted to the requested format and width
// when they differ. Input contract: IsWholeFieldMultiple.
FrameRef TakeFieldDirectly(const FrameRef& inFrame, const CutlistRenderParams& inParams,
                           bool inKeepSecond);

// A progressive frame made from one field of inFrame (its second field, rows
// 1, 3, 5, ..., when inKeepSecond). A frame two or four times the requested
// height in a field-by-field format takes the kept field directly
// (TakeFieldDirectly); any other frame is deinterlaced in place on a
// writeable copy (the other field rebuilt from the kept one).
FrameRef DeinterlaceKeepingField(const FrameRef& inFrame, const CutlistRenderParams& inParams,
                                 bool inKeepSecond);

// Builds the frame for the requested time inRequested from two upstream
// renders: inSecond (rendered for inRequested's second time, conformed to
// inSecondTime) gives the output's second slot, inFirst (rendered for its
// first time, conformed to inFirstTime) the first slot, each with the field
// whose time matches the request. A progressive request answered by one
// frame gives that frame deinterlaced at the request's time, or the frame
// itself when upstream delivered it progressive. Fields are scaled when the
// frames' heights differ.
FrameRef AssembleFields(const MF::FrameTime& inRequested, const FrameRef& inFirst,
                        const MF::FrameTime& inFirstTime, const FrameRef& inSecond,
                        const MF::FrameTime& inSecondTime, const CutlistRenderParams& inParams);

// Copies field inSourceField (1 or 2) of inSource into field slot inSlot of
// inDestination (not shared), scaling when the sizes differ. Answers the
// status of the pixel work.
QRT::Result CopyFieldIntoSlot(const FrameRef& inSource, std::int32_t inSourceField,
                              const FrameRef& inDestination, std::int32_t inSlot,
                              std::uint32_t inQuality);

// Throws ML::RenderRequestException when inStatus is a failure.
void ThrowIfFailed(QRT::Result inStatus);

} // namespace ML::FieldFilterSteps
