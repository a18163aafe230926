#pragma once

// BE::Deprecated::IVideoSource: the back end's video source, the object a
// renderer reads frames of one piece of media from; and
// BE::Deprecated::IAsyncVideoSource, the asynchronous-read interface that some
// sources also answer.
//
// Conventions of both interfaces:
// - Threads: every operation may be called from any thread at any time, also
//   concurrently; sources are immutable after opening except for their
//   internal caches, which they guard themselves.
// - Times are media times (TickTime). A source with a frame rate maps a time
//   to the frame that contains it (TickTime::ToFrame64); a still image or a
//   time-invariant source answers the same picture for every time.
// - Frames handed out are marked shared (MF::IVideoFrame::MarkShared): several
//   callers may hold the same frame; take VF::MakeWriteableVideoFrame to write.
// - Statuses: 0 on success, negative on failure (BE/MediaStatus.h). A failed
//   request leaves the output empty and loses nothing; the source stays usable.

#include "BE/ColorProfile.h"
#include "BE/VideoFrameRequest.h"
#include "MF/BinaryData.h"
#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Param.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <memory>
#include <vector>

namespace BE::Deprecated
{

// Flags of IVideoSource::GetVideoFrame.
// Read the frame, decoding it if need be; may block for as long as that takes.
inline constexpr std::int32_t kFrameRequestFlag_Read = 0;
// Hand out only a frame that is ready without blocking (already decoded and
// held by the source); otherwise answer kResult_FrameNotReady and no frame.
inline constexpr std::int32_t kFrameRequestFlag_NoBlock = 1;

// A token the source hands out when a prefetch starts. While any hold lives,
// the source keeps the frames it decodes (up to a generous bound) so that a
// frame read ahead is still there when the prefetcher asks for it with
// kFrameRequestFlag_NoBlock. Dropping the token ends the hold; it may outlive
// the source.
using PrefetchHold = std::shared_ptr<void>;

class IVideoSource : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{c51953e6-9de1-446f-8b06-c50212f3d9f7}");

    // --- Description ---------------------------------------------------------
    // The native frame rate (kFrameRate_Video1000 for still images).
    virtual mvxmediatypes::FrameRate GetFrameRate() const noexcept = 0;
    // True for a still picture: every time shows the same frame.
    virtual bool IsStill() const noexcept = 0;
    // True when frames come from an image file whose decoding is slow; the
    // prefetcher reads such sources on its image executor.
    virtual bool IsImage() const noexcept = 0;
    virtual mvxmediatypes::FieldType GetFieldType() const noexcept = 0;
    // (0, 0, width, height) of the native frame.
    virtual QRT::ParamRect GetBounds() const noexcept = 0;
    virtual mvxmediatypes::PixelAspectRatio GetPixelAspectRatio() const noexcept = 0;
    // The alpha kind of delivered frames (none for opaque sources).
    virtual mvxmediatypes::AlphaChannel GetAlphaChannel() const noexcept = 0;
    // The colour that premultiplied frames were premultiplied over (0 when
    // the source is not premultiplied).
    virtual QRT::ParamColor GetMatteColor() const noexcept = 0;
    // The profile the source's pixels are encoded in.
    virtual ColorProfile GetColorProfile() const = 0;
    // The formats in which the source can deliver, its own format first.
    virtual std::vector<mvxmediatypes::PixelFormat> GetPixelFormats() const = 0;

