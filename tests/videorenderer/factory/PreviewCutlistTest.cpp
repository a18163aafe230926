// The factory's preview cutlists over preview material in a Y4M file: where
// the segment lies, which file frame shows when, the preview node's keys,
// its two render paths, pulldown removal, and the refusal of other objects.

#include "BE/Preview.h"
#include "BE/Sequence.h"
#include "MF/RenderableCutlistFactory.h"
#include "ML/CutlistRenderer.h"
#include "TestFrames.h"
#include "VF/SharedVideoFrameCache.h"
#include "factory/CutlistFactory.h"
#include "graph/RenderableNodePreviewImpl.h"
#include "mvxcore/debug/DebugDatabase.h"

#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace ML
{
namespace
{

namespace mt = mvxmediatypes;
using mt::TickTime;
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;
using NodeRef = QRT::InterfaceRef<MF::IRenderableNode>;
using mvxcore::debug::DebugDatabase;
using vrtest::FrameRef;

constexpr int kFileFrames = 6;

TickTime Video(double inFrames)
{
    return TickTime::TicksToTime(
        static_cast<std::int64_t>(inFrames * mt::kFrameRate_Video2997.GetTicksPerFrame()));
}

// The grey level of file frame inFrame (Y'; neutral chroma).
std::uint8_t Level(int inFrame)
{
    return static_cast<std::uint8_t>(30 + 35 * inFrame);
}

class PreviewCutlistTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        std::ofstream file(mPath, std::ios::binary);
        file << "YUV4MPEG2 W16 H8 F30000:1001 Ip A1:1 C444\n";
        for (int frame = 0; frame < kFileFrames; ++frame)
            file << "FRAME\n"
                 << std::string(16 * 8, static_cast<char>(Level(frame)))
                 << std::string(2 * 16 * 8, static_cast<char>(128));
    }
    void TearDown() override
    {
        DebugDatabase::ClearAll();
        std::filesystem::remove(mPath);
        std::filesystem::remove(mCopy);
    }

    BE::PreviewSettings Settings() const
    {
        BE::PreviewSettings settings;
        settings.mPath = mPath;
        settings.mStream = {mt::kFrameRate_Video2997,
                            16,
                            8,
                            mt::kPixelAspectRatio_Square,
                            mt::kFieldType_Progressive,
                            mt::kAlphaChannel_None};
        settings.mStart = Video(10);
        settings.mEnd = Video(10 + kFileFrames);
        return settings;
    }

    QRT::InterfaceRef<BE::IPreviewNode> Preview(const BE::PreviewSettings& inSettings,
                                                BE::PreviewKind inKind) const
    {
        const BE::PreviewResult made = BE::CreatePreview(inSettings, inKind);
        EXPECT_TRUE(made.mPreview) << made.mStatus.mMessage;
        return made.mPreview;
    }

    QRT::Result Build(const QRT::InterfaceRef<QRT::QRTUnknown>& inObject, BE::PreviewKind inKind,
                      CutlistRef& outCutlist) const
    {
        return inKind == BE::PreviewKind::kSequenceRange
                   ? mFactory->CreatePreviewCutlist(inObject, outCutlist)
                   : mFactory->CreatePreviewSourceCutlist(inObject, outCutlist);
    }

    // The cutlist's frame at inTime, 16x8 BGRA.
    static FrameRef RenderAt(const CutlistRef& inCutlist, TickTime inTime)
    {
        CutlistRenderParams params = vrtest::MakeParams(16, 8, MF::FrameTime(inTime));
        params.mFrameRate = mt::kFrameRate_Video2997;
        params.mQuality = 4;
        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        MF::FrameTime local;
        EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(inCutlist, params, producer, local),
                  QRT::kResult_Success);
        EXPECT_TRUE(producer);
        return CutlistRenderer::RenderFrameFromCutlist(producer, params, local,
                                                       {mt::kPixelFormat_BGRA_4444_8u}, false);
    }

    // The first pixel of file frame inFrame as the file's own source gives it.
    static vrtest::Bgra FilePixel(const QRT::InterfaceRef<BE::IPreviewNode>& inPreview, int inFrame)
    {
        FrameRef frame;
        EXPECT_EQ(inPreview->GetVideoSource()->GetVideoFrame(
                      Video(inFrame), BE::VideoFrameRequest(), MF::BinaryData(), BE::ColorProfile(),
                      BE::Deprecated::kFrameRequestFlag_Read, frame),
                  QRT::kResult_Success);
        const auto* pixel = static_cast<const std::uint8_t*>(frame->GetBaseAddress());
        return {pixel[0], pixel[1], pixel[2], pixel[3]};
    }

    // Named after the test, so that tests run at once do not share files.
    const std::string mPath = ::testing::TempDir() +
                              ::testing::UnitTest::GetInstance()->current_test_info()->name() +
                              ".y4m";
    const std::string mCopy = mPath + ".copy.y4m";
    const QRT::InterfaceRef<MF::IRenderableCutlistFactory> mFactory = CreateCutlistFactory();
};

