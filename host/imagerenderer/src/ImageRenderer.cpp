// Entry points of the image renderer other than motion: format queries,
// compositing, mixing, conversion, scaling, fields, fill and matte removal.
// Each checks its input, picks its kernel once, then runs row by row.

#include "Blend.h"
#include "Checks.h"
#include "Kernels.h"
#include "Scale.h"
#include "SimdAccumulate.h"
#include "SimdDeinterlace.h"
#include "YUV.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <vector>

namespace
{

using IR::Alpha;
using IR::FormatInfo;
using IR::Layout;
using IR::View;

std::size_t RowBytesOf(IR_PixelFormat inFormat, std::int32_t inWidth)
{
    return static_cast<std::size_t>(IR_MinimumRowBytes(inFormat, inWidth));
}

} // namespace

bool IR_IsValidPixelFormat(IR_PixelFormat inFormat)
{
    IR::FormatInfo info;
    return IR::DescribeFormat(inFormat, info);
}

std::int64_t IR_MinimumRowBytes(IR_PixelFormat inFormat, std::int32_t inWidth)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    MVX_INPUT_CONTRACT(inWidth >= 0);
    if (info.layout == Layout::kYUYV)
        return (static_cast<std::int64_t>(inWidth) + 1) / 2 * 4;
    return static_cast<std::int64_t>(inWidth) * info.bytesPerPixel;
}

bool IR_IsOriginTopLeft(IR_PixelFormat inFormat)
{
    return !IR::RequireFormat(inFormat).bottomLeft;
}

bool IR_IsOriginBottomLeft(IR_PixelFormat inFormat)
{
    return IR::RequireFormat(inFormat).bottomLeft;
}

// ---------------------------------------------------------------------------
// Compositing

