// The common node model: hashing, property maps, inputs, operators,
// contracts, flag rules and the prefetch walk.

#include "ContractExpect.h"
#include "ExpectedHash.h"
#include "MF/TimeTransform.h"
#include "QRT/Exception.h"
#include "TestNodeKinds.h"

#include <gtest/gtest.h>

namespace graphtest
{
namespace
{

const QRT::ImmutableString kKeyA = QRT::ImmutableString::CreateStatic("A::Key");
const QRT::ImmutableString kKeyB = QRT::ImmutableString::CreateStatic("B::Key");
const QRT::ImmutableString kKeyLong = QRT::ImmutableString::CreateStatic("A::KeyLonger");

class RenderableNodeCommonImplTest : public ::testing::Test
{
protected:
    static QRT::Guid HashOf(const QRT::InterfaceRef<TestNode>& inNode)
    {
        inNode->MakeImmutable();
        return inNode->GetNodeHash();
    }
};

TEST_F(RenderableNodeCommonImplTest, EmptyNodeHashesSeedAndKindOnly)
{
    const QRT::InterfaceRef<MF::IRenderableNode> node = MakeLeaf("Leaf");
    EXPECT_EQ(node->GetNodeHash(),
              HashOfRuns({"ML::RenderableNodeCommonImpl", "NodeType::", "Leaf"}));
    EXPECT_EQ(node->GetNodeType(), std::string_view("Leaf"));
    // Mixing the seed as one run with the kind differs: run boundaries count.
    EXPECT_NE(node->GetNodeHash(), HashOfRuns({"ML::RenderableNodeCommonImplNodeType::", "Leaf"}));
}

TEST_F(RenderableNodeCommonImplTest, HashedPropertiesAreMixedInKeyOrder)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    // Written out of order: the map orders by ImmutableString::Compare, so
    // "A::Key" < "A::KeyLonger" < "B::Key".
    node->SetProperty(kKeyB, "2", true);
    node->SetProperty(kKeyLong, "3", true);
    node->SetProperty(kKeyA, "1", true);
    EXPECT_EQ(HashOf(node), HashOfRuns({"ML::RenderableNodeCommonImpl", "PropertyName::", "A::Key",
                                        "PropertyValue::", "1", "PropertyName::", "A::KeyLonger",
                                        "PropertyValue::", "3", "PropertyName::", "B::Key",
                                        "PropertyValue::", "2", "NodeType::", "Leaf"}));
}

TEST_F(RenderableNodeCommonImplTest, BinaryPropertyValuesAreMixedWithEmbeddedZeros)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    const std::string value("a\0b", 3);
    node->SetProperty(kKeyA, value, true);
    EXPECT_EQ(HashOf(node), HashOfRuns({"ML::RenderableNodeCommonImpl", "PropertyName::", "A::Key",
                                        "PropertyValue::", value, "NodeType::", "Leaf"}));
}

TEST_F(RenderableNodeCommonImplTest, UnhashedPropertiesLeaveTheHashAlone)
{
    auto plain = MakeMutable<TestNode>("Leaf", 0u);
    auto annotated = MakeMutable<TestNode>("Leaf", 0u);
    annotated->SetProperty(kKeyA, "runtime", false);
    EXPECT_EQ(HashOf(plain), HashOf(annotated));

    MF::RenderablePropertyValue value;
    EXPECT_EQ(annotated->GetProperty(kKeyA, value), QRT::kResult_Success);
    EXPECT_EQ(value, "runtime");
}

TEST_F(RenderableNodeCommonImplTest, InputsMixOffsetAndChildHashAndEmptySlotsMixOffsetOnly)
{
    const QRT::InterfaceRef<MF::IRenderableNode> child = MakeLeaf("Child");
    auto parent = MakeMutable<TestNode>("Parent", 0u);
    parent->AddInput(child, Ticks(250));
    parent->AddInput(nullptr, Ticks(-7));
    EXPECT_EQ(HashOf(parent), HashOfRuns({"ML::RenderableNodeCommonImpl", "Input::", BytesOf(250),
                                          BytesOf(child->GetNodeHash()), "Input::", BytesOf(-7),
                                          "NodeType::", "Parent"}));
}

