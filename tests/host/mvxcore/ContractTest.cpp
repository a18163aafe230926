#include "mvxcore/debug/Contract.h"

#include "mvxcore/config/Error.h"

#include <functional>
#include <optional>
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

// Records every contract dialog (kind and line) and assertion report (texts
// and line).
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
                                   std::to_string(inFailure.line));
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

TEST_F(ContractTest, ViolationThrowsLevelZeroError105WithItsTextsAndPlaceAndCallsTheDialogOnce)
{
    const struct
    {
        std::function<void()> violate;
        ContractKind kind;
        int minor;
        const char* message;
        const char* expression;
        const int* line;
    } cases[] = {
        {[] { RequirePositive(-3); }, ContractKind::kInput, 25,
         "$$$/mvxcore/utility/Error/Contract/InputContractViolation=An input contract violation "
         "has occurred!",
         "inValue > 0", &sInputCheckLine},
        {[] { ProduceEven(4); }, ContractKind::kOutput, 26,
         "$$$/mvxcore/utility/Error/Contract/OutputContractViolation=An output contract "
         "violation has occurred!",
         "result % 2 == 0", &sOutputCheckLine},
    };
    for (const auto& c : cases)
    {
        SCOPED_TRACE(c.expression);
        mContracts.clear();
        std::optional<Error> error;
        try
        {
            c.violate();
        }
        catch (const Error& inError)
        {
            error = inError;
        }
        ASSERT_TRUE(error) << "the contract let the value through";
        EXPECT_EQ(error->GetLevel(), 0);
        EXPECT_EQ(error->GetMajor(), 105);
        EXPECT_EQ(error->GetMinor(), c.minor);
        EXPECT_EQ(error->GetMessage(), c.message);
        EXPECT_EQ(error->GetExpression(), c.expression);
        EXPECT_TRUE(error->GetFile().ends_with("ContractTest.cpp")) << error->GetFile();
        EXPECT_EQ(error->GetLine(), *c.line);
        EXPECT_NE(std::string(error->what()).find(c.expression), std::string::npos);
        EXPECT_EQ(mContracts, (std::vector<std::pair<ContractKind, int>>{{c.kind, *c.line}}));
    }
    EXPECT_TRUE(mAsserts.empty());
}

TEST_F(ContractTest, AssertionReportsThroughTheHookAndContinuesAndPassingChecksCallNoHook)
{
    EXPECT_EQ(RequirePositive(7), 7);
    EXPECT_EQ(AssertThenContinue(3), 4);
    EXPECT_TRUE(mAsserts.empty());
    EXPECT_EQ(AssertThenContinue(12), 13);
    EXPECT_EQ(mAsserts, std::vector<std::string>{"inValue < 10 / values stay below ten / " +
                                                 std::to_string(sAssertLine)});
    EXPECT_TRUE(mContracts.empty());
}

TEST_F(ContractTest, ReplacedHookAnswersAndABreakAnswerDoesNotTrapWithoutDebugger)
{
    int calls = 0;
    const auto previous =
        mvxcore::debug::SetContractDialogHook([&](const ContractFailure&) { return ++calls < 0; });
    ASSERT_TRUE(previous);
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(calls, 1);
    EXPECT_TRUE(mContracts.empty());
    // The fixture's hook comes back and sees the next failure.
    mvxcore::debug::SetContractDialogHook(previous);
    if (mvxcore::debug::IsDebuggerAttached())
        GTEST_SKIP() << "a debugger is attached; the break would be taken";
    mAnswerBreak = true;
    // Without a debugger the break is skipped and the error is thrown as usual
    // (a trap would end this process).
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(mContracts.size(), 1u);
}

} // namespace
