#include "MF/RenderableCutlistFactory.h"
#include "MF/RenderableCutlistProvider.h"
#include "MF/TimeTransform.h"
#include "QRT/Allocated.h"

#include <atomic>
#include <vector>

#include <gtest/gtest.h>

namespace
{

// Short names keep the factory's many overrides on one line each.
using Obj = MF::HostObjectRef;
using Cut = MF::RenderableCutlistRef;
using Name = QRT::ImmutableString;
using Ranges = MF::TickTimeRangeList;
using Res = QRT::Result;
using FactoryRef = QRT::InterfaceRef<MF::IRenderableCutlistFactory>;
constexpr QRT::Result kNo = QRT::kResult_NotFound;

std::atomic<int> sLiveFactories{0};
std::atomic<int> sTagSeenAtDestruction{-1};

// A factory that builds nothing and answers its tag as the status of
// CreateMediaCutlist, so a caller can tell which factory it reached. On
// destruction it notes the tag of the factory published then, as a module
// tearing down might ask for it.
class TaggedFactory : public QRT::Implements<MF::IRenderableCutlistFactory>
{
public:
    explicit TaggedFactory(QRT::Result inTag)
        : mTag(inTag)
    {
        ++sLiveFactories;
    }
    ~TaggedFactory();

    Res CreateSequenceCutlist(const Obj&, const Name&, Cut&) override { return kNo; }
    Res CreateSequenceCutlistForRanges(const Obj&, const Ranges&, const Name&, Cut&) override
    {
        return kNo;
    }
    Res CreateTrackGroupCutlist(const Obj&, const Name&, Cut&) override { return kNo; }
    Res CreateTrackGroupCutlistForRanges(const Obj&, const Ranges&, const Name&, Cut&) override
    {
        return kNo;
    }
    Res CreateTrackItemCutlist(const Obj&, Cut&) override { return kNo; }
    Res CreateMediaCutlist(const Obj&, Cut& outCutlist) override
    {
        outCutlist.Reset();
        return mTag;
    }
    Res CreatePreviewCutlist(const Obj&, Cut&) override { return kNo; }
    Res CreatePreviewSourceCutlist(const Obj&, Cut&) override { return kNo; }
    Res CreateMergedCutlist(const std::vector<Cut>&, const Name&, Cut&) override { return kNo; }
    Res CreateSequenceCutlistWithObject(const Obj&, const Obj&, const Name&, Cut&) override
    {
        return kNo;
    }

private:
    const QRT::Result mTag;
};

QRT::Result TagOf(const FactoryRef& inFactory)
{
    Cut cutlist;
    return inFactory->CreateMediaCutlist({}, cutlist);
}

TaggedFactory::~TaggedFactory()
{
    --sLiveFactories;
    const auto published = MF::GetCutlistFactory();
    sTagSeenAtDestruction = published ? TagOf(published) : 0;
}

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
    MF::SetCutlistFactory(MakeFactory(2));
    EXPECT_EQ(TagOf(MF::GetCutlistFactory()), 2);
    // The caller keeps its factory across the replacement; nobody else does.
    EXPECT_EQ(TagOf(held), 1);
    EXPECT_EQ(sLiveFactories.load(), 2);
    // Factory 2 is released outside the publication lock: its destructor reads
    // the publication, which under the lock would be a recursive lock.
    MF::SetCutlistFactory(MakeFactory(3));
    EXPECT_EQ(sTagSeenAtDestruction.load(), 3);
    EXPECT_EQ(sLiveFactories.load(), 2);
}

} // namespace
