// MediaNodeProducer: renders one request of a media node through the node's
// source chain, or its placeholder, and names the frame's hash.

#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/StaticImageFactory.h"
#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "graph/RenderableNodeMediaImpl.h"

#include <algorithm>
#include <cmath>
#include <string_view>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

constexpr std::string_view kFrameHashText = "MediaNode frame hash";

double RatioOf(mvxmediatypes::PixelAspectRatio inRatio)
{
    if (inRatio.GetNumerator() == 0 || inRatio.GetDenominator() == 0)
        return 1.0;
    return static_cast<double>(inRatio.GetNumerator()) / inRatio.GetDenominator();
}

std::uint32_t Pixels(double inValue)
{
    return static_cast<std::uint32_t>(std::max(1.0, std::round(inValue)));
}

// Made per request by RenderableNodeMediaImpl::GetProducer; used by one
// thread at a time. Holds the node's render state (its source chain is
// shared with the node's other producers), never the node itself.
class MediaNodeProducer
    : public QRT::Implements<IRenderableNodeProducer, IRenderableNodePrefetchProvider>
{
public:
    MediaNodeProducer(const MediaNodeRenderState& inState, const QRT::Guid& inNodeHash,
                      TickTime inFixedTime)
        : mState(inState)
        , mNodeHash(inNodeHash)
        , mFixedTime(inFixedTime)
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame.Reset();
        const MF::FrameTime mapped = MapTime(inTime);
        CutlistRenderParams sourceParams = SourceParams(inParams, mapped);
        if (!mState.mSource)
            return ProducePlaceholder(inParams, sourceParams, outFrame);

        MF::FrameTime conformed;
        mState.mSource->ConformFrameTime(mapped, sourceParams, conformed);
        sourceParams.SetFrameTime(conformed);
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        mState.mSource->RenderFrame(conformed, sourceParams, frame);
        if (!frame)
            return QRT::kResult_Success;

        const auto quality = static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality);
        const mvxmediatypes::FieldType wanted = mState.mStill || mFixedTime.IsValid()
                                                    ? mvxmediatypes::kFieldType_Progressive
                                                    : mapped.GetFieldOrder();
        if (frame->GetFieldType() != wanted)
        {
            frame = VF::MakeWriteableVideoFrame(frame, quality);
            frame->SetFieldType(wanted);
        }
        // A full-frame rendering (a nested sequence at its own size) is
        // brought to the size the media plays at.
        if (CutlistRenderer::UseRequestedSize(frame, sourceParams) &&
            !CutlistRenderer::UseRequestedSize(frame, inParams))
        {
            QRT::InterfaceRef<MF::IVideoFrame> sized = VF::CreateVideoFrame(
                frame->GetPixelFormat(), sourceParams.mWidth, sourceParams.mHeight,
                sourceParams.mPixelAspectRatio, false, false);
            if (!sized)
                return VF::kResult_OutOfFrameMemory;
            sized->SetFieldType(frame->GetFieldType());
            const QRT::Result copied = VF::VideoFrameManipulators::CopyFrameWithFields(
                frame, sized, quality, mvxmediatypes::IsInterlaced(frame->GetFieldType()) ? 1 : 0);
            if (QRT::Failed(copied))
                return copied;
            frame = sized;
        }
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kFrameHashText);
        QRT::MixHash::MixInGuid(hash, mNodeHash);
        if (!mState.mStill)
        {
            const MF::FrameTime mapped = MapTime(inTime);
            QRT::MixHash::MixInValue(hash, mapped.GetSecondFieldTime().GetTicks());
            QRT::MixHash::MixInValue(hash, mapped.GetFirstFieldTime().GetTicks());
        }
        QRT::MixHash::MixInValue(hash, inParams.mWidth);
        QRT::MixHash::MixInValue(hash, inParams.mHeight);
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetNumerator());
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetDenominator());
        QRT::MixHash::MixInValue(hash, inParams.mHorizontalScale);
        QRT::MixHash::MixInValue(hash, inParams.mVerticalScale);
        QRT::MixHash::MixInValue(hash, inParams.mQuality);
        QRT::MixHash::MixInValue(hash, inParams.mSecondaryQuality);
        QRT::MixHash::MixInValue(hash, inParams.mPixelFormat.GetValue());
        const bool holdDeinterlace = mFixedTime.IsValid() && mState.mFrameHoldDeinterlace;
        QRT::MixHash::MixInValue(hash, static_cast<std::uint8_t>(holdDeinterlace ? 1 : 0));
        QRT::MixHash::MixInValue(hash, static_cast<std::uint8_t>(mState.mSource ? 1 : 0));
        for (const QRT::Guid& material : mState.mMaterialHashes)
            QRT::MixHash::MixInGuid(hash, material);
        outHash = QRT::HashValueToGuid(hash);
    }

    void Prefetch(const MF::TickTimeRange& inRange, const CutlistRenderParams& inParams,
                  RenderableNodePrefetchList& ioPrefetches) const override
    {
        if (!mState.mSource)
            return;
        const MF::FrameTime mapped = MapTime(MF::FrameTime(inRange.first, inRange.second));
        CutlistRenderParams sourceParams = SourceParams(inParams, mapped);
        MF::FrameTime conformed;
        mState.mSource->ConformFrameTime(mapped, sourceParams, conformed);
        sourceParams.SetFrameTime(conformed);
        mState.mSource->CollectPrefetches(conformed, sourceParams, ioPrefetches);
    }

