#include "mvxmediatypes/PixelFormat.h"

#include <algorithm>
#include <cstring>
#include <set>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace mvxmediatypes
{
namespace
{

// What a catalogue format physically is, written down by hand.
struct Expected
{
    PixelFormat format;
    const char* name;
    const char* code;
    bool renderFormat;       // (word & 0xC0000) == 0x40000 && (word & 0xC00) == 0
    bool fieldByField;       // (word & 0xC0000) == 0x40000 && (word & 0x3C000) != 0
    bool horizontallyHalved; // bit 0, bits 14-17 in 9..12, bits 10-11 == 3
    std::uint32_t bytesPerPixel;
    std::uint32_t channels;
    std::uint32_t bitDepth;
    bool yuv;
    bool alpha;
    bool premultiplied;
    bool isFloat;
    bool linear;
    bool compressed;
};

const std::vector<Expected>& Catalogue()
{
    static const std::vector<Expected> kExpected = {
        {kPixelFormat_BGRA_4444_8u, "BGRA_4444_8u", "BGRA", true, false, false, 4, 4, 8, false,
         true, false, false, false, false},
        {kPixelFormat_BGRA_4444_16u, "BGRA_4444_16u", "BGA6", true, false, false, 8, 4, 16, false,
         true, false, false, false, false},
        {kPixelFormat_BGRA_4444_16f, "BGRA_4444_16f", "BGAh", true, false, false, 8, 4, 16, false,
         true, false, true, false, false},
        {kPixelFormat_BGRA_4444_32f, "BGRA_4444_32f", "BGAf", true, false, false, 16, 4, 32, false,
         true, false, true, false, false},
        {kPixelFormat_BGRP_4444_32f_Linear, "BGRP_4444_32f_Linear", "BGPl", true, false, false, 16,
         4, 32, false, true, true, true, true, false},
        {kPixelFormat_VUYA_4444_8u, "VUYA_4444_8u", "VUYA", true, false, false, 4, 4, 8, true, true,
         false, false, false, false},
        {kPixelFormat_VUYA_4444_32f, "VUYA_4444_32f", "VUAf", true, false, false, 16, 4, 32, true,
         true, false, true, false, false},
        {kPixelFormat_YUYV_422_8u, "YUYV_422_8u", "YUYV", false, false, false, 2, 3, 8, true, false,
         false, false, false, false},
        {kPixelFormat_YUYV_422_8u_Fields, "YUYV_422_8u_Fields", "YUFd", false, true, false, 2, 3, 8,
         true, false, false, false, false, false},
        {kPixelFormat_YUYV_422_8u_HalfWidthFields, "YUYV_422_8u_HalfWidthFields", "YUFh", false,
         true, true, 2, 3, 8, true, false, false, false, false, false},
        {kPixelFormat_MJPG_422_Compressed, "MJPG_422_Compressed", "MJPG", false, false, false, 0, 3,
         8, true, false, false, false, false, true},
    };
    return kExpected;
}

class PixelFormatTest : public ::testing::Test
{
protected:
    static std::uint32_t Word(PixelFormat inFormat)
    {
        return static_cast<std::uint32_t>(inFormat.GetValue() >> 32);
    }

    static std::string CodeText(PixelFormat inFormat)
    {
        const std::uint32_t code = static_cast<std::uint32_t>(inFormat.GetValue());
        std::string text;
        for (int i = 0; i < 4; ++i)
            text += static_cast<char>((code >> (8 * i)) & 0xFF);
        return text;
    }

    // The concrete catalogue formats as a list.
    static std::vector<PixelFormat> Concrete()
    {
        std::vector<PixelFormat> formats;
        for (const Expected& e : Catalogue())
            formats.push_back(e.format);
        return formats;
    }
};

TEST_F(PixelFormatTest, EveryCatalogueFormatAnswersTheRendererBitTests)
{
    for (const Expected& e : Catalogue())
    {
        SCOPED_TRACE(e.name);
        const std::uint32_t word = Word(e.format);
        // The tests exactly as the renderer writes them on the raw word.
        EXPECT_EQ((word & 0xC0000) == 0x40000 && (word & 0xC00) == 0, e.renderFormat);
        EXPECT_EQ((word & 0xC0000) == 0x40000 && (word & 0x3C000) != 0, e.fieldByField);
        const std::uint32_t layout = word & 0x3C000;
        const bool halved =
            (word & 1) != 0 &&
            (layout == 0x24000 || layout == 0x28000 || layout == 0x2C000 || layout == 0x30000) &&
            (word & 0xC00) == 0xC00;
        EXPECT_EQ(halved, e.horizontallyHalved);
        EXPECT_EQ((word & 1) != 0, e.yuv) << "bit 0 is the colour model";

        EXPECT_EQ(e.format.IsRenderFormat(), e.renderFormat);
        EXPECT_EQ(e.format.IsFieldByField(), e.fieldByField);
        EXPECT_EQ(e.format.IsHorizontallyHalved(), e.horizontallyHalved);
        EXPECT_EQ(e.format.GetBytesPerPixel(), e.bytesPerPixel);
        EXPECT_EQ(e.format.GetChannelCount(), e.channels);
        EXPECT_EQ(e.format.GetBitDepth(), e.bitDepth);
        EXPECT_EQ(e.format.IsYUV(), e.yuv);
        EXPECT_EQ(e.format.IsRGB(), !e.yuv);
        EXPECT_EQ(e.format.HasAlpha(), e.alpha);
        EXPECT_EQ(e.format.IsPremultiplied(), e.premultiplied);
        EXPECT_EQ(e.format.IsFloat(), e.isFloat);
        EXPECT_EQ(e.format.IsLinear(), e.linear);
        EXPECT_EQ(e.format.IsCompressed(), e.compressed);
        EXPECT_EQ(e.format.IsRaster(), !e.compressed);
        EXPECT_TRUE(e.format.IsValid());
        EXPECT_EQ(CodeText(e.format), e.code);
        EXPECT_EQ(e.format.GetProperties(), word);
    }
}

TEST_F(PixelFormatTest, BytesPerPixelFollowTheSampleKindAndPacking)
{
    // The sizing rule reads bits 1-3 and 10-11: one 4:4:4 8-bit pixel is 4
    // bytes, a 4:2:2 8-bit one 2, 16-bit kinds 8, 32-bit float 16 or 8.
    EXPECT_EQ((Word(kPixelFormat_BGRA_4444_8u) >> 1) & 7, 0u);
    EXPECT_EQ((Word(kPixelFormat_BGRA_4444_16u) >> 1) & 7, 2u);
    EXPECT_EQ((Word(kPixelFormat_BGRA_4444_16f) >> 1) & 7, 3u);
    EXPECT_EQ((Word(kPixelFormat_BGRA_4444_32f) >> 1) & 7, 5u);
    EXPECT_EQ((Word(kPixelFormat_MJPG_422_Compressed) >> 1) & 7, 1u);
    const PixelFormat yuv32f422 = PixelFormat::Make(
        MakePixelFormatCode('t', 'e', 's', 't'),
        MakePixelProperties(true, kPixelSampleKind_32f, 3, false, false, kPixelChroma_422, false,
                            kPixelFieldLayout_Interleaved, 1, 32));
    EXPECT_EQ(yuv32f422.GetBytesPerPixel(), 8u);
    const PixelFormat packed10 = PixelFormat::Make(
        MakePixelFormatCode('v', '2', '1', '0'),
        MakePixelProperties(true, kPixelSampleKind_10uPacked, 3, false, false, kPixelChroma_422,
                            false, kPixelFieldLayout_Interleaved, 1, 10));
    EXPECT_EQ(packed10.GetBytesPerPixel(), 0u);
    EXPECT_EQ(kPixelFormat_Any.GetBytesPerPixel(), 0u);
    EXPECT_EQ(kPixelFormat_Invalid.GetBytesPerPixel(), 0u);
}

TEST_F(PixelFormatTest, AnyAndInvalidAreDistinctWildcards)
{
    EXPECT_EQ(kPixelFormat_Invalid.GetValue(), 0u);
    EXPECT_EQ(PixelFormat(), kPixelFormat_Invalid);
    EXPECT_NE(kPixelFormat_Any, kPixelFormat_Invalid);
    EXPECT_TRUE(kPixelFormat_Any.IsAny());
    EXPECT_FALSE(kPixelFormat_Any.IsValid());
    EXPECT_FALSE(kPixelFormat_Invalid.IsValid());
    for (const PixelFormat wildcard : {kPixelFormat_Any, kPixelFormat_Invalid})
    {
        // Neither may ever be chosen as a render format.
        EXPECT_NE(Word(wildcard) & 0xC0000, 0x40000u);
        EXPECT_FALSE(wildcard.IsRGB());
        EXPECT_FALSE(wildcard.IsYUV());
    }
    std::set<std::uint64_t> values;
    for (const PixelFormat format : GetPixelFormatCatalogue())
        values.insert(format.GetValue());
    EXPECT_EQ(values.size(), GetPixelFormatCatalogue().size()) << "catalogue values collide";
    EXPECT_EQ(GetPixelFormatCatalogue().size(), Catalogue().size() + 2);
}

TEST_F(PixelFormatTest, NamesRoundTripAndUnknownNamesAreRejected)
{
    for (const PixelFormat format : GetPixelFormatCatalogue())
    {
        const std::string_view name = GetPixelFormatName(format);
        ASSERT_FALSE(name.empty());
        EXPECT_EQ(PixelFormatFromName(name), format) << name;
    }
    for (const Expected& e : Catalogue())
        EXPECT_EQ(GetPixelFormatName(e.format), e.name);
    EXPECT_EQ(GetPixelFormatName(kPixelFormat_Any), "Any");
    EXPECT_EQ(GetPixelFormatName(kPixelFormat_Invalid), "Invalid");
    EXPECT_EQ(GetPixelFormatName(PixelFormat(0x1234)), "");
    EXPECT_FALSE(PixelFormatFromName("bgra_4444_8u").has_value());
    EXPECT_FALSE(PixelFormatFromName("BGRA_4444_8u ").has_value());
    EXPECT_FALSE(PixelFormatFromName("").has_value());
}

TEST_F(PixelFormatTest, SelectNearestPrefersAnExactMatch)
{
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u,
                                       {kPixelFormat_BGRA_4444_32f, kPixelFormat_BGRA_4444_16u}),
              kPixelFormat_BGRA_4444_16u);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_YUYV_422_8u,
                                       {kPixelFormat_VUYA_4444_8u, kPixelFormat_YUYV_422_8u},
                                       kRenderQuality_Draft),
              kPixelFormat_YUYV_422_8u);
}