TEST_F(RenderableNodeCommonImplTest, OperatorsFollowTheInputSideHash)
{
    const QRT::InterfaceRef<MF::IRenderableNode> child = MakeLeaf("Child");
    const QRT::InterfaceRef<MF::IRenderableNode> first = MakeLeaf("Effect1");
    const QRT::InterfaceRef<MF::IRenderableNode> second = MakeLeaf("Effect2");
    auto clip = MakeMutable<TestNode>("Clip", 0u);
    clip->AddInput(child, Ticks(0));
    clip->AddOperator(first);
    clip->AddOperator(second);
    clip->MakeImmutable();

    const ByteRuns inputSide{"ML::RenderableNodeCommonImpl", "Input::",    BytesOf(0),
                             BytesOf(child->GetNodeHash()),  "NodeType::", "Clip"};
    ByteRuns full = inputSide;
    full.insert(full.end(), {"Operator::", BytesOf(first->GetNodeHash()),
                             "Operator::", BytesOf(second->GetNodeHash())});
    EXPECT_EQ(clip->GetInputSideHash(), HashOfRuns(inputSide));
    EXPECT_EQ(clip->GetNodeHash(), HashOfRuns(full));
}

TEST_F(RenderableNodeCommonImplTest, OffsetsSubtreesAndOperatorOrderChangeTheHash)
{
    const QRT::InterfaceRef<MF::IRenderableNode> childA = MakeLeaf("Child");
    const QRT::InterfaceRef<MF::IRenderableNode> childB = []
    {
        auto node = MakeMutable<TestNode>("Child", 0u);
        node->SetProperty(kKeyA, "deeper", true);
        return Seal(node);
    }();
    const QRT::InterfaceRef<MF::IRenderableNode> effect1 = MakeLeaf("Effect1");
    const QRT::InterfaceRef<MF::IRenderableNode> effect2 = MakeLeaf("Effect2");

    auto build = [&](const QRT::InterfaceRef<MF::IRenderableNode>& inChild, std::int64_t inOffset,
                     bool inSwapOperators)
    {
        auto node = MakeMutable<TestNode>("Clip", 0u);
        node->AddInput(inChild, Ticks(inOffset));
        node->AddOperator(inSwapOperators ? effect2 : effect1);
        node->AddOperator(inSwapOperators ? effect1 : effect2);
        return HashOf(node);
    };
    const QRT::Guid base = build(childA, 10, false);
    EXPECT_EQ(build(childA, 10, false), base);
    EXPECT_NE(build(childA, 11, false), base);
    EXPECT_NE(build(childB, 10, false), base);
    EXPECT_NE(build(childA, 10, true), base);
}

TEST_F(RenderableNodeCommonImplTest, ChangingAHashedValueOrKindChangesTheHash)
{
    auto one = MakeMutable<TestNode>("Leaf", 0u);
    auto two = MakeMutable<TestNode>("Leaf", 0u);
    auto other = MakeMutable<TestNode>("Leaf2", 0u);
    one->SetProperty(kKeyA, "1", true);
    two->SetProperty(kKeyA, "2", true);
    other->SetProperty(kKeyA, "1", true);
    const QRT::Guid hashOne = HashOf(one);
    EXPECT_NE(hashOne, HashOf(two));
    EXPECT_NE(hashOne, HashOf(other));
}

TEST_F(RenderableNodeCommonImplTest, PropertyLookupPrefersHashedAndEmptyValueRemoves)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    node->SetProperty(kKeyA, "unhashed", false);
    node->SetProperty(kKeyA, "hashed", true);
    node->SetProperty(kKeyB, "b", false);
    node->SetProperty(kKeyLong, "gone", true);
    node->SetProperty(kKeyLong, "", true);

    MF::RenderablePropertyValue value = "untouched";
    EXPECT_EQ(node->GetProperty(kKeyA, value), QRT::kResult_Success);
    EXPECT_EQ(value, "hashed");
    value = "untouched";
    EXPECT_EQ(node->GetProperty(kKeyLong, value), QRT::kResult_NotFound);
    EXPECT_EQ(value, "untouched");

    MF::RenderablePropertyMap all{{kKeyLong, "stale"}};
    node->GetProperties(all);
    const MF::RenderablePropertyMap expected{{kKeyA, "hashed"}, {kKeyB, "b"}};
    EXPECT_EQ(all, expected);

    // Removing the hashed value uncovers the unhashed one.
    node->SetProperty(kKeyA, "", true);
    EXPECT_EQ(node->GetProperty(kKeyA, value), QRT::kResult_Success);
    EXPECT_EQ(value, "unhashed");
}

TEST_F(RenderableNodeCommonImplTest, RemovedPropertyHashesLikeNeverSet)
{
    auto cleared = MakeMutable<TestNode>("Leaf", 0u);
    cleared->SetProperty(kKeyA, "x", true);
    cleared->SetProperty(kKeyA, "", true);
    EXPECT_EQ(HashOf(cleared), MakeLeaf("Leaf")->GetNodeHash());
}