protected:
    ~MediaNodeProducer() = default;

private:
    MF::FrameTime MapTime(const MF::FrameTime& inTime) const
    {
        if (mFixedTime.IsValid())
            return MF::FrameTime(mFixedTime);
        return MF::FrameTime(inTime.GetFirstFieldTime() + mState.mTimeOrigin,
                             inTime.GetSecondFieldTime() + mState.mTimeOrigin);
    }

    // The request as the source chain sees it: the media's native picture
    // in the request's pixel aspect ratio (or fitted into the request with
    // scale-to-frame), reduced by the request's scales, at media time.
    CutlistRenderParams SourceParams(const CutlistRenderParams& inParams,
                                     const MF::FrameTime& inMapped) const
    {
        CutlistRenderParams params = inParams;
        params.SetFrameTime(inMapped);
        const double nativeWidth =
            mState.mWidth * RatioOf(mState.mPixelAspectRatio) / RatioOf(inParams.mPixelAspectRatio);
        const double nativeHeight = mState.mHeight;
        double fullWidth = nativeWidth;
        double fullHeight = nativeHeight;
        if (mState.mScaleToFrame && inParams.mFullFrameWidth > 0 && inParams.mFullFrameHeight > 0)
        {
            const double fit = std::min(inParams.mFullFrameWidth / nativeWidth,
                                        inParams.mFullFrameHeight / nativeHeight);
            fullWidth *= fit;
            fullHeight *= fit;
        }
        params.mFullFrameWidth = Pixels(fullWidth);
        params.mFullFrameHeight = Pixels(fullHeight);
        params.mFullFramePixelAspectRatio = inParams.mPixelAspectRatio;
        params.mWidth = Pixels(fullWidth * inParams.mHorizontalScale);
        params.mHeight = Pixels(fullHeight * inParams.mVerticalScale);
        return params;
    }

    QRT::Result ProducePlaceholder(const CutlistRenderParams& inParams,
                                   const CutlistRenderParams& inSourceParams,
                                   QRT::InterfaceRef<MF::IVideoFrame>& outFrame) const
    {
        if (mState.mBlack)
        {
            outFrame = CutlistRenderer::GetBlackFrame(inParams);
            return QRT::kResult_Success;
        }
        if (!mState.mOfflinePicture && !mState.mPendingPicture)
            return QRT::kResult_NotFound;
        outFrame = StaticImageFactory::LoadImageW(
            mState.mOfflinePicture ? kStaticImage_MediaOffline : kStaticImage_MediaPending,
            static_cast<std::int32_t>(inSourceParams.mWidth),
            static_cast<std::int32_t>(inSourceParams.mHeight),
            mvxmediatypes::kPixelFormat_BGRA_4444_8u, inParams.mPixelAspectRatio,
            static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality));
        return QRT::kResult_Success;
    }

    const MediaNodeRenderState mState;
    const QRT::Guid mNodeHash;
    // Valid for a frame hold: the media time every frame shows.
    const TickTime mFixedTime;
};

} // namespace

QRT::InterfaceRef<IRenderableNodeProducer>
CreateMediaNodeProducer(const MediaNodeRenderState& inState, const QRT::Guid& inNodeHash,
                        mvxmediatypes::TickTime inFixedTime)
{
    return QRT::Allocated<MediaNodeProducer>::Create<IRenderableNodeProducer>(inState, inNodeHash,
                                                                              inFixedTime);
}

} // namespace ML
