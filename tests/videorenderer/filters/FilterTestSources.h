#pragma once

// Test media for the frame filter tests: renderable sources whose every row
// says which upstream field and time it came from, and a source that
// telecines four-frame film cycles into 29.97 interlaced video.
//
// MarkedSource conforms requests like a media adaptor (to its frame grid,
// in its declared field order, or following the request's order) and
// renders frames whose field-slot-1 rows (0, 2, 4, ...) hold Marker(first
// field time, 1) and slot-2 rows Marker(second field time, 2) of the
// conformed time. Rendered frames are marked shared, so a filter that writes
// into an upstream frame fails its contract. Renders and prefetch requests
// are logged (under a lock: the sources are used from several threads).

#include "MF/FrameTime.h"
#include "MF/IVideoFrame.h"
#include "ML/CutlistRenderParams.h"
#include "ML/IRenderableSource.h"
#include "QRT/Allocated.h"
#include "VF/VideoFrame.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/Pulldown.h"

#include <cstdint>
#include <cstring>
#include <functional>
#include <mutex>
#include <stdexcept>
#include <vector>

namespace FilterTest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using mvxmediatypes::FrameRate;
using mvxmediatypes::TickTime;

// 29.97 interlaced timing: frame and field durations in ticks.
inline constexpr std::int64_t kFrame = 23'543'520;
inline constexpr std::int64_t kField = kFrame / 2;

inline TickTime Ticks(std::int64_t inTicks)
{
    return TickTime::TicksToTime(inTicks);
}

// A BGRA 8-bit pixel as stored in memory: B, G, R, A.
struct Pixel
{
    std::uint8_t mB = 0, mG = 0, mR = 0, mA = 0;
    friend bool operator==(const Pixel&, const Pixel&) = default;
};

// The marker of field slot inSlot of a frame whose slot holds inTime
// (a multiple of kField).
inline Pixel Marker(TickTime inTime, std::int32_t inSlot, std::uint8_t inTag = 0)
{
    const std::int64_t index = inTime.GetTicks() / kField;
    if (inTime.GetTicks() % kField != 0 || index < 0 || index > 15)
        throw std::logic_error("marker time off the test grid");
    return Pixel{static_cast<std::uint8_t>(index * 16 + 8),
                 static_cast<std::uint8_t>(inSlot * 64 + inTag), static_cast<std::uint8_t>(index),
                 255};
}

inline Pixel ReadPixel(const MF::IVideoFrame& inFrame, std::int32_t inX, std::int32_t inY)
{
    const auto* row = static_cast<const std::uint8_t*>(inFrame.GetBaseAddress()) +
                      static_cast<std::ptrdiff_t>(inY) * inFrame.GetRowBytes();
    Pixel pixel;
    std::memcpy(&pixel, row + inX * 4, 4);
    return pixel;
}

inline void WritePixel(MF::IVideoFrame& ioFrame, std::int32_t inX, std::int32_t inY, Pixel inPixel)
{
    auto* row = static_cast<std::uint8_t*>(ioFrame.GetWritableBaseAddress()) +
                static_cast<std::ptrdiff_t>(inY) * ioFrame.GetRowBytes();
    std::memcpy(row + inX * 4, &inPixel, 4);
}

// A BGRA 8-bit frame filled by inPixelAt(x, y).
inline FrameRef MakeFrame(std::uint32_t inWidth, std::uint32_t inHeight,
                          const std::function<Pixel(std::int32_t, std::int32_t)>& inPixelAt)
{
    FrameRef frame =
        VF::CreateVideoFrame(mvxmediatypes::kPixelFormat_BGRA_4444_8u, inWidth, inHeight,
                             mvxmediatypes::kPixelAspectRatio_Square, false, false);
    for (std::int32_t y = 0; y < static_cast<std::int32_t>(inHeight); ++y)
        for (std::int32_t x = 0; x < static_cast<std::int32_t>(inWidth); ++x)
            WritePixel(*frame, x, y, inPixelAt(x, y));
    return frame;
}

// Render parameters for a BGRA 8-bit frame of the given size (also the full
// frame) at 29.97.
inline ML::CutlistRenderParams MakeParams(std::uint32_t inWidth, std::uint32_t inHeight,
                                          std::uint32_t inQuality = 4)
{
    ML::CutlistRenderParams params;
    params.mWidth = inWidth;
    params.mHeight = inHeight;
    params.mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mPixelFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u;
    params.mQuality = inQuality;
    params.mSecondaryQuality = inQuality;
    params.mFullFrameWidth = inWidth;
    params.mFullFrameHeight = inHeight;
    params.mFullFramePixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    params.mFrameRate = mvxmediatypes::kFrameRate_Video2997;
    return params;
}

