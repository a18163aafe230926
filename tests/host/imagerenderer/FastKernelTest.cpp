// The vectorised kernels against the plain reference kernels on random buffers: every
// tail length of the widest vectors (up to 64 pixels), odd misalignments, padded rows.

#include "ImageTestSupport.h"
#include "ReferenceKernels.h"

#include <gtest/gtest.h>

namespace
{

using namespace irtest;

// Widths that cover an empty body, every partial last vector and several whole ones.
std::vector<std::int32_t> Widths()
{
    std::vector<std::int32_t> widths;
    for (std::int32_t w = 1; w <= 67; ++w)
        widths.push_back(w);
    widths.push_back(131);
    return widths;
}

// Draws a random source through inMatrix onto a random destination with the renderer and with
// the reference; answers the alpha-weighted largest difference.
double MotionAgainstReference(std::mt19937& ioRandom, IR_PixelFormat inFormat, Image ioSrc,
                              Image ioDst, const IR_AffineMatrix& inMatrix, float inOpacity,
                              std::int32_t inQuality, bool inLower)
{
    const bool straight = inFormat == kBGRA8;
    ioSrc.Randomise(ioRandom);
    if (straight) // a straight pixel of alpha 0 with colour must come out as 0
        ioSrc.Set(2, 2, {50, 60, 70, 0});
    ioDst.Randomise(ioRandom);
    Image expected = Copy(ioDst, 0);
    IR::Reference::Motion8(ioSrc.Data(), ioSrc.RowBytes(), ioSrc.Width(), ioSrc.Height(),
                           expected.Data(), expected.RowBytes(), ioDst.Width(), ioDst.Height(),
                           straight, inMatrix, inOpacity, inQuality, inLower);
    EXPECT_EQ(Draw(ioSrc, ioDst, inMatrix, inQuality, kIR_Field_All, inLower, inOpacity),
              kIR_NoError);
    return MaxDifference(ioDst, expected, straight);
}

using FastKernelTest = ::testing::Test;

TEST_F(FastKernelTest, CompositeMatchesReferenceAtEveryTailLengthAndKeepsThePadding)
{
    std::mt19937 random(21);
    for (IR_PixelFormat format : {kBGRA8, kBGRP8, kBGRA32f, kBGRP32f})
        for (float opacity : {1.0f, 0.61f, 0.0f})
            for (std::int32_t width : Widths())
            {
                SCOPED_TRACE(testing::Message() << "format " << format << " opacity " << opacity
                                                << " width " << width);
                const std::int32_t misalign = width % 4;
                Image src(format, width, 2, misalign), dst(format, width, 2, 3 - misalign);
                src.Randomise(random);
                dst.Randomise(random);
                const auto rowBytes = IR_MinimumRowBytes(format, width);
                for (std::int32_t y = 0; y < 2; ++y)
                    std::memset(dst.Row(y) + rowBytes, 0xA5, Image::kPadding);
                // Every fifth 8-bit source pixel transparent (a straight one keeping colour).
                for (std::int32_t x = 0; x < width && !src.IsFloat(); x += 5)
                    src.Row(0)[4 * x + 3] = 0;
                for (std::int32_t x = 0; x < width && format == kBGRP8; x += 5)
                    src.Set(x, 0, {0, 0, 0, 0});
                Image expected = Copy(dst, 0);
                IR::Reference::Composite(src.Data(), src.RowBytes(), expected.Data(),
                                         expected.RowBytes(), format, width, 2, opacity);
                ASSERT_EQ(Composite(src, dst, opacity), kIR_NoError);
                ASSERT_LE(MaxDifference(dst, expected), dst.IsFloat() ? 1e-5 : 1);
                // The vector tails write nothing into the row padding.
                for (int i = 0; i < 2 * Image::kPadding; ++i)
                    ASSERT_EQ(dst.Row(i / Image::kPadding)[rowBytes + i % Image::kPadding], 0xA5);
            }
}

TEST_F(FastKernelTest, MixMatchesReferenceOnMisalignedOddRows)
{
    std::mt19937 random(5);
    for (IR_PixelFormat format : {kBGRA8, kBGRP32f})
    {
        Image a(format, 31, 4, 1), b(format, 31, 4, 2), d(format, 31, 4, 3), e(format, 31, 4, 0);
        a.Randomise(random);
        b.Randomise(random);
        const double tolerance = d.IsFloat() ? 1e-6 : 1;
        IR_CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(), d.Data(), d.RowBytes(),
                         format, 31, 4, 0.3f, 4);
        IR::Reference::CrossDissolve(a.Data(), a.RowBytes(), b.Data(), b.RowBytes(), e.Data(),
                                     e.RowBytes(), format, 31, 4, 0.3);
        EXPECT_LE(MaxDifference(d, e), tolerance) << format;
        const void* srcs[] = {a.Data(), b.Data(), a.Data()};
        const std::int32_t rows[] = {a.RowBytes(), b.RowBytes(), a.RowBytes()};
        const double weights[] = {0.2, 0.7, 0.3};
        IR_Accumulate(srcs, rows, weights, 3, d.Data(), d.RowBytes(), format, 31, 4, 4);
        IR::Reference::Accumulate(srcs, rows, weights, 3, e.Data(), e.RowBytes(), format, 31, 4);
        EXPECT_LE(MaxDifference(d, e), tolerance) << format;
    }
}

