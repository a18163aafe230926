#pragma once

// Test doubles of the source, filter and prefetcher tests, and their helpers:
// pixel access of small BGRA 8-bit frames, render parameters, and two doubles.
//
// MarkedSource is a renderable source that conforms like a media adaptor (to
// its frame grid, in its declared field order, or following the request's
// order) and renders frames whose slot-1 rows (0, 2, 4, ...) hold
// Marker(first field time, 1) and slot-2 rows Marker(second field time, 2) of
// the conformed time; with a gradient, channel R of row y is 10 * y instead.
// Asked for planar 4:2:0, it renders a progressive time as a 4:2:0 frame
// whose Y, Cb and Cr samples are the B, G and R of Marker(time, 1).
// Its frames are marked shared, so a filter that writes into them fails its
// contract.
//
// ScriptedVideoSource is a back-end video source (with media information and,
// when enabled, asynchronous reads) whose answers the test sets and which
// records every frame, prefetch and draw request.
//
// Settings are made before a double is used; the records are guarded by a
// mutex, so the doubles may be used from several threads.

#include "BE/IMediaInfo.h"
#include "BE/IVideoSource.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "ML/RenderRequestException.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "VF/VideoFrameManipulators.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <future>
#include <map>
#include <memory>
#include <mutex>
#include <ostream>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace ML::Test
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using SourceRef = QRT::InterfaceRef<IRenderableSource>;
using mt::FrameRate;
using mt::TickTime;
using mvxcore::utility::Guid;

inline TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// 29.97 and 25 frames per second: frame and field durations in ticks.
inline constexpr std::int64_t kFrame = 23'543'520;
inline constexpr std::int64_t kField = kFrame / 2;
inline constexpr std::int64_t kFrame25 = 28'224'000;
inline constexpr std::int64_t kField25 = kFrame25 / 2;

// Short names for the tables of the source tests.
inline constexpr mt::FieldType kProg = mt::kFieldType_Progressive;
inline constexpr mt::FieldType kUpper = mt::kFieldType_UpperFirst;
inline constexpr mt::FieldType kLower = mt::kFieldType_LowerFirst;
inline constexpr mt::FieldType kAsSource = mt::kFieldType_AsSource;
inline const FrameRate k25 = mt::kFrameRate_Video25;
inline const FrameRate k50 = mt::kFrameRate_Video50;
inline const FrameRate k1000 = mt::kFrameRate_Video1000;
inline const FrameRate kNoRate = mt::kFrameRate_Zero;

// A BGRA 8-bit pixel as stored in memory.
struct Pixel
{
    std::uint8_t mB = 0, mG = 0, mR = 0, mA = 0;
    friend bool operator==(const Pixel&, const Pixel&) = default;
    friend std::ostream& operator<<(std::ostream& ioStream, const Pixel& inPixel)
    {
        return ioStream << "BGRA(" << int(inPixel.mB) << ", " << int(inPixel.mG) << ", "
                        << int(inPixel.mR) << ", " << int(inPixel.mA) << ")";
    }
};

inline Pixel ReadPixel(const MF::IVideoFrame& inFrame, std::int32_t inX, std::int32_t inY)
{
    Pixel pixel;
    std::memcpy(&pixel,
                static_cast<const std::uint8_t*>(inFrame.GetBaseAddress()) +
                    static_cast<std::ptrdiff_t>(inY) * inFrame.GetRowBytes() + inX * 4,
                4);
    return pixel;
}

inline FrameRef MakeFrame(std::uint32_t inWidth, std::uint32_t inHeight,
                          const std::function<Pixel(std::int32_t, std::int32_t)>& inPixelAt)
{
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                                          mt::kPixelAspectRatio_Square, false, false);
    auto* base = static_cast<std::uint8_t*>(frame->GetWritableBaseAddress());
    for (std::int32_t y = 0; y < static_cast<std::int32_t>(inHeight); ++y)
        for (std::int32_t x = 0; x < static_cast<std::int32_t>(inWidth); ++x)
        {
            const Pixel pixel = inPixelAt(x, y);
            std::memcpy(base + static_cast<std::ptrdiff_t>(y) * frame->GetRowBytes() + x * 4,
                        &pixel, 4);
        }
    return frame;
}

