#include "BrambleSupport/BrambleSupport.h"

#include <tuple>

#include <gtest/gtest.h>

extern "C" int CallFirstSuiteFunctionFromC(const char* inName, int32_t inVersion, int inArgument);

namespace
{

struct IntSuite
{
    int (*mFirst)(int);
};

const IntSuite kTimesThreeSuite = {[](int inValue) { return inValue * 3; }};
const IntSuite kPlusOneSuite = {[](int inValue) { return inValue + 1; }};
constexpr const char* kName = "Test Suite";

class BrambleSupportTest : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_EQ(BrambleSupport::GetInitializeCount(), 0); }
    void TearDown() override
    {
        // Every case balances its calls; anything left would leak into the next.
        while (BrambleSupport::GetInitializeCount() > 0)
            BrambleSupport::Shutdown();
        EXPECT_EQ(BrambleSupport::GetSuiteCount(), 0u);
    }
};

TEST_F(BrambleSupportTest, SessionsAreCountedAndTheLastShutdownWithdrawsEverySuite)
{
    // An unbalanced shutdown is refused and leaves no debt.
    EXPECT_EQ(BrambleSupport::Shutdown(), BrambleSupport::kResult_SuiteSupportNotInitialized);
    EXPECT_EQ(BrambleSupport::RegisterSuite(kName, 1, &kTimesThreeSuite),
              BrambleSupport::kResult_SuiteSupportNotInitialized);
    EXPECT_EQ(BrambleSupport::Initialize(), 0);
    EXPECT_EQ(BrambleSupport::Initialize(), 0);
    ASSERT_EQ(BrambleSupport::RegisterSuite(kName, 1, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::Shutdown(), 0);
    // Another user remains: the suite stays published. Acquisitions are counted
    // and releases must balance them.
    EXPECT_EQ(BrambleSupport_ReleaseSuite(kName, 1), BRAMBLE_SUITE_NOT_ACQUIRED);
    for (int round = 0; round < 2; ++round)
        EXPECT_EQ(BrambleSupport_AcquireSuite(kName, 1), &kTimesThreeSuite);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount(kName, 1), 2u);
    for (const int expected : {BRAMBLE_SUITE_OK, BRAMBLE_SUITE_OK, BRAMBLE_SUITE_NOT_ACQUIRED})
        EXPECT_EQ(BrambleSupport_ReleaseSuite(kName, 1), expected);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount(nullptr, 1), 0u);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Missing Suite", 1), 0u);
    EXPECT_EQ(BrambleSupport::Shutdown(), 0);
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 0u);
    EXPECT_EQ(BrambleSupport_AcquireSuite(kName, 1), nullptr);
    // A new session can publish the same (name, version) again.
    BrambleSupport::Initialize();
    EXPECT_EQ(BrambleSupport::RegisterSuite(kName, 1, &kPlusOneSuite), 0);
    EXPECT_EQ(BrambleSupport_AcquireSuite(kName, 1), &kPlusOneSuite);
    EXPECT_EQ(BrambleSupport_ReleaseSuite(kName, 1), BRAMBLE_SUITE_OK);
}

TEST_F(BrambleSupportTest, VersionsOfOneNameShareATableBadArgumentsAreRefusedAndCCallsThrough)
{
    BrambleSupport::Initialize();
    EXPECT_EQ(BrambleSupport::RegisterSuite(kName, 2, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite(kName, 3, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite(kName, 3, &kPlusOneSuite),
              BrambleSupport::kResult_SuiteAlreadyRegistered);
    for (const auto& [name, version, table] : {std::tuple{(const char*)nullptr, 1, &kPlusOneSuite},
                                               {"", 1, &kPlusOneSuite},
                                               {kName, 0, &kPlusOneSuite},
                                               {kName, 1, (const IntSuite*)nullptr}})
        EXPECT_EQ(BrambleSupport::RegisterSuite(name, version, table),
                  BrambleSupport::kResult_BadSuiteArgument)
            << version;
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 2u);
    // The first table of (name, version) stays; names and versions compare exactly.
    const std::tuple<const char*, int, const void*> cases[] = {
        {kName, 3, &kTimesThreeSuite}, {"test suite", 2, nullptr}, {nullptr, 1, nullptr}};
    for (const auto& [name, version, table] : cases)
    {
        EXPECT_EQ(BrambleSupport_AcquireSuite(name, version), table) << version;
        EXPECT_EQ(BrambleSupport_ReleaseSuite(name, version), table  ? BRAMBLE_SUITE_OK
                                                              : name ? BRAMBLE_SUITE_NOT_ACQUIRED
                                                                     : BRAMBLE_SUITE_BAD_ARGUMENT);
    }
    // A plain C plug-in calls through the basic suite.
    ASSERT_EQ(BrambleSupport::RegisterSuite("Arithmetic Suite", 1, &kTimesThreeSuite), 0);
    ASSERT_EQ(BrambleSupport::RegisterSuite("Arithmetic Suite", 2, &kPlusOneSuite), 0);
    for (const auto& [version, result] : {std::pair{1, 42}, {2, 15}, {3, -1}})
        EXPECT_EQ(CallFirstSuiteFunctionFromC("Arithmetic Suite", version, 14), result);
    // The C caller released what it acquired.
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Arithmetic Suite", 1), 0u);
}

} // namespace
