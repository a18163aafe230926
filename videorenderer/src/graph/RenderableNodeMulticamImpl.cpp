// The multicam node and its producer.

#include "graph/RenderableNodeMulticamImpl.h"

#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "QRT/Hash.h"
#include "VF/MulticamRender.h"
#include "mvxcore/debug/Contract.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <string_view>

namespace ML
{
namespace
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using ProducerRef = QRT::InterfaceRef<IRenderableNodeProducer>;

constexpr std::string_view kFrameHashText = "RenderableNodeMulticamImpl";

MF::FrameTime InputTime(const MF::FrameTime& inTime, mvxmediatypes::TickTime inOffset)
{
    return MF::FrameTime(inTime.GetFirstFieldTime() - inOffset,
                         inTime.GetSecondFieldTime() - inOffset);
}

struct AngleProducer
{
    ProducerRef mProducer; // empty when the angle renders nothing at the time
    mvxmediatypes::TickTime mOffset;
};

// Made per request by the node, used by one thread at a time; holds the
// angles' producers and values only.
class MulticamNodeProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    MulticamNodeProducer(std::vector<AngleProducer> inAngles, std::uint64_t inSelected,
                         bool inShowProgram, bool inRecording, bool inIsNonMultiCam)
        : mAngles(std::move(inAngles))
        , mSelected(inSelected)
        , mShowProgram(inShowProgram)
        , mRecording(inRecording)
        , mIsNonMultiCam(inIsNonMultiCam)
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                             FrameRef& outFrame) override
    {
        const std::size_t shown = mIsNonMultiCam ? 0 : static_cast<std::size_t>(mSelected);
        VF::MulticamFrames frames(mAngles.size());
        for (std::size_t i = 0; i < mAngles.size(); ++i)
        {
            if (!mAngles[i].mProducer || (!mShowProgram && i != shown))
                continue;
            const QRT::Result status = mAngles[i].mProducer->ProduceFrame(
                InputTime(inTime, mAngles[i].mOffset), inParams, frames[i]);
            if (QRT::Failed(status))
                return status;
        }
        const mvxmediatypes::PixelFormat format = GetCompositingFormat(inParams);
        const auto quality = static_cast<mvxmediatypes::RenderQuality>(inParams.mQuality);
        FrameRef frame;
        if (mIsNonMultiCam)
        {
            QRT::Guid key;
            GetFrameHash(key, inTime, inParams);
            frame = VF::RenderNonMulticam(
                frames, mShowProgram,
                VF::UnSelectedRenderParams(format, inParams.mWidth, inParams.mHeight,
                                           inParams.mPixelAspectRatio, quality),
                key);
        }
        else
            frame = VF::RenderMulticam(
                frames, mSelected, mShowProgram, mRecording,
                VF::SelectedRenderParams(format, inParams.mWidth, inParams.mHeight,
                                         inParams.mPixelAspectRatio, quality));
        if (!frame)
            return QRT::kResult_NotFound;
        if (frame != frames[shown] && !frame->IsShared())
            frame->SetFieldType(static_cast<mvxmediatypes::FieldType>(inParams.mFieldType));
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& inTime,
                      const CutlistRenderParams& inParams) override
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kFrameHashText);
        for (const AngleProducer& angle : mAngles)
        {
            QRT::Guid input;
            if (angle.mProducer)
                angle.mProducer->GetFrameHash(input, InputTime(inTime, angle.mOffset), inParams);
            QRT::MixHash::MixInGuid(hash, input);
        }
        QRT::MixHash::MixInValue(hash, mSelected);
        const std::uint8_t flags[3] = {static_cast<std::uint8_t>(mShowProgram),
                                       static_cast<std::uint8_t>(mRecording),
                                       static_cast<std::uint8_t>(mIsNonMultiCam)};
        QRT::MixHash::MixInValue(hash, flags);
        outHash = QRT::HashValueToGuid(hash);
    }

protected:
    ~MulticamNodeProducer() = default;

private:
    const std::vector<AngleProducer> mAngles;
    const std::uint64_t mSelected;
    const bool mShowProgram;
    const bool mRecording;
    const bool mIsNonMultiCam;
};

} // namespace

QRT::ImmutableString RenderableNodeMulticamImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeMulticamImpl");
}

