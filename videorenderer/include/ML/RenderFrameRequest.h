#pragma once

// ML::RenderFrameRequest: one request for one video frame.
//
// What to render (a cutlist provider and the cutlist chosen from it, a
// producer, a prefetch source, or a set of prefetch handles), at which time,
// size, pixel aspect ratio, quality and field order, in which of the caller's
// pixel formats, for whom (caller, client, station, context), with which
// priority, and where the outcome goes (client call, station message,
// completion function, or a waiting thread).
//
// A value type: the render queue copies and moves it freely between its
// lists. A request is used by one thread at a time; copies may live on
// different threads. All copies of one request share its result slot, which
// is the only state they share (the renderer stores the frame there while a
// waiting thread reads it after the waitable object is signalled).
//
// Fields are public: the request is filled by its creator (the render-frame
// object, the suites, InitiateRender) and read by the render queue.
//
// Failures of the render operations are thrown: contract violations as the
// contract error, unresolvable trees as RenderRequestException, missing
// objects as QRT::NullInterfaceException. The render queue turns them into
// statuses.

#include "BE/VideoSegmentNode.h"
#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "MF/RenderableCutlist.h"
#include "MF/RenderableCutlistProvider.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IAcceleratedSequenceRenderer.h"
#include "ML/IRenderFrameClient.h"
#include "ML/IRenderableNodePrefetch.h"
#include "ML/IRenderableNodeProducer.h"
#include "QRT/Guid.h"
#include "QRT/ImmutableString.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Param.h"
#include "QRT/WaitableObject.h"
#include "QRT/WeakReference.h"
#include "VF/FrameCachePriority.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <memory>
#include <mutex>
#include <vector>

#include <boost/function.hpp>

namespace ML
{

// Request identifiers come from the module's request counter; 0 means none.
using RenderRequestID = std::uint32_t;

// Called after every delivery of a request: (frame, cancelled, status).
using RenderCompletionFunction = boost::function<void(QRT::InterfaceRef<MF::IVideoFrame> inFrame,
                                                      bool inCancelled, int inStatus)>;

// Priorities: from 900 up the normal class (prefetched, served first), below
// it the low class; above 810 the frame is cached with the high priority.
inline constexpr std::uint32_t kRenderPriority_Normal = 900;
inline constexpr std::uint32_t kRenderPriority_CacheHigh = 810;

// Render flags.
inline constexpr std::uint32_t kRenderFlag_AlwaysCache = 8;
inline constexpr std::uint32_t kRenderFlag_CacheWhenRangeNotEmpty = 16;

// mSecondaryQuality value meaning "the same as mQuality".
inline constexpr std::uint32_t kSecondaryQuality_SameAsQuality = 0xFFFFFFFFu;

// The text mixed first into every request key.
inline constexpr char kRequestKeyPrefix[] = "Hash Including Render Params";

// The slot that all copies of one request share: the rendered frame.
// Thread-safe.
class RenderFrameResultSlot
{
public:
    void Store(QRT::InterfaceRef<MF::IVideoFrame> inFrame);
    QRT::InterfaceRef<MF::IVideoFrame> Get() const;

private:
    // Guards mFrame.
    mutable std::mutex mMutex;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
};

// What the render-frame object and the suites give a request.
struct RenderFrameRequestSettings
{
    MF::FrameTime mTime;
    mvxmediatypes::FrameRate mFrameRate;
    QRT::ParamRect mFullFrameRect;
    mvxmediatypes::PixelAspectRatio mFullFramePixelAspectRatio;
    QRT::InterfaceRef<MF::IRenderableCutlistProvider> mCutlistProvider;
    std::shared_ptr<void> mShared;
    QRT::ImmutableString mCutlistName;
    std::uint32_t mQuality = 0;
    std::uint32_t mSecondaryQuality = 0;
    QRT::ParamRect mOutputRect;
    mvxmediatypes::PixelAspectRatio mOutputPixelAspectRatio;
    std::vector<mvxmediatypes::PixelFormat> mRequestedFormats;
    std::uint32_t mFieldType = 0;
    bool mRenderSingleField = false;
    std::uint32_t mRenderFlags = 0;
    bool mFlagA = false;
    bool mCompositeOnBlack = false;
    QRT::ImmutableString mStationName;
    std::intptr_t mContext = 0;
    QRT::InterfaceRef<IRenderFrameClient> mClient;
    QRT::InterfaceRef<IAcceleratedSequenceRenderer> mAcceleratedRenderer;
    std::uint32_t mPriority = 0;
    const void* mCaller = nullptr;
    RenderRequestID mRequestID = 0;
    double mFactor = 1.0;
    bool mDoNotCache = false;
    QRT::InterfaceRef<QRT::IWaitableObject> mWaitable;
    mvxmediatypes::TickTime mValidStart = mvxmediatypes::kTime_Min;
    mvxmediatypes::TickTime mValidEnd = mvxmediatypes::kTime_Max;
    std::uint32_t mCutlistChoice = 0;
    std::int64_t mCutlistParameter = -1;
    QRT::InterfaceRef<IRenderableNodeProducer> mProducer;
    QRT::InterfaceRef<QRT::QRTUnknown> mPrefetchSource;
    RenderCompletionFunction mCompletion;
};

class RenderFrameRequest
{
public:
    RenderFrameRequest();
    RenderFrameRequest(const RenderFrameRequest&);
    RenderFrameRequest(RenderFrameRequest&&) noexcept;
    RenderFrameRequest& operator=(const RenderFrameRequest&);
    RenderFrameRequest& operator=(RenderFrameRequest&&) noexcept;
    virtual ~RenderFrameRequest();

