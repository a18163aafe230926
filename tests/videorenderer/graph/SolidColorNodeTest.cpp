// The solid-colour node, its producer's pixels and hash, and the disabled node.

#include "IR/ImageRenderer.h"
#include "ML/RenderableNodes.h"
#include "TestNodeKinds.h"
#include "graph/RenderableNodeDisabledImpl.h"
#include "graph/RenderableNodeSolidColorImpl.h"

#include <cstring>

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

const QRT::ImmutableString kColorKey =
    QRT::ImmutableString::CreateStatic(ML::kSolidColorNodeColorKey);

class SolidColorNodeTest : public ::testing::Test
{
protected:
    static ML::CutlistRenderParams
    Params(std::uint32_t inWidth, std::uint32_t inHeight,
           mvxmediatypes::PixelFormat inFormat = mvxmediatypes::kPixelFormat_BGRA_4444_8u)
    {
        ML::CutlistRenderParams params;
        params.mWidth = inWidth;
        params.mHeight = inHeight;
        params.mPixelFormat = inFormat;
        params.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(1, 1);
        return params;
    }

    static QRT::InterfaceRef<ML::IRenderableNodeProducer>
    ProducerOf(const QRT::InterfaceRef<MF::IRenderableNode>& inNode,
               const ML::CutlistRenderParams& inParams)
    {
        const QRT::InterfaceRef<ML::IRenderableNodeProducerProvider> provider(inNode);
        QRT::InterfaceRef<ML::IRenderableNodeProducer> producer;
        provider->GetProducer(producer, inParams.GetFrameTime(), inParams);
        return producer;
    }

    // Every pixel of a BGRA 8-bit frame, checked against one B, G, R, A quadruple.
    static void ExpectAllPixels(const QRT::InterfaceRef<MF::IVideoFrame>& inFrame, std::uint8_t inB,
                                std::uint8_t inG, std::uint8_t inR, std::uint8_t inA)
    {
        const QRT::ParamRect bounds = inFrame->GetBounds();
        const auto* base = static_cast<const std::uint8_t*>(inFrame->GetBaseAddress());
        int mismatches = 0;
        for (int y = 0; y < bounds.Height(); ++y)
        {
            const std::uint8_t* row = base + y * inFrame->GetRowBytes();
            for (int x = 0; x < bounds.Width(); ++x)
            {
                const std::uint8_t* pixel = row + 4 * x;
                if (pixel[0] != inB || pixel[1] != inG || pixel[2] != inR || pixel[3] != inA)
                    ++mismatches;
            }
        }
        EXPECT_EQ(mismatches, 0);
    }

    static QRT::InterfaceRef<MF::IRenderableNode> NodeWithColorText(const char* inText)
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
    const QRT::InterfaceRef<MF::IRenderableNode> node = ML::CreateSolidColorNode(0x80FF4010u);
    EXPECT_EQ(node->GetNodeType(), std::string_view("RenderableNodeSolidColorImpl"));
    MF::RenderablePropertyValue value;
    ASSERT_EQ(node->GetProperty(kColorKey, value), QRT::kResult_Success);
    EXPECT_EQ(value, "2164211728");
    EXPECT_EQ(node->GetRenderFlags(), 0u);
    EXPECT_NE(node->GetNodeHash(), ML::CreateSolidColorNode(0x80FF4011u)->GetNodeHash());
    EXPECT_EQ(node->GetNodeHash(), ML::CreateSolidColorNode(0x80FF4010u)->GetNodeHash());
}

TEST_F(SolidColorNodeTest, ProducerFillsEveryPixelWithTheColour)
{
    const ML::CutlistRenderParams params = Params(37, 5);
    const auto producer = ProducerOf(ML::CreateSolidColorNode(0xFF204060u), params);
    ASSERT_TRUE(producer);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    ASSERT_EQ(producer->ProduceFrame(params.GetFrameTime(), params, frame), QRT::kResult_Success);
    ASSERT_TRUE(frame);
    EXPECT_EQ(frame->GetPixelFormat(), mvxmediatypes::kPixelFormat_BGRA_4444_8u);
    EXPECT_EQ(frame->GetBounds().Width(), 37);
    EXPECT_EQ(frame->GetBounds().Height(), 5);
    ExpectAllPixels(frame, 0x60, 0x40, 0x20, 0xFF);
}

TEST_F(SolidColorNodeTest, AbsentColourIsOpaqueWhiteAndUnreadableColourIsZero)
{
    const ML::CutlistRenderParams params = Params(8, 3);
    QRT::InterfaceRef<MF::IVideoFrame> frame;

    ASSERT_EQ(ProducerOf(NodeWithColorText(nullptr), params)
                  ->ProduceFrame(params.GetFrameTime(), params, frame),
              QRT::kResult_Success);
    ExpectAllPixels(frame, 0xFF, 0xFF, 0xFF, 0xFF);

    for (const char* bad : {"red", "-1", "4294967296", "12 "})
    {
        frame.Reset();
        ASSERT_EQ(ProducerOf(NodeWithColorText(bad), params)
                      ->ProduceFrame(params.GetFrameTime(), params, frame),
                  QRT::kResult_Success);
        ExpectAllPixels(frame, 0, 0, 0, 0);
    }
}

