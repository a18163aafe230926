// RenderableVideoSource: the renderable source over a back-end video source
// that creates its frames itself (CreateRenderableSource).

#include "MF/PixelAspectRatioAdjust.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "VF/VideoFrame.h"
#include "prefetch/MediaNodePrefetcher.h"
#include "sources/MediaAdaptorSteps.h"

namespace ML
{
namespace
{

using mvxmediatypes::FieldType;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// The field orders that make a stream interlaced, plus "as the source says",
// which the adaptor counts as interlaced when it has to decide on its own.
bool IsInterlacedOrAsSource(FieldType inFieldType)
{
    return mvxmediatypes::IsInterlaced(inFieldType) ||
           inFieldType == mvxmediatypes::kFieldType_AsSource;
}

// A renderable source over one back-end video source, described by the clip
// that uses it: its declared frame rate, field type, pixel aspect ratio and
// alpha treatment, the clip's binary data and colour profile. The source
// delivers frames in whatever form it likes; this adaptor conforms their
// alpha and pixel aspect ratio to the clip's declaration.
//
// Owned through IRenderableSource references (by render requests, media
// producers and the filters stacked on it); it holds its video source for its
// whole life. Immutable after construction, so the render queue's workers and
// the prefetch paths call it concurrently without a lock.
//
// An empty video source is allowed: the description queries then answer the
// declared values, CollectPrefetches collects nothing and RenderFrame throws
// the foundation's null-interface exception.
class RenderableVideoSource : public QRT::Implements<IRenderableSource>
{
public:
    RenderableVideoSource(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                          const MF::BinaryData& inBinaryData,
                          mvxmediatypes::AlphaChannel inAlphaKind, QRT::ParamColor inMatteColor,
                          bool inIgnoreAlpha, bool inInvertAlpha, FrameRate inFrameRate,
                          FieldType inFieldType, mvxmediatypes::PixelAspectRatio inPixelAspectRatio,
                          const BE::ColorProfile& inColorProfile)
        : mSource(inSource)
        , mBinaryData(inBinaryData)
        , mMatteColor(inMatteColor.GetRGB24())
        , mAlphaKind(inAlphaKind)
        , mIgnoreAlpha(inIgnoreAlpha)
        , mInvertAlpha(inInvertAlpha)
        , mFrameRate(inFrameRate)
        , mFieldType(inFieldType)
        , mEffectiveFieldType(inSource ? inSource->GetFieldType() : inFieldType)
        , mPixelAspectRatio(inPixelAspectRatio)
        , mColorProfile(inColorProfile)
    {
        // An interlaced frame must split into two fields of whole ticks.
        const std::int64_t ticks = mFrameRate.GetTicksPerFrame();
        if (mvxmediatypes::IsInterlaced(mFieldType) && ticks % 2 != 0)
            mFrameRate = FrameRate::Create(ticks + 1);
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        // Time-invariant media and clips without a rate have one frame, at zero.
        if (MediaAdaptorSteps::GetMediaInfoKind(mSource) ==
                MediaAdaptorSteps::kMediaInfoKind_TimeInvariant ||
            mFrameRate.IsZero())
        {
            outConformed = MF::FrameTime(mvxmediatypes::kTime_Zero);
            return;
        }

        const bool still = IsStill();
        TickTime time = inRequested.GetTime();
        if (!still)
        {
            // A progressive frame of a clip that follows an interlaced source
            // may start at any field.
            const bool fieldGrid = mFieldType == mvxmediatypes::kFieldType_AsSource &&
                                   IsInterlacedOrAsSource(mEffectiveFieldType) &&
                                   inRequested.IsProgressive();
            time = time.AlignToFrame(fieldGrid ? mFrameRate * 2 : mFrameRate);
        }
        outConformed = MF::FrameTime(time);

        FieldType order = mFieldType;
        if (order == mvxmediatypes::kFieldType_AsSource)
        {
            order = mvxmediatypes::IsInterlaced(mEffectiveFieldType)
                        ? inRequested.GetFieldOrder()
                        : mvxmediatypes::kFieldType_Progressive;
        }
        if (!mvxmediatypes::IsInterlaced(order))
            return;

        FrameRate fieldRate;
        GetFieldRate(fieldRate);
        const TickTime later = time + fieldRate.GetFrameDuration();
        if (order == mvxmediatypes::kFieldType_UpperFirst)
            outConformed.SetSecondFieldTime(later);
        else
            outConformed.SetFirstFieldTime(later);
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        if (!mSource)
            return;
        const BE::VideoFrameRequest request = MediaAdaptorSteps::MakeFrameRequest(inTime, inParams);
        // The hint names the frame that rendering will ask for, so it is given
        // the time after the conversion by frame number.
        const TickTime time = SourceTime(inTime.GetTime());
        mSource->PrefetchVideoFrame(time, request, mBinaryData);
        QRT::InterfaceRef<IRenderableNodePrefetch> prefetch = CreateMediaNodePrefetcher(
            mSource, time, request, mBinaryData, mColorProfile, inParams.mCachePriority);
        if (prefetch)
            ioPrefetches.push_back(std::move(prefetch));
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const BE::VideoFrameRequest request = MediaAdaptorSteps::MakeFrameRequest(inTime, inParams);
        const TickTime time = SourceTime(inTime.GetTime());

        QRT::InterfaceRef<MF::IVideoFrame> frame;
        const QRT::Result status =
            mSource->GetVideoFrame(time, request, mBinaryData, mColorProfile,
                                   BE::Deprecated::kFrameRequestFlag_Read, frame);
        MediaAdaptorSteps::ThrowIfFailed(status);
        if (!frame)
            throw QRT::NullInterfaceException();

        MediaAdaptorSteps::ApplyAlphaHandling(frame, mIgnoreAlpha, mInvertAlpha, mAlphaKind,
                                              mMatteColor, inParams.mQuality);
        ConformPixelAspectRatio(frame, inParams);
        outFrame = std::move(frame);
    }