    // From render-frame settings. Input contract "mRequestedFormats.size() >
    // 0". Computes mScale from the two rectangles and pixel aspect ratios,
    // and, unless inDeferKey, the key at once with inKeyFlag.
    RenderFrameRequest(const RenderFrameRequestSettings& inSettings, bool inDeferKey,
                       bool inKeyFlag);

    // Prefetch-only: completes when inPrefetches complete.
    RenderFrameRequest(mvxmediatypes::TickTime inTime, RenderableNodePrefetchList inPrefetches,
                       RenderRequestID inRequestID);

    // Prefetch-only from a prefetch source (an object answering
    // IRenderableNodePrefetchProvider, or itself a prefetch handle).
    RenderFrameRequest(mvxmediatypes::TickTime inTime,
                       QRT::InterfaceRef<QRT::QRTUnknown> inPrefetchSource,
                       RenderRequestID inRequestID);

    // Sets mKey ("Hash Including Render Params"): the content hash of the
    // frame mixed with the render parameters that change the picture; nil
    // when there is nothing to hash. Resolves and keeps mProducer, and moves
    // mNodeTime into the producer's node time; a cutlist without a producer
    // at the time (or whose lookup fails) gives the black frame's hash.
    void ComputeKey(bool inFlag);

    // Collects the request's prefetch handles into mActivePrefetches and
    // starts each of them. Only prefetch-only requests and requests of the
    // normal class prefetch.
    void StartPrefetches();

    // True when no handle reports a pending result (an empty list is done).
    bool PrefetchesComplete() const;
    // True when any handle, asked with the seconds waited, wants more time.
    bool PrefetchesWantMoreTime(double inElapsedSeconds) const;
    // The frame of the first handle, or empty.
    void GetPrefetchResult(QRT::InterfaceRef<MF::IVideoFrame>& outFrame) const;
    // Tells every active handle to cancel.
    void CancelPrefetches() const;

    // The render pixel format: the first requested format that is a render
    // format (uncompressed raster, 4:4:4), else BGRA_4444_8u. Kept in
    // mPixelFormat. GetRenderPixelFormat answers the same without keeping it.
    mvxmediatypes::PixelFormat ChooseRenderPixelFormat();
    mvxmediatypes::PixelFormat GetRenderPixelFormat() const;

    // The cutlist chosen by mCutlistChoice (0 main, 1 alternate, 3 third),
    // fetched once from mCutlistProvider with mCutlistName and inFlag.
    QRT::InterfaceRef<MF::IRenderableCutlist> GetRenderCutlist(bool inFlag);

    // Fills outParams for this request (size, ratio, qualities, format,
    // scales, full frame, frame rate, field type, single field, frame time).
    void BuildRenderParams(bool inFlag, CutlistRenderParams& outParams);

    // Renders the frame in inPixelFormat through the cutlist renderer.
    // Input contracts "inPixelFormat != MF::kPixelFormat_Invalid" and
    // "mKey != QRT::Guid()". Throws on failure.
    void Render(QRT::InterfaceRef<MF::IVideoFrame>& outFrame,
                mvxmediatypes::PixelFormat inPixelFormat);

