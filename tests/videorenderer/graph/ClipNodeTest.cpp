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
        {"reverse", [](auto& c) { c.mReverse = true; }, 3, Frames(7) - Ticks(1)},
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
    EXPECT_EQ(made->GetBounds(), QRT::ParamRect(0, 0, 64, 36));
    QRT::Guid once;
    QRT::Guid twice;
    fixed->GetFrameHash(once, {}, At({}));
    fixed->GetFrameHash(twice, {}, At({}));
    EXPECT_NE(once, twice);
}

TEST(ClipNodeTest, IntrinsicParametersOfAHoldWithFiltersAreTheMotionAtTheHoldTime)
{
    BE::TrackItemSettings moved;
    moved.mMotion.mPosition = BE::KeyframeCurve::Point({}, {Key(0, 0, -9), Key(8, 64, -9)});
    moved.mMotion.mAnchor = BE::KeyframeCurve::Point({8, 4.5});
    moved.mMotion.mScale = BE::KeyframeCurve::Scalar(50);
    moved.mMotion.mRotation = BE::KeyframeCurve::Scalar(30);
    moved.mOpacity = BE::KeyframeCurve::Scalar(50);
    moved.mBlendMode = kIR_BlendMode_Multiply;
    BE::ClipSettings held;
    held.mFrameHold = {Frames(2), true, false};
    const NodeRef clip = ClipOver(Item(Pattern("bars", "size=32x18"), held, moved));
    // The 32x18 media in the 64x36 frame, as at frame 2 where it is 16 pixels right.
    const ML::MotionRecord expected{.mAnchorX = 0.75f,
                                    .mAnchorY = 0.75f,
                                    .mPositionX = 0.75f,
                                    .mPositionY = 0.25f,
                                    .mScaleX = 0.5f,
                                    .mScaleY = 0.5f,
                                    .mRotation = 30,
                                    .mMediaPixelAspect = 1.0f,
                                    .mMediaWidth = 32,
                                    .mMediaHeight = 18,
                                    .mBlendMode = kIR_BlendMode_Multiply,
                                    .mOpacity = 0.5f};
    ML::MotionRecord record;
    record.mOpacity = 0.25f;
    EXPECT_EQ(QRT::InterfaceRef<ML::IRenderableNodeIntrinsicParameterProvider>(clip)
                  ->GetIntrinsicParameters(Frames(6), At({}), record),
              QRT::kResult_Success);
    EXPECT_EQ(std::memcmp(&record, &expected, sizeof record), 0)
        << record.mPositionX << " " << record.mAnchorX << " " << record.mMediaWidth;
}

} // namespace
} // namespace graphtest
