// RenderableCutlistSource: a sequence as a renderable source
// (CreateRenderableCutlistSource).

#include "ML/RenderableCutlistSource.h"

#include "ML/CutlistRenderer.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderStatus.h"
#include "QRT/Allocated.h"

#include <cstdint>
#include <vector>

namespace ML
{
namespace
{

using mvxmediatypes::FieldType;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// The quality from which a frame is rendered at its full size.
constexpr std::int32_t kFullSizeQuality = 3;
// The quality from which even a progressive sequence is conformed.
constexpr std::int32_t kConformAlwaysQuality = 5;

// Renders a sequence, given by its cutlist provider, through the cutlist
// renderer. The provider and its main and alternate cutlists are fetched at
// creation and held for the source's whole life; the source is immutable
// after that, so the render queue's workers, the prefetch paths and callers
// use it concurrently without a lock.
class RenderableCutlistSource : public QRT::Implements<IRenderableSource>
{
public:
    RenderableCutlistSource(const QRT::InterfaceRef<MF::IRenderableCutlistProvider>& inProvider,
                            const FrameRate& inFrameRate, const QRT::ImmutableString& inName)
        : mProvider(inProvider)
        , mMainCutlist(inProvider->GetMainCutlist(inName, true))
        , mAlternateCutlist(inProvider->GetAlternateCutlist(inName, true))
        , mFrameRate(inFrameRate)
        , mFieldType(FieldTypeOf(inProvider))
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        // A sequence without a rate has no frame grid to align to.
        TickTime time = inRequested.GetTime();
        if (!mFrameRate.IsZero())
            time = time.AlignToFrame(mFrameRate);
        outConformed = MF::FrameTime(time);

        FieldType order = mFieldType;
        // "As source" follows the field order of an interlaced request.
        if (order == mvxmediatypes::kFieldType_AsSource && inRequested.IsInterlaced())
            order = inRequested.GetFieldOrder();
        if (!mvxmediatypes::IsInterlaced(order))
            return;

        // One field is half a frame, also when "as source" took the
        // request's order (the field rate of such a sequence is its frame
        // rate, which would put the second field into the next frame).
        const TickTime later = time + (mFrameRate * 2).GetFrameDuration();
        if (order == mvxmediatypes::kFieldType_UpperFirst)
            outConformed.SetSecondFieldTime(later);
        else
            outConformed.SetFirstFieldTime(later);
    }

    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                           RenderableNodePrefetchList& ioPrefetches) override
    {
        const CutlistRenderParams params = ConformParams(inTime, inParams);
        // A failed node lookup starts nothing; rendering reports it.
        CutlistRenderer::CollectCutlistPrefetches(ChooseCutlist(inParams), params, ioPrefetches);
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        outFrame = nullptr;
        const CutlistRenderParams params = ConformParams(inTime, inParams);

        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        MF::FrameTime localTime;
        const QRT::Result status = CutlistRenderer::GetProducerForCutlist(
            ChooseCutlist(inParams), params, producer, localTime);
        if (QRT::Failed(status))
            throw RenderRequestException(status);

        const std::vector<mvxmediatypes::PixelFormat> anyFormat{mvxmediatypes::kPixelFormat_Any};
        const bool insertIntoCache = (params.mRenderFlags & kRenderFlagAlwaysCache) != 0;
        QRT::InterfaceRef<MF::IVideoFrame> frame = CutlistRenderer::RenderFrameFromCutlist(
            producer, params, localTime, anyFormat, insertIntoCache);
        // The renderer answers nothing when the producer failed (or the black
        // frame could not be made): that is a failed render, not a frame.
        if (!frame)
            throw RenderRequestException(kResult_RenderFailed);

        outFrame =
            CutlistRenderer::ConformFrameToOutput(frame, params, params.mPixelFormat, anyFormat);
    }

    void GetFrameRate(FrameRate& outRate) override { outRate = mFrameRate; }

    void GetFieldRate(FrameRate& outRate) override
    {
        outRate = mvxmediatypes::IsInterlaced(mFieldType) ? mFrameRate * 2 : mFrameRate;
    }

private:
    // The render flag that asks for the rendered frame to be cached.
    static constexpr std::uint32_t kRenderFlagAlwaysCache = 8;

    // The provider's field type, progressive when it does not describe its
    // picture.
    static FieldType
    FieldTypeOf(const QRT::InterfaceRef<MF::IRenderableCutlistProvider>& inProvider)
    {
        const auto properties = QRT::QueryRef<MF::IRenderableCutlistProviderProperties>(inProvider);
        return properties ? properties->GetFieldType() : mvxmediatypes::kFieldType_Progressive;
    }

    const QRT::InterfaceRef<MF::IRenderableCutlist>&
    ChooseCutlist(const CutlistRenderParams& inParams) const
    {
        return (inParams.mCutlistChoiceBit & 1) != 0 ? mAlternateCutlist : mMainCutlist;
    }

    // inParams for this sequence at inTime: its rate and field type, and for
    // interlaced sequences (or the highest qualities) a size the sequence can
    // render: whole field pairs at low quality, the full frame otherwise.
    CutlistRenderParams ConformParams(const MF::FrameTime& inTime,
                                      const CutlistRenderParams& inParams) const
    {
        CutlistRenderParams params = inParams;
        params.SetFrameTime(inTime);
        params.mFrameRate = mFrameRate;
        params.mFieldType = static_cast<std::uint32_t>(mFieldType);

        const std::int32_t quality = static_cast<std::int32_t>(params.mQuality);
        if (!mvxmediatypes::IsInterlaced(mFieldType) && quality < kConformAlwaysQuality)
            return params;
        if (quality < kFullSizeQuality)
        {
            // Both fields need the same number of lines.
            if (params.mHeight % 2 != 0)
            {
                ++params.mHeight;
                // Without a full-frame height there is no scale to recompute.
                if (params.mFullFrameHeight != 0)
                {
                    params.mVerticalScale = static_cast<double>(params.mHeight) /
                                            static_cast<double>(params.mFullFrameHeight);
                }
            }
            return params;
        }
        params.mWidth = params.mFullFrameWidth;
        params.mHeight = params.mFullFrameHeight;
        params.mHorizontalScale = 1.0;
        params.mVerticalScale = 1.0;
        params.mPixelAspectRatio = params.mFullFramePixelAspectRatio;
        return params;
    }

    const QRT::InterfaceRef<MF::IRenderableCutlistProvider> mProvider;
    const QRT::InterfaceRef<MF::IRenderableCutlist> mMainCutlist;
    const QRT::InterfaceRef<MF::IRenderableCutlist> mAlternateCutlist;
    const FrameRate mFrameRate;
    const FieldType mFieldType;
};

} // namespace

QRT::InterfaceRef<IRenderableSource>
CreateRenderableCutlistSource(const QRT::InterfaceRef<MF::IRenderableCutlistProvider>& inProvider,
                              const mvxmediatypes::FrameRate& inFrameRate,
                              const QRT::ImmutableString& inName)
{
    return QRT::Allocated<RenderableCutlistSource>::Create<IRenderableSource>(inProvider,
                                                                              inFrameRate, inName);
}

} // namespace ML