TEST_F(PixelFormatTest, SelectNearestPrefersTheSameModelThenNoPrecisionLoss)
{
    // Same model, deeper, beats same model shallower and the other model.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u,
                                       {kPixelFormat_VUYA_4444_32f, kPixelFormat_BGRA_4444_8u,
                                        kPixelFormat_BGRA_4444_32f}),
              kPixelFormat_BGRA_4444_32f);
    // Nothing deeper: the deepest below.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_32f,
                                       {kPixelFormat_BGRA_4444_8u, kPixelFormat_BGRA_4444_16u}),
              kPixelFormat_BGRA_4444_16u);
    // The colour model outranks depth.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_VUYA_4444_8u,
                                       {kPixelFormat_BGRA_4444_8u, kPixelFormat_VUYA_4444_32f}),
              kPixelFormat_VUYA_4444_32f);
    // An uncompressed request never lands on a compressed format while a raster one exists.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_YUYV_422_8u, {kPixelFormat_MJPG_422_Compressed,
                                                                  kPixelFormat_BGRA_4444_8u}),
              kPixelFormat_BGRA_4444_8u);
    // Same depth: same alpha handling, premultiplication and linearity decide.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRP_4444_32f_Linear,
                                       {kPixelFormat_BGRA_4444_16f, kPixelFormat_BGRA_4444_32f}),
              kPixelFormat_BGRA_4444_32f);
    EXPECT_EQ(
        SelectNearestPixelFormat(kPixelFormat_BGRA_4444_32f,
                                 {kPixelFormat_BGRP_4444_32f_Linear, kPixelFormat_BGRA_4444_32f}),
        kPixelFormat_BGRA_4444_32f);
    // Same depth, float-ness decides between 16-bit kinds.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16f,
                                       {kPixelFormat_BGRA_4444_16u, kPixelFormat_BGRA_4444_16f}),
              kPixelFormat_BGRA_4444_16f);
    // Among formats without alpha, the same chroma sampling decides.
    EXPECT_EQ(
        SelectNearestPixelFormat(kPixelFormat_YUYV_422_8u,
                                 {kPixelFormat_YUYV_422_8u_HalfWidthFields,
                                  kPixelFormat_YUYV_422_8u_Fields, kPixelFormat_VUYA_4444_8u}),
        kPixelFormat_YUYV_422_8u_Fields);
}