std::int32_t IR_Composite(const void* inSrc, std::int32_t inSrcRowBytes, void* ioDst,
                          std::int32_t inDstRowBytes, IR_PixelFormat inFormat, std::int32_t inWidth,
                          std::int32_t inHeight, float inOpacity, std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(inSrc, inSrcRowBytes, inFormat, inWidth, inHeight);
    IR::RequireBuffer(ioDst, inDstRowBytes, inFormat, inWidth, inHeight);
    IR::RequireUnit(inOpacity);
    IR::RequireQuality(inQuality);
    if (info.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    const View src = IR::MakeView(inSrc, inSrcRowBytes, info, inHeight);
    const View dst = IR::MakeView(ioDst, inDstRowBytes, info, inHeight);
    const bool straight = info.alpha == Alpha::kStraight;
    if (inQuality >= IR::kBestQuality && !info.linear)
    {
        // Best quality blends in linear light through the float row pipeline.
        IR::ScratchBlock rows(static_cast<std::size_t>(inWidth) * 32);
        if (!rows.Valid())
            return kIR_OutOfMemory;
        float* s = rows.Floats();
        float* d = s + 4 * static_cast<std::size_t>(inWidth);
        const IR::RowReader srcReader(inSrc, inSrcRowBytes, inFormat, inWidth, inHeight, true,
                                      true);
        const IR::RowReader dstReader(ioDst, inDstRowBytes, inFormat, inWidth, inHeight, true,
                                      true);
        const IR::RowWriter writer(ioDst, inDstRowBytes, inFormat, inWidth, inHeight, true, true);
        const auto over = IR::Kernels::SelectOverRowF(false, false);
        for (std::int32_t y = 0; y < inHeight; ++y)
        {
            srcReader.Read(y, s);
            dstReader.Read(y, d);
            over(s, d, inWidth, inOpacity);
            writer.Write(y, d);
        }
        return kIR_NoError;
    }
    if (info.isFloat)
    {
        const auto over = IR::Kernels::SelectOverRowF(straight, straight);
        for (std::int32_t y = 0; y < inHeight; ++y)
            over(reinterpret_cast<const float*>(src.Row(y)), reinterpret_cast<float*>(dst.Row(y)),
                 inWidth, inOpacity);
        return kIR_NoError;
    }
    const auto over = IR::Kernels::SelectOverRow8(straight, straight);
    for (std::int32_t y = 0; y < inHeight; ++y)
        over(src.Row(y), dst.Row(y), inWidth, inOpacity);
    return kIR_NoError;
}

std::int32_t IR_CompositeToBlackAndTestSourceAlpha(void* ioBase, std::int32_t inRowBytes,
                                                   IR_PixelFormat inFormat, std::int32_t inWidth,
                                                   std::int32_t inHeight, float inOpacity,
                                                   bool* outSourceAlphaBelowOpaque)
{
    MVX_INPUT_CONTRACT(outSourceAlphaBelowOpaque != nullptr);
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(ioBase, inRowBytes, inFormat, inWidth, inHeight);
    IR::RequireUnit(inOpacity);
    *outSourceAlphaBelowOpaque = false;
    if (info.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    const View view = IR::MakeView(ioBase, inRowBytes, info, inHeight);
    const bool straight = info.alpha == Alpha::kStraight;
    bool below = false;
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        if (info.isFloat)
            below |= IR::Kernels::ToBlackRowF(reinterpret_cast<float*>(view.Row(y)), inWidth,
                                              inOpacity, straight);
        else
            below |= IR::Kernels::ToBlackRow8(view.Row(y), inWidth, inOpacity, straight);
    }
    *outSourceAlphaBelowOpaque = below;
    return kIR_NoError;
}

std::int32_t IR_CompositeToBlack(void* ioBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                                 std::int32_t inWidth, std::int32_t inHeight, float inOpacity)
{
    bool below = false;
    return IR_CompositeToBlackAndTestSourceAlpha(ioBase, inRowBytes, inFormat, inWidth, inHeight,
                                                 inOpacity, &below);
}

// ---------------------------------------------------------------------------
// Mixing

std::int32_t IR_CrossDissolve(const void* inSrcA, std::int32_t inSrcARowBytes, const void* inSrcB,
                              std::int32_t inSrcBRowBytes, void* outDst, std::int32_t inDstRowBytes,
                              IR_PixelFormat inFormat, std::int32_t inWidth, std::int32_t inHeight,
                              float inWeight, std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(inSrcA, inSrcARowBytes, inFormat, inWidth, inHeight);
    IR::RequireBuffer(inSrcB, inSrcBRowBytes, inFormat, inWidth, inHeight);
    IR::RequireBuffer(outDst, inDstRowBytes, inFormat, inWidth, inHeight);
    IR::RequireUnit(inWeight);
    IR::RequireQuality(inQuality);
    if (info.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    const View a = IR::MakeView(inSrcA, inSrcARowBytes, info, inHeight);
    const View b = IR::MakeView(inSrcB, inSrcBRowBytes, info, inHeight);
    const View d = IR::MakeView(outDst, inDstRowBytes, info, inHeight);
    if (inQuality >= IR::kBestQuality && !info.linear && !info.isFloat)
    {
        const void* sources[2] = {inSrcA, inSrcB};
        const std::int32_t rowBytes[2] = {inSrcARowBytes, inSrcBRowBytes};
        const double weights[2] = {1.0 - static_cast<double>(inWeight), inWeight};
        return IR::AccumulateLinear8(sources, rowBytes, weights, 2, outDst, inDstRowBytes, info,
                                     inWidth, inHeight);
    }
    if (inQuality >= IR::kBestQuality && !info.linear)
    {
        IR::ScratchBlock rows(static_cast<std::size_t>(inWidth) * 32);
        if (!rows.Valid())
            return kIR_OutOfMemory;
        float* ra = rows.Floats();
        float* rb = ra + 4 * static_cast<std::size_t>(inWidth);
        const bool premultiplied = info.alpha == Alpha::kPremultiplied;
        const IR::RowReader readerA(inSrcA, inSrcARowBytes, inFormat, inWidth, inHeight, true,
                                    premultiplied);
        const IR::RowReader readerB(inSrcB, inSrcBRowBytes, inFormat, inWidth, inHeight, true,
                                    premultiplied);
        const IR::RowWriter writer(outDst, inDstRowBytes, inFormat, inWidth, inHeight, true,
                                   premultiplied);
        for (std::int32_t y = 0; y < inHeight; ++y)
        {
            readerA.Read(y, ra);
            readerB.Read(y, rb);
            IR::Kernels::CrossDissolveRowF(ra, rb, ra, inWidth * 4, inWeight);
            writer.Write(y, ra);
        }
        return kIR_NoError;
    }
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        if (info.isFloat)
            IR::Kernels::CrossDissolveRowF(
                reinterpret_cast<const float*>(a.Row(y)), reinterpret_cast<const float*>(b.Row(y)),
                reinterpret_cast<float*>(d.Row(y)), inWidth * 4, inWeight);
        else
            IR::Kernels::CrossDissolveRow8(a.Row(y), b.Row(y), d.Row(y), inWidth * 4, inWeight);
    }
    return kIR_NoError;
}

std::int32_t IR_Accumulate(const void* const* inSrcs, const std::int32_t* inSrcRowBytes,
                           const double* inWeights, std::int32_t inCount, void* outDst,
                           std::int32_t inDstRowBytes, IR_PixelFormat inFormat,
                           std::int32_t inWidth, std::int32_t inHeight, std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    MVX_INPUT_CONTRACT(inCount >= 1);
    MVX_INPUT_CONTRACT(inSrcs != nullptr && inSrcRowBytes != nullptr && inWeights != nullptr);
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        IR::RequireBuffer(inSrcs[i], inSrcRowBytes[i], inFormat, inWidth, inHeight);
        MVX_INPUT_CONTRACT(std::isfinite(inWeights[i]));
    }
    IR::RequireBuffer(outDst, inDstRowBytes, inFormat, inWidth, inHeight);
    IR::RequireQuality(inQuality);
    if (info.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    const std::int32_t values = inWidth * 4;
    const bool viaLinear = inQuality >= IR::kBestQuality && !info.linear;
    if (viaLinear && !info.isFloat)
        return IR::AccumulateLinear8(inSrcs, inSrcRowBytes, inWeights, inCount, outDst,
                                     inDstRowBytes, info, inWidth, inHeight);
    IR::ScratchBlock rows(static_cast<std::size_t>(values) * 8);
    if (!rows.Valid())
        return kIR_OutOfMemory;
    float* acc = rows.Floats();
    float* temp = acc + values;
    std::vector<View> views;
    std::vector<IR::RowReader> readers;
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        views.push_back(IR::MakeView(inSrcs[i], inSrcRowBytes[i], info, inHeight));
        if (viaLinear)
            readers.emplace_back(inSrcs[i], inSrcRowBytes[i], inFormat, inWidth, inHeight, true,
                                 info.alpha == Alpha::kPremultiplied);
    }
    const View dst = IR::MakeView(outDst, inDstRowBytes, info, inHeight);
    const IR::RowWriter writer(outDst, inDstRowBytes, inFormat, inWidth, inHeight, true,
                               info.alpha == Alpha::kPremultiplied);
    // 8-bit sums are kept in code units so that the final store only rounds.
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        std::fill(acc, acc + values, 0.0f);
        for (std::int32_t i = 0; i < inCount; ++i)
        {
            const float w = static_cast<float>(inWeights[i]);
            if (viaLinear)
            {
                readers[i].Read(y, temp);
                IR::Kernels::AccumulateRowF(temp, acc, values, w);
            }
            else if (info.isFloat)
                IR::Kernels::AccumulateRowF(reinterpret_cast<const float*>(views[i].Row(y)), acc,
                                            values, w);
            else
                IR::Kernels::AccumulateRow8(views[i].Row(y), acc, values, w);
        }
        if (viaLinear)
        {
            for (std::int32_t x = 3; x < values; x += 4)
                acc[x] = std::clamp(acc[x], 0.0f, 1.0f);
            writer.Write(y, acc);
        }
        else if (info.isFloat)
        {
            for (std::int32_t x = 3; x < values; x += 4)
                acc[x] = std::clamp(acc[x], 0.0f, 1.0f);
            std::memcpy(dst.Row(y), acc, static_cast<std::size_t>(values) * 4);
        }
        else
        {
            IR::Kernels::StoreRow8(acc, dst.Row(y), values);
        }
    }
    return kIR_NoError;
}

