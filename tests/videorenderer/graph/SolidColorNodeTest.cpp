// The solid-colour node, its producer's pixels and frame hash, and the disabled node.

#include "IR/ImageRenderer.h"
#include "ML/RenderableNodes.h"
#include "QRT/Exception.h"
#include "TestNodeKinds.h"
#include "graph/RenderableNodeDisabledImpl.h"
#include "graph/RenderableNodeSolidColorImpl.h"

#include <array>
#include <cstring>
#include <tuple>

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

using SolidColorNodeTest = ::testing::Test;

TEST_F(SolidColorNodeTest, ProducerFillsEveryPixelWithTheColourTheDefaultOrZero)
{
    // YUV pixels are whatever the image renderer's fill makes of the colour.
    std::uint8_t yuv[4];
    ASSERT_EQ(IR_FillWithColor(yuv, 4, kIR_PixelFormat_VUYA_4444_8u, 1, 1, 0xFF336699u, 0),
              kIR_NoError);
    const mt::PixelFormat bgra = mt::kPixelFormat_BGRA_4444_8u;
    const std::tuple<const char*, mt::PixelFormat, std::array<std::uint8_t, 4>> cases[] = {
        {"4280303712", bgra, {0x60, 0x40, 0x20, 0xFF}}, // 0xFF204060, B G R A in memory
        {nullptr, bgra, {0xFF, 0xFF, 0xFF, 0xFF}},      // absent: opaque white
        {"red", bgra, {0, 0, 0, 0}},                    // unreadable: all zero
        {"4281558681", mt::kPixelFormat_VUYA_4444_8u, {yuv[0], yuv[1], yuv[2], yuv[3]}}};
    for (const auto& [text, format, pixel] : cases)
    {
        SCOPED_TRACE(text ? text : "absent");
        const ML::CutlistRenderParams params = Params(37, 5, format);
        FrameRef frame;
        ASSERT_EQ(ProducerOf(NodeWithColorText(text), params)->ProduceFrame({}, params, frame),
                  QRT::kResult_Success);
        ASSERT_TRUE(frame && frame->GetBounds().Width() == 37 && frame->GetBounds().Height() == 5);
        EXPECT_EQ(frame->GetPixelFormat(), format);
        const auto* base = static_cast<const std::uint8_t*>(frame->GetBaseAddress());
        int mismatches = 0;
        for (int y = 0; y < 5; ++y)
            for (int x = 0; x < 37; ++x)
                mismatches +=
                    std::memcmp(pixel.data(), base + y * frame->GetRowBytes() + 4 * x, 4) != 0;
        EXPECT_EQ(mismatches, 0);
    }
}

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
