#pragma once

// Where a place of a JSON text is: the line of the value a JSON pointer
// names. Used only to word error messages, so it parses the text again
// rather than keep positions for every value on the way.

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace BE::timeline
{

// "/a/b~1c/0": inPath extended by an object key (escaped as JSON pointers
// escape "~" and "/") or by an array index.
std::string ChildPath(const std::string& inPath, std::string_view inKey);
std::string ChildPath(const std::string& inPath, std::size_t inIndex);

// The line (from 1) on which the value at inPointer starts, or nullopt when
// the text holds no such value.
std::optional<int> FindLineOfValue(std::string_view inText, const std::string& inPointer);

// The line and column (from 1) of byte inOffset of inText.
void LineAndColumn(std::string_view inText, std::size_t inOffset, int& outLine, int& outColumn);

} // namespace BE::timeline