TEST_F(FastKernelTest, AssociationChangesMatchReference)
{
    std::mt19937 random(24);
    for (std::int32_t width : Widths())
    {
        SCOPED_TRACE(testing::Message() << "width " << width);
        Image straight(kBGRA8, width, 2, width % 3), premultiplied(kBGRP8, width, 2, 1),
            expected(kBGRP8, width, 2), back(kBGRA8, width, 2, 2), backExpected(kBGRA8, width, 2);
        straight.Randomise(random);
        auto convert = [&](const Image& inSrc, Image& outDst)
        {
            ASSERT_EQ(IR_Convert(inSrc.Data(), inSrc.RowBytes(), inSrc.Format(), outDst.Data(),
                                 outDst.RowBytes(), outDst.Format(), width, 2, 4),
                      kIR_NoError);
        };
        convert(straight, premultiplied);
        IR::Reference::StraightToPremultiplied8(straight.Data(), straight.RowBytes(),
                                                expected.Data(), expected.RowBytes(), width, 2);
        // The fixed-point product is exactly rounded: no difference at all.
        ASSERT_EQ(MaxDifference(premultiplied, expected), 0);
        // Un-premultiplying arbitrary bytes (colour above alpha included) clamps to 255.
        Image any(kBGRP8, width, 2, 3);
        any.Randomise(random);
        for (std::int32_t x = 0; x < width; x += 3)
            any.Set(x, 0, {200, 17, 90, static_cast<std::uint8_t>(x % 7 == 0 ? 0 : 60)});
        convert(any, back);
        IR::Reference::PremultipliedToStraight8(any.Data(), any.RowBytes(), backExpected.Data(),
                                                backExpected.RowBytes(), width, 2);
        ASSERT_LE(MaxDifference(back, backExpected), 1);
    }
}

TEST_F(FastKernelTest, YUV420MatchesReferenceAtEveryTailLength)
{
    std::mt19937 random(25);
    std::uniform_int_distribution<int> code(0, 255);
    for (std::int32_t width : Widths())
        for (bool bt601 : {true, false})
        {
            const std::int32_t height = 3, rowBytes = (width + 3) & ~1;
            // Every code, including those outside video range (they clamp); an odd start.
            std::vector<std::uint8_t> storage(std::size_t(rowBytes) * height +
                                              2 * (rowBytes / 2) * ((height + 1) / 2) + 2);
            for (auto& v : storage)
                v = static_cast<std::uint8_t>(code(random));
            const std::uint8_t* planes = storage.data() + 1;
            const IR_PixelFormat format = kIR_PixelFormat_YUV_420_Planar_8u |
                                          (bt601 ? kIR_FormatBit_BT601 : kIR_FormatBit_BT709);
            Image dst(kBGRA8, width, height, 1), expected(kBGRA8, width, height);
            ASSERT_EQ(IR_Convert(planes, rowBytes, format, dst.Data(), dst.RowBytes(), dst.Format(),
                                 width, height, 4),
                      kIR_NoError);
            IR::Reference::YUV420ToBGRA8(planes, rowBytes, bt601, expected.Data(),
                                         expected.RowBytes(), width, height);
            ASSERT_LE(MaxDifference(dst, expected), 1) << width << (bt601 ? " 601" : " 709");
        }
}

