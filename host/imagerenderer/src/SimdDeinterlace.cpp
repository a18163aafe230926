// Row averaging for the field operations (SimdDeinterlace.h): whole vectors over the
// row, then the last partial vector through stack copies, so the tail gets the
// arithmetic of the body (which is exact: a rounding-up byte mean, a float mean).

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdDeinterlace.cpp"
#include "SimdDeinterlace.h"

#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::Simd::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

// inMean(a, b) over inCount lanes of T, in whole vectors of tag D and one partial one.
template <class D, class T, class Mean>
HWY_INLINE void MeanOfRows(D inD, const T* inA, const T* inB, T* outDst, std::size_t inCount,
                           const Mean& inMean)
{
    const std::size_t n = hn::Lanes(inD);
    std::size_t i = 0;
    for (; i + n <= inCount; i += n)
        hn::StoreU(inMean(hn::LoadU(inD, inA + i), hn::LoadU(inD, inB + i)), inD, outDst + i);
    if (i == inCount)
        return;
    alignas(64) T a[HWY_MAX_BYTES / sizeof(T)] = {};
    alignas(64) T b[HWY_MAX_BYTES / sizeof(T)] = {};
    const std::size_t rest = (inCount - i) * sizeof(T);
    std::memcpy(a, inA + i, rest);
    std::memcpy(b, inB + i, rest);
    hn::Store(inMean(hn::Load(inD, a), hn::Load(inD, b)), inD, a);
    std::memcpy(outDst + i, a, rest);
}

void Average8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
              std::size_t inBytes)
{
    const hn::ScalableTag<std::uint8_t> d;
    MeanOfRows(d, inA, inB, outDst, inBytes,
               [](auto inX, auto inY) { return hn::AverageRound(inX, inY); });
}

void AverageF(const float* inA, const float* inB, float* outDst, std::size_t inCount)
{
    const hn::ScalableTag<float> d;
    const auto half = hn::Set(d, 0.5f);
    MeanOfRows(d, inA, inB, outDst, inCount,
               [&](auto inX, auto inY) { return hn::Mul(half, hn::Add(inX, inY)); });
}

} // namespace IR::Simd::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::Simd
{

HWY_EXPORT(Average8);
HWY_EXPORT(AverageF);

void AverageRows8(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
                  std::size_t inBytes)
{
    HWY_DYNAMIC_DISPATCH(Average8)(inA, inB, outDst, inBytes);
}

void AverageRowsF(const float* inA, const float* inB, float* outDst, std::size_t inCount)
{
    HWY_DYNAMIC_DISPATCH(AverageF)(inA, inB, outDst, inCount);
}

} // namespace IR::Simd
#endif