std::uint32_t RenderableNodeMulticamImpl::ComputeRenderFlags() const
{
    return 0;
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeMulticamImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

void RenderableNodeMulticamImpl::SetMulticam(const QRT::InterfaceRef<BE::IMulticamMedia>& inSource,
                                             std::uint64_t inSelectedTrack, bool inShowProgram,
                                             bool inRecording, bool inIsNonMultiCam)
{
    MVX_INPUT_CONTRACT(IsMutable());
    mSource = inSource;
    mSelectedTrack = inSelectedTrack;
    mShowProgram = inShowProgram;
    mRecording = inRecording;
    mIsNonMultiCam = inIsNonMultiCam;
    static const QRT::ImmutableString sIsNonMultiCam =
        QRT::ImmutableString::CreateStatic("MulticamNode::IsNonMultiCam");
    static const QRT::ImmutableString sSelectedTrack =
        QRT::ImmutableString::CreateStatic("MulticamNode::SelectedTrack");
    static const QRT::ImmutableString sRecording =
        QRT::ImmutableString::CreateStatic("MulticamNode::Recording");
    static const QRT::ImmutableString sShowProgram =
        QRT::ImmutableString::CreateStatic("MulticamNode::ShowProgram");
    SetTypedProperty(sIsNonMultiCam, inIsNonMultiCam, true);
    if (!inIsNonMultiCam)
    {
        SetTypedProperty(sSelectedTrack, inSelectedTrack, true);
        SetTypedProperty(sRecording, inRecording, true);
    }
    SetTypedProperty(sShowProgram, inShowProgram, true);
}

void RenderableNodeMulticamImpl::GetProducer(ProducerRef& outProducer, const MF::FrameTime& inTime,
                                             const CutlistRenderParams& inParams) const
{
    std::vector<AngleProducer> angles;
    for (const auto& [node, offset] : GetInputs())
    {
        AngleProducer angle{{}, offset};
        if (const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node))
            provider->GetProducer(angle.mProducer, InputTime(inTime, offset), inParams);
        angles.push_back(std::move(angle));
    }
    outProducer = QRT::Allocated<MulticamNodeProducer>::Create<IRenderableNodeProducer>(
        std::move(angles), mSelectedTrack, mShowProgram, mRecording, mIsNonMultiCam);
}

void RenderableNodeMulticamImpl::GetStillRanges(mvxmediatypes::TickTime inStart,
                                                mvxmediatypes::TickTime inEnd,
                                                MF::TickTimeRangeList& ioRanges) const
{
    if (mShowProgram)
        return;
    const std::size_t shown = mIsNonMultiCam ? 0 : static_cast<std::size_t>(mSelectedTrack);
    const auto& [node, offset] = GetInputs()[shown];
    const auto provider = QRT::QueryRef<IRenderableNodeProducerProvider>(node);
    if (!provider)
        return;
    MF::TickTimeRangeList ranges;
    provider->GetStillRanges(inStart - offset, inEnd - offset, ranges);
    for (const auto& [start, end] : ranges)
        ioRanges.emplace_back(start + offset, end + offset);
}

void RenderableNodeMulticamImpl::GetSmartRenderTimes(
    mvxmediatypes::TickTime /*inStart*/, mvxmediatypes::TickTime /*inEnd*/,
    const mvxmediatypes::FrameRate& /*inFrameRate*/, bool /*inFlag*/,
    std::set<mvxmediatypes::TickTime>& /*ioTimes*/) const
{
}

QRT::InterfaceRef<MF::IRenderableNode> CreateMulticamNode(const MulticamNodeSetup& inSetup)
{
    MVX_INPUT_CONTRACT(!inSetup.mAngles.empty());
    MVX_INPUT_CONTRACT(inSetup.mSelectedTrack < inSetup.mAngles.size());
    QRT::InterfaceRef<RenderableNodeMulticamImpl> node =
        QRT::Allocated<RenderableNodeMulticamImpl>::CreateInstance();
    for (const QRT::InterfaceRef<MF::IRenderableNode>& angle : inSetup.mAngles)
    {
        if (!angle)
            throw QRT::NullInterfaceException();
        node->AddInput(angle, mvxmediatypes::kTime_Zero);
    }
    node->SetMulticam(inSetup.mSource, inSetup.mSelectedTrack, inSetup.mShowProgram,
                      inSetup.mRecording, inSetup.mIsNonMultiCam);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
