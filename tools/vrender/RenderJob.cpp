#include "RenderJob.h"

#include "BE/IMediaInfo.h"
#include "BE/VideoSources.h"
#include "MF/BinaryData.h"
#include "MF/TimeTransform.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderableSourceFilters.h"
#include "ML/RenderableVideoSources.h"
#include "ML/VideoRenderer.h"
#include "OrderingWindow.h"
#include "Progress.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <algorithm>
#include <chrono>
#include <cinttypes>
#include <map>
#include <memory>

namespace vrender
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using SourceRef = QRT::InterfaceRef<ML::IRenderableSource>;
using ExecutorRef = boost::shared_ptr<mvxcore::threads::AsyncThreadedExecutor>;

// How long the loop waits for the next frame before it redraws the progress.
constexpr std::chrono::milliseconds kPollInterval(100);
// A render in which no frame arrives for this long is stuck; it is reported
// and abandoned rather than waited for forever.
constexpr std::chrono::seconds kStallTimeout(120);

std::string StatusText(QRT::Result inStatus)
{
    char text[16];
    std::snprintf(text, sizeof(text), "0x%08X", static_cast<std::uint32_t>(inStatus));
    return text;
}

// One frame as it leaves the encoder pool.
struct FrameResult
{
    EncodedFrame mEncoded;
    bool mCancelled = false;
    // Empty on success.
    std::string mError;
};

// State shared between the loop and the callbacks, which run on the module's
// delivering thread and on the encoder pool. Held by shared_ptr so that a
// late callback never reaches freed state.
struct SharedState
{
    SharedState(std::int64_t inFirst, BE::VideoSourceRef inMedia, SourceRef inSource,
                std::unique_ptr<FrameWriter> inWriter, RenderPlan inPlan,
                QRT::InterfaceRef<MF::ITimeTransform> inTimeTransform)
        : mWindow(inFirst)
        , mMedia(std::move(inMedia))
        , mSource(std::move(inSource))
        , mWriter(std::move(inWriter))
        , mPlan(inPlan)
        , mTimeTransform(std::move(inTimeTransform))
    {
    }

    OrderingWindow<FrameResult> mWindow;
    // The media under mSource, which may know why a read failed.
    const BE::VideoSourceRef mMedia;
    const SourceRef mSource;
    const std::unique_ptr<FrameWriter> mWriter;
    const RenderPlan mPlan;
    // Output time to media time (--speed); empty when frames are not re-timed.
    const QRT::InterfaceRef<MF::ITimeTransform> mTimeTransform;
};

// The delivered frame in the stream's format and size: the source delivers
// the nearest format it has and may keep its own size.
FrameRef ConformToStream(const FrameRef& inFrame, const RenderPlan& inPlan, std::string& outError)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const StreamInfo& stream = inPlan.mStream;
    if (inFrame->GetPixelFormat() == inPlan.mPixelFormat &&
        static_cast<std::uint32_t>(bounds.Width()) == stream.mWidth &&
        static_cast<std::uint32_t>(bounds.Height()) == stream.mHeight)
        return inFrame;
    FrameRef converted;
    const QRT::Result created =
        VF::CreateVideoFrame(inPlan.mPixelFormat, stream.mWidth, stream.mHeight,
                             stream.mPixelAspectRatio, false, false, converted);
    if (QRT::Failed(created))
    {
        outError = "cannot create a " + std::to_string(stream.mWidth) + "x" +
                   std::to_string(stream.mHeight) + " frame (status " + StatusText(created) + ")";
        return {};
    }
    const QRT::Result copied =
        VF::VideoFrameManipulators::CopyFrame(inFrame, converted, stream.mQuality);
    if (QRT::Failed(copied))
    {
        outError = "cannot convert the frame (status " + StatusText(copied) + ")";
        return {};
    }
    converted->SetFieldType(inFrame->GetFieldType());
    if (converted->GetPixelFormat().HasAlpha())
        converted->SetAlphaChannel(inFrame->HasAlpha() ? inFrame->GetAlphaChannel()
                                                       : mt::kAlphaChannel_Straight);
    return converted;
}

