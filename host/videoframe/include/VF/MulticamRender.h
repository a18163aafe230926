#pragma once

// Multicam pictures: the frame a multicam media shows, made from the frames
// of its camera angles. Either the selected angle alone, scaled to the
// output, or (show program) every angle in a grid with the selected one
// outlined.
//
// Grid: n angles fill ceil(sqrt(n)) columns and as many rows as they need,
// in angle order, left to right and top to bottom; each cell is the output
// divided evenly (left edges even, for 4:2:2 formats), each angle scaled
// into its cell. Cells without a frame, and the output where no cell is,
// are the background colour. The outline is drawn inside the selected cell.
//
// Plain functions on IR kernels (VideoFrameManipulators), callable from any
// thread at once; angle frames are only read and may be shared.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "mvxcore/utility/Guid.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>
#include <vector>

namespace VF
{

// The outline of the selected angle: amber, and red while angle switches
// are being recorded.
inline constexpr uint32_t kMulticamOutlineColor = 0xFFFFC000u;
inline constexpr uint32_t kMulticamRecordingColor = 0xFFE01010u;

struct MultiCamRenderParams
{
    mvxmediatypes::PixelFormat mFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    uint32_t mWidth = 0;
    uint32_t mHeight = 0;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::RenderQuality mQuality = mvxmediatypes::kRenderQuality_Draft;
    // Pixels of outline round the selected cell of a grid; 0 draws none.
    uint32_t mOutlineWidth = 0;
    uint32_t mBackgroundColor = 0xFF000000u;
};

// Parameters that outline the selected angle: max(2, height / 90) pixels.
MultiCamRenderParams SelectedRenderParams(mvxmediatypes::PixelFormat inFormat, uint32_t inWidth,
                                          uint32_t inHeight,
                                          mvxmediatypes::PixelAspectRatio inRatio,
                                          mvxmediatypes::RenderQuality inQuality);
// The same without an outline.
MultiCamRenderParams UnSelectedRenderParams(mvxmediatypes::PixelFormat inFormat, uint32_t inWidth,
                                            uint32_t inHeight,
                                            mvxmediatypes::PixelAspectRatio inRatio,
                                            mvxmediatypes::RenderQuality inQuality);

using MulticamFrames = std::vector<QRT::InterfaceRef<MF::IVideoFrame>>;

// The multicam picture. Without show program: the selected angle's frame
// itself when it already has the output's format and size, else a copy
// scaled to them; the background colour when that angle has no frame.
// With it: the grid, outlined with kMulticamRecordingColor while recording
// and kMulticamOutlineColor otherwise. Empty when the output frame cannot
// be made or an angle's format cannot be read. Input contracts: at least
// one frame slot, inSelected below their number, a non-zero output size.
QRT::InterfaceRef<MF::IVideoFrame> RenderMulticam(const MulticamFrames& inFrames,
                                                  uint64_t inSelected, bool inShowProgram,
                                                  bool inRecording,
                                                  const MultiCamRenderParams& inParams);

// The picture of material that is not a multicam shown where a multicam is
// expected: the first frame alone (as RenderMulticam with angle 0 selected),
// or with show program the grid without outline. When inKey is not nil the
// picture is kept in the shared video-frame cache under it (low priority),
// and a picture already kept there is answered without rendering. Input
// contracts as RenderMulticam.
QRT::InterfaceRef<MF::IVideoFrame> RenderNonMulticam(const MulticamFrames& inFrames,
                                                     bool inShowProgram,
                                                     const MultiCamRenderParams& inParams,
                                                     const mvxcore::utility::Guid& inKey);

} // namespace VF