// ---------------------------------------------------------------------------
// Conversion

namespace
{

// Conversions with a dedicated kernel; false when the general pipeline must run.
bool ConvertFast(const View& inSrc, const FormatInfo& inS, IR_PixelFormat inSrcFormat,
                 const void* inSrcBase, std::int32_t inSrcRowBytes, const View& inDst,
                 const FormatInfo& inD, std::int32_t inWidth, std::int32_t inHeight)
{
    if (inS.layout == Layout::kYUV420 && inD.layout == Layout::kBGRA && !inD.isFloat)
    {
        const auto* base = static_cast<const std::uint8_t*>(inSrcBase);
        const std::ptrdiff_t chromaStep = inSrcRowBytes / 2;
        const std::uint8_t* u = base + static_cast<std::ptrdiff_t>(inSrcRowBytes) * inHeight;
        const std::uint8_t* v = u + chromaStep * ((inHeight + 1) / 2);
        const bool m601 = IR::UsesBT601(inSrcFormat, inHeight);
        for (std::int32_t y = 0; y < inHeight; ++y)
            IR::Kernels::YUV420ToBGRARow8(inSrc.Row(y), u + (y / 2) * chromaStep,
                                          v + (y / 2) * chromaStep, inDst.Row(y), inWidth, m601);
        return true;
    }
    if (inS.layout != Layout::kBGRA || inD.layout != Layout::kBGRA || inS.linear != inD.linear)
        return false;
    const std::int32_t values = inWidth * 4;
    if (inS.alpha == inD.alpha && inS.isFloat != inD.isFloat)
    {
        for (std::int32_t y = 0; y < inHeight; ++y)
        {
            if (inS.isFloat)
                IR::Kernels::RowFTo8(reinterpret_cast<const float*>(inSrc.Row(y)), inDst.Row(y),
                                     values);
            else
                IR::Kernels::Row8ToF(inSrc.Row(y), reinterpret_cast<float*>(inDst.Row(y)), values);
        }
        return true;
    }
    if (!inS.isFloat && !inD.isFloat)
    {
        for (std::int32_t y = 0; y < inHeight; ++y)
        {
            if (inS.alpha == inD.alpha)
                std::memmove(inDst.Row(y), inSrc.Row(y), static_cast<std::size_t>(values));
            else if (inS.alpha == Alpha::kPremultiplied)
                IR::Kernels::PremultipliedToStraightRow8(inSrc.Row(y), inDst.Row(y), inWidth);
            else
                IR::Kernels::StraightToPremultipliedRow8(inSrc.Row(y), inDst.Row(y), inWidth);
        }
        return true;
    }
    return false;
}

} // namespace

