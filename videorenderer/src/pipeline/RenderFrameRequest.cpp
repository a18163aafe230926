#include "ML/RenderFrameRequest.h"

#include "ML/CutlistRenderer.h"
#include "ML/IRenderableNodePrefetchProvider.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderStatus.h"
#include "QRT/Hash.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"
#include "render/VideoFrameCompositeUtilities.h"

#include <algorithm>
#include <utility>

namespace ML
{

namespace
{

// The colour a frame with alpha is flattened onto.
constexpr std::uint32_t kOpaqueBlack = 0xFF000000u;

std::uint32_t NonNegative(std::int32_t inValue)
{
    return inValue > 0 ? static_cast<std::uint32_t>(inValue) : 0u;
}

double RatioValue(const mvxmediatypes::PixelAspectRatio& inRatio)
{
    if (!inRatio.IsValid())
        return 1.0;
    return static_cast<double>(inRatio.GetNumerator()) / inRatio.GetDenominator();
}

// Scale from the full frame to the output frame, in square pixels: the
// output's width over the full frame's width, each times its pixel aspect
// ratio; the heights when the widths are not usable.
float ComputeScale(const QRT::ParamRect& inFullFrame,
                   const mvxmediatypes::PixelAspectRatio& inFullRatio,
                   const QRT::ParamRect& inOutput,
                   const mvxmediatypes::PixelAspectRatio& inOutputRatio)
{
    if (inFullFrame.Width() > 0 && inOutput.Width() > 0)
        return static_cast<float>((inOutput.Width() * RatioValue(inOutputRatio)) /
                                  (inFullFrame.Width() * RatioValue(inFullRatio)));
    if (inFullFrame.Height() > 0 && inOutput.Height() > 0)
        return static_cast<float>(static_cast<double>(inOutput.Height()) / inFullFrame.Height());
    return 1.0f;
}

// Floor division for tick counts (times may be negative).
std::int64_t FloorDivide(std::int64_t inValue, std::int64_t inDivisor)
{
    std::int64_t quotient = inValue / inDivisor;
    if ((inValue % inDivisor != 0) && ((inValue < 0) != (inDivisor < 0)))
        --quotient;
    return quotient;
}

} // namespace

void RenderFrameResultSlot::Store(QRT::InterfaceRef<MF::IVideoFrame> inFrame)
{
    QRT::InterfaceRef<MF::IVideoFrame> previous;
    {
        std::lock_guard<std::mutex> lock(mMutex);
        previous = std::exchange(mFrame, std::move(inFrame));
    }
    // The previous frame is released outside the lock.
}

QRT::InterfaceRef<MF::IVideoFrame> RenderFrameResultSlot::Get() const
{
    std::lock_guard<std::mutex> lock(mMutex);
    return mFrame;
}

RenderFrameRequest::RenderFrameRequest()
    : mResult(std::make_shared<RenderFrameResultSlot>())
{
}

RenderFrameRequest::RenderFrameRequest(const RenderFrameRequest&) = default;
RenderFrameRequest::RenderFrameRequest(RenderFrameRequest&&) noexcept = default;
RenderFrameRequest& RenderFrameRequest::operator=(const RenderFrameRequest&) = default;
RenderFrameRequest& RenderFrameRequest::operator=(RenderFrameRequest&&) noexcept = default;
RenderFrameRequest::~RenderFrameRequest() = default;

RenderFrameRequest::RenderFrameRequest(const RenderFrameRequestSettings& inSettings,
                                       bool inDeferKey, bool inKeyFlag)
    : RenderFrameRequest()
{
    mRequestedFormats = inSettings.mRequestedFormats;
    MVX_INPUT_CONTRACT(mRequestedFormats.size() > 0);

    mTime = inSettings.mTime.GetTime();
    mNodeTime = inSettings.mTime;
    mFrameRate = inSettings.mFrameRate;
    mFullFrameRect = inSettings.mFullFrameRect;
    mFullFramePixelAspectRatio = inSettings.mFullFramePixelAspectRatio;
    mCutlistProvider = inSettings.mCutlistProvider;
    mShared = inSettings.mShared;
    mCutlistName = inSettings.mCutlistName;
    mQuality = inSettings.mQuality;
    mSecondaryQuality = inSettings.mSecondaryQuality;
    mOutputRect = inSettings.mOutputRect;
    mOutputPixelAspectRatio = inSettings.mOutputPixelAspectRatio;
    mFieldType = inSettings.mFieldType;
    mRenderSingleField = inSettings.mRenderSingleField;
    mRenderFlags = inSettings.mRenderFlags;
    mFlagA = inSettings.mFlagA;
    mCompositeOnBlack = inSettings.mCompositeOnBlack;
    mStationName = inSettings.mStationName;
    mContext = inSettings.mContext;
    mClient = QRT::WeakReference<IRenderFrameClient>(inSettings.mClient);
    mAcceleratedRenderer = inSettings.mAcceleratedRenderer;
    mPriority = inSettings.mPriority;
    mCaller = inSettings.mCaller;
    mRequestID = inSettings.mRequestID;
    mFactor = inSettings.mFactor;
    mDoNotCache = inSettings.mDoNotCache;
    mWaitable = inSettings.mWaitable;
    mValidStart = inSettings.mValidStart;
    mValidEnd = inSettings.mValidEnd;
    mCutlistChoice = inSettings.mCutlistChoice;
    mCutlistParameter = inSettings.mCutlistParameter;
    mProducer = inSettings.mProducer;
    mPrefetchSource = inSettings.mPrefetchSource;
    mCompletion = inSettings.mCompletion;
    mScale = ComputeScale(mFullFrameRect, mFullFramePixelAspectRatio, mOutputRect,
                          mOutputPixelAspectRatio);
    if (!inDeferKey)
        ComputeKey(inKeyFlag);
}

RenderFrameRequest::RenderFrameRequest(mvxmediatypes::TickTime inTime,
                                       RenderableNodePrefetchList inPrefetches,
                                       RenderRequestID inRequestID)
    : RenderFrameRequest()
{
    mTime = inTime;
    mNodeTime = MF::FrameTime(inTime);
    mGivenPrefetches = std::move(inPrefetches);
    mRequestID = inRequestID;
    mPrefetchOnly = true;
    mCutlistParameter = -1;
}

RenderFrameRequest::RenderFrameRequest(mvxmediatypes::TickTime inTime,
                                       QRT::InterfaceRef<QRT::QRTUnknown> inPrefetchSource,
                                       RenderRequestID inRequestID)
    : RenderFrameRequest()
{
    mTime = inTime;
    mNodeTime = MF::FrameTime(inTime);
    mPrefetchSource = std::move(inPrefetchSource);
    mRequestID = inRequestID;
    mPrefetchOnly = true;
    mCutlistParameter = -1;
}

QRT::InterfaceRef<MF::IRenderableCutlist> RenderFrameRequest::GetRenderCutlist(bool inFlag)
{
    if (mCutlistProvider && !mCutlist)
    {
        MVX_INPUT_CONTRACT(mCutlistChoice == 0 || mCutlistChoice == 1 || mCutlistChoice == 3);
        if (mCutlistChoice == 0)
            mCutlist = mCutlistProvider->GetMainCutlist(mCutlistName, inFlag);
        else if (mCutlistChoice == 1)
            mCutlist = mCutlistProvider->GetAlternateCutlist(mCutlistName, inFlag);
        else
            mCutlist = mCutlistProvider->GetThirdCutlist(mCutlistName, inFlag);
    }
    return mCutlist;
}

mvxmediatypes::PixelFormat RenderFrameRequest::GetRenderPixelFormat() const
{
    if (mPixelFormat != mvxmediatypes::kPixelFormat_Invalid)
        return mPixelFormat;
    const auto found = std::find_if(mRequestedFormats.begin(), mRequestedFormats.end(),
                                    [](const mvxmediatypes::PixelFormat& inFormat)
                                    { return inFormat.IsRenderFormat(); });
    return found != mRequestedFormats.end() ? *found : mvxmediatypes::kPixelFormat_BGRA_4444_8u;
}

mvxmediatypes::PixelFormat RenderFrameRequest::ChooseRenderPixelFormat()
{
    mPixelFormat = GetRenderPixelFormat();
    return mPixelFormat;
}

void RenderFrameRequest::BuildRenderParams(bool /*inFlag*/, CutlistRenderParams& outParams)
{
    outParams.mWidth = NonNegative(mOutputRect.Width());
    outParams.mHeight = NonNegative(mOutputRect.Height());
    outParams.mPixelAspectRatio = mOutputPixelAspectRatio;
    outParams.mQuality = mQuality;
    outParams.mCutlistParameter = mCutlistParameter;
    outParams.mSecondaryQuality =
        mSecondaryQuality == kSecondaryQuality_SameAsQuality ? mQuality : mSecondaryQuality;
    outParams.mPixelFormat = ChooseRenderPixelFormat();
    outParams.mHorizontalScale = mScale;
    outParams.mVerticalScale = mScale;
    outParams.mFullFrameWidth = NonNegative(mFullFrameRect.Width());
    outParams.mFullFrameHeight = NonNegative(mFullFrameRect.Height());
    outParams.mFullFramePixelAspectRatio = mFullFramePixelAspectRatio;
    outParams.mNode = QRT::InterfaceRef<QRT::QRTUnknown>(mCutlistProvider);
    outParams.mFrameRate = mFrameRate;
    outParams.mFieldType = mFieldType;
    if (mCutlistProvider)
    {
        const auto properties =
            QRT::QueryRef<MF::IRenderableCutlistProviderProperties>(mCutlistProvider);
        if (properties)
        {
            const mvxmediatypes::FieldType reported = properties->GetFieldType();
            // "As the source says" and "no answer" leave the request's own order.
            if (reported != mvxmediatypes::kFieldType_AsSource &&
                reported != mvxmediatypes::kFieldType_Invalid)
                outParams.mFieldType = static_cast<std::uint32_t>(reported);
        }
    }
    outParams.mCutlistChoiceBit = mCutlistChoice & 1u;
    outParams.mRenderFlags = mRenderFlags;
    outParams.mCachePriority = GetCachePriority();

    // Half a frame is one frame at twice the frame rate.
    const std::int64_t ticksPerFrame = mFrameRate.GetTicksPerFrame();
    const std::int64_t halfFrameTicks = ticksPerFrame / 2;
    const mvxmediatypes::TickTime halfFrame = mvxmediatypes::TickTime::TicksToTime(halfFrameTicks);
    mvxmediatypes::TickTime time = mTime;
    outParams.mSingleField = 0;
    if (mRenderSingleField)
    {
        outParams.mSingleField = 1;
        if (halfFrameTicks > 0 && FloorDivide(time.GetTicks(), halfFrameTicks) % 2 != 0)
        {
            outParams.mSingleField = 2;
            time = time - halfFrame;
        }
    }

    if (ticksPerFrame != 0 && outParams.mFieldType == mvxmediatypes::kFieldType_UpperFirst)
        outParams.SetFrameTime(MF::FrameTime(time, time + halfFrame));
    else if (ticksPerFrame != 0 && outParams.mFieldType == mvxmediatypes::kFieldType_LowerFirst)
        outParams.SetFrameTime(MF::FrameTime(time + halfFrame, time));
    else
        outParams.SetFrameTime(MF::FrameTime(time));
}

void RenderFrameRequest::ComputeKey(bool inFlag)
{
    const auto cutlist = GetRenderCutlist(inFlag);
    CutlistRenderParams params;
    BuildRenderParams(inFlag, params);

    QRT::Guid contentHash;
    if (mProducer)
    {
        mProducer->GetFrameHash(contentHash, mNodeTime, params);
    }
    else if (cutlist)
    {
        // The lookup answers the producer and the frame time in its node's own
        // time; that time becomes mNodeTime, so the hash is asked for the same
        // time the render later produces (and the cutlist renderer caches) it
        // at. Where no producer can be had, a failed lookup included, the
        // request stands for the black frame of its parameters.
        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        MF::FrameTime localTime;
        if (QRT::Succeeded(
                CutlistRenderer::GetProducerForCutlist(cutlist, params, producer, localTime)) &&
            producer)
        {
            mNodeTime = localTime;
            producer->GetFrameHash(contentHash, mNodeTime, params);
            mProducer = producer;
        }
        if (contentHash.IsNil())
            contentHash = CutlistRenderer::GetBlackFrameHash(params);
    }

    if (contentHash.IsNil())
    {
        mKey = QRT::Guid();
        return;
    }

    QRT::HashValue hash;
    QRT::MixHash::MixInData(hash, kRequestKeyPrefix, sizeof(kRequestKeyPrefix) - 1);
    const auto contentBytes = QRT::GuidToBytes(contentHash);
    QRT::MixHash::MixInData(hash, contentBytes.data(), contentBytes.size());
    for (const mvxmediatypes::PixelFormat& format : mRequestedFormats)
    {
        const std::uint64_t value = format.GetValue();
        QRT::MixHash::MixInData(hash, &value, sizeof(value));
    }
    const std::uint8_t compositeOnBlack = mCompositeOnBlack ? 1 : 0;
    QRT::MixHash::MixInData(hash, &compositeOnBlack, sizeof(compositeOnBlack));
    QRT::MixHash::MixInData(hash, &mQuality, sizeof(mQuality));
    QRT::MixHash::MixInData(hash, &mSecondaryQuality, sizeof(mSecondaryQuality));
    mKey = QRT::HashValueToGuid(hash);
}

void RenderFrameRequest::StartPrefetches()
{
    if (!mPrefetchOnly && mPriority < kRenderPriority_Normal)
        return;
    CutlistRenderParams params;
    BuildRenderParams(true, params);

    RenderableNodePrefetchList prefetches;
    if (mPrefetchSource)
    {
        if (const auto provider = QRT::QueryRef<IRenderableNodePrefetchProvider>(mPrefetchSource))
        {
            const MF::TickTimeRange range(mNodeTime.GetTime(), mNodeTime.GetLaterTime());
            provider->Prefetch(range, params, prefetches);
        }
        else if (auto handle = QRT::QueryRef<IRenderableNodePrefetch>(mPrefetchSource))
        {
            prefetches.push_back(std::move(handle));
        }
    }
    else if (const auto cutlist = GetRenderCutlist(true))
    {
        const QRT::Result status =
            CutlistRenderer::CollectCutlistPrefetches(cutlist, params, prefetches);
        if (QRT::Failed(status))
            throw RenderRequestException(status);
    }
    else
    {
        prefetches = std::move(mGivenPrefetches);
        mGivenPrefetches.clear();
    }
    mActivePrefetches = std::move(prefetches);
    // Each handle is started exactly once, here; a handle that cannot start
    // goes inert and reports itself complete without a frame.
    for (const auto& handle : mActivePrefetches)
        if (handle)
            handle->InitiatePrefetch();
}

bool RenderFrameRequest::PrefetchesComplete() const
{
    for (const auto& handle : mActivePrefetches)
    {
        if (!handle)
            continue;
        QRT::InterfaceRef<MF::IVideoFrame> frame;
        if (QRT::Failed(handle->GetPrefetchedFrame(frame)))
            return false;
    }
    return true;
}

bool RenderFrameRequest::PrefetchesWantMoreTime(double inElapsedSeconds) const
{
    bool wantMore = false;
    // Every handle is asked: the question also lets a handle fall back to
    // another way of reading.
    for (const auto& handle : mActivePrefetches)
        if (handle && handle->ContinueWaitingForPrefetch(inElapsedSeconds))
            wantMore = true;
    return wantMore;
}

void RenderFrameRequest::GetPrefetchResult(QRT::InterfaceRef<MF::IVideoFrame>& outFrame) const
{
    outFrame.Reset();
    if (!mActivePrefetches.empty() && mActivePrefetches.front())
        mActivePrefetches.front()->GetPrefetchedFrame(outFrame);
}

void RenderFrameRequest::CancelPrefetches() const
{
    for (const auto& handle : mActivePrefetches)
        if (handle)
            handle->CancelPrefetch();
}

void RenderFrameRequest::Render(QRT::InterfaceRef<MF::IVideoFrame>& outFrame,
                                mvxmediatypes::PixelFormat inPixelFormat)
{
    // Both checks name the exact expressions of the contract.
    if (inPixelFormat == mvxmediatypes::kPixelFormat_Invalid)
        mvxcore::debug::ContractViolated(mvxcore::debug::ContractKind::kInput,
                                         "inPixelFormat != MF::kPixelFormat_Invalid", __FILE__,
                                         __LINE__);
    if (mKey == QRT::Guid())
        mvxcore::debug::ContractViolated(mvxcore::debug::ContractKind::kInput,
                                         "mKey != QRT::Guid()", __FILE__, __LINE__);

    CutlistRenderParams params;
    BuildRenderParams(true, params);
    params.mPixelFormat = inPixelFormat;
    const bool insertIntoCache = !mDoNotCache && (mRenderFlags & kRenderFlag_AlwaysCache) != 0;
    QRT::InterfaceRef<MF::IVideoFrame> frame = CutlistRenderer::RenderFrameFromCutlist(
        mProducer, params, mNodeTime, mRequestedFormats, insertIntoCache);

    if (frame && mCompositeOnBlack && frame->HasAlpha())
    {
        // Opaque black of the frame's own format, size and alpha kind, with
        // the frame composited over it.
        QRT::InterfaceRef<MF::IVideoFrame> black = frame->CreateEmptyFrame(false);
        QRT::Result status = VF::VideoFrameManipulators::FillWithColor(black, kOpaqueBlack);
        if (QRT::Succeeded(status))
            status = CompositeFrameAtOffset(frame, black, 0, 0);
        if (QRT::Failed(status))
            throw RenderRequestException(status);
        frame = std::move(black);
    }
    outFrame = std::move(frame);
}

QRT::InterfaceRef<BE::Deprecated::IMedia>
RenderFrameRequest::GetFirstMediaFromVideoSegment(const BE::VideoSegmentNode& inNode)
{
    if (inNode.GetKind() != BE::kVideoSegmentNodeKind_ImportedMedia)
        return {};
    return static_cast<const BE::ImportedVideoSegmentNode&>(inNode).GetMedia();
}

void RenderFrameRequest::StoreResult(QRT::InterfaceRef<MF::IVideoFrame> inFrame) const
{
    mResult->Store(std::move(inFrame));
}

QRT::InterfaceRef<MF::IVideoFrame> RenderFrameRequest::GetResult() const
{
    return mResult->Get();
}

} // namespace ML
