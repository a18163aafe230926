#include "ML/CutlistRenderer.h"

#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/IRenderableNodeProducerProvider.h"
#include "QRT/Hash.h"
#include "QRT/Param.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "render/FramePixels.h"

#include <cstring>

namespace ML
{

namespace
{

QRT::ParamRect MakeRect(std::uint32_t inWidth, std::uint32_t inHeight)
{
    return QRT::ParamRect(0, 0, static_cast<std::int32_t>(inWidth),
                          static_cast<std::int32_t>(inHeight));
}

} // namespace

QRT::Result CutlistRenderer::GetProducerForCutlist(
    const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist, const CutlistRenderParams& inParams,
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, MF::FrameTime& outLocalFrameTime)
{
    QRT::InterfaceRef<MF::IRenderableNode> node;
    MF::FrameTime localTime = inParams.GetFrameTime();
    const QRT::Result status = inCutlist->GetNodeAtTime(inParams.GetFrameTime(), node, localTime);
    if (QRT::Failed(status))
        return status;
    outProducer.Reset();
    outLocalFrameTime = localTime;
    if (node)
    {
        const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node);
        if (provider)
            provider->GetProducer(outProducer, localTime, inParams);
    }
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IVideoFrame> CutlistRenderer::RenderFrameFromCutlist(
    const QRT::InterfaceRef<IRenderableNodeProducer>& inProducer,
    const CutlistRenderParams& inParams, const MF::FrameTime& inLocalFrameTime,
    const std::vector<mvxmediatypes::PixelFormat>& inAcceptableFormats, bool inInsertIntoCache)
{
    if (!inProducer)
        return GetBlackFrame(inParams);

    QRT::Guid hash;
    inProducer->GetFrameHash(hash, inLocalFrameTime, inParams);
    // A nil hash names no frame: it is neither looked up nor cached, so that
    // unrelated frames never meet under it.
    const bool hashed = hash != QRT::Guid();
    if (hashed)
    {
        const auto cached = VF::SharedVideoFrameCache::RetrieveFromCache(hash);
        if (cached)
            return ConformFrameToOutput(cached, inParams, inParams.mPixelFormat,
                                        inAcceptableFormats);
    }

    QRT::InterfaceRef<MF::IVideoFrame> produced;
    if (QRT::Failed(inProducer->ProduceFrame(inLocalFrameTime, inParams, produced)))
        return {};
    auto conformed =
        ConformFrameToOutput(produced, inParams, inParams.mPixelFormat, inAcceptableFormats);
    if (conformed && inInsertIntoCache && hashed)
    {
        conformed->MarkShared(1);
        VF::SharedVideoFrameCache::InsertIntoCache(conformed, hash, inParams.mCachePriority);
    }
    return conformed;
}

QRT::Guid CutlistRenderer::GetBlackFrameHash(const CutlistRenderParams& inParams)
{
    static_assert(sizeof(inParams.mPixelAspectRatio) == 8, "two 32-bit terms");
    static_assert(sizeof(inParams.mPixelFormat) == 8, "one 64-bit value");
    QRT::HashValue hash;
    QRT::MixHash::MixInData(hash, kBlackFrameHashPrefix, sizeof(kBlackFrameHashPrefix) - 1);
    QRT::MixHash::MixInData(hash, &inParams.mWidth, sizeof(inParams.mWidth));
    QRT::MixHash::MixInData(hash, &inParams.mHeight, sizeof(inParams.mHeight));
    QRT::MixHash::MixInData(hash, &inParams.mPixelAspectRatio, sizeof(inParams.mPixelAspectRatio));
    QRT::MixHash::MixInData(hash, &inParams.mPixelFormat, sizeof(inParams.mPixelFormat));
    return QRT::HashValueToGuid(hash);
}

QRT::InterfaceRef<MF::IVideoFrame>
CutlistRenderer::GetBlackFrame(const CutlistRenderParams& inParams)
{
    // Black frames stay at the high priority whatever the render: there are
    // few of them and every render of their size asks for them again.
    const QRT::Guid hash = GetBlackFrameHash(inParams);
    if (auto cached = VF::SharedVideoFrameCache::RetrieveFromCache(hash))
        return cached;
    auto frame = VF::CreateVideoFrame(inParams.mPixelFormat, inParams.mWidth, inParams.mHeight,
                                      inParams.mPixelAspectRatio, true, true);
    // Cleared memory is transparent black in RGB; in Y'CbCr it is a green
    // below black, so those frames are filled with transparent black instead.
    if (frame && inParams.mPixelFormat.IsYUV() &&
        QRT::Failed(VF::VideoFrameManipulators::FillWithColor(frame, 0x00000000u)))
        frame.Reset();
    if (frame)
    {
        frame->MarkShared(1);
        VF::SharedVideoFrameCache::InsertIntoCache(frame, hash, VF::kCachePriority_High);
    }
    return frame;
}

QRT::Result
CutlistRenderer::GetCutlistFrameHash(QRT::Guid& outHash,
                                     const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist,
                                     const CutlistRenderParams& inParams)
{
    QRT::InterfaceRef<IRenderableNodeProducer> producer;
    MF::FrameTime localTime;
    const QRT::Result status = GetProducerForCutlist(inCutlist, inParams, producer, localTime);
    if (QRT::Failed(status))
        return status;
    if (producer)
        producer->GetFrameHash(outHash, localTime, inParams);
    else
        outHash = GetBlackFrameHash(inParams);
    return QRT::kResult_Success;
}

QRT::InterfaceRef<MF::IVideoFrame> CutlistRenderer::ConformFrameToOutput(
    const QRT::InterfaceRef<MF::IVideoFrame>& inFrame, const CutlistRenderParams& inParams,
    mvxmediatypes::PixelFormat inPreferredFormat,
    const std::vector<mvxmediatypes::PixelFormat>& inAcceptableFormats)
{
    if (!inFrame)
        return {};
    const mvxmediatypes::PixelFormat target = mvxmediatypes::SelectNearestPixelFormat(
        std::vector<mvxmediatypes::PixelFormat>{inPreferredFormat}, inFrame->GetPixelFormat(),
        inAcceptableFormats, inParams.mQuality, true);
    if (target == inFrame->GetPixelFormat())
        return inFrame;

    const QRT::ParamRect bounds = inFrame->GetBounds();
    std::uint32_t width = static_cast<std::uint32_t>(bounds.Width());
    std::uint32_t height = static_cast<std::uint32_t>(bounds.Height());
    mvxmediatypes::PixelAspectRatio ratio = inFrame->GetPixelAspectRatio();
    if (UseRequestedSize(inFrame, inParams))
    {
        width = inParams.mWidth;
        height = inParams.mHeight;
        ratio = inParams.mPixelAspectRatio;
    }
    auto converted = VF::CreateVideoFrame(target, width, height, ratio, false, false);
    if (!converted)
        return inFrame;
    converted->SetFieldType(inFrame->GetFieldType());
    // A pair of formats the pixel code cannot convert leaves the frame as it
    // came rather than delivering uninitialised pixels.
    if (QRT::Failed(ConvertFramePixels(inFrame, converted, inParams.mQuality)))
        return inFrame;
    return converted;
}

bool CutlistRenderer::FrameAlreadyConformsToOutput(
    const QRT::InterfaceRef<MF::IVideoFrame>& inFrame, const CutlistRenderParams& inParams)
{
    const auto frameFieldType = static_cast<std::uint32_t>(inFrame->GetFieldType());
    if (static_cast<std::int32_t>(inParams.mQuality) >=
            static_cast<std::int32_t>(mvxmediatypes::kRenderQuality_Medium) &&
        frameFieldType != inParams.mFieldType)
    {
        // Only one field is needed of an interlaced frame offered for a
        // progressive request: it still serves.
        const bool oneFieldServes =
            inParams.mSingleField != 0 && frameFieldType != 0 && inParams.mFieldType == 0;
        if (!oneFieldServes)
            return false;
    }
    std::uint32_t offsetX = 0;
    std::uint32_t offsetY = 0;
    inFrame->GetOriginOffset(offsetX, offsetY);
    if (offsetX != MF::kNoOriginOffset || offsetY != MF::kNoOriginOffset)
        return false;
    if (!(inFrame->GetPixelAspectRatio() == inParams.mPixelAspectRatio))
        return false;
    if (inFrame->GetBounds() == MakeRect(inParams.mWidth, inParams.mHeight))
        return true;
    return inFrame->HasFullFrame(0) &&
           inFrame->GetFullFrameRect() ==
               MakeRect(inParams.mFullFrameWidth, inParams.mFullFrameHeight);
}

bool CutlistRenderer::UseRequestedSize(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                                       const CutlistRenderParams& inParams)
{
    if (!inFrame->HasFullFrame(0))
        return false;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    if (bounds == MakeRect(inParams.mWidth, inParams.mHeight))
        return false;
    if (bounds == MakeRect(inParams.mFullFrameWidth, inParams.mFullFrameHeight))
        return true;
    return inFrame->GetPixelFormat().IsHorizontallyHalved() &&
           bounds == MakeRect(inParams.mFullFrameWidth / 2, inParams.mFullFrameHeight);
}

QRT::Result CutlistRenderer::CollectCutlistPrefetches(
    const QRT::InterfaceRef<MF::IRenderableCutlist>& inCutlist, const CutlistRenderParams& inParams,
    RenderableNodePrefetchList& ioPrefetches)
{
    if (!inCutlist)
        return QRT::kResult_Success;
    QRT::InterfaceRef<MF::IRenderableNode> node;
    MF::FrameTime localTime = inParams.GetFrameTime();
    const QRT::Result status = inCutlist->GetNodeAtTime(inParams.GetFrameTime(), node, localTime);
    if (QRT::Failed(status))
        return status;
    if (!node)
        return QRT::kResult_Success;
    const auto provider = QRT::QueryRef<IRenderableNodePrefetchProvider>(node);
    if (provider)
    {
        // The range runs from the earlier to the later field time, so that a
        // lower-field-first frame still gives a forward range.
        const MF::TickTimeRange range(localTime.GetTime(), localTime.GetLaterTime());
        provider->Prefetch(range, inParams, ioPrefetches);
    }
    return QRT::kResult_Success;
}

} // namespace ML
