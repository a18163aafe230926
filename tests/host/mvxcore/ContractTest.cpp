#include "mvxcore/debug/Contract.h"

#include "mvxcore/config/Error.h"

#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace
{

using mvxcore::config::Error;
using mvxcore::debug::AssertFailure;
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

bool EndsWith(const std::string& inText, const std::string& inEnd)
{
    return inText.size() >= inEnd.size() &&
           inText.compare(inText.size() - inEnd.size(), inEnd.size(), inEnd) == 0;
}

// Records every contract dialog and assertion report with copies of their texts.
class ContractTest : public ::testing::Test
{
protected:
    struct SeenContract
    {
        ContractKind kind;
        std::string expression;
        std::string file;
        int line;
    };
    struct SeenAssert
    {
        std::string condition;
        std::string message;
        std::string file;
        int line;
    };

    void SetUp() override
    {
        mvxcore::debug::SetContractDialogHook(
            [this](const ContractFailure& inFailure)
            {
                mContracts.push_back({inFailure.kind, std::string(inFailure.expression),
                                      std::string(inFailure.file), inFailure.line});
                return mAnswerBreak;
            });
        mvxcore::debug::SetAssertHook(
            [this](const AssertFailure& inFailure)
            {
                mAsserts.push_back({std::string(inFailure.condition),
                                    std::string(inFailure.message), std::string(inFailure.file),
                                    inFailure.line});
            });
    }

    void TearDown() override
    {
        mvxcore::debug::SetContractDialogHook({});
        mvxcore::debug::SetAssertHook({});
    }

    bool mAnswerBreak = false;
    std::vector<SeenContract> mContracts;
    std::vector<SeenAssert> mAsserts;
};

TEST_F(ContractTest, InputViolationThrowsLevelZeroError105Of25WithExpressionAndPlace)
{
    try
    {
        RequirePositive(-3);
        FAIL() << "the input contract let -3 through";
    }
    catch (const Error& inError)
    {
        EXPECT_EQ(inError.GetLevel(), 0);
        EXPECT_EQ(inError.GetMajor(), 105);
        EXPECT_EQ(inError.GetMinor(), 25);
        EXPECT_EQ(inError.GetMessage(), "$$$/mvxcore/utility/Error/Contract/"
                                        "InputContractViolation=An input contract violation has "
                                        "occurred!");
        EXPECT_EQ(inError.GetExpression(), "inValue > 0");
        EXPECT_TRUE(EndsWith(inError.GetFile(), "ContractTest.cpp")) << inError.GetFile();
        EXPECT_EQ(inError.GetLine(), sInputCheckLine);
        EXPECT_NE(std::string(inError.what()).find("inValue > 0"), std::string::npos);
    }
}

TEST_F(ContractTest, OutputViolationThrowsLevelZeroError105Of26WithExpressionAndPlace)
{
    try
    {
        ProduceEven(4);
        FAIL() << "the output contract let an odd result through";
    }
    catch (const Error& inError)
    {
        EXPECT_EQ(inError.GetLevel(), 0);
        EXPECT_EQ(inError.GetMajor(), 105);
        EXPECT_EQ(inError.GetMinor(), 26);
        EXPECT_EQ(inError.GetMessage(), "$$$/mvxcore/utility/Error/Contract/"
                                        "OutputContractViolation=An output contract violation has "
                                        "occurred!");
        EXPECT_EQ(inError.GetExpression(), "result % 2 == 0");
        EXPECT_EQ(inError.GetLine(), sOutputCheckLine);
    }
}

TEST_F(ContractTest, DialogHookReceivesEachFailureOnce)
{
    EXPECT_THROW(RequirePositive(0), Error);
    EXPECT_THROW(ProduceEven(1), Error);
    ASSERT_EQ(mContracts.size(), 2u);
    EXPECT_EQ(mContracts[0].kind, ContractKind::kInput);
    EXPECT_EQ(mContracts[0].expression, "inValue > 0");
    EXPECT_TRUE(EndsWith(mContracts[0].file, "ContractTest.cpp"));
    EXPECT_EQ(mContracts[0].line, sInputCheckLine);
    EXPECT_EQ(mContracts[1].kind, ContractKind::kOutput);
    EXPECT_EQ(mContracts[1].expression, "result % 2 == 0");
    EXPECT_EQ(mContracts[1].line, sOutputCheckLine);
}

TEST_F(ContractTest, PassingChecksCallNoHook)
{
    EXPECT_EQ(RequirePositive(7), 7);
    EXPECT_EQ(AssertThenContinue(3), 4);
    EXPECT_TRUE(mContracts.empty());
    EXPECT_TRUE(mAsserts.empty());
}

TEST_F(ContractTest, DialogAskingToBreakDoesNotTrapWithoutDebugger)
{
    if (mvxcore::debug::IsDebuggerAttached())
        GTEST_SKIP() << "a debugger is attached; the break would be taken";
    mAnswerBreak = true;
    // Without a debugger the break is skipped and the error is thrown as usual
    // (a trap would end this process).
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(mContracts.size(), 1u);
}

TEST_F(ContractTest, AssertionReportsThroughTheHookAndContinues)
{
    EXPECT_EQ(AssertThenContinue(12), 13);
    ASSERT_EQ(mAsserts.size(), 1u);
    EXPECT_EQ(mAsserts[0].condition, "inValue < 10");
    EXPECT_EQ(mAsserts[0].message, "values stay below ten");
    EXPECT_TRUE(EndsWith(mAsserts[0].file, "ContractTest.cpp"));
    EXPECT_EQ(mAsserts[0].line, sAssertLine);
    EXPECT_TRUE(mContracts.empty());
}

TEST_F(ContractTest, ReplacingAHookAnswersThePreviousOne)
{
    int calls = 0;
    const auto previous = mvxcore::debug::SetContractDialogHook(
        [&](const ContractFailure&)
        {
            ++calls;
            return false;
        });
    ASSERT_TRUE(previous);
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(calls, 1);
    EXPECT_TRUE(mContracts.empty());
    // The fixture's hook comes back and sees the next failure.
    mvxcore::debug::SetContractDialogHook(previous);
    EXPECT_THROW(RequirePositive(-1), Error);
    EXPECT_EQ(mContracts.size(), 1u);
    EXPECT_EQ(calls, 1);
}

} // namespace
