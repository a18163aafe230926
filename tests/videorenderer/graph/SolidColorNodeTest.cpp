// The solid-colour node, its producer's pixels and frame hash, and the disabled node.

#include "IR/ImageRenderer.h"
#include "ML/RenderableNodes.h"
#include "QRT/Exception.h"
#include "TestNodeKinds.h"
#include "graph/RenderableNodeDisabledImpl.h"
#include "graph/RenderableNodeSolidColorImpl.h"

#include <cstring>

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

namespace mt = mvxmediatypes;
using FrameRef = QRT::InterfaceRef<MF::IVideoFrame>;

const QRT::ImmutableString kColorKey =
    QRT::ImmutableString::CreateStatic(ML::kSolidColorNodeColorKey);

class SolidColorNodeTest : public ::testing::Test
{
protected:
    static ML::CutlistRenderParams Params(std::uint32_t inWidth, std::uint32_t inHeight,
                                          mt::PixelFormat inFormat = mt::kPixelFormat_BGRA_4444_8u)
    {
        ML::CutlistRenderParams params;
        params.mWidth = inWidth;
        params.mHeight = inHeight;
        params.mPixelFormat = inFormat;
        params.mPixelAspectRatio = mt::PixelAspectRatio(1, 1);
        return params;
    }

    static QRT::InterfaceRef<ML::IRenderableNodeProducer>
    ProducerOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
    {
        QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
        QRT::InterfaceRef<ML::IRenderableNodeProducerProvider>(inNode)->GetProducer(
            producer, inParams.GetFrameTime(), inParams);
        return producer;
    }

    static QRT::Result Produce(const NodeRef& inNode, const ML::CutlistRenderParams& inParams,
                               FrameRef& outFrame)
    {
        outFrame.Reset();
        return ProducerOf(inNode, inParams)
            ->ProduceFrame(inParams.GetFrameTime(), inParams, outFrame);
    }

    static QRT::Guid FrameHashOf(const NodeRef& inNode, const ML::CutlistRenderParams& inParams)
    {
        QRT::Guid hash;
        ProducerOf(inNode, inParams)->GetFrameHash(hash, inParams.GetFrameTime(), inParams);
        return hash;
    }

    // Counts the pixels of a BGRA 8-bit frame that differ from inBGRA (B in the low byte).
    static int Mismatches(const FrameRef& inFrame, std::uint32_t inBGRA)
    {
        int mismatches = 0;
        for (int y = 0; y < inFrame->GetBounds().Height(); ++y)
            for (int x = 0; x < inFrame->GetBounds().Width(); ++x)
            {
                std::uint32_t pixel = 0;
                std::memcpy(&pixel,
                            static_cast<const std::uint8_t*>(inFrame->GetBaseAddress()) +
                                y * inFrame->GetRowBytes() + 4 * x,
                            4);
                mismatches += pixel != inBGRA;
            }
        return mismatches;
    }

    static NodeRef NodeWithColorText(const char* inText)
    {
        auto node = MakeMutable<ML::RenderableNodeSolidColorImpl>();
        if (inText)
            node->SetProperty(kColorKey, inText, true);
        node->MakeImmutable();
        return node->GetSelfReference();
    }
};

TEST_F(SolidColorNodeTest, NodeStoresTheColourAsHashedDecimal)
{
    const NodeRef node = ML::CreateSolidColorNode(0x80FF4010u);
    MF::RenderablePropertyValue value;
    ASSERT_EQ(node->GetProperty(kColorKey, value), QRT::kResult_Success);
    EXPECT_EQ(value, "2164211728");
    EXPECT_EQ(node->GetRenderFlags(), 0u);
    EXPECT_EQ(node->GetNodeHash(),
              HashOfRuns(
                  {"ML::RenderableNodeCommonImpl", "PropertyName::", ML::kSolidColorNodeColorKey,
                   "PropertyValue::", "2164211728", "NodeType::", "RenderableNodeSolidColorImpl"}));
    EXPECT_EQ(node->GetNodeHash(), NodeWithColorText("2164211728")->GetNodeHash());
}