std::int32_t IR_Convert(const void* inSrc, std::int32_t inSrcRowBytes, IR_PixelFormat inSrcFormat,
                        void* outDst, std::int32_t inDstRowBytes, IR_PixelFormat inDstFormat,
                        std::int32_t inWidth, std::int32_t inHeight, std::int32_t inQuality)
{
    const FormatInfo s = IR::RequireFormat(inSrcFormat);
    const FormatInfo d = IR::RequireFormat(inDstFormat);
    IR::RequireBuffer(inSrc, inSrcRowBytes, inSrcFormat, inWidth, inHeight);
    IR::RequireBuffer(outDst, inDstRowBytes, inDstFormat, inWidth, inHeight);
    IR::RequireQuality(inQuality);
    // In place works row by row, so rows must keep their size and order.
    MVX_INPUT_CONTRACT(inSrc != outDst ||
                       (s.bytesPerPixel == d.bytesPerPixel && s.bottomLeft == d.bottomLeft &&
                        inSrcRowBytes == inDstRowBytes));
    if (d.layout == Layout::kYUV420)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    const View src = IR::MakeView(inSrc, inSrcRowBytes, s, inHeight);
    const View dst = IR::MakeView(outDst, inDstRowBytes, d, inHeight);
    if (ConvertFast(src, s, inSrcFormat, inSrc, inSrcRowBytes, dst, d, inWidth, inHeight))
        return kIR_NoError;
    IR::ScratchBlock row(static_cast<std::size_t>(inWidth) * 16);
    if (!row.Valid())
        return kIR_OutOfMemory;
    const bool premultiplied = d.alpha == Alpha::kPremultiplied;
    const IR::RowReader reader(inSrc, inSrcRowBytes, inSrcFormat, inWidth, inHeight, d.linear,
                               premultiplied);
    const IR::RowWriter writer(outDst, inDstRowBytes, inDstFormat, inWidth, inHeight, d.linear,
                               premultiplied);
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        reader.Read(y, row.Floats());
        writer.Write(y, row.Floats());
    }
    return kIR_NoError;
}

