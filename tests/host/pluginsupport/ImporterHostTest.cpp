#include "ImporterHost/ImporterHost.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

class ImporterHostTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_EQ(ImporterHost::GetInitializeCount(), 0);
        mSessions = ImporterHost::GetSessionCount();
    }
    void TearDown() override
    {
        while (ImporterHost::GetInitializeCount() > 0)
            ImporterHost::Shutdown();
    }

    std::uint32_t mSessions = 0;
};

TEST_F(ImporterHostTest, FirstInitializeOpensASessionAndLastShutdownClosesIt)
{
    // An unbalanced shutdown is refused and opens nothing.
    EXPECT_EQ(ImporterHost::Shutdown(), ImporterHost::kResult_ImporterHostNotInitialized);
    EXPECT_LT(ImporterHost::kResult_ImporterHostNotInitialized, 0);
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 0);
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions);
    for (const int count : {1, 2})
    {
        EXPECT_EQ(ImporterHost::Initialize(), 0);
        EXPECT_TRUE(ImporterHost::IsSessionOpen());
        EXPECT_EQ(ImporterHost::GetInitializeCount(), count);
        EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    }
    for (const bool open : {true, false})
    {
        EXPECT_EQ(ImporterHost::Shutdown(), 0);
        EXPECT_EQ(ImporterHost::IsSessionOpen(), open);
    }
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 0);
    EXPECT_EQ(ImporterHost::Initialize(), 0);
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 2) << "a new session";
    EXPECT_EQ(ImporterHost::Shutdown(), 0);
}

TEST_F(ImporterHostTest, ConcurrentBalancedCallsEndClosed)
{
    ImporterHost::Initialize();
    std::vector<std::thread> threads;
    for (int t = 0; t < 6; ++t)
    {
        threads.emplace_back(
            []
            {
                for (int i = 0; i < 1000; ++i)
                {
                    EXPECT_EQ(ImporterHost::Initialize(), 0);
                    EXPECT_EQ(ImporterHost::Shutdown(), 0);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    // The first user kept the session open throughout: no second session.
    EXPECT_EQ(ImporterHost::GetSessionCount(), mSessions + 1);
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 1);
    EXPECT_EQ(ImporterHost::Shutdown(), 0);
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
}

} // namespace
