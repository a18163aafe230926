// TransitionNodeProducer: renders one request of a transition node.

#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "VF/VideoFrame.h"
#include "graph/RenderableNodeTransitionImpl.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <algorithm>
#include <cstddef>
#include <string_view>

namespace ML
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

constexpr std::string_view kProducerHashText = "TransitionNodeProducer";
// The part of a motion record that is geometry (everything before the blend
// mode and opacity): what an input of a transition is drawn through.
constexpr std::size_t kGeometryBytes = offsetof(MotionRecord, mBlendMode);
static_assert(kGeometryBytes == 64);

MF::FrameTime InputTime(const MF::FrameTime& inTime, mvxmediatypes::TickTime inOffset)
{
    return MF::FrameTime(inTime.GetFirstFieldTime() - inOffset,
                         inTime.GetSecondFieldTime() - inOffset);
}

MotionRecord GeometryOnly(const MotionRecord& inRecord)
{
    MotionRecord record = inRecord;
    record.mBlendMode = kIR_BlendMode_Normal;
    record.mOpacity = 1.0f;
    return record;
}

bool IsPremultiplied(const MF::IVideoFrame& inFrame)
{
    return inFrame.GetAlphaChannel() == mvxmediatypes::kAlphaChannel_Premultiplied;
}

// Made per request by the node, used by one thread at a time; holds the
// input producers, the host transition and values only.
//
// Frame hash: "TransitionNodeProducer"; in fixed mode a fresh unique value,
// else per input its producer's frame hash at its input time and its two
// geometry records (64 bytes each), or the nil hash without a producer; then the request's pixel
// aspect ratio (8 bytes), width (4), height (4), the node hash (16), the requested frame time (16),
// quality (4), secondary quality (4) and pixel format (8).
class TransitionNodeProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    explicit TransitionNodeProducer(TransitionProducerSetup inSetup)
        : mSetup(std::move(inSetup))
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        const mvxmediatypes::PixelFormat format = GetCompositingFormat(inParams);
        FrameRef output = VF::CreateVideoFrame(format, inParams.mWidth, inParams.mHeight,
                                               inParams.mPixelAspectRatio, false, false);
        if (!output)
            return QRT::kResult_NotFound;
        output->SetFieldType(static_cast<mvxmediatypes::FieldType>(inParams.mFieldType));
        FrameRef frames[2];
        for (std::size_t index = 0; index < 2; ++index)
        {
            const TransitionProducerSetup::Side& side = mSetup.mSides[index];
            FrameRef frame = side.mFixedFrame;
            if (!mSetup.mFixed)
            {
                if (!side.mProducer)
                    continue;
                const QRT::Result status =
                    side.mProducer->ProduceFrame(InputTime(inTime, side.mOffset), inParams, frame);
                if (QRT::Failed(status))
                    return status;
            }
            if (!frame)
                continue;
            frame = ApplyMotion(frame, GeometryOnly(side.mFirstField),
                                GeometryOnly(side.mSecondField), inParams);
            frames[index] = frame ? Conform(frame, *output, inParams) : frame;
            if (!frames[index])
                return QRT::kResult_NotFound;
        }
        TX::TransitionFrameSettings settings;
        settings.mFieldType = output->GetFieldType();
        settings.mSecondFieldProgress = Progress(inTime.GetSecondFieldTime());
        settings.mScale = static_cast<float>(inParams.mHorizontalScale);
        const QRT::Result status = mSetup.mTransition->Render(
            frames[0].Get(), frames[1].Get(), *output, Progress(inTime.GetFirstFieldTime()),
            mSetup.mParameters, settings, inParams.mQuality);
        if (QRT::Failed(status))
            return status;
        outFrame = std::move(output);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kProducerHashText);
        if (mSetup.mFixed)
            QRT::MixHash::MixInGuid(hash, QRT::Guid::CreateUnique());
        for (const TransitionProducerSetup::Side& side : mSetup.mSides)
        {
            if (mSetup.mFixed)
                continue;
            if (!side.mProducer)
            {
                QRT::MixHash::MixInGuid(hash, QRT::Guid());
                continue;
            }
            QRT::Guid input;
            side.mProducer->GetFrameHash(input, InputTime(inTime, side.mOffset), inParams);
            QRT::MixHash::MixInGuid(hash, input);
            QRT::MixHash::MixInData(hash, &side.mFirstField, kGeometryBytes);
            QRT::MixHash::MixInData(hash, &side.mSecondField, kGeometryBytes);
        }
        const std::uint32_t aspect[2] = {inParams.mPixelAspectRatio.GetNumerator(),
                                         inParams.mPixelAspectRatio.GetDenominator()};
        QRT::MixHash::MixInValue(hash, aspect);
        QRT::MixHash::MixInValue(hash, inParams.mWidth);
        QRT::MixHash::MixInValue(hash, inParams.mHeight);
        QRT::MixHash::MixInGuid(hash, mSetup.mNodeHash);
        const std::int64_t time[2] = {inTime.GetFirstFieldTime().GetTicks(),
                                      inTime.GetSecondFieldTime().GetTicks()};
        QRT::MixHash::MixInValue(hash, time);
        QRT::MixHash::MixInValue(hash, inParams.mQuality);
        QRT::MixHash::MixInValue(hash, inParams.mSecondaryQuality);
        QRT::MixHash::MixInValue(hash, inParams.mPixelFormat.GetValue());
        outHash = QRT::HashValueToGuid(hash);
    }

protected:
    ~TransitionNodeProducer() = default;

private:
    // Node time over the duration, 0 to 1; a transition of no length is over.
    float Progress(mvxmediatypes::TickTime inTime) const
    {
        const std::int64_t duration = mSetup.mParameters.mDuration.GetTicks();
        if (duration <= 0)
            return 1.0f;
        return std::clamp(static_cast<float>(static_cast<double>(inTime.GetTicks()) /
                                             static_cast<double>(duration)),
                          0.0f, 1.0f);
    }

    // inFrame in the output's format, size and alpha kind: itself when it
    // already is, else drawn unmoved into a new frame of the request.
    static FrameRef Conform(const FrameRef& inFrame, const MF::IVideoFrame& inOutput,
                            const CutlistRenderParams& inParams)
    {
        if (inFrame->GetPixelFormat() == inOutput.GetPixelFormat() &&
            inFrame->GetBounds().Width() == inOutput.GetBounds().Width() &&
            inFrame->GetBounds().Height() == inOutput.GetBounds().Height() &&
            IsPremultiplied(*inFrame) == IsPremultiplied(inOutput))
            return inFrame;
        return CompositeLayer(inFrame, kIdentityMotionRecord, kIdentityMotionRecord, {}, inParams);
    }

    const TransitionProducerSetup mSetup;
};

} // namespace

QRT::InterfaceRef<IRenderableNodeProducer>
CreateTransitionNodeProducer(TransitionProducerSetup inSetup)
{
    return QRT::Allocated<TransitionNodeProducer>::Create<IRenderableNodeProducer>(
        std::move(inSetup));
}

} // namespace ML
