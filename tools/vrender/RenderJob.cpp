#include "RenderJob.h"

#include "BE/IMediaInfo.h"
#include "BE/VideoSources.h"
#include "EdgeHoldSource.h"
#include "MF/BinaryData.h"
#include "MF/TimeTransform.h"
#include "ML/RenderRequestException.h"
#include "ML/RenderableSourceFilters.h"
#include "ML/RenderableVideoSources.h"
#include "ML/VideoRenderer.h"
#include "OrderingWindow.h"
#include "PrefetchedRender.h"
#include "Progress.h"
#include "VF/FrameCachePriority.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/threads/ExecutorFactories.h"

#include <algorithm>
#include <chrono>
#include <cinttypes>
#include <cmath>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <new>
#include <unistd.h>

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
// Without --memory the frames in flight may take this share of the
// physical memory.
constexpr std::uint64_t kDefaultMemoryDivisor = 2;
// Bytes per output pixel of the encoders' staging and output buffers (8-bit
// 4:4:4 staging and the packed planes or the PNG rows).
constexpr std::uint64_t kEncoderBytesPerPixel = 8;
// The least bytes per pixel of a source frame (8-bit BGRA).
constexpr std::uint64_t kSourceBytesPerPixel = 4;

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
    // With --keep-going: why the frame was written black; empty otherwise.
    std::string mFailure;
};

// State shared between the loop and the callbacks, which run on the module's
// delivering thread and on the encoder pool. Held by shared_ptr so that a
// late callback never reaches freed state.
struct SharedState
{
    SharedState(std::int64_t inFirst, std::unique_ptr<FrameWriter> inWriter, RenderPlan inPlan,
                RenderInput inInput, bool inKeepGoing)
        : mWindow(inFirst)
        , mSource(std::move(inInput.mSource))
        , mWriter(std::move(inWriter))
        , mPlan(inPlan)
        , mTimeTransform(std::move(inInput.mTimeTransform))
        , mExplainFailure(std::move(inInput.mExplainFailure))
        , mKeepGoing(inKeepGoing)
    {
    }

    OrderingWindow<FrameResult> mWindow;
    const SourceRef mSource;
    const std::unique_ptr<FrameWriter> mWriter;
    const RenderPlan mPlan;
    // Output time to media time (--speed); empty when frames are not re-timed.
    const QRT::InterfaceRef<MF::ITimeTransform> mTimeTransform;
    // Why a frame came without a picture.
    const std::function<std::string(std::int64_t)> mExplainFailure;
    // A failed frame is written black and the render goes on.
    const bool mKeepGoing;
};

// The delivered frame in the stream's size and in the render's format, or
// in any format the writer takes as it is: the source delivers the nearest
// format it has and may keep its own size.
FrameRef ConformToStream(const FrameRef& inFrame, const RenderPlan& inPlan,
                         const FrameWriter& inWriter, std::string& outError)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const StreamInfo& stream = inPlan.mStream;
    const mt::PixelFormat format = inFrame->GetPixelFormat();
    if ((format == inPlan.mPixelFormat || inWriter.Accepts(format)) &&
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
// when frames are re-timed (output time zero at inMediaStart), else empty;
// the time filters then read the media through HoldEdgeFrames.
SourceRef StackFilters(SourceRef inSource, const FilterOptions& inFilters,
                       const SourceFacts& inMedia, mt::TickTime inMediaStart,
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
        if (inFilters.mInterlaceConsecutive && !inMedia.mIsStill)
            source = ML::InterlaceConsecutiveFramesFromSource(source);
    }
    if (inFilters.mScale)
        source = ML::ScaleAndPARCorrectSource(source);
    if (inFilters.mSpeed && !inMedia.mIsStill)
    {
        if (inMedia.mDuration != mt::kTime_Max && inMedia.mDuration > mt::kTime_Zero)
            source = HoldEdgeFrames(source, inMedia.mDuration, inMedia.mFrameRate);
        outTimeTransform = MF::CreateTimeTransform(*inFilters.mSpeed, mt::kTime_Zero, inMediaStart);
        source = inFilters.mFrameBlend
                     ? ML::TimeBlendSource(source, outTimeTransform, *inFilters.mSpeed)
                     : ML::TimeMixSource(source);
    }
    return source;
}