TEST_F(SolidColorNodeTest, UnmakeableFrameAnswersNotFoundAndNoFrame)
{
    const ML::CutlistRenderParams params = Params(0, 4);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    EXPECT_EQ(ProducerOf(ML::CreateSolidColorNode(0xFF000000u), params)
                  ->ProduceFrame(params.GetFrameTime(), params, frame),
              QRT::kResult_NotFound);
    EXPECT_FALSE(frame);

    const ML::CutlistRenderParams invalid = Params(4, 4, mvxmediatypes::kPixelFormat_Invalid);
    EXPECT_EQ(ProducerOf(ML::CreateSolidColorNode(0xFF000000u), invalid)
                  ->ProduceFrame(invalid.GetFrameTime(), invalid, frame),
              QRT::kResult_NotFound);
    EXPECT_FALSE(frame);
}

TEST_F(SolidColorNodeTest, FormatTheFillCannotWriteIsRefusedWithoutAFrame)
{
    const ML::CutlistRenderParams params = Params(4, 4, mvxmediatypes::kPixelFormat_BGRA_4444_16u);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    EXPECT_EQ(ProducerOf(ML::CreateSolidColorNode(0xFF000000u), params)
                  ->ProduceFrame(params.GetFrameTime(), params, frame),
              kIR_UnsupportedFormat);
    EXPECT_FALSE(frame);
}

TEST_F(SolidColorNodeTest, YuvFramesMatchTheImageRendererFill)
{
    const ML::CutlistRenderParams params = Params(6, 2, mvxmediatypes::kPixelFormat_VUYA_4444_8u);
    QRT::InterfaceRef<MF::IVideoFrame> frame;
    ASSERT_EQ(ProducerOf(ML::CreateSolidColorNode(0xFF336699u), params)
                  ->ProduceFrame(params.GetFrameTime(), params, frame),
              QRT::kResult_Success);
    std::uint8_t expected[4 * 6];
    ASSERT_EQ(IR_FillWithColor(expected, sizeof(expected), kIR_PixelFormat_VUYA_4444_8u, 6, 1,
                               0xFF336699u, 0),
              kIR_NoError);
    for (int y = 0; y < 2; ++y)
    {
        const auto* row =
            static_cast<const std::uint8_t*>(frame->GetBaseAddress()) + y * frame->GetRowBytes();
        EXPECT_EQ(std::memcmp(row, expected, sizeof(expected)), 0) << "row " << y;
    }
}

TEST_F(SolidColorNodeTest, FrameHashFollowsColourAndFormatButNotTime)
{
    ML::CutlistRenderParams params = Params(16, 9);
    QRT::Guid base;
    ProducerOf(ML::CreateSolidColorNode(0xFF0000FFu), params)
        ->GetFrameHash(base, params.GetFrameTime(), params);

    auto hashWith = [&](std::uint32_t inColor, const ML::CutlistRenderParams& inParams)
    {
        QRT::Guid hash;
        ProducerOf(ML::CreateSolidColorNode(inColor), inParams)
            ->GetFrameHash(hash, inParams.GetFrameTime(), inParams);
        return hash;
    };

    ML::CutlistRenderParams later = params;
    later.SetFrameTime(MF::FrameTime(Ticks(705600000)));
    EXPECT_EQ(hashWith(0xFF0000FFu, later), base);

    EXPECT_NE(hashWith(0xFF0000FEu, params), base);
    ML::CutlistRenderParams changed = params;
    changed.mWidth = 17;
    EXPECT_NE(hashWith(0xFF0000FFu, changed), base);
    changed = params;
    changed.mHeight = 10;
    EXPECT_NE(hashWith(0xFF0000FFu, changed), base);
    changed = params;
    changed.mPixelFormat = mvxmediatypes::kPixelFormat_VUYA_4444_8u;
    EXPECT_NE(hashWith(0xFF0000FFu, changed), base);
    changed = params;
    changed.mPixelAspectRatio = mvxmediatypes::PixelAspectRatio(10, 11);
    EXPECT_NE(hashWith(0xFF0000FFu, changed), base);

    // An absent colour and an explicit opaque white give interchangeable frames.
    QRT::Guid white;
    ProducerOf(NodeWithColorText(nullptr), params)->GetFrameHash(white, params, params);
    EXPECT_EQ(white, hashWith(0xFFFFFFFFu, params));
}

class RenderableNodeDisabledImplTest : public ::testing::Test
{
};

TEST_F(RenderableNodeDisabledImplTest, TakesItsFirstInputsFlagsAndRendersNothing)
{
    const QRT::InterfaceRef<MF::IRenderableNode> child = MakeLeaf("Media", 93u);
    const QRT::InterfaceRef<MF::IRenderableNode> node = ML::CreateDisabledNode(child, Ticks(12));
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
    EXPECT_THROW(broken->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_THROW(ML::CreateDisabledNode(nullptr, Ticks(0)), QRT::NullInterfaceException);
}

} // namespace
} // namespace graphtest
