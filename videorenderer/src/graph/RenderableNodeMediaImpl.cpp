// The media node: its keys, its source chain, its flags and still ranges.

#include "graph/RenderableNodeMediaImpl.h"

#include "BE/CutlistProvider.h"
#include "ML/RenderFlags.h"
#include "ML/RenderableCutlistSource.h"
#include "ML/RenderablePropertyValue.h"
#include "ML/RenderableSourceFilters.h"
#include "ML/RenderableVideoSources.h"
#include "QRT/Allocated.h"
#include "QRT/Exception.h"
#include "graph/ClipTimeTransforms.h"

#include <algorithm>
#include <string>
#include <string_view>

namespace ML
{
namespace
{

using mvxmediatypes::TickTime;

QRT::ImmutableString Key(const char* inName)
{
    return QRT::ImmutableString::CreateStatic(inName);
}

// What tells this media's material apart from any other's: its kind,
// location, resolved path and colour, and the frame key its source gives the
// first frame (which covers the file's size and modification time). Two
// media nodes of different material must never share a node hash, since
// frame hashes, and so cached frames, are made from it.
MF::BinaryData MaterialIdentity(const BE::ISequenceMedia& inMedia,
                                const QRT::InterfaceRef<BE::Deprecated::IVideoSource>& inSource)
{
    const BE::MediaSettings& settings = inMedia.GetMediaSettings();
    std::string text = std::to_string(static_cast<int>(settings.mKind)) + '\n' +
                       settings.mLocation + '\n' + settings.mResolvedPath + '\n' +
                       std::to_string(settings.mColor);
    if (inSource)
        text += '\n' + inSource
                           ->GetFrameKey(mvxmediatypes::kTime_Zero, BE::VideoFrameRequest(),
                                         inMedia.GetOpaqueData(), inMedia.GetColorProfile())
                           .ToString();
    return MF::BinaryData::FromText(text);
}

BE::SequenceSettings SequenceOf(const MediaNodeSetup& inSetup, const BE::StreamSettings& inStream)
{
    if (inSetup.mHasSequence)
        return inSetup.mSequence;
    return {mvxmediatypes::kFrameRate_Zero, inStream.mWidth, inStream.mHeight,
            mvxmediatypes::kPixelAspectRatio_Square, inStream.mFieldType};
}

mvxmediatypes::FieldType Swapped(mvxmediatypes::FieldType inOrder)
{
    return inOrder == mvxmediatypes::kFieldType_UpperFirst ? mvxmediatypes::kFieldType_LowerFirst
                                                           : mvxmediatypes::kFieldType_UpperFirst;
}

} // namespace

RenderableNodeMediaImpl::RenderableNodeMediaImpl(const MediaNodeSetup& inSetup)
{
    if (!inSetup.mMedia)
        throw QRT::NullInterfaceException();
    BuildSourceChain(inSetup);
}

void RenderableNodeMediaImpl::BuildSourceChain(const MediaNodeSetup& inSetup)
{
    const BE::ISequenceMedia& media = *inSetup.mMedia;
    if (inSetup.mStreamIndex >= media.GetVideoStreamCount())
        throw QRT::NullInterfaceException();
    const QRT::InterfaceRef<BE::IMediaStream> stream = media.GetVideoStream(inSetup.mStreamIndex);
    const BE::StreamSettings& settings = stream->GetStreamSettings();
    BE::TrackItemSettings item;
    if (inSetup.mTrackItem)
    {
        item = inSetup.mTrackItem->GetSettings();
        item.mClip = inSetup.mTrackItem->GetClip()->GetClipSettings();
    }
    const BE::ClipSettings& clip = item.mClip;
    const BE::SequenceSettings sequence = SequenceOf(inSetup, settings);
    const bool still = media.IsStill();
    const bool hold = clip.mFrameHold.IsSet();
    const bool holdDeinterlace = hold && clip.mFrameHold.mDeinterlace;
    const bool frameBlend = clip.mFrameBlend && !still && !hold;
    const auto mode = static_cast<std::int32_t>(clip.mFieldProcessing);
    const mvxmediatypes::AlphaChannel alpha = clip.mAlpha.mType != mvxmediatypes::kAlphaChannel_None
                                                  ? clip.mAlpha.mType
                                                  : settings.mAlpha;
    const bool pulldown =
        clip.mPulldown.mRemove && clip.mPulldown.mCadence != mvxmediatypes::kPulldownCadence_None;
    const QRT::InterfaceRef<BE::ISequence> nested = media.GetNestedSequence();
    const QRT::InterfaceRef<BE::Deprecated::IVideoSource> videoSource = stream->GetVideoSource();

    mState.mStill = still;
    mState.mFrameHoldAt = clip.mFrameHold.mAt;
    mState.mFrameHoldDeinterlace = holdDeinterlace;
    mState.mScaleToFrame = clip.mScaleToFrame;
    mState.mWidth = settings.mWidth;
    mState.mHeight = settings.mHeight;
    mState.mPixelAspectRatio = settings.mPixelAspectRatio;

    // 1. The base source; muted media are not read at all.
    QRT::InterfaceRef<IRenderableSource> source;
    if (!inSetup.mMuted && nested)
    {
        if (!inSetup.mNestedCutlist)
            throw QRT::NullInterfaceException();
        BE::CutlistProviderSettings described;
        described.mRight = settings.mWidth;
        described.mBottom = settings.mHeight;
        described.mPixelAspectRatio = settings.mPixelAspectRatio;
        described.mFieldType = settings.mFieldType;
        described.mFrameRate = settings.mFrameRate;
        const QRT::InterfaceRef<BE::ICutlistProvider> provider =
            BE::CreateCutlistProvider(described);
        provider->SetCutlists(QRT::ImmutableString(),
                              {inSetup.mNestedCutlist, inSetup.mNestedCutlist, {}});
        source =
            CreateRenderableCutlistSource(provider, settings.mFrameRate, QRT::ImmutableString());
        mState.mMaterialHashes.push_back(inSetup.mNestedCutlist->GetCutlistHash());
    }
    else if (!inSetup.mMuted && videoSource)
    {
        source = CreateRenderableSource(
            videoSource, media.GetOpaqueData(), alpha, QRT::ParamColor(clip.mAlpha.mMatteColor),
            clip.mAlpha.mIgnore, clip.mAlpha.mInvert, settings.mFrameRate, settings.mFieldType,
            settings.mPixelAspectRatio, media.GetColorProfile());
    }

    // 2. to 6. Pulldown removal, or the field filters.
    mvxmediatypes::FieldType order = settings.mFieldType;
    if (source && pulldown)
        source = RemovePulldownFromSource(source, clip.mPulldown.mCadence);
    else if (source)
    {
        if (mvxmediatypes::IsInterlaced(order) && !still)
        {
            if (clip.mReverseFieldDominance)
            {
                source = ReverseFieldDominanceOfSource(source);
                order = Swapped(order);
            }
            const bool shrinking = clip.mScaleToFrame && sequence.mHeight < settings.mHeight;
            if (mvxmediatypes::IsInterlaced(sequence.mFieldType) && order != sequence.mFieldType &&
                !shrinking)
                source = FieldReverseSource(source);
        }
        if (mode == 2 || holdDeinterlace)
            source = DeinterlaceSource(source);
        if (mode == 3)
            source = RemoveFlickerFromSource(source);
        if (!still && mode == 1)
            source = InterlaceConsecutiveFramesFromSource(source);
    }
    // 7. and 8. Scaling, then re-timing.
    if (source)
    {
        source = ScaleAndPARCorrectSource(source);
        if (frameBlend)
            source = TimeBlendSource(source, CreatePlaybackTimeTransform(item), clip.mSpeed);
        else if (!still)
            source = TimeMixSource(source);
    }
    mState.mSource = source;
    mState.mBlack = !source && (inSetup.mMuted || (!media.IsOffline() && !media.IsPending()));
    mState.mOfflinePicture = !source && !mState.mBlack && media.IsOffline();
    mState.mPendingPicture = !source && !mState.mBlack && !media.IsOffline();
    const bool transparentSolid = media.GetMediaSettings().mKind == BE::MediaKind::kSolid &&
                                  (media.GetMediaSettings().mColor >> 24) != 0xFF;
    const bool alphaShows = alpha != mvxmediatypes::kAlphaChannel_None &&
                            alpha != mvxmediatypes::kAlphaChannel_Ignore && !clip.mAlpha.mIgnore;
    mOpaque = mState.mOfflinePicture || mState.mPendingPicture ||
              (source && !nested && !alphaShows && !transparentSolid);

    if (const QRT::InterfaceRef<BE::IStillRanges> ranges =
            QRT::QueryRef<BE::IStillRanges>(inSetup.mMedia))
        ranges->GetStillRanges(mvxmediatypes::kTime_Zero, mvxmediatypes::kTime_Max, mStillRanges);

    // The keys.
    SetTypedProperty(Key("MediaNode::ClipID"), inSetup.mClipID, false);
    SetProperty(Key("MediaNode::MediaInstanceString"), media.GetMediaSettings().mLocation, false);
    SetProperty(Key("MediaNode::MediaModState"),
                FormatPropertyValue(MaterialIdentity(media, videoSource)), true);
    SetTypedProperty(Key("MediaNode::MediaStreamGroup"),
                     static_cast<std::uint64_t>(inSetup.mStreamIndex), true);
    SetProperty(Key("MediaNode::MediaStreamLabel"), inSetup.mStreamLabel, true);
    SetTypedProperty(Key("MediaNode::MediaIsDraft"), media.IsDraft(), true);
    SetTypedProperty(Key("MediaNode::MediaIsOffline"), media.IsOffline(), true);
    SetTypedProperty(Key("MediaNode::MediaIsPending"), media.IsPending(), true);
    SetTypedProperty(Key("MediaNode::StreamFrameRate"), settings.mFrameRate.GetTicksPerFrame(),
                     true);
    SetTypedProperty(Key("MediaNode::StreamAlphaType"), static_cast<std::int32_t>(alpha), true);
    SetTypedProperty(Key("MediaNode::StreamIgnoreAlpha"), clip.mAlpha.mIgnore, true);
    SetTypedProperty(Key("MediaNode::StreamInvertAlpha"), clip.mAlpha.mInvert, true);
    SetTypedProperty(Key("MediaNode::StreamAlphaMatteColor"), clip.mAlpha.mMatteColor, true);
    SetTypedProperty(Key("MediaNode::StreamRemovePulldown"), clip.mPulldown.mRemove, true);
    SetTypedProperty(Key("MediaNode::StreamPullDownCadence"),
                     static_cast<std::int32_t>(clip.mPulldown.mCadence), true);
    SetTypedProperty(Key("MediaNode::StreamFrameWidth"), settings.mWidth, true);
    SetTypedProperty(Key("MediaNode::StreamFrameHeight"), settings.mHeight, true);
    SetTypedProperty(Key("MediaNode::StreamPixelAspectRatioNum"),
                     settings.mPixelAspectRatio.GetNumerator(), true);
    SetTypedProperty(Key("MediaNode::StreamPixelAspectRatioDen"),
                     settings.mPixelAspectRatio.GetDenominator(), true);
    SetTypedProperty(Key("MediaNode::StreamFieldType"),
                     static_cast<std::int32_t>(settings.mFieldType), true);
    SetProperty(Key("MediaNode::StreamOpaqueData"), FormatPropertyValue(media.GetOpaqueData()),
                true);
    if (const auto duration = QRT::QueryRef<BE::IMediaDuration>(inSetup.mMedia))
    {
        SetTypedProperty(Key("MediaNode::ContentStart"), mvxmediatypes::kTime_Zero, true);
        SetTypedProperty(Key("MediaNode::ContentEnd"), duration->GetDuration(), true);
    }
    if (nested)
        SetProperty(Key("MediaNode::NestedSequenceHash"),
                    inSetup.mNestedCutlist->GetCutlistHash().ToString(), true);
    if (inSetup.mSelectedMulticamTrack)
        SetTypedProperty(Key("MediaNode::SelectedMulticamTrack"), *inSetup.mSelectedMulticamTrack,
                         true);
    SetTypedProperty(Key("MediaNode::TrackItemIsMuted"), inSetup.mMuted, true);
    SetTypedProperty(Key("MediaNode::ClipSpeed"), clip.mSpeed, false);
    SetTypedProperty(Key("MediaNode::ClipBackwards"), clip.mReverse, false);
    SetTypedProperty(Key("MediaNode::StreamFrameBlend"), frameBlend, true);
    SetTypedProperty(Key("MediaNode::ClipScaleToFramePolicy"),
                     static_cast<std::int32_t>(clip.mScaleToFrame), true);
    SetTypedProperty(Key("MediaNode::StreamReverseFieldDominance"), clip.mReverseFieldDominance,
                     true);
    SetTypedProperty(Key("MediaNode::DeinterlaceAlways"), mode == 2, true);
    SetTypedProperty(Key("MediaNode::RemoveFlicker"), mode == 3, true);
    SetTypedProperty(Key("MediaNode::InterlaceConsecutiveFrames"), mode == 1, true);
    const BE::ColorProfile& profile = media.GetColorProfile();
    SetProperty(Key("MediaNode::SelectedColorProfileName"), profile.mName, true);
    if (profile.mData)
        SetProperty(
            Key("MediaNode::SelectedColorProfileData"),
            FormatPropertyValue(MF::BinaryData(profile.mData->data(), profile.mData->size())),
            true);
    // Half the height difference, when odd, moves the picture by one line
    // against the sequence's fields.
    const bool fieldsDiffer =
        mvxmediatypes::IsInterlaced(sequence.mFieldType) &&
        (order != sequence.mFieldType || settings.mFieldType == mvxmediatypes::kFieldType_AsSource);
    const std::int32_t halfDifference = (settings.mHeight - sequence.mHeight) / 2;
    if (fieldsDiffer && halfDifference % 2 != 0)
        SetTypedProperty(Key("MediaNode::ScanlineOffsetToImproveVerticalCentering"),
                         std::int32_t{settings.mHeight > sequence.mHeight ? 1 : -1}, true);
    SetTypedProperty(Key("MediaNode::InPointMediaTimeAsTicks"), clip.mInPoint, false);
    SetTypedProperty(Key("MediaNode::OutPointMediaTimeAsTicks"), clip.mOutPoint, false);
}

QRT::ImmutableString RenderableNodeMediaImpl::GetNodeType() const
{
    return QRT::ImmutableString::CreateStatic("RenderableNodeMediaImpl");
}

QRT::InterfaceRef<MF::IRenderableNode> RenderableNodeMediaImpl::GetSelfReference()
{
    return QRT::InterfaceRef<MF::IRenderableNode>(this);
}

std::uint32_t RenderableNodeMediaImpl::ComputeRenderFlags() const
{
    return kRenderFlags_Media | (mState.mStill ? kRenderFlag_TimeInvariant : 0u) |
           (mOpaque ? kRenderFlag_Opaque : 0u);
}

void RenderableNodeMediaImpl::PrefetchSelf(const MF::TickTimeRange& inRange,
                                           const CutlistRenderParams& inParams,
                                           RenderableNodePrefetchList& ioPrefetches) const
{
    if (mState.mOfflinePicture || mState.mPendingPicture)
        return;
    QRT::InterfaceRef<IRenderableNodeProducer> producer;
    GetProducer(producer, MF::FrameTime(inRange.first, inRange.second), inParams);
    if (const auto prefetcher = QRT::QueryRef<IRenderableNodePrefetchProvider>(producer))
        prefetcher->Prefetch(inRange, inParams, ioPrefetches);
}

void RenderableNodeMediaImpl::GetProducer(QRT::InterfaceRef<IRenderableNodeProducer>& outProducer,
                                          const MF::FrameTime& /*inTime*/,
                                          const CutlistRenderParams& /*inParams*/) const
{
    // The frame-hold rule: a held media shows its hold time whatever is asked.
    TickTime fixed = mvxmediatypes::kTime_Invalid;
    if (!mState.mStill && mState.mFrameHoldAt != mvxmediatypes::kTime_Max)
        fixed = mState.mFrameHoldAt + mState.mTimeOrigin;
    outProducer = CreateMediaNodeProducer(mState, GetNodeHash(), fixed);
}

void RenderableNodeMediaImpl::GetStillRanges(TickTime inStart, TickTime inEnd,
                                             MF::TickTimeRangeList& ioRanges) const
{
    auto range = std::lower_bound(mStillRanges.begin(), mStillRanges.end(), inStart,
                                  [](const MF::TickTimeRange& inRange, TickTime inTime)
                                  { return inRange.second < inTime; });
    for (; range != mStillRanges.end() && range->first <= inEnd; ++range)
        ioRanges.emplace_back(std::max(range->first, inStart), std::min(range->second, inEnd));
}

void RenderableNodeMediaImpl::GetSmartRenderTimes(TickTime /*inStart*/, TickTime /*inEnd*/,
                                                  const mvxmediatypes::FrameRate& /*inFrameRate*/,
                                                  bool /*inFlag*/,
                                                  std::set<TickTime>& /*ioTimes*/) const
{
}

QRT::InterfaceRef<MF::IRenderableNode> CreateMediaNode(const MediaNodeSetup& inSetup)
{
    QRT::InterfaceRef<RenderableNodeMediaImpl> node =
        QRT::Allocated<RenderableNodeMediaImpl>::CreateInstance(inSetup);
    node->MakeImmutable();
    return node->GetSelfReference();
}

} // namespace ML
