#pragma once

// Blend modes on float premultiplied rows (IR_BlendMode numbering).

#include <cstdint>

namespace IR
{

// ioDst = blend of inSrc (premultiplied, already scaled by opacity) over ioDst
// (premultiplied); the mode is chosen once per row, not per pixel.
void BlendRowF(std::uint32_t inMode, const float* inSrc, float* ioDst, std::int32_t inCount);

} // namespace IR
