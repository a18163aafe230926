// The effect node: the exported match names, the keys SetEffect writes and
// which of them the hash covers, render flags from the effect's time
// variance, operators (none for opacity and motion), operator hashes, and
// the time an operator renders at.

#include "FX/EffectCatalogue.h"
#include "ML/MatchNames.h"
#include "ML/RenderFlags.h"
#include "QRT/Allocated.h"
#include "TestFrames.h"
#include "graph/RenderableNodeEffectImpl.h"

#include <atomic>
#include <set>
#include <thread>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;
using mt::TickTime;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;

// An effect of a given match name, time variance and parameters, that renders nothing.
class TestEffect : public QRT::Implements<FX::IEffect>
{
public:
    TestEffect(std::string inMatch, bool inTimeVariant, std::vector<FX::EffectParam> inParams,
               bool inReentrant = true)
        : mMatch(std::move(inMatch))
        , mTimeVariant(inTimeVariant)
        , mParams(std::move(inParams))
        , mReentrant(inReentrant)
    {
    }
    const std::string& GetMatchName() const override { return mMatch; }
    bool GetOpaqueData(MF::BinaryData&) const override { return false; }
    std::uint32_t GetParamCount() const override { return std::uint32_t(mParams.size()); }
    const FX::EffectParam& GetParam(std::uint32_t inIndex) const override
    {
        return mParams[inIndex];
    }
    bool HasDuration() const override { return false; }
    TickTime GetDuration() const override { return {}; }
    bool IsTimeVariant() const override { return mTimeVariant; }
    bool IsReentrant() const override { return mReentrant; }
    std::uint32_t GetInstanceID() const override { return 0; }
    // Counts the renders and notes whether two ever ran at once: each render
    // waits a little for a second one to come in beside it.
    QRT::Result Render(const FX::RenderContext&, QRT::InterfaceRef<MF::IVideoFrame>&,
                       const FX::LayerInputs&) override
    {
        ++mRenders;
        bool together = mInside.fetch_add(1) > 0;
        for (int spin = 0; spin < 2000 && !together; ++spin)
        {
            std::this_thread::yield();
            together = mInside.load() > 1;
        }
        mOverlapped = mOverlapped || together;
        --mInside;
        return QRT::kResult_Success;
    }

    std::atomic<int> mRenders{0};
    std::atomic<bool> mOverlapped{false};

private:
    std::string mMatch;
    bool mTimeVariant;
    std::vector<FX::EffectParam> mParams;
    bool mReentrant;
    std::atomic<int> mInside{0};
};

NodeRef Node(const QRT::InterfaceRef<FX::IEffect>& inEffect, const std::string& inLabel = {})
{
    return CreateEffectNode({inEffect, mt::kFrameRate_Video25, inLabel, {}});
}

NodeRef Node(const BE::EffectSettings& inSettings, std::optional<TickTime> inDuration = {})
{
    const FX::EffectMade made = FX::CreateEffect(inSettings, inDuration);
    EXPECT_TRUE(made.mEffect) << made.mError;
    return Node(made.mEffect);
}

NodeRef Node(const std::string& inMatch, bool inTimeVariant,
             std::vector<FX::EffectParam> inParams = {})
{
    return Node(QRT::Allocated<TestEffect>::Create<FX::IEffect>(inMatch, inTimeVariant,
                                                                std::move(inParams)));
}

BE::EffectSettings Settings(std::string_view inMatch, std::map<std::string, std::string> inParams)
{
    BE::EffectSettings settings;
    settings.mMatchName = std::string(inMatch);
    settings.mParams = std::move(inParams);
    return settings;
}

std::string Property(const NodeRef& inNode, const char* inKey)
{
    MF::RenderablePropertyValue value;
    inNode->GetProperty(QRT::ImmutableString::CreateStatic(inKey), value);
    return std::string(value.begin(), value.end());
}

QRT::InterfaceRef<IRenderableNodeOperator> Operator(const NodeRef& inNode)
{
    QRT::InterfaceRef<IRenderableNodeOperator> made;
    QRT::QueryRef<IRenderableNodeOperatorProvider>(inNode)->CreateOperator(
        made, MF::FrameTime(), vrtest::MakeParams(8, 4));
    return made;
}

