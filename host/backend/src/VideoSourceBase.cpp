#include "VideoSourceBase.h"

#include "BE/MediaStatus.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <new>

namespace BE::detail
{

using mvxcore::utility::Guid;
using mvxmediatypes::FieldType;
using mvxmediatypes::PixelFormat;
using mvxmediatypes::TickTime;

namespace
{

// Marks the start of every frame key, so that keys of this library never
// collide with hashes of other objects that mix the same fields.
constexpr std::string_view kFrameKeyTag = "BE.VideoFrameKey";

} // namespace

mvxmediatypes::RenderQuality ToRenderQuality(std::uint32_t inQuality)
{
    return static_cast<mvxmediatypes::RenderQuality>(
        std::min<std::uint32_t>(inQuality, mvxmediatypes::kRenderQuality_Max));
}

// --- HeldFrames ----------------------------------------------------------------

FrameRef HeldFrames::Find(const Guid& inKey)
{
    std::lock_guard lock(mMutex);
    for (auto it = mFrames.begin(); it != mFrames.end(); ++it)
    {
        if (it->first == inKey)
        {
            // Most recently used first, so trimming drops the stalest frames.
            mFrames.splice(mFrames.begin(), mFrames, it);
            return mFrames.front().second;
        }
    }
    return {};
}

void HeldFrames::Insert(const Guid& inKey, const FrameRef& inFrame)
{
    std::lock_guard lock(mMutex);
    for (auto it = mFrames.begin(); it != mFrames.end(); ++it)
    {
        if (it->first == inKey)
        {
            mFrames.erase(it);
            break;
        }
    }
    mFrames.emplace_front(inKey, inFrame);
    TrimLocked();
}

Deprecated::PrefetchHold HeldFrames::MakeHold()
{
    {
        std::lock_guard lock(mMutex);
        ++mHoldCount;
    }
    // The token points at this object and keeps it alive, so a hold may
    // outlive its source.
    std::shared_ptr<HeldFrames> self = shared_from_this();
    HeldFrames* raw = self.get();
    return Deprecated::PrefetchHold(raw, [self = std::move(self)](void*) { self->EndHold(); });
}

std::size_t HeldFrames::GetHoldCount()
{
    std::lock_guard lock(mMutex);
    return mHoldCount;
}

void HeldFrames::EndHold()
{
    std::lock_guard lock(mMutex);
    --mHoldCount;
    TrimLocked();
}

void HeldFrames::TrimLocked()
{
    const std::size_t capacity = std::min(kIdleCapacity + 2 * mHoldCount, kHeldCapacity);
    while (mFrames.size() > capacity)
        mFrames.pop_back();
}

// --- VideoSourceBase -----------------------------------------------------------

VideoSourceBase::VideoSourceBase(SourceDescription inDescription)
    : mDescription(std::move(inDescription))
    , mHeldFrames(std::make_shared<HeldFrames>())
{
    MVX_INPUT_CONTRACT(!mDescription.mPixelFormats.empty());
    MVX_INPUT_CONTRACT(mDescription.mWidth > 0 && mDescription.mHeight > 0);
}

mvxmediatypes::FrameRate VideoSourceBase::GetFrameRate() const noexcept
{
    return mDescription.mFrameRate;
}

bool VideoSourceBase::IsStill() const noexcept
{
    return mDescription.mStill;
}

bool VideoSourceBase::IsImage() const noexcept
{
    return mDescription.mImage;
}

FieldType VideoSourceBase::GetFieldType() const noexcept
{
    return mDescription.mFieldType;
}

QRT::ParamRect VideoSourceBase::GetBounds() const noexcept
{
    return QRT::ParamRect(0, 0, static_cast<int32_t>(mDescription.mWidth),
                          static_cast<int32_t>(mDescription.mHeight));
}

mvxmediatypes::PixelAspectRatio VideoSourceBase::GetPixelAspectRatio() const noexcept
{
    return mDescription.mPixelAspectRatio;
}

mvxmediatypes::AlphaChannel VideoSourceBase::GetAlphaChannel() const noexcept
{
    return mDescription.mAlpha;
}

QRT::ParamColor VideoSourceBase::GetMatteColor() const noexcept
{
    return mDescription.mMatte;
}

ColorProfile VideoSourceBase::GetColorProfile() const
{
    return mDescription.mColorProfile;
}

std::vector<PixelFormat> VideoSourceBase::GetPixelFormats() const
{
    return mDescription.mPixelFormats;
}

std::int64_t VideoSourceBase::FrameIndexForTime(TickTime inTime) const
{
    if (mDescription.mStill || mDescription.mKind == Deprecated::kMediaInfoKind_TimeInvariant ||
        !inTime.IsValid())
        return 0;
    return inTime.ToFrame64(mDescription.mFrameRate);
}

bool VideoSourceBase::IsFrameInRange(TickTime inTime, std::int64_t inIndex) const
{
    if (!inTime.IsValid())
        return false;
    if (mDescription.mFrameCount < 0)
        return true;
    return inIndex >= 0 && inIndex < mDescription.mFrameCount;
}

Guid VideoSourceBase::FrameKeyForIndex(std::int64_t inIndex, const VideoFrameRequest& inRequest,
                                       const MF::BinaryData& inBinaryData,
                                       const ColorProfile& inColorProfile) const
{
    QRT::HashValue hash;
    QRT::MixHash::MixInString(hash, kFrameKeyTag);
    QRT::MixHash::MixInString(hash, mDescription.mIdentity);
    QRT::MixHash::MixInValue(hash, inIndex);
    QRT::MixHash::MixInValue(hash, inRequest.mWidth);
    QRT::MixHash::MixInValue(hash, inRequest.mHeight);
    QRT::MixHash::MixInValue(hash, inRequest.mPixelAspectRatio.GetNumerator());
    QRT::MixHash::MixInValue(hash, inRequest.mPixelAspectRatio.GetDenominator());
    QRT::MixHash::MixInValue(hash, inRequest.mPixelFormat.GetValue());
    QRT::MixHash::MixInValue(hash, static_cast<std::int32_t>(inRequest.mFieldType));
    QRT::MixHash::MixInValue(hash, inRequest.mQuality);
    QRT::MixHash::MixInData(hash, inBinaryData.GetData(), inBinaryData.GetSize());
    QRT::MixHash::MixInString(hash, inColorProfile.mName);
    if (inColorProfile.mData)
        QRT::MixHash::MixInData(hash, inColorProfile.mData->data(), inColorProfile.mData->size());
    else
        QRT::MixHash::MixInData(hash, nullptr, 0);
    return QRT::HashValueToGuid(hash);
}

PixelFormat VideoSourceBase::ChooseFormat(const VideoFrameRequest& inRequest) const
{
    const PixelFormat own = mDescription.mPixelFormats.front();
    if (!inRequest.mPixelFormat.IsValid())
        return own;
    const PixelFormat nearest = mvxmediatypes::SelectNearestPixelFormat(
        inRequest.mPixelFormat, mDescription.mPixelFormats, inRequest.mQuality);
    return nearest.IsValid() ? nearest : own;
}

QRT::Result VideoSourceBase::GetVideoFrame(TickTime inTime, const VideoFrameRequest& inRequest,
                                           const MF::BinaryData& inBinaryData,
                                           const ColorProfile& inColorProfile, std::int32_t inFlags,
                                           FrameRef& outFrame)
{
    outFrame.Reset();
    MVX_INPUT_CONTRACT(inFlags == Deprecated::kFrameRequestFlag_Read ||
                       inFlags == Deprecated::kFrameRequestFlag_NoBlock);
    const std::int64_t index = FrameIndexForTime(inTime);
    if (!IsFrameInRange(inTime, index))
        return kResult_FrameOutOfRange;

    const Guid key = FrameKeyForIndex(index, inRequest, inBinaryData, inColorProfile);
    if (FrameRef held = mHeldFrames->Find(key))
    {
        outFrame = std::move(held);
        return QRT::kResult_Success;
    }
    if (inFlags == Deprecated::kFrameRequestFlag_NoBlock)
        return kResult_FrameNotReady;

    const PixelFormat format = ChooseFormat(inRequest);
    FrameRef produced;
    QRT::Result status = QRT::kResult_Success;
    try
    {
        status = ProduceFrame(index, format, produced);
    }
    catch (const std::bad_alloc&)
    {
        // Staging memory for a huge picture: a status, not a crash.
        return VF::kResult_OutOfFrameMemory;
    }
    if (QRT::Failed(status))
        return status;
    MVX_OUTPUT_CONTRACT(produced && produced->GetPixelFormat() == format);

    // Interlaced frames keep their fields apart when scaled, so each field
    // still shows its own moment.
    const FieldType fieldType = mvxmediatypes::IsInterlaced(mDescription.mFieldType)
                                    ? mDescription.mFieldType
                                    : mvxmediatypes::kFieldType_Progressive;
    FrameRef frame = std::move(produced);
    const std::uint32_t width = inRequest.mWidth != 0 ? inRequest.mWidth : mDescription.mWidth;
    const std::uint32_t height = inRequest.mHeight != 0 ? inRequest.mHeight : mDescription.mHeight;
    // Planar frames keep their own size: their planes are not scaled here,
    // the consumer's scaler reduces them.
    if (inRequest.mWidth != 0 && inRequest.mHeight != 0 && !format.IsPlanar() &&
        (width != mDescription.mWidth || height != mDescription.mHeight))
    {
        FrameRef scaled;
        const QRT::Result created = VF::CreateVideoFrame(
            format, width, height, mDescription.mPixelAspectRatio, false, false, scaled);
        if (QRT::Failed(created))
            return created;
        scaled->SetFieldType(fieldType);
        const QRT::Result copied = VF::VideoFrameManipulators::CopyFrameWithFields(
            frame, scaled, ToRenderQuality(inRequest.mQuality),
            mvxmediatypes::IsInterlaced(fieldType) ? VF::kFieldSelection_First
                                                   : VF::kFieldSelection_Frame);
        if (QRT::Failed(copied))
            return copied;
        frame = std::move(scaled);
    }
    if (frame->GetPixelAspectRatio() != mDescription.mPixelAspectRatio ||
        frame->GetFieldType() != fieldType || frame->GetAlphaChannel() != mDescription.mAlpha)
    {
        // A source may hand out a frame it keeps (a decoded still), which is
        // shared and must not be written.
        frame = VF::MakeWriteableVideoFrame(frame, ToRenderQuality(inRequest.mQuality));
        frame->SetPixelAspectRatio(mDescription.mPixelAspectRatio);
        frame->SetFieldType(fieldType);
        frame->SetAlphaChannel(mDescription.mAlpha);
    }
    frame->MarkShared(1);

    mHeldFrames->Insert(key, frame);
    outFrame = std::move(frame);
    return QRT::kResult_Success;
}

void VideoSourceBase::PrefetchVideoFrame(TickTime /*inTime*/,
                                         const VideoFrameRequest& /*inRequest*/,
                                         const MF::BinaryData& /*inBinaryData*/)
{
    // The prefetchers schedule the reads of these sources themselves; a
    // hint alone would only duplicate their work.
}

QRT::Result VideoSourceBase::DrawVideoFrame(
    TickTime inTime, const MF::BinaryData& inBinaryData, TickTime /*inFrameGridOrigin*/,
    TickTime /*inSecondTime*/, const FrameRef& ioDestination,
    mvxmediatypes::RenderQuality inQuality, FieldType inFieldType, bool inProgressive,
    bool /*inIgnoreAlpha*/, bool /*inInvertAlpha*/, bool /*inThirdFlag*/, double /*inValue*/)
{
    MVX_INPUT_CONTRACT(ioDestination);
    MVX_INPUT_CONTRACT(!ioDestination->IsShared());
    const QRT::ParamRect bounds = ioDestination->GetBounds();
    VideoFrameRequest request;
    request.mWidth = static_cast<std::uint32_t>(bounds.Width());
    request.mHeight = static_cast<std::uint32_t>(bounds.Height());
    request.mPixelAspectRatio = ioDestination->GetPixelAspectRatio();
    request.mPixelFormat = ioDestination->GetPixelFormat();
    request.mFieldType = inProgressive ? mvxmediatypes::kFieldType_Progressive : inFieldType;
    request.mQuality = inQuality;
    FrameRef frame;
    const QRT::Result status =
        GetVideoFrame(inTime, request, inBinaryData, mDescription.mColorProfile,
                      Deprecated::kFrameRequestFlag_Read, frame);
    if (QRT::Failed(status))
        return status;
    return VF::VideoFrameManipulators::CopyFrame(frame, ioDestination, inQuality);
}

bool VideoSourceBase::IsPrefetchWanted(TickTime inTime) const
{
    return mDescription.mPrefetchWanted && IsFrameInRange(inTime, FrameIndexForTime(inTime));
}

Guid VideoSourceBase::GetFrameKey(TickTime inTime, const VideoFrameRequest& inRequest,
                                  const MF::BinaryData& inBinaryData,
                                  const ColorProfile& inColorProfile) const
{
    return FrameKeyForIndex(FrameIndexForTime(inTime), inRequest, inBinaryData, inColorProfile);
}

Deprecated::PrefetchHold VideoSourceBase::GetPrefetchHold()
{
    return mHeldFrames->MakeHold();
}

std::int32_t VideoSourceBase::GetKind() const noexcept
{
    return mDescription.mKind;
}

std::u16string VideoSourceBase::GetName() const
{
    return mDescription.mName;
}

std::uint32_t VideoSourceBase::GetStreamCount(std::int32_t inType) const
{
    MVX_INPUT_CONTRACT(inType == Deprecated::kMediaType_Video ||
                       inType == Deprecated::kMediaType_Audio);
    return inType == Deprecated::kMediaType_Video ? 1 : 0;
}

QRT::InterfaceRef<Deprecated::IVideoSource> VideoSourceBase::GetVideoSource(std::int32_t inType,
                                                                            std::int32_t inIndex)
{
    MVX_INPUT_CONTRACT(inType == Deprecated::kMediaType_Video);
    MVX_INPUT_CONTRACT(inIndex == 0);
    return QRT::InterfaceRef<Deprecated::IVideoSource>(this);
}

TickTime VideoSourceBase::GetDuration() const noexcept
{
    if (mDescription.mFrameCount < 0)
        return mvxmediatypes::kTime_Max;
    return TickTime::FromFrame(mDescription.mFrameCount, mDescription.mFrameRate);
}

QRT::InterfaceRef<Deprecated::IMediaInfo> VideoSourceBase::Copy() const
{
    return Reopen();
}

std::string VideoSourceBase::GetMediaPath() const
{
    return mDescription.mMediaPath;
}

QRT::InterfaceRef<Deprecated::IMediaInfo> VideoSourceBase::GetMediaInfo()
{
    return QRT::InterfaceRef<Deprecated::IMediaInfo>(this);
}

} // namespace BE::detail
