// RenderableGetVideoSource: the renderable source over a back-end video source
// that draws into a frame the adaptor makes (CreateRenderableGetVideoSource).

#include "ML/RenderableVideoSources.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "sources/MediaAdaptorSteps.h"

namespace ML
{
namespace
{

using mvxmediatypes::FieldType;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// A rate whose frames can be numbered against another's: a real rate below
// the one-frame-per-millisecond rate of stills.
bool IsConvertibleRate(FrameRate inRate)
{
    return inRate > mvxmediatypes::kFrameRate_Zero && inRate < mvxmediatypes::kFrameRate_Video1000;
}

// A renderable source over one back-end video source that makes the
// destination frame itself (requested size and pixel aspect ratio, the
// nearest format the source can deliver) and has the source draw into it. Its
// frame grid is anchored at the clip's frame-grid origin. The second time,
// the third flag and the value belong to the back end's clip description and
// are handed to the source unchanged.
//
// Owned through IRenderableSource references; holds its video source for its
// whole life. Immutable after construction, so any number of threads call it
// at once without a lock. It needs no prefetch: CollectPrefetches collects
// nothing. An empty video source makes every operation that asks the source
// throw the foundation's null-interface exception.
class RenderableGetVideoSource : public QRT::Implements<IRenderableSource>
{
public:
    RenderableGetVideoSource(const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
                             const MF::BinaryData& inBinaryData, TickTime inFrameGridOrigin,
                             TickTime inSecondTime, QRT::ParamColor inMatteColor,
                             mvxmediatypes::AlphaChannel inAlphaKind, bool inIgnoreAlpha,
                             bool inInvertAlpha, bool inThirdFlag, double inValue,
                             FrameRate inFrameRate)
        : mSource(inSource)
        , mBinaryData(inBinaryData)
        , mFrameGridOrigin(inFrameGridOrigin)
        , mSecondTime(inSecondTime)
        , mMatteColor(inMatteColor.GetRGB24())
        , mAlphaKind(inAlphaKind)
        , mIgnoreAlpha(inIgnoreAlpha)
        , mInvertAlpha(inInvertAlpha)
        , mThirdFlag(inThirdFlag)
        , mValue(inValue)
        , mFrameRate(inFrameRate)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        if (IsTimeInvariant() || mFrameRate.IsZero())
        {
            outConformed = MF::FrameTime(mvxmediatypes::kTime_Zero);
            return;
        }
        const bool still = mSource->IsStill();
        TickTime time = inRequested.GetTime();
        if (!still)
            time = (time - mFrameGridOrigin).AlignToFrame(mFrameRate) + mFrameGridOrigin;
        outConformed = MF::FrameTime(time);
        if (!inRequested.IsInterlaced() || still)
            return;

        FrameRate fieldRate;
        GetFieldRate(fieldRate);
        const TickTime later = time + fieldRate.GetFrameDuration();
        if (inRequested.GetFieldOrder() == mvxmediatypes::kFieldType_LowerFirst)
            outConformed.SetFirstFieldTime(later);
        else
            outConformed.SetSecondFieldTime(later);
    }

    void CollectPrefetches(const MF::FrameTime& /*inTime*/, const CutlistRenderParams& /*inParams*/,
                           RenderableNodePrefetchList& /*ioPrefetches*/) override
    {
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const std::vector<mvxmediatypes::PixelFormat> formats = mSource->GetPixelFormats();
        const mvxmediatypes::PixelFormat format = mvxmediatypes::SelectNearestPixelFormat(
            inParams.mPixelFormat, formats, inParams.mQuality);

        QRT::InterfaceRef<MF::IVideoFrame> frame;
        MediaAdaptorSteps::ThrowIfFailed(
            VF::CreateVideoFrame(format, inParams.mWidth, inParams.mHeight,
                                 inParams.mPixelAspectRatio, false, false, frame));
        const FieldType fieldType = inTime.GetFieldOrder();
        frame->SetFieldType(fieldType);

        TickTime time = inTime.GetTime();
        const FrameRate sourceRate = mSource->GetFrameRate();
        if (mFrameRate != sourceRate && IsConvertibleRate(mFrameRate) &&
            IsConvertibleRate(sourceRate))
            time = MediaAdaptorSteps::ConvertTimeByFrameNumber(time, mFrameRate, sourceRate);

        const auto quality = static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality);
        MediaAdaptorSteps::ThrowIfFailed(mSource->DrawVideoFrame(
            time, mBinaryData, mFrameGridOrigin, mSecondTime, frame, quality, fieldType,
            inTime.IsProgressive(), mIgnoreAlpha, mInvertAlpha, mThirdFlag, mValue));

        MediaAdaptorSteps::ApplyAlphaHandling(frame, mIgnoreAlpha, mInvertAlpha, mAlphaKind,
                                              mMatteColor, inParams.mQuality);
        outFrame = std::move(frame);
    }

    void GetFrameRate(FrameRate& outRate) override
    {
        if (IsTimeInvariant())
            outRate = mvxmediatypes::kFrameRate_Zero;
        else if (mSource->IsStill())
            outRate = mvxmediatypes::kFrameRate_Video1000;
        else
            outRate = mFrameRate;
    }

    void GetFieldRate(FrameRate& outRate) override
    {
        GetFrameRate(outRate);
        const FieldType sourceFieldType = mSource->GetFieldType();
        const bool interlaced = mvxmediatypes::IsInterlaced(sourceFieldType) ||
                                sourceFieldType == mvxmediatypes::kFieldType_AsSource;
        if (interlaced && !mSource->IsStill() && !IsTimeInvariant() && !outRate.IsZero())
            outRate = outRate * 2;
    }

private:
    bool IsTimeInvariant() const
    {
        // The kind is asked of the source itself, so an empty source fails here
        // as it would on any other question.
        if (!mSource)
            throw QRT::NullInterfaceException();
        return MediaAdaptorSteps::GetMediaInfoKind(mSource) ==
               MediaAdaptorSteps::kMediaInfoKind_TimeInvariant;
    }

    const QRT::InterfaceRef<BE::Deprecated::IVideoSource> mSource;
    const MF::BinaryData mBinaryData;
    const TickTime mFrameGridOrigin;
    const TickTime mSecondTime;
    // 0xRRGGBB.
    const std::uint32_t mMatteColor;
    const mvxmediatypes::AlphaChannel mAlphaKind;
    const bool mIgnoreAlpha;
    const bool mInvertAlpha;
    const bool mThirdFlag;
    const double mValue;
    const FrameRate mFrameRate;
};

} // namespace

QRT::InterfaceRef<IRenderableSource> CreateRenderableGetVideoSource(
    const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource,
    const MF::BinaryData& inBinaryData, mvxmediatypes::TickTime inFrameGridOrigin,
    mvxmediatypes::TickTime inSecondTime, QRT::ParamColor inMatteColor,
    mvxmediatypes::AlphaChannel inAlphaKind, bool inIgnoreAlpha, bool inInvertAlpha,
    bool inThirdFlag, double inValue, mvxmediatypes::FrameRate inFrameRate)
{
    return QRT::Allocated<RenderableGetVideoSource>::Create<IRenderableSource>(
        inSource, inBinaryData, inFrameGridOrigin, inSecondTime, inMatteColor, inAlphaKind,
        inIgnoreAlpha, inInvertAlpha, inThirdFlag, inValue, inFrameRate);
}

} // namespace ML
