#include "Formats.h"

#include "YUV.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <vector>

namespace IR
{

bool DescribeFormat(IR_PixelFormat inFormat, FormatInfo& outInfo)
{
    constexpr IR_PixelFormat kKnownBits =
        kIR_FormatBit_Float | kIR_FormatBit_Linear | kIR_FormatBit_StraightAlpha |
        kIR_FormatBit_PremultipliedAlpha | kIR_FormatBit_BottomLeft | kIR_FormatMask_Layout |
        kIR_FormatBit_BT601 | kIR_FormatBit_BT709;
    if ((inFormat & ~kKnownBits) != 0)
        return false;
    const bool straight = (inFormat & kIR_FormatBit_StraightAlpha) != 0;
    const bool premultiplied = (inFormat & kIR_FormatBit_PremultipliedAlpha) != 0;
    if (straight && premultiplied)
        return false;
    if ((inFormat & kIR_FormatBit_BT601) && (inFormat & kIR_FormatBit_BT709))
        return false;
    FormatInfo info;
    info.isFloat = (inFormat & kIR_FormatBit_Float) != 0;
    info.linear = (inFormat & kIR_FormatBit_Linear) != 0;
    info.bottomLeft = (inFormat & kIR_FormatBit_BottomLeft) != 0;
    info.alpha =
        straight ? Alpha::kStraight : (premultiplied ? Alpha::kPremultiplied : Alpha::kNone);
    const IR_PixelFormat layout = inFormat & kIR_FormatMask_Layout;
    const bool matrixBits = (inFormat & (kIR_FormatBit_BT601 | kIR_FormatBit_BT709)) != 0;
    if (layout == kIR_FormatLayout_BGRA)
    {
        if (info.alpha == Alpha::kNone || matrixBits || (info.linear && !info.isFloat))
            return false;
        info.layout = Layout::kBGRA;
        info.bytesPerPixel = info.isFloat ? 16 : 4;
    }
    else
    {
        if (info.isFloat || info.linear || info.bottomLeft || premultiplied)
            return false;
        if (layout == kIR_FormatLayout_VUYA)
        {
            if (!straight)
                return false;
            info.layout = Layout::kVUYA;
            info.bytesPerPixel = 4;
        }
        else if (layout == kIR_FormatLayout_YUYV || layout == kIR_FormatLayout_YUV420Planar)
        {
            if (straight)
                return false;
            info.layout = layout == kIR_FormatLayout_YUYV ? Layout::kYUYV : Layout::kYUV420;
            info.bytesPerPixel = layout == kIR_FormatLayout_YUYV ? 2 : 1;
        }
        else
        {
            return false;
        }
    }
    outInfo = info;
    return true;
}

bool UsesBT601(IR_PixelFormat inFormat, std::int32_t inHeight)
{
    if (inFormat & kIR_FormatBit_BT601)
        return true;
    if (inFormat & kIR_FormatBit_BT709)
        return false;
    return inHeight < 720;
}

View MakeView(const void* inBase, std::int32_t inRowBytes, const FormatInfo& inInfo,
              std::int32_t inHeight)
{
    View view;
    view.base = static_cast<std::uint8_t*>(const_cast<void*>(inBase));
    view.step = inRowBytes;
    if (inInfo.bottomLeft && inHeight > 0)
    {
        view.base += static_cast<std::ptrdiff_t>(inHeight - 1) * inRowBytes;
        view.step = -static_cast<std::ptrdiff_t>(inRowBytes);
    }
    return view;
}

namespace
{

double ExactToLinear(double inC)
{
    return inC <= 0.04045 ? inC / 12.92 : std::pow((inC + 0.055) / 1.055, 2.4);
}

double ExactToEncoded(double inL)
{
    return inL <= 0.0031308 ? inL * 12.92 : 1.055 * std::pow(inL, 1.0 / 2.4) - 0.055;
}

constexpr int kTableSize = 4096;

// Tables built once on first use (function-local statics are thread-safe).
struct TransferTables
{
    float toLinear[kTableSize + 2];
    float toEncoded[kTableSize + 2];
    float linear8[256];
    std::vector<std::uint8_t> encoded8;

