#include "mvxcore/debug/Contract.h"

#include "ContractExpect.h"
#include "mvxcore/config/Error.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using mvxcore::config::Error;
using mvxcore::debug::ContractFailure;
using mvxcore::debug::ContractKind;

int sInputCheckLine = 0;
int sOutputCheckLine = 0;
int sAssertLine = 0;

int RequirePositive(int inValue)
{
    sInputCheckLine = __LINE__ + 1;
    MVX_INPUT_CONTRACT(inValue > 0);
    return inValue;
}

int ProduceEven(int inValue)
{
    const int result = inValue * 2 + 1;
    sOutputCheckLine = __LINE__ + 1;
    MVX_OUTPUT_CONTRACT(result % 2 == 0);
    return result;
}

int AssertThenContinue(int inValue)
{
    sAssertLine = __LINE__ + 1;
    MVX_ASSERT(inValue < 10, "values stay below ten");
    return inValue + 1;
}

// Records every contract dialog (kind and line) and assertion report (texts,
// line and function).
class ContractTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        mvxcore::debug::SetContractDialogHook(
            [this](const ContractFailure& inFailure)
            {
                mContracts.emplace_back(inFailure.kind, inFailure.line);
                return mAnswerBreak;
            });
        mvxcore::debug::SetAssertHook(
            [this](const mvxcore::debug::AssertFailure& inFailure)
            {
                mAsserts.push_back(std::string(inFailure.condition) + " / " +
                                   std::string(inFailure.message) + " / " +
                                   std::to_string(inFailure.line) + " / " +
                                   std::string(inFailure.function));
            });
    }

    void TearDown() override
    {
        mvxcore::debug::SetContractDialogHook({});
        mvxcore::debug::SetAssertHook({});
    }

    bool mAnswerBreak = false;
    std::vector<std::pair<ContractKind, int>> mContracts;
    std::vector<std::string> mAsserts;
};

TEST_F(ContractTest, ViolationThrowsAContractErrorAndCallsTheDialogOnceAndAssertionsContinue)
{
    // Passing checks call no hook; a failed assertion reports and continues.
    EXPECT_EQ(RequirePositive(7), 7);
    EXPECT_EQ(AssertThenContinue(3), 4);
    EXPECT_EQ(AssertThenContinue(12), 13);
    EXPECT_EQ(mAsserts,
              std::vector<std::string>{"inValue < 10 / values stay below ten / " +
                                       std::to_string(sAssertLine) + " / AssertThenContinue"});
    vrtest::ExpectInputContract([] { RequirePositive(-3); }, "inValue > 0");
    vrtest::ExpectOutputContract([] { ProduceEven(4); }, "result % 2 == 0");
    EXPECT_EQ(mContracts, (std::vector<std::pair<ContractKind, int>>{
                              {ContractKind::kInput, sInputCheckLine},
                              {ContractKind::kOutput, sOutputCheckLine}}));
    try
    {
        RequirePositive(0);
        ADD_FAILURE() << "no violation";
    }
    catch (const Error& inError)
    {
        EXPECT_EQ(inError.GetMessage(), "$$$/mvxcore/utility/Error/Contract/"
                                        "InputContractViolation=An input contract violation "
                                        "has occurred!");
        EXPECT_TRUE(inError.GetFile().ends_with("ContractTest.cpp")) << inError.GetFile();
        EXPECT_EQ(inError.GetLine(), sInputCheckLine);
    }
    EXPECT_EQ(mAsserts.size(), 1u);
}

TEST_F(ContractTest, ABreakAnswerDoesNotTrapWithoutDebugger)
{
    if (mvxcore::debug::IsDebuggerAttached())
        GTEST_SKIP() << "a debugger is attached; the break would be taken";
    mAnswerBreak = true;
    // Without a debugger the break is skipped and the error is thrown as usual
    // (a trap would end this process).
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(mContracts.size(), 1u);
}

} // namespace
