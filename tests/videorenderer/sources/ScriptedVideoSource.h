#pragma once

// ScriptedVideoSource: a back-end video source for the adaptor tests whose
// answers the test sets (rate, still, field type, media-info kind, formats,
// statuses, the frame it hands out) and which records the arguments of every
// frame, prefetch and draw request it receives. Settings are made before the
// source is handed to an adaptor; the records are guarded by a mutex so that
// the source may be read from several threads.

#include "BE/IMediaInfo.h"
#include "BE/IVideoSource.h"
#include "QRT/Allocated.h"

#include <mutex>
#include <vector>

namespace ML::Test
{

struct FrameRequestCall
{
    mvxmediatypes::TickTime mTime;
    BE::VideoFrameRequest mRequest;
    MF::BinaryData mBinaryData;
    BE::ColorProfile mColorProfile;
    std::int32_t mFlags = -1;
};

struct PrefetchCall
{
    mvxmediatypes::TickTime mTime;
    BE::VideoFrameRequest mRequest;
    MF::BinaryData mBinaryData;
};

struct DrawCall
{
    mvxmediatypes::TickTime mTime;
    MF::BinaryData mBinaryData;
    mvxmediatypes::TickTime mFrameGridOrigin;
    mvxmediatypes::TickTime mSecondTime;
    // The destination's address only: holding a reference would make the
    // adaptor copy the frame before it writes.
    const void* mDestination = nullptr;
    // Attributes of the destination as the source received it.
    mvxmediatypes::PixelFormat mDestinationFormat;
    QRT::ParamRect mDestinationBounds;
    mvxmediatypes::PixelAspectRatio mDestinationRatio;
    mvxmediatypes::FieldType mDestinationFieldType = mvxmediatypes::kFieldType_Invalid;
    mvxmediatypes::RenderQuality mQuality = mvxmediatypes::kRenderQuality_Draft;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Invalid;
    bool mProgressive = false;
    bool mIgnoreAlpha = false;
    bool mInvertAlpha = false;
    bool mThirdFlag = false;
    double mValue = 0.0;
};

class ScriptedVideoSource
    : public QRT::Implements<BE::Deprecated::IVideoSource, BE::Deprecated::IMediaInfo>
{
public:
    // --- Settings ----------------------------------------------------------------
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    bool mStill = false;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    std::int32_t mKind = BE::Deprecated::kMediaInfoKind_Clip;
    std::vector<mvxmediatypes::PixelFormat> mPixelFormats = {
        mvxmediatypes::kPixelFormat_BGRA_4444_8u};
    // What GetVideoFrame answers: the status and (on success) this frame.
    QRT::Result mFrameStatus = QRT::kResult_Success;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    // What DrawVideoFrame answers; on success it fills the destination with
    // mDrawColor (0xAARRGGBB) when the destination is BGRA_4444_8u.
    QRT::Result mDrawStatus = QRT::kResult_Success;
    std::uint32_t mDrawColor = 0xFF000000u;
    bool mPrefetchWanted = false;

    // --- Records -----------------------------------------------------------------
    std::vector<FrameRequestCall> FrameCalls() const
    {
        std::lock_guard lock(mMutex);
        return mFrameCalls;
    }
    std::vector<PrefetchCall> PrefetchCalls() const
    {
        std::lock_guard lock(mMutex);
        return mPrefetchCalls;
    }
    std::vector<DrawCall> DrawCalls() const
    {
        std::lock_guard lock(mMutex);
        return mDrawCalls;
    }

    // --- IVideoSource ------------------------------------------------------------
    mvxmediatypes::FrameRate GetFrameRate() const noexcept override { return mFrameRate; }
    bool IsStill() const noexcept override { return mStill; }
    bool IsImage() const noexcept override { return false; }
    mvxmediatypes::FieldType GetFieldType() const noexcept override { return mFieldType; }
    QRT::ParamRect GetBounds() const noexcept override { return {0, 0, 4, 2}; }
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept override
    {
        return mvxmediatypes::kPixelAspectRatio_Square;
    }
    mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept override
    {
        return mvxmediatypes::kAlphaChannel_None;
    }
    QRT::ParamColor GetMatteColor() const noexcept override { return {}; }
    BE::ColorProfile GetColorProfile() const override { return {"sRGB", nullptr}; }
    std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const override
    {
        return mPixelFormats;
    }

    QRT::Result GetVideoFrame(mvxmediatypes::TickTime inTime,
                              const BE::VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const BE::ColorProfile& inColorProfile, std::int32_t inFlags,
                              QRT::InterfaceRef<MF::IVideoFrame>& outFrame) override
    {
        {
            std::lock_guard lock(mMutex);
            mFrameCalls.push_back({inTime, inRequest, inBinaryData, inColorProfile, inFlags});
        }
        outFrame = nullptr;
        if (QRT::Failed(mFrameStatus))
            return mFrameStatus;
        outFrame = mFrame;
        return QRT::kResult_Success;
    }

    void PrefetchVideoFrame(mvxmediatypes::TickTime inTime, const BE::VideoFrameRequest& inRequest,
                            const MF::BinaryData& inBinaryData) override
    {
        std::lock_guard lock(mMutex);
        mPrefetchCalls.push_back({inTime, inRequest, inBinaryData});
    }

    QRT::Result DrawVideoFrame(mvxmediatypes::TickTime inTime, const MF::BinaryData& inBinaryData,
                               mvxmediatypes::TickTime inFrameGridOrigin,
                               mvxmediatypes::TickTime inSecondTime,
                               const QRT::InterfaceRef<MF::IVideoFrame>& ioDestination,
                               mvxmediatypes::RenderQuality inQuality,
                               mvxmediatypes::FieldType inFieldType, bool inProgressive,
                               bool inIgnoreAlpha, bool inInvertAlpha, bool inThirdFlag,
                               double inValue) override
    {
        {
            std::lock_guard lock(mMutex);
            mDrawCalls.push_back(
                {inTime, inBinaryData, inFrameGridOrigin, inSecondTime, ioDestination.Get(),
                 ioDestination->GetPixelFormat(), ioDestination->GetBounds(),
                 ioDestination->GetPixelAspectRatio(), ioDestination->GetFieldType(), inQuality,
                 inFieldType, inProgressive, inIgnoreAlpha, inInvertAlpha, inThirdFlag, inValue});
        }
        if (QRT::Failed(mDrawStatus))
            return mDrawStatus;
        if (ioDestination->GetPixelFormat() == mvxmediatypes::kPixelFormat_BGRA_4444_8u)
            Fill(*ioDestination, mDrawColor);
        return QRT::kResult_Success;
    }

    bool IsPrefetchWanted(mvxmediatypes::TickTime /*inTime*/) const override
    {
        return mPrefetchWanted;
    }
    mvxcore::utility::Guid GetFrameKey(mvxmediatypes::TickTime inTime,
                                       const BE::VideoFrameRequest& /*inRequest*/,
                                       const MF::BinaryData& /*inBinaryData*/,
                                       const BE::ColorProfile& /*inColorProfile*/) const override
    {
        // Distinct per time and per source object: enough for the tests.
        mvxcore::utility::Guid key;
        key.Data1 = static_cast<std::uint32_t>(inTime.GetTicks());
        key.Data2 = 0x5eed;
        const auto self = reinterpret_cast<std::uintptr_t>(this);
        for (int i = 0; i < 8; ++i)
            key.Data4[i] = static_cast<std::uint8_t>(self >> (8 * i));
        return key;
    }
    BE::Deprecated::PrefetchHold GetPrefetchHold() override { return std::make_shared<int>(0); }

    // --- IMediaInfo --------------------------------------------------------------
    std::int32_t GetKind() const noexcept override { return mKind; }
    std::u16string GetName() const override { return u"scripted"; }
    std::uint32_t GetStreamCount(std::int32_t inType) const override
    {
        return inType == BE::Deprecated::kMediaType_Video ? 1 : 0;
    }
    QRT::InterfaceRef<BE::Deprecated::IVideoSource>
    GetVideoSource(std::int32_t /*inType*/, std::int32_t /*inIndex*/) override
    {
        return QRT::InterfaceRef<BE::Deprecated::IVideoSource>(this);
    }
    mvxmediatypes::TickTime GetDuration() const noexcept override
    {
        return mvxmediatypes::kTime_Max;
    }
    QRT::InterfaceRef<BE::Deprecated::IMediaInfo> Copy() const override { return {}; }

    // Fills a BGRA_4444_8u frame with 0xAARRGGBB.
    static void Fill(MF::IVideoFrame& ioFrame, std::uint32_t inColor)
    {
        const QRT::ParamRect bounds = ioFrame.GetBounds();
        auto* base = static_cast<std::uint8_t*>(ioFrame.GetWritableBaseAddress());
        for (std::int32_t y = 0; y < bounds.Height(); ++y)
        {
            std::uint8_t* row = base + static_cast<std::ptrdiff_t>(y) * ioFrame.GetRowBytes();
            for (std::int32_t x = 0; x < bounds.Width(); ++x)
            {
                row[4 * x + 0] = static_cast<std::uint8_t>(inColor);
                row[4 * x + 1] = static_cast<std::uint8_t>(inColor >> 8);
                row[4 * x + 2] = static_cast<std::uint8_t>(inColor >> 16);
                row[4 * x + 3] = static_cast<std::uint8_t>(inColor >> 24);
            }
        }
    }

private:
    mutable std::mutex mMutex; // guards the three call records
    std::vector<FrameRequestCall> mFrameCalls;
    std::vector<PrefetchCall> mPrefetchCalls;
    std::vector<DrawCall> mDrawCalls;
};

using ScriptedSourceRef = QRT::InterfaceRef<ScriptedVideoSource>;

inline ScriptedSourceRef MakeScriptedSource()
{
    return QRT::Allocated<ScriptedVideoSource>::CreateInstance();
}

} // namespace ML::Test