QRT::Guid OperatorHash(const NodeRef& inNode, double inSeconds,
                       const CutlistRenderParams& inParams = vrtest::MakeParams(8, 4))
{
    QRT::Guid hash;
    EXPECT_EQ(Operator(inNode)->GetOperatorHash(
                  hash, MF::FrameTime(TickTime::FromSeconds(inSeconds)), inParams),
              QRT::kResult_Success);
    return hash;
}

TEST(EffectNodeTest, ExportsTheThirtyFiveMatchNames)
{
    const auto& names = GetExportedMatchNames();
    std::set<std::string_view> distinct;
    for (const QRT::ImmutableString* name : names)
        distinct.insert(name->ToStringView());
    EXPECT_EQ(distinct.size(), 35u);
    EXPECT_EQ(kMatchnameTransform, std::string_view("KX.VNTR Geometry"));
    EXPECT_EQ(kMatchnameVolumeAdaptive, std::string_view("Internal Volume 16 Channel"));
    EXPECT_EQ(kMatchnameChannelVolumeAdaptive,
              std::string_view("Internal Channel Volume 16 Channel"));
    EXPECT_EQ(kTalusMatchName, std::string_view("Orvl.TimeWarp"));
    EXPECT_EQ(kMatchnameProcamp, std::string_view("KX.VNTR ProcAmp"));
    // Every effect of the host's catalogue is an exported name or one of its own two.
    for (const std::string& name : FX::GetEffectMatchNames())
        EXPECT_TRUE(distinct.contains(name) || name == "VR.Crop" || name == "VR.GaussianBlur")
            << name;
}

TEST(EffectNodeTest, SetEffectWritesItsKeysAndTheHashLeavesOutTheInstance)
{
    BE::EffectSettings settings = Settings(FX::kMatch_Crop, {{"left", "10"}});
    settings.mOpaqueData = MF::BinaryData::FromText("st");
    const FX::EffectMade made = FX::CreateEffect(settings, TickTime::FromSeconds(2));
    const NodeRef node = Node(made.mEffect, "V1");
    EXPECT_EQ(Property(node, "EffectNode::FilterMatchName"), "VR.Crop");
    EXPECT_EQ(Property(node, "EffectNode::StreamLabel"), "V1");
    EXPECT_EQ(Property(node, "EffectNode::EffectDuration"),
              std::to_string(TickTime::FromSeconds(2).GetTicks()));
    EXPECT_EQ(Property(node, "EffectNode::FilterOpaqueData"), "7374");
    EXPECT_EQ(Property(node, "EffectNode::FilterParams"), "4\nleft=10\ntop=0\nright=0\nbottom=0\n");
    EXPECT_EQ(Property(node, "EffectNode::RuntimeInstanceID"),
              std::to_string(made.mEffect->GetInstanceID()));

    // Another effect of the same settings has another instance number and the same hash.
    const NodeRef same = Node(FX::CreateEffect(settings, TickTime::FromSeconds(2)).mEffect, "V1");
    EXPECT_NE(Property(same, "EffectNode::RuntimeInstanceID"),
              Property(node, "EffectNode::RuntimeInstanceID"));
    EXPECT_EQ(same->GetNodeHash(), node->GetNodeHash());
    settings.mParams["left"] = "11";
    EXPECT_NE(Node(settings, TickTime::FromSeconds(2))->GetNodeHash(), node->GetNodeHash());
    EXPECT_NE(Node(made.mEffect, "V2")->GetNodeHash(), node->GetNodeHash());
    EXPECT_EQ(Property(Node(settings), "EffectNode::EffectDuration"), "");
}

FX::EffectParam Layer(double inValue)
{
    return {"layer", FX::ParamType::kLayer, BE::KeyframeCurve::Scalar(inValue)};
}

