#include "mvxcore/config/Error.h"

namespace mvxcore::config
{

Error::Error(int inLevel, int inMajor, int inMinor, std::string inMessage, SourcePlace inPlace)
    : std::runtime_error(inPlace.expression.empty()
                             ? inMessage
                             : inMessage + " (" + std::string(inPlace.expression) + " at " +
                                   std::string(inPlace.file) + ":" + std::to_string(inPlace.line) +
                                   ")")
    , mLevel(inLevel)
    , mMajor(inMajor)
    , mMinor(inMinor)
    , mMessage(std::move(inMessage))
    , mExpression(inPlace.expression)
    , mFile(inPlace.file)
    , mLine(inPlace.line)
{
}

void ThrowError(int inLevel, int inMajor, int inMinor, std::string_view inMessage,
                SourcePlace inPlace)
{
    throw Error(inLevel, inMajor, inMinor, std::string(inMessage), inPlace);
}

} // namespace mvxcore::config
