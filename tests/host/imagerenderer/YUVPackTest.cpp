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
    for (const IR_PixelFormat format : {kBGRA8, kIR_PixelFormat_VUYA_4444_8u})
        for (const bool subsampled : {false, true})
            for (std::int32_t width = 1; width <= 68; ++width)
                for (const std::int32_t height : {1, 2, 5})
                {
                    // 68 stands for a row of several whole vectors and a tail.
                    const std::int32_t w = width == 68 ? 131 : width;
                    const bool vuya = format != kBGRA8, matrix601 = w % 2 == 0;
                    SCOPED_TRACE(testing::Message() << "vuya " << vuya << " 420 " << subsampled
                                                    << " " << w << "x" << height);
                    Image src(format, w, height, w % 3);
                    src.Randomise(random);
                    const int k = subsampled ? 2 : 1;
                    Plane planes[3] = {{w, height},
                                       {(w + k - 1) / k, (height + k - 1) / k},
                                       {(w + k - 1) / k, (height + k - 1) / k}};
                    ASSERT_EQ(IR_PackYUVPlanes(src.Data(), src.RowBytes(), format, matrix601,
                                               planes[0].mBytes.data(), planes[0].mRowBytes,
                                               planes[1].mBytes.data(), planes[1].mRowBytes,
                                               planes[2].mBytes.data(), planes[2].mRowBytes,
                                               subsampled, w, height),
                              kIR_NoError);
                    double worst = 0;
                    for (int p = 0; p < 3; ++p)
                        for (std::int32_t py = 0; py < planes[p].mHeight; ++py)
                            for (std::int32_t px = 0; px < planes[p].mWidth; ++px)
                            {
                                // Luma as computed; chroma the mean of the rounded codes
                                // of its block (the last column or row repeated).
                                const int n = p == 0 ? 1 : k;
                                double sum = 0;
                                for (int i = 0; i < n * n; ++i)
                                {
                                    const double c =
                                        Codes(src.Get(std::min(n * px + i % n, w - 1),
                                                      std::min(n * py + i / n, height - 1)),
                                              vuya, matrix601)[p];
                                    sum += p == 0 ? c : std::round(c);
                                }
                                const double expected = n == 2 ? std::floor((sum + 2) / 4) : sum;
                                worst = std::max(worst, std::abs(planes[p].At(px, py) - expected));
                            }
                    // Fixed point may round a code the other way; VUYA samples are exact.
                    EXPECT_LE(worst, vuya ? 0 : 1);
                    for (const Plane& plane : planes)
                        EXPECT_TRUE(plane.PaddingKept());
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
