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

using Object = MF::HostObjectRef;
using Cutlist = MF::RenderableCutlistRef;
using Name = QRT::ImmutableString;
using Ranges = MF::TickTimeRangeList;
using FactoryRef = QRT::InterfaceRef<MF::IRenderableCutlistFactory>;
constexpr QRT::Result kNo = QRT::kResult_NotFound;

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

    QRT::Result CreateSequenceCutlist(const Object&, const Name&, Cutlist&) override { return kNo; }
    QRT::Result CreateSequenceCutlistForRanges(const Object&, const Ranges&, const Name&,
                                               Cutlist&) override
    {
        return kNo;
    }
    QRT::Result CreateTrackGroupCutlist(const Object&, const Name&, Cutlist&) override
    {
        return kNo;
    }
    QRT::Result CreateTrackGroupCutlistForRanges(const Object&, const Ranges&, const Name&,
                                                 Cutlist&) override
    {
        return kNo;
    }
    QRT::Result CreateTrackItemCutlist(const Object&, Cutlist&) override { return kNo; }
    QRT::Result CreateMediaCutlist(const Object&, Cutlist& outCutlist) override
    {
        outCutlist.Reset();
        return mTag;
    }
    QRT::Result CreatePreviewCutlist(const Object&, Cutlist&) override { return kNo; }
    QRT::Result CreatePreviewSourceCutlist(const Object&, Cutlist&) override { return kNo; }
    QRT::Result CreateMergedCutlist(const std::vector<Cutlist>&, const Name&, Cutlist&) override
    {
        return kNo;
    }
    QRT::Result CreateSequenceCutlistWithObject(const Object&, const Object&, const Name&,
                                                Cutlist&) override
    {
        return kNo;
    }

private:
    const QRT::Result mTag;
};

QRT::Result TagOf(const FactoryRef& inFactory)
{
    Cutlist cutlist;
    return inFactory->CreateMediaCutlist({}, cutlist);
}

// A factory whose destruction asks for the published factory, as a module
// tearing down might.
std::atomic<int> sTagSeenAtDestruction{-1};

class CuriousFactory : public TaggedFactory
{
public:
    using TaggedFactory::TaggedFactory;
    ~CuriousFactory()
    {
        const auto published = MF::GetCutlistFactory();
        sTagSeenAtDestruction = published ? TagOf(published) : 0;
    }
};

FactoryRef MakeFactory(QRT::Result inTag)
{
    return QRT::Allocated<TaggedFactory>::Create<MF::IRenderableCutlistFactory>(inTag);
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

TEST_F(CutlistFactoryTest, PublicationAnswersTheLatestFactoryAndReleasesTheOneBefore)
{
    EXPECT_FALSE(MF::GetCutlistFactory());
    MF::SetCutlistFactory(MakeFactory(1));
    const auto held = MF::GetCutlistFactory();
    ASSERT_TRUE(held);
    EXPECT_EQ(TagOf(held), 1);
    EXPECT_EQ(MF::GetCutlistFactory(), held);
    MF::SetCutlistFactory(MakeFactory(2));
    EXPECT_EQ(TagOf(MF::GetCutlistFactory()), 2);
    // The caller keeps its factory across the replacement; nobody else does.
    EXPECT_EQ(TagOf(held), 1);
    EXPECT_EQ(sLiveFactories.load(), 2);
    MF::SetCutlistFactory(MakeFactory(3));
    EXPECT_EQ(sLiveFactories.load(), 2);
    MF::SetCutlistFactory({});
    EXPECT_FALSE(MF::GetCutlistFactory());
    EXPECT_EQ(sLiveFactories.load(), 1);
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
                    if (const auto factory = MF::GetCutlistFactory())
                    {
                        const QRT::Result tag = TagOf(factory);
                        badTags += tag < 100 || tag >= 100 + kReplacements;
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

using InterfaceIdentifierTest = ::testing::Test;

TEST_F(InterfaceIdentifierTest, FixedIdentifiersCrossTheBoundaryUnchangedAndAreDistinct)
{
    EXPECT_EQ(MF::IRenderableNode::kIID, QRT::Guid("{d8f24158-f4f3-4749-8ab1-3b96d99b5d0d}"));
    EXPECT_EQ(MF::IRenderableCutlist::kIID, QRT::Guid("{36644276-d282-49eb-b213-cc82f80d62e1}"));
    EXPECT_EQ(MF::IRenderableCutlistProviderProperties::kIID,
              QRT::Guid("{dd0d9eea-2665-4332-af1b-8c9e56ece56d}"));
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