    TransferTables()
        : encoded8(65536)
    {
        for (int i = 0; i <= kTableSize + 1; ++i)
        {
            const double x = std::min(1.0, static_cast<double>(i) / kTableSize);
            toLinear[i] = static_cast<float>(ExactToLinear(x));
            toEncoded[i] = static_cast<float>(ExactToEncoded(x));
        }
        for (int i = 0; i < 256; ++i)
            linear8[i] = static_cast<float>(ExactToLinear(i / 255.0));
        for (int i = 0; i < 65536; ++i)
        {
            const double e = ExactToEncoded(i / 65535.0) * 255.0;
            encoded8[i] = static_cast<std::uint8_t>(std::clamp(std::lround(e), 0L, 255L));
        }
    }
};

const TransferTables& Tables()
{
    static const TransferTables sTables;
    return sTables;
}

// The exact encoder near zero is steep; interpolating between table entries there
// costs precision, so the first table cell uses the linear segment directly.
inline float Lookup(const float* inTable, float inX)
{
    const float pos = inX * kTableSize;
    const int i = static_cast<int>(pos);
    const float f = pos - static_cast<float>(i);
    return inTable[i] + (inTable[i + 1] - inTable[i]) * f;
}

} // namespace

float ToLinear(float inEncoded)
{
    if (!(inEncoded >= 0.0f && inEncoded <= 1.0f))
        return inEncoded < 0.0f ? -static_cast<float>(ExactToLinear(-inEncoded))
                                : static_cast<float>(ExactToLinear(inEncoded));
    if (inEncoded <= 0.04045f)
        return inEncoded / 12.92f;
    return Lookup(Tables().toLinear, inEncoded);
}

float ToEncoded(float inLinear)
{
    if (!(inLinear >= 0.0f && inLinear <= 1.0f))
        return inLinear < 0.0f ? -static_cast<float>(ExactToEncoded(-inLinear))
                               : static_cast<float>(ExactToEncoded(inLinear));
    if (inLinear <= 0.0031308f)
        return inLinear * 12.92f;
    if (inLinear < 0.05f)
        return static_cast<float>(ExactToEncoded(inLinear));
    return Lookup(Tables().toEncoded, inLinear);
}

const float* ToLinearTable8()
{
    return Tables().linear8;
}

const std::uint8_t* ToEncoded8Table()
{
    return Tables().encoded8.data();
}

ScratchBlock::ScratchBlock(std::size_t inBytes)
    : mBlock(IR_AllocateTransientMemoryBlock(inBytes == 0 ? 64 : inBytes))
{
}

ScratchBlock::~ScratchBlock()
{
    IR_FreeTransientMemoryBlock(mBlock);
}

void PremultiplyRow(float* ioPixels, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        float* p = ioPixels + 4 * i;
        const float a = p[3];
        p[0] *= a;
        p[1] *= a;
        p[2] *= a;
    }
}

void UnpremultiplyRow(float* ioPixels, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        float* p = ioPixels + 4 * i;
        const float a = p[3];
        const float r = a > 0.0f ? 1.0f / a : 0.0f;
        p[0] *= r;
        p[1] *= r;
        p[2] *= r;
    }
}

void LinearizeRow(float* ioPixels, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        float* p = ioPixels + 4 * i;
        p[0] = ToLinear(p[0]);
        p[1] = ToLinear(p[1]);
        p[2] = ToLinear(p[2]);
    }
}

void EncodeRow(float* ioPixels, std::int32_t inCount)
{
    for (std::int32_t i = 0; i < inCount; ++i)
    {
        float* p = ioPixels + 4 * i;
        p[0] = ToEncoded(p[0]);
        p[1] = ToEncoded(p[1]);
        p[2] = ToEncoded(p[2]);
    }
}

// ---------------------------------------------------------------------------
// RowReader

RowReader::RowReader(const void* inBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                     std::int32_t inWidth, std::int32_t inHeight, bool inWantLinear,
                     bool inWantPremultiplied)
    : mWidth(inWidth)
    , mHeight(inHeight)
    , mWantLinear(inWantLinear)
    , mWantPremultiplied(inWantPremultiplied)
{
    DescribeFormat(inFormat, mInfo);
    mView = MakeView(inBase, inRowBytes, mInfo, inHeight);
    mMatrix601 = UsesBT601(inFormat, inHeight);
    if (mInfo.layout == Layout::kYUV420)
    {
        const auto* base = static_cast<const std::uint8_t*>(inBase);
        mChromaStep = inRowBytes / 2;
        mPlaneU = base + static_cast<std::ptrdiff_t>(inRowBytes) * inHeight;
        mPlaneV = mPlaneU + mChromaStep * ((inHeight + 1) / 2);
    }
}