TEST(EffectNodeTest, RenderFlagsFollowTheEffectsTimeVariance)
{
    BE::EffectSettings keyed = Settings(FX::kMatch_Crop, {});
    keyed.mKeyframedParams["left"] = BE::KeyframeCurve::Scalar(
        0, {{TickTime(), {0, 0}, {}, {}, {}}, {TickTime::FromSeconds(1), {5, 0}, {}, {}, {}}});
    const struct
    {
        NodeRef mNode;
        std::uint32_t mFlags;
    } cases[] = {
        {Node(Settings(FX::kMatch_Crop, {{"left", "5"}})), 76},
        {Node(keyed), 68},
        {Node("Test.Clock", true), 68},
        {Node("Test.Layer", false, {Layer(FX::kNoLayer)}), 76},
        {Node("Test.Layer", false, {Layer(2)}), 68},
    };
    for (const auto& c : cases)
        EXPECT_EQ(c.mNode->GetRenderFlags(), c.mFlags)
            << Property(c.mNode, "EffectNode::FilterParams");
}

TEST(EffectNodeTest, OpacityAndMotionMakeNoOperator)
{
    EXPECT_FALSE(Operator(Node(std::string(kMatchnameOpacity), false)));
    EXPECT_FALSE(Operator(Node(std::string(kMatchnameMotion), false)));
    EXPECT_TRUE(Operator(Node("Test.Other", false)));
}

TEST(EffectNodeTest, OperatorHashesChangeWithTimeOnlyForTimeVariantEffects)
{
    const NodeRef still = Node("Test.Still", false);
    const NodeRef clock = Node("Test.Clock", true);
    EXPECT_EQ(OperatorHash(still, 0), OperatorHash(still, 3.5));
    EXPECT_NE(OperatorHash(clock, 0), OperatorHash(clock, 3.5));
    EXPECT_NE(OperatorHash(still, 0), OperatorHash(Node("Test.Other", false), 0));
    CutlistRenderParams other = vrtest::MakeParams(8, 4);
    other.mQuality = 5;
    EXPECT_NE(OperatorHash(still, 0), OperatorHash(still, 0, other));
}

TEST(EffectNodeTest, AnOperatorRendersAtTheClipsTimeNotTheInputs)
{
    BE::EffectSettings settings = Settings(FX::kMatch_ProcAmp, {});
    settings.mKeyframedParams["brightness"] = BE::KeyframeCurve::Scalar(
        0, {{TickTime(), {0, 0}, {}, {}, {}}, {TickTime::FromSeconds(1), {100, 0}, {}, {}, {}}});
    const auto effect = Operator(Node(settings));
    QRT::InterfaceRef<MF::IVideoFrame> frame = vrtest::MakeFrame(4, 2);
    vrtest::Fill(*frame, {0, 0, 0, 255});
    const MF::FrameTime clipTime(TickTime::FromSeconds(0.5));
    const MF::FrameTime inputTime(TickTime::FromSeconds(7));
    // Never destroyed: the subtree renderers a list holds are declared only.
    static const SubTreeRenderList* const sNoLayers = new SubTreeRenderList();
    ASSERT_EQ(
        effect->ApplyOperator(clipTime, inputTime, vrtest::MakeParams(4, 2), *sNoLayers, frame, 0),
        QRT::kResult_Success);
    EXPECT_TRUE(vrtest::IsFilledWith(frame, {128, 128, 128, 255}));
}

TEST(EffectNodeTest, AnEffectThatMayNotRunTwiceAtOnceRendersOneFrameAtATime)
{
    // Four threads render through operators of one node; without the node's
    // lock the effect's renders meet.
    const auto effect = QRT::Allocated<TestEffect>::CreateInstance(
        "Serial", false, std::vector<FX::EffectParam>{}, false);
    const NodeRef node = Node(QRT::InterfaceRef<FX::IEffect>(effect.Get()));
    static const SubTreeRenderList* const sNoLayers = new SubTreeRenderList();
    {
        std::vector<std::jthread> threads;
        for (int t = 0; t < 4; ++t)
            threads.emplace_back(
                [&]
                {
                    for (int i = 0; i < 5; ++i)
                    {
                        QRT::InterfaceRef<MF::IVideoFrame> frame = vrtest::MakeFrame(4, 2);
                        EXPECT_EQ(Operator(node)->ApplyOperator({}, {}, vrtest::MakeParams(4, 2),
                                                                *sNoLayers, frame, 0),
                                  QRT::kResult_Success);
                    }
                });
    }
    EXPECT_EQ(effect->mRenders.load(), 20);
    EXPECT_FALSE(effect->mOverlapped.load());
}

} // namespace
} // namespace ML