// Stacks the frame filters of inFilters on inSource in the order a media
// node stacks them. outTimeTransform is the output-to-media time mapping
// when frames are re-timed, else empty.
SourceRef StackFilters(SourceRef inSource, const FilterOptions& inFilters, bool inStill,
                       QRT::InterfaceRef<MF::ITimeTransform>& outTimeTransform)
{
    SourceRef source = std::move(inSource);
    if (inFilters.mRemovePulldown != mvxmediatypes::kPulldownCadence_None)
        source = ML::RemovePulldownFromSource(source, inFilters.mRemovePulldown);
    else
    {
        if (inFilters.mReverseFieldDominance)
            source = ML::ReverseFieldDominanceOfSource(source);
        if (inFilters.mFieldReverse)
            source = ML::FieldReverseSource(source);
        if (inFilters.mDeinterlace)
            source = ML::DeinterlaceSource(source);
        if (inFilters.mRemoveFlicker)
            source = ML::RemoveFlickerFromSource(source);
        if (inFilters.mInterlaceConsecutive && !inStill)
            source = ML::InterlaceConsecutiveFramesFromSource(source);
    }
    if (inFilters.mScale)
        source = ML::ScaleAndPARCorrectSource(source);
    if (inFilters.mSpeed && !inStill)
    {
        outTimeTransform = MF::CreateTimeTransform(*inFilters.mSpeed);
        source = inFilters.mFrameBlend
                     ? ML::TimeBlendSource(source, outTimeTransform, *inFilters.mSpeed)
                     : ML::TimeMixSource(source);
    }
    return source;
}

// Runs on the encoder pool: finishes one delivered frame.
FrameResult FinishFrame(SharedState& inState, std::int64_t inIndex, FrameRef inFrame,
                        bool inCancelled, int inStatus)
{
    FrameResult result;
    result.mEncoded.mIndex = inIndex;
    const std::string name = "frame " + std::to_string(inIndex);
    if (inCancelled)
    {
        result.mCancelled = true;
        return result;
    }
    if (inStatus < 0)
    {
        result.mError = name + ": the render failed (status " + StatusText(inStatus) + ")";
        return result;
    }
    try
    {
        // Success without a frame: the source could not render this time.
        if (!inFrame)
        {
            const std::string cause = BE::GetLastReadFailure(inState.mMedia);
            result.mError = name + ": " + (cause.empty() ? "the source delivered no frame" : cause);
            return result;
        }
        std::string problem;
        const FrameRef frame = ConformToStream(inFrame, inState.mPlan, problem);
        if (!frame)
        {
            result.mError = name + ": " + problem;
            return result;
        }
        result.mEncoded = inState.mWriter->Encode(inIndex, frame);
        if (!result.mEncoded.mError.empty())
            result.mError = name + ": " + result.mEncoded.mError;
    }
    catch (const ML::RenderRequestException& inException)
    {
        result.mError =
            name + ": the render failed (status " + StatusText(inException.GetStatus()) + ")";
    }
    catch (const std::exception& inException)
    {
        result.mError = name + ": " + inException.what();
    }
    return result;
}

SourceFacts DescribeSource(const BE::VideoSourceRef& inSource)
{
    SourceFacts facts;
    const QRT::ParamRect bounds = inSource->GetBounds();
    facts.mWidth = static_cast<std::uint32_t>(bounds.Width());
    facts.mHeight = static_cast<std::uint32_t>(bounds.Height());
    facts.mFrameRate = inSource->GetFrameRate();
    facts.mIsStill = inSource->IsStill();
    facts.mFieldType = inSource->GetFieldType();
    facts.mPixelAspectRatio = inSource->GetPixelAspectRatio();
    const auto info = QRT::QueryRef<BE::Deprecated::IMediaInfo>(inSource);
    facts.mDuration = info ? info->GetDuration() : mt::kTime_Max;
    return facts;
}

std::unique_ptr<FrameWriter> CreateWriter(const RenderOptions& inOptions,
                                          const RenderEnvironment& inEnvironment)
{
    switch (inOptions.mOutputKind)
    {
    case OutputKind::kY4MStream:
        return CreateY4MWriter(inEnvironment.mOutput, {}, inOptions.mChroma);
    case OutputKind::kY4MFile:
        return CreateY4MWriter(nullptr, inOptions.mOutputPath, inOptions.mChroma,
                               inOptions.mOverwrite);
    case OutputKind::kPngSequence:
        break;
    }
    return CreatePngSequenceWriter(inOptions.mOutputPath, inOptions.mOverwrite);
}

