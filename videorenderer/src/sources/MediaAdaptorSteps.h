#pragma once

// The steps that both media adaptors (RenderableVideoSource and
// RenderableGetVideoSource) take on the way from a render request to a back-end
// video source and back: the frame request record, the conversion of a time by
// frame number between the adaptor's rate and the source's, the media-info
// kind, and the alpha handling of a delivered frame.
//
// Plain functions without state; callable from any thread at once. Frames
// handed in may be shared: every step that writes pixels or attributes takes a
// writeable copy first (VF::MakeWriteableVideoFrame), so a frame that the
// source or the frame cache hands to other threads is never written.
// Failures of the pixel operations are thrown as ML::RenderRequestException.

#include "BE/IVideoSource.h"
#include "BE/VideoFrameRequest.h"
#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelFormat.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>

namespace ML::MediaAdaptorSteps
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

// The frame request record for rendering inTime with inParams: the requested
// size, pixel aspect ratio, pixel format and quality, and the field order of
// inTime (1, 2, or 0 for a progressive frame).
BE::VideoFrameRequest MakeFrameRequest(const MF::FrameTime& inTime,
                                       const CutlistRenderParams& inParams);

// inTime at inOwnRate moved to the start of the frame of the same number at
// inSourceRate. The caller decides whether the rates call for it.
mvxmediatypes::TickTime ConvertTimeByFrameNumber(mvxmediatypes::TickTime inTime,
                                                 mvxmediatypes::FrameRate inOwnRate,
                                                 mvxmediatypes::FrameRate inSourceRate);

// The kind of the source's media (BE::Deprecated::MediaInfoKind); a source
// without the media-info interface, and an empty source, count as ordinary
// clips (kind 0).
std::int32_t GetMediaInfoKind(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource);

// The time-invariant kind: such media has no frame grid and conforms every
// time to zero.
inline constexpr std::int32_t kMediaInfoKind_TimeInvariant = 1;

// True when the frame's alpha is one the adaptors may rework: the frame's
// alpha query answers true and its format is an addressable raster stored
// whole (storage bits 18-19 equal to 1, chroma bits 10-11 clear).
bool HasReworkableAlpha(const MF::IVideoFrame& inFrame);

// Brings a delivered frame's alpha to what the clip declares:
// - inAlphaKind premultiplied, and the frame is an RGB raster whose pixels
//   can be addressed: its colour is un-premultiplied in place (against
//   inMatteColor, or against black when that is 0) and its alpha kind
//   becomes straight. Formats the image renderer cannot address directly
//   (16-bit samples) are worked on through a 32-bit float staging copy;
//   formats that store premultiplied colour by definition are only relabelled.
// - otherwise, when the frame's alpha kind differs from inAlphaKind, the frame
//   is relabelled with inAlphaKind.
// inMatteColor is 0xRRGGBB. ioFrame is replaced by a writeable copy when it
// changes (it is worked on in place when nobody else holds it).
void ConformAlpha(FrameRef& ioFrame, mvxmediatypes::AlphaChannel inAlphaKind,
                  std::uint32_t inMatteColor, std::uint32_t inQuality);

// The alpha step of both adaptors, applied to a frame the source delivered:
// - ignore alpha: every alpha made opaque (nothing else happens);
// - otherwise invert alpha (when asked) and then ConformAlpha.
// Frames without a reworkable alpha (HasReworkableAlpha) are left as they
// are; a frame that changes is replaced as by ConformAlpha.
void ApplyAlphaHandling(FrameRef& ioFrame, bool inIgnoreAlpha, bool inInvertAlpha,
                        mvxmediatypes::AlphaChannel inAlphaKind, std::uint32_t inMatteColor,
                        std::uint32_t inQuality);

// Throws ML::RenderRequestException carrying inStatus when it is a failure.
void ThrowIfFailed(QRT::Result inStatus);

} // namespace ML::MediaAdaptorSteps
