// The preview node: its keys, its two render paths and its producer.

#include "graph/RenderableNodePreviewImpl.h"

#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableSourceFilters.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "mvxcore/debug/DebugDatabase.h"

#include <string>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

QRT::ImmutableString Key(const char* inName)
{
    return QRT::ImmutableString::CreateStatic(inName);
}

const QRT::InterfaceRef<BE::IPreviewNode>&
RequirePreview(const QRT::InterfaceRef<BE::IPreviewNode>& inPreview)
{
    if (!inPreview || !inPreview->GetVideoSource())
        throw QRT::NullInterfaceException();
    return inPreview;
}

} // namespace

RenderableNodePreviewImpl::RenderableNodePreviewImpl(
    const QRT::InterfaceRef<BE::IPreviewNode>& inPreview)
    : mPreview(RequirePreview(inPreview))
{
    const BE::PreviewSettings& settings = mPreview->GetPreviewSettings();
    const BE::StreamSettings& stream = settings.mStream;
    const QRT::InterfaceRef<BE::Deprecated::IVideoSource> file = mPreview->GetVideoSource();
    mNewRenderer = !mvxcore::debug::DebugDatabase::GetBool("DisableNewMediaNodeRenderer") &&
                   !settings.mLegacyRenderer && !settings.mLegacyFile;
    const bool pulldown =
        mNewRenderer && settings.mPulldownCadence != mvxmediatypes::kPulldownCadence_None;

    QRT::InterfaceRef<IRenderableSource> source;
    if (mNewRenderer)
    {
        source = CreateRenderableSource(file, MF::BinaryData(), stream.mAlpha, QRT::ParamColor(0),
                                        false, false, stream.mFrameRate, stream.mFieldType,
                                        stream.mPixelAspectRatio, file->GetColorProfile());
        if (pulldown)
            source = RemovePulldownFromSource(source, settings.mPulldownCadence);
        source = ScaleAndPARCorrectSource(source);
    }
    else
    {
        source = CreateRenderableGetVideoSource(
            file, MF::BinaryData(), mvxmediatypes::kTime_Zero, mvxmediatypes::kTime_Zero,
            QRT::ParamColor(0), stream.mAlpha, false, false, false, 0.0, stream.mFrameRate);
    }
    mState.mSource = source;
    mState.mStill = file->IsStill();
    mState.mWidth = stream.mWidth;
    mState.mHeight = stream.mHeight;
    mState.mPixelAspectRatio = stream.mPixelAspectRatio;

    // The material's identity: its file, and the frame key of its first
    // frame, which changes when the file is rewritten.
    const std::string identity =
        settings.mPath + '\n' +
        file->GetFrameKey(mvxmediatypes::kTime_Zero, BE::VideoFrameRequest(), MF::BinaryData(),
                          file->GetColorProfile())
            .ToString();
    SetProperty(Key("MediaNode::MediaInstanceString"), settings.mPath, true);
    SetProperty(Key("MediaNode::MediaModState"), identity, true);
    SetTypedProperty(Key("MediaNode::StreamFrameRate"), stream.mFrameRate.GetTicksPerFrame(), true);
    SetTypedProperty(Key("MediaNode::StreamAlphaType"), static_cast<std::int32_t>(stream.mAlpha),
                     true);
    SetTypedProperty(Key("MediaNode::StreamRemovePulldown"), pulldown, true);
    SetTypedProperty(Key("MediaNode::StreamPullDownCadence"),
                     static_cast<std::int32_t>(settings.mPulldownCadence), true);
    SetTypedProperty(Key("MediaNode::StreamFrameWidth"), stream.mWidth, true);
    SetTypedProperty(Key("MediaNode::StreamFrameHeight"), stream.mHeight, true);
    SetTypedProperty(Key("MediaNode::StreamPixelAspectRatioNum"),
                     stream.mPixelAspectRatio.GetNumerator(), true);
    SetTypedProperty(Key("MediaNode::StreamPixelAspectRatioDen"),
                     stream.mPixelAspectRatio.GetDenominator(), true);
    SetTypedProperty(Key("MediaNode::StreamFieldType"),
                     static_cast<std::int32_t>(stream.mFieldType), true);
    SetTypedProperty(Key("MediaNode::ContentStart"), mvxmediatypes::kTime_Zero, true);
    SetTypedProperty(Key("MediaNode::ContentEnd"), settings.mEnd - settings.mStart, true);
    // Previews are shown frame by frame, never blended.
    SetTypedProperty(Key("MediaNode::StreamFrameBlend"), false, false);
}

QRT::ImmutableString RenderableNodePreviewImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodePreviewImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodePreviewImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

std::uint32_t RenderableNodePreviewImpl::ComputeRenderFlags() const
{
    const bool opaque =
        mPreview->GetPreviewSettings().mStream.mAlpha == mvxmediatypes::kAlphaChannel_None;
    return kRenderFlags_Media | (mState.mStill ? kRenderFlag_TimeInvariant : 0u) |
           (opaque ? kRenderFlag_Opaque : 0u);
}

void RenderableNodePreviewImpl::PrefetchSelf(const MF::TickTimeRange& inRange,
                                             const CutlistRenderParams& inParams,
                                             RenderableNodePrefetchList& ioPrefetches) const
{
    QRT::InterfaceRef<IRenderableNodeProducer> producer;
    GetProducer(producer, MF::FrameTime(inRange.first, inRange.second), inParams);
    if (const auto prefetcher = QRT::QueryRef<IRenderableNodePrefetchProvider>(producer))
        prefetcher->Prefetch(inRange, inParams, ioPrefetches);
}

void RenderableNodePreviewImpl::GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                                            const MF::FrameTime& /*inTime*/,
                                            const CutlistRenderParams& /*inParams*/) const
{
    outProducer = CreateMediaNodeProducer(mState, GetNodeHash(), mvxmediatypes::kTime_Invalid);
}

void RenderableNodePreviewImpl::GetStillRanges(TickTime /*inStart*/, TickTime /*inEnd*/,
                                               MF::TickTimeRangeList& /*ioRanges*/) const
{
}

void RenderableNodePreviewImpl::GetSmartRenderTimes(TickTime /*inStart*/, TickTime /*inEnd*/,
                                                    const mvxmediatypes::FrameRate& /*inFrameRate*/,
                                                    bool /*inFlag*/,
                                                    std::set<TickTime>& /*ioTimes*/) const
{
}

const BE::PreviewSettings& RenderableNodePreviewImpl::GetPreviewSettings() const noexcept
{
    return mPreview->GetPreviewSettings();
}

QRT::InterfaceRef<BE::Deprecated::IVideoSource> RenderableNodePreviewImpl::GetVideoSource() const
{
    return mPreview->GetVideoSource();
}

QRT::InterfaceRef<MF::IRenderableNode>
CreatePreviewNode(const QRT::InterfaceRef<BE::IPreviewNode>& inPreview)
{
    QRT::InterfaceRef<RenderableNodePreviewImpl> node =
        QRT::Allocated<RenderableNodePreviewImpl>::CreateInstance(inPreview);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
