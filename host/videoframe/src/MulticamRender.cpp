// Multicam pictures (VF/MulticamRender.h).

#include "VF/MulticamRender.h"

#include "VF/FrameCachePriority.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cmath>

namespace VF
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using Manip = VideoFrameManipulators;

FrameRef CreateOutput(const MultiCamRenderParams& inParams)
{
    FrameRef frame = CreateVideoFrame(inParams.mFormat, inParams.mWidth, inParams.mHeight,
                                      inParams.mPixelAspectRatio, false, false);
    if (frame && QRT::Failed(Manip::FillWithColor(frame, inParams.mBackgroundColor)))
        return {};
    return frame;
}

// Fills inRect of ioFrame with inColor: a two-pixel solid frame scaled onto
// the rectangle, which keeps the frame's format whatever it is.
bool FillRect(const FrameRef& ioFrame, const QRT::ParamRect& inRect, uint32_t inColor,
              mt::RenderQuality inQuality)
{
    if (inRect.Width() <= 0 || inRect.Height() <= 0)
        return true;
    const FrameRef solid = CreateVideoFrame(ioFrame->GetPixelFormat(), 2, 2,
                                            ioFrame->GetPixelAspectRatio(), false, false);
    return solid && QRT::Succeeded(Manip::FillWithColor(solid, inColor)) &&
           QRT::Succeeded(Manip::CopyRect(solid, solid->GetBounds(), ioFrame, inRect, inQuality,
                                          kCopyChannels_All));
}

QRT::ParamRect Rect(int32_t inLeft, int32_t inTop, int32_t inRight, int32_t inBottom)
{
    return {inLeft, inTop, inRight, inBottom};
}

// The cell of angle inIndex among inCount.
QRT::ParamRect CellOf(std::size_t inIndex, std::size_t inCount, uint32_t inWidth, uint32_t inHeight)
{
    const auto columns =
        static_cast<std::size_t>(std::ceil(std::sqrt(static_cast<double>(inCount))));
    const std::size_t rows = (inCount + columns - 1) / columns;
    const std::size_t column = inIndex % columns;
    const std::size_t row = inIndex / columns;
    const auto edge = [](std::size_t inAt, std::size_t inOf, uint32_t inSize, bool inEven)
    {
        const auto at = static_cast<int32_t>(inAt * inSize / inOf);
        return inEven ? at & ~1 : at;
    };
    const bool last = column + 1 == columns;
    return Rect(edge(column, columns, inWidth, true), edge(row, rows, inHeight, false),
                last ? static_cast<int32_t>(inWidth) : edge(column + 1, columns, inWidth, true),
                edge(row + 1, rows, inHeight, false));
}

FrameRef RenderGrid(const MulticamFrames& inFrames, std::size_t inSelected, uint32_t inOutline,
                    const MultiCamRenderParams& inParams)
{
    FrameRef output = CreateOutput(inParams);
    if (!output)
        return {};
    for (std::size_t i = 0; i < inFrames.size(); ++i)
    {
        const QRT::ParamRect cell = CellOf(i, inFrames.size(), inParams.mWidth, inParams.mHeight);
        if (inFrames[i] && cell.Width() > 0 && cell.Height() > 0 &&
            QRT::Failed(Manip::CopyRect(inFrames[i], inFrames[i]->GetBounds(), output, cell,
                                        inParams.mQuality, kCopyChannels_All)))
            return {};
    }
    const QRT::ParamRect cell =
        CellOf(inSelected, inFrames.size(), inParams.mWidth, inParams.mHeight);
    const int32_t width = std::min<int32_t>(static_cast<int32_t>(inParams.mOutlineWidth),
                                            std::min(cell.Width(), cell.Height()) / 2);
    if (width > 0)
    {
        // Left and right edges are even-wide, for 4:2:2 formats.
        const int32_t side = (width + 1) & ~1;
        const QRT::ParamRect edges[] = {
            Rect(cell.mLeft, cell.mTop, cell.mRight, cell.mTop + width),
            Rect(cell.mLeft, cell.mBottom - width, cell.mRight, cell.mBottom),
            Rect(cell.mLeft, cell.mTop, std::min(cell.mLeft + side, cell.mRight), cell.mBottom),
            Rect(std::max(cell.mRight - side, cell.mLeft) & ~1, cell.mTop, cell.mRight,
                 cell.mBottom),
        };
        for (const QRT::ParamRect& edge : edges)
            if (!FillRect(output, edge, inOutline, inParams.mQuality))
                return {};
    }
    return output;
}

