#include "TransitionKernels.h"

namespace TX::Kernels
{
namespace
{

// 8-bit: 16-bit integer arithmetic (a * wa + b * wb + c * wc <= 255 * 256),
// which vectorises to 16-bit multiplies.
inline std::uint8_t Mix8(std::uint32_t inA, std::uint32_t inB, std::uint32_t inC,
                         std::uint32_t inWeightB, std::uint32_t inWeightC)
{
    const std::uint32_t weightA = 256u - inWeightB - inWeightC;
    return static_cast<std::uint8_t>(
        static_cast<std::uint16_t>(inA * weightA + inB * inWeightB + inC * inWeightC + 128u) >> 8);
}

} // namespace

void MixRow8(const std::uint8_t* inA, const std::uint8_t* inB, const std::uint8_t* inC,
             std::uint8_t* outRow, std::int32_t inChannels, std::uint16_t inWeightB,
             std::uint16_t inWeightC)
{
    if (inC == nullptr)
    {
        for (std::int32_t i = 0; i < inChannels; ++i)
            outRow[i] = Mix8(inA[i], inB[i], 0, inWeightB, 0);
        return;
    }
    for (std::int32_t i = 0; i < inChannels; ++i)
        outRow[i] = Mix8(inA[i], inB[i], inC[i], inWeightB, inWeightC);
}

void MixRow8(const std::uint8_t* inA, const std::uint8_t* inB, const std::uint8_t* inC,
             std::uint8_t* outRow, std::int32_t inChannels, const std::uint16_t* inWeightsB,
             const std::uint16_t* inWeightsC)
{
    if (inC == nullptr)
    {
        for (std::int32_t i = 0; i < inChannels; ++i)
            outRow[i] = Mix8(inA[i], inB[i], 0, inWeightsB[i], 0);
        return;
    }
    for (std::int32_t i = 0; i < inChannels; ++i)
        outRow[i] = Mix8(inA[i], inB[i], inC[i], inWeightsB[i], inWeightsC[i]);
}

void MixRowF(const float* inA, const float* inB, const float* inC, float* outRow,
             std::int32_t inChannels, float inWeightB, float inWeightC)
{
    const float weightA = 1.0f - inWeightB - inWeightC;
    if (inC == nullptr)
    {
        for (std::int32_t i = 0; i < inChannels; ++i)
            outRow[i] = inA[i] * weightA + inB[i] * inWeightB;
        return;
    }
    for (std::int32_t i = 0; i < inChannels; ++i)
        outRow[i] = inA[i] * weightA + inB[i] * inWeightB + inC[i] * inWeightC;
}

void MixRowF(const float* inA, const float* inB, const float* inC, float* outRow,
             std::int32_t inChannels, const float* inWeightsB, const float* inWeightsC)
{
    if (inC == nullptr)
    {
        for (std::int32_t i = 0; i < inChannels; ++i)
            outRow[i] = inA[i] + (inB[i] - inA[i]) * inWeightsB[i];
        return;
    }
    for (std::int32_t i = 0; i < inChannels; ++i)
        outRow[i] = inA[i] * (1.0f - inWeightsB[i] - inWeightsC[i]) + inB[i] * inWeightsB[i] +
                    inC[i] * inWeightsC[i];
}

} // namespace TX::Kernels