// Base of the logging test sources.
class LoggingSource : public QRT::Implements<ML::IRenderableSource>
{
public:
    void CollectPrefetches(const MF::FrameTime& inTime, const ML::CutlistRenderParams& /*inParams*/,
                           ML::RenderableNodePrefetchList& /*ioPrefetches*/) override
    {
        std::lock_guard<std::mutex> lock(mLogLock);
        mPrefetched.push_back(inTime);
    }

    std::vector<MF::FrameTime> Prefetched() const
    {
        std::lock_guard<std::mutex> lock(mLogLock);
        return mPrefetched;
    }
    std::vector<MF::FrameTime> Rendered() const
    {
        std::lock_guard<std::mutex> lock(mLogLock);
        return mRendered;
    }
    FrameRef LastFrame() const
    {
        std::lock_guard<std::mutex> lock(mLogLock);
        return mLastFrame;
    }

protected:
    void Log(const MF::FrameTime& inTime, const FrameRef& inFrame)
    {
        std::lock_guard<std::mutex> lock(mLogLock);
        mRendered.push_back(inTime);
        mLastFrame = inFrame;
    }

private:
    // Guards the three logs below.
    mutable std::mutex mLogLock;
    std::vector<MF::FrameTime> mPrefetched;
    std::vector<MF::FrameTime> mRendered;
    FrameRef mLastFrame;
};

// How a MarkedSource delivers fields.
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
    // inNativeWidth/Height 0: frames at the requested size.
    MarkedSource(Delivery inDelivery, FrameRate inRate, std::uint32_t inNativeWidth = 0,
                 std::uint32_t inNativeHeight = 0, std::uint8_t inTag = 0)
        : mDelivery(inDelivery)
        , mRate(inRate)
        , mNativeWidth(inNativeWidth)
        , mNativeHeight(inNativeHeight)
        , mTag(inTag)
    {
    }

    void ConformFrameTime(const MF::FrameTime& inRequested,
                          const ML::CutlistRenderParams& /*inParams*/,
                          MF::FrameTime& outConformed) override
    {
        const TickTime t = inRequested.GetTime();
        const FrameRate fieldRate = mRate * 2;
        const TickTime half = fieldRate.GetFrameDuration();
        switch (mDelivery)
        {
        case Delivery::kProgressive:
            outConformed = MF::FrameTime(t.AlignToFrame(mRate));
            return;
        case Delivery::kUpperFirst:
            outConformed = MF::FrameTime::Make(t.AlignToFrame(mRate),
                                               mvxmediatypes::kFieldType_UpperFirst, half);
            return;
        case Delivery::kLowerFirst:
            outConformed = MF::FrameTime::Make(t.AlignToFrame(mRate),
                                               mvxmediatypes::kFieldType_LowerFirst, half);
            return;
        case Delivery::kFollowRequest:
            outConformed =
                inRequested.IsProgressive()
                    ? MF::FrameTime(t.AlignToFrame(fieldRate))
                    : MF::FrameTime::Make(t.AlignToFrame(mRate), inRequested.GetFieldOrder(), half);
            return;
        }
    }

    void RenderFrame(const MF::FrameTime& inTime, const ML::CutlistRenderParams& inParams,
                     FrameRef& outFrame) override
    {
        MF::FrameTime conformed;
        ConformFrameTime(inTime, inParams, conformed);
        const std::uint32_t width = mNativeWidth != 0 ? mNativeWidth : inParams.mWidth;
        const std::uint32_t height = mNativeHeight != 0 ? mNativeHeight : inParams.mHeight;
        const Pixel first = Marker(conformed.GetFirstFieldTime(), 1, mTag);
        const Pixel second = Marker(conformed.GetSecondFieldTime(), 2, mTag);
        FrameRef frame = MakeFrame(width, height,
                                   [&](std::int32_t, std::int32_t inY)
                                   { return inY % 2 == 0 ? first : second; });
        frame->SetFieldType(conformed.GetFieldOrder());
        frame->MarkShared(1);
        Log(conformed, frame);
        outFrame = frame;
    }

    void GetFrameRate(FrameRate& outRate) override { outRate = mRate; }
    void GetFieldRate(FrameRate& outRate) override
    {
        outRate = mDelivery == Delivery::kProgressive ? mRate : mRate * 2;
    }

private:
    const Delivery mDelivery;
    const FrameRate mRate;
    const std::uint32_t mNativeWidth;
    const std::uint32_t mNativeHeight;
    const std::uint8_t mTag;
};

inline QRT::InterfaceRef<MarkedSource>
MakeMarkedSource(Delivery inDelivery, FrameRate inRate = mvxmediatypes::kFrameRate_Video2997,
                 std::uint32_t inNativeWidth = 0, std::uint32_t inNativeHeight = 0)
{
    return QRT::Allocated<MarkedSource>::CreateInstance(inDelivery, inRate, inNativeWidth,
                                                        inNativeHeight);
}

} // namespace FilterTest