TEST_F(PreviewCutlistTest, OneSegmentOverThePreviewShowingTheFileFramesOnEitherPath)
{
    constexpr auto kRange = BE::PreviewKind::kSequenceRange;
    constexpr auto kFile = BE::PreviewKind::kFileSource;
    struct Probe
    {
        double mAt; // video frames, in cutlist time
        int mFileFrame;
    };
    struct Case
    {
        const char* mName;
        BE::PreviewKind mKind;
        bool mSwitch, mLegacyRenderer, mLegacyFile;
        mt::PulldownCadence mCadence;
        double mStart, mEnd; // the segment, in video frames
        bool mNewPath;
        const char* mRemovePulldown;
        std::vector<Probe> mProbes;
    };
    const std::vector<Case> cases = {
        {"range",
         kRange,
         false,
         false,
         false,
         mt::kPulldownCadence_None,
         10,
         16,
         true,
         "0",
         {{10, 0}, {13, 3}, {15.5, 5}}},
        {"file",
         kFile,
         false,
         false,
         false,
         mt::kPulldownCadence_None,
         0,
         6,
         true,
         "0",
         {{0, 0}, {4, 4}}},
        {"range, switch",
         kRange,
         true,
         false,
         false,
         mt::kPulldownCadence_None,
         10,
         16,
         false,
         "0",
         {{11, 1}, {15, 5}}},
        {"file, legacy renderer",
         kFile,
         false,
         true,
         false,
         mt::kPulldownCadence_None,
         0,
         6,
         false,
         "0",
         {{2, 2}}},
        {"file, legacy file",
         kFile,
         false,
         false,
         true,
         mt::kPulldownCadence_None,
         0,
         6,
         false,
         "0",
         {{3, 3}}},
        // Film frame 3 (3.75 video frames in) is the whole video frame 4 of
        // an AA cadence; read raw, that time falls in video frame 3.
        {"file, pulldown",
         kFile,
         false,
         false,
         false,
         mt::kPulldownCadence_23_AA,
         0,
         6,
         true,
         "1",
         {{0, 0}, {3.75, 4}}},
        {"file, pulldown, switch",
         kFile,
         true,
         false,
         false,
         mt::kPulldownCadence_23_AA,
         0,
         6,
         false,
         "0",
         {{3.75, 3}}},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.mName);
        DebugDatabase::ClearAll();
        if (c.mSwitch)
            DebugDatabase::SetValue("DisableNewMediaNodeRenderer", "true");
        BE::PreviewSettings settings = Settings();
        settings.mLegacyRenderer = c.mLegacyRenderer;
        settings.mLegacyFile = c.mLegacyFile;
        settings.mPulldownCadence = c.mCadence;
        const QRT::InterfaceRef<BE::IPreviewNode> preview = Preview(settings, c.mKind);
        ASSERT_TRUE(preview);
        CutlistRef cutlist;
        ASSERT_EQ(Build(preview, c.mKind, cutlist), QRT::kResult_Success);
        ASSERT_EQ(cutlist->GetSegmentCount(), 1u);
        TickTime start, end, offset;
        QRT::Guid hash;
        ASSERT_EQ(cutlist->GetSegment(0, start, end, offset, hash), QRT::kResult_Success);
        EXPECT_EQ(start, Video(c.mStart));
        EXPECT_EQ(end, Video(c.mEnd));

        NodeRef root, node;
        ASSERT_EQ(cutlist->GetNodeByHash(hash, root), QRT::kResult_Success);
        ASSERT_EQ(root->GetInputCount(), 1u);
        ASSERT_EQ(root->GetInput(0, offset, node), QRT::kResult_Success);
        const auto* impl = dynamic_cast<const RenderableNodePreviewImpl*>(node.Get());
        ASSERT_NE(impl, nullptr);
        EXPECT_EQ(node->GetNodeType(),
                  QRT::ImmutableString::CreateStatic("RenderableNodePreviewImpl"));
        EXPECT_EQ(QRT::QueryRef<BE::IPreviewNode>(node)->GetPreviewSettings().mPath, mPath);
        EXPECT_EQ(impl->UsesNewRenderer(), c.mNewPath);
        const auto* remove = impl->FindHashedProperty(
            QRT::ImmutableString::CreateStatic("MediaNode::StreamRemovePulldown"));
        ASSERT_NE(remove, nullptr);
        EXPECT_EQ(*remove, c.mRemovePulldown);

        for (const Probe& probe : c.mProbes)
        {
            SCOPED_TRACE(probe.mAt);
            const FrameRef frame = RenderAt(cutlist, Video(probe.mAt));
            ASSERT_TRUE(frame);
            EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
            EXPECT_TRUE(vrtest::IsFilledWith(frame, FilePixel(preview, probe.mFileFrame)));
        }
    }
}

