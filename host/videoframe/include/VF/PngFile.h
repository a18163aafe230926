#pragma once

// Reading and writing PNG files of video frames (test pictures, stills,
// diagnostics). Plain functions over the system's libpng; safe from any
// thread on different files. Bad files never crash: every failure answers a
// status and a message naming the file and the problem.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"
#include "mvxmediatypes/PixelFormat.h"

#include <string>

namespace VF
{

// The file cannot be opened, or is not a PNG file at all.
inline constexpr QRT::Result kResult_PngCannotOpen = static_cast<QRT::Result>(0xA0100010u);
// The file is a PNG file but damaged, truncated or too large for a frame.
inline constexpr QRT::Result kResult_PngMalformed = static_cast<QRT::Result>(0xA0100011u);
// The file cannot be written.
inline constexpr QRT::Result kResult_PngWriteFailed = static_cast<QRT::Result>(0xA0100012u);

struct PngStatus
{
    QRT::Result mResult = QRT::kResult_Success;
    // Empty on success; otherwise "<path>: <problem>".
    std::string mMessage;

    bool Succeeded() const { return QRT::Succeeded(mResult); }
};

enum class PngChannels
{
    kRGB,  // RGB, alpha dropped (colour as stored, not composited)
    kRGBA, // RGBA, straight alpha
};

enum class PngDepth
{
    k8,  // 8 bits a sample
    k16, // 16 bits a sample, for frames deeper than 8 bits
};

// The depth that keeps a frame of inFormat: 16 bits for formats of more
// than 8 bits a sample (16u, 16f, 32f), else 8.
PngDepth GetPngDepthFor(mvxmediatypes::PixelFormat inFormat);

// Writes the frame as a PNG file of inDepth, sRGB-encoded as the frame is
// (no gamma change). Any frame of a raster format is converted first, at the
// best quality, to straight BGRA_4444_8u (8 bits) or BGRA_4444_16u (16 bits:
// sample v of 0..65535 is stored as is, most significant byte first).
// Statuses: kResult_PngWriteFailed, kResult_UnsupportedPixelFormat (the frame
// cannot be converted), or success. Input contract: "inFrame != nullptr".
PngStatus WritePngFile(const std::string& inPath, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                       PngChannels inChannels = PngChannels::kRGBA,
                       PngDepth inDepth = PngDepth::k8);

// Reads a PNG file of any colour type and depth into a new frame of
// BGRA_4444_8u, straight alpha (opaque when the file has none), square
// pixels, progressive. Samples are taken as stored, without gamma
// conversion; a 16-bit sample v becomes (v * 255 + 32767) / 65535. On
// failure outFrame is emptied, the status is kResult_PngCannotOpen,
// kResult_PngMalformed or kResult_OutOfFrameMemory, and the message names
// the file and the decoder's reason ("<path>: IDAT: CRC error").
PngStatus ReadPngFile(const std::string& inPath, QRT::InterfaceRef<MF::IVideoFrame>& outFrame);

} // namespace VF
