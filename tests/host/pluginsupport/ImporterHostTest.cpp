#include "ImporterHost/ImporterHost.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using ImporterHostTest = ::testing::Test;

TEST_F(ImporterHostTest, FirstInitializeOpensASessionAndLastShutdownClosesIt)
{
    ASSERT_EQ(ImporterHost::GetInitializeCount(), 0);
    const std::uint32_t sessions = ImporterHost::GetSessionCount();
    // An unbalanced shutdown is refused and opens nothing.
    EXPECT_EQ(ImporterHost::Shutdown(), ImporterHost::kResult_ImporterHostNotInitialized);
    EXPECT_EQ(ImporterHost::Initialize(), 0);
    // Balanced calls from many threads while the first user holds the session open.
    std::vector<std::thread> threads;
    for (int t = 0; t < 6; ++t)
        threads.emplace_back(
            []
            {
                for (int i = 0; i < 1000; ++i)
                {
                    EXPECT_EQ(ImporterHost::Initialize(), 0);
                    EXPECT_EQ(ImporterHost::Shutdown(), 0);
                }
            });
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(ImporterHost::GetSessionCount(), sessions + 1) << "no second session";
    EXPECT_EQ(ImporterHost::GetInitializeCount(), 1);
    EXPECT_TRUE(ImporterHost::IsSessionOpen());
    EXPECT_EQ(ImporterHost::Shutdown(), 0);
    EXPECT_FALSE(ImporterHost::IsSessionOpen());
    EXPECT_EQ(ImporterHost::Initialize(), 0);
    EXPECT_EQ(ImporterHost::GetSessionCount(), sessions + 2) << "a new session";
    EXPECT_EQ(ImporterHost::Shutdown(), 0);
}

} // namespace