TEST_F(RenderableNodeCommonImplTest, InputsAndOperatorsAreReadBackByIndex)
{
    const QRT::InterfaceRef<MF::IRenderableNode> child = MakeLeaf("Child");
    const QRT::InterfaceRef<MF::IRenderableNode> effect = MakeLeaf("Effect");
    auto node = MakeMutable<TestNode>("Parent", 0u);
    node->AddInput(child, Ticks(5));
    node->AddInput(nullptr, Ticks(9));
    node->AddOperator(effect);
    node->MakeImmutable();

    ASSERT_EQ(node->GetInputCount(), 2u);
    TickTime offset;
    QRT::InterfaceRef<MF::IRenderableNode> got;
    EXPECT_EQ(node->GetInput(0, offset, got), QRT::kResult_Success);
    EXPECT_EQ(offset, Ticks(5));
    EXPECT_TRUE(got == child);
    EXPECT_EQ(node->GetInput(1, offset, got), QRT::kResult_Success);
    EXPECT_EQ(offset, Ticks(9));
    EXPECT_FALSE(got);

    got = child;
    offset = Ticks(123);
    EXPECT_EQ(node->GetInput(2, offset, got), QRT::kResult_NotFound);
    EXPECT_EQ(offset, Ticks(123));
    EXPECT_TRUE(got == child);

    ASSERT_EQ(node->GetOperatorCount(), 1u);
    EXPECT_EQ(node->GetOperator(0, got), QRT::kResult_Success);
    EXPECT_TRUE(got == effect);
    EXPECT_EQ(node->GetOperator(1, got), QRT::kResult_NotFound);
    EXPECT_TRUE(got == effect);
}

TEST_F(RenderableNodeCommonImplTest, SealedNodesRefuseWritesAndMutableNodesRefuseReads)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    TickTime offset;
    QRT::InterfaceRef<MF::IRenderableNode> got;
    ML::RenderableNodePrefetchList prefetches;
    EXPECT_INPUT_CONTRACT(node->GetNodeHash(), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetRenderFlags(), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetInput(0, offset, got), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetOperator(0, got), "!mMutable");
    EXPECT_INPUT_CONTRACT(
        node->Prefetch({Ticks(0), Ticks(1)}, ML::CutlistRenderParams(), prefetches), "!mMutable");
    // Counts and properties may be read while building.
    EXPECT_EQ(node->GetInputCount(), 0u);

    node->MakeImmutable();
    EXPECT_INPUT_CONTRACT(node->SetProperty(kKeyA, "1", true), "mMutable");
    EXPECT_INPUT_CONTRACT(node->AddInput(nullptr, Ticks(0)), "mMutable");
    EXPECT_INPUT_CONTRACT(node->AddOperator(MakeLeaf("Effect")), "mMutable");
    EXPECT_INPUT_CONTRACT(node->MakeImmutable(), "mMutable");
    MF::RenderablePropertyValue value;
    EXPECT_EQ(node->GetProperty(kKeyA, value), QRT::kResult_NotFound);
}

TEST_F(RenderableNodeCommonImplTest, EmptyOperatorFailsTheSealAndLeavesTheNodeMutable)
{
    auto node = MakeMutable<TestNode>("Clip", 0u);
    node->AddOperator(nullptr);
    EXPECT_THROW(node->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_TRUE(node->IsMutable());
}

TEST_F(RenderableNodeCommonImplTest, SealingAMutableInputIsRefused)
{
    auto child = MakeMutable<TestNode>("Child", 0u);
    auto parent = MakeMutable<TestNode>("Parent", 0u);
    parent->AddInput(QRT::InterfaceRef<MF::IRenderableNode>(child.Get()), Ticks(0));
    EXPECT_INPUT_CONTRACT(parent->MakeImmutable(), "!mMutable");
    EXPECT_TRUE(parent->IsMutable());
}

TEST_F(RenderableNodeCommonImplTest, RenderFlagsComeFromTheKindAtSealing)
{
    EXPECT_EQ(MakeLeaf("Leaf", 84u)->GetRenderFlags(), 84u);
}

TEST_F(RenderableNodeCommonImplTest, TypedSettersWriteTheTextForm)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    node->SetTypedProperty(kKeyA, 0.1 + 0.2, true);
    node->SetTypedProperty(kKeyB, Ticks(-705600000), false);
    node->SetTypedProperty(kKeyLong, true, true);
    MF::RenderablePropertyValue value;
    node->GetProperty(kKeyA, value);
    EXPECT_EQ(value, "0.3");
    node->GetProperty(kKeyB, value);
    EXPECT_EQ(value, "-705600000");
    node->GetProperty(kKeyLong, value);
    EXPECT_EQ(value, "1");
}

