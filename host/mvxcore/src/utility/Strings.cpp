#include "mvxcore/utility/Strings.h"

#include <cstdint>

namespace mvxcore::utility
{
namespace
{

void AppendUTF8(std::string& outText, char32_t inCodePoint)
{
    if (inCodePoint < 0x80)
    {
        outText.push_back(static_cast<char>(inCodePoint));
    }
    else if (inCodePoint < 0x800)
    {
        outText.push_back(static_cast<char>(0xC0 | (inCodePoint >> 6)));
        outText.push_back(static_cast<char>(0x80 | (inCodePoint & 0x3F)));
    }
    else if (inCodePoint < 0x10000)
    {
        outText.push_back(static_cast<char>(0xE0 | (inCodePoint >> 12)));
        outText.push_back(static_cast<char>(0x80 | ((inCodePoint >> 6) & 0x3F)));
        outText.push_back(static_cast<char>(0x80 | (inCodePoint & 0x3F)));
    }
    else
    {
        outText.push_back(static_cast<char>(0xF0 | (inCodePoint >> 18)));
        outText.push_back(static_cast<char>(0x80 | ((inCodePoint >> 12) & 0x3F)));
        outText.push_back(static_cast<char>(0x80 | ((inCodePoint >> 6) & 0x3F)));
        outText.push_back(static_cast<char>(0x80 | (inCodePoint & 0x3F)));
    }
}

void AppendUTF16(std::u16string& outText, char32_t inCodePoint)
{
    if (inCodePoint < 0x10000)
    {
        outText.push_back(static_cast<char16_t>(inCodePoint));
    }
    else
    {
        const char32_t offset = inCodePoint - 0x10000;
        outText.push_back(static_cast<char16_t>(0xD800 + (offset >> 10)));
        outText.push_back(static_cast<char16_t>(0xDC00 + (offset & 0x3FF)));
    }
}

bool IsHighSurrogate(char32_t inUnit)
{
    return inUnit >= 0xD800 && inUnit <= 0xDBFF;
}

bool IsLowSurrogate(char32_t inUnit)
{
    return inUnit >= 0xDC00 && inUnit <= 0xDFFF;
}

} // namespace

std::string UTF16to8(std::u16string_view inText)
{
    std::string result;
    result.reserve(inText.size());
    for (size_t i = 0; i < inText.size(); ++i)
    {
        const char32_t unit = inText[i];
        if (IsHighSurrogate(unit) && i + 1 < inText.size() && IsLowSurrogate(inText[i + 1]))
        {
            const char32_t low = inText[++i];
            AppendUTF8(result, 0x10000 + ((unit - 0xD800) << 10) + (low - 0xDC00));
        }
        else if (IsHighSurrogate(unit) || IsLowSurrogate(unit))
        {
            AppendUTF8(result, kReplacementCharacter);
        }
        else
        {
            AppendUTF8(result, unit);
        }
    }
    return result;
}

std::u16string UTF8to16(std::string_view inText)
{
    std::u16string result;
    result.reserve(inText.size());
    size_t i = 0;
    while (i < inText.size())
    {
        const uint8_t lead = static_cast<uint8_t>(inText[i]);
        if (lead < 0x80)
        {
            result.push_back(lead);
            ++i;
            continue;
        }

        // Length and the allowed range of the second byte per lead byte; the
        // narrowed ranges exclude overlong forms, surrogates and values above
        // U+10FFFF.
        size_t length = 0;
        uint8_t secondLow = 0x80;
        uint8_t secondHigh = 0xBF;
        char32_t codePoint = 0;
        if (lead >= 0xC2 && lead <= 0xDF)
        {
            length = 2;
            codePoint = lead & 0x1F;
        }
        else if (lead >= 0xE0 && lead <= 0xEF)
        {
            length = 3;
            codePoint = lead & 0x0F;
            if (lead == 0xE0)
                secondLow = 0xA0;
            else if (lead == 0xED)
                secondHigh = 0x9F;
        }
        else if (lead >= 0xF0 && lead <= 0xF4)
        {
            length = 4;
            codePoint = lead & 0x07;
            if (lead == 0xF0)
                secondLow = 0x90;
            else if (lead == 0xF4)
                secondHigh = 0x8F;
        }
        else
        {
            result.push_back(static_cast<char16_t>(kReplacementCharacter));
            ++i;
            continue;
        }

        // Take continuation bytes while they fit; a misfit ends the maximal
        // ill-formed subsequence, which becomes one U+FFFD, and decoding goes
        // on at the misfit byte.
        size_t taken = 1;
        bool complete = true;
        while (taken < length)
        {
            if (i + taken >= inText.size())
            {
                complete = false;
                break;
            }
            const uint8_t next = static_cast<uint8_t>(inText[i + taken]);
            const uint8_t low = taken == 1 ? secondLow : 0x80;
            const uint8_t high = taken == 1 ? secondHigh : 0xBF;
            if (next < low || next > high)
            {
                complete = false;
                break;
            }
            codePoint = (codePoint << 6) | (next & 0x3F);
            ++taken;
        }
        if (complete)
            AppendUTF16(result, codePoint);
        else
            result.push_back(static_cast<char16_t>(kReplacementCharacter));
        i += taken;
    }
    return result;
}

std::u16string AsciiToUTF16(std::string_view inText)
{
    std::u16string result;
    result.reserve(inText.size());
    for (const char c : inText)
    {
        const uint8_t byte = static_cast<uint8_t>(c);
        result.push_back(byte < 0x80 ? static_cast<char16_t>(byte)
                                     : static_cast<char16_t>(kReplacementCharacter));
    }
    return result;
}

} // namespace mvxcore::utility
