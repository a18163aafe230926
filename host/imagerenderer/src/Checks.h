#pragma once

// Input checks shared by the image renderer's entry points. Each raises the
// input-contract error with the failed expression's text.

#include "Formats.h"
#include "mvxcore/debug/Contract.h"

#include <cmath>

namespace IR
{

inline FormatInfo RequireFormat(IR_PixelFormat inFormat)
{
    FormatInfo info;
    MVX_INPUT_CONTRACT(DescribeFormat(inFormat, info));
    return info;
}

inline void RequireBuffer(const void* inBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                          std::int32_t inWidth, std::int32_t inHeight)
{
    MVX_INPUT_CONTRACT(inBase != nullptr);
    MVX_INPUT_CONTRACT(inWidth >= 0 && inHeight >= 0);
    MVX_INPUT_CONTRACT(inRowBytes >= IR_MinimumRowBytes(inFormat, inWidth));
    MVX_INPUT_CONTRACT((inFormat & kIR_FormatMask_Layout) != kIR_FormatLayout_YUV420Planar ||
                       inRowBytes % 2 == 0);
    // Float components are read as floats: natural alignment is required.
    MVX_INPUT_CONTRACT((inFormat & kIR_FormatBit_Float) == 0 ||
                       (reinterpret_cast<std::uintptr_t>(inBase) % 4 == 0 && inRowBytes % 4 == 0));
}

inline void RequireUnit(float inValue)
{
    MVX_INPUT_CONTRACT(inValue >= 0.0f && inValue <= 1.0f);
}

inline void RequireQuality(std::int32_t inQuality)
{
    MVX_INPUT_CONTRACT(inQuality >= 0);
}

inline constexpr std::int32_t kBestQuality = 5;
inline constexpr std::int32_t kBilinearQuality = 3;

} // namespace IR
