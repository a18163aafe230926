#include "mvxcore/debug/DebugDatabase.h"

#include "ContractExpect.h"

#include <atomic>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

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
    EXPECT_FALSE(DebugDatabase::GetBool("CompareMediaNodeRenderers"));
    EXPECT_EQ(DebugDatabase::GetValue("CompareMediaNodeRenderers"), std::nullopt);
    for (const char* text : {"TRUE", "True", "1", "yes", "true ", "", "false"})
    {
        DebugDatabase::SetValue("CompareMediaNodeRenderers", text);
        EXPECT_FALSE(DebugDatabase::GetBool("CompareMediaNodeRenderers")) << '"' << text << '"';
        EXPECT_EQ(DebugDatabase::GetValue("CompareMediaNodeRenderers"), std::string(text));
    }
    DebugDatabase::SetValue("CompareMediaNodeRenderers", "true");
    DebugDatabase::SetValue("DisableNewMediaNodeRenderer", "true");
    EXPECT_TRUE(DebugDatabase::GetBool("CompareMediaNodeRenderers"));
    DebugDatabase::Clear("CompareMediaNodeRenderers");
    DebugDatabase::Clear("NeverSet");
    EXPECT_FALSE(DebugDatabase::GetBool("CompareMediaNodeRenderers"));
    EXPECT_EQ(DebugDatabase::GetValue("CompareMediaNodeRenderers"), std::nullopt);
    EXPECT_TRUE(DebugDatabase::GetBool("DisableNewMediaNodeRenderer"));
    EXPECT_INPUT_CONTRACT(DebugDatabase::SetValue("", "true"), "!inName.empty()");
    EXPECT_EQ(DebugDatabase::GetValue(""), std::nullopt);
}

TEST_F(DebugDatabaseTest, ListEntriesAreTrimmedAndMalformedOnesSkipped)
{
    EXPECT_EQ(DebugDatabase::LoadFromText(" A=true, B = false ,C,=x,D=,,E=a=b"), 2u);
    EXPECT_TRUE(DebugDatabase::GetBool("A"));
    EXPECT_EQ(DebugDatabase::GetValue("B"), "false");
    EXPECT_EQ(DebugDatabase::GetValue("C"), std::nullopt);
    EXPECT_EQ(DebugDatabase::GetValue(""), std::nullopt);
    EXPECT_EQ(DebugDatabase::GetValue("D"), "");
    EXPECT_EQ(DebugDatabase::GetValue("E"), "a=b");
}

TEST_F(DebugDatabaseTest, EnvironmentReplacesEveryValue)
{
    DebugDatabase::SetValue("Stale", "true");
    setenv(mvxcore::debug::kDebugEnvironmentVariable,
           "CompareMediaNodeRenderers=true,DisableNewMediaNodeRenderer=false,broken", 1);
    EXPECT_EQ(DebugDatabase::LoadFromEnvironment(), 1u);
    EXPECT_TRUE(DebugDatabase::GetBool("CompareMediaNodeRenderers"));
    EXPECT_EQ(DebugDatabase::GetValue("DisableNewMediaNodeRenderer"), "false");
    EXPECT_EQ(DebugDatabase::GetValue("Stale"), std::nullopt);
    unsetenv(mvxcore::debug::kDebugEnvironmentVariable);
    EXPECT_EQ(DebugDatabase::LoadFromEnvironment(), 0u);
    EXPECT_FALSE(DebugDatabase::GetBool("CompareMediaNodeRenderers"));
}

TEST_F(DebugDatabaseTest, ReadersOnOtherThreadsSeeOnlyWholeValues)
{
    std::atomic<bool> stop{false};
    std::atomic<int> torn{0};
    std::vector<std::thread> readers;
    for (int t = 0; t < 3; ++t)
    {
        readers.emplace_back(
            [&]
            {
                while (!stop.load())
                {
                    const auto value = DebugDatabase::GetValue("Flip");
                    if (value && *value != "true" && *value != "false")
                        ++torn;
                    DebugDatabase::GetBool("Flip");
                }
            });
    }
    for (int i = 0; i < 5000; ++i)
    {
        DebugDatabase::SetValue("Flip", i % 2 ? "true" : "false");
        if (i % 100 == 0)
            DebugDatabase::Clear("Flip");
    }
    stop = true;
    for (std::thread& reader : readers)
        reader.join();
    EXPECT_EQ(torn.load(), 0);
}

} // namespace
