#include "mvxcore/debug/Contract.h"

#include "mvxcore/config/Error.h"

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <string>

namespace mvxcore::debug
{
namespace
{

// Guards sContractHook and sAssertHook.
std::mutex sHookMutex;
ContractDialogHook sContractHook;
AssertHook sAssertHook;

void DefaultAssertReport(const AssertFailure& inFailure)
{
    std::fprintf(stderr, "Assertion failed: %.*s (%.*s) at %.*s:%d in %.*s\n",
                 static_cast<int>(inFailure.condition.size()), inFailure.condition.data(),
                 static_cast<int>(inFailure.message.size()), inFailure.message.data(),
                 static_cast<int>(inFailure.file.size()), inFailure.file.data(), inFailure.line,
                 static_cast<int>(inFailure.function.size()), inFailure.function.data());
}

} // namespace

ContractDialogHook SetContractDialogHook(ContractDialogHook inHook)
{
    std::lock_guard lock(sHookMutex);
    std::swap(sContractHook, inHook);
    return inHook;
}

AssertHook SetAssertHook(AssertHook inHook)
{
    std::lock_guard lock(sHookMutex);
    std::swap(sAssertHook, inHook);
    return inHook;
}

bool IsDebuggerAttached()
{
    std::ifstream status("/proc/self/status");
    std::string line;
    while (std::getline(status, line))
    {
        if (line.rfind("TracerPid:", 0) == 0)
            return std::strtol(line.c_str() + 10, nullptr, 10) != 0;
    }
    return false;
}

bool BreakAfterContractDialog(const ContractFailure& inFailure)
{
    ContractDialogHook hook;
    {
        std::lock_guard lock(sHookMutex);
        hook = sContractHook;
    }
    // The hook runs outside the lock so that it may itself replace hooks.
    return hook ? hook(inFailure) : false;
}

void BreakAfterAssertDialog(std::string_view inCondition, std::string_view inMessage,
                            std::string_view inFile, int inLine, std::string_view inFunction)
{
    AssertHook hook;
    {
        std::lock_guard lock(sHookMutex);
        hook = sAssertHook;
    }
    const AssertFailure failure{inCondition, inMessage, inFile, inLine, inFunction};
    if (hook)
        hook(failure);
    else
        DefaultAssertReport(failure);

    const char* breakOnAssert = std::getenv("MVX_BREAK_ON_ASSERT");
    if (breakOnAssert && std::string_view(breakOnAssert) == "1" && IsDebuggerAttached())
        std::raise(SIGTRAP);
}

void ContractViolated(ContractKind inKind, std::string_view inExpression, std::string_view inFile,
                      int inLine)
{
    const ContractFailure failure{inKind, inExpression, inFile, inLine};
    if (BreakAfterContractDialog(failure) && IsDebuggerAttached())
        std::raise(SIGTRAP);

    const bool input = inKind == ContractKind::kInput;
    config::ThrowError(0, kContractErrorMajor,
                       input ? kInputContractErrorMinor : kOutputContractErrorMinor,
                       input ? kInputContractViolationMessage : kOutputContractViolationMessage,
                       config::SourcePlace{inExpression, inFile, inLine});
}

} // namespace mvxcore::debug
