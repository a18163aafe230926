// ClipNodeProducer: renders one request of a clip node: the input at the
// mapped time, conformed to the request, then the clip's operators in order.

#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "VF/SharedVideoFrameCache.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "graph/RenderableNodeClipImpl.h"

#include <algorithm>
#include <string_view>
#include <utility>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

constexpr std::string_view kFrameHashText = "ClipNodeProducer FrameHash";

// Clip time to the transform's time, before a time-invariant input is sent
// to time 0.
MF::FrameTime MapThroughTransform(const ClipProducerSetup& inSetup, const MF::FrameTime& inTime)
{
    TickTime first = inTime.GetFirstFieldTime() - inSetup.mOffset;
    TickTime second = inTime.GetSecondFieldTime() - inSetup.mOffset;
    if (inSetup.mOffset > mvxmediatypes::kTime_Zero)
    {
        first = std::max(first, mvxmediatypes::kTime_Zero);
        second = std::max(second, mvxmediatypes::kTime_Zero);
    }
    if (!inSetup.mTransform)
        return {first, second};
    return {inSetup.mTransform->Transform(first), inSetup.mTransform->Transform(second)};
}

// Made per request by RenderableNodeClipImpl; used by one thread at a time.
// Holds the input's producer and the operators made for the request.
//
// Intermediate caching (render flag 1, or 2 with a time-invariant input)
// keeps the input's frame under the input's hash and the finished frame
// under the full hash, so that a later request skips whatever is already
// done.
class ClipNodeProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    explicit ClipNodeProducer(ClipProducerSetup inSetup)
        : mSetup(std::move(inSetup))
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        outFrame.Reset();
        const MF::FrameTime mapped = MapThroughTransform(mSetup, inTime);
        const MF::FrameTime inputTime = MapClipTime(mSetup, inTime);
        const auto quality = static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality);
        const bool operators = !mSetup.mOperators.empty();
        const bool caching = !mSetup.mFixedFrame &&
                             ((inParams.mRenderFlags & 1) != 0 ||
                              ((inParams.mRenderFlags & 2) != 0 && mSetup.mInputTimeInvariant));
        QRT::Guid fullHash;
        if (caching && operators)
        {
            fullHash = ComputeHash(inTime, inParams);
            if (FrameRef hit = VF::SharedVideoFrameCache::RetrieveFromCache(fullHash))
            {
                outFrame = std::move(hit);
                return QRT::kResult_Success;
            }
        }

        FrameRef frame = mSetup.mFixedFrame;
        if (!frame && mSetup.mInput)
        {
            QRT::Guid inputHash;
            mSetup.mInput->GetFrameHash(inputHash, inputTime, inParams);
            frame = VF::SharedVideoFrameCache::RetrieveFromCache(inputHash);
            if (!frame)
            {
                const QRT::Result status = mSetup.mInput->ProduceFrame(inputTime, inParams, frame);
                if (QRT::Failed(status))
                    return status;
                if (caching && frame)
                    Cache(frame, inputHash, inParams);
            }
        }
        if (!frame)
            return QRT::kResult_Success;

        const mvxmediatypes::FieldType expected = inputTime.GetFieldOrder();
        if (inTime.IsInterlaced() && frame->GetFieldType() != expected)
        {
            frame = VF::MakeWriteableVideoFrame(frame, quality);
            frame->SetFieldType(expected);
        }
        if (!operators)
        {
            outFrame = std::move(frame);
            return QRT::kResult_Success;
        }
        const QRT::Result conformed = Conform(frame, inParams, quality);
        if (QRT::Failed(conformed))
            return conformed;
        for (std::size_t i = 0; i < mSetup.mOperators.size(); ++i)
        {
            // A setup may leave out the layer lists of operators that read none.
            static const SubTreeRenderList sNoLayers;
            const SubTreeRenderList& layers =
                i < mSetup.mLayerInputs.size() ? mSetup.mLayerInputs[i] : sNoLayers;
            const QRT::Result status = mSetup.mOperators[i]->ApplyOperator(
                OperatorTime(inTime), mapped, inParams, layers, frame, 0);
            if (QRT::Failed(status))
                return status;
        }
        if (caching && frame)
            Cache(frame, fullHash, inParams);
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override
    {
        // A caller's frame is never shared through the cache.
        if (mSetup.mFixedFrame)
        {
            outHash = QRT::Guid::CreateUnique();
            return;
        }
        if (mSetup.mInput && mSetup.mOperators.empty())
        {
            mSetup.mInput->GetFrameHash(outHash, MapClipTime(mSetup, inTime), inParams);
            return;
        }
        outHash = ComputeHash(inTime, inParams);
    }

protected:
    ~ClipNodeProducer() = default;

