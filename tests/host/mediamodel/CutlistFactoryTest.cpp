#include "MF/RenderableCutlistFactory.h"
#include "MF/RenderableCutlistProvider.h"
#include "MF/TimeTransform.h"
#include "QRT/Allocated.h"

#include <atomic>
#include <set>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using MF::HostObjectRef;
using MF::RenderableCutlistRef;

std::atomic<int> sLiveFactories{0};

// A factory that builds nothing and answers its tag as the status of
// CreateMediaCutlist, so a caller can tell which factory it reached.
class TaggedFactory : public QRT::Implements<MF::IRenderableCutlistFactory>
{
public:
    explicit TaggedFactory(QRT::Result inTag)
        : mTag(inTag)
    {
        ++sLiveFactories;
    }
    ~TaggedFactory() { --sLiveFactories; }

    QRT::Result CreateSequenceCutlist(const HostObjectRef&, const QRT::ImmutableString&,
                                      RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateSequenceCutlistForRanges(const HostObjectRef&, const MF::TickTimeRangeList&,
                                               const QRT::ImmutableString&,
                                               RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateTrackGroupCutlist(const HostObjectRef&, const QRT::ImmutableString&,
                                        RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateTrackGroupCutlistForRanges(const HostObjectRef&, const MF::TickTimeRangeList&,
                                                 const QRT::ImmutableString&,
                                                 RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateTrackItemCutlist(const HostObjectRef&, RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateMediaCutlist(const HostObjectRef&, RenderableCutlistRef& outCutlist) override
    {
        outCutlist.Reset();
        return mTag;
    }
    QRT::Result CreatePreviewCutlist(const HostObjectRef&, RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreatePreviewSourceCutlist(const HostObjectRef&, RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateMergedCutlist(const std::vector<RenderableCutlistRef>&,
                                    const QRT::ImmutableString&, RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }
    QRT::Result CreateSequenceCutlistWithObject(const HostObjectRef&, const HostObjectRef&,
                                                const QRT::ImmutableString&,
                                                RenderableCutlistRef&) override
    {
        return QRT::kResult_NotFound;
    }

private:
    const QRT::Result mTag;
};

// A factory whose destruction asks for the published factory, as a module
// tearing down might.
std::atomic<int> sTagSeenAtDestruction{-1};

class CuriousFactory : public TaggedFactory
{
public:
    using TaggedFactory::TaggedFactory;
    ~CuriousFactory()
    {
        RenderableCutlistRef cutlist;
        const auto published = MF::GetCutlistFactory();
        sTagSeenAtDestruction = published ? published->CreateMediaCutlist({}, cutlist) : 0;
    }
};

QRT::InterfaceRef<MF::IRenderableCutlistFactory> MakeFactory(QRT::Result inTag)
{
    return QRT::Allocated<TaggedFactory>::Create<MF::IRenderableCutlistFactory>(inTag);
}

QRT::Result TagOf(const QRT::InterfaceRef<MF::IRenderableCutlistFactory>& inFactory)
{
    RenderableCutlistRef cutlist;
    return inFactory->CreateMediaCutlist({}, cutlist);
}

class CutlistFactoryTest : public ::testing::Test
{
protected:
    void SetUp() override { MF::SetCutlistFactory({}); }
    void TearDown() override
    {
        MF::SetCutlistFactory({});
        EXPECT_EQ(sLiveFactories.load(), 0);
    }
};

TEST_F(CutlistFactoryTest, NothingIsPublishedAtFirst)
{
    EXPECT_FALSE(MF::GetCutlistFactory());
}

TEST_F(CutlistFactoryTest, PublishedFactoryIsAnswered)
{
    MF::SetCutlistFactory(MakeFactory(11));
    const auto published = MF::GetCutlistFactory();
    ASSERT_TRUE(published);
    EXPECT_EQ(TagOf(published), 11);
    EXPECT_EQ(MF::GetCutlistFactory(), published);
}

TEST_F(CutlistFactoryTest, ReplacementReleasesThePreviousFactory)
{
    MF::SetCutlistFactory(MakeFactory(1));
    EXPECT_EQ(sLiveFactories.load(), 1);
    MF::SetCutlistFactory(MakeFactory(2));
    EXPECT_EQ(sLiveFactories.load(), 1);
    EXPECT_EQ(TagOf(MF::GetCutlistFactory()), 2);
}

TEST_F(CutlistFactoryTest, WithdrawingReleasesAndAnswersEmpty)
{
    MF::SetCutlistFactory(MakeFactory(3));
    MF::SetCutlistFactory({});
    EXPECT_FALSE(MF::GetCutlistFactory());
    EXPECT_EQ(sLiveFactories.load(), 0);
}

TEST_F(CutlistFactoryTest, CallerKeepsItsFactoryAcrossReplacement)
{
    MF::SetCutlistFactory(MakeFactory(4));
    const auto held = MF::GetCutlistFactory();
    MF::SetCutlistFactory(MakeFactory(5));
    EXPECT_EQ(sLiveFactories.load(), 2);
    EXPECT_EQ(TagOf(held), 4);
}

TEST_F(CutlistFactoryTest, PreviousFactoryIsReleasedOutsideThePublicationLock)
{
    MF::SetCutlistFactory(QRT::Allocated<CuriousFactory>::Create<MF::IRenderableCutlistFactory>(6));
    sTagSeenAtDestruction = -1;
    // The curious factory's destructor reads the publication: under the lock
    // this would be a recursive lock (a contract violation inside a release).
    MF::SetCutlistFactory(MakeFactory(7));
    EXPECT_EQ(sTagSeenAtDestruction.load(), 7);
}

TEST_F(CutlistFactoryTest, ConcurrentReadersSeeOnlyPublishedFactories)
{
    constexpr int kReaders = 4;
    constexpr int kReplacements = 2000;
    std::atomic<bool> writing{true};
    std::atomic<int> badTags{0};
    std::atomic<long> reads{0};

    std::vector<std::thread> readers;
    for (int reader = 0; reader < kReaders; ++reader)
        readers.emplace_back(
            [&]
            {
                while (writing.load())
                {
                    const auto factory = MF::GetCutlistFactory();
                    if (!factory)
                        continue;
                    const QRT::Result tag = TagOf(factory);
                    if (tag < 100 || tag >= 100 + kReplacements)
                        ++badTags;
                    ++reads;
                }
            });

    for (int index = 0; index < kReplacements; ++index)
        MF::SetCutlistFactory(MakeFactory(100 + index));
    // Let every reader finish at least a few reads of the last factory.
    while (reads.load() < kReaders)
        std::this_thread::yield();
    writing = false;
    for (std::thread& thread : readers)
        thread.join();

    EXPECT_EQ(badTags.load(), 0);
    EXPECT_EQ(TagOf(MF::GetCutlistFactory()), 100 + kReplacements - 1);
    EXPECT_EQ(sLiveFactories.load(), 1);
}

class InterfaceIdentifierTest : public ::testing::Test
{
};

TEST_F(InterfaceIdentifierTest, FixedIdentifiersCrossTheBoundaryUnchanged)
{
    EXPECT_EQ(MF::IRenderableNode::kIID, QRT::Guid("{d8f24158-f4f3-4749-8ab1-3b96d99b5d0d}"));
    EXPECT_EQ(MF::IRenderableCutlist::kIID, QRT::Guid("{36644276-d282-49eb-b213-cc82f80d62e1}"));
    EXPECT_EQ(MF::IRenderableCutlistProviderProperties::kIID,
              QRT::Guid("{dd0d9eea-2665-4332-af1b-8c9e56ece56d}"));
}

TEST_F(InterfaceIdentifierTest, EveryInterfaceHasItsOwnIdentifier)
{
    const std::set<QRT::Guid> identifiers{MF::IRenderableNode::kIID,
                                          MF::IRenderableCutlist::kIID,
                                          MF::IRenderableExtendedStillInfo::kIID,
                                          MF::ISmartRenderSegmentInfo::kIID,
                                          MF::IRenderableCutlistProvider::kIID,
                                          MF::IRenderableCutlistProviderProperties::kIID,
                                          MF::IRenderableCutlistFactory::kIID,
                                          MF::ITimeTransform::kIID,
                                          QRT::QRTUnknown::kIID};
    EXPECT_EQ(identifiers.size(), 9u);
}

} // namespace