void RowReader::Read(std::int32_t inY, float* outPixels) const
{
    const std::uint8_t* row = mView.Row(inY);
    const std::int32_t n = mWidth;
    bool straightColour = mInfo.alpha != Alpha::kPremultiplied;
    bool linear = mInfo.linear;
    if (mInfo.layout == Layout::kBGRA)
    {
        if (mInfo.isFloat)
        {
            std::memcpy(outPixels, row, static_cast<std::size_t>(n) * 16);
        }
        else if (mWantLinear && straightColour)
        {
            // 8-bit straight colour goes to linear light through the exact code table.
            const float* table = ToLinearTable8();
            for (std::int32_t i = 0; i < 4 * n; i += 4)
            {
                outPixels[i] = table[row[i]];
                outPixels[i + 1] = table[row[i + 1]];
                outPixels[i + 2] = table[row[i + 2]];
                outPixels[i + 3] = row[i + 3] * (1.0f / 255.0f);
            }
            linear = true;
        }
        else
        {
            for (std::int32_t i = 0; i < 4 * n; ++i)
                outPixels[i] = row[i] * (1.0f / 255.0f);
        }
    }
    else
    {
        const YUVCoefficients& k = YUVCoefficientsFor(mMatrix601);
        auto put = [&](std::int32_t inX, int inY8, int inU8, int inV8, float inA)
        {
            float* p = outPixels + 4 * inX;
            YUVToRGB(k, inY8, inU8, inV8, p[2], p[1], p[0]);
            p[3] = inA;
        };
        if (mInfo.layout == Layout::kVUYA)
        {
            for (std::int32_t x = 0; x < n; ++x)
                put(x, row[4 * x + 2], row[4 * x + 1], row[4 * x], row[4 * x + 3] / 255.0f);
        }
        else if (mInfo.layout == Layout::kYUYV)
        {
            for (std::int32_t x = 0; x < n; ++x)
            {
                const std::uint8_t* pair = row + 4 * (x / 2);
                put(x, row[2 * x], pair[1], pair[3], 1.0f);
            }
        }
        else
        {
            const std::uint8_t* u = mPlaneU + (inY / 2) * mChromaStep;
            const std::uint8_t* v = mPlaneV + (inY / 2) * mChromaStep;
            for (std::int32_t x = 0; x < n; ++x)
                put(x, row[x], u[x / 2], v[x / 2], 1.0f);
        }
        straightColour = true;
    }

    if (linear == mWantLinear)
    {
        if (mWantPremultiplied && straightColour && mInfo.alpha != Alpha::kNone)
            PremultiplyRow(outPixels, n);
        else if (!mWantPremultiplied && !straightColour)
            UnpremultiplyRow(outPixels, n);
        return;
    }
    // Transfer changes apply to straight colour.
    if (!straightColour)
        UnpremultiplyRow(outPixels, n);
    if (mWantLinear)
        LinearizeRow(outPixels, n);
    else
        EncodeRow(outPixels, n);
    if (mWantPremultiplied)
        PremultiplyRow(outPixels, n);
}

// ---------------------------------------------------------------------------
// RowWriter

RowWriter::RowWriter(void* inBase, std::int32_t inRowBytes, IR_PixelFormat inFormat,
                     std::int32_t inWidth, std::int32_t inHeight, bool inHaveLinear,
                     bool inHavePremultiplied)
    : mWidth(inWidth)
    , mHaveLinear(inHaveLinear)
    , mHavePremultiplied(inHavePremultiplied)
{
    DescribeFormat(inFormat, mInfo);
    mView = MakeView(inBase, inRowBytes, mInfo, inHeight);
    mMatrix601 = UsesBT601(inFormat, inHeight);
}

