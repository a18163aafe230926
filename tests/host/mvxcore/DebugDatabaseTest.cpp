#include "mvxcore/debug/DebugDatabase.h"

#include "ContractExpect.h"

#include <cstdlib>
#include <string>

#include <gtest/gtest.h>

namespace
{

using mvxcore::debug::DebugDatabase;

class DebugDatabaseTest : public ::testing::Test
{
protected:
    void SetUp() override { DebugDatabase::ClearAll(); }
    void TearDown() override
    {
        unsetenv(mvxcore::debug::kDebugEnvironmentVariable);
        DebugDatabase::ClearAll();
    }
};

TEST_F(DebugDatabaseTest, SwitchIsOnOnlyForExactlyTrueAndClearRemovesOnlyThatSwitch)
{
    DebugDatabase::SetValue("Compare", "true ");
    EXPECT_FALSE(DebugDatabase::GetBool("Compare"));
    DebugDatabase::SetValue("Compare", "true");
    DebugDatabase::SetValue("Disable", "true");
    EXPECT_TRUE(DebugDatabase::GetBool("Compare"));
    DebugDatabase::Clear("Compare");
    DebugDatabase::Clear("NeverSet");
    EXPECT_EQ(DebugDatabase::GetValue("Compare"), std::nullopt);
    EXPECT_TRUE(DebugDatabase::GetBool("Disable"));
    EXPECT_INPUT_CONTRACT(DebugDatabase::SetValue("", "true"), "!inName.empty()");
}

TEST_F(DebugDatabaseTest, EnvironmentReplacesEveryValueTrimmedAndSkipsMalformedEntries)
{
    DebugDatabase::SetValue("Stale", "true");
    setenv(mvxcore::debug::kDebugEnvironmentVariable, " A=true, B = false ,C,=x,D=,,E=a=b", 1);
    EXPECT_EQ(DebugDatabase::LoadFromEnvironment(), 2u);
    EXPECT_TRUE(DebugDatabase::GetBool("A"));
    EXPECT_EQ(DebugDatabase::GetValue("B"), "false");
    EXPECT_EQ(DebugDatabase::GetValue("C"), std::nullopt);
    EXPECT_EQ(DebugDatabase::GetValue("D"), "");
    EXPECT_EQ(DebugDatabase::GetValue("E"), "a=b");
    EXPECT_EQ(DebugDatabase::GetValue("Stale"), std::nullopt);
    // Text is merged in and answers the number of entries it skipped.
    EXPECT_EQ(DebugDatabase::LoadFromText("F=true,bad"), 1u);
    EXPECT_TRUE(DebugDatabase::GetBool("F") && DebugDatabase::GetBool("A"));
    unsetenv(mvxcore::debug::kDebugEnvironmentVariable);
    EXPECT_EQ(DebugDatabase::LoadFromEnvironment(), 0u);
    EXPECT_FALSE(DebugDatabase::GetBool("A"));
}

} // namespace
