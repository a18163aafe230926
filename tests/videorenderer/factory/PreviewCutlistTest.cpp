// The factory's preview cutlists over preview material in a Y4M file: where
// the segment lies, which file frame shows when, the preview node's keys,
// its two render paths, pulldown removal, and the refusal of other objects.

#include "BE/Preview.h"
#include "BE/Sequence.h"
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
using CutlistRef = QRT::InterfaceRef<MF::IRenderableCutlist>;
using PreviewRef = QRT::InterfaceRef<BE::IPreviewNode>;
using mvxcore::debug::DebugDatabase;
using vrtest::FrameRef;
constexpr auto kRange = BE::PreviewKind::kSequenceRange;
constexpr auto kFile = BE::PreviewKind::kFileSource;

mt::TickTime Video(double inFrames)
{
    return mt::TickTime::TicksToTime(
        static_cast<std::int64_t>(inFrames * mt::kFrameRate_Video2997.GetTicksPerFrame()));
}

class PreviewCutlistTest : public ::testing::Test
{
protected:
    // Six 16x8 frames at 29.97, frame n of grey level 30 + 35 n.
    void SetUp() override
    {
        VF::SharedVideoFrameCache::Clear();
        std::ofstream file(mPath, std::ios::binary);
        file << "YUV4MPEG2 W16 H8 F30000:1001 Ip A1:1 C444\n";
        for (int frame = 0; frame < 6; ++frame)
            file << "FRAME\n"
                 << std::string(128, static_cast<char>(30 + 35 * frame))
                 << std::string(256, '\x80');
    }
    void TearDown() override
    {
        DebugDatabase::ClearAll();
        std::filesystem::remove(mPath);
    }

    // The material over sequence frames [10, 16).
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
        settings.mEnd = Video(16);
        return settings;
    }

    QRT::Result Build(const QRT::InterfaceRef<QRT::QRTUnknown>& inObject, BE::PreviewKind inKind,
                      CutlistRef& outCutlist) const
    {
        return inKind == kRange ? mFactory->CreatePreviewCutlist(inObject, outCutlist)
                                : mFactory->CreatePreviewSourceCutlist(inObject, outCutlist);
    }

    // The cutlist's 16x8 BGRA frame at inTime.
    static FrameRef RenderAt(const CutlistRef& inCutlist, mt::TickTime inTime)
    {
        CutlistRenderParams params = vrtest::MakeParams(16, 8, MF::FrameTime(inTime));
        params.mFrameRate = mt::kFrameRate_Video2997;
        QRT::InterfaceRef<IRenderableNodeProducer> producer;
        MF::FrameTime local;
        EXPECT_EQ(CutlistRenderer::GetProducerForCutlist(inCutlist, params, producer, local), 0);
        return CutlistRenderer::RenderFrameFromCutlist(producer, params, local,
                                                       {mt::kPixelFormat_BGRA_4444_8u}, false);
    }

    // The first pixel of file frame inFrame as the file's own source gives it.
    static vrtest::Bgra FilePixel(const PreviewRef& inPreview, int inFrame)
    {
        FrameRef frame;
        EXPECT_EQ(inPreview->GetVideoSource()->GetVideoFrame(
                      Video(inFrame), {}, {}, {}, BE::Deprecated::kFrameRequestFlag_Read, frame),
                  0);
        const auto* pixel = static_cast<const std::uint8_t*>(frame->GetBaseAddress());
        return {pixel[0], pixel[1], pixel[2], pixel[3]};
    }

    const std::string mPath = ::testing::TempDir() +
                              ::testing::UnitTest::GetInstance()->current_test_info()->name() +
                              ".y4m";
    const QRT::InterfaceRef<MF::IRenderableCutlistFactory> mFactory = CreateCutlistFactory();
};

