#pragma once

// 128-bit identifier: class, interface, renderer and plug-in identifiers, and
// content hashes. A literal value type, so interface identifiers can be
// compile-time constants written in their text form:
//
//     static constexpr mvxcore::utility::Guid kIID{"{282d21cf-d8da-4e4f-82be-6e9c176ca796}"};
//
// Text form: 8-4-4-4-12 hexadecimal digits, with or without surrounding braces,
// in either case. ToString writes lower case in braces.

#include <array>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

namespace mvxcore::utility
{

struct Guid
{
    uint32_t Data1 = 0;
    uint16_t Data2 = 0;
    uint16_t Data3 = 0;
    std::array<uint8_t, 8> Data4{};

    constexpr Guid() = default;
    constexpr Guid(uint32_t inData1, uint16_t inData2, uint16_t inData3,
                   const std::array<uint8_t, 8>& inData4)
        : Data1(inData1)
        , Data2(inData2)
        , Data3(inData3)
        , Data4(inData4)
    {
    }

    // Parses the text form; throws std::invalid_argument on malformed text
    // (which makes a malformed constant a compile error).
    explicit constexpr Guid(std::string_view inText)
    {
        const std::optional<Guid> parsed = Parse(inText);
        if (!parsed)
        {
            throw std::invalid_argument("malformed Guid text");
        }
        *this = *parsed;
    }

    // The text form, or nothing when inText is not one.
    static constexpr std::optional<Guid> Parse(std::string_view inText) noexcept;

    // A new random (version 4) identifier.
    static Guid CreateUnique();

    // "{xxxxxxxx-xxxx-xxxx-xxxx-xxxxxxxxxxxx}", lower case.
    std::string ToString() const;

    constexpr bool IsNil() const noexcept { return *this == Guid(); }

    friend constexpr bool operator==(const Guid&, const Guid&) = default;
    friend constexpr std::strong_ordering operator<=>(const Guid&, const Guid&) = default;
};

// The nil identifier (all zero).
inline constexpr Guid kGuid_Nil{};

// The 16 bytes of a Guid as it lies in memory: Data1, Data2 and Data3 least
// significant byte first, then the eight bytes of Data4. Hashes mix Guids in
// this form.
std::array<uint8_t, 16> GuidToBytes(const Guid& inGuid) noexcept;
Guid GuidFromBytes(const std::array<uint8_t, 16>& inBytes) noexcept;

namespace detail
{
constexpr int HexDigit(char inC) noexcept
{
    if (inC >= '0' && inC <= '9')
        return inC - '0';
    if (inC >= 'a' && inC <= 'f')
        return inC - 'a' + 10;
    if (inC >= 'A' && inC <= 'F')
        return inC - 'A' + 10;
    return -1;
}

// Reads inCount hex digits at inText[ioPos]; false on a non-digit.
constexpr bool ReadHex(std::string_view inText, size_t& ioPos, size_t inCount,
                       uint64_t& outValue) noexcept
{
    outValue = 0;
    for (size_t i = 0; i < inCount; ++i)
    {
        const int d = HexDigit(inText[ioPos++]);
        if (d < 0)
            return false;
        outValue = (outValue << 4) | static_cast<uint64_t>(d);
    }
    return true;
}
} // namespace detail

constexpr std::optional<Guid> Guid::Parse(std::string_view inText) noexcept
{
    if (inText.size() == 38)
    {
        if (inText.front() != '{' || inText.back() != '}')
            return std::nullopt;
        inText = inText.substr(1, 36);
    }
    if (inText.size() != 36 || inText[8] != '-' || inText[13] != '-' || inText[18] != '-' ||
        inText[23] != '-')
        return std::nullopt;

    Guid g;
    size_t pos = 0;
    uint64_t v = 0;
    if (!detail::ReadHex(inText, pos, 8, v))
        return std::nullopt;
    g.Data1 = static_cast<uint32_t>(v);
    ++pos;
    if (!detail::ReadHex(inText, pos, 4, v))
        return std::nullopt;
    g.Data2 = static_cast<uint16_t>(v);
    ++pos;
    if (!detail::ReadHex(inText, pos, 4, v))
        return std::nullopt;
    g.Data3 = static_cast<uint16_t>(v);
    ++pos;
    for (size_t i = 0; i < 8; ++i)
    {
        if (i == 2)
            ++pos; // the last dash
        if (!detail::ReadHex(inText, pos, 2, v))
            return std::nullopt;
        g.Data4[i] = static_cast<uint8_t>(v);
    }
    return g;
}

} // namespace mvxcore::utility

template <>
struct std::hash<mvxcore::utility::Guid>
{
    size_t operator()(const mvxcore::utility::Guid& inGuid) const noexcept
    {
        uint64_t lo = (static_cast<uint64_t>(inGuid.Data1) << 32) |
                      (static_cast<uint64_t>(inGuid.Data2) << 16) | inGuid.Data3;
        uint64_t hi = 0;
        for (uint8_t b : inGuid.Data4)
            hi = (hi << 8) | b;
        return static_cast<size_t>(lo * 0x9E3779B97F4A7C15ull ^ hi);
    }
};
