#include "mvxmediatypes/PixelFormat.h"

#include <set>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

// What a catalogue format physically is, written down by hand.
constexpr unsigned kRender = 1, kFields = 2, kHalved = 4, kYuv = 8, kAlpha = 16, kPremul = 32,
                   kFloat = 64, kLinear = 128, kCompressed = 256, kPlanar = 512;

struct Expected
{
    PixelFormat format;
    const char *name, *code;
    std::uint32_t bytesPerPixel, channels, bitDepth, sampleKind, traits;
};

const Expected kCatalogue[] = {
    {kPixelFormat_BGRA_4444_8u, "BGRA_4444_8u", "BGRA", 4, 4, 8, 0, kRender | kAlpha},
    {kPixelFormat_BGRA_4444_16u, "BGRA_4444_16u", "BGA6", 8, 4, 16, 2, kRender | kAlpha},
    {kPixelFormat_BGRA_4444_16f, "BGRA_4444_16f", "BGAh", 8, 4, 16, 3, kRender | kAlpha | kFloat},
    {kPixelFormat_BGRA_4444_32f, "BGRA_4444_32f", "BGAf", 16, 4, 32, 5, kRender | kAlpha | kFloat},
    {kPixelFormat_BGRP_4444_32f_Linear, "BGRP_4444_32f_Linear", "BGPl", 16, 4, 32, 5,
     kRender | kAlpha | kPremul | kFloat | kLinear},
    {kPixelFormat_VUYA_4444_8u, "VUYA_4444_8u", "VUYA", 4, 4, 8, 0, kRender | kYuv | kAlpha},
    {kPixelFormat_VUYA_4444_32f, "VUYA_4444_32f", "VUAf", 16, 4, 32, 5,
     kRender | kYuv | kAlpha | kFloat},
    {kPixelFormat_YUYV_422_8u, "YUYV_422_8u", "YUYV", 2, 3, 8, 0, kYuv},
    {kPixelFormat_YUYV_422_8u_Fields, "YUYV_422_8u_Fields", "YUFd", 2, 3, 8, 0, kFields | kYuv},
    {kPixelFormat_YUYV_422_8u_HalfWidthFields, "YUYV_422_8u_HalfWidthFields", "YUFh", 2, 3, 8, 0,
     kFields | kHalved | kYuv},
    {kPixelFormat_MJPG_422_Compressed, "MJPG_422_Compressed", "MJPG", 0, 3, 8, 1,
     kYuv | kCompressed},
    {kPixelFormat_YUV_420_8u_Planar, "YUV_420_8u_Planar", "I420", 2, 3, 8, 0, kYuv | kPlanar}};

const PixelFormat kBgra8 = kPixelFormat_BGRA_4444_8u;
const PixelFormat kBgra16 = kPixelFormat_BGRA_4444_16u;
const PixelFormat kBgra32 = kPixelFormat_BGRA_4444_32f;
const PixelFormat kVuya8 = kPixelFormat_VUYA_4444_8u;
const PixelFormat kVuya32 = kPixelFormat_VUYA_4444_32f;
const PixelFormat kYuyv = kPixelFormat_YUYV_422_8u;
const PixelFormat kYuyvFields = kPixelFormat_YUYV_422_8u_Fields;
const PixelFormat kYuyvHalf = kPixelFormat_YUYV_422_8u_HalfWidthFields;
const PixelFormat kPlanar420 = kPixelFormat_YUV_420_8u_Planar;
const PixelFormat kAny = kPixelFormat_Any;
const PixelFormat kInvalid = kPixelFormat_Invalid;

std::uint32_t Word(PixelFormat inFormat)
{
    return static_cast<std::uint32_t>(inFormat.GetValue() >> 32);
}

using PixelFormatTest = ::testing::Test;

