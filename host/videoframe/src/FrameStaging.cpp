#include "FrameStaging.h"

#include "VF/PixelFormatConversions.h"
#include "VF/VideoFrameManipulators.h"
#include "mvxcore/debug/Contract.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>

namespace VF
{

namespace mt = mvxmediatypes;

IR_PixelFormat BEPixelFormatToIRPixelFormat(mt::PixelFormat inFormat)
{
    if (inFormat == mt::kPixelFormat_BGRA_4444_8u)
        return kIR_PixelFormat_BGRA_8u;
    if (inFormat == mt::kPixelFormat_BGRA_4444_32f)
        return kIR_PixelFormat_BGRA_32f;
    if (inFormat == mt::kPixelFormat_BGRP_4444_32f_Linear)
        return kIR_PixelFormat_BGRP_32f_Linear;
    if (inFormat == mt::kPixelFormat_VUYA_4444_8u)
        return kIR_PixelFormat_VUYA_4444_8u;
    if (inFormat == mt::kPixelFormat_YUYV_422_8u)
        return kIR_PixelFormat_YUYV_422_8u;
    return kIR_PixelFormat_Invalid;
}

IRFrameBuffer GetIRFrameBuffer(const MF::IVideoFrame& inFrame)
{
    const QRT::ParamRect bounds = inFrame.GetBounds();
    return IRFrameBuffer{inFrame.GetBaseAddress(), inFrame.GetRowBytes(),
                         BEPixelFormatToIRPixelFormat(inFrame.GetPixelFormat()), bounds.Width(),
                         bounds.Height()};
}

IRWritableFrameBuffer GetWritableIRFrameBuffer(MF::IVideoFrame& inFrame)
{
    MVX_INPUT_CONTRACT(!inFrame.IsShared());
    const QRT::ParamRect bounds = inFrame.GetBounds();
    return IRWritableFrameBuffer{inFrame.GetWritableBaseAddress(), inFrame.GetRowBytes(),
                                 BEPixelFormatToIRPixelFormat(inFrame.GetPixelFormat()),
                                 bounds.Width(), bounds.Height()};
}

namespace detail
{

StagingPlan GetStagingPlan(mt::PixelFormat inFormat, int32_t inWidth, int32_t inHeight)
{
    StagingPlan plan;
    plan.mWidth = inWidth;
    plan.mHeight = inHeight;
    const IR_PixelFormat direct = BEPixelFormatToIRPixelFormat(inFormat);
    if (direct != kIR_PixelFormat_Invalid)
    {
        plan.mKind = StagingKind::kDirect;
        plan.mFormat = direct;
    }
    else if (inFormat == mt::kPixelFormat_BGRA_4444_16u ||
             inFormat == mt::kPixelFormat_BGRA_4444_16f)
    {
        plan.mKind = StagingKind::kSixteenBit;
        plan.mFormat = kIR_PixelFormat_BGRA_32f;
    }
    else if (inFormat == mt::kPixelFormat_VUYA_4444_32f)
    {
        plan.mKind = StagingKind::kVUYAFloat;
        plan.mFormat = kIR_PixelFormat_BGRA_32f;
    }
    else if (inFormat == mt::kPixelFormat_YUYV_422_8u_Fields ||
             inFormat == mt::kPixelFormat_YUYV_422_8u_HalfWidthFields)
    {
        plan.mKind = StagingKind::kFieldsApart;
        plan.mFormat = kIR_PixelFormat_YUYV_422_8u;
        if (inFormat.IsHorizontallyHalved())
            plan.mWidth = inWidth * 2;
    }
    return plan;
}

int32_t MemoryRowOfPictureRow(mt::PixelFormat inFormat, int32_t inHeight, int32_t inRow)
{
    if (!inFormat.IsFieldByField())
        return inRow;
    const uint32_t layout = inFormat.GetFieldLayout();
    const bool upperFirst = layout == mt::kPixelFieldLayout_FieldsUpperFirst ||
                            layout == mt::kPixelFieldLayout_HalfWidthFieldsUpperFirst;
    // The stored-first field holds picture rows 0, 2, 4 (upper) or 1, 3, 5
    // (lower); the other field follows it.
    const bool even = (inRow & 1) == 0;
    if (upperFirst)
        return even ? inRow / 2 : (inHeight + 1) / 2 + inRow / 2;
    return even ? inHeight / 2 + inRow / 2 : inRow / 2;
}

size_t ActiveRowBytes(mt::PixelFormat inFormat, int32_t inWidth)
{
    if (!inFormat.IsRaster() || inWidth < 0)
        return 0;
    const size_t width = static_cast<size_t>(inWidth);
    switch (inFormat.GetChroma())
    {
    case mt::kPixelChroma_444:
        return width * inFormat.GetBytesPerPixel();
    case mt::kPixelChroma_422:
        return (width + (width & 1)) * inFormat.GetBytesPerPixel();
    case mt::kPixelChroma_422Pairs:
        return width * 2 * inFormat.GetBytesPerPixel();
    default:
        return 0;
    }
}

float HalfToFloat(uint16_t inHalf)
{
    const uint32_t sign = uint32_t{inHalf & 0x8000u} << 16;
    const uint32_t exponent = (inHalf >> 10) & 0x1F;
    const uint32_t mantissa = inHalf & 0x3FF;
    if (exponent == 0)
    {
        // Zero or subnormal: mantissa * 2^-24.
        const float value = std::ldexp(static_cast<float>(mantissa), -24);
        return sign ? -value : value;
    }
    if (exponent == 31)
        return std::bit_cast<float>(sign | 0x7F800000u | (mantissa << 13));
    return std::bit_cast<float>(sign | ((exponent + 112) << 23) | (mantissa << 13));
}

uint16_t FloatToHalf(float inValue)
{
    const uint32_t bits = std::bit_cast<uint32_t>(inValue);
    const uint16_t sign = static_cast<uint16_t>((bits >> 16) & 0x8000u);
    const uint32_t magnitude = bits & 0x7FFFFFFFu;
    if (magnitude >= 0x7F800000u)
        return static_cast<uint16_t>(sign | 0x7C00u | (magnitude > 0x7F800000u ? 0x200u : 0u));
    // 65520 and above round to infinity.
    if (magnitude >= 0x477FF000u)
        return static_cast<uint16_t>(sign | 0x7C00u);
    if (magnitude < 0x38800000u)
    {
        // Subnormal half: round magnitude / 2^-24 to nearest even.
        const float scaled = std::bit_cast<float>(magnitude) * 16777216.0f;
        return static_cast<uint16_t>(sign | static_cast<uint16_t>(std::nearbyint(scaled)));
    }
    // Normal: rebias the exponent and round the 13 dropped mantissa bits to
    // nearest even; a carry into the exponent is the correct result.
    const uint32_t rebased = magnitude - (112u << 23);
    const uint32_t rounded = rebased + 0xFFFu + ((rebased >> 13) & 1u);
    return static_cast<uint16_t>(sign | (rounded >> 13));
}

namespace
{

struct YCbCrMatrix
{
    float mKr;
    float mKb;
};

YCbCrMatrix MatrixForHeight(int32_t inHeight)
{
    return inHeight >= kMatrix709MinimumRows ? YCbCrMatrix{0.2126f, 0.0722f}
                                             : YCbCrMatrix{0.299f, 0.114f};
}

void UnpackRow(const StagingPlan& inPlan, mt::PixelFormat inFormat, const std::byte* inSrc,
               float* outDst, int32_t inHeight)
{
    const int32_t width = inPlan.mWidth;
    if (inPlan.mKind == StagingKind::kSixteenBit)
    {
        const bool half = inFormat == mt::kPixelFormat_BGRA_4444_16f;
        for (int32_t i = 0; i < width * 4; ++i)
        {
            uint16_t value;
            std::memcpy(&value, inSrc + 2 * i, 2);
            outDst[i] = half ? HalfToFloat(value) : value * (1.0f / 65535.0f);
        }
        return;
    }
    // Float V, U, Y, A into B, G, R, A.
    const YCbCrMatrix m = MatrixForHeight(inHeight);
    const float kg = 1.0f - m.mKr - m.mKb;
    for (int32_t x = 0; x < width; ++x)
    {
        float vuya[4];
        std::memcpy(vuya, inSrc + 16 * x, 16);
        const float r = vuya[2] + 2.0f * (1.0f - m.mKr) * vuya[0];
        const float b = vuya[2] + 2.0f * (1.0f - m.mKb) * vuya[1];
        const float g = (vuya[2] - m.mKr * r - m.mKb * b) / kg;
        outDst[4 * x + 0] = b;
        outDst[4 * x + 1] = g;
        outDst[4 * x + 2] = r;
        outDst[4 * x + 3] = vuya[3];
    }
}

void PackRow(const StagingPlan& inPlan, mt::PixelFormat inFormat, const float* inSrc,
             std::byte* outDst, int32_t inHeight)
{
    const int32_t width = inPlan.mWidth;
    if (inPlan.mKind == StagingKind::kSixteenBit)
    {
        const bool half = inFormat == mt::kPixelFormat_BGRA_4444_16f;
        for (int32_t i = 0; i < width * 4; ++i)
        {
            const uint16_t value =
                half ? FloatToHalf(inSrc[i])
                     : static_cast<uint16_t>(std::clamp(inSrc[i], 0.0f, 1.0f) * 65535.0f + 0.5f);
            std::memcpy(outDst + 2 * i, &value, 2);
        }
        return;
    }
    const YCbCrMatrix m = MatrixForHeight(inHeight);
    const float kg = 1.0f - m.mKr - m.mKb;
    for (int32_t x = 0; x < width; ++x)
    {
        const float b = inSrc[4 * x + 0];
        const float g = inSrc[4 * x + 1];
        const float r = inSrc[4 * x + 2];
        const float y = m.mKr * r + kg * g + m.mKb * b;
        const float vuya[4] = {(r - y) / (2.0f * (1.0f - m.mKr)), (b - y) / (2.0f * (1.0f - m.mKb)),
                               y, inSrc[4 * x + 3]};
        std::memcpy(outDst + 16 * x, vuya, 16);
    }
}

} // namespace

StagedImage::~StagedImage()
{
    IR_FreeTransientMemoryBlock(mBlock);
}

QRT::Result StagedImage::Open(const MF::IVideoFrame& inFrame, bool inUnpack)
{
    MVX_INPUT_CONTRACT(mBase == nullptr);
    const QRT::ParamRect bounds = inFrame.GetBounds();
    const mt::PixelFormat format = inFrame.GetPixelFormat();
    mPlan = GetStagingPlan(format, bounds.Width(), bounds.Height());
    if (mPlan.mKind == StagingKind::kUnsupported || inFrame.GetPlaneCount() != 1)
        return kResult_UnsupportedPixelFormat;
    if (mPlan.mKind == StagingKind::kDirect)
    {
        mBase = const_cast<void*>(inFrame.GetBaseAddress());
        mRowBytes = inFrame.GetRowBytes();
        return QRT::kResult_Success;
    }
    const int64_t minimum = IR_MinimumRowBytes(mPlan.mFormat, mPlan.mWidth);
    mRowBytes = static_cast<int32_t>((minimum + 63) / 64 * 64);
    mBlock = IR_AllocateTransientMemoryBlock(static_cast<size_t>(mRowBytes) *
                                             static_cast<size_t>(std::max(1, mPlan.mHeight)));
    if (mBlock == nullptr)
        return kIR_OutOfMemory;
    mBase = mBlock;
    if (!inUnpack)
        return QRT::kResult_Success;
    const auto* frameBase = static_cast<const std::byte*>(inFrame.GetBaseAddress());
    const size_t frameRowBytes = static_cast<size_t>(inFrame.GetRowBytes());
    for (int32_t y = 0; y < mPlan.mHeight; ++y)
    {
        auto* row = static_cast<std::byte*>(mBlock) + static_cast<size_t>(y) * mRowBytes;
        if (mPlan.mKind == StagingKind::kFieldsApart)
        {
            const int32_t memoryRow = MemoryRowOfPictureRow(format, mPlan.mHeight, y);
            std::memcpy(row, frameBase + memoryRow * frameRowBytes, static_cast<size_t>(minimum));
        }
        else
        {
            UnpackRow(mPlan, format, frameBase + y * frameRowBytes, reinterpret_cast<float*>(row),
                      mPlan.mHeight);
        }
    }
    return QRT::kResult_Success;
}

QRT::Result StagedImage::OpenForReading(const MF::IVideoFrame& inFrame)
{
    return Open(inFrame, true);
}

QRT::Result StagedImage::OpenForWriting(MF::IVideoFrame& inFrame, bool inKeepContent)
{
    MVX_INPUT_CONTRACT(!inFrame.IsShared());
    const QRT::Result status = Open(inFrame, inKeepContent);
    if (QRT::Succeeded(status))
    {
        mWriteFrame = &inFrame;
        if (!IsStaged())
            mBase = inFrame.GetWritableBaseAddress();
    }
    return status;
}

void StagedImage::Commit()
{
    MVX_INPUT_CONTRACT(mWriteFrame != nullptr);
    if (!IsStaged())
        return;
    const mt::PixelFormat format = mWriteFrame->GetPixelFormat();
    auto* frameBase = static_cast<std::byte*>(mWriteFrame->GetWritableBaseAddress());
    const size_t frameRowBytes = static_cast<size_t>(mWriteFrame->GetRowBytes());
    const size_t pictureRowBytes =
        static_cast<size_t>(IR_MinimumRowBytes(mPlan.mFormat, mPlan.mWidth));
    for (int32_t y = 0; y < mPlan.mHeight; ++y)
    {
        const auto* row =
            static_cast<const std::byte*>(mBlock) + static_cast<size_t>(y) * mRowBytes;
        if (mPlan.mKind == StagingKind::kFieldsApart)
        {
            const int32_t memoryRow = MemoryRowOfPictureRow(format, mPlan.mHeight, y);
            std::memcpy(frameBase + memoryRow * frameRowBytes, row, pictureRowBytes);
        }
        else
        {
            PackRow(mPlan, format, reinterpret_cast<const float*>(row),
                    frameBase + y * frameRowBytes, mPlan.mHeight);
        }
    }
}

} // namespace detail
} // namespace VF