TEST_F(PixelFormatTest, SelectNearestAtDraftQualityTakesTheNearestDepthEitherWay)
{
    const std::vector<PixelFormat> list = {kPixelFormat_BGRA_4444_32f, kPixelFormat_BGRA_4444_8u};
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u, list, kRenderQuality_Low),
              kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u, list, kRenderQuality_Medium),
              kPixelFormat_BGRA_4444_32f);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u, list),
              kPixelFormat_BGRA_4444_32f);
    // A tie in distance goes to the shallower format.
    const PixelFormat rgb24 = PixelFormat::Make(
        MakePixelFormatCode('t', '2', '4', ' '),
        MakePixelProperties(false, kPixelSampleKind_16u, 4, true, false, kPixelChroma_444, false,
                            kPixelFieldLayout_Interleaved, 1, 24));
    EXPECT_EQ(SelectNearestPixelFormat(rgb24,
                                       {kPixelFormat_BGRA_4444_32f, kPixelFormat_BGRA_4444_16u},
                                       kRenderQuality_Draft),
              kPixelFormat_BGRA_4444_16u);
}

TEST_F(PixelFormatTest, SelectNearestKeepsListOrderOnEqualCandidates)
{
    const std::uint32_t properties = kPixelFormat_BGRA_4444_8u.GetProperties();
    const PixelFormat first =
        PixelFormat::Make(MakePixelFormatCode('R', 'G', 'B', 'A'), properties);
    const PixelFormat second =
        PixelFormat::Make(MakePixelFormatCode('A', 'R', 'G', 'B'), properties);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u, {first, second}), first);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_16u, {second, first}), second);
}