// An opaque black frame of the stream: what --keep-going writes in place of
// a frame that failed.
FrameRef MakeStandInFrame(const RenderPlan& inPlan)
{
    const StreamInfo& stream = inPlan.mStream;
    FrameRef frame;
    if (QRT::Failed(VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, stream.mWidth,
                                         stream.mHeight, stream.mPixelAspectRatio, false, false,
                                         frame)) ||
        QRT::Failed(VF::VideoFrameManipulators::FillWithColor(frame, 0xFF000000u)))
        return {};
    frame->SetFieldType(stream.mFieldType);
    return frame;
}

// Why a render threw, for the frame's message.
std::string DescribeRenderFailure(const std::exception_ptr& inFailure)
{
    try
    {
        std::rethrow_exception(inFailure);
    }
    catch (const std::bad_alloc&)
    {
        return "out of memory (lower --jobs or --memory)";
    }
    catch (const std::exception& inException)
    {
        return std::string("the render failed: ") + inException.what();
    }
    catch (...)
    {
        return "the render failed";
    }
}

// Runs on the encoder pool: finishes one rendered frame. inFailure is what
// the render threw, if anything.
FrameResult FinishFrame(SharedState& inState, std::int64_t inIndex, FrameRef inFrame,
                        bool inCancelled, int inStatus, std::exception_ptr inFailure)
{
    FrameResult result;
    result.mEncoded.mIndex = inIndex;
    const std::string name = "frame " + std::to_string(inIndex);
    if (inCancelled)
    {
        result.mCancelled = true;
        return result;
    }
    try
    {
        std::string failure;
        if (inFailure)
            failure = DescribeRenderFailure(inFailure);
        else if (inStatus < 0)
            failure = "the render failed (status " + StatusText(inStatus) + ")";
        else if (!inFrame)
            // Success without a frame: the source could not render this time.
            failure = inState.mExplainFailure(inIndex);
        if (!failure.empty())
        {
            if (!inState.mKeepGoing || !(inFrame = MakeStandInFrame(inState.mPlan)))
            {
                result.mError = name + ": " + failure;
                return result;
            }
            result.mFailure = name + ": " + failure;
        }
        std::string problem;
        const FrameRef frame = ConformToStream(inFrame, inState.mPlan, *inState.mWriter, problem);
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
    catch (const std::bad_alloc&)
    {
        result.mError = name + ": out of memory (lower --jobs or --memory)";
    }
    catch (const std::exception& inException)
    {
        result.mError = name + ": " + inException.what();
    }
    return result;
}

std::string FormatSpeed(double inSpeed)
{
    char text[32];
    std::snprintf(text, sizeof(text), "%g", inSpeed);
    return text;
}

// "1.5 GiB", "512.0 MiB".
std::string FormatBytes(std::uint64_t inBytes)
{
    const bool gibibytes = inBytes >= (std::uint64_t{1} << 30);
    char text[32];
    std::snprintf(text, sizeof(text), "%.1f %s",
                  static_cast<double>(inBytes) / (gibibytes ? 1073741824.0 : 1048576.0),
                  gibibytes ? "GiB" : "MiB");
    return text;
}

// The memory one frame in flight takes at most, roughly: the source's frame
// (two when filters read neighbouring frames), the frame in the render
// format, and the encoder's buffers.
std::uint64_t EstimateFrameBytes(const SourceFacts& inSource, const RenderPlan& inPlan,
                                 bool inFiltered)
{
    const std::uint64_t bytesPerPixel =
        std::max<std::uint64_t>(inPlan.mPixelFormat.GetBytesPerPixel(), kSourceBytesPerPixel);
    const std::uint64_t sourcePixels = std::uint64_t{inSource.mWidth} * inSource.mHeight;
    const std::uint64_t outputPixels =
        std::uint64_t{inPlan.mStream.mWidth} * inPlan.mStream.mHeight;
    return sourcePixels * bytesPerPixel * (inFiltered ? 2 : 1) +
           outputPixels * (bytesPerPixel + kEncoderBytesPerPixel);
}

// The number of output frames, at inSpeed (not zero) on a grid of
// inTicksPerFrame, whose media times fall inside [0, inDuration).
std::int64_t CountRetimedFrames(mt::TickTime inDuration, std::int64_t inTicksPerFrame,
                                double inSpeed)
{
    const auto forward = MF::CreateTimeTransform(std::fabs(inSpeed));
    const auto mediaTime = [&](std::int64_t inFrame)
    { return forward->Transform(mt::TickTime::TicksToTime(inFrame * inTicksPerFrame)); };
    auto count = static_cast<std::int64_t>(
        std::ceil(static_cast<double>(inDuration.GetTicks()) /
                  (std::fabs(inSpeed) * static_cast<double>(inTicksPerFrame))));
    while (count > 0 && mediaTime(count - 1) >= inDuration)
        --count;
    while (mediaTime(count) < inDuration)
        ++count;
    return count;
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
        // A cancel may have made a write fail (the pipe's reader went away
        // with the user's Ctrl-C); the cancel is what happened.
        if (mEnvironment.mCancel && mEnvironment.mCancel->load())
            mCancelled = true;

        if (mError.empty() && !mCancelled)
        {
            std::string error;
            if (!mState->mWriter->Finish(error))
                Fail(error);
        }
        if (mError.empty() && mFailedFrames > 0)
            mError = mFailedFrames == 1
                         ? mFirstFailure + " (written black)"
                         : std::to_string(mFailedFrames) +
                               " frames failed and were written black; the first, " + mFirstFailure;
        RenderOutcome outcome;
        outcome.mFramesWritten = mWritten;
        outcome.mSeconds = mProgress.GetElapsedSeconds();
        outcome.mWhere = mState->mWriter->Describe();
        outcome.mError = mError;
        outcome.mExitCode = mCancelled ? 130 : !mError.empty() ? 1 : 0;
        if (mCancelled)
            outcome.mError.clear();
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
        // A view of a larger or smaller picture renders its media at the
        // output's scale of it.
        params.mFullFrameWidth = plan.mFullFrameWidth != 0 ? plan.mFullFrameWidth : stream.mWidth;
        params.mFullFrameHeight =
            plan.mFullFrameHeight != 0 ? plan.mFullFrameHeight : stream.mHeight;
        params.mFullFramePixelAspectRatio = stream.mPixelAspectRatio;
        params.mHorizontalScale = double(stream.mWidth) / params.mFullFrameWidth;
        params.mVerticalScale = double(stream.mHeight) / params.mFullFrameHeight;
        params.mFrameRate = stream.mFrameRate;
        params.mFieldType = static_cast<std::uint32_t>(stream.mFieldType);
        // One pass over the material: its frames are not asked for again,
        // except by neighbours, which the cache's low-priority allowance keeps.
        params.mCachePriority = VF::kCachePriority_Low;
        MF::FrameTime conformed;
        mState->mSource->ConformFrameTime(requested, params, conformed);
        params.SetFrameTime(conformed);

        const unsigned int requestID = ML::GetNextRequestID();
        mInFlight.emplace(inIndex, requestID);
        std::shared_ptr<SharedState> state = mState;
        // The render and the pixel work run on the encoder pool, in
        // parallel, not on the module's single delivering thread.
        InitiatePrefetchedRender(mState->mSource, conformed, params, requestID, mEncoders,
                                 [state, inIndex](FrameRef inFrame, bool inCancelled, int inStatus,
                                                  std::exception_ptr inFailure)
                                 {
                                     state->mWindow.Deliver(
                                         inIndex, FinishFrame(*state, inIndex, std::move(inFrame),
                                                              inCancelled, inStatus, inFailure));
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
        if (!ioResult.mFailure.empty())
        {
            mProgress.Clear();
            std::fprintf(mEnvironment.mProgress, "vrender: %s; written black\n",
                         ioResult.mFailure.c_str());
            if (mFailedFrames++ == 0)
                mFirstFailure = ioResult.mFailure;
        }
        ++mWritten;
        if (mEnvironment.mFramesWritten)
            mEnvironment.mFramesWritten->store(mWritten);
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
    // Frames written black with --keep-going, and the first one's reason.
    std::int64_t mFailedFrames = 0;
    std::string mFirstFailure;
    bool mStopping = false;
    bool mCancelled = false;
    bool mAbandoned = false;
    std::string mError;
};

} // namespace

HostFacts DescribeHost()
{
    HostFacts host;
    host.mCoreCount = mvxcore::threads::GetCPUCoreCount();
    const long pages = sysconf(_SC_PHYS_PAGES);
    const long pageSize = sysconf(_SC_PAGESIZE);
    if (pages > 0 && pageSize > 0)
        host.mPhysicalMemory =
            static_cast<std::uint64_t>(pages) * static_cast<std::uint64_t>(pageSize);
    return host;
}

bool PlanRender(const RenderOptions& inOptions, const SourceFacts& inSource,
                const HostFacts& inHost, RenderPlan& outPlan, std::string& outError)
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
    // A Y4M stream of the source's own size without filters asks for its
    // own sampling (planar 4:2:0, or 4:4:4 Y'CbCr): a source that has it
    // hands its samples over unconverted. Composited frames (a sequence)
    // and filters work in BGRA, except that re-timing and scaling of
    // progressive frames also work on 4:2:0 planes (and answer BGRA for what
    // they cannot do so).
    const bool sameSize = stream.mWidth == inSource.mWidth && stream.mHeight == inSource.mHeight;
    FilterOptions others = inOptions.mFilters;
    others.mSpeed.reset();
    others.mScale = false;
    const bool planarFilters =
        inOptions.mFilters.Any() && !others.Any() && inOptions.mChroma == Y4MChroma::k420 &&
        !mt::IsInterlaced(inSource.mFieldType) && !mt::IsInterlaced(stream.mFieldType);
    const bool asStored =
        inOptions.mOutputKind != OutputKind::kPngSequence && !inSource.mComposited &&
        (!inOptions.mFilters.Any() ? sameSize
                                   : planarFilters && (sameSize || inOptions.mFilters.mScale));
    plan.mPixelFormat = inOptions.mPixelFormat.value_or(!asStored ? mt::kPixelFormat_BGRA_4444_8u
                                                        : inOptions.mChroma == Y4MChroma::k420
                                                            ? mt::kPixelFormat_YUV_420_8u_Planar
                                                            : mt::kPixelFormat_VUYA_4444_8u);

    // The media's length in frames of the output grid, when it has one; a
    // speed plays it in fewer or more frames.
    const bool retimed = !inSource.mIsStill && inOptions.mFilters.mSpeed.has_value();
    const double speed = inOptions.mFilters.mSpeed.value_or(1.0);
    const std::int64_t ticks = stream.mFrameRate.GetTicksPerFrame();
    std::optional<std::int64_t> length;
    if (!inSource.mIsStill && inSource.mDuration != mt::kTime_Max &&
        inSource.mDuration >= mt::kTime_Zero)
        length = retimed ? CountRetimedFrames(inSource.mDuration, ticks, speed)
                         : (inSource.mDuration.GetTicks() + ticks - 1) / ticks;
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
            outError = asked + ": the media has " + range +
                       (retimed ? " at speed " + FormatSpeed(speed) : std::string());
            return false;
        }
    }
    stream.mFirstFrame = plan.mFirst;
    stream.mFrameCount = plan.mCount;
    if (retimed && speed < 0)
    {
        // Backwards from the last media frame, or from where the forward
        // frames would end when that is later (slow motion), so that the
        // last output frame shows the media's first.
        const std::int64_t last = length ? *length - 1 : plan.mFirst + plan.mCount - 1;
        const mt::TickTime lastTime = mt::TickTime::TicksToTime(last * ticks);
        mt::TickTime start = MF::CreateTimeTransform(-speed)->Transform(lastTime);
        if (length)
        {
            const std::int64_t mediaTicks =
                inSource.mFrameRate.IsZero() ? ticks : inSource.mFrameRate.GetTicksPerFrame();
            start = std::max(start, mt::TickTime::TicksToTime(std::max<std::int64_t>(
                                        inSource.mDuration.GetTicks() - mediaTicks, 0)));
        }
        // The backward product may round a tick below zero.
        const mt::TickTime end =
            MF::CreateTimeTransform(speed, mt::kTime_Zero, start)->Transform(lastTime);
        if (end < mt::kTime_Zero)
            start = mt::TickTime::TicksToTime(start.GetTicks() - end.GetTicks());
        plan.mMediaStart = start;
    }

    const unsigned cores = std::max(inHost.mCoreCount, 1u);
    plan.mJobs = inOptions.mJobs != 0 ? inOptions.mJobs : std::min(2 * cores, kMaxJobs);
    plan.mFrameBytes = EstimateFrameBytes(inSource, plan, inOptions.mFilters.Any());
    const std::uint64_t budget =
        inOptions.mMemoryBudget.value_or(inHost.mPhysicalMemory / kDefaultMemoryDivisor);
    if (budget != 0)
    {
        const std::uint64_t fit = budget / std::max<std::uint64_t>(plan.mFrameBytes, 1);
        if (fit == 0)
        {
            const bool sourceLarger = std::uint64_t{inSource.mWidth} * inSource.mHeight >
                                      std::uint64_t{stream.mWidth} * stream.mHeight;
            outError = "a " + std::to_string(sourceLarger ? inSource.mWidth : stream.mWidth) + "x" +
                       std::to_string(sourceLarger ? inSource.mHeight : stream.mHeight) +
                       " frame needs about " + FormatBytes(plan.mFrameBytes) +
                       " in flight, more than the memory budget of " + FormatBytes(budget) +
                       (inOptions.mMemoryBudget ? std::string(" (--memory)")
                                                : " (half the physical memory; --memory sets it)");
            return false;
        }
        plan.mJobs = static_cast<std::uint32_t>(std::min<std::uint64_t>(plan.mJobs, fit));
    }
    outPlan = plan;
    return true;
}

