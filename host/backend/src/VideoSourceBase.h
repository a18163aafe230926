#pragma once

// BE::detail::VideoSourceBase: what every video source of this library shares.
// A concrete source describes itself once (SourceDescription) and produces
// native frames by index; the base answers the description queries, maps
// times to frame indices, computes frame keys, conforms produced frames to
// the request record (format and size), keeps recently delivered frames for
// requests that must not block, hands out prefetch holds, draws into caller
// frames, and answers IMediaInfo and IMedia.
//
// Owned through QRT references; all operations may be called from any
// thread. The description never changes after construction; the held frames
// are guarded by their own lock. ProduceFrame may run on several threads at
// once, also for the same frame (both produce equal pixels).

#include "BE/IMediaInfo.h"
#include "BE/IVideoSource.h"
#include "QRT/Hash.h"

#include <cstdint>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

namespace BE::detail
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

struct SourceDescription
{
    // What the source was opened from (IMedia::GetMediaPath).
    std::string mMediaPath;
    // The identity mixed into frame keys: names the material exactly (the
    // file with its size and modification time, or the canonical pattern).
    std::string mIdentity;
    std::u16string mName;
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::AlphaChannel mAlpha = mvxmediatypes::kAlphaChannel_None;
    QRT::ParamColor mMatte;
    bool mStill = false;
    bool mImage = false;
    bool mPrefetchWanted = false;
    std::int32_t mKind = Deprecated::kMediaInfoKind_Clip;
    // The number of frames; -1 for media without an end.
    std::int64_t mFrameCount = -1;
    // Own format first.
    std::vector<mvxmediatypes::PixelFormat> mPixelFormats;
    ColorProfile mColorProfile;
};

// Frames a source delivered recently, by frame key, most recent first.
// Without prefetch holds a few frames are kept; while holds are out, two
// more for each hold (up to kHeldCapacity in all): the frame the hold's read
// ahead brings, and room for one whose hold ended before its render took it.
// So read-ahead frames survive until they are taken, and the frames kept
// follow the reads in flight rather than a fixed count.
class HeldFrames : public std::enable_shared_from_this<HeldFrames>
{
public:
    static constexpr std::size_t kIdleCapacity = 4;
    static constexpr std::size_t kHeldCapacity = 64;

    FrameRef Find(const mvxcore::utility::Guid& inKey);
    void Insert(const mvxcore::utility::Guid& inKey, const FrameRef& inFrame);
    Deprecated::PrefetchHold MakeHold();
    std::size_t GetHoldCount();

private:
    void EndHold();
    void TrimLocked();

    // Guards mFrames and mHoldCount.
    std::mutex mMutex;
    std::list<std::pair<mvxcore::utility::Guid, FrameRef>> mFrames;
    std::size_t mHoldCount = 0;
};

class VideoSourceBase
    : public QRT::Implements<Deprecated::IVideoSource, Deprecated::IMediaInfo, Deprecated::IMedia>
{
public:
    // IVideoSource.
    mvxmediatypes::FrameRate GetFrameRate() const noexcept override;
    bool IsStill() const noexcept override;
    bool IsImage() const noexcept override;
    mvxmediatypes::FieldType GetFieldType() const noexcept override;
    QRT::ParamRect GetBounds() const noexcept override;
    mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept override;
    mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept override;
    QRT::ParamColor GetMatteColor() const noexcept override;
    ColorProfile GetColorProfile() const override;
    std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const override;
    QRT::Result GetVideoFrame(mvxmediatypes::TickTime inTime, const VideoFrameRequest& inRequest,
                              const MF::BinaryData& inBinaryData,
                              const ColorProfile& inColorProfile, std::int32_t inFlags,
                              FrameRef& outFrame) override;
    void PrefetchVideoFrame(mvxmediatypes::TickTime inTime, const VideoFrameRequest& inRequest,
                            const MF::BinaryData& inBinaryData) override;
    QRT::Result DrawVideoFrame(mvxmediatypes::TickTime inTime, const MF::BinaryData& inBinaryData,
                               mvxmediatypes::TickTime inFrameGridOrigin,
                               mvxmediatypes::TickTime inSecondTime, const FrameRef& ioDestination,
                               mvxmediatypes::RenderQuality inQuality,
                               mvxmediatypes::FieldType inFieldType, bool inProgressive,
                               bool inIgnoreAlpha, bool inInvertAlpha, bool inThirdFlag,
                               double inValue) override;
    bool IsPrefetchWanted(mvxmediatypes::TickTime inTime) const override;
    mvxcore::utility::Guid GetFrameKey(mvxmediatypes::TickTime inTime,
                                       const VideoFrameRequest& inRequest,
                                       const MF::BinaryData& inBinaryData,
                                       const ColorProfile& inColorProfile) const override;
    Deprecated::PrefetchHold GetPrefetchHold() override;

    // IMediaInfo.
    std::int32_t GetKind() const noexcept override;
    std::u16string GetName() const override;
    std::uint32_t GetStreamCount(std::int32_t inType) const override;
    QRT::InterfaceRef<Deprecated::IVideoSource> GetVideoSource(std::int32_t inType,
                                                               std::int32_t inIndex) override;
    mvxmediatypes::TickTime GetDuration() const noexcept override;
    QRT::InterfaceRef<Deprecated::IMediaInfo> Copy() const override;

    // IMedia.
    std::string GetMediaPath() const override;
    QRT::InterfaceRef<Deprecated::IMediaInfo> GetMediaInfo() override;

    // Why the latest frame read failed, naming the file and the reason;
    // empty when it succeeded or the source keeps no reason
    // (BE::GetLastReadFailure).
    virtual std::string GetLastReadFailure() const { return {}; }

protected:
    explicit VideoSourceBase(SourceDescription inDescription);
    ~VideoSourceBase() = default;

    const SourceDescription& GetDescription() const { return mDescription; }

    // Produces frame inIndex (0 for stills and time-invariant media) at the
    // native size in inFormat, one of the description's formats. Attributes
    // (aspect ratio, field type, alpha kind) are set by the caller.
    virtual QRT::Result ProduceFrame(std::int64_t inIndex, mvxmediatypes::PixelFormat inFormat,
                                     FrameRef& outFrame) = 0;
    // The material opened again as a new source; empty when that fails.
    virtual QRT::InterfaceRef<Deprecated::IMediaInfo> Reopen() const = 0;

private:
    // The frame index of a time (0 for stills and time-invariant media).
    std::int64_t FrameIndexForTime(mvxmediatypes::TickTime inTime) const;
    bool IsFrameInRange(mvxmediatypes::TickTime inTime, std::int64_t inIndex) const;
    mvxcore::utility::Guid FrameKeyForIndex(std::int64_t inIndex,
                                            const VideoFrameRequest& inRequest,
                                            const MF::BinaryData& inBinaryData,
                                            const ColorProfile& inColorProfile) const;
    mvxmediatypes::PixelFormat ChooseFormat(const VideoFrameRequest& inRequest) const;

    const SourceDescription mDescription;
    const std::shared_ptr<HeldFrames> mHeldFrames;
};

// Clamps a request quality to the RenderQuality range.
mvxmediatypes::RenderQuality ToRenderQuality(std::uint32_t inQuality);

} // namespace BE::detail
