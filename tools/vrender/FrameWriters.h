#pragma once

// vrender's output writers: numbered PNG files and Y4M streams.
//
// Writing a frame is split in two so that the expensive part runs in
// parallel and the output still comes out in order:
// - Encode (any thread, concurrently for different frames) does the pixel
//   work: PNG compression into a temporary file beside the final one, or the
//   conversion to planar Y'CbCr bytes of a Y4M frame;
// - Commit (one thread, in frame order) makes the frame visible: renames the
//   PNG file into place, or appends the Y4M frame to the stream.
// Discard removes what Encode produced for a frame that will not be
// committed (a cancelled or failed render). Every failure answers a message
// that names the file and the problem; nothing throws.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "mvxmediatypes/FieldType.h"
#include "mvxmediatypes/FrameRate.h"
#include "mvxmediatypes/PixelAspectRatio.h"
#include "mvxmediatypes/PixelFormat.h"

#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

namespace vrender
{

enum class Y4MChroma;

// What every frame of the output is.
struct StreamInfo
{
    std::uint32_t mWidth = 0;
    std::uint32_t mHeight = 0;
    mvxmediatypes::FrameRate mFrameRate = mvxmediatypes::kFrameRate_Video25;
    mvxmediatypes::FieldType mFieldType = mvxmediatypes::kFieldType_Progressive;
    mvxmediatypes::PixelAspectRatio mPixelAspectRatio = mvxmediatypes::kPixelAspectRatio_Square;
    mvxmediatypes::RenderQuality mQuality = mvxmediatypes::kRenderQuality_Max;
    // The frame numbers the output will hold: mFirstFrame onwards, mFrameCount of them.
    std::int64_t mFirstFrame = 0;
    std::int64_t mFrameCount = 0;
};

// One encoded frame, between Encode and Commit.
struct EncodedFrame
{
    std::int64_t mIndex = 0;
    // Y4M: the frame's bytes ("FRAME\n" and the planes), or, for a planar
    // frame that needs no conversion, the frame itself, whose planes Commit
    // writes as they are.
    std::vector<std::uint8_t> mBytes;
    QRT::InterfaceRef<MF::IVideoFrame> mFrame;
    // PNG: the temporary file and the final path.
    std::string mTemporaryPath;
    std::string mFinalPath;
    // Empty on success.
    std::string mError;
};

class FrameWriter
{
public:
    virtual ~FrameWriter() = default;

    // Prepares the output (creates the directory, writes the stream header).
    // Called once, before any other operation. False with outError on failure.
    virtual bool Begin(const StreamInfo& inInfo, std::string& outError) = 0;
    // True when Encode takes frames of inFormat as they are, so that the
    // render need not convert them first. Any thread.
    virtual bool Accepts(mvxmediatypes::PixelFormat inFormat) const = 0;
    // Any thread, concurrently. inFrame has the stream's size.
    virtual EncodedFrame Encode(std::int64_t inIndex,
                                const QRT::InterfaceRef<MF::IVideoFrame>& inFrame) = 0;
    // One thread, in index order.
    virtual bool Commit(EncodedFrame& ioFrame, std::string& outError) = 0;
    // Removes what Encode left for a frame that is not committed.
    virtual void Discard(EncodedFrame& ioFrame) = 0;
    // Flushes and closes the output. False with outError on failure.
    virtual bool Finish(std::string& outError) = 0;
    // Where the output goes, for the summary ("out/demo/frame_%05d.png").
    virtual std::string Describe() const = 0;
};

// Numbered PNG files from a printf-style pattern (vrender::CheckFramePattern),
// numbered by source frame. Frames without alpha, or whose alpha is opaque,
// are written as RGB, others as RGBA; 8-bit formats as 8-bit files, deeper
// ones as 16-bit files.
//
// Files of the same pattern from an earlier render (the frame numbers of
// the new range, and any other number when the number is in the file name)
// make Begin fail unless inOverwrite is set, so that a folder never ends up
// holding two renders mixed. With inOverwrite, the frames of the range are
// replaced and, once every frame is written, Finish removes the files of the
// pattern outside the range. Files that do not match the pattern are never
// touched.
std::unique_ptr<FrameWriter> CreatePngSequenceWriter(std::string inPattern,
                                                     bool inOverwrite = false);

// A Y4M stream written to inFile (not closed by the writer), or to a file
// that the writer creates at inPath when inFile is null; an existing file
// there makes Begin fail unless inOverwrite is set. Frames are converted to
// 8-bit video-range Y'CbCr (BT.601 below 720 rows, BT.709 from 720), 4:4:4
// or 4:2:0 with each chroma sample the mean of its 2x2 block, in one pass
// into a buffer the writer reuses (IR_PackYUVPlanes); planar 4:2:0 frames
// go out into a 4:2:0 stream unconverted. Each frame is one write.
std::unique_ptr<FrameWriter> CreateY4MWriter(std::FILE* inFile, std::string inPath,
                                             Y4MChroma inChroma, bool inOverwrite = false);

// The Y4M stream header line, newline included:
// "YUV4MPEG2 W<w> H<h> F<n>:<d> I<p|t|b> A<n>:<d> C<420|444> XCOLORRANGE=LIMITED\n".
std::string MakeY4MHeader(const StreamInfo& inInfo, Y4MChroma inChroma);

// The frame rate as a reduced ratio of frames per second.
void GetFrameRateRatio(mvxmediatypes::FrameRate inRate, std::int64_t& outNumerator,
                       std::int64_t& outDenominator);

} // namespace vrender
