#pragma once

// BE::Deprecated::IMediaInfo: the description of one piece of media (its
// kind, name, streams and duration) and the door to its sources; and
// BE::Deprecated::IMedia, the media object a sequence's imported segment
// refers to. The video sources of this library answer all three interfaces
// (IVideoSource, IMediaInfo, IMedia) on one object.
//
// Threads: every operation may be called from any thread; the answers never
// change after the media is opened.

#include "QRT/InterfaceRef.h"
#include "QRT/QRTUnknown.h"
#include "QRT/Result.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string>

namespace BE::Deprecated
{

class IVideoSource;

// Stream types.
enum MediaType : std::int32_t
{
    kMediaType_Video = 1,
    kMediaType_Audio = 2,
};

// Kinds of media (IMediaInfo::GetKind).
enum MediaInfoKind : std::int32_t
{
    // Ordinary media on a time line: frames follow its frame rate.
    kMediaInfoKind_Clip = 0,
    // Time-invariant media: one picture at every time and no frame grid
    // (generated bars, solid colours, gradients). Renderers conform every
    // requested time of such media to zero, so all times share one frame.
    kMediaInfoKind_TimeInvariant = 1,
};

class IMediaInfo : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{199443a5-29ee-4878-ba40-b0215def58e6}");

    // A MediaInfoKind value.
    virtual std::int32_t GetKind() const noexcept = 0;
    // The media's name (its file name, or its pattern text).
    virtual std::u16string GetName() const = 0;
    // The number of streams of a type (1 video stream, 0 audio streams for
    // the sources of this library). inType is a MediaType (input contract
    // "inType == kMediaType_Video || inType == kMediaType_Audio").
    virtual std::uint32_t GetStreamCount(std::int32_t inType) const = 0;
    // The source of stream inIndex of type inType. Input contracts:
    // "inType == kMediaType_Video", "inIndex == 0".
    virtual QRT::InterfaceRef<IVideoSource> GetVideoSource(std::int32_t inType,
                                                           std::int32_t inIndex) = 0;
    // The length of the media: frame count times frame duration, or kTime_Max
    // for media without an end (stills, patterns).
    virtual mvxmediatypes::TickTime GetDuration() const noexcept = 0;
    // A new, independent media object over the same material (the file is
    // opened again, the pattern made again). Empty when the material can no
    // longer be opened.
    virtual QRT::InterfaceRef<IMediaInfo> Copy() const = 0;

protected:
    ~IMediaInfo() = default;
};

class IMedia : public QRT::QRTUnknown
{
public:
    QRT_INTERFACE_ID("{d85027bf-c106-4884-9a94-9f228894d1a9}");

    // What the media was opened from: a file path or a "pattern:" text.
    virtual std::string GetMediaPath() const = 0;
    virtual QRT::InterfaceRef<IMediaInfo> GetMediaInfo() = 0;

protected:
    ~IMedia() = default;
};

} // namespace BE::Deprecated
