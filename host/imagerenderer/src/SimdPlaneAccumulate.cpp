// Weighted sums of 8-bit planes (IR/PlaneAccumulate.h).
//
// Samples are widened to 16 bits and shifted up by 8, so that the high half of
// their product with a 16-bit weight is the weighted sample in 1/256 of a code
// value; the sums stay below 65536 because the weights add up to at most 65536.
// Whole vectors over the row, then the last partial vector through stack copies,
// so the tail gets the arithmetic of the body.

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "SimdPlaneAccumulate.cpp"
#include "IR/ImageRenderer.h"
#include "IR/PlaneAccumulate.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstring>

#include <hwy/foreach_target.h> // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace IR::PlaneAccumulate::HWY_NAMESPACE
{

namespace hn = hwy::HWY_NAMESPACE;

// The rounded sums in 1/256 of a code value as codes (at most 255 once shifted,
// so the signed narrowing keeps them).
template <class D16, class D8, class V>
HWY_INLINE hn::VFromD<D8> Narrow(D16 /*inD16*/, D8 inD8, V inSum)
{
    const hn::RebindToSigned<D16> di16;
    return hn::DemoteTo(inD8, hn::BitCast(di16, hn::ShiftRight<8>(inSum)));
}

// One vector of samples from inRow, weighted by inSteps / 65536, in 1/256 of a code value.
template <class D16, class D8>
HWY_INLINE hn::VFromD<D16> Weighted(D16 inD16, D8 inD8, const std::uint8_t* inRow,
                                    std::uint16_t inSteps)
{
    const auto samples = hn::ShiftLeft<8>(hn::PromoteTo(inD16, hn::LoadU(inD8, inRow)));
    return hn::MulHigh(samples, hn::Set(inD16, inSteps));
}

// One vector of weighted sums: inCount sources at inOffset of their rows.
template <class D16, class D8>
HWY_INLINE hn::VFromD<D8> SumAt(D16 inD16, D8 inD8, const std::uint8_t* const* inRows,
                                const std::uint16_t* inSteps, std::int32_t inCount,
                                std::size_t inOffset)
{
    auto sum = hn::Set(inD16, std::uint16_t{128});
    for (std::int32_t k = 0; k < inCount; ++k)
        sum = hn::Add(sum, Weighted(inD16, inD8, inRows[k] + inOffset, inSteps[k]));
    return Narrow(inD16, inD8, sum);
}

void AccumulateRow(const std::uint8_t* const* inRows, const std::uint16_t* inSteps,
                   std::int32_t inCount, std::uint8_t* outDst, std::size_t inWidth)
{
    const hn::ScalableTag<std::uint16_t> d16;
    const hn::Rebind<std::uint8_t, decltype(d16)> d8;
    const std::size_t n = hn::Lanes(d16);
    std::size_t i = 0;
    for (; i + n <= inWidth; i += n)
        hn::StoreU(SumAt(d16, d8, inRows, inSteps, inCount, i), d8, outDst + i);
    if (i == inWidth)
        return;
    // The tail: each source's last samples copied into one zeroed vector's worth.
    constexpr std::size_t kMaxLanes = HWY_MAX_BYTES / sizeof(std::uint16_t);
    alignas(64) std::uint8_t out[kMaxLanes] = {};
    const std::size_t rest = inWidth - i;
    auto sum = hn::Set(d16, std::uint16_t{128});
    for (std::int32_t k = 0; k < inCount; ++k)
    {
        alignas(64) std::uint8_t tail[kMaxLanes] = {};
        std::memcpy(tail, inRows[k] + i, rest);
        sum = hn::Add(sum, Weighted(d16, d8, tail, inSteps[k]));
    }
    hn::Store(Narrow(d16, d8, sum), d8, out);
    std::memcpy(outDst + i, out, rest);
}

} // namespace IR::PlaneAccumulate::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace IR::PlaneAccumulate
{
namespace
{

HWY_EXPORT(AccumulateRow);

constexpr std::int32_t kStackSources = 16;
constexpr long kWeightSteps = 65536;

// The sources that are read: their bases, row bytes, weight steps and the
// current row of each. On the stack for a few sources, in a transient block
// for more.
class SourceTable
{
public:
    explicit SourceTable(std::int32_t inCount)
    {
        if (inCount <= kStackSources)
            return;
        const std::size_t count = static_cast<std::size_t>(inCount);
        mBlock = IR_AllocateTransientMemoryBlock(
            count *
            (2 * sizeof(const std::uint8_t*) + sizeof(std::ptrdiff_t) + sizeof(std::uint16_t)));
        if (mBlock == nullptr)
        {
            mBases = nullptr;
            return;
        }
        mBases = static_cast<const std::uint8_t**>(mBlock);
        mRows = mBases + count;
        mRowBytes = reinterpret_cast<std::ptrdiff_t*>(mRows + count);
        mSteps = reinterpret_cast<std::uint16_t*>(mRowBytes + count);
    }
    ~SourceTable() { IR_FreeTransientMemoryBlock(mBlock); }
    SourceTable(const SourceTable&) = delete;
    SourceTable& operator=(const SourceTable&) = delete;

    bool IsReady() const { return mBases != nullptr; }
    std::int32_t Count() const { return mCount; }
    const std::uint16_t* Steps() const { return mSteps; }

    void Add(const std::uint8_t* inBase, std::int32_t inRowBytes, std::uint16_t inSteps)
    {
        mBases[mCount] = inBase;
        mRowBytes[mCount] = inRowBytes;
        mSteps[mCount] = inSteps;
        ++mCount;
    }

    // Row inY of every source.
    const std::uint8_t* const* RowsAt(std::int32_t inY)
    {
        for (std::int32_t k = 0; k < mCount; ++k)
            mRows[k] = mBases[k] + inY * mRowBytes[k];
        return mRows;
    }

private:
    void* mBlock = nullptr;
    std::int32_t mCount = 0;
    const std::uint8_t* mStackBases[kStackSources] = {};
    const std::uint8_t* mStackRows[kStackSources] = {};
    std::ptrdiff_t mStackRowBytes[kStackSources] = {};
    std::uint16_t mStackSteps[kStackSources] = {};
    const std::uint8_t** mBases = mStackBases;
    const std::uint8_t** mRows = mStackRows;
    std::ptrdiff_t* mRowBytes = mStackRowBytes;
    std::uint16_t* mSteps = mStackSteps;
};

} // namespace
} // namespace IR::PlaneAccumulate

