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
    const BE::MediaRef moving = Pattern("pattern:moving?size=64x36");
    const NodeRef plain = ML::CreateMediaNode(MediaSetup(moving, {}));
    const auto clip = [](auto inChange)
    {
        BE::ClipSettings settings;
        inChange(settings);
        return settings;
    };
    const struct
    {
        const char* mName;
        BE::ClipSettings mClip;
        double mClipFrame;
        TickTime mMediaTime;
    } cases[] = {
        {"in point", clip([](auto& c) { c.mInPoint = Frames(2); }), 1, Frames(3)},
        {"speed", clip([](auto& c) { c.mSpeed = 2; }), 2, Frames(4)},
        {"reverse, first frame", clip([](auto& c) { c.mReverse = true; }), 0,
         Frames(10) - Ticks(1)},
        {"reverse", clip([](auto& c) { c.mReverse = true; }), 3, Frames(7) - Ticks(1)},
        {"negative speed", clip([](auto& c) { c.mSpeed = -1; }), 3, Frames(7) - Ticks(1)},
        {"remapped backwards",
         clip(
             [](auto& c) {
                 c.mTimeRemapping = BE::KeyframeCurve::Scalar(0, {Key(0, 0.32), Key(8, 0)});
             }),
         2, Frames(6)},
        {"frame hold", clip([](auto& c) { c.mFrameHold.mAt = Frames(4); }), 7, Frames(4)},
        {"frame hold, first frame", clip([](auto& c) { c.mFrameHold.mAt = Frames(4); }), 0,
         Frames(4)},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        const BE::TrackItemRef item = Item(moving, c.mClip);
        const NodeRef node = ClipOver(item);
        const ML::CutlistRenderParams params = At(MF::FrameTime(Frames(c.mClipFrame)));
        const ML::CutlistRenderParams media = At(MF::FrameTime(c.mMediaTime));
        EXPECT_EQ(node->GetRenderFlags(),
                  85u - (c.mClip.mSpeed == 1 && !c.mClip.IsTimeRemapped() ? 0u : 16u));
        EXPECT_TRUE(SamePixels(Render(node, params), Render(plain, media)));
        EXPECT_FALSE(SamePixels(Render(node, params), Render(plain, At(MF::FrameTime(Frames(8))))));
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

TEST(ClipNodeTest, ClipsOfOneMediaShareFramesAndEffectsChangeThem)
{
    const BE::MediaRef moving = Pattern("pattern:moving?size=64x36");
    BE::ClipSettings later;
    later.mInPoint = Frames(2);
    const NodeRef first = ClipOver(Item(moving));
    const NodeRef second = ClipOver(Item(moving, later));
    EXPECT_NE(first->GetNodeHash(), second->GetNodeHash());
    EXPECT_EQ(FrameHash(first, At(MF::FrameTime(Frames(3)))),
              FrameHash(second, At(MF::FrameTime(Frames(1)))));
    EXPECT_NE(FrameHash(first, At(MF::FrameTime(Frames(3)))),
              FrameHash(second, At(MF::FrameTime(Frames(3)))));
    const NodeRef effected =
        ClipWithEffects(Item(moving), {Seal(MakeMutable<FillEffectNode>(76u))});
    EXPECT_NE(FrameHash(effected, At(MF::FrameTime(Frames(3)))),
              FrameHash(first, At(MF::FrameTime(Frames(3)))));
}

TEST(ClipNodeTest, OperatorsRunOnTheFrameConformedToTheRequest)
{
    const BE::TrackItemRef item = Item(Pattern("pattern:solid?size=32x18&color=FF0000"));
    const auto effect = MakeMutable<FillEffectNode>(76u);
    const NodeRef node = ClipWithEffects(item, {Seal(effect)});
    const FrameRef frame = Render(node, At(MF::FrameTime(Frames(1))));
    EXPECT_TRUE(vrtest::IsFilledWith(frame, kFill));
    // The media, at its own size, sits centred in a clear frame of the request.
    const FrameRef given = effect->mMade->mGiven;
    ASSERT_TRUE(given);
    EXPECT_EQ(given->GetBounds(), QRT::ParamRect(0, 0, 64, 36));
    const auto pixel = [&](int inX, int inY)
    {
        vrtest::Bgra bytes;
        std::memcpy(bytes.data(),
                    static_cast<const std::uint8_t*>(given->GetBaseAddress()) +
                        inY * given->GetRowBytes() + 4 * inX,
                    4);
        return bytes;
    };
    EXPECT_EQ(pixel(15, 9), (vrtest::Bgra{0, 0, 0, 0}));
    EXPECT_EQ(pixel(16, 9), (vrtest::Bgra{0, 0, 255, 255}));
    EXPECT_EQ(pixel(47, 26), (vrtest::Bgra{0, 0, 255, 255}));
    EXPECT_EQ(pixel(48, 27), (vrtest::Bgra{0, 0, 0, 0}));

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

TEST(ClipNodeTest, RenderFlagsFollowInputOperatorsAndRetiming)
{
    const BE::MediaRef bars = Pattern("pattern:bars?size=64x36");
    BE::ClipSettings fast;
    fast.mSpeed = 2;
    BE::ClipSettings blended = fast;
    blended.mFrameBlend = true;
    const struct
    {
        const char* mName;
        BE::ClipSettings mClip;
        std::vector<std::uint32_t> mEffectFlags;
        std::uint32_t mFlags;
    } cases[] = {
        {"plain still", {}, {}, 93},
        {"re-timed", fast, {}, 77},
        {"re-timed and blended", blended, {}, 205},
        {"operator keeping every bit", {}, {76}, 92},
        {"operators with layer inputs and time", {}, {76, 12}, 28},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        std::vector<NodeRef> effects;
        for (const std::uint32_t flags : c.mEffectFlags)
            effects.push_back(Seal(MakeMutable<FillEffectNode>(flags)));
        EXPECT_EQ(ClipWithEffects(Item(bars, c.mClip), effects)->GetRenderFlags(), c.mFlags);
    }
}

TEST(ClipNodeTest, IntrinsicParametersEvaluateMotion)
{
    const BE::MediaRef media = Pattern("pattern:bars?size=32x18");
    BE::TrackItemSettings moved;
    moved.mMotion.mPosition = BE::KeyframeCurve::Point({16, -9});
    moved.mMotion.mAnchor = BE::KeyframeCurve::Point({8, 4.5});
    moved.mMotion.mScale = BE::KeyframeCurve::Scalar(50);
    moved.mMotion.mRotation = BE::KeyframeCurve::Scalar(30);
    moved.mOpacity = BE::KeyframeCurve::Scalar(50);
    moved.mBlendMode = kIR_BlendMode_Multiply;
    BE::TrackItemSettings sliding;
    sliding.mMotion.mPosition = BE::KeyframeCurve::Point({}, {Key(0, 0), Key(8, 64)});
    BE::ClipSettings held;
    held.mFrameHold = {Frames(2), true, false};
    ML::MotionRecord identity = ML::kIdentityMotionRecord;
    identity.mMediaPixelAspect = 1.0f;
    // A moved media's record: its geometry, opacity, blend mode and size.
    const auto recordOf = [&](float inX, float inY, float inAnchor, float inScale,
                              double inRotation, float inOpacity, IR_BlendMode inBlend)
    {
        ML::MotionRecord record = identity;
        record.mPositionX = inX;
        record.mPositionY = inY;
        record.mAnchorX = record.mAnchorY = inAnchor;
        record.mScaleX = record.mScaleY = inScale;
        record.mRotation = inRotation;
        record.mOpacity = inOpacity;
        record.mBlendMode = inBlend;
        record.mMediaWidth = 32;
        record.mMediaHeight = 18;
        return record;
    };
    const struct
    {
        const char* mName;
        BE::TrackItemRef mItem;
        double mLayerFrame;
        ML::MotionRecord mRecord;
    } cases[] = {
        {"untouched", Item(media), 3, identity},
        {"moved, scaled, rotated", Item(media, {}, moved), 3,
         recordOf(0.75f, 0.25f, 0.75f, 0.5f, 30, 0.5f, kIR_BlendMode_Multiply)},
        {"sliding", Item(media, {}, sliding), 4,
         recordOf(1.0f, 0.5f, 0.5f, 1, 0, 1, kIR_BlendMode_Normal)},
        {"held with filters", Item(media, held, sliding), 6,
         recordOf(0.75f, 0.5f, 0.5f, 1, 0, 1, kIR_BlendMode_Normal)},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.mName);
        ML::MotionRecord record;
        record.mOpacity = 0.25f;
        const NodeRef clip = ClipOver(c.mItem);
        EXPECT_EQ(QRT::InterfaceRef<ML::IRenderableNodeIntrinsicParameterProvider>(clip)
                      ->GetIntrinsicParameters(Frames(c.mLayerFrame), At({}), record),
                  QRT::kResult_Success);
        EXPECT_EQ(std::memcmp(&record, &c.mRecord, sizeof record), 0)
            << record.mPositionX << " " << record.mAnchorX << " " << record.mMediaWidth;
    }
}

} // namespace
} // namespace graphtest