    // The media of a segment node: the node's media when it is an imported
    // media node (kind 1), else an empty reference.
    static QRT::InterfaceRef<BE::Deprecated::IMedia>
    GetFirstMediaFromVideoSegment(const BE::VideoSegmentNode& inNode);

    // Puts inFrame into the shared result slot.
    void StoreResult(QRT::InterfaceRef<MF::IVideoFrame> inFrame) const;
    // The frame in the shared result slot.
    QRT::InterfaceRef<MF::IVideoFrame> GetResult() const;

    // Output size: right minus left, bottom minus top of mOutputRect.
    std::int32_t GetOutputWidth() const { return mOutputRect.Width(); }
    std::int32_t GetOutputHeight() const { return mOutputRect.Height(); }
    bool IsNormalPriority() const { return mPriority >= kRenderPriority_Normal; }
    // The shared frame cache's priority for the request's frames (its result
    // and, through the render parameters, the source frames it reads ahead):
    // high above kRenderPriority_CacheHigh, low at and below it.
    std::int32_t GetCachePriority() const
    {
        return mPriority > kRenderPriority_CacheHigh ? VF::kCachePriority_High
                                                     : VF::kCachePriority_Low;
    }

    mvxmediatypes::TickTime mTime;
    mvxmediatypes::FrameRate mFrameRate;
    QRT::ParamRect mFullFrameRect;
    mvxmediatypes::PixelAspectRatio mFullFramePixelAspectRatio;
    QRT::InterfaceRef<MF::IRenderableCutlistProvider> mCutlistProvider;
    // Carried with the request; not read by the pipeline.
    std::shared_ptr<void> mShared;
    QRT::ImmutableString mCutlistName;
    std::uint32_t mQuality = 0;
    std::uint32_t mSecondaryQuality = 0;
    QRT::ParamRect mOutputRect;
    mvxmediatypes::PixelAspectRatio mOutputPixelAspectRatio;
    std::vector<mvxmediatypes::PixelFormat> mRequestedFormats;
    std::uint32_t mFieldType = 0;
    bool mRenderSingleField = false;
    std::uint32_t mRenderFlags = 0;
    // Carried; not read by the pipeline.
    bool mFlagA = false;
    bool mCompositeOnBlack = false;
    QRT::ImmutableString mStationName;
    std::intptr_t mContext = 0;
    QRT::WeakReference<IRenderFrameClient> mClient;
    QRT::InterfaceRef<IAcceleratedSequenceRenderer> mAcceleratedRenderer;
    std::uint32_t mPriority = 0;
    // Carried; not read by the pipeline.
    std::uint32_t mCarriedWord1 = 1;
    std::uint32_t mCarriedWord2 = 0;
    const void* mCaller = nullptr;
    RenderRequestID mRequestID = 0;
    float mScale = 1.0f;
    // Carried; not read by the pipeline.
    std::uint32_t mCarriedWord3 = 0;
    std::uint32_t mCarriedWord4 = 0;
    double mFactor = 1.0;
    bool mDoNotCache = false;
    // Carried; not read by the pipeline.
    std::uint8_t mCarriedBytes[3] = {0, 0, 0};
    // When set, completion signals this object instead of notifying anybody.
    QRT::InterfaceRef<QRT::IWaitableObject> mWaitable;
    QRT::Guid mKey;
    std::shared_ptr<RenderFrameResultSlot> mResult;
    // Carried; not read by the pipeline.
    std::int64_t mCarriedValue = 0;
    mvxmediatypes::TickTime mValidStart = mvxmediatypes::kTime_Min;
    mvxmediatypes::TickTime mValidEnd = mvxmediatypes::kTime_Max;
    mvxmediatypes::PixelFormat mPixelFormat = mvxmediatypes::kPixelFormat_Invalid;
    std::uint32_t mCutlistChoice = 0;
    std::int64_t mCutlistParameter = -1;
    QRT::InterfaceRef<IRenderableNodeProducer> mProducer;
    // The frame time given to the render tree (the node's own time once the
    // producer has been resolved).
    MF::FrameTime mNodeTime;
    QRT::InterfaceRef<QRT::QRTUnknown> mPrefetchSource;
    QRT::InterfaceRef<MF::IRenderableCutlist> mCutlist;
    RenderableNodePrefetchList mActivePrefetches;
    RenderableNodePrefetchList mGivenPrefetches;
    bool mPrefetchOnly = false;
    RenderCompletionFunction mCompletion;
};

} // namespace ML
