// Halving of 8-bit planes (IR/PlaneHalve.h).
//
// Two source rows are read a vector of bytes at a time; seen as 16-bit lanes,
// each lane holds an even sample in its low byte and the odd one beside it in
// its high byte, so the pair sums of both rows need no shuffles. Whole vectors
// over the row, then the last partial vector through stack copies, so the tail
// gets the arithmetic of the body.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdPlaneHalve.cpp"
#include "IR/PlaneHalve.h"
#include "mvxcore/debug/Contract.h"

#include <cstddef>
#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::PlaneHalve::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

#if HWY_TARGET == HWY_SCALAR
// The one-lane fallback has no byte pairs in a lane: a plain loop.
void HalveRow(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
              std::size_t inWidth)
{
    for (std::size_t i = 0; i < inWidth; ++i)
        outDst[i] = static_cast<std::uint8_t>(
            (inTop[2 * i] + inTop[2 * i + 1] + inBottom[2 * i] + inBottom[2 * i + 1] + 2) >> 2);
}
#else
// The means of the 2x2 blocks of one vector of bytes of each row.
template <class D8>
HWY_INLINE hn::VFromD<hn::Rebind<std::uint8_t, hn::RepartitionToWide<D8>>>
Means(D8 inD8, const std::uint8_t* inTop, const std::uint8_t* inBottom)
{
    const hn::RepartitionToWide<D8> d16;
    const hn::RebindToSigned<decltype(d16)> di16;
    const hn::Rebind<std::uint8_t, decltype(d16)> dHalf;
    const auto top = hn::BitCast(d16, hn::LoadU(inD8, inTop));
    const auto bottom = hn::BitCast(d16, hn::LoadU(inD8, inBottom));
    const auto low = hn::Set(d16, std::uint16_t{0xFF});
    const auto sum = hn::Add(hn::Add(hn::And(top, low), hn::ShiftRight<8>(top)),
                             hn::Add(hn::And(bottom, low), hn::ShiftRight<8>(bottom)));
    const auto mean = hn::ShiftRight<2>(hn::Add(sum, hn::Set(d16, std::uint16_t{2})));
    return hn::DemoteTo(dHalf, hn::BitCast(di16, mean));
}

void HalveRow(const std::uint8_t* inTop, const std::uint8_t* inBottom, std::uint8_t* outDst,
              std::size_t inWidth)
{
    const hn::ScalableTag<std::uint8_t> d8;
    const hn::Rebind<std::uint8_t, hn::RepartitionToWide<decltype(d8)>> dHalf;
    // Output samples per vector of source bytes.
    const std::size_t n = hn::Lanes(dHalf);
    std::size_t i = 0;
    for (; i + n <= inWidth; i += n)
        hn::StoreU(Means(d8, inTop + 2 * i, inBottom + 2 * i), dHalf, outDst + i);
    if (i == inWidth)
        return;
    alignas(64) std::uint8_t top[HWY_MAX_BYTES] = {};
    alignas(64) std::uint8_t bottom[HWY_MAX_BYTES] = {};
    const std::size_t rest = inWidth - i;
    std::memcpy(top, inTop + 2 * i, 2 * rest);
    std::memcpy(bottom, inBottom + 2 * i, 2 * rest);
    hn::Store(Means(d8, top, bottom), dHalf, top);
    std::memcpy(outDst + i, top, rest);
}
#endif

} // namespace IR::PlaneHalve::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::PlaneHalve
{
HWY_EXPORT(HalveRow);
} // namespace IR::PlaneHalve

std::int32_t IR_HalvePlane8(const std::uint8_t* inSrc, std::int32_t inSrcRowBytes,
                            std::uint8_t* outDst, std::int32_t inDstRowBytes, std::int32_t inWidth,
                            std::int32_t inHeight)
{
    MVX_INPUT_CONTRACT(inSrc != nullptr && outDst != nullptr);
    MVX_INPUT_CONTRACT(inWidth >= 0 && inHeight >= 0);
    MVX_INPUT_CONTRACT(inSrcRowBytes >= 2 * std::int64_t{inWidth} && inDstRowBytes >= inWidth);
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        const std::uint8_t* top = inSrc + std::ptrdiff_t{2 * y} * inSrcRowBytes;
        HWY_DYNAMIC_DISPATCH(IR::PlaneHalve::HalveRow)
        (top, top + inSrcRowBytes, outDst + std::ptrdiff_t{y} * inDstRowBytes,
         static_cast<std::size_t>(inWidth));
    }
    return kIR_NoError;
}
#endif
