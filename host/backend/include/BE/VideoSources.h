#pragma once

// Opening the back end's video sources: still images (PNG, JPEG), Y4M video
// files, generated patterns, and two wrappers that slow any source down (a
// synchronous decode latency, and the same behind the asynchronous-read
// interface on a worker thread of its own) for prefetch tests and benchmarks.
//
// Every function answers a status with a message ("<path or pattern>: <problem>")
// and, on success, the source; on failure the output is empty. A success
// may carry a message too: damage the source works around (a Y4M file whose
// last frame is cut short). Every function may be called from any thread.

#include "BE/IMediaInfo.h"
#include "BE/IVideoSource.h"
#include "BE/PatternSettings.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"

#include <chrono>
#include <string>

namespace BE
{

struct OpenStatus
{
    QRT::Result mResult = QRT::kResult_Success;
    std::string mMessage;

    bool Succeeded() const { return QRT::Succeeded(mResult); }
};

using VideoSourceRef = QRT::InterfaceRef<Deprecated::IVideoSource>;

// Opens a file by its extension (.png, .jpg, .jpeg, .y4m, any case) or a
// "pattern:" text (BE/PatternSettings.h). A path that names anything but a
// regular file (a directory, a FIFO, a device) is refused before it is
// opened, with kResult_MediaCannotOpen. Statuses: kResult_MediaCannotOpen,
// kResult_MediaMalformed, kResult_MediaUnsupported (also for an unknown
// extension), kResult_BadPattern.
OpenStatus OpenVideoSource(const std::string& inMedia, VideoSourceRef& outSource);

// A still image. The file's header is read now (size, validity); the pixels
// are decoded on the first frame request and then held. PNG files deliver
// straight alpha, JPEG files are opaque. Frame rate kFrameRate_Video1000,
// still and image.
OpenStatus OpenImageFileSource(const std::string& inPath, VideoSourceRef& outSource);

// Why the source's latest frame read failed, naming the file and the
// decoder's reason ("<path>: IDAT: CRC error"), for sources that keep it
// (still images, the cut last frame of a Y4M file); empty when that read
// succeeded, none failed, or the source keeps no reason. Frame requests
// answer only a status; this is the rest of the story for a message.
std::string GetLastReadFailure(const VideoSourceRef& inSource);

// A Y4M file (8-bit 4:2:0, 4:2:2 or 4:4:4; progressive, upper or lower field
// first). The header is parsed and an index of frame offsets is built now;
// a malformed file is refused here. When the file ends inside its last
// frame, and an earlier frame is complete, the source keeps every frame: the
// cut one fails its reads with kResult_MediaMalformed, and the success
// message names it ("<path>: frame 4 is truncated: 1000 of 1536 bytes").
// A FIFO or device is refused without waiting for data. Frames are read by index
// and delivered as BGRA_4444_8u (BT.601 below 720 rows, BT.709 from 720), or
// VUYA_4444_8u / YUYV_422_8u when asked for.
OpenStatus OpenY4MSource(const std::string& inPath, VideoSourceRef& outSource);

// A generated pattern.
VideoSourceRef CreatePatternSource(const PatternSettings& inMedia);

// Wraps inSource: a frame that is not yet held by inSource costs inLatency
// of sleep before it is read; held frames and kFrameRequestFlag_NoBlock
// requests never sleep. Everything else is inSource's (frame keys included).
// Input contract: "inSource != nullptr".
VideoSourceRef CreateLatencyVideoSource(const VideoSourceRef& inSource,
                                        std::chrono::microseconds inLatency);

// As CreateLatencyVideoSource, and also answers
// Deprecated::IAsyncVideoSource: started reads run one at a time, earliest
// start first, on the wrapper's own worker thread (each sleeping inLatency,
// cut short by a cancel). Waits time out after inTimeout of the caller's
// waiting. Input contract: "inSource != nullptr".
VideoSourceRef
CreateAsyncVideoSource(const VideoSourceRef& inSource, std::chrono::microseconds inLatency,
                       std::chrono::milliseconds inTimeout = std::chrono::seconds(10),
                       bool inAsyncEnabled = true);

} // namespace BE
