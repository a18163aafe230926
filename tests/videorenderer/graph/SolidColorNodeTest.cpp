// The solid-colour node, its producer's pixels and frame hash, and the disabled node.

#include "ML/RenderableNodes.h"
#include "QRT/Exception.h"
#include "TestNodeKinds.h"
#include "graph/RenderableNodeDisabledImpl.h"
#include "graph/RenderableNodeSolidColorImpl.h"

#include <array>
#include <cmath>
#include <cstring>
#include <string>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

ML::CutlistRenderParams Params(std::uint32_t inWidth, std::uint32_t inHeight,
                               mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
{
    ML::CutlistRenderParams params;
    params.mWidth = inWidth;
    params.mHeight = inHeight;
    params.mPixelFormat = inFormat;
    params.mPixelAspectRatio = mt::PixelAspectRatio(1, 1);
    return params;
}

QRT::InterfaceRef<ML::IRenderableNodeProducer> ProducerOf(const NodeRef& inNode,
                                                          const ML::CutlistRenderParams& inParams)
{
    QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
    QRT::InterfaceRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
        producer, inParams.GetFrameTime(), inParams);
    return producer;
}

QRT::Guid FrameHashOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    QRT::Guid hash;
    ProducerOf(inNode, inParams)->GetFrameHash(hash, inParams.GetFrameTime(), inParams);
    return hash;
}

NodeRef NodeWithColorText(const char* inText)
{
    auto node = MakeMutable<ML::RenderableNodeSolidColorImpl>();
    if (inText)
        node->SetProperty(QRT::ImmutableString::CreateStatic(ML::kSolidColorNodeColorKey), inText,
                          true);
    node->MakeImmutable();
    return node->GetSelfReference();
}

// One stored group of four samples (a pixel, or a YUYV pixel pair) that a fill
// must leave in memory, as values 0..1 (Cb and Cr of float Y'CbCr -0.5..0.5),
// the size and kind of a sample, and how far one may be off: one code of 8-
// and 16-bit samples, the rounding of half floats near 1, and float rounding
// (more for the sRGB curve) of floats.
struct ExpectedGroup
{
    int mBytes = 1;
    bool mFloat = false;
    std::array<double, 4> mValues{};
    double mTolerance = 0;
};

template <typename T>
T Load(const std::uint8_t* inBytes)
{
    T value{};
    std::memcpy(&value, inBytes, sizeof(T));
    return value;
}

double ReadSample(const std::uint8_t* inBytes, const ExpectedGroup& inGroup)
{
    if (inGroup.mBytes == 1)
        return inBytes[0] / 255.0;
    if (inGroup.mBytes == 4)
        return Load<float>(inBytes);
    const auto word = Load<std::uint16_t>(inBytes);
    if (!inGroup.mFloat)
        return word / 65535.0;
    // A half float; the fill's values are normal (2^-14..1) and not negative.
    return std::ldexp(1.0 + (word & 0x3FF) / 1024.0, ((word >> 10) & 0x1F) - 15);
}

// The samples of the frame's rows (inGroups groups each) that are off the group.
int WrongSamples(const FrameRef& inFrame, std::uint32_t inGroups, const ExpectedGroup& inGroup)
{
    const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
    int wrong = 0;
    for (std::int32_t row = 0; row < inFrame->GetBounds().Height(); ++row)
        for (std::uint32_t i = 0; i < inGroups * 4; ++i)
        {
            const double got =
                ReadSample(base + row * inFrame->GetRowBytes() + i * inGroup.mBytes, inGroup);
            if (std::abs(got - inGroup.mValues[i % 4]) > inGroup.mTolerance && wrong++ == 0)
                ADD_FAILURE() << "row " << row << " sample " << i << " is " << got << ", expected "
                              << inGroup.mValues[i % 4];
        }
    return wrong;
}

