#pragma once

// Vectorised row averaging of the field operations (the rebuilt rows of deinterlacing and
// the quarter-height field copy), written with Highway and chosen for the processor on
// first use. Rows need no alignment; the destination may be either source.

#include <cstddef>
#include <cstdint>

namespace IR::Simd
{

// outDst[i] = (inA[i] + inB[i] + 1) >> 1 over inBytes bytes.
void AverageRows8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
                  std::size_t inBytes);

// outDst[i] = 0.5f * (inA[i] + inB[i]) over inCount floats.
void AverageRowsF(const float* inA, const float* inB, float* outDst, std::size_t inCount);

} // namespace IR::Simd