// The loop proper; see the header comment of RunRender.
class RenderLoop
{
public:
    RenderLoop(std::shared_ptr<SharedState> inState, ExecutorRef inEncoders,
               const RenderEnvironment& inEnvironment)
        : mState(std::move(inState))
        , mEncoders(std::move(inEncoders))
        , mEnvironment(inEnvironment)
        , mProgress(inEnvironment.mProgress, inEnvironment.mShowProgress, mState->mPlan.mCount)
    {
    }

    RenderOutcome Run()
    {
        const RenderPlan& plan = mState->mPlan;
        const std::int64_t end = plan.mFirst + plan.mCount;
        std::int64_t issued = plan.mFirst;
        auto lastArrival = std::chrono::steady_clock::now();
        for (;;)
        {
            if (!mStopping && mEnvironment.mCancel && mEnvironment.mCancel->load())
            {
                mCancelled = true;
                Stop();
            }
            while (!mStopping && issued < end &&
                   issued - mState->mWindow.GetNextIndex() < static_cast<std::int64_t>(plan.mJobs))
                Issue(issued++);
            const std::int64_t next = mState->mWindow.GetNextIndex();
            if (next == issued && (mStopping || issued == end))
                break;

            std::optional<FrameResult> result = mState->mWindow.TakeNext(kPollInterval);
            if (!result)
            {
                mProgress.Update(mWritten);
                if (std::chrono::steady_clock::now() - lastArrival > kStallTimeout)
                {
                    Fail("frame " + std::to_string(next) + ": no frame arrived for " +
                         std::to_string(kStallTimeout.count()) + " s; giving up");
                    mAbandoned = true;
                    break;
                }
                continue;
            }
            lastArrival = std::chrono::steady_clock::now();
            mInFlight.erase(result->mEncoded.mIndex);
            Take(*result);
            mProgress.Update(mWritten);
        }
        mProgress.Clear();

        if (mError.empty() && !mCancelled)
        {
            std::string error;
            if (!mState->mWriter->Finish(error))
                Fail(error);
        }
        RenderOutcome outcome;
        outcome.mFramesWritten = mWritten;
        outcome.mSeconds = mProgress.GetElapsedSeconds();
        outcome.mWhere = mState->mWriter->Describe();
        outcome.mError = mError;
        outcome.mExitCode = !mError.empty() ? 1 : mCancelled ? 130 : 0;
        return outcome;
    }

    // True when requests were still out at the end (a stalled render); they
    // may call back later, into state that their callbacks keep alive.
    bool WasAbandoned() const { return mAbandoned; }

private:
    void Issue(std::int64_t inIndex)
    {
        const RenderPlan& plan = mState->mPlan;
        const StreamInfo& stream = plan.mStream;
        const mt::TickTime time = mt::TickTime::FromFrame(inIndex, stream.mFrameRate);
        const mt::TickTime fieldDuration = mt::TickTime::TicksToTime(
            std::max<std::int64_t>(stream.mFrameRate.GetTicksPerFrame() / 2, 1));
        MF::FrameTime requested = MF::FrameTime::Make(time, stream.mFieldType, fieldDuration);
        // Re-timed output asks the time filter for the media times of its
        // fields; the filter blends or picks the media frames around them.
        if (mState->mTimeTransform)
            requested =
                MF::FrameTime(mState->mTimeTransform->Transform(requested.GetFirstFieldTime()),
                              mState->mTimeTransform->Transform(requested.GetSecondFieldTime()));

        ML::CutlistRenderParams params;
        params.SetFrameTime(requested);
        params.mWidth = stream.mWidth;
        params.mHeight = stream.mHeight;
        params.mPixelAspectRatio = stream.mPixelAspectRatio;
        params.mPixelFormat = plan.mPixelFormat;
        params.mQuality = stream.mQuality;
        params.mSecondaryQuality = stream.mQuality;
        params.mFullFrameWidth = stream.mWidth;
        params.mFullFrameHeight = stream.mHeight;
        params.mFullFramePixelAspectRatio = stream.mPixelAspectRatio;
        params.mFrameRate = stream.mFrameRate;
        params.mFieldType = static_cast<std::uint32_t>(stream.mFieldType);
        MF::FrameTime conformed;
        mState->mSource->ConformFrameTime(requested, params, conformed);
        params.SetFrameTime(conformed);

        const unsigned int requestID = ML::GetNextRequestID();
        mInFlight.emplace(inIndex, requestID);
        std::shared_ptr<SharedState> state = mState;
        // The module's delivering thread only hands the frame on: the pixel
        // work runs on the encoder pool so that deliveries are never held up.
        // The callback holds the pool, not the shared state, so that the pool
        // is never released on one of its own threads.
        ML::InitiateRender(
            mState->mSource, conformed, params, requestID,
            [state, encoders = mEncoders, inIndex](FrameRef inFrame, unsigned int, SourceRef,
                                                   bool inCancelled, int inStatus)
            {
                auto task = [state, inIndex, inFrame, inCancelled, inStatus] {
                    state->mWindow.Deliver(
                        inIndex, FinishFrame(*state, inIndex, inFrame, inCancelled, inStatus));
                };
                if (!encoders->Post(task))
                    task();
            });
    }