// A planar 4:2:0 frame whose Y, Cb and Cr planes hold inPixel's B, G and R.
inline FrameRef MakePlanarFrame(std::uint32_t inWidth, std::uint32_t inHeight, Pixel inPixel)
{
    FrameRef frame = VF::CreateVideoFrame(mt::kPixelFormat_YUV_420_8u_Planar, inWidth, inHeight,
                                          mt::kPixelAspectRatio_Square, false, false);
    const std::uint8_t samples[3] = {inPixel.mB, inPixel.mG, inPixel.mR};
    for (std::uint32_t plane = 0; plane < 3; ++plane)
    {
        const std::uint32_t rows = plane == 0 ? inHeight : (inHeight + 1) / 2;
        std::memset(frame->GetWritablePlaneBaseAddress(plane), samples[plane],
                    std::size_t{rows} * static_cast<std::size_t>(frame->GetPlaneRowBytes(plane)));
    }
    return frame;
}

// Checks that every sample of the planes of a 4:2:0 frame is inPixel's B (Y), G (Cb), R (Cr).
inline ::testing::AssertionResult PlanesAre(const FrameRef& inFrame, Pixel inPixel)
{
    if (!inFrame || inFrame->GetPixelFormat() != mt::kPixelFormat_YUV_420_8u_Planar)
        return ::testing::AssertionFailure() << "no 4:2:0 frame";
    const QRT::ParamRect bounds = inFrame->GetBounds();
    const std::uint8_t samples[3] = {inPixel.mB, inPixel.mG, inPixel.mR};
    for (std::uint32_t plane = 0; plane < 3; ++plane)
    {
        const std::int32_t width = plane == 0 ? bounds.Width() : (bounds.Width() + 1) / 2;
        const std::int32_t height = plane == 0 ? bounds.Height() : (bounds.Height() + 1) / 2;
        const auto* base = static_cast<const std::uint8_t*>(inFrame->GetPlaneBaseAddress(plane));
        for (std::int32_t y = 0; y < height; ++y)
            for (std::int32_t x = 0; x < width; ++x)
                if (base[y * inFrame->GetPlaneRowBytes(plane) + x] != samples[plane])
                    return ::testing::AssertionFailure()
                           << "plane " << plane << " (" << x << ", " << y << ") is "
                           << int(base[y * inFrame->GetPlaneRowBytes(plane) + x]) << ", not "
                           << int(samples[plane]);
    }
    return ::testing::AssertionSuccess();
}

inline FrameRef MakeFilledFrame(std::uint32_t inWidth, std::uint32_t inHeight, Pixel inPixel)
{
    return MakeFrame(inWidth, inHeight, [inPixel](std::int32_t, std::int32_t) { return inPixel; });
}

// Checks every pixel of inFrame (rows and columns of its bounds) against
// inExpected(x, y), each channel within inTolerance.
inline ::testing::AssertionResult
PixelsAre(const FrameRef& inFrame,
          const std::function<Pixel(std::int32_t, std::int32_t)>& inExpected, int inTolerance = 0)
{
    if (!inFrame)
        return ::testing::AssertionFailure() << "no frame";
    const QRT::ParamRect bounds = inFrame->GetBounds();
    for (std::int32_t y = 0; y < bounds.Height(); ++y)
        for (std::int32_t x = 0; x < bounds.Width(); ++x)
        {
            const Pixel got = ReadPixel(*inFrame, x, y);
            const Pixel want = inExpected(x, y);
            if (std::abs(got.mB - want.mB) > inTolerance ||
                std::abs(got.mG - want.mG) > inTolerance ||
                std::abs(got.mR - want.mR) > inTolerance ||
                std::abs(got.mA - want.mA) > inTolerance)
                return ::testing::AssertionFailure()
                       << "pixel (" << x << ", " << y << ") is " << got << ", expected " << want;
        }
    return ::testing::AssertionSuccess();
}

