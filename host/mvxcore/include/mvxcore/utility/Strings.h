#pragma once

// Conversions between the host's UTF-16 strings and UTF-8 byte strings.
// They never fail: whatever cannot be decoded (a lone surrogate, a malformed
// or overlong UTF-8 sequence, a code point above U+10FFFF, a cut-off
// sequence) becomes U+FFFD, one per maximal ill-formed subsequence, and the
// conversion goes on with the next unit. Pure functions, callable from any
// thread.

#include <string>
#include <string_view>

namespace mvxcore::utility
{

inline constexpr char32_t kReplacementCharacter = 0xFFFD;

std::string UTF16to8(std::u16string_view inText);
std::u16string UTF8to16(std::string_view inText);
// Widens 7-bit text; any byte above 0x7F becomes U+FFFD.
std::u16string AsciiToUTF16(std::string_view inText);

} // namespace mvxcore::utility
