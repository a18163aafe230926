#pragma once

// vrender's render loop: renders a range of frames of one media source
// through the module's render queue and writes them in order.
//
// The loop runs on the caller's thread. It keeps up to `jobs` frames in
// flight: each is conformed (IRenderableSource::ConformFrameTime) and its
// prefetches are queued (InitiatePrefetchedRender); when they are done the
// module's delivering thread only posts the frame to vrender's encoder pool,
// where the source renders it and format conversion, PNG compression or
// Y'CbCr packing run, in parallel; finished frames
// go through an OrderingWindow back into frame order and are committed by
// the loop. A cancel request (Ctrl-C) or a failed frame cancels everything
// in flight with ML::CancelRender, waits until every request has ended and
// removes what was produced but not written. The frames in flight are bounded
// by count (--jobs) and by memory (--memory): a frame that does not fit the
// budget on its own is refused before anything is rendered. The module must
// be up (ML::VideoRenderer::Initialize) for the whole call.

#include "BE/Sequence.h"
#include "FrameWriters.h"
#include "MF/RenderableCutlist.h"
#include "MF/TimeTransform.h"
#include "ML/IRenderableSource.h"
#include "Options.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/TickTime.h"

#include <atomic>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <string>

namespace vrender
{

// What vrender needs to know about a source to plan a render.
struct SourceFacts
{
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    mvxmediatypes::FrameRate mFrameRate;
    bool mIsStill = false;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio;
    // kTime_Max for media without an end.
    mvxmediatypes::TickTime mDuration = mvxmediatypes::kTime_Max;
    // Frames are composited (a sequence): they are made in BGRA whatever the
    // output takes.
    bool mComposited = false;
};

// Frames of endless media rendered when no range is given.
inline constexpr std::int64_t kDefaultEndlessFrameCount = 50;
// Frame rate of the frame grid for still images when none is given.
inline constexpr mvxmediatypes::FrameRate kDefaultStillFrameRate =
    mvxmediatypes::kFrameRate_Video25;

// What vrender needs to know about the machine to plan a render.
struct HostFacts
{
    unsigned mCoreCount = 1;
    // 0 when unknown: the frames in flight are then bounded only by --memory.
    std::uint64_t mPhysicalMemory = 0;
};

// Answers the cores and the physical memory of this machine.
HostFacts DescribeHost();

struct RenderPlan
{
    std::int64_t mFirst = 0;
    std::int64_t mCount = 0;
    StreamInfo mStream;
    mvxmediatypes::PixelFormat mPixelFormat;
    std::uint32_t mJobs = 1;
    // Re-timed output (--speed): the media time of output time zero. Zero
    // for forward speeds; for reverse ones the time from which the frame
    // range plays back to the media's first frame (the last frame of a clip).
    mvxmediatypes::TickTime mMediaStart = mvxmediatypes::kTime_Zero;
    // The memory one frame in flight takes, as estimated for the budget.
    std::uint64_t mFrameBytes = 0;
    // The picture the frames are a view of (a sequence's frame, which the
    // output may show smaller or larger); 0 x 0 means the output's own.
    std::uint32_t mFullFrameWidth = 0;
    std::uint32_t mFullFrameHeight = 0;
};

// Resolves the options against the source and the machine: frame range
// (checked against the media's length, which a speed stretches or shrinks:
// the output frames whose media times fall inside the media), size, pixel
// aspect ratio, field order, frame rate, where re-timed output starts in the
// media, and the number of frames in flight (--jobs, at most as many as fit
// the memory budget). False with outError naming the option and the problem
// ("--frames 90:120: the media has 100 frames (0 to 99)").
bool PlanRender(const RenderOptions& inOptions, const SourceFacts& inSource,
                const HostFacts& inHost, RenderPlan& outPlan, std::string& outError);

struct RenderOutcome
{
    // 0 success, 1 failure, 130 cancelled (also when the cancel made a
    // write fail).
    int mExitCode = 0;
    // The failure, naming the file or frame and the problem; empty otherwise.
    std::string mError;
    std::int64_t mFramesWritten = 0;
    double mSeconds = 0.0;
    // Where the frames went (the writer's description).
    std::string mWhere;
};

struct RenderEnvironment
{
    // Y4M streams go here.
    std::FILE* mOutput = stdout;
    // Progress goes here.
    std::FILE* mProgress = stderr;
    bool mShowProgress = false;
    // Set from another thread or a signal handler to cancel.
    const std::atomic<bool>* mCancel = nullptr;
    // When set, counts the frames written as they are written, for a
    // caller that reports on a render it cannot wait for.
    std::atomic<std::int64_t>* mFramesWritten = nullptr;
};

// What the loop renders: the source, the mapping of output time to the
// source's time when frames are re-timed, and why a frame failed.
struct RenderInput
{
    QRT::InterfaceRef<ML::IRenderableSource> mSource;
    // Empty when frames are not re-timed.
    QRT::InterfaceRef<MF::ITimeTransform> mTimeTransform;
    // Why frame N came without a picture, naming the file where it can.
    // Called on the encoder pool, any number at once.
    std::function<std::string(std::int64_t)> mExplainFailure;
};

// Renders the frames of inPlan from inInput.mSource and writes them as
// inOptions says (the loop of the header comment).
RenderOutcome RunRenderLoop(RenderInput inInput, const RenderPlan& inPlan,
                            const RenderOptions& inOptions, const RenderEnvironment& inEnvironment);

// `vrender source`: one media source with the filters of inOptions.
RenderOutcome RunRender(const RenderOptions& inOptions, const RenderEnvironment& inEnvironment);

// The cutlist the published factory builds of inSequence; empty, with
// outError saying why, when it cannot be built. The module must be up.
QRT::InterfaceRef<MF::IRenderableCutlist> BuildTimelineCutlist(const BE::SequenceRef& inSequence,
                                                               std::string& outError);

// `vrender render` and the demo: a timeline file, or the built-in demo
// timeline, through the cutlist factory and the cutlist source.
RenderOutcome RunTimelineRender(const RenderOptions& inOptions,
                                const RenderEnvironment& inEnvironment);

} // namespace vrender
