#include "BrambleSupport/BrambleSupport.h"

#include <atomic>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

extern "C" int CallFirstSuiteFunctionFromC(const char* inName, int32_t inVersion, int inArgument);

namespace
{

int TimesThree(int inValue)
{
    return inValue * 3;
}
int PlusOne(int inValue)
{
    return inValue + 1;
}

struct IntSuite
{
    int (*mFirst)(int);
};

const IntSuite kTimesThreeSuite = {&TimesThree};
const IntSuite kPlusOneSuite = {&PlusOne};

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

TEST_F(BrambleSupportTest, InitializeAndShutdownAreCountedOneForOne)
{
    // An unbalanced shutdown is refused and leaves no debt.
    EXPECT_EQ(BrambleSupport::Shutdown(), BrambleSupport::kResult_SuiteSupportNotInitialized);
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite("Test Suite", 1, &kTimesThreeSuite),
              BrambleSupport::kResult_SuiteSupportNotInitialized);
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 0u);
    for (const int count : {1, 2})
    {
        EXPECT_EQ(BrambleSupport::Initialize(), 0);
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), count);
    }
    for (const int count : {1, 0})
    {
        EXPECT_EQ(BrambleSupport::Shutdown(), 0);
        EXPECT_EQ(BrambleSupport::GetInitializeCount(), count);
    }
}

TEST_F(BrambleSupportTest, VersionsOfOneNameShareATableAndDuplicatesAreRefused)
{
    BrambleSupport::Initialize();
    EXPECT_EQ(BrambleSupport::RegisterSuite("Test Suite", 2, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite("Test Suite", 3, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite("Other Suite", 2, &kPlusOneSuite), 0);
    EXPECT_EQ(BrambleSupport::RegisterSuite("Test Suite", 3, &kPlusOneSuite),
              BrambleSupport::kResult_SuiteAlreadyRegistered);
    EXPECT_EQ(BrambleSupport::kResult_SuiteAlreadyRegistered,
              static_cast<QRT::Result>(0xA00F0002u));
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 3u);
    // The first table of (name, version) stays; names and versions compare exactly.
    const std::tuple<const char*, int, const void*> cases[] = {{"Test Suite", 3, &kTimesThreeSuite},
                                                               {"Test Suite", 2, &kTimesThreeSuite},
                                                               {"Other Suite", 2, &kPlusOneSuite},
                                                               {"test suite", 2, nullptr},
                                                               {"Test Suite", 1, nullptr},
                                                               {"Test Suite", 4, nullptr},
                                                               // Bad arguments acquire nothing.
                                                               {nullptr, 1, nullptr},
                                                               {"", 1, nullptr},
                                                               {"Test Suite", 0, nullptr}};
    for (const auto& [name, version, table] : cases)
        EXPECT_EQ(BrambleSupport_AcquireSuite(name, version), table)
            << (name ? name : "null") << " " << version;
}

TEST_F(BrambleSupportTest, BadArgumentsAreRefusedWithAStatus)
{
    BrambleSupport::Initialize();
    const QRT::Result bad = BrambleSupport::kResult_BadSuiteArgument;
    EXPECT_LT(bad, 0);
    const std::tuple<const char*, int, const void*> cases[] = {
        {nullptr, 1, &kTimesThreeSuite},
        {"", 1, &kTimesThreeSuite},
        {"Test Suite", 0, &kTimesThreeSuite},
        {"Test Suite", -3, &kTimesThreeSuite},
        {"Test Suite", 1, nullptr}};
    for (const auto& [name, version, table] : cases)
        EXPECT_EQ(BrambleSupport::RegisterSuite(name, version, table), bad) << version;
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 0u);
    EXPECT_EQ(BrambleSupport_ReleaseSuite(nullptr, 1), BRAMBLE_SUITE_BAD_ARGUMENT);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", -1), BRAMBLE_SUITE_BAD_ARGUMENT);
}

TEST_F(BrambleSupportTest, AcquisitionsAreCountedAndReleasesMustBalanceThem)
{
    BrambleSupport::Initialize();
    ASSERT_EQ(BrambleSupport::RegisterSuite("Test Suite", 1, &kTimesThreeSuite), 0);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Test Suite", 1), 0u);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_NOT_ACQUIRED);

    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Suite", 1), &kTimesThreeSuite);
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Suite", 1), &kTimesThreeSuite);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Test Suite", 1), 2u);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_OK);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_OK);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Test Suite", 1), 0u);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_NOT_ACQUIRED);

    // A failed acquisition counts nothing.
    EXPECT_EQ(BrambleSupport_AcquireSuite("Missing Suite", 1), nullptr);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Missing Suite", 1), BRAMBLE_SUITE_NOT_ACQUIRED);
}

