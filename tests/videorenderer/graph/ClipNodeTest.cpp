// The clip node: how it maps clip time to media time, its frame hashes,
// render flags, operators and intrinsic motion.

#include "ML/IRenderableNodeOperatorProvider.h"
#include "MediaNodeTestSupport.h"
#include "VF/VideoFrame.h"
#include "graph/ClipTimeTransforms.h"
#include "graph/RenderableNodeClipImpl.h"

namespace graphtest
{
namespace
{

using ML::RenderableNodeClipImpl;

constexpr vrtest::Bgra kFill{10, 20, 30, 255};

// Fills the frame it is given with kFill, keeping what it was given.
class FillOperator : public QRT::Implements<ML::IRenderableNodeOperator>
{
public:
    QRT::Result ApplyOperator(const MF::FrameTime&, const MF::FrameTime&,
                              const ML::CutlistRenderParams&, const ML::SubTreeRenderList&,
                              FrameRef& ioFrame, std::uint32_t) override
    {
        mGiven = ioFrame;
        ioFrame = VF::MakeWriteableVideoFrame(ioFrame, mt::RenderQuality{});
        vrtest::Fill(*ioFrame, kFill);
        return QRT::kResult_Success;
    }
    QRT::Result GetOperatorHash(QRT::Guid& outHash, const MF::FrameTime&,
                                const ML::CutlistRenderParams&) override
    {
        outHash = QRT::Guid("{0f111111-2222-3333-4444-555555555555}");
        return QRT::kResult_Success;
    }
    FrameRef mGiven;
};

class FillEffectNode
    : public ML::RenderableNodeWithInterfaces<TestNode, ML::IRenderableNodeOperatorProvider>
{
public:
    explicit FillEffectNode(std::uint32_t inFlags)
        : RenderableNodeWithInterfaces("RenderableNodeEffectImpl", inFlags)
    {
    }
    void CreateOperator(QRT::InterfaceRef<ML::IRenderableNodeOperator>& outOperator,
                        const MF::FrameTime&, const ML::CutlistRenderParams&) const override
    {
        mMade = QRT::Allocated<FillOperator>::CreateInstance();
        outOperator = mMade;
    }
    mutable QRT::InterfaceRef<FillOperator> mMade;

protected:
    ~FillEffectNode() = default;
};

NodeRef ClipWithEffects(const BE::TrackItemRef& inItem, const std::vector<NodeRef>& inEffects)
{
    ML::ClipNodeSetup setup;
    setup.mTrackItem = inItem;
    setup.mInput = ML::CreateMediaNode(MediaSetup(inItem->GetMedia(), inItem));
    setup.mOperators = inEffects;
    return ML::CreateClipNode(setup);
}

BE::CurveKey Key(double inFrames, double inX, double inY = 0)
{
    BE::CurveKey key;
    key.mTime = Frames(inFrames);
    key.mValue = {inX, inY};
    return key;
}

TEST(ClipNodeTest, ClipTimeMapsToMediaTime)
{
    const BE::MediaRef moving = Pattern("moving");
    const NodeRef plain = ML::CreateMediaNode(MediaSetup(moving, {}));
    const struct
    {
        const char* mName;
        void (*mChange)(BE::ClipSettings&);
        double mClipFrame;
        TickTime mMediaTime;
    } cases[] = {
        {"in point", [](auto& c) { c.mInPoint = Frames(2); }, 1, Frames(3)},
        {"speed", [](auto& c) { c.mSpeed = 2; }, 2, Frames(4)},
        {"reverse, first frame", [](auto& c) { c.mReverse = true; }, 0, Frames(10) - Ticks(1)},
        {"negative speed", [](auto& c) { c.mSpeed = -1; }, 3, Frames(7) - Ticks(1)},
        {"remapped backwards",
         [](auto& c) {
             c.mTimeRemapping = BE::KeyframeCurve::Scalar(0, {Key(0, 0.32), Key(8, 0)});
         },
         2, Frames(6)},
        {"frame hold", [](auto& c) { c.mFrameHold.mAt = Frames(4); }, 7, Frames(4)},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        BE::ClipSettings clip;
        c.mChange(clip);
        const BE::TrackItemRef item = Item(moving, clip);
        const NodeRef node = ClipOver(item);
        const ML::CutlistRenderParams params = AtFrame(c.mClipFrame);
        const ML::CutlistRenderParams media = At(MF::FrameTime(c.mMediaTime));
        EXPECT_EQ(dynamic_cast<RenderableNodeClipImpl&>(*node).GetTimeTransform()->Transform(
                      Frames(c.mClipFrame)),
                  c.mMediaTime);
        EXPECT_EQ(node->GetRenderFlags(),
                  85u - (clip.mSpeed == 1 && !clip.IsTimeRemapped() ? 0u : 16u));
        EXPECT_TRUE(SamePixels(Render(node, params), Render(plain, media)));
        EXPECT_FALSE(SamePixels(Render(node, params), Render(plain, AtFrame(8))));
        // Without operators the clip's frame is its media producer's.
        EXPECT_EQ(FrameHash(node, params),
                  FrameHash(ML::CreateMediaNode(MediaSetup(moving, item)), media));
    }
}

TEST(ClipNodeTest, TimeTransformsMapBothWays)
{
    using ML::CreateRemapTimeTransform;
    const auto remap = [](std::vector<BE::CurveKey> inKeys)
    { return CreateRemapTimeTransform(BE::KeyframeCurve::Scalar(0, std::move(inKeys))); };
    const struct
    {
        const char* mName;
        ML::TimeTransformRef mTransform;
        TickTime mOuter, mInner, mInverse;
    } cases[] = {
        {"remap rising", remap({Key(0, 0.08), Key(8, 0.4)}), Frames(2), Frames(4), Frames(2)},
        {"remap falling", remap({Key(0, 0.32), Key(8, 0)}), Frames(2), Frames(6), Frames(2)},
        {"remap turning", remap({Key(0, 0), Key(4, 0.4), Key(8, 0)}), Frames(2), Frames(5),
         mt::kTime_Invalid},
        {"chain",
         ML::CreateMultiTimeTransform(
             {MF::CreateTimeTransform(2), remap({Key(0, 0), Key(8, 0.32)})}),
         Frames(2), Frames(4), Frames(2)},
        {"hold", ML::CreateHoldTimeTransform(Frames(3)), Frames(7), Frames(3), mt::kTime_Invalid},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        EXPECT_EQ(c.mTransform->Transform(c.mOuter), c.mInner);
        EXPECT_EQ(c.mTransform->InverseTransform(c.mInner), c.mInverse);
    }
}

TEST(ClipNodeTest, ClipsOfOneMediaShareFramesAndEffectsChangeThemAndTheirFlags)
{
    const BE::MediaRef moving = Pattern("moving");
    BE::ClipSettings later;
    later.mInPoint = Frames(2);
    const NodeRef first = ClipOver(Item(moving));
    const NodeRef second = ClipOver(Item(moving, later));
    EXPECT_NE(first->GetNodeHash(), second->GetNodeHash());
    EXPECT_EQ(FrameHash(first, AtFrame(3)), FrameHash(second, AtFrame(1)));
    EXPECT_NE(FrameHash(first, AtFrame(3)), FrameHash(second, AtFrame(3)));
    // An operator keeps the clip's flags but opacity; its own flags limit the rest.
    const auto effect = [](std::uint32_t inFlags)
    { return Seal(MakeMutable<FillEffectNode>(inFlags)); };
    const NodeRef effected = ClipWithEffects(Item(moving), {effect(76)});
    EXPECT_NE(FrameHash(effected, AtFrame(3)), FrameHash(first, AtFrame(3)));
    EXPECT_EQ(effected->GetRenderFlags(), 84u);
    EXPECT_EQ(ClipWithEffects(Item(moving), {effect(76), effect(12)})->GetRenderFlags(), 20u);
    // Re-timing clears flag 16 of the still; blending the frames sets flag 128.
    BE::ClipSettings blended;
    blended.mSpeed = 2;
    blended.mFrameBlend = true;
    EXPECT_EQ(ClipOver(Item(Pattern("bars"), blended))->GetRenderFlags(), 205u);
}

TEST(ClipNodeTest, OperatorsRunOnTheFrameConformedToTheRequest)
{
    const BE::TrackItemRef item = Item(Pattern("solid", "size=32x18&color=FF0000"));
    const auto effect = MakeMutable<FillEffectNode>(76u);
    const NodeRef node = ClipWithEffects(item, {Seal(effect)});
    const FrameRef frame = Render(node, AtFrame(1));
    EXPECT_TRUE(vrtest::IsFilledWith(frame, kFill));
    // The media, at its own size, sits centred in a clear frame of the request.
    const FrameRef given = effect->mMade->mGiven;
    ASSERT_TRUE(given);
    EXPECT_EQ(given->GetBounds(), QRT::ParamRect(0, 0, 64, 36));
    const auto alpha = [&](std::int32_t inX, std::int32_t inY)
    {
        return static_cast<const std::uint8_t*>(
            given->GetBaseAddress())[inY * given->GetRowBytes() + 4 * inX + 3];
    };
    EXPECT_EQ((std::vector<int>{alpha(15, 9), alpha(16, 9), alpha(47, 26), alpha(48, 27)}),
              (std::vector<int>{0, 255, 255, 0}));

    auto& clip = dynamic_cast<RenderableNodeClipImpl&>(*node);
    QRT::InterfaceRef<ML::IRenderableNodeProducer> fixed;
    clip.GetProducerForOperatorsWithFixedInput(fixed, 1, 1, given, {}, 0);
    EXPECT_FALSE(fixed);
    clip.GetProducerForOperatorsWithFixedInput(fixed, 0, 1, vrtest::MakeFrame(8, 4), {}, 0);
    ASSERT_TRUE(fixed);
    FrameRef made;
    EXPECT_EQ(fixed->ProduceFrame({}, At({}), made), QRT::kResult_Success);
    EXPECT_TRUE(vrtest::IsFilledWith(made, kFill));
    QRT::Guid once;
    QRT::Guid twice;
    fixed->GetFrameHash(once, {}, At({}));
    fixed->GetFrameHash(twice, {}, At({}));
    EXPECT_NE(once, twice);
}

// The motion values themselves are checked on pixels by the golden motion timeline.
TEST(ClipNodeTest, IntrinsicParametersOfAHoldWithFiltersAreTheMotionAtTheHoldTime)
{
    BE::TrackItemSettings sliding;
    sliding.mMotion.mPosition = BE::KeyframeCurve::Point({}, {Key(0, 0), Key(8, 64)});
    BE::ClipSettings held;
    held.mFrameHold = {Frames(2), true, false};
    const auto recordAt = [](const NodeRef& inClip, double inFrame)
    {
        ML::MotionRecord record;
        EXPECT_EQ(QRT::InterfaceRef<ML::IRenderableNodeIntrinsicParameterProvider>(inClip)
                      ->GetIntrinsicParameters(Frames(inFrame), At({}), record),
                  QRT::kResult_Success);
        return record;
    };
    const BE::MediaRef media = Pattern("bars", "size=32x18");
    const ML::MotionRecord record = recordAt(ClipOver(Item(media, held, sliding)), 6);
    const ML::MotionRecord unheld = recordAt(ClipOver(Item(media, {}, sliding)), 2);
    EXPECT_EQ(record.mPositionX, 0.75f);
    EXPECT_EQ(record.mMediaWidth, 32u);
    EXPECT_EQ(std::memcmp(&record, &unheld, sizeof record), 0);
}

} // namespace
} // namespace graphtest