    // --- Reading ---------------------------------------------------------------
    // The frame request: the frame at inTime as inRequest asks for it.
    // inFlags is kFrameRequestFlag_Read or kFrameRequestFlag_NoBlock.
    // inBinaryData and inColorProfile are the clip's; they take part in the
    // frame key. Answers 0 with the frame, or a negative status and no frame.
    virtual QRT::Result GetVideoFrame(mvxmediatypes::TickTime inTime,
                                      const VideoFrameRequest& inRequest,
                                      const MF::BinaryData& inBinaryData,
                                      const ColorProfile& inColorProfile, std::int32_t inFlags,
                                      QRT::InterfaceRef<MF::IVideoFrame>& outFrame) = 0;
    // The prefetch request: a hint that the frame at inTime will be asked for
    // soon. No result is relied on; sources that gain nothing ignore it.
    virtual void PrefetchVideoFrame(mvxmediatypes::TickTime inTime,
                                    const VideoFrameRequest& inRequest,
                                    const MF::BinaryData& inBinaryData) = 0;
    // The draw-into-frame request: draws the frame at inTime into
    // ioDestination (any raster format, any size; scaled and converted at
    // inQuality). inFieldType is the requested frame's field order and
    // inProgressive is true for a progressive request. The frame-grid origin,
    // the second time, the three flags and inValue belong to the caller's
    // clip and are accepted unchanged; the sources of this library draw the
    // same picture whatever they say. Input contracts: a destination is
    // given and not shared.
    virtual QRT::Result
    DrawVideoFrame(mvxmediatypes::TickTime inTime, const MF::BinaryData& inBinaryData,
                   mvxmediatypes::TickTime inFrameGridOrigin, mvxmediatypes::TickTime inSecondTime,
                   const QRT::InterfaceRef<MF::IVideoFrame>& ioDestination,
                   mvxmediatypes::RenderQuality inQuality, mvxmediatypes::FieldType inFieldType,
                   bool inProgressive, bool inIgnoreAlpha, bool inInvertAlpha, bool inThirdFlag,
                   double inValue) = 0;

    // --- Prefetching -----------------------------------------------------------
    // True when reading the frame at inTime ahead of time pays (the read is
    // slow) and the time holds a frame at all.
    virtual bool IsPrefetchWanted(mvxmediatypes::TickTime inTime) const = 0;
    // The frame key: a Guid that names exactly the frame GetVideoFrame would
    // deliver for these arguments. Equal arguments on sources of the same
    // media (same file, size and modification time, or the same pattern)
    // give equal keys, across opens and processes; a different frame, record,
    // binary data or colour profile gives a different key.
    virtual mvxcore::utility::Guid GetFrameKey(mvxmediatypes::TickTime inTime,
                                               const VideoFrameRequest& inRequest,
                                               const MF::BinaryData& inBinaryData,
                                               const ColorProfile& inColorProfile) const = 0;
    // The prefetch hold (see PrefetchHold). Never null.
    virtual PrefetchHold GetPrefetchHold() = 0;

protected:
    ~IVideoSource() = default;
};

// The asynchronous-read interface. A source that answers it reads frames on
// its own thread: the prefetcher starts a read, polls it with waits, and then
// takes the frame with kFrameRequestFlag_NoBlock, or cancels the read. Reads
// are named by their arguments (through the frame key); starting the same
// read twice counts twice and needs two cancels.
class IAsyncVideoSource : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{41b7a3d3-1b0f-4317-ac0a-93ce19cf2ad5}");

    // True while the source wants to be read asynchronously.
    virtual bool IsAsyncEnabled() const noexcept = 0;
    // Starts reading the frame (returns at once). 0, or a negative status
    // when the read cannot be started (the time holds no frame).
    virtual QRT::Result StartAsyncRead(mvxmediatypes::TickTime inTime,
                                       const VideoFrameRequest& inRequest,
                                       const MF::BinaryData& inBinaryData,
                                       const ColorProfile& inColorProfile) = 0;
    // Blocks until the read completes or a short slice of time passes.
    // inElapsedSeconds is how long the caller has waited for this read so far.
    // Answers true while waiting is worthwhile: the read has completed (take
    // the frame) or is still within the source's time-out. Answers false when
    // the read has timed out, or when no such read is in flight (never
    // started, or cancelled).
    virtual bool WaitForAsyncRead(mvxmediatypes::TickTime inTime,
                                  const VideoFrameRequest& inRequest,
                                  const MF::BinaryData& inBinaryData,
                                  const ColorProfile& inColorProfile, double inElapsedSeconds) = 0;
    // Withdraws one start of the read. When no start remains, a queued read
    // is dropped, a running one is abandoned (its result discarded) and a
    // completed frame that was not taken is forgotten.
    virtual void CancelAsyncRead(mvxmediatypes::TickTime inTime, const VideoFrameRequest& inRequest,
                                 const MF::BinaryData& inBinaryData,
                                 const ColorProfile& inColorProfile) = 0;

protected:
    ~IAsyncVideoSource() = default;
};

} // namespace BE::Deprecated