std::int32_t IR_ConvertYUV420Planes(const std::uint8_t* inY, std::int32_t inYRowBytes,
                                    const std::uint8_t* inU, std::int32_t inURowBytes,
                                    const std::uint8_t* inV, std::int32_t inVRowBytes,
                                    bool inMatrix601, void* outDst, std::int32_t inDstRowBytes,
                                    IR_PixelFormat inDstFormat, std::int32_t inWidth,
                                    std::int32_t inHeight)
{
    const FormatInfo d = IR::RequireFormat(inDstFormat);
    MVX_INPUT_CONTRACT(inY != nullptr && inU != nullptr && inV != nullptr);
    MVX_INPUT_CONTRACT(inWidth >= 0 && inHeight >= 0);
    MVX_INPUT_CONTRACT(inYRowBytes >= inWidth);
    MVX_INPUT_CONTRACT(inURowBytes >= (inWidth + 1) / 2 && inVRowBytes >= (inWidth + 1) / 2);
    IR::RequireBuffer(outDst, inDstRowBytes, inDstFormat, inWidth, inHeight);
    if (d.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    const View dst = IR::MakeView(outDst, inDstRowBytes, d, inHeight);
    if (!d.isFloat)
    {
        for (std::int32_t y = 0; y < inHeight; ++y)
            IR::Kernels::YUV420ToBGRARow8(inY + static_cast<std::ptrdiff_t>(y) * inYRowBytes,
                                          inU + static_cast<std::ptrdiff_t>(y / 2) * inURowBytes,
                                          inV + static_cast<std::ptrdiff_t>(y / 2) * inVRowBytes,
                                          dst.Row(y), inWidth, inMatrix601);
        return kIR_NoError;
    }
    IR::ScratchBlock row(static_cast<std::size_t>(inWidth) * 16);
    if (!row.Valid())
        return kIR_OutOfMemory;
    const IR::YUVCoefficients& k = IR::YUVCoefficientsFor(inMatrix601);
    const IR::RowWriter writer(outDst, inDstRowBytes, inDstFormat, inWidth, inHeight, false, false);
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        float* p = row.Floats();
        for (std::int32_t x = 0; x < inWidth; ++x, p += 4)
        {
            IR::YUVToRGB(k, inY[static_cast<std::ptrdiff_t>(y) * inYRowBytes + x],
                         inU[static_cast<std::ptrdiff_t>(y / 2) * inURowBytes + x / 2],
                         inV[static_cast<std::ptrdiff_t>(y / 2) * inVRowBytes + x / 2], p[2], p[1],
                         p[0]);
            p[3] = 1.0f;
        }
        writer.Write(y, row.Floats());
    }
    return kIR_NoError;
}

// ---------------------------------------------------------------------------
// Scaling