RenderOutcome RunRenderLoop(RenderInput inInput, const RenderPlan& inPlan,
                            const RenderOptions& inOptions, const RenderEnvironment& inEnvironment)
{
    RenderOutcome outcome;
    outcome.mExitCode = 1;
    // Without a source no request would ever be answered.
    if (!inInput.mSource)
    {
        outcome.mError = "the renderer has no source to render";
        return outcome;
    }
    std::unique_ptr<FrameWriter> writer = CreateWriter(inOptions, inEnvironment);
    if (!writer->Begin(inPlan.mStream, outcome.mError))
        return outcome;
    auto state = std::make_shared<SharedState>(inPlan.mFirst, std::move(writer), inPlan,
                                               std::move(inInput), inOptions.mKeepGoing);
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
    if (!PlanRender(inOptions, facts, DescribeHost(), plan, outcome.mError))
        return outcome;
    if (facts.mIsStill)
        for (const std::string& warning : GetStillSourceWarnings(inOptions))
            std::fprintf(inEnvironment.mProgress, "vrender: warning: %s\n", warning.c_str());

    // The adaptor declares what the source says of itself, so frames are
    // sampled on the source's own time line whatever the output rate.
    RenderInput input;
    input.mSource = ML::CreateRenderableSource(
        media, MF::BinaryData(), media->GetAlphaChannel(), media->GetMatteColor(), false, false,
        media->GetFrameRate(), media->GetFieldType(), media->GetPixelAspectRatio(),
        media->GetColorProfile());
    if (!input.mSource)
    {
        outcome.mError = "'" + inOptions.mMedia + "': the renderer cannot wrap this media";
        return outcome;
    }
    input.mSource = StackFilters(input.mSource, inOptions.mFilters, facts, plan.mMediaStart,
                                 input.mTimeTransform);
    // The decoder's reason for a frame, else what opening the media noted
    // about damage it works around.
    input.mExplainFailure = [media, note = opened.mMessage](std::int64_t)
    {
        std::string cause = BE::GetLastReadFailure(media);
        if (cause.empty())
            cause = note.empty() ? std::string("the source delivered no frame") : note;
        return cause;
    };
    return RunRenderLoop(std::move(input), plan, inOptions, inEnvironment);
}

} // namespace vrender
