// Packing BGRA and VUYA pixels into Y'CbCr planes, against codes computed here in
// double precision: every tail length of the widest vectors, odd heights, misaligned
// sources, and plane padding that must stay untouched.

#include "IR/YUVPlanes.h"
#include "ImageTestSupport.h"

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

constexpr std::uint8_t kUntouched = 0xA5;

// Y, Cb, Cr of one pixel, unrounded for BGRA (video range, the header's formula).
std::array<double, 3> Codes(const Pixel& inP, bool inVUYA, bool inMatrix601)
{
    if (inVUYA)
        return {double(inP[2]), double(inP[1]), double(inP[0])};
    const double kr = inMatrix601 ? 0.299 : 0.2126, kb = inMatrix601 ? 0.114 : 0.0722;
    const double b = inP[0] / 255.0, g = inP[1] / 255.0, r = inP[2] / 255.0;
    const double y = kr * r + (1 - kr - kb) * g + kb * b;
    return {16 + 219 * y, 128 + 224 * (b - y) / (2 * (1 - kb)),
            128 + 224 * (r - y) / (2 * (1 - kr))};
}

// One plane with kPadding bytes after each row and one spare row, all preset.
struct Plane
{
    Plane(std::int32_t inWidth, std::int32_t inHeight)
        : mWidth(inWidth)
        , mHeight(inHeight)
        , mRowBytes(inWidth + Image::kPadding)
        , mBytes(static_cast<std::size_t>(mRowBytes) * (inHeight + 1), kUntouched)
    {
    }
    std::uint8_t& At(std::int32_t inX, std::int32_t inY) { return mBytes[inY * mRowBytes + inX]; }
    // True when nothing outside the plane's samples was written.
    bool PaddingKept() const
    {
        for (std::size_t i = 0; i < mBytes.size(); ++i)
            if ((std::int32_t(i) % mRowBytes >= mWidth || std::int32_t(i) / mRowBytes >= mHeight) &&
                mBytes[i] != kUntouched)
                return false;
        return true;
    }
    std::int32_t mWidth, mHeight, mRowBytes;
    std::vector<std::uint8_t> mBytes;
};

using YUVPackTest = ::testing::Test;

TEST_F(YUVPackTest, PlanesFollowTheFormulaAtEveryTailAndOddHeight)
{
    std::mt19937 random(5);
    std::vector<std::int32_t> widths{131};
    for (std::int32_t w = 1; w <= 67; ++w)
        widths.push_back(w);
    for (const IR_PixelFormat format : {kBGRA8, kIR_PixelFormat_VUYA_4444_8u})
        for (const bool subsampled : {false, true})
            for (const std::int32_t width : widths)
                for (const std::int32_t height : {1, 2, 5})
                {
                    const bool vuya = format != kBGRA8, matrix601 = width % 2 == 0;
                    SCOPED_TRACE(testing::Message() << "vuya " << vuya << " 420 " << subsampled
                                                    << " " << width << "x" << height);
                    Image src(format, width, height, width % 3);
                    src.Randomise(random);
                    const std::int32_t cw = subsampled ? (width + 1) / 2 : width;
                    const std::int32_t ch = subsampled ? (height + 1) / 2 : height;
                    Plane y(width, height), cb(cw, ch), cr(cw, ch);
                    ASSERT_EQ(IR_PackYUVPlanes(src.Data(), src.RowBytes(), format, matrix601,
                                               y.mBytes.data(), y.mRowBytes, cb.mBytes.data(),
                                               cb.mRowBytes, cr.mBytes.data(), cr.mRowBytes,
                                               subsampled, width, height),
                              kIR_NoError);
                    // Fixed point may round a code the other way; VUYA samples are exact.
                    const double tolerance = vuya ? 0 : 1;
                    double worst = 0;
                    for (std::int32_t py = 0; py < height; ++py)
                        for (std::int32_t px = 0; px < width; ++px)
                            worst =
                                std::max(worst, std::abs(y.At(px, py) - Codes(src.Get(px, py), vuya,
                                                                              matrix601)[0]));
                    for (std::int32_t py = 0; py < ch; ++py)
                        for (std::int32_t px = 0; px < cw; ++px)
                        {
                            // The mean of the rounded codes of the block (its last
                            // column or row repeated at an odd size).
                            const int k = subsampled ? 2 : 1;
                            std::array<double, 3> sum{};
                            for (int i = 0; i < k * k; ++i)
                            {
                                const auto c = Codes(src.Get(std::min(k * px + i % k, width - 1),
                                                             std::min(k * py + i / k, height - 1)),
                                                     vuya, matrix601);
                                for (int j = 1; j < 3; ++j)
                                    sum[j] += std::round(c[j]);
                            }
                            for (int j = 1; j < 3; ++j)
                            {
                                const double expected =
                                    subsampled ? std::floor((sum[j] + 2) / 4) : sum[j];
                                const double got = j == 1 ? cb.At(px, py) : cr.At(px, py);
                                worst = std::max(worst, std::abs(got - expected));
                            }
                        }
                    EXPECT_LE(worst, tolerance);
                    EXPECT_TRUE(y.PaddingKept() && cb.PaddingKept() && cr.PaddingKept());
                }
}

TEST_F(YUVPackTest, OtherSourcesAndEmptySizesAreRefused)
{
    Image src(kBGRA8, 4, 2);
    Plane y(4, 2), c(4, 2);
    const auto pack = [&](IR_PixelFormat inFormat, std::int32_t inWidth, std::uint8_t* inY)
    {
        return IR_PackYUVPlanes(src.Data(), src.RowBytes(), inFormat, true, inY, y.mRowBytes,
                                c.mBytes.data(), c.mRowBytes, c.mBytes.data(), c.mRowBytes, false,
                                inWidth, 2);
    };
    for (const IR_PixelFormat format : {kBGRP8, kBGRA32f, kIR_PixelFormat_YUYV_422_8u})
        EXPECT_EQ(pack(format, 4, y.mBytes.data()), kIR_UnsupportedFormat) << format;
    EXPECT_EQ(pack(kBGRA8, 0, y.mBytes.data()), kIR_UnsupportedFormat);
    EXPECT_EQ(pack(kBGRA8, 4, nullptr), kIR_UnsupportedFormat);
    EXPECT_TRUE(y.PaddingKept() && c.PaddingKept());
    EXPECT_EQ(y.mBytes[0], kUntouched);
}

} // namespace