std::int32_t IR_ScaleConvert(const void* inSrc, std::int32_t inSrcRowBytes,
                             IR_PixelFormat inSrcFormat, std::int32_t inSrcWidth,
                             std::int32_t inSrcHeight, void* outDst, std::int32_t inDstRowBytes,
                             IR_PixelFormat inDstFormat, std::int32_t inDstWidth,
                             std::int32_t inDstHeight, std::int32_t inQuality)
{
    IR::RequireFormat(inSrcFormat);
    const FormatInfo d = IR::RequireFormat(inDstFormat);
    IR::RequireBuffer(inSrc, inSrcRowBytes, inSrcFormat, inSrcWidth, inSrcHeight);
    IR::RequireBuffer(outDst, inDstRowBytes, inDstFormat, inDstWidth, inDstHeight);
    IR::RequireQuality(inQuality);
    MVX_INPUT_CONTRACT(inSrc != outDst);
    if (d.layout == Layout::kYUV420)
        return kIR_UnsupportedFormat;
    if (inDstWidth == 0 || inDstHeight == 0)
        return kIR_NoError;
    if (inSrcWidth == 0 || inSrcHeight == 0)
        return kIR_UnsupportedFormat;
    if (inSrcWidth == inDstWidth && inSrcHeight == inDstHeight)
        return IR_Convert(inSrc, inSrcRowBytes, inSrcFormat, outDst, inDstRowBytes, inDstFormat,
                          inDstWidth, inDstHeight, inQuality);
    std::int32_t status = kIR_NoError;
    if (IR::ScaleConvertBGRA(inSrc, inSrcRowBytes, inSrcFormat, inSrcWidth, inSrcHeight, outDst,
                             inDstRowBytes, inDstFormat, inDstWidth, inDstHeight, inQuality,
                             status))
        return status;
    const IR::Taps hTaps = IR::MakeTaps(inSrcWidth, inDstWidth, inQuality);
    const IR::Taps vTaps = IR::MakeTaps(inSrcHeight, inDstHeight, inQuality);
    // Ring of horizontally filtered source rows; vertical taps only move forward.
    const std::int32_t ringSize = vTaps.maxCount + 1;
    const std::size_t srcFloats = static_cast<std::size_t>(inSrcWidth) * 4;
    const std::size_t dstFloats = static_cast<std::size_t>(inDstWidth) * 4;
    IR::ScratchBlock scratch((srcFloats + dstFloats * (ringSize + 1)) * 4);
    if (!scratch.Valid())
        return kIR_OutOfMemory;
    float* srcRow = scratch.Floats();
    float* ring = srcRow + srcFloats;
    float* out = ring + dstFloats * ringSize;
    std::vector<std::int32_t> ringTag(ringSize, -1);
    const IR::RowReader reader(inSrc, inSrcRowBytes, inSrcFormat, inSrcWidth, inSrcHeight, d.linear,
                               true);
    const IR::RowWriter writer(outDst, inDstRowBytes, inDstFormat, inDstWidth, inDstHeight,
                               d.linear, true);
    auto filtered = [&](std::int32_t inRow) -> const float*
    {
        float* slot = ring + dstFloats * (inRow % ringSize);
        if (ringTag[inRow % ringSize] == inRow)
            return slot;
        reader.Read(inRow, srcRow);
        for (std::int32_t x = 0; x < inDstWidth; ++x)
        {
            const float* w = &hTaps.weights[static_cast<std::size_t>(x) * hTaps.maxCount];
            const float* s = srcRow + 4 * static_cast<std::size_t>(hTaps.first[x]);
            float acc[4] = {0.0f, 0.0f, 0.0f, 0.0f};
            for (std::int32_t t = 0; t < hTaps.count[x]; ++t)
                for (int c = 0; c < 4; ++c)
                    acc[c] += w[t] * s[4 * t + c];
            std::memcpy(slot + 4 * x, acc, 16);
        }
        ringTag[inRow % ringSize] = inRow;
        return slot;
    };
    for (std::int32_t y = 0; y < inDstHeight; ++y)
    {
        std::fill(out, out + dstFloats, 0.0f);
        const float* w = &vTaps.weights[static_cast<std::size_t>(y) * vTaps.maxCount];
        for (std::int32_t t = 0; t < vTaps.count[y]; ++t)
        {
            const float* row = filtered(vTaps.first[y] + t);
            for (std::size_t i = 0; i < dstFloats; ++i)
                out[i] += w[t] * row[i];
        }
        writer.Write(y, out);
    }
    return kIR_NoError;
}

// ---------------------------------------------------------------------------
// Fields

