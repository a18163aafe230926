#pragma once

// Reading and writing PNG files of video frames (test pictures, stills,
// diagnostics). Plain functions over the system's libpng; safe from any
// thread on different files. Bad files never crash: every failure answers a
// status and a message naming the file and the problem.

#include "MF/IVideoFrame.h"
#include "QRT/InterfaceRef.h"
#include "QRT/Result.h"

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
    kRGB,  // 8-bit RGB, alpha dropped (colour as stored, not composited)
    kRGBA, // 8-bit RGBA, straight alpha
};

// Writes the frame as an 8-bit PNG file. Any frame of a raster format is
// converted to 8-bit straight BGRA first (CopyFrame at the best quality).
// Statuses: kResult_PngWriteFailed, kResult_UnsupportedPixelFormat (the frame
// cannot be converted), or success. Input contract: "inFrame != nullptr".
PngStatus WritePngFile(const std::string& inPath, const QRT::InterfaceRef<MF::IVideoFrame>& inFrame,
                       PngChannels inChannels = PngChannels::kRGBA);

// Reads a PNG file of any colour type and depth into a new frame of
// BGRA_4444_8u, straight alpha (opaque when the file has none), square
// pixels, progressive. On failure outFrame is emptied and the status is
// kResult_PngCannotOpen, kResult_PngMalformed or
// kResult_OutOfFrameMemory.
PngStatus ReadPngFile(const std::string& inPath, QRT::InterfaceRef<MF::IVideoFrame>& outFrame);

} // namespace VF