TEST_F(PreviewCutlistTest, KeysFollowTheMediaNodesWithTheInstanceHashedAndFrameBlendNot)
{
    const QRT::InterfaceRef<BE::IPreviewNode> preview =
        Preview(Settings(), BE::PreviewKind::kFileSource);
    ASSERT_TRUE(preview);
    const NodeRef node = CreatePreviewNode(preview);
    const auto& impl = dynamic_cast<const RenderableNodePreviewImpl&>(*node);
    struct Key
    {
        const char* mName;
        bool mHashed;
        std::string mValue;
    };
    const std::vector<Key> keys = {
        {"MediaNode::MediaInstanceString", true, mPath},
        {"MediaNode::StreamFrameRate", true, "23543520"},
        {"MediaNode::StreamFrameWidth", true, "16"},
        {"MediaNode::StreamFrameHeight", true, "8"},
        {"MediaNode::StreamPixelAspectRatioNum", true, "1"},
        {"MediaNode::StreamFieldType", true, "0"},
        {"MediaNode::StreamPullDownCadence", true, "0"},
        {"MediaNode::ContentEnd", true, std::to_string(Video(kFileFrames).GetTicks())},
        {"MediaNode::StreamFrameBlend", false, "0"},
    };
    for (const Key& key : keys)
    {
        SCOPED_TRACE(key.mName);
        const QRT::ImmutableString name = QRT::ImmutableString::CreateStatic(key.mName);
        MF::RenderablePropertyValue value;
        ASSERT_EQ(node->GetProperty(name, value), QRT::kResult_Success);
        EXPECT_EQ(value, key.mValue);
        EXPECT_EQ(impl.FindHashedProperty(name) != nullptr, key.mHashed);
    }
    // Its prefetch reaches the file's frames through its own producer.
    RenderableNodePrefetchList prefetches;
    CutlistRenderParams params = vrtest::MakeParams(16, 8);
    params.mFrameRate = mt::kFrameRate_Video2997;
    impl.Prefetch({Video(0), Video(3)}, params, prefetches);
    EXPECT_EQ(prefetches.size(), 1u);
    // The material takes part in the hash: another file, another node.
    BE::PreviewSettings moved = Settings();
    moved.mPath = mCopy;
    std::ofstream(moved.mPath, std::ios::binary) << std::ifstream(mPath, std::ios::binary).rdbuf();
    const QRT::InterfaceRef<BE::IPreviewNode> copy = Preview(moved, BE::PreviewKind::kFileSource);
    ASSERT_TRUE(copy);
    EXPECT_NE(CreatePreviewNode(copy)->GetNodeHash(), node->GetNodeHash());
}

TEST_F(PreviewCutlistTest, ObjectsThatAreNotThatKindOfPreviewAreRefused)
{
    BE::MediaSettings bars;
    bars.mKind = BE::MediaKind::kPattern;
    bars.mLocation = "pattern:bars";
    const QRT::InterfaceRef<QRT::QRTUnknown> media = BE::CreateMedia(bars).mMedia;
    const QRT::InterfaceRef<QRT::QRTUnknown> range =
        Preview(Settings(), BE::PreviewKind::kSequenceRange);
    const QRT::InterfaceRef<QRT::QRTUnknown> file =
        Preview(Settings(), BE::PreviewKind::kFileSource);
    struct Case
    {
        QRT::InterfaceRef<QRT::QRTUnknown> mObject;
        BE::PreviewKind mOperation;
    };
    for (const Case& c : std::vector<Case>{{media, BE::PreviewKind::kSequenceRange},
                                           {media, BE::PreviewKind::kFileSource},
                                           {file, BE::PreviewKind::kSequenceRange},
                                           {range, BE::PreviewKind::kFileSource}})
    {
        CutlistRef cutlist = CutlistRef();
        EXPECT_EQ(Build(c.mObject, c.mOperation, cutlist), QRT::kResult_NotFound);
        EXPECT_FALSE(cutlist);
    }
    // Material that cannot be opened makes no preview.
    BE::PreviewSettings missing = Settings();
    missing.mPath = ::testing::TempDir() + "no_such_preview.y4m";
    EXPECT_FALSE(BE::CreatePreview(missing, BE::PreviewKind::kFileSource).mPreview);
    BE::PreviewSettings backwards = Settings();
    backwards.mEnd = Video(1);
    EXPECT_FALSE(BE::CreatePreview(backwards, BE::PreviewKind::kFileSource).mPreview);
}

} // namespace
} // namespace ML