namespace
{

bool IsInterleaved(const FormatInfo& inInfo)
{
    return inInfo.layout != Layout::kYUV420;
}

// dst = average of two rows of the format's components (8-bit rounded up at .5).
void AverageRows(const std::uint8_t* inA, const std::uint8_t* inB, std::uint8_t* outDst,
                 std::size_t inBytes, bool inFloat)
{
    if (inFloat)
        IR::Simd::AverageRowsF(reinterpret_cast<const float*>(inA),
                               reinterpret_cast<const float*>(inB),
                               reinterpret_cast<float*>(outDst), inBytes / 4);
    else
        IR::Simd::AverageRows8(inA, inB, outDst, inBytes);
}

} // namespace

std::int32_t IR_Deinterlace(void* ioBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                            std::int32_t inWidth, std::int32_t inHeight, bool inKeepSecond,
                            std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(ioBase, inRowBytes, inFormat, inWidth, inHeight);
    IR::RequireQuality(inQuality);
    if (!IsInterleaved(info))
        return kIR_UnsupportedFormat;
    const View view = IR::MakeView(ioBase, inRowBytes, info, inHeight);
    const std::size_t bytes = RowBytesOf(inFormat, inWidth);
    const std::int32_t kept = inKeepSecond ? 1 : 0;
    for (std::int32_t y = 1 - kept; y < inHeight; y += 2)
    {
        const bool hasAbove = y - 1 >= 0;
        const bool hasBelow = y + 1 < inHeight;
        if (!hasAbove && !hasBelow)
            continue;
        if (inQuality >= IR::kBilinearQuality && hasAbove && hasBelow)
            AverageRows(view.Row(y - 1), view.Row(y + 1), view.Row(y), bytes, info.isFloat);
        else
            std::memcpy(view.Row(y), view.Row(hasAbove ? y - 1 : y + 1), bytes);
    }
    return kIR_NoError;
}

std::int32_t IR_DeinterlaceCopy(const void* inSrc, std::int32_t inSrcRowBytes,
                                std::int32_t inSrcHeight, void* outDst, std::int32_t inDstRowBytes,
                                std::int32_t inDstHeight, IR_PixelFormat inFormat,
                                std::int32_t inWidth, bool inKeepSecond, std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(inSrc, inSrcRowBytes, inFormat, inWidth, inSrcHeight);
    IR::RequireBuffer(outDst, inDstRowBytes, inFormat, inWidth, inDstHeight);
    MVX_INPUT_CONTRACT(inSrcHeight == 2 * inDstHeight || inSrcHeight == 4 * inDstHeight);
    IR::RequireQuality(inQuality);
    MVX_INPUT_CONTRACT(inSrc != outDst);
    if (!IsInterleaved(info))
        return kIR_UnsupportedFormat;
    const View src = IR::MakeView(inSrc, inSrcRowBytes, info, inSrcHeight);
    const View dst = IR::MakeView(outDst, inDstRowBytes, info, inDstHeight);
    const std::size_t bytes = RowBytesOf(inFormat, inWidth);
    const std::int32_t field = inKeepSecond ? 1 : 0;
    const bool quarter = inSrcHeight == 4 * inDstHeight;
    for (std::int32_t y = 0; y < inDstHeight; ++y)
    {
        if (!quarter)
            std::memcpy(dst.Row(y), src.Row(2 * y + field), bytes);
        else if (inQuality >= IR::kBilinearQuality)
            AverageRows(src.Row(4 * y + field), src.Row(4 * y + 2 + field), dst.Row(y), bytes,
                        info.isFloat);
        else
            std::memcpy(dst.Row(y), src.Row(4 * y + field), bytes);
    }
    return kIR_NoError;
}

// ---------------------------------------------------------------------------
// Fill and matte