namespace
{

inline std::uint8_t To8(float inV)
{
    const float v = inV * 255.0f + 0.5f;
    return static_cast<std::uint8_t>(v <= 0.0f ? 0.0f : (v >= 255.0f ? 255.0f : v));
}

} // namespace

void RowWriter::Write(std::int32_t inY, float* ioPixels, std::int32_t inX0, std::int32_t inX1) const
{
    if (inX1 <= inX0)
        return;
    float* px = ioPixels + 4 * inX0;
    const std::int32_t n = inX1 - inX0;
    const bool wantPremultiplied = mInfo.alpha == Alpha::kPremultiplied;
    const bool wantLinear = mInfo.linear;
    bool premultiplied = mHavePremultiplied;
    bool linear = mHaveLinear;
    const bool direct8 = mInfo.layout == Layout::kBGRA && !mInfo.isFloat && !wantPremultiplied;
    if (linear != wantLinear || premultiplied != wantPremultiplied)
    {
        if (premultiplied)
            UnpremultiplyRow(px, n);
        premultiplied = false;
        if (linear && !wantLinear && direct8)
        {
            // Straight 8-bit output from linear light: one table look-up per channel.
            const std::uint8_t* table = ToEncoded8Table();
            std::uint8_t* row = mView.Row(inY) + 4 * static_cast<std::ptrdiff_t>(inX0);
            for (std::int32_t i = 0; i < 4 * n; i += 4)
            {
                for (int c = 0; c < 3; ++c)
                {
                    const float v = std::clamp(px[i + c], 0.0f, 1.0f) * 65535.0f + 0.5f;
                    row[i + c] = table[static_cast<int>(v)];
                }
                row[i + 3] = To8(px[i + 3]);
            }
            return;
        }
        if (linear && !wantLinear)
            EncodeRow(px, n);
        else if (!linear && wantLinear)
            LinearizeRow(px, n);
        linear = wantLinear;
        if (wantPremultiplied)
            PremultiplyRow(px, n);
    }

    std::uint8_t* row = mView.Row(inY);
    if (mInfo.layout == Layout::kBGRA)
    {
        if (mInfo.isFloat)
        {
            std::memcpy(row + 16 * static_cast<std::ptrdiff_t>(inX0), px,
                        static_cast<std::size_t>(n) * 16);
        }
        else
        {
            std::uint8_t* out = row + 4 * static_cast<std::ptrdiff_t>(inX0);
            for (std::int32_t i = 0; i < 4 * n; ++i)
                out[i] = To8(px[i]);
        }
        return;
    }
    const YUVCoefficients& k = YUVCoefficientsFor(mMatrix601);
    if (mInfo.layout == Layout::kVUYA)
    {
        std::uint8_t* out = row + 4 * static_cast<std::ptrdiff_t>(inX0);
        for (std::int32_t i = 0; i < n; ++i)
        {
            const float* p = px + 4 * i;
            int y, u, v;
            RGBToYUV(k, p[2], p[1], p[0], y, u, v);
            out[4 * i] = static_cast<std::uint8_t>(v);
            out[4 * i + 1] = static_cast<std::uint8_t>(u);
            out[4 * i + 2] = static_cast<std::uint8_t>(y);
            out[4 * i + 3] = To8(p[3]);
        }
        return;
    }
    // YUYV: luma per pixel, chroma from the average of the pair (pairs are whole
    // because callers write from an even start; an odd last pixel pairs with itself).
    for (std::int32_t x = inX0 & ~1; x < inX1; x += 2)
    {
        const float* p0 = ioPixels + 4 * x;
        const float* p1 = x + 1 < mWidth ? p0 + 4 : p0;
        int y0, u0, v0, y1, u1, v1;
        RGBToYUV(k, p0[2], p0[1], p0[0], y0, u0, v0);
        RGBToYUV(k, p1[2], p1[1], p1[0], y1, u1, v1);
        std::uint8_t* out = row + 2 * static_cast<std::ptrdiff_t>(x);
        out[0] = static_cast<std::uint8_t>(y0);
        out[1] = static_cast<std::uint8_t>((u0 + u1 + 1) / 2);
        if (x + 1 < mWidth)
            out[2] = static_cast<std::uint8_t>(y1);
        out[3] = static_cast<std::uint8_t>((v0 + v1 + 1) / 2);
    }
}

} // namespace IR