TEST_F(PixelFormatTest, EveryCatalogueFormatAnswersTheRendererBitTests)
{
    for (const Expected& e : kCatalogue)
    {
        SCOPED_TRACE(e.name);
        const std::uint32_t word = Word(e.format);
        // The renderer tests the raw word for render formats.
        EXPECT_EQ((word & 0xC0000) == 0x40000 && (word & 0xC00) == 0, (e.traits & kRender) != 0);
        EXPECT_EQ((word >> 1) & 7, e.sampleKind) << "bits 1-3 are the sample kind";
        const PixelFormat f = e.format;
        const unsigned traits = kRender * f.IsRenderFormat() | kFields * f.IsFieldByField() |
                                kHalved * f.IsHorizontallyHalved() | kYuv * f.IsYUV() |
                                kAlpha * f.HasAlpha() | kPremul * f.IsPremultiplied() |
                                kFloat * f.IsFloat() | kLinear * f.IsLinear() |
                                kCompressed * f.IsCompressed() | kPlanar * f.IsPlanar();
        EXPECT_EQ(traits, e.traits);
        EXPECT_TRUE(f.IsRGB() != f.IsYUV() && f.IsRaster() != f.IsCompressed() && f.IsValid());
        EXPECT_EQ(std::tuple(f.GetBytesPerPixel(), f.GetChannelCount(), f.GetBitDepth()),
                  std::tuple(e.bytesPerPixel, e.channels, e.bitDepth));
        EXPECT_EQ(e.format.GetCode(),
                  MakePixelFormatCode(e.code[0], e.code[1], e.code[2], e.code[3]));
        EXPECT_EQ(GetPixelFormatName(e.format), e.name);
    }
}

TEST_F(PixelFormatTest, WildcardsAndOtherFormatsHaveNoSizeAndNamesRoundTrip)
{
    // A 4:2:2 float format outside the catalogue, and a packed one of no fixed
    // size.
    const auto make = [](PixelSampleKind inKind, std::uint32_t inDepth)
    {
        return PixelFormat::Make(MakePixelFormatCode('t', 'e', 's', 't'),
                                 MakePixelProperties(true, inKind, 3, false, false,
                                                     kPixelChroma_422, false,
                                                     kPixelFieldLayout_Interleaved, 1, inDepth));
    };
    EXPECT_EQ(make(kPixelSampleKind_32f, 32).GetBytesPerPixel(), 8u);
    EXPECT_EQ(make(kPixelSampleKind_10uPacked, 10).GetBytesPerPixel(), 0u);
    for (const PixelFormat wildcard : {kAny, kInvalid})
    {
        // Neither may ever be chosen as a render format.
        EXPECT_NE(Word(wildcard) & 0xC0000, 0x40000u);
        EXPECT_FALSE(wildcard.IsValid() || wildcard.IsRGB() || wildcard.IsYUV());
        EXPECT_EQ(wildcard.GetBytesPerPixel(), 0u);
    }
    std::set<std::uint64_t> values;
    for (const PixelFormat format : GetPixelFormatCatalogue())
    {
        values.insert(format.GetValue());
        EXPECT_EQ(PixelFormatFromName(GetPixelFormatName(format)), format);
    }
    EXPECT_EQ(values.size(), std::size(kCatalogue) + 2) << "catalogue values collide";
    EXPECT_EQ(GetPixelFormatName(PixelFormat(0x1234)), "");
    EXPECT_FALSE(PixelFormatFromName("bgra_4444_8u").has_value());
}

