#pragma once

// Test helpers shared by every suite: check that a call breaks an input or
// output contract with exactly the expected expression text.
//
//     EXPECT_INPUT_CONTRACT(frame->SetFieldType(7), "IsValidFieldType(inFieldType)");
//     vrtest::ExpectInputContract([&] { rate.ToFrame64(zero); }, "inRate > kFrameRate_Zero");

#include "mvxcore/config/Error.h"
#include "mvxcore/debug/Contract.h"

#include <string>

#include <gtest/gtest.h>

namespace vrtest
{

template <typename Call>
void ExpectContract(Call&& inCall, int inMinor, const std::string& inExpression)
{
    try
    {
        inCall();
        ADD_FAILURE() << "no contract violation; expected \"" << inExpression << "\"";
    }
    catch (const mvxcore::config::Error& error)
    {
        EXPECT_EQ(error.GetLevel(), 0);
        EXPECT_EQ(error.GetMajor(), mvxcore::debug::kContractErrorMajor);
        EXPECT_EQ(error.GetMinor(), inMinor);
        EXPECT_EQ(error.GetExpression(), inExpression);
    }
}

template <typename Call>
void ExpectInputContract(Call&& inCall, const std::string& inExpression)
{
    ExpectContract(inCall, mvxcore::debug::kInputContractErrorMinor, inExpression);
}

template <typename Call>
void ExpectOutputContract(Call&& inCall, const std::string& inExpression)
{
    ExpectContract(inCall, mvxcore::debug::kOutputContractErrorMinor, inExpression);
}

} // namespace vrtest

#define EXPECT_INPUT_CONTRACT(statement, expressionText)                                           \
    ::vrtest::ExpectInputContract([&] { statement; }, expressionText)

#define EXPECT_OUTPUT_CONTRACT(statement, expressionText)                                          \
    ::vrtest::ExpectOutputContract([&] { statement; }, expressionText)