std::int32_t IR_FillWithColor(void* outBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                              std::int32_t inWidth, std::int32_t inHeight, std::uint32_t inColor,
                              std::int32_t inQuality)
{
    const FormatInfo info = IR::RequireFormat(inFormat);
    IR::RequireBuffer(outBase, inRowBytes, inFormat, inWidth, inHeight);
    IR::RequireQuality(inQuality);
    if (!IsInterleaved(info))
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    IR::ScratchBlock row(static_cast<std::size_t>(inWidth) * 16);
    if (!row.Valid())
        return kIR_OutOfMemory;
    float* p = row.Floats();
    const float b = (inColor & 0xFF) / 255.0f;
    const float g = ((inColor >> 8) & 0xFF) / 255.0f;
    const float r = ((inColor >> 16) & 0xFF) / 255.0f;
    const float a = (inColor >> 24) / 255.0f;
    for (std::int32_t x = 0; x < inWidth; ++x)
    {
        p[4 * x] = b;
        p[4 * x + 1] = g;
        p[4 * x + 2] = r;
        p[4 * x + 3] = a;
    }
    const IR::RowWriter writer(outBase, inRowBytes, inFormat, inWidth, inHeight, false, false);
    writer.Write(0, p);
    // Every row equals the first: copy it rather than convert again.
    const View view = IR::MakeView(outBase, inRowBytes, info, inHeight);
    const std::size_t bytes = RowBytesOf(inFormat, inWidth);
    for (std::int32_t y = 1; y < inHeight; ++y)
        std::memcpy(view.Row(y), view.Row(0), bytes);
    return kIR_NoError;
}

std::int32_t IR_UnPremultiplyAgainstMatteColor(const void* inSrc, std::int32_t inSrcRowBytes,
                                               void* outDst, std::int32_t inDstRowBytes,
                                               IR_PixelFormat inFormat, std::int32_t inWidth,
                                               std::int32_t inHeight, std::uint32_t inMatteColor,
                                               std::uint32_t inOutputAlpha, std::int32_t inQuality)
{
    MVX_INPUT_CONTRACT(inOutputAlpha == kIR_FormatBit_StraightAlpha ||
                       inOutputAlpha == kIR_FormatBit_PremultipliedAlpha);
    const IR_PixelFormat alphaBits = kIR_FormatBit_StraightAlpha | kIR_FormatBit_PremultipliedAlpha;
    // The stored values are read as they are: the source word with the straight bit.
    const IR_PixelFormat rawFormat = (inFormat & ~alphaBits) | kIR_FormatBit_StraightAlpha;
    const IR_PixelFormat outFormat = (inFormat & ~alphaBits) | inOutputAlpha;
    const FormatInfo info = IR::RequireFormat(rawFormat);
    IR::RequireBuffer(inSrc, inSrcRowBytes, rawFormat, inWidth, inHeight);
    IR::RequireBuffer(outDst, inDstRowBytes, outFormat, inWidth, inHeight);
    IR::RequireQuality(inQuality);
    if (info.layout != Layout::kBGRA)
        return kIR_UnsupportedFormat;
    if (inWidth == 0 || inHeight == 0)
        return kIR_NoError;
    IR::ScratchBlock row(static_cast<std::size_t>(inWidth) * 16);
    if (!row.Valid())
        return kIR_OutOfMemory;
    float matte[3] = {(inMatteColor & 0xFF) / 255.0f, ((inMatteColor >> 8) & 0xFF) / 255.0f,
                      ((inMatteColor >> 16) & 0xFF) / 255.0f};
    if (info.linear)
        for (float& m : matte)
            m = IR::ToLinear(m);
    const bool premultipliedOut = inOutputAlpha == kIR_FormatBit_PremultipliedAlpha;
    const IR::RowReader reader(inSrc, inSrcRowBytes, rawFormat, inWidth, inHeight, info.linear,
                               false);
    const IR::RowWriter writer(outDst, inDstRowBytes, outFormat, inWidth, inHeight, info.linear,
                               premultipliedOut);
    for (std::int32_t y = 0; y < inHeight; ++y)
    {
        float* p = row.Floats();
        reader.Read(y, p);
        for (std::int32_t x = 0; x < inWidth; ++x, p += 4)
        {
            const float a = p[3];
            for (int c = 0; c < 3; ++c)
            {
                const float straight =
                    a > 0.0f ? std::clamp((p[c] - (1.0f - a) * matte[c]) / a, 0.0f, 1.0f) : 0.0f;
                p[c] = premultipliedOut ? straight * a : straight;
            }
        }
        writer.Write(y, row.Floats());
    }
    return kIR_NoError;
}