TEST_F(PixelFormatTest, SelectNearestHandlesAnyInvalidAndEmptyLists)
{
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_8u, {}), kPixelFormat_Invalid);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_Invalid, {kPixelFormat_BGRA_4444_8u}),
              kPixelFormat_Invalid);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_YUYV_422_8u,
                                       {kPixelFormat_BGRA_4444_8u, kPixelFormat_Any}),
              kPixelFormat_YUYV_422_8u);
    EXPECT_EQ(
        SelectNearestPixelFormat(kPixelFormat_Any, {kPixelFormat_Any, kPixelFormat_VUYA_4444_8u,
                                                    kPixelFormat_BGRA_4444_8u}),
        kPixelFormat_VUYA_4444_8u);
    // Lists of wildcards only offer nothing concrete.
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_BGRA_4444_8u, {kPixelFormat_Invalid}),
              kPixelFormat_Invalid);
    EXPECT_EQ(SelectNearestPixelFormat(kPixelFormat_Any, {kPixelFormat_Any}), kPixelFormat_Invalid);
}

TEST_F(PixelFormatTest, SelectNearestNeverAnswersAnUnacceptableFormat)
{
    const std::vector<PixelFormat> formats = Concrete();
    const std::size_t count = formats.size();
    for (std::uint32_t mask = 1; mask < (1u << count); ++mask)
    {
        std::vector<PixelFormat> list;
        for (std::size_t i = 0; i < count; ++i)
            if (mask & (1u << i))
                list.push_back(formats[i]);
        for (const PixelFormat requested : formats)
        {
            for (const std::uint32_t quality : {0u, 5u})
            {
                const PixelFormat chosen = SelectNearestPixelFormat(requested, list, quality);
                ASSERT_TRUE(std::find(list.begin(), list.end(), chosen) != list.end())
                    << "mask " << mask << " requested " << GetPixelFormatName(requested);
                if (std::find(list.begin(), list.end(), requested) != list.end())
                {
                    ASSERT_EQ(chosen, requested);
                }
            }
        }
    }
}