FrameRef RenderOne(const FrameRef& inFrame, const MultiCamRenderParams& inParams)
{
    if (!inFrame)
        return CreateOutput(inParams);
    const QRT::ParamRect bounds = inFrame->GetBounds();
    if (inFrame->GetPixelFormat() == inParams.mFormat &&
        bounds.Width() == static_cast<int32_t>(inParams.mWidth) &&
        bounds.Height() == static_cast<int32_t>(inParams.mHeight))
        return inFrame;
    FrameRef output = CreateVideoFrame(inParams.mFormat, inParams.mWidth, inParams.mHeight,
                                       inParams.mPixelAspectRatio, false, false);
    if (!output || QRT::Failed(Manip::CopyFrame(inFrame, output, inParams.mQuality)))
        return {};
    output->SetFieldType(inFrame->GetFieldType());
    return output;
}

void CheckInputs(const MulticamFrames& inFrames, uint64_t inSelected,
                 const MultiCamRenderParams& inParams)
{
    MVX_INPUT_CONTRACT(!inFrames.empty());
    MVX_INPUT_CONTRACT(inSelected < inFrames.size());
    MVX_INPUT_CONTRACT(inParams.mWidth > 0 && inParams.mHeight > 0);
}

MultiCamRenderParams MakeParams(mt::PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                                mt::PixelAspectRatio inRatio, mt::RenderQuality inQuality,
                                uint32_t inOutlineWidth)
{
    MultiCamRenderParams params;
    params.mFormat = inFormat;
    params.mWidth = inWidth;
    params.mHeight = inHeight;
    params.mPixelAspectRatio = inRatio;
    params.mQuality = inQuality;
    params.mOutlineWidth = inOutlineWidth;
    return params;
}

} // namespace

MultiCamRenderParams SelectedRenderParams(mt::PixelFormat inFormat, uint32_t inWidth,
                                          uint32_t inHeight, mt::PixelAspectRatio inRatio,
                                          mt::RenderQuality inQuality)
{
    return MakeParams(inFormat, inWidth, inHeight, inRatio, inQuality,
                      std::max<uint32_t>(2, inHeight / 90));
}

MultiCamRenderParams UnSelectedRenderParams(mt::PixelFormat inFormat, uint32_t inWidth,
                                            uint32_t inHeight, mt::PixelAspectRatio inRatio,
                                            mt::RenderQuality inQuality)
{
    return MakeParams(inFormat, inWidth, inHeight, inRatio, inQuality, 0);
}

FrameRef RenderMulticam(const MulticamFrames& inFrames, uint64_t inSelected, bool inShowProgram,
                        bool inRecording, const MultiCamRenderParams& inParams)
{
    CheckInputs(inFrames, inSelected, inParams);
    const auto selected = static_cast<std::size_t>(inSelected);
    if (!inShowProgram)
        return RenderOne(inFrames[selected], inParams);
    return RenderGrid(inFrames, selected,
                      inRecording ? kMulticamRecordingColor : kMulticamOutlineColor, inParams);
}

FrameRef RenderNonMulticam(const MulticamFrames& inFrames, bool inShowProgram,
                           const MultiCamRenderParams& inParams,
                           const mvxcore::utility::Guid& inKey)
{
    CheckInputs(inFrames, 0, inParams);
    if (!inKey.IsNil())
        if (FrameRef kept = SharedVideoFrameCache::RetrieveFromCache(inKey))
            return kept;
    MultiCamRenderParams plain = inParams;
    plain.mOutlineWidth = 0;
    FrameRef picture =
        inShowProgram ? RenderGrid(inFrames, 0, 0, plain) : RenderOne(inFrames.front(), plain);
    if (picture && !inKey.IsNil())
        SharedVideoFrameCache::InsertIntoCache(picture, inKey, kCachePriority_Low);
    return picture;
}

} // namespace VF