TEST_F(PreviewCutlistTest, OneSegmentOverThePreviewShowingTheFileFramesOnEitherPath)
{
    enum class Path
    {
        kNew,
        kSwitch,
        kLegacyRenderer,
        kLegacyFile
    };
    struct Case
    {
        const char* mName;
        BE::PreviewKind mKind;
        Path mPath;
        bool mPulldown;
        std::vector<std::pair<double, int>> mFileFrameAt; // cutlist frame, file frame
    };
    // Film frame 3 (3.75 video frames in) is the whole video frame 4 of an
    // AA cadence; read raw, that time falls in video frame 3.
    const std::vector<Case> cases = {
        {"range", kRange, Path::kNew, false, {{10, 0}, {13, 3}, {15.5, 5}}},
        {"file", kFile, Path::kNew, false, {{0, 0}, {4, 4}}},
        {"range, switch", kRange, Path::kSwitch, false, {{11, 1}}},
        {"legacy renderer", kFile, Path::kLegacyRenderer, false, {{2, 2}}},
        {"legacy file", kFile, Path::kLegacyFile, false, {{3, 3}}},
        {"pulldown", kFile, Path::kNew, true, {{0, 0}, {3.75, 4}}},
        {"pulldown, switch", kFile, Path::kSwitch, true, {{3.75, 3}}},
    };
    for (const Case& c : cases)
    {
        SCOPED_TRACE(c.mName);
        DebugDatabase::ClearAll();
        if (c.mPath == Path::kSwitch)
            DebugDatabase::SetValue("DisableNewMediaNodeRenderer", "true");
        BE::PreviewSettings settings = Settings();
        settings.mLegacyRenderer = c.mPath == Path::kLegacyRenderer;
        settings.mLegacyFile = c.mPath == Path::kLegacyFile;
        if (c.mPulldown)
            settings.mPulldownCadence = mt::kPulldownCadence_23_AA;
        const PreviewRef preview = BE::CreatePreview(settings, c.mKind).mPreview;
        CutlistRef cutlist;
        ASSERT_EQ(Build(preview, c.mKind, cutlist), QRT::kResult_Success);
        ASSERT_EQ(cutlist->GetSegmentCount(), 1u);
        mt::TickTime start, end, offset;
        QRT::Guid hash;
        QRT::InterfaceRef<MF::IRenderableNode> root, node;
        ASSERT_EQ(cutlist->GetSegment(0, start, end, offset, hash), 0);
        EXPECT_EQ(start, Video(c.mKind == kRange ? 10 : 0));
        EXPECT_EQ(end, Video(c.mKind == kRange ? 16 : 6));
        ASSERT_EQ(cutlist->GetNodeByHash(hash, root), 0);
        ASSERT_EQ(root->GetInput(0, offset, node), 0);
        const auto* impl = dynamic_cast<const RenderableNodePreviewImpl*>(node.Get());
        ASSERT_NE(impl, nullptr);
        EXPECT_EQ(QRT::QueryRef<BE::IPreviewNode>(node)->GetVideoSource(),
                  preview->GetVideoSource());
        const bool newPath = c.mPath == Path::kNew;
        EXPECT_EQ(impl->UsesNewRenderer(), newPath);
        EXPECT_EQ(*impl->FindHashedProperty(
                      QRT::ImmutableString::CreateStatic("MediaNode::StreamRemovePulldown")),
                  newPath && c.mPulldown ? "1" : "0");
        for (const auto& [at, fileFrame] : c.mFileFrameAt)
        {
            SCOPED_TRACE(at);
            const FrameRef frame = RenderAt(cutlist, Video(at));
            ASSERT_TRUE(frame);
            EXPECT_EQ(frame->GetBounds(), QRT::ParamRect(0, 0, 16, 8));
            EXPECT_TRUE(vrtest::IsFilledWith(frame, FilePixel(preview, fileFrame)));
        }
    }
}

TEST_F(PreviewCutlistTest, KeysFollowTheMediaNodesWithTheInstanceHashedAndFrameBlendNot)
{
    const auto node = CreatePreviewNode(BE::CreatePreview(Settings(), kFile).mPreview);
    EXPECT_EQ(node->GetNodeType(), QRT::ImmutableString::CreateStatic("RenderableNodePreviewImpl"));
    const auto& impl = dynamic_cast<const RenderableNodePreviewImpl&>(*node);
    struct Key
    {
        const char* mName;
        bool mHashed;
        std::string mValue;
    };
    for (const Key& key : std::vector<Key>{
             {"MediaNode::MediaInstanceString", true, mPath},
             {"MediaNode::StreamFrameRate", true, "23543520"},
             {"MediaNode::StreamFrameWidth", true, "16"},
             {"MediaNode::StreamFieldType", true, "0"},
             {"MediaNode::ContentEnd", true, std::to_string(Video(6).GetTicks())},
             {"MediaNode::StreamFrameBlend", false, "0"},
         })
    {
        SCOPED_TRACE(key.mName);
        const auto name = QRT::ImmutableString::CreateStatic(key.mName);
        MF::RenderablePropertyValue value;
        ASSERT_EQ(node->GetProperty(name, value), QRT::kResult_Success);
        EXPECT_EQ(value, key.mValue);
        EXPECT_EQ(impl.FindHashedProperty(name) != nullptr, key.mHashed);
    }
    // Its prefetch reaches the file through its own producer.
    RenderableNodePrefetchList prefetches;
    impl.Prefetch({Video(0), Video(3)}, vrtest::MakeParams(16, 8), prefetches);
    EXPECT_EQ(prefetches.size(), 1u);
}

TEST_F(PreviewCutlistTest, ObjectsThatAreNotThatKindOfPreviewAreRefused)
{
    BE::MediaSettings bars;
    bars.mKind = BE::MediaKind::kPattern;
    bars.mLocation = "pattern:bars";
    const QRT::InterfaceRef<QRT::QRTUnknown> media = BE::CreateMedia(bars).mMedia;
    const QRT::InterfaceRef<QRT::QRTUnknown> range = BE::CreatePreview(Settings(), kRange).mPreview;
    const QRT::InterfaceRef<QRT::QRTUnknown> file = BE::CreatePreview(Settings(), kFile).mPreview;
    for (const auto& [object, kind] :
         std::vector<std::pair<QRT::InterfaceRef<QRT::QRTUnknown>, BE::PreviewKind>>{
             {media, kRange}, {media, kFile}, {file, kRange}, {range, kFile}})
    {
        CutlistRef cutlist;
        EXPECT_EQ(Build(object, kind, cutlist), QRT::kResult_NotFound);
        EXPECT_FALSE(cutlist);
    }
    // Material that cannot be opened, or a range backwards, makes no preview.
    BE::PreviewSettings missing = Settings(), backwards = Settings();
    missing.mPath += ".missing.y4m";
    backwards.mEnd = Video(1);
    EXPECT_FALSE(BE::CreatePreview(missing, kFile).mPreview);
    EXPECT_FALSE(BE::CreatePreview(backwards, kFile).mPreview);
}

} // namespace
} // namespace ML
