// The common node model: the sealed hash rebuilt from its byte runs,
// properties, inputs, operators, contracts and the prefetch walk.

#include "ContractExpect.h"
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
const QRT::ImmutableString kKeyC = QRT::ImmutableString::CreateStatic("C::Key");
const QRT::ImmutableString kKeyLong = QRT::ImmutableString::CreateStatic("A::KeyLonger");
const std::string kSeed = "ML::RenderableNodeCommonImpl";

using RenderableNodeCommonImplTest = ::testing::Test;

TEST_F(RenderableNodeCommonImplTest, OnlyHashedPropertiesAreMixedInKeyOrder)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    const std::string binary("a\0b", 3);
    // Written out of order: the map orders "A::Key" < "A::KeyLonger" < "B::Key".
    node->SetProperty(kKeyB, binary, true);
    node->SetProperty(kKeyLong, "3", true);
    node->SetProperty(kKeyA, "1", true);
    // Neither an unhashed value nor a removed one reaches the hash.
    node->SetProperty(kKeyC, "runtime", false);
    node->SetProperty(kKeyC, "gone", true);
    node->SetProperty(kKeyC, "", true);
    node->MakeImmutable();
    EXPECT_EQ(node->GetNodeHash(), HashOfRuns({kSeed, "PropertyName::", "A::Key", "PropertyValue::",
                                               "1", "PropertyName::", "A::KeyLonger",
                                               "PropertyValue::", "3", "PropertyName::", "B::Key",
                                               "PropertyValue::", binary, "NodeType::", "Leaf"}));
}

TEST_F(RenderableNodeCommonImplTest, InputsAndOperatorsAreHashedInOrderAndReadBackByIndex)
{
    const NodeRef child = MakeLeaf("Child");
    const NodeRef first = MakeLeaf("Effect1");
    const NodeRef second = MakeLeaf("Effect2");
    auto clip = MakeMutable<TestNode>("Clip", 0u);
    clip->AddInput(child, Ticks(250));
    clip->AddInput(nullptr, Ticks(-7)); // an empty slot mixes its offset only
    clip->AddOperator(first);
    clip->AddOperator(second);
    clip->MakeImmutable();

    ByteRuns runs({kSeed, "Input::", BytesOf<std::int64_t>(250), BytesOf(child->GetNodeHash()),
                   "Input::", BytesOf<std::int64_t>(-7), "NodeType::", "Clip"});
    EXPECT_EQ(clip->GetInputSideHash(), HashOfRuns(runs));
    runs.insert(runs.end(), {"Operator::", BytesOf(first->GetNodeHash()),
                             "Operator::", BytesOf(second->GetNodeHash())});
    EXPECT_EQ(clip->GetNodeHash(), HashOfRuns(runs));
    TickTime offset;
    NodeRef got;
    EXPECT_EQ(clip->GetInput(2, offset, got), QRT::kResult_NotFound);
    EXPECT_EQ(clip->GetOperator(1, got), QRT::kResult_Success);
    EXPECT_TRUE(got == second);
    EXPECT_EQ(clip->GetOperator(2, got), QRT::kResult_NotFound);
}

TEST_F(RenderableNodeCommonImplTest, SealedNodesRefuseWritesAndMutableNodesRefuseReads)
{
    auto node = MakeMutable<TestNode>("Leaf", 0u);
    TickTime offset;
    NodeRef got;
    ML::RenderableNodePrefetchList prefetches;
    EXPECT_INPUT_CONTRACT(node->GetNodeHash(), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetInputSideHash(), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetRenderFlags(), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetInput(0, offset, got), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->GetOperator(0, got), "!mMutable");
    EXPECT_INPUT_CONTRACT(node->Prefetch(Range(0, 1), ML::CutlistRenderParams(), prefetches),
                          "!mMutable");
    // A mutable input cannot be sealed into a parent, nor an empty operator.
    auto parent = MakeMutable<TestNode>("Parent", 0u);
    parent->AddInput(NodeRef(node.Get()), Ticks(0));
    EXPECT_INPUT_CONTRACT(parent->MakeImmutable(), "!mMutable");
    auto clip = MakeMutable<TestNode>("Clip", 0u);
    clip->AddOperator(nullptr);
    EXPECT_THROW(clip->MakeImmutable(), QRT::NullInterfaceException);
    EXPECT_TRUE(parent->IsMutable() && clip->IsMutable());

    node->MakeImmutable();
    EXPECT_INPUT_CONTRACT(node->SetProperty(kKeyA, "1", true), "mMutable");
    EXPECT_INPUT_CONTRACT(node->AddInput(nullptr, Ticks(0)), "mMutable");
    EXPECT_INPUT_CONTRACT(node->AddOperator(MakeLeaf("Effect")), "mMutable");
    EXPECT_INPUT_CONTRACT(node->MakeImmutable(), "mMutable");
}

TEST_F(RenderableNodeCommonImplTest, PrefetchShiftsInputRangesByOffsetsThenMapsThem)
{
    auto first = MakeMutable<TestNode>("Media", 0u);
    auto second = MakeMutable<TestNode>("Media", 0u);
    auto parent = MakeMutable<TestNode>("Clip", 84u);
    parent->AddInput(Seal(first), Ticks(100));
    parent->AddInput(nullptr, Ticks(0));
    parent->AddInput(Seal(second), Ticks(-50));
    // Media time = 1000 + 2 * t.
    parent->mTransform = MF::CreateTimeTransform(2.0, Ticks(0), Ticks(1000));
    parent->MakeImmutable();
    EXPECT_EQ(parent->GetRenderFlags(), 84u);

    ML::RenderableNodePrefetchList prefetches;
    parent->Prefetch(Range(300, 400), ML::CutlistRenderParams(), prefetches);
    using Ranges = std::vector<MF::TickTimeRange>;
    EXPECT_EQ(first->mPrefetchRanges, Ranges{Range(1400, 1600)});
    EXPECT_EQ(second->mPrefetchRanges, Ranges{Range(1700, 1900)});
    EXPECT_EQ(parent->mPrefetchRanges, Ranges{Range(300, 400)});
    EXPECT_TRUE(prefetches.empty());
}

} // namespace
} // namespace graphtest