    void Take(FrameResult& ioResult)
    {
        FrameWriter& writer = *mState->mWriter;
        if (mStopping)
        {
            writer.Discard(ioResult.mEncoded);
            return;
        }
        if (!ioResult.mError.empty())
        {
            writer.Discard(ioResult.mEncoded);
            return Fail(ioResult.mError);
        }
        if (ioResult.mCancelled)
            return Fail("frame " + std::to_string(ioResult.mEncoded.mIndex) +
                        ": the render was cancelled by the renderer");
        std::string error;
        if (!writer.Commit(ioResult.mEncoded, error))
            return Fail(error);
        ++mWritten;
    }

    void Fail(std::string inError)
    {
        if (mError.empty())
            mError = std::move(inError);
        Stop();
    }

    // Stops issuing and withdraws every request still out; each of them ends
    // with one more callback (cancelled, or its frame), which the loop waits for.
    void Stop()
    {
        if (mStopping)
            return;
        mStopping = true;
        for (const auto& [index, requestID] : mInFlight)
            ML::CancelRender(requestID);
    }

    const std::shared_ptr<SharedState> mState;
    const ExecutorRef mEncoders;
    const RenderEnvironment& mEnvironment;
    ProgressDisplay mProgress;
    // Frame index to request identifier of the requests not yet taken.
    std::map<std::int64_t, unsigned int> mInFlight;
    std::int64_t mWritten = 0;
    bool mStopping = false;
    bool mCancelled = false;
    bool mAbandoned = false;
    std::string mError;
};

} // namespace

