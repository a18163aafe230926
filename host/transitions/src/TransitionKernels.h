#pragma once

// Row kernels of the transitions: out = a * (1 - wb - wc) + b * wb + c * wc
// per channel, where a and b are the two pictures and c a colour row (border,
// dip colour). 8-bit rows take weights in 1/256 (wb + wc <= 256) and round to
// nearest; float rows take weights 0 to 1. Weights are uniform over the row
// or given per channel (four per pixel). A null c means wc is 0.
//
// Plain loops over contiguous memory written for the compiler's vectoriser;
// no state, any thread.

#include <cstdint>

namespace TX::Kernels
{

void MixRow8(const std::uint8_t* inA, const std::uint8_t* inB, const std::uint8_t* inC,
             std::uint8_t* outRow, std::int32_t inChannels, std::uint16_t inWeightB,
             std::uint16_t inWeightC);
void MixRow8(const std::uint8_t* inA, const std::uint8_t* inB, const std::uint8_t* inC,
             std::uint8_t* outRow, std::int32_t inChannels, const std::uint16_t* inWeightsB,
             const std::uint16_t* inWeightsC);
void MixRowF(const float* inA, const float* inB, const float* inC, float* outRow,
             std::int32_t inChannels, float inWeightB, float inWeightC);
void MixRowF(const float* inA, const float* inB, const float* inC, float* outRow,
             std::int32_t inChannels, const float* inWeightsB, const float* inWeightsC);

} // namespace TX::Kernels