FrameRef Produce(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
{
    FrameRef frame;
    EXPECT_EQ(ProducerOf(inNode, inParams)->ProduceFrame({}, inParams, frame),
              QRT::kResult_Success);
    return frame;
}

using SolidColorNodeTest = ::testing::Test;

TEST_F(SolidColorNodeTest, ProducerFillsWithTheColourTheDefaultOrZero)
{
    const std::tuple<const char*, std::array<double, 4>> cases[] = {
        {"4280303712", {0x60 / 255.0, 0x40 / 255.0, 0x20 / 255.0, 1}}, // 0xFF204060
        {nullptr, {1, 1, 1, 1}},                                       // absent: opaque white
        {"red", {0, 0, 0, 0}}};                                        // unreadable: all zero
    for (const auto& [text, bgra] : cases)
    {
        SCOPED_TRACE(text ? text : "absent");
        const FrameRef frame = Produce(NodeWithColorText(text), Params(37, 5));
        ASSERT_TRUE(frame && frame->GetBounds() == QRT::ParamRect(0, 0, 37, 5));
        EXPECT_EQ(WrongSamples(frame, 37, {1, false, bgra, 0.1 / 255}), 0);
    }
}

// Every format a render can ask for (the packed raster formats of the catalogue) at
// two heights (below 720 rows Y'CbCr uses BT.601, from 720 on BT.709).
using SolidColorFillTest = ::testing::TestWithParam<std::tuple<mt::PixelFormat, std::uint32_t>>;

std::vector<mt::PixelFormat> RenderableFormats()
{
    std::vector<mt::PixelFormat> formats;
    for (const mt::PixelFormat format : mt::GetPixelFormatCatalogue())
        if (format.IsRaster() && !format.IsPlanar())
            formats.push_back(format);
    return formats;
}

constexpr std::uint32_t kColor = 0xC0336699u; // A 0xC0, R 0x33, G 0x66, B 0x99

ExpectedGroup ExpectedFill(mt::PixelFormat inFormat, std::uint32_t inHeight)
{
    const double b = 0x99 / 255.0, g = 0x66 / 255.0, r = 0x33 / 255.0, a = 0xC0 / 255.0;
    const double kr = inHeight < 720 ? 0.299 : 0.2126, kb = inHeight < 720 ? 0.114 : 0.0722;
    const double y = kr * r + (1 - kr - kb) * g + kb * b;
    const double cb = (b - y) / (2 * (1 - kb)), cr = (r - y) / (2 * (1 - kr));
    const double codeY = (16 + 219 * y) / 255, codeU = (128 + 224 * cb) / 255;
    const double codeV = (128 + 224 * cr) / 255, code = 1.0 / 255;
    const auto linear = [a](double inC)
    { return a * (inC <= 0.04045 ? inC / 12.92 : std::pow((inC + 0.055) / 1.055, 2.4)); };
    if (inFormat == mt::kPixelFormat_BGRA_4444_8u)
        return {1, false, {b, g, r, a}, code};
    if (inFormat == mt::kPixelFormat_BGRA_4444_16u)
        return {2, false, {b, g, r, a}, 1.0 / 65535};
    if (inFormat == mt::kPixelFormat_BGRA_4444_16f)
        return {2, true, {b, g, r, a}, 1.0 / 2048};
    if (inFormat == mt::kPixelFormat_BGRA_4444_32f)
        return {4, true, {b, g, r, a}, 1e-6};
    if (inFormat == mt::kPixelFormat_BGRP_4444_32f_Linear)
        return {4, true, {linear(b), linear(g), linear(r), a}, 1e-4};
    if (inFormat == mt::kPixelFormat_VUYA_4444_8u)
        return {1, false, {codeV, codeU, codeY, a}, code};
    if (inFormat == mt::kPixelFormat_VUYA_4444_32f)
        return {4, true, {cr, cb, y, a}, 1e-5};
    // The 4:2:2 formats: Y0 U Y1 V, alpha dropped.
    if (inFormat.IsYUV() && inFormat.GetChroma() != mt::kPixelChroma_444 && !inFormat.IsFloat())
        return {1, false, {codeY, codeU, codeY, codeV}, code};
    ADD_FAILURE() << "no expectation for " << mt::GetPixelFormatName(inFormat);
    return {};
}

TEST_P(SolidColorFillTest, EveryStoredSampleHoldsTheColourInTheRequestedFormat)
{
    const auto [format, height] = GetParam();
    const FrameRef frame = Produce(ML::CreateSolidColorNode(kColor), Params(6, height, format));
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetPixelFormat(), format);
    EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 6, height));
    // A YUYV group holds two pixels; a pixel-pair format's width counts groups.
    const std::uint32_t groups = format.GetChroma() == mt::kPixelChroma_422 ? 3 : 6;
    EXPECT_EQ(WrongSamples(frame, groups, ExpectedFill(format, height)), 0);
}

