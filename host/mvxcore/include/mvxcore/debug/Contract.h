#pragma once

// Contracts: every function checks its inputs and outputs.
//
//     MVX_INPUT_CONTRACT(inVideoFrame != NULL);
//     MVX_OUTPUT_CONTRACT(result == 0);
//
// A failed check offers the contract dialog (BreakAfterContractDialog with the
// expression's text, the file and the line), breaks into a debugger only when
// one is attached and the dialog asks for it, and then throws through
// mvxcore::config::ThrowError with level 0, numbers 105/25 (input) or 105/26
// (output) and the fixed "$$$/..." messages below. The exception reaches the
// caller; nothing is logged and swallowed.
//
// Non-fatal assertions (MVX_ASSERT) report through BreakAfterAssertDialog, with
// the condition, the message, the file, the line and the function that checked,
// and let processing continue.
//
// Hooks may be replaced at any time from any thread; they are called on the
// thread whose check failed.

#include <functional>
#include <string_view>

namespace mvxcore::debug
{

inline constexpr int kContractErrorMajor = 105;
inline constexpr int kInputContractErrorMinor = 25;
inline constexpr int kOutputContractErrorMinor = 26;
inline constexpr std::string_view kInputContractViolationMessage =
    "$$$/mvxcore/utility/Error/Contract/InputContractViolation=An input contract violation has "
    "occurred!";
inline constexpr std::string_view kOutputContractViolationMessage =
    "$$$/mvxcore/utility/Error/Contract/OutputContractViolation=An output contract violation has "
    "occurred!";

enum class ContractKind
{
    kInput,
    kOutput,
};

struct ContractFailure
{
    ContractKind kind;
    std::string_view expression;
    std::string_view file;
    int line;
};

struct AssertFailure
{
    std::string_view condition;
    std::string_view message;
    std::string_view file;
    int line;
    // The function that checked, as its caller names it (empty when unnamed).
    std::string_view function;
};

// The contract dialog. Answers true when the user asked to break into the
// debugger. The default hook (headless host) answers false.
using ContractDialogHook = std::function<bool(const ContractFailure&)>;
// Replaces the hook (an empty function restores the default); returns the previous one.
ContractDialogHook SetContractDialogHook(ContractDialogHook inHook);

// The assertion report. The default hook writes one line to standard error.
using AssertHook = std::function<void(const AssertFailure&)>;
AssertHook SetAssertHook(AssertHook inHook);

// Offers the contract dialog and answers whether to break.
bool BreakAfterContractDialog(const ContractFailure& inFailure);

// Reports a failed non-fatal assertion and returns; breaks into an attached
// debugger only when MVX_BREAK_ON_ASSERT=1 is set in the environment.
// inFunction names the checking function ("ML::RenderFrameQueue::ProcessPrefetchRequests").
void BreakAfterAssertDialog(std::string_view inCondition, std::string_view inMessage,
                            std::string_view inFile, int inLine, std::string_view inFunction = {});

// True when a debugger is tracing this process.
bool IsDebuggerAttached();

// The whole failure path of a contract: dialog, optional break, throw.
[[noreturn]] void ContractViolated(ContractKind inKind, std::string_view inExpression,
                                   std::string_view inFile, int inLine);

} // namespace mvxcore::debug

#define MVX_INPUT_CONTRACT(expr)                                                                   \
    do                                                                                             \
    {                                                                                              \
        if (!(expr)) [[unlikely]]                                                                  \
            ::mvxcore::debug::ContractViolated(::mvxcore::debug::ContractKind::kInput, #expr,      \
                                               __FILE__, __LINE__);                                \
    } while (false)

#define MVX_OUTPUT_CONTRACT(expr)                                                                  \
    do                                                                                             \
    {                                                                                              \
        if (!(expr)) [[unlikely]]                                                                  \
            ::mvxcore::debug::ContractViolated(::mvxcore::debug::ContractKind::kOutput, #expr,     \
                                               __FILE__, __LINE__);                                \
    } while (false)

// Non-fatal: reports and continues.
#define MVX_ASSERT(cond, message)                                                                  \
    do                                                                                             \
    {                                                                                              \
        if (!(cond)) [[unlikely]]                                                                  \
            ::mvxcore::debug::BreakAfterAssertDialog(#cond, message, __FILE__, __LINE__,           \
                                                     __func__);                                    \
    } while (false)