std::int32_t IR_AccumulatePlane8(const std::uint8_t* const* inSrcs,
                                 const std::int32_t* inSrcRowBytes, const double* inWeights,
                                 std::int32_t inCount, std::uint8_t* outDst,
                                 std::int32_t inDstRowBytes, std::int32_t inWidth,
                                 std::int32_t inHeight)
{
    using namespace IR::PlaneAccumulate;
    MVX_INPUT_CONTRACT(inCount >= 1);
    MVX_INPUT_CONTRACT(inSrcs != nullptr && inSrcRowBytes != nullptr && inWeights != nullptr);
    MVX_INPUT_CONTRACT(outDst != nullptr && inWidth >= 0 && inHeight >= 0);
    MVX_INPUT_CONTRACT(inDstRowBytes >= inWidth);
    double total = 0.0;
    for (std::int32_t k = 0; k < inCount; ++k)
    {
        MVX_INPUT_CONTRACT(inSrcs[k] != nullptr && inSrcRowBytes[k] >= inWidth);
        MVX_INPUT_CONTRACT(std::isfinite(inWeights[k]) && inWeights[k] >= 0.0 &&
                           inWeights[k] <= 1.0);
        total += inWeights[k];
    }
    MVX_INPUT_CONTRACT(total <= 1.0 + 1e-6);
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;

    SourceTable sources(inCount);
    if (!sources.IsReady())
        return kIR_OutOfMemory;
    double running = 0.0;
    long previous = 0;
    const std::uint8_t* whole = nullptr;
    std::ptrdiff_t wholeRowBytes = 0;
    for (std::int32_t k = 0; k < inCount; ++k)
    {
        running += inWeights[k];
        const long reached = std::lround(std::min(running, 1.0) * kWeightSteps);
        const long steps = reached - previous;
        previous = reached;
        if (steps == 0)
            continue;
        // All the weight on one source: only then can a step count be 65536.
        if (steps == kWeightSteps)
        {
            whole = inSrcs[k];
            wholeRowBytes = inSrcRowBytes[k];
            continue;
        }
        sources.Add(inSrcs[k], inSrcRowBytes[k], static_cast<std::uint16_t>(steps));
    }

    const auto width = static_cast<std::size_t>(inWidth);
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        std::uint8_t* out = outDst + std::ptrdiff_t{y} * inDstRowBytes;
        if (whole != nullptr)
        {
            const std::uint8_t* in = whole + y * wholeRowBytes;
            if (in != out)
                std::memcpy(out, in, width);
        }
        else if (sources.Count() == 0)
            std::memset(out, 0, width);
        else
            HWY_DYNAMIC_DISPATCH(AccumulateRow)
        (sources.RowsAt(y), sources.Steps(), sources.Count(), out, width);
    }
    return kIR_NoError;
}
#endif
