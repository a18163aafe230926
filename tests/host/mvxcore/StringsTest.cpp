#include "mvxcore/utility/Strings.h"

#include <string>

#include <gtest/gtest.h>

namespace
{

using mvxcore::utility::AsciiToUTF16;
using mvxcore::utility::UTF16to8;
using mvxcore::utility::UTF8to16;

const std::string kReplacement8 = "\xEF\xBF\xBD";
constexpr char16_t kReplacement16 = u'\xFFFD';

class StringsTest : public ::testing::Test
{
};

TEST_F(StringsTest, ConvertsAsciiBothWaysUnchanged)
{
    EXPECT_EQ(UTF16to8(u"RenderFrame 42"), "RenderFrame 42");
    EXPECT_EQ(UTF8to16("RenderFrame 42"), u"RenderFrame 42");
    EXPECT_EQ(UTF16to8(u""), "");
    EXPECT_EQ(UTF8to16(""), u"");
    // An embedded zero is a character like any other.
    EXPECT_EQ(UTF8to16(std::string("a\0b", 3)), std::u16string(u"a\0b", 3));
}

TEST_F(StringsTest, ConvertsTwoAndThreeByteSequences)
{
    EXPECT_EQ(UTF16to8(u"\u00E9\u20AC"), "\xC3\xA9\xE2\x82\xAC");
    EXPECT_EQ(UTF8to16("\xC3\xA9\xE2\x82\xAC"), u"\u00E9\u20AC");
    EXPECT_EQ(UTF16to8(u"\u07FF\u0800\uFFFF"), "\xDF\xBF\xE0\xA0\x80\xEF\xBF\xBF");
}

TEST_F(StringsTest, ConvertsSurrogatePairsToFourByteSequencesAndBack)
{
    const std::u16string grinning = {0xD83D, 0xDE00};
    EXPECT_EQ(UTF16to8(grinning), "\xF0\x9F\x98\x80");
    EXPECT_EQ(UTF8to16("\xF0\x9F\x98\x80"), grinning);
    const std::u16string highest = {0xDBFF, 0xDFFF};
    EXPECT_EQ(UTF16to8(highest), "\xF4\x8F\xBF\xBF");
    EXPECT_EQ(UTF8to16("\xF4\x8F\xBF\xBF"), highest);
    const std::u16string lowest = {0xD800, 0xDC00};
    EXPECT_EQ(UTF8to16("\xF0\x90\x80\x80"), lowest);
}

TEST_F(StringsTest, ReplacesUnpairedSurrogates)
{
    EXPECT_EQ(UTF16to8(std::u16string{u'a', 0xD83D}), "a" + kReplacement8);
    EXPECT_EQ(UTF16to8(std::u16string{0xDE00, u'b'}), kReplacement8 + "b");
    EXPECT_EQ(UTF16to8(std::u16string{0xD83D, u'c'}), kReplacement8 + "c");
    // Reversed order is two lone surrogates.
    EXPECT_EQ(UTF16to8(std::u16string{0xDE00, 0xD83D}), kReplacement8 + kReplacement8);
    EXPECT_EQ(UTF16to8(std::u16string{0xD83D, 0xD83D, 0xDE00}), kReplacement8 + "\xF0\x9F\x98\x80");
}

TEST_F(StringsTest, ReplacesEachMaximalIllFormedUTF8Subsequence)
{
    const char16_t r = kReplacement16;
    // Lone continuation bytes and bytes that never start a sequence.
    EXPECT_EQ(UTF8to16("\x80"), std::u16string({r}));
    EXPECT_EQ(UTF8to16("\xF5\xFF"), std::u16string({r, r}));
    // Overlong forms.
    EXPECT_EQ(UTF8to16("\xC0\xAF"), std::u16string({r, r}));
    EXPECT_EQ(UTF8to16("\xE0\x80\xAF"), std::u16string({r, r, r}));
    EXPECT_EQ(UTF8to16("\xF0\x80\x80\xAF"), std::u16string({r, r, r, r}));
    // Encoded surrogates and values above U+10FFFF.
    EXPECT_EQ(UTF8to16("\xED\xA0\x80"), std::u16string({r, r, r}));
    EXPECT_EQ(UTF8to16("\xF4\x90\x80\x80"), std::u16string({r, r, r, r}));
    // Cut-off sequences become one replacement each.
    EXPECT_EQ(UTF8to16("\xE2\x82"), std::u16string({r}));
    EXPECT_EQ(UTF8to16("\xE2\x82"
                       "A"),
              std::u16string({r, u'A'}));
    EXPECT_EQ(UTF8to16("\xF0\x9F\x98"), std::u16string({r}));
    // The mixed example of the Unicode standard's recommended practice.
    EXPECT_EQ(UTF8to16("\x61\xF1\x80\x80\xE1\x80\xC2\x62\x80\x63\x80\xBF\x64"),
              std::u16string({u'a', r, r, r, u'b', r, u'c', r, r, u'd'}));
}

TEST_F(StringsTest, RoundTripsEveryScalarValue)
{
    for (char32_t codePoint = 1; codePoint <= 0x10FFFF; ++codePoint)
    {
        if (codePoint >= 0xD800 && codePoint <= 0xDFFF)
            continue;
        std::u16string utf16;
        if (codePoint < 0x10000)
        {
            utf16.push_back(static_cast<char16_t>(codePoint));
        }
        else
        {
            utf16.push_back(static_cast<char16_t>(0xD800 + ((codePoint - 0x10000) >> 10)));
            utf16.push_back(static_cast<char16_t>(0xDC00 + ((codePoint - 0x10000) & 0x3FF)));
        }
        const std::string utf8 = UTF16to8(utf16);
        const size_t expectedLength = codePoint < 0x80      ? 1
                                      : codePoint < 0x800   ? 2
                                      : codePoint < 0x10000 ? 3
                                                            : 4;
        ASSERT_EQ(utf8.size(), expectedLength) << std::hex << static_cast<uint32_t>(codePoint);
        ASSERT_EQ(UTF8to16(utf8), utf16) << std::hex << static_cast<uint32_t>(codePoint);
    }
}

TEST_F(StringsTest, AsciiWideningReplacesHighBytes)
{
    EXPECT_EQ(AsciiToUTF16("Still Image"), u"Still Image");
    EXPECT_EQ(AsciiToUTF16("A\xE9Z"), std::u16string({u'A', kReplacement16, u'Z'}));
    EXPECT_EQ(AsciiToUTF16(""), u"");
}

} // namespace