INSTANTIATE_TEST_SUITE_P(RenderableFormats, SolidColorFillTest,
                         ::testing::Combine(::testing::ValuesIn(RenderableFormats()),
                                            ::testing::Values(5u, 720u)),
                         [](const auto& inInfo)
                         {
                             return std::string(mt::GetPixelFormatName(std::get<0>(inInfo.param))) +
                                    "_" + std::to_string(std::get<1>(inInfo.param));
                         });

TEST_F(SolidColorNodeTest, FrameHashIsColourFormatSizeAndAspectButNotTime)
{
    ML::CutlistRenderParams params = Params(16, 9, mt::kPixelFormat_VUYA_4444_8u);
    params.mPixelAspectRatio = mt::PixelAspectRatio(10, 11);
    const QRT::Guid hash = FrameHashOf(ML::CreateSolidColorNode(0xFF0000FFu), params);
    EXPECT_EQ(hash, HashOfRuns({"RenderableNodeSolidColorImpl FrameHash",
                                BytesOf<std::uint32_t>(0xFF0000FFu),
                                BytesOf(mt::kPixelFormat_VUYA_4444_8u.GetValue()),
                                BytesOf<std::uint32_t>(16), BytesOf<std::uint32_t>(9),
                                BytesOf<std::uint32_t>(10), BytesOf<std::uint32_t>(11)}));
    params.SetFrameTime(MF::FrameTime(Ticks(705600000)));
    EXPECT_EQ(FrameHashOf(ML::CreateSolidColorNode(0xFF0000FFu), params), hash);
    // An absent colour and an explicit opaque white give interchangeable frames.
    EXPECT_EQ(FrameHashOf(NodeWithColorText(nullptr), params),
              FrameHashOf(ML::CreateSolidColorNode(0xFFFFFFFFu), params));
}

using RenderableNodeDisabledImplTest = ::testing::Test;

TEST_F(RenderableNodeDisabledImplTest, TakesItsFirstInputsFlagsAndRendersNothing)
{
    const NodeRef node = ML::CreateDisabledNode(MakeLeaf("Media", 93u), Ticks(12));
    EXPECT_EQ(node->GetRenderFlags(), 93u);
    EXPECT_FALSE(QRT::QueryRef<ML::IRenderableNodeProducerProvider>(node));
    EXPECT_EQ(Seal(MakeMutable<ML::RenderableNodeDisabledImpl>())->GetRenderFlags(), 0u);
    // The flag rule fails on an empty first input before anything is sealed.
    auto broken = MakeMutable<ML::RenderableNodeDisabledImpl>();
    broken->AddInput(nullptr, Ticks(0));
    EXPECT_THROW(broken->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_TRUE(broken->IsMutable());
    EXPECT_THROW(ML::CreateDisabledNode(nullptr, Ticks(0)), QRT::NullInterfaceException);
}

} // namespace
} // namespace graphtest