TEST_F(FastKernelTest, MotionMatchesReference)
{
    const std::int32_t srcW = 37, srcH = 23, dstW = 41, dstH = 27;
    auto motion = [&](const IR_MotionGeometry& inGeometry)
    {
        IR_AffineMatrix matrix;
        IR_BuildMotionMatrix(inGeometry, srcW, srcH, dstW, dstH, &matrix);
        return matrix;
    };
    const IR_AffineMatrix shrunk = motion({.positionX = 0.45f, .scaleX = 0.75f, .scaleY = 0.75f});
    // (matrix, quality, opacity, tolerance). Bilinear weights are 8-bit: two roundings and the
    // weight step stay within 2. Nearest sampling of a rotation is left to the exact quarter
    // turns of MotionTest: at pixel boundaries fixed and double positions may pick neighbours.
    std::vector<std::tuple<IR_AffineMatrix, std::int32_t, float, double>> cases{
        {shrunk, 0, 0.8f, 1},
        {shrunk, 3, 0.8f, 2},
        {motion({.scaleX = 1.3f, .scaleY = 0.8f, .rotationDegrees = 17.0}), 3, 0.8f, 2}};
    // Shrinking, enlarging, unequal axes, mirrored, and a source hanging over every edge.
    for (const auto& [sx, sy, x, y] :
         {std::array{0.5f, 0.5f, 0.37f, 0.41f}, std::array{0.33f, 0.9f, 0.1f, 0.9f},
          std::array{-0.8f, 0.6f, 0.5f, 0.5f}, std::array{2.5f, 2.5f, 0.0f, 1.0f}})
        for (float opacity : {1.0f, 0.55f})
            cases.emplace_back(motion({.positionX = x, .positionY = y, .scaleX = sx, .scaleY = sy}),
                               4, opacity, 2);
    std::mt19937 random(11);
    for (std::size_t i = 0; i < cases.size(); ++i)
        for (IR_PixelFormat format : {kBGRP8, kBGRA8})
            for (bool lower : {false, true})
            {
                const auto& [matrix, quality, opacity, tolerance] = cases[i];
                EXPECT_LE(MotionAgainstReference(random, format, Image(format, srcW, srcH, 3),
                                                 Image(format, dstW, dstH, 1), matrix, opacity,
                                                 quality, lower),
                          tolerance)
                    << "case " << i << " format " << format << " lower " << lower;
            }
}

TEST_F(FastKernelTest, SeparableMotionMatchesReferenceAtEveryWidth)
{
    // Exactly half size with the taps on pixel pairs (w = 128) and between them, the same
    // size moved by a fraction (stride 1), and a general scale (gathered taps); sources
    // twice as wide plus one (odd) hang over both edges of the destination.
    const std::array<double, 3> cases[] = {
        {0.5, 1.0, 0.0}, {0.5, 0.3, 0.45}, {1.0, -0.35, 0.2}, {0.8, 0.6, -0.3}};
    std::mt19937 random(28);
    for (IR_PixelFormat format : {kBGRP8, kBGRA8})
        for (const auto& [scale, tx, ty] : cases)
            for (std::int32_t width : Widths())
                for (bool lower : {false, true})
                    for (float opacity : {1.0f, 0.6f})
                        ASSERT_LE(MotionAgainstReference(
                                      random, format, Image(format, 2 * width + 1, 9, width % 4),
                                      Image(format, width, 5, 3 - width % 4),
                                      IR_AffineMatrix{scale, 0, 0, scale, tx, ty}, opacity, 4,
                                      lower),
                                  2)
                            << format << " scale " << scale << " tx " << tx << " width " << width
                            << " lower " << lower << " opacity " << opacity;
}

} // namespace