inline ::testing::AssertionResult AllPixelsAre(const FrameRef& inFrame, Pixel inExpected)
{
    return PixelsAre(inFrame, [inExpected](std::int32_t, std::int32_t) { return inExpected; });
}

// Rows alternate between the two slots' pixels (slot 1 on even rows).
inline ::testing::AssertionResult RowsAre(const FrameRef& inFrame, Pixel inFirst, Pixel inSecond,
                                          int inTolerance = 0)
{
    return PixelsAre(
        inFrame, [&](std::int32_t, std::int32_t inY) { return inY % 2 == 0 ? inFirst : inSecond; },
        inTolerance);
}

// A copy of inFrame in inFormat (BGRA 8-bit unless told), converted at high quality.
inline FrameRef Converted(const FrameRef& inFrame,
                          mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
{
    const QRT::ParamRect bounds = inFrame->GetBounds();
    FrameRef copy = VF::CreateVideoFrame(inFormat, static_cast<std::uint32_t>(bounds.Width()),
                                         static_cast<std::uint32_t>(bounds.Height()),
                                         inFrame->GetPixelAspectRatio(), false, false);
    EXPECT_GE(VF::VideoFrameManipulators::CopyFrame(inFrame, copy, mt::kRenderQuality_High), 0);
    return copy;
}

// Render parameters for a frame of the given size (also the full frame) at
// 29.97; the secondary quality is the quality.
inline CutlistRenderParams MakeParams(std::uint32_t inWidth, std::uint32_t inHeight,
                                      std::uint32_t inQuality = 4,
                                      mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
{
    CutlistRenderParams params;
    params.mWidth = params.mFullFrameWidth = inWidth;
    params.mHeight = params.mFullFrameHeight = inHeight;
    params.mPixelAspectRatio = params.mFullFramePixelAspectRatio = mt::kPixelAspectRatio_Square;
    params.mPixelFormat = inFormat;
    params.mQuality = params.mSecondaryQuality = inQuality;
    params.mFrameRate = mt::kFrameRate_Video2997;
    return params;
}

inline MF::FrameTime Conform(IRenderableSource& inSource, const MF::FrameTime& inTime,
                             const CutlistRenderParams& inParams = {})
{
    MF::FrameTime conformed(Ticks(-1));
    inSource.ConformFrameTime(inTime, inParams, conformed);
    return conformed;
}

inline FrameRef Render(IRenderableSource& inSource, const MF::FrameTime& inTime,
                       const CutlistRenderParams& inParams)
{
    FrameRef frame;
    inSource.RenderFrame(inTime, inParams, frame);
    return frame;
}

// The status of the RenderRequestException that rendering throws (0 when none).
inline QRT::Result RenderStatus(IRenderableSource& inSource, const CutlistRenderParams& inParams,
                                FrameRef& outFrame)
{
    try
    {
        inSource.RenderFrame(MF::FrameTime(), inParams, outFrame);
    }
    catch (const RenderRequestException& exception)
    {
        return exception.GetStatus();
    }
    return QRT::kResult_Success;
}

inline FrameRate RateOf(IRenderableSource& inSource)
{
    FrameRate rate;
    inSource.GetFrameRate(rate);
    return rate;
}

inline FrameRate FieldRateOf(IRenderableSource& inSource)
{
    FrameRate rate;
    inSource.GetFieldRate(rate);
    return rate;
}

// The marker of field slot inSlot of a frame whose slot holds inTime (a
// multiple of kField, at most 15 fields).
inline Pixel Marker(TickTime inTime, std::int32_t inSlot)
{
    const std::int64_t index = inTime.GetTicks() / kField;
    if (inTime.GetTicks() % kField != 0 || index < 0 || index > 15)
        throw std::logic_error("marker time off the test grid");
    return Pixel{static_cast<std::uint8_t>(index * 16 + 8), static_cast<std::uint8_t>(inSlot * 64),
                 static_cast<std::uint8_t>(index), 255};
}

// Marker(inTime, inSlot) with channel R set to 10 * inRow: the gradient rows.
inline Pixel GradientMarker(TickTime inTime, std::int32_t inSlot, std::int32_t inRow)
{
    Pixel pixel = Marker(inTime, inSlot);
    pixel.mR = static_cast<std::uint8_t>(10 * inRow);
    return pixel;
}

// A copy of inRecord taken under inMutex.
template <typename T>
T Locked(std::mutex& inMutex, const T& inRecord)
{
    std::lock_guard lock(inMutex);
    return inRecord;
}

// Base of the renderable test sources: logs prefetch requests and renders.
class LoggingSource : public QRT::Implements<IRenderableSource>
{
public:
    void CollectPrefetches(const MF::FrameTime& inTime, const CutlistRenderParams&,
                           RenderableNodePrefetchList&) override
    {
        std::lock_guard lock(mLogLock);
        mPrefetched.push_back(inTime);
    }
    std::vector<MF::FrameTime> Prefetched() const { return Locked(mLogLock, mPrefetched); }
    std::vector<MF::FrameTime> Rendered() const { return Locked(mLogLock, mRendered); }
    FrameRef LastFrame() const { return Locked(mLogLock, mLastFrame); }

protected:
    // Marks inFrame shared, logs it and hands it out.
    void Deliver(const MF::FrameTime& inTime, const FrameRef& inFrame, FrameRef& outFrame)
    {
        inFrame->SetFieldType(inTime.GetFieldOrder());
        inFrame->MarkShared(1);
        std::lock_guard lock(mLogLock);
        mRendered.push_back(inTime);
        mLastFrame = outFrame = inFrame;
    }

private:
    mutable std::mutex mLogLock; // guards the three logs
    std::vector<MF::FrameTime> mPrefetched, mRendered;
    FrameRef mLastFrame;
};

enum class Delivery
{
    kProgressive,  // progressive frames on its frame grid
    kUpperFirst,   // interlaced, first slot earlier, whatever the request
    kLowerFirst,   // interlaced, first slot later, whatever the request
    kFollowRequest // interlaced requests in their order; progressive ones on the field grid
};

class MarkedSource : public LoggingSource
{
public:
    // inWidth/inHeight 0: frames at the requested size.
    MarkedSource(Delivery inDelivery, FrameRate inRate, std::uint32_t inWidth,
                 std::uint32_t inHeight, bool inGradient)
        : mDelivery(inDelivery)
        , mRate(inRate)
        , mWidth(inWidth)
        , mHeight(inHeight)
        , mGradient(inGradient)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested, const CutlistRenderParams&,
                          MF::FrameTime& outConformed) override
    {
        const TickTime frame = inRequested.GetTime().AlignToFrame(mRate);
        if (mDelivery == Delivery::kProgressive)
            outConformed = MF::FrameTime(frame);
        else if (mDelivery == Delivery::kFollowRequest && inRequested.IsProgressive())
            outConformed = MF::FrameTime(inRequested.GetTime().AlignToFrame(mRate * 2));
        else
        {
            const mt::FieldType order =
                mDelivery == Delivery::kFollowRequest ? inRequested.GetFieldOrder()
                : mDelivery == Delivery::kUpperFirst  ? mt::kFieldType_UpperFirst
                                                      : mt::kFieldType_LowerFirst;
            outConformed = MF::FrameTime::Make(frame, order, (mRate * 2).GetFrameDuration());
        }
    }

    void RenderFrame(const MF::FrameTime& inTime, const CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        MF::FrameTime conformed;
        ConformFrameTime(inTime, inParams, conformed);
        const std::uint32_t width = mWidth != 0 ? mWidth : inParams.mWidth;
        const std::uint32_t height = mHeight != 0 ? mHeight : inParams.mHeight;
        if (inParams.mPixelFormat == mt::kPixelFormat_YUV_420_8u_Planar &&
            conformed.IsProgressive())
            return Deliver(conformed,
                           MakePlanarFrame(width, height, Marker(conformed.GetTime(), 1)),
                           outFrame);
        const FrameRef frame =
            MakeFrame(width, height,
                      [&](std::int32_t, std::int32_t inY)
                      {
                          const std::int32_t slot = inY % 2 == 0 ? 1 : 2;
                          const TickTime time = conformed.GetFieldTime(slot);
                          return mGradient ? GradientMarker(time, slot, inY) : Marker(time, slot);
                      });
        Deliver(conformed, frame, outFrame);
    }

    void GetFrameRate(FrameRate& outRate) override { outRate = mRate; }
    void GetFieldRate(FrameRate& outRate) override
    {
        outRate = mDelivery == Delivery::kProgressive ? mRate : mRate * 2;
    }

private:
    const Delivery mDelivery;
    const FrameRate mRate;
    const std::uint32_t mWidth;
    const std::uint32_t mHeight;
    const bool mGradient;
};

inline QRT::InterfaceRef<MarkedSource> MakeMarkedSource(Delivery inDelivery,
                                                        std::uint32_t inWidth = 0,
                                                        std::uint32_t inHeight = 0,
                                                        bool inGradient = false)
{
    return QRT::Allocated<MarkedSource>::CreateInstance(inDelivery, mt::kFrameRate_Video2997,
                                                        inWidth, inHeight, inGradient);
}

// A one-shot latch: Wait blocks until Open (called once).
struct Gate
{
    std::promise<void> mOpened;
    std::shared_future<void> mFuture = mOpened.get_future().share();
    void Open() { mOpened.set_value(); }
    void Wait() const { mFuture.wait(); }
};

// A frame key unique to this process run, so that tests never meet each
// other's frames in the process-wide cache.
inline Guid MakeKey()
{
    static std::atomic<std::uint32_t> sNext{1};
    Guid key;
    key.Data2 = 0x7e57;
    const std::uint32_t serial = sNext.fetch_add(1);
    for (int i = 0; i < 4; ++i)
        key.Data4[4 + i] = static_cast<std::uint8_t>(serial >> (8 * i));
    return key;
}

struct FrameCall
{
    TickTime mTime;
    BE::VideoFrameRequest mRequest;
    MF::BinaryData mBinaryData;
    BE::ColorProfile mColorProfile;
    std::int32_t mFlags = -1;
};

// A prefetch hint is logged as a FrameCall without profile and flags.
// A draw request: its time and the other arguments but the destination as one
// text.
struct DrawCall
{
    TickTime mTime;
    std::string mArguments;
};

class ScriptedVideoSource
    : public QRT::Implements<BE::Deprecated::IVideoSource, BE::Deprecated::IMediaInfo,
                             BE::Deprecated::IAsyncVideoSource>
{
public:
    // --- Settings -------------------------------------------------------------
    FrameRate mFrameRate = mt::kFrameRate_Video25;
    bool mStill = false;
    mt::FieldType mFieldType = mt::kFieldType_Progressive;
    std::int32_t mKind = BE::Deprecated::kMediaInfoKind_Clip;
    std::vector<mt::PixelFormat> mPixelFormats = {mt::kPixelFormat_BGRA_4444_8u};
    // A read answers mFrameStatus and on success mFrame, or with mNewFrames a new 4x2 frame per
    // read. Frames read are held and answer kFrameRequestFlag_NoBlock.
    QRT::Result mFrameStatus = QRT::kResult_Success;
    FrameRef mFrame;
    bool mNewFrames = false;
    // DrawVideoFrame answers mDrawStatus.
    QRT::Result mDrawStatus = QRT::kResult_Success;
    bool mPrefetchWanted = false;
    // Keys are mKeySalt with the time in Data1, or null keys.
    bool mNullKeys = false;
    Guid mKeySalt = MakeKey();
    // Asynchronous reads: off unless enabled. A wait answers true once
    // CompleteRead ran, else mWaitAnswer.
    std::atomic<bool> mAsyncEnabled{false};
    std::atomic<QRT::Result> mStartStatus{QRT::kResult_Success};
    std::atomic<bool> mWaitAnswer{true};
    std::atomic<int> mStarts{0}, mCancels{0};

    // --- Records --------------------------------------------------------------
    std::vector<FrameCall> FrameCalls() const { return Locked(mMutex, mFrameCalls); }
    // The times of the reads (requests with kFrameRequestFlag_Read), in order.
    std::vector<std::int64_t> ReadTicks() const
    {
        std::vector<std::int64_t> ticks;
        for (const FrameCall& call : FrameCalls())
            if (call.mFlags == BE::Deprecated::kFrameRequestFlag_Read)
                ticks.push_back(call.mTime.GetTicks());
        return ticks;
    }
    std::vector<FrameCall> PrefetchCalls() const { return Locked(mMutex, mPrefetchCalls); }
    std::vector<DrawCall> DrawCalls() const { return Locked(mMutex, mDrawCalls); }

    Guid KeyFor(TickTime inTime) const
    {
        Guid key = mKeySalt;
        key.Data1 = static_cast<std::uint32_t>(inTime.GetTicks());
        return mNullKeys ? Guid() : key;
    }

    // Completes the started asynchronous read: the frame becomes held.
    void CompleteRead(TickTime inTime)
    {
        FrameRef frame;
        GetVideoFrame(inTime, {}, {}, {}, BE::Deprecated::kFrameRequestFlag_Read, frame);
        mCompleted.store(true);
    }

    // --- IVideoSource -----------------------------------------------------------
    FrameRate GetFrameRate() const noexcept override { return mFrameRate; }
    bool IsStill() const noexcept override { return mStill; }
    bool IsImage() const noexcept override { return false; }
    mt::FieldType GetFieldType() const noexcept override { return mFieldType; }
    QRT::ParamRect GetBounds() const noexcept override { return {0, 0, 4, 2}; }
    mt::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mt::kPixelAspectRatio_Square;
    }
    mt::AlphaChannel GetAlphaChannel() const noexcept override { return mt::kAlphaChannel_None; }
    QRT::ParamColor GetMatteColor() const noexcept override { return {}; }
    BE::ColorProfile GetColorProfile() const override { return {"sRGB", nullptr}; }
    std::vector<mt::PixelFormat> GetPixelFormats() const override { return mPixelFormats; }

    QRT::Result GetVideoFrame(TickTime inTime, const BE::VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const BE::ColorProfile& inColorProfile, std::int32_t inFlags,
                              FrameRef& outFrame) override
    {
        outFrame = nullptr;
        std::lock_guard lock(mMutex);
        mFrameCalls.push_back({inTime, inRequest, inBinaryData, inColorProfile, inFlags});
        if (inFlags == BE::Deprecated::kFrameRequestFlag_NoBlock)
        {
            const auto found = mHeld.find(inTime.GetTicks());
            if (found == mHeld.end())
                return static_cast<QRT::Result>(0xA0100005u);
            outFrame = found->second;
            return QRT::kResult_Success;
        }
        if (QRT::Failed(mFrameStatus))
            return mFrameStatus;
        outFrame = mNewFrames ? MakeFilledFrame(4, 2, Pixel{}) : mFrame;
        if (outFrame)
            mHeld[inTime.GetTicks()] = outFrame;
        return QRT::kResult_Success;
    }

    void PrefetchVideoFrame(TickTime inTime, const BE::VideoFrameRequest& inRequest,
                            const MF::BinaryData& inBinaryData) override
    {
        std::lock_guard lock(mMutex);
        mPrefetchCalls.push_back({inTime, inRequest, inBinaryData, {}, -1});
    }

    QRT::Result DrawVideoFrame(TickTime inTime, const MF::BinaryData& inBinaryData,
                               TickTime inFrameGridOrigin, TickTime inSecondTime, const FrameRef&,
                               mt::RenderQuality inQuality, mt::FieldType inFieldType,
                               bool inProgressive, bool inIgnoreAlpha, bool inInvertAlpha,
                               bool inThirdFlag, double inValue) override
    {
        std::ostringstream arguments;
        arguments << "data " << inBinaryData.GetSize() << " origin " << inFrameGridOrigin.GetTicks()
                  << " second " << inSecondTime.GetTicks() << " quality " << inQuality << " field "
                  << inFieldType << " progressive " << inProgressive << " ignore " << inIgnoreAlpha
                  << " invert " << inInvertAlpha << " third " << inThirdFlag << " value "
                  << inValue;
        {
            std::lock_guard lock(mMutex);
            mDrawCalls.push_back({inTime, arguments.str()});
        }
        return mDrawStatus;
    }

    bool IsPrefetchWanted(TickTime) const override { return mPrefetchWanted; }
    Guid GetFrameKey(TickTime inTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                     const BE::ColorProfile&) const override
    {
        return KeyFor(inTime);
    }
    BE::Deprecated::PrefetchHold GetPrefetchHold() override { return std::make_shared<int>(0); }

    // --- IMediaInfo -------------------------------------------------------------
    std::int32_t GetKind() const noexcept override { return mKind; }
    std::u16string GetName() const override { return u"scripted"; }
    std::uint32_t GetStreamCount(std::int32_t inType) const override
    {
        return inType == BE::Deprecated::kMediaType_Video ? 1 : 0;
    }
    QRT::InterfaceRef<BE::Deprecated::IVideoSource> GetVideoSource(std::int32_t,
                                                                   std::int32_t) override
    {
        return QRT::InterfaceRef<BE::Deprecated::IVideoSource>(this);
    }
    TickTime GetDuration() const noexcept override { return mt::kTime_Max; }
    QRT::InterfaceRef<BE::Deprecated::IMediaInfo> Copy() const override { return {}; }

    // --- IAsyncVideoSource ------------------------------------------------------
    bool IsAsyncEnabled() const noexcept override { return mAsyncEnabled.load(); }
    QRT::Result StartAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                               const BE::ColorProfile&) override
    {
        mStarts.fetch_add(1);
        return mStartStatus.load();
    }
    bool WaitForAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                          const BE::ColorProfile&, double) override
    {
        return mCompleted.load() || mWaitAnswer.load();
    }
    void CancelAsyncRead(TickTime, const BE::VideoFrameRequest&, const MF::BinaryData&,
                         const BE::ColorProfile&) override
    {
        mCancels.fetch_add(1);
    }

private:
    mutable std::mutex mMutex; // guards the call records and mHeld
    std::vector<FrameCall> mFrameCalls, mPrefetchCalls;
    std::vector<DrawCall> mDrawCalls;
    std::map<std::int64_t, FrameRef> mHeld;
    std::atomic<bool> mCompleted{false};
};

using ScriptedSourceRef = QRT::InterfaceRef<ScriptedVideoSource>;

inline ScriptedSourceRef MakeScriptedSource()
{
    return QRT::Allocated<ScriptedVideoSource>::CreateInstance();
}

} // namespace ML::Test