TEST_F(RenderableNodeCommonImplTest, QueriesAnswerNodeAndPrefetchProviderOnly)
{
    const QRT::InterfaceRef<MF::IRenderableNode> node = MakeLeaf("Leaf");
    EXPECT_TRUE(QRT::QueryRef<ML::IRenderableNodePrefetchProvider>(node));
    EXPECT_FALSE(QRT::QueryRef<ML::IRenderableNodeProducerProvider>(node));
}

// --- Flag rules of the compositor-style and transition-style kinds -----------------------

class RenderFlagRuleTest : public ::testing::Test
{
};

TEST_F(RenderFlagRuleTest, CompositorWithoutInputsHas92)
{
    EXPECT_EQ(Seal(MakeMutable<TestCompositorNode>())->GetRenderFlags(), 92u);
}

TEST_F(RenderFlagRuleTest, CompositorAndsAllInputsWithItsMask)
{
    auto node = MakeMutable<TestCompositorNode>();
    node->AddInput(MakeLeaf("Media", 84u + 8u + 1u), Ticks(0));
    node->AddInput(MakeLeaf("Media", 84u + 128u), Ticks(0));
    // 93 & 212 & 92 = 84: the opaque, still and 128 bits do not survive.
    EXPECT_EQ(Seal(node)->GetRenderFlags(), 84u);
}

TEST_F(RenderFlagRuleTest, CompositorWithAnEmptyInputFailsToSeal)
{
    auto node = MakeMutable<TestCompositorNode>();
    node->AddInput(MakeLeaf("Media", 84u), Ticks(0));
    node->AddInput(nullptr, Ticks(0));
    EXPECT_THROW(node->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_TRUE(node->IsMutable());
}

TEST_F(RenderFlagRuleTest, TransitionWithoutInputsHas68AndSkipsEmptyInputs)
{
    EXPECT_EQ(Seal(MakeMutable<TestTransitionNode>())->GetRenderFlags(), 68u);

    auto node = MakeMutable<TestTransitionNode>();
    node->AddInput(nullptr, Ticks(0));
    node->AddInput(MakeLeaf("Media", 84u + 8u), Ticks(0));
    EXPECT_EQ(Seal(node)->GetRenderFlags(), 68u);

    auto withoutLayers = MakeMutable<TestTransitionNode>();
    withoutLayers->AddInput(MakeLeaf("Media", 84u), Ticks(0));
    withoutLayers->AddInput(MakeLeaf("Effectish", 4u), Ticks(0));
    EXPECT_EQ(Seal(withoutLayers)->GetRenderFlags(), 4u);
}

// --- The prefetch walk ---------------------------------------------------------------------

class RenderableNodePrefetchTest : public ::testing::Test
{
};

TEST_F(RenderableNodePrefetchTest, RangesAreShiftedByOffsetsThenMappedAndSelfComesLast)
{
    auto first = MakeMutable<TestNode>("Media", 0u);
    auto second = MakeMutable<TestNode>("Media", 0u);
    Seal(first);
    Seal(second);
    auto parent = MakeMutable<TestNode>("Clip", 0u);
    parent->AddInput(QRT::InterfaceRef<MF::IRenderableNode>(first.Get()), Ticks(100));
    parent->AddInput(nullptr, Ticks(0));
    parent->AddInput(QRT::InterfaceRef<MF::IRenderableNode>(second.Get()), Ticks(-50));
    // Media time = 1000 + 2 * t.
    parent->SetTimeTransform(MF::CreateTimeTransform(2.0, Ticks(0), Ticks(1000)));
    parent->MakeImmutable();

    ML::RenderableNodePrefetchList prefetches;
    parent->Prefetch({Ticks(300), Ticks(400)}, ML::CutlistRenderParams(), prefetches);

    ASSERT_EQ(first->mPrefetchRanges.size(), 1u);
    EXPECT_EQ(first->mPrefetchRanges[0], MF::TickTimeRange(Ticks(1400), Ticks(1600)));
    ASSERT_EQ(second->mPrefetchRanges.size(), 1u);
    EXPECT_EQ(second->mPrefetchRanges[0], MF::TickTimeRange(Ticks(1700), Ticks(1900)));
    ASSERT_EQ(parent->mPrefetchRanges.size(), 1u);
    EXPECT_EQ(parent->mPrefetchRanges[0], MF::TickTimeRange(Ticks(300), Ticks(400)));
    EXPECT_TRUE(prefetches.empty());
}

} // namespace
} // namespace graphtest
