#include "mvxcore/utility/Strings.h"

#include <string>

#include <gtest/gtest.h>

namespace
{

using mvxcore::utility::UTF16to8;
using mvxcore::utility::UTF8to16;

const std::string kR8 = "\xEF\xBF\xBD";
constexpr char16_t kR = u'\xFFFD';

TEST(StringsTest, EveryScalarValueRoundTripsAtItsEncodedLength)
{
    for (char32_t codePoint = 1; codePoint <= 0x10FFFF; ++codePoint)
    {
        if (codePoint >= 0xD800 && codePoint <= 0xDFFF)
            continue;
        std::u16string utf16;
        if (codePoint < 0x10000)
            utf16.push_back(static_cast<char16_t>(codePoint));
        else
            utf16 = {static_cast<char16_t>(0xD800 + ((codePoint - 0x10000) >> 10)),
                     static_cast<char16_t>(0xDC00 + ((codePoint - 0x10000) & 0x3FF))};
        const std::string utf8 = UTF16to8(utf16);
        const size_t length = codePoint < 0x80      ? 1
                              : codePoint < 0x800   ? 2
                              : codePoint < 0x10000 ? 3
                                                    : 4;
        ASSERT_EQ(utf8.size(), length) << std::hex << static_cast<uint32_t>(codePoint);
        ASSERT_EQ(UTF8to16(utf8), utf16) << std::hex << static_cast<uint32_t>(codePoint);
    }
    // An embedded zero is a character like any other.
    EXPECT_EQ(UTF8to16(std::string("a\0b", 3)), std::u16string(u"a\0b", 3));
}

TEST(StringsTest, UnpairedSurrogatesAreReplaced)
{
    EXPECT_EQ(UTF16to8(std::u16string{u'a', 0xD83D}), "a" + kR8);
    // Reversed order is two lone surrogates.
    EXPECT_EQ(UTF16to8(std::u16string{0xDE00, 0xD83D}), kR8 + kR8);
    EXPECT_EQ(UTF16to8(std::u16string{0xD83D, 0xD83D, 0xDE00}), kR8 + "\xF0\x9F\x98\x80");
}

TEST(StringsTest, EachMaximalIllFormedUTF8SubsequenceIsReplacedOnce)
{
    const std::pair<const char*, std::u16string> cases[] = {
        // Bytes that never start a sequence, overlong forms, encoded
        // surrogates and values above U+10FFFF.
        {"\xF5\xFF", {kR, kR}},
        {"\xE0\x80\xAF", {kR, kR, kR}},
        {"\xF0\x80\x80\xAF", {kR, kR, kR, kR}},
        {"\xED\xA0\x80", {kR, kR, kR}},
        {"\xF4\x90\x80\x80", {kR, kR, kR, kR}},
        // A cut-off sequence becomes one replacement.
        {"\xF0\x9F\x98", {kR}},
        // The mixed example of the Unicode standard's recommended practice.
        {"\x61\xF1\x80\x80\xE1\x80\xC2\x62\x80\x63\x80\xBF\x64",
         {u'a', kR, kR, kR, u'b', kR, u'c', kR, kR, u'd'}},
    };
    for (const auto& [utf8, utf16] : cases)
        EXPECT_EQ(UTF8to16(utf8), utf16) << testing::PrintToString(std::string(utf8));
    EXPECT_EQ(mvxcore::utility::AsciiToUTF16("A\xE9Z"), std::u16string({u'A', kR, u'Z'}));
}

} // namespace
