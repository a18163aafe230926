#include "ModuleTestSupport.h"

#include "ML/RenderRequestException.h"
#include "VF/VideoFrame.h"

#include <cstring>
#include <stdexcept>
#include <thread>

namespace modtest
{

bool WaitUntil(const std::function<bool()>& inCondition, std::chrono::milliseconds inLimit)
{
    const auto end = std::chrono::steady_clock::now() + inLimit;
    while (!inCondition())
    {
        if (std::chrono::steady_clock::now() > end)
            return false;
        std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
    return true;
}

DelayedPrefetch::DelayedPrefetch(
    boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor> inExecutor,
    std::chrono::milliseconds inDelay)
    : mExecutor(std::move(inExecutor))
    , mDelay(inDelay)
{
}

QRT::Result DelayedPrefetch::InitiatePrefetch()
{
    ++mInitiateCount;
    if (mDelay.count() >= 0)
    {
        QRT::InterfaceRef<DelayedPrefetch> self(this);
        mExecutor->Post([self] { self->Arrive(); }, static_cast<int>(mDelay.count()));
    }
    return QRT::kResult_Success;
}

void DelayedPrefetch::Arrive()
{
    FrameRef frame = VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, 4, 4,
                                          mvxmediatypes::kPixelAspectRatio_Square, true, false);
    {
        std::lock_guard lock(mMutex);
        mFrame = frame;
    }
    mComplete.store(true);
    mArrived.store(true);
}

QRT::Result DelayedPrefetch::GetPrefetchedFrame(FrameRef& outFrame)
{
    outFrame.Reset();
    if (!mComplete.load())
        return QRT::kResult_NotFound;
    std::lock_guard lock(mMutex);
    outFrame = mFrame;
    return QRT::kResult_Success;
}

QRT::Result DelayedPrefetch::CancelPrefetch()
{
    ++mCancelCount;
    return QRT::kResult_Success;
}

void DelayedPrefetch::GetPrefetchKey(QRT::Guid& outKey) const
{
    outKey = QRT::Guid();
}

bool DelayedPrefetch::ContinueWaitingForPrefetch(double)
{
    return !mComplete.load();
}

void ColorSource::ConformFrameTime(const MF::FrameTime& inRequested, const ML::CutlistRenderParams&,
                                   MF::FrameTime& outConformed)
{
    outConformed = inRequested;
}

void ColorSource::CollectPrefetches(const MF::FrameTime& inTime, const ML::CutlistRenderParams&,
                                    ML::RenderableNodePrefetchList& ioPrefetches)
{
    ++mCollectCount;
    mCollectTime = inTime;
    if (mPrefetch)
        ioPrefetches.push_back(mPrefetch);
}

void ColorSource::RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                              FrameRef& outFrame)
{
    outFrame.Reset();
    ++mRenderCount;
    mRenderTime = inTime;
    mRenderWidth = inParams.mWidth;
    if (mPrefetch)
        mPrefetchArrivedBeforeRender =
            static_cast<DelayedPrefetch*>(mPrefetch.Get())->mArrived.load();
    switch (mFailure)
    {
    case SourceFailure::kRenderRequestException:
        throw ML::RenderRequestException(mFailureStatus);
    case SourceFailure::kStdException:
        throw std::runtime_error("source failed");
    case SourceFailure::kNone:
        break;
    }
    FrameRef frame =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, inParams.mWidth,
                             inParams.mHeight, inParams.mPixelAspectRatio, false, false);
    if (!frame)
        throw ML::RenderRequestException(VF::kResult_InvalidFrameSize);
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (std::uint32_t y = 0; y < inParams.mHeight; ++y)
    {
        std::uint8_t* row = base + static_cast<std::size_t>(y) * frame->GetRowBytes();
        for (std::uint32_t x = 0; x < inParams.mWidth; ++x)
            std::memcpy(row + 4 * x, mColor, 4);
    }
    outFrame = frame;
}

void ColorSource::GetFrameRate(mvxmediatypes::FrameRate& outRate)
{
    outRate = mvxmediatypes::kFrameRate_Video25;
}

void ColorSource::GetFieldRate(mvxmediatypes::FrameRate& outRate)
{
    outRate = mvxmediatypes::kFrameRate_Video25;
}

bool IsFilledWith(const FrameRef& inFrame, const std::uint8_t (&inColor)[4])
{
    if (!inFrame || inFrame->GetPixelFormat() != mvxmediatypes::kPixelFormat_BGRA_4444_8u)
        return false;
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
    {
        const std::uint8_t* row = base + static_cast<std::size_t>(y) * inFrame->GetRowBytes();
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
            if (std::memcmp(row + 4 * x, inColor, 4) != 0)
                return false;
    }
    return true;
}

ML::InitiateRenderCallback CallbackRecorder::Callback()
{
    return [this](FrameRef inFrame, unsigned int inRequestID, SourceRef inSource, bool inCancelled,
                  int inStatus)
    {
        std::lock_guard lock(mMutex);
        mCalls.push_back({inFrame, inRequestID, inSource, inCancelled, inStatus});
    };
}

std::vector<CallbackCall> CallbackRecorder::Get()
{
    std::lock_guard lock(mMutex);
    return mCalls;
}

std::size_t CallbackRecorder::Count()
{
    std::lock_guard lock(mMutex);
    return mCalls.size();
}

bool CallbackRecorder::WaitForCount(std::size_t inCount)
{
    return WaitUntil([&] { return Count() >= inCount; });
}

std::vector<CallbackCall> CallbackRecorder::For(unsigned int inRequestID)
{
    std::lock_guard lock(mMutex);
    std::vector<CallbackCall> found;
    for (const CallbackCall& call : mCalls)
        if (call.mRequestID == inRequestID)
            found.push_back(call);
    return found;
}

ML::CutlistRenderParams MakeParams(const MF::FrameTime& inTime, std::uint32_t inWidth,
                                   std::uint32_t inHeight)
{
    ML::CutlistRenderParams params;
    params.SetFrameTime(inTime);
    params.mWidth = inWidth;
    params.mHeight = inHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mFullFrameWidth = inWidth;
    params.mFullFrameHeight = inHeight;
    params.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mFrameRate = mvxmediatypes::kFrameRate_Video25;
    return params;
}

} // namespace modtest
