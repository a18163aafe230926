// The solid-colour node and its colour-fill producer.

#include "graph/RenderableNodeSolidColorImpl.h"

#include "ML/RenderableNodes.h"
#include "ML/RenderablePropertyValue.h"
#include "QRT/Allocated.h"
#include "QRT/Hash.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxmediatypes/PixelFormat.h"

#include <string_view>

namespace ML
{
namespace
{

// Opaque white: the colour of a node whose colour key is absent.
constexpr std::uint32_t kDefaultSolidColor = 0xFFFFFFFFu;
// Transparent black: the colour of a node whose colour text cannot be read.
constexpr std::uint32_t kUnreadableSolidColor = 0;

constexpr std::string_view kFrameHashText = "RenderableNodeSolidColorImpl FrameHash";

const QRT::ImmutableString& ColorKey()
{
    static const QRT::ImmutableString sKey =
        QRT::ImmutableString::CreateStatic(kSolidColorNodeColorKey);
    return sKey;
}

// Renders one request of a solid-colour node. Made per request by the node,
// used by one thread at a time, holds only values (no reference to the node).
//
// Frame hash: "RenderableNodeSolidColorImpl FrameHash", then the colour (4
// bytes), the pixel format (8), width (4), height (4) and the pixel aspect
// ratio's numerator and denominator (4 each) of the request. That is exactly
// what the frame depends on: neither the time (the colour does not change)
// nor the node hash (two nodes of one colour give interchangeable frames, so
// they share cache entries).
class SolidColorNodeProducer : public QRT::Implements<IRenderableNodeProducer>
{
public:
    explicit SolidColorNodeProducer(std::uint32_t inColor)
        : mColor(inColor)
    {
    }

    QRT::Result ProduceFrame(const MF::FrameTime& /*inTime*/, const CutlistRenderParams& inParams,
                             QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        QRT::InterfaceRef<MF::IVideoFrame> frame =
            VF::CreateVideoFrame(inParams.mPixelFormat, inParams.mWidth, inParams.mHeight,
                                 inParams.mPixelAspectRatio, false, false);
        if (!frame)
            return QRT::kResult_NotFound;
        // Every raster format: the ones the image renderer writes are filled
        // in place, the others (16-bit and half-float RGB, float Y'CbCr)
        // through a staging copy converted into the frame.
        const QRT::Result status = VF::VideoFrameManipulators::FillWithColor(frame, mColor);
        if (QRT::Failed(status))
            return status;
        outFrame = std::move(frame);
        return QRT::kResult_Success;
    }

    void GetFrameHash(QRT::Guid& outHash, const MF::FrameTime& /*inTime*/,
                      const CutlistRenderParams& inParams) override
    {
        QRT::HashValue hash;
        QRT::MixHash::MixInString(hash, kFrameHashText);
        QRT::MixHash::MixInValue(hash, mColor);
        QRT::MixHash::MixInValue(hash, inParams.mPixelFormat.GetValue());
        QRT::MixHash::MixInValue(hash, inParams.mWidth);
        QRT::MixHash::MixInValue(hash, inParams.mHeight);
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetNumerator());
        QRT::MixHash::MixInValue(hash, inParams.mPixelAspectRatio.GetDenominator());
        outHash = QRT::HashValueToGuid(hash);
    }

protected:
    ~SolidColorNodeProducer() = default;

private:
    const std::uint32_t mColor;
};

} // namespace

QRT::ImmutableString RenderableNodeSolidColorImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeSolidColorImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeSolidColorImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

void RenderableNodeSolidColorImpl::SetColor(std::uint32_t inColor)
{
    SetTypedProperty(ColorKey(), inColor, true);
}

std::uint32_t RenderableNodeSolidColorImpl::GetResolvedColor() const
{
    MF::RenderablePropertyValue text;
    if (GetProperty(ColorKey(), text) != QRT::kResult_Success)
        return kDefaultSolidColor;
    std::uint32_t color = 0;
    if (!ParsePropertyValue(text, color))
        return kUnreadableSolidColor;
    return color;
}

void RenderableNodeSolidColorImpl::GetProducer(
    QRT::InterfaceRef<IRenderableNodeProducer>& outProducer, const MF::FrameTime& /*inTime*/,
    const CutlistRenderParams& /*inParams*/) const
{
    outProducer =
        QRT::Allocated<SolidColorNodeProducer>::Create<IRenderableNodeProducer>(GetResolvedColor());
}

void RenderableNodeSolidColorImpl::GetStillRanges(mvxmediatypes::TickTime /*inStart*/,
                                                  mvxmediatypes::TickTime /*inEnd*/,
                                                  MF::TickTimeRangeList& /*ioRanges*/) const
{
}

void RenderableNodeSolidColorImpl::GetSmartRenderTimes(
    mvxmediatypes::TickTime /*inStart*/, mvxmediatypes::TickTime /*inEnd*/,
    const mvxmediatypes::FrameRate& /*inFrameRate*/, bool /*inFlag*/,
    std::set<mvxmediatypes::TickTime>& /*ioTimes*/) const
{
}

QRT::InterfaceRef<MF::IRenderableNode> CreateSolidColorNode(std::uint32_t inColor)
{
    QRT::InterfaceRef<RenderableNodeSolidColorImpl> node =
        QRT::Allocated<RenderableNodeSolidColorImpl>::CreateInstance();
    node->SetColor(inColor);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
