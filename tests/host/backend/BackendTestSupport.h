#pragma once

// Helpers shared by the back end's tests: reading pixels of small frames,
// temporary files, and the usual request arguments.

#include "BE/IVideoSource.h"
#include "BE/VideoSources.h"
#include "MF/IVideoFrame.h"

#include <array>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <unistd.h>

#include <gtest/gtest.h>

namespace betest
{

using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;
using mvxmediatypes::TickTime;

// B, G, R, A of pixel (x, y) of an 8-bit 4:4:4 frame (also V, U, Y, A).
inline std::array<int, 4> Pixel(const FrameRef& inFrame, int inX, int inY)
{
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    const std::uint8_t* pixel = base + std::size_t(inY) * inFrame->GetRowBytes() + inX * 4;
    return {pixel[0], pixel[1], pixel[2], pixel[3]};
}

inline std::array<int, 4> Bgra(int inBlue, int inGreen, int inRed, int inAlpha = 255)
{
    return {inBlue, inGreen, inRed, inAlpha};
}

// Reads the frame at inTime with the default request (own size and format).
inline QRT::Result ReadFrame(const BE::VideoSourceRef& inSource, TickTime inTime,
                             FrameRef& outFrame,
                             std::int32_t inFlags = BE::Deprecated::kFrameRequestFlag_Read,
                             const BE::VideoFrameRequest& inRequest = {})
{
    return inSource->GetVideoFrame(inTime, inRequest, MF::BinaryData(), BE::ColorProfile(), inFlags,
                                   outFrame);
}

inline FrameRef ReadFrameOrFail(const BE::VideoSourceRef& inSource, TickTime inTime,
                                const BE::VideoFrameRequest& inRequest = {})
{
    FrameRef frame;
    EXPECT_EQ(ReadFrame(inSource, inTime, frame, BE::Deprecated::kFrameRequestFlag_Read, inRequest),
              QRT::kResult_Success);
    return frame;
}

inline BE::VideoSourceRef OpenOrFail(const std::string& inMedia)
{
    BE::VideoSourceRef source;
    const BE::OpenStatus status = BE::OpenVideoSource(inMedia, source);
    EXPECT_TRUE(status.Succeeded()) << status.mMessage;
    EXPECT_TRUE(source);
    return source;
}

// A directory of its own per test, removed with its files afterwards.
class TempDirectory
{
public:
    std::string File(const std::string& inName) { return (mPath / inName).string(); }
    ~TempDirectory() { std::filesystem::remove_all(mPath); }

private:
    std::filesystem::path mPath = []
    {
        std::string pattern = ::testing::TempDir() + "be_test_XXXXXX";
        EXPECT_NE(mkdtemp(pattern.data()), nullptr);
        return std::filesystem::path(pattern);
    }();
};

inline void WriteBytes(const std::string& inPath, const std::string& inBytes)
{
    std::ofstream file(inPath, std::ios::binary | std::ios::trunc);
    file.write(inBytes.data(), static_cast<std::streamsize>(inBytes.size()));
}

inline std::string ReadBytes(const std::string& inPath)
{
    std::ifstream file(inPath, std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

} // namespace betest