TEST_F(BrambleSupportTest, PlainCPluginCallsThroughTheBasicSuite)
{
    BrambleSupport::Initialize();
    ASSERT_EQ(BrambleSupport::RegisterSuite("Arithmetic Suite", 1, &kTimesThreeSuite), 0);
    ASSERT_EQ(BrambleSupport::RegisterSuite("Arithmetic Suite", 2, &kPlusOneSuite), 0);
    EXPECT_EQ(CallFirstSuiteFunctionFromC("Arithmetic Suite", 1, 14), 42);
    EXPECT_EQ(CallFirstSuiteFunctionFromC("Arithmetic Suite", 2, 14), 15);
    EXPECT_EQ(CallFirstSuiteFunctionFromC("Arithmetic Suite", 3, 14), -1);
    // The C caller released what it acquired.
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Arithmetic Suite", 1), 0u);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Arithmetic Suite", 2), 0u);
    const BrambleBasicSuite* basic = BrambleSupport_GetBasicSuite();
    ASSERT_NE(basic, nullptr);
    EXPECT_EQ(basic, BrambleSupport_GetBasicSuite());
    EXPECT_EQ(basic->AcquireSuite, &BrambleSupport_AcquireSuite);
    EXPECT_EQ(basic->ReleaseSuite, &BrambleSupport_ReleaseSuite);
}

TEST_F(BrambleSupportTest, LastShutdownWithdrawsEverySuiteAndNextSessionStartsEmpty)
{
    BrambleSupport::Initialize();
    BrambleSupport::Initialize();
    ASSERT_EQ(BrambleSupport::RegisterSuite("Test Suite", 1, &kTimesThreeSuite), 0);
    BrambleSupport::Shutdown();
    // Another user remains: the suite stays published.
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Suite", 1), &kTimesThreeSuite);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_OK);
    BrambleSupport::Shutdown();
    EXPECT_EQ(BrambleSupport::GetSuiteCount(), 0u);
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Suite", 1), nullptr);

    // A new session can publish the same (name, version) again.
    BrambleSupport::Initialize();
    EXPECT_EQ(BrambleSupport::RegisterSuite("Test Suite", 1, &kPlusOneSuite), 0);
    EXPECT_EQ(BrambleSupport_AcquireSuite("Test Suite", 1), &kPlusOneSuite);
    EXPECT_EQ(BrambleSupport_ReleaseSuite("Test Suite", 1), BRAMBLE_SUITE_OK);
}

TEST_F(BrambleSupportTest, ConcurrentRegistrationsAcceptExactlyOneTablePerKey)
{
    BrambleSupport::Initialize();
    constexpr int kThreads = 8;
    constexpr int kVersions = 50;
    std::atomic<int> accepted{0};
    std::atomic<int> refused{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t)
    {
        threads.emplace_back(
            [&, t]
            {
                const IntSuite* table = (t % 2 == 0) ? &kTimesThreeSuite : &kPlusOneSuite;
                for (int version = 1; version <= kVersions; ++version)
                {
                    // Every thread races for the shared names; each also has its own.
                    const QRT::Result shared =
                        BrambleSupport::RegisterSuite("Shared Suite", version, table);
                    (shared == 0 ? accepted : refused).fetch_add(1);
                    const std::string own = "Own Suite " + std::to_string(t);
                    EXPECT_EQ(BrambleSupport::RegisterSuite(own.c_str(), version, table), 0);
                    EXPECT_EQ(BrambleSupport_AcquireSuite(own.c_str(), version), table);
                    EXPECT_EQ(BrambleSupport_ReleaseSuite(own.c_str(), version), 0);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(accepted.load(), kVersions);
    EXPECT_EQ(refused.load(), kVersions * (kThreads - 1));
    EXPECT_EQ(BrambleSupport::GetSuiteCount(),
              static_cast<std::size_t>(kVersions * (kThreads + 1)));
}

TEST_F(BrambleSupportTest, ConcurrentAcquireAndReleaseLeaveNoAcquisition)
{
    BrambleSupport::Initialize();
    ASSERT_EQ(BrambleSupport::RegisterSuite("Test Suite", 1, &kTimesThreeSuite), 0);
    std::vector<std::thread> threads;
    std::atomic<int> wrongTables{0};
    for (int t = 0; t < 6; ++t)
    {
        threads.emplace_back(
            [&]
            {
                for (int i = 0; i < 2000; ++i)
                {
                    const auto* table =
                        static_cast<const IntSuite*>(BrambleSupport_AcquireSuite("Test Suite", 1));
                    if (table != &kTimesThreeSuite || table->mFirst(2) != 6)
                        wrongTables.fetch_add(1);
                    if (BrambleSupport_ReleaseSuite("Test Suite", 1) != 0)
                        wrongTables.fetch_add(1);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(wrongTables.load(), 0);
    EXPECT_EQ(BrambleSupport::GetSuiteAcquireCount("Test Suite", 1), 0u);
}

TEST_F(BrambleSupportTest, ConcurrentBalancedCallsEndAtZero)
{
    std::vector<std::thread> threads;
    for (int t = 0; t < 6; ++t)
    {
        threads.emplace_back(
            []
            {
                for (int i = 0; i < 1000; ++i)
                {
                    EXPECT_EQ(BrambleSupport::Initialize(), 0);
                    EXPECT_EQ(BrambleSupport::Shutdown(), 0);
                }
            });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(BrambleSupport::GetInitializeCount(), 0);
}

} // namespace