bool PlanRender(const RenderOptions& inOptions, const SourceFacts& inSource, unsigned inCoreCount,
                RenderPlan& outPlan, std::string& outError)
{
    RenderPlan plan;
    StreamInfo& stream = plan.mStream;
    stream.mWidth = inOptions.mWidth != 0 ? inOptions.mWidth : inSource.mWidth;
    stream.mHeight = inOptions.mHeight != 0 ? inOptions.mHeight : inSource.mHeight;
    stream.mPixelAspectRatio = inOptions.mPixelAspectRatio.value_or(inSource.mPixelAspectRatio);
    stream.mFieldType = inOptions.mFieldType.value_or(
        mt::IsInterlaced(inSource.mFieldType) ? inSource.mFieldType : mt::kFieldType_Progressive);
    stream.mQuality = static_cast<mt::RenderQuality>(inOptions.mQuality);
    // Still images carry no rate of their own; a still pattern has the one it is given.
    const bool stillRate =
        inSource.mFrameRate.IsZero() || inSource.mFrameRate >= mt::kFrameRate_Video1000;
    stream.mFrameRate =
        inOptions.mFrameRate.value_or(stillRate ? kDefaultStillFrameRate : inSource.mFrameRate);
    if (mt::IsInterlaced(stream.mFieldType) && stream.mFrameRate.GetTicksPerFrame() < 2)
    {
        outError = "--field: the frame rate is too high for interlaced frames";
        return false;
    }
    plan.mPixelFormat = inOptions.mPixelFormat;

    // The media's length in frames of the output grid, when it has one.
    std::optional<std::int64_t> length;
    if (inSource.mIsStill)
        length.reset();
    else if (inSource.mDuration != mt::kTime_Max && inSource.mDuration >= mt::kTime_Zero)
    {
        const std::int64_t ticks = stream.mFrameRate.GetTicksPerFrame();
        length = (inSource.mDuration.GetTicks() + ticks - 1) / ticks;
    }
    plan.mFirst = inOptions.mStart.value_or(0);
    if (inOptions.mCount)
        plan.mCount = *inOptions.mCount;
    else if (length)
        plan.mCount = *length - plan.mFirst;
    else
        plan.mCount = inSource.mIsStill ? 1 : kDefaultEndlessFrameCount;
    if (length)
    {
        const std::string range = *length == 0   ? std::string("no frames")
                                  : *length == 1 ? std::string("1 frame (0)")
                                                 : std::to_string(*length) + " frames (0 to " +
                                                       std::to_string(*length - 1) + ")";
        if (plan.mFirst >= *length || plan.mCount < 1 || plan.mFirst + plan.mCount > *length)
        {
            const std::string asked = inOptions.mCount
                                          ? "frames " + std::to_string(plan.mFirst) + " to " +
                                                std::to_string(plan.mFirst + plan.mCount - 1)
                                          : "--start " + std::to_string(plan.mFirst);
            outError = asked + ": the media has " + range;
            return false;
        }
    }
    stream.mFirstFrame = plan.mFirst;
    stream.mFrameCount = plan.mCount;
    const unsigned cores = std::max(inCoreCount, 1u);
    plan.mJobs = inOptions.mJobs != 0 ? inOptions.mJobs : std::min(2 * cores, kMaxJobs);
    outPlan = plan;
    return true;
}

RenderOutcome RunRender(const RenderOptions& inOptions, const RenderEnvironment& inEnvironment)
{
    RenderOutcome outcome;
    outcome.mExitCode = 1;
    BE::VideoSourceRef media;
    const BE::OpenStatus opened = BE::OpenVideoSource(inOptions.mMedia, media);
    if (!opened.Succeeded() || !media)
    {
        outcome.mError = opened.mMessage.empty()
                             ? "'" + inOptions.mMedia + "': cannot open the media (status " +
                                   StatusText(opened.mResult) + ")"
                             : opened.mMessage;
        return outcome;
    }
    const SourceFacts facts = DescribeSource(media);
    RenderPlan plan;
    if (!PlanRender(inOptions, facts, mvxcore::threads::GetCPUCoreCount(), plan, outcome.mError))
        return outcome;
    if (facts.mIsStill)
        for (const std::string& warning : GetStillSourceWarnings(inOptions))
            std::fprintf(inEnvironment.mProgress, "vrender: warning: %s\n", warning.c_str());

    // The adaptor declares what the source says of itself, so frames are
    // sampled on the source's own time line whatever the output rate.
    SourceRef source = ML::CreateRenderableSource(
        media, MF::BinaryData(), media->GetAlphaChannel(), media->GetMatteColor(), false, false,
        media->GetFrameRate(), media->GetFieldType(), media->GetPixelAspectRatio(),
        media->GetColorProfile());
    if (!source)
    {
        outcome.mError = "'" + inOptions.mMedia + "': the renderer cannot wrap this media";
        return outcome;
    }

    std::unique_ptr<FrameWriter> writer = CreateWriter(inOptions, inEnvironment);
    if (!writer->Begin(plan.mStream, outcome.mError))
        return outcome;
    QRT::InterfaceRef<MF::ITimeTransform> timeTransform;
    source = StackFilters(source, inOptions.mFilters, media->IsStill(), timeTransform);
    auto state = std::make_shared<SharedState>(plan.mFirst, media, source, std::move(writer), plan,
                                               timeTransform);
    const ExecutorRef encoders =
        mvxcore::threads::CreateThreadPoolExecutor(mvxcore::threads::GetCPUCoreCount());

    RenderLoop loop(state, encoders, inEnvironment);
    outcome = loop.Run();
    if (!loop.WasAbandoned())
    {
        // Every frame has been delivered; the pool only has to wind down.
        encoders->BeginShutdown();
        encoders->WaitForRunningTasks();
    }
    return outcome;
}

} // namespace vrender