TEST_F(SolidColorNodeTest, ProducerFillsEveryPixelWithTheColourTheDefaultOrZero)
{
    const ML::CutlistRenderParams params = Params(37, 5);
    const std::pair<const char*, std::uint32_t> cases[] = {
        {"4280303712", 0xFF204060u}, // 0xFF204060: A, R, G, B from the high byte down
        {nullptr, 0xFFFFFFFFu},      // absent: opaque white
        {"red", 0u},                 // unreadable: all zero
        {"-1", 0u},
        {"4294967296", 0u},
        {"12 ", 0u},
    };
    for (const auto& [text, expected] : cases)
    {
        SCOPED_TRACE(text ? text : "absent");
        FrameRef frame;
        ASSERT_EQ(Produce(NodeWithColorText(text), params, frame), QRT::kResult_Success);
        ASSERT_TRUE(frame);
        EXPECT_EQ(frame->GetPixelFormat(), mt::kPixelFormat_BGRA_4444_8u);
        EXPECT_EQ(frame->GetBounds().Width(), 37);
        EXPECT_EQ(frame->GetBounds().Height(), 5);
        EXPECT_EQ(Mismatches(frame, expected), 0);
    }
}

TEST_F(SolidColorNodeTest, FramesThatCannotBeMadeOrFilledAnswerAStatusAndNoFrame)
{
    const struct
    {
        std::uint32_t mWidth;
        mt::PixelFormat mFormat;
        QRT::Result mStatus;
    } cases[] = {{0, mt::kPixelFormat_BGRA_4444_8u, QRT::kResult_NotFound},
                 {4, mt::kPixelFormat_Invalid, QRT::kResult_NotFound},
                 {4, mt::kPixelFormat_BGRA_4444_16u, kIR_UnsupportedFormat}};
    for (const auto& test : cases)
    {
        FrameRef frame;
        EXPECT_EQ(Produce(ML::CreateSolidColorNode(0xFF000000u),
                          Params(test.mWidth, 4, test.mFormat), frame),
                  test.mStatus);
        EXPECT_FALSE(frame);
    }
}

TEST_F(SolidColorNodeTest, YuvFramesMatchTheImageRendererFill)
{
    FrameRef frame;
    ASSERT_EQ(Produce(ML::CreateSolidColorNode(0xFF336699u),
                      Params(6, 2, mt::kPixelFormat_VUYA_4444_8u), frame),
              QRT::kResult_Success);
    std::uint8_t expected[4 * 6];
    ASSERT_EQ(IR_FillWithColor(expected, sizeof(expected), kIR_PixelFormat_VUYA_4444_8u, 6, 1,
                               0xFF336699u, 0),
              kIR_NoError);
    for (int y = 0; y < 2; ++y)
        EXPECT_EQ(std::memcmp(static_cast<const std::uint8_t*>(frame->GetBaseAddress()) +
                                  y * frame->GetRowBytes(),
                              expected, sizeof(expected)),
                  0)
            << "row " << y;
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
    ML::CutlistRenderParams later = params;
    later.SetFrameTime(MF::FrameTime(Ticks(705600000)));
    EXPECT_EQ(FrameHashOf(ML::CreateSolidColorNode(0xFF0000FFu), later), hash);
    // An absent colour and an explicit opaque white give interchangeable frames.
    EXPECT_EQ(FrameHashOf(NodeWithColorText(nullptr), params),
              FrameHashOf(ML::CreateSolidColorNode(0xFFFFFFFFu), params));
}

class RenderableNodeDisabledImplTest : public ::testing::Test
{
};

TEST_F(RenderableNodeDisabledImplTest, TakesItsFirstInputsFlagsAndRendersNothing)
{
    const NodeRef child = MakeLeaf("Media", 93u);
    const NodeRef node = ML::CreateDisabledNode(child, Ticks(12));
    EXPECT_EQ(node->GetNodeType(), std::string_view("RenderableNodeDisabledImpl"));
    EXPECT_EQ(node->GetRenderFlags(), 93u);
    EXPECT_FALSE(QRT::QueryRef<ML::IRenderableNodeProducerProvider>(node));
    EXPECT_TRUE(QRT::QueryRef<ML::IRenderableNodePrefetchProvider>(node));
    // It still counts in hashes: the subtree and its offset are covered.
    EXPECT_NE(node->GetNodeHash(), ML::CreateDisabledNode(child, Ticks(13))->GetNodeHash());
}

TEST_F(RenderableNodeDisabledImplTest, WithoutInputsFlagsAreZeroAndEmptyFirstInputFails)
{
    EXPECT_EQ(Seal(MakeMutable<ML::RenderableNodeDisabledImpl>())->GetRenderFlags(), 0u);
    auto broken = MakeMutable<ML::RenderableNodeDisabledImpl>();
    broken->AddInput(nullptr, Ticks(0));
    // The flag rule fails before anything is sealed.
    EXPECT_THROW(broken->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_TRUE(broken->IsMutable());
    EXPECT_THROW(ML::CreateDisabledNode(nullptr, Ticks(0)), QRT::NullInterfaceException);
}

} // namespace
} // namespace graphtest