TEST_F(PixelFormatTest, SelectNearestFollowsItsPreferenceOrder)
{
    // Equal properties under another code: list order decides between them.
    const PixelFormat rgba =
        PixelFormat::Make(MakePixelFormatCode('R', 'G', 'B', 'A'), kBgra8.GetProperties());
    const PixelFormat rgb24 = PixelFormat::Make(
        MakePixelFormatCode('t', '2', '4', ' '),
        MakePixelProperties(false, kPixelSampleKind_16u, 4, true, false, kPixelChroma_444, false,
                            kPixelFieldLayout_Interleaved, 1, 24));
    // (why, requested, list, quality, expected)
    const std::tuple<const char*, PixelFormat, std::vector<PixelFormat>, std::uint32_t, PixelFormat>
        cases[] = {
            {"exact match", kBgra16, {kBgra32, kBgra16}, 5, kBgra16},
            {"nothing deeper: deepest below", kBgra32, {kBgra8, kBgra16}, 5, kBgra16},
            {"model outranks depth", kVuya8, {kBgra8, kVuya32}, 5, kVuya32},
            {"raster first", kYuyv, {kPixelFormat_MJPG_422_Compressed, kBgra8}, 5, kBgra8},
            {"same chroma sampling", kYuyv, {kYuyvHalf, kYuyvFields, kVuya8}, 5, kYuyvFields},
            {"low quality: nearest depth", kBgra16, {kBgra32, kBgra8}, 2, kBgra8},
            {"tie at draft: the shallower", rgb24, {kBgra32, kBgra16}, 0, kBgra16},
            {"list order on equals, swapped", kBgra16, {rgba, kBgra8}, 5, rgba},
            {"empty list", kBgra8, {}, 5, kInvalid},
            {"invalid request", kInvalid, {kBgra8}, 5, kInvalid},
            {"only wildcards", kBgra8, {kInvalid}, 5, kInvalid},
            {"Any in the list takes the request", kYuyv, {kBgra8, kAny}, 5, kYuyv},
            {"Any requested: first concrete", kAny, {kAny, kVuya8, kBgra8}, 5, kVuya8},
            {"planar never for packed", kYuyv, {kBgra8, kPlanar420, kVuya8}, 5, kVuya8},
            {"packed for planar at last", kPlanar420, {kBgra8, kVuya8}, 5, kVuya8},
        };
    for (const auto& [why, requested, list, quality, expected] : cases)
        EXPECT_EQ(SelectNearestPixelFormat(requested, list, quality), expected) << why;
    // The two-argument form decides as at kRenderQuality_Max.
    EXPECT_EQ(SelectNearestPixelFormat(kBgra16, {rgba, kBgra8}), rgba);
}

TEST_F(PixelFormatTest, SelectFromRankedRequestsFollowsTheDocumentedSteps)
{
    // (why, requested, fallback, available, quality, allow nearest, expected)
    const std::tuple<const char*, std::vector<PixelFormat>, PixelFormat, std::vector<PixelFormat>,
                     std::uint32_t, bool, PixelFormat>
        cases[] = {
            {"ranking among exact", {kBgra32, kBgra8}, kYuyv, {kBgra8, kBgra32}, 5, true, kBgra32},
            {"no nearest: fallback", {kBgra16}, kInvalid, {kVuya8, kBgra32}, 5, false, kInvalid},
            {"the format in hand", {kBgra8}, kYuyv, {kVuya8, kYuyv}, 5, true, kYuyv},
            {"nearest at draft", {kBgra16}, kYuyv, {kBgra8, kBgra32}, 0, true, kBgra8},
            {"Any offered: in hand", {kBgra8}, kYuyv, {kAny}, 5, true, kYuyv},
            {"Any offered, no nearest", {kBgra8}, kYuyv, {kAny}, 5, false, kBgra8},
            {"Any offered, none in hand", {kBgra8}, kInvalid, {kAny}, 5, true, kBgra8},
            {"Any requested: in hand", {kAny}, kYuyv, {kBgra8, kYuyv}, 5, true, kYuyv},
            {"Any requested: first", {kAny}, kBgra32, {kVuya8, kBgra8}, 5, true, kVuya8},
            {"nothing available", {kBgra8}, kYuyv, {}, 5, true, kYuyv},
            {"only invalid requested", {kInvalid}, kInvalid, {kBgra8}, 5, true, kInvalid}};
    for (const auto& [why, requested, fallback, available, quality, nearest, expected] : cases)
        EXPECT_EQ(SelectNearestPixelFormat(requested, fallback, available, quality, nearest),
                  expected)
            << why;
}

} // namespace
} // namespace mvxmediatypes