    void GetFrameRate(FrameRate& outRate) override
    {
        outRate = IsStill() ? mvxmediatypes::kFrameRate_Video1000 : mFrameRate;
    }

    void GetFieldRate(FrameRate& outRate) override
    {
        if (IsStill())
        {
            outRate = mvxmediatypes::kFrameRate_Video1000;
            return;
        }
        const FieldType fieldType =
            mFieldType == mvxmediatypes::kFieldType_AsSource ? mEffectiveFieldType : mFieldType;
        outRate =
            IsInterlacedOrAsSource(fieldType) && !mFrameRate.IsZero() ? mFrameRate * 2 : mFrameRate;
    }

private:
    bool IsStill() const { return mSource && mSource->IsStill(); }

    // inTime moved onto the source's own frame grid by frame number when the
    // clip declares another rate than the source's.
    TickTime SourceTime(TickTime inTime) const
    {
        const FrameRate sourceRate = mSource->GetFrameRate();
        if (mFrameRate == sourceRate || mFrameRate.IsZero() || sourceRate.IsZero())
            return inTime;
        return MediaAdaptorSteps::ConvertTimeByFrameNumber(inTime, mFrameRate, sourceRate);
    }

    // Gives the frame the clip's pixel aspect ratio, adjusted for a delivered
    // size that scales the requested one by different factors across and down.
    void ConformPixelAspectRatio(QRT::InterfaceRef<MF::IVideoFrame>& ioFrame,
                                 const CutlistRenderParams& inParams) const
    {
        // A clip that accepts any ratio keeps the source's.
        if (mPixelAspectRatio.IsAny())
            return;
        const QRT::ParamRect bounds = ioFrame->GetBounds();
        const std::int32_t frameWidth = bounds.Width();
        const std::int32_t frameHeight = bounds.Height();
        if (frameWidth <= 0 || frameHeight <= 0)
            return;
        // A request without a size asks for the source's own size: nothing
        // was scaled, so the declared ratio stands.
        const std::int32_t requestedWidth =
            inParams.mWidth != 0 ? static_cast<std::int32_t>(inParams.mWidth) : frameWidth;
        const std::int32_t requestedHeight =
            inParams.mHeight != 0 ? static_cast<std::int32_t>(inParams.mHeight) : frameHeight;
        const mvxmediatypes::PixelAspectRatio adjusted =
            MF::AdjustPixelAspectRatioForNonUniformDownsample(
                mPixelAspectRatio, requestedWidth, requestedHeight, frameWidth, frameHeight);
        if (ioFrame->GetPixelAspectRatio() == adjusted)
            return;
        ioFrame = VF::MakeWriteableVideoFrame(
            ioFrame, static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality));
        ioFrame->SetPixelAspectRatio(adjusted);
    }

    const QRT::InterfaceRef<BE::Deprecated::IVideoSource> mSource;
    const MF::BinaryData mBinaryData;
    // 0xRRGGBB.
    const std::uint32_t mMatteColor;
    const mvxmediatypes::AlphaChannel mAlphaKind;
    const bool mIgnoreAlpha;
    const bool mInvertAlpha;
    // Fixed in the constructor (one tick longer for odd interlaced frames).
    FrameRate mFrameRate;
    const FieldType mFieldType;
    const FieldType mEffectiveFieldType;
    const mvxmediatypes::PixelAspectRatio mPixelAspectRatio;
    const BE::ColorProfile mColorProfile;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
CreateRenderableSource(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                       const MF::BinaryData& inBinaryData, mvxmediatypes::AlphaChannel inAlphaKind,
                       QRT::ParamColor inMatteColor, bool inIgnoreAlpha, bool inInvertAlpha,
                       mvxmediatypes::FrameRate inFrameRate, mvxmediatypes::FieldType inFieldType,
                       mvxmediatypes::PixelAspectRatio inPixelAspectRatio,
                       const BE::ColorProfile& inColorProfile)
{
    return QRT::Allocated<RenderableVideoSource>::Create<IRenderableSource>(
        inSource, inBinaryData, inAlphaKind, inMatteColor, inIgnoreAlpha, inInvertAlpha,
        inFrameRate, inFieldType, inPixelAspectRatio, inColorProfile);
}

} // namespace ML