TEST_F(PixelFormatTest, SelectFromRankedRequestsFollowsTheDocumentedSteps)
{
    const PixelFormat bgra8 = kPixelFormat_BGRA_4444_8u;
    const PixelFormat bgra16 = kPixelFormat_BGRA_4444_16u;
    const PixelFormat bgra32 = kPixelFormat_BGRA_4444_32f;
    const PixelFormat yuyv = kPixelFormat_YUYV_422_8u;
    const PixelFormat vuya = kPixelFormat_VUYA_4444_8u;

    // 1. The caller's ranking wins among exact matches.
    EXPECT_EQ(SelectNearestPixelFormat({bgra32, bgra8}, yuyv, {bgra8, bgra32}, 5, true), bgra32);
    EXPECT_EQ(SelectNearestPixelFormat({bgra16, bgra8}, kPixelFormat_Invalid, {bgra8}, 5, false),
              bgra8);
    // 3. Without nearest selection nothing but an exact match or the fallback.
    EXPECT_EQ(SelectNearestPixelFormat({bgra16}, kPixelFormat_Invalid, {vuya, bgra32}, 5, false),
              kPixelFormat_Invalid);
    // 4. A format in hand that is acceptable needs no conversion.
    EXPECT_EQ(SelectNearestPixelFormat({bgra8}, yuyv, {vuya, yuyv}, 5, true), yuyv);
    // 5. Otherwise the nearest to the first request, at the given quality.
    EXPECT_EQ(SelectNearestPixelFormat({bgra16}, yuyv, {bgra8, bgra32}, 5, true), bgra32);
    EXPECT_EQ(SelectNearestPixelFormat({bgra16}, yuyv, {bgra8, bgra32}, 0, true), bgra8);
    // 2. "Any" offered: keep the format in hand, or give the caller its first choice.
    EXPECT_EQ(SelectNearestPixelFormat({bgra8}, yuyv, {kPixelFormat_Any}, 5, true), yuyv);
    EXPECT_EQ(SelectNearestPixelFormat({bgra8}, yuyv, {kPixelFormat_Any}, 5, false), bgra8);
    EXPECT_EQ(SelectNearestPixelFormat({bgra8}, kPixelFormat_Invalid, {kPixelFormat_Any}, 5, true),
              bgra8);
    // Requests of "any format".
    EXPECT_EQ(SelectNearestPixelFormat({kPixelFormat_Any}, yuyv, {bgra8, yuyv}, 5, true), yuyv);
    EXPECT_EQ(SelectNearestPixelFormat({kPixelFormat_Any}, bgra32, {vuya, bgra8}, 5, true), vuya);
    // 6. Nothing to choose from.
    EXPECT_EQ(SelectNearestPixelFormat({bgra8}, yuyv, {}, 5, true), yuyv);
    EXPECT_EQ(SelectNearestPixelFormat({}, yuyv, {bgra8}, 5, true), yuyv);
    EXPECT_EQ(
        SelectNearestPixelFormat({kPixelFormat_Invalid}, kPixelFormat_Invalid, {bgra8}, 5, true),
        kPixelFormat_Invalid);
}

} // namespace
} // namespace mvxmediatypes
