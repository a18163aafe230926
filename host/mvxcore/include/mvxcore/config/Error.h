#pragma once

// Errors raised by the core utilities. ThrowError is the single way a
// contract violation (and any other configured error) leaves a function: it
// throws mvxcore::config::Error, which carries the error level, the two error
// numbers, the message text and, for contracts, the failed expression with its
// source place.

#include <stdexcept>
#include <string>
#include <string_view>

namespace mvxcore::config
{

// Where a contract failed: the expression's text, the source file and line.
struct SourcePlace
{
    std::string_view expression;
    std::string_view file;
    int line = 0;
};

class Error : public std::runtime_error
{
public:
    Error(int inLevel, int inMajor, int inMinor, std::string inMessage, SourcePlace inPlace = {});

    int GetLevel() const noexcept { return mLevel; }
    int GetMajor() const noexcept { return mMajor; }
    int GetMinor() const noexcept { return mMinor; }
    // The message exactly as given ("$$$/..." key and English text).
    const std::string& GetMessage() const noexcept { return mMessage; }
    // Empty when the error did not come from a contract.
    const std::string& GetExpression() const noexcept { return mExpression; }
    const std::string& GetFile() const noexcept { return mFile; }
    int GetLine() const noexcept { return mLine; }

private:
    int mLevel;
    int mMajor;
    int mMinor;
    std::string mMessage;
    std::string mExpression;
    std::string mFile;
    int mLine;
};

[[noreturn]] void ThrowError(int inLevel, int inMajor, int inMinor, std::string_view inMessage,
                             SourcePlace inPlace = {});

} // namespace mvxcore::config