private:
    // The clip time the operators render at: the held time for a frame hold
    // with filters, else the requested time.
    MF::FrameTime OperatorTime(const MF::FrameTime& inTime) const
    {
        return mSetup.mOperatorHoldTime.IsValid() ? MF::FrameTime(mSetup.mOperatorHoldTime)
                                                  : inTime;
    }

    QRT::Guid ComputeHash(const MF::FrameTime& inTime, const CutlistRenderParams& inParams)
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kFrameHashText);
        QRT::MixHash::MixInGuid(hash, mSetup.mNodeHash);
        QRT::MixHash::MixInValue(hash, std::uint8_t{0});
        if (mSetup.mInput)
        {
            QRT::Guid inputHash;
            mSetup.mInput->GetFrameHash(inputHash, MapClipTime(mSetup, inTime), inParams);
            QRT::MixHash::MixInGuid(hash, inputHash);
        }
        // Effects are keyed in the clip's time and render at it (ApplyOperator's
        // output time), so their hashes take that time, not the input's: a
        // frame hold without filters or a re-timing maps many clip times to
        // one input time while an animated effect still changes.
        for (const QRT::InterfaceRef<IRenderableNodeOperator>& effect : mSetup.mOperators)
        {
            QRT::Guid operatorHash;
            effect->GetOperatorHash(operatorHash, OperatorTime(inTime), inParams);
            QRT::MixHash::MixInGuid(hash, operatorHash);
        }
        return QRT::HashValueToGuid(hash);
    }

    static void Cache(const FrameRef& inFrame, const QRT::Guid& inHash,
                      const CutlistRenderParams& inParams)
    {
        inFrame->MarkShared(1);
        VF::SharedVideoFrameCache::InsertIntoCache(inFrame, inHash, inParams.mCachePriority);
    }

    // Brings the input frame to the request before the operators run: a
    // frame that is not a full-frame rendering is placed, at its own size and
    // centred, on a clear frame of the request's size; a larger frame is given
    // the origin offset that centres the request inside it.
    static QRT::Result Conform(FrameRef& ioFrame, const CutlistRenderParams& inParams,
                               mvxmediatypes::RenderQuality inQuality)
    {
        const auto width = static_cast<std::int32_t>(inParams.mWidth);
        const auto height = static_cast<std::int32_t>(inParams.mHeight);
        if (!ioFrame->HasFullFrame(0))
        {
            FrameRef placed =
                VF::CreateVideoFrame(ioFrame->GetPixelFormat(), inParams.mWidth, inParams.mHeight,
                                     inParams.mPixelAspectRatio, true, false);
            if (!placed)
                return VF::kResult_OutOfFrameMemory;
            placed->SetFieldType(ioFrame->GetFieldType());
            placed->SetAlphaChannel(ioFrame->GetAlphaChannel());
            const QRT::ParamRect source = ioFrame->GetBounds();
            // Even offsets keep 4:2:2 pairs whole.
            const std::int32_t dx = ((width - source.Width()) / 2) & ~1;
            const std::int32_t dy = (height - source.Height()) / 2;
            const QRT::ParamRect target(std::max(0, dx), std::max(0, dy),
                                        std::min(width, dx + source.Width()),
                                        std::min(height, dy + source.Height()));
            if (target.Width() > 0 && target.Height() > 0)
            {
                const QRT::ParamRect from(target.mLeft - dx, target.mTop - dy, target.mRight - dx,
                                          target.mBottom - dy);
                const QRT::Result copied = VF::VideoFrameManipulators::CopyRect(
                    ioFrame, from, placed, target, inQuality, VF::kCopyChannels_All);
                if (QRT::Failed(copied))
                    return copied;
            }
            placed->SetFullFrameRect(QRT::ParamRect(0, 0, width, height));
            ioFrame = std::move(placed);
            return QRT::kResult_Success;
        }
        const QRT::ParamRect bounds = ioFrame->GetBounds();
        if (bounds.Width() <= width && bounds.Height() <= height)
            return QRT::kResult_Success;
        const auto x = static_cast<std::uint32_t>(std::max(0, (bounds.Width() - width) / 2));
        const auto y = static_cast<std::uint32_t>(std::max(0, (bounds.Height() - height) / 2));
        std::uint32_t haveX = 0;
        std::uint32_t haveY = 0;
        ioFrame->GetOriginOffset(haveX, haveY);
        if (haveX == x && haveY == y)
            return QRT::kResult_Success;
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, inQuality);
        ioFrame->SetOriginOffset(x, y);
        return QRT::kResult_Success;
    }

    ClipProducerSetup mSetup;
};

} // namespace

MF::FrameTime MapClipTime(const ClipProducerSetup& inSetup, const MF::FrameTime& inTime)
{
    if (inSetup.mInputTimeInvariant)
        return MF::FrameTime();
    return MapThroughTransform(inSetup, inTime);
}

QRT::InterfaceRef<IRenderableNodeProducer> CreateClipNodeProducer(ClipProducerSetup inSetup)
{
    return QRT::Allocated<ClipNodeProducer>::Create<IRenderableNodeProducer>(std::move(inSetup));
}

} // namespace ML
