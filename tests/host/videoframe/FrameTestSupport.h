#pragma once

// Frames and byte access shared by the video frame tests.

#include "VF/VideoFrame.h"

#include <algorithm>
#include <cstring>
#include <vector>

#include <gtest/gtest.h>

namespace vftest
{

namespace mt = mvxmediatypes;
using Frame = QRT::InterfaceRef<MF::IVideoFrame>;

// A square-pixel frame, cleared unless asked otherwise.
inline Frame MakeFrame(mt::PixelFormat inFormat, uint32_t inWidth, uint32_t inHeight,
                       bool inClear = true, bool inTrack = false)
{
    Frame frame;
    EXPECT_EQ(VF::CreateVideoFrame(inFormat, inWidth, inHeight, mt::kPixelAspectRatio_Square,
                                   inClear, inTrack, frame),
              QRT::kResult_Success);
    return frame;
}

inline void FillBytes(MF::IVideoFrame& ioFrame, uint8_t inValue)
{
    std::memset(ioFrame.GetWritableBaseAddress(), inValue, ioFrame.GetDataSize());
}

inline bool AllBytesAre(const MF::IVideoFrame& inFrame, uint8_t inValue)
{
    const auto* bytes = static_cast<const uint8_t*>(inFrame.GetBaseAddress());
    return std::all_of(bytes, bytes + inFrame.GetDataSize(),
                       [&](uint8_t b) { return b == inValue; });
}

// The first byte of memory row inY (plane 0), and of pixel inX of 4-byte pixels.
inline uint8_t* Row(const Frame& inFrame, int32_t inY, int32_t inX = 0)
{
    return static_cast<uint8_t*>(const_cast<void*>(inFrame->GetBaseAddress())) +
           size_t(inY) * inFrame->GetRowBytes() + 4 * size_t(inX);
}

inline uint32_t ReferenceCount(const Frame& inFrame)
{
    const uint32_t count = inFrame->AddRef();
    inFrame->Release();
    return count - 1;
}

} // namespace vftest
