#include "mvxcore/utility/Guid.h"

#include <cstdio>
#include <random>

namespace mvxcore::utility
{

Guid Guid::CreateUnique()
{
    // One generator per thread, seeded from the system's entropy source.
    thread_local std::mt19937_64 sGenerator{[]
                                            {
                                                std::random_device rd;
                                                std::seed_seq seq{rd(), rd(), rd(), rd(),
                                                                  rd(), rd(), rd(), rd()};
                                                return std::mt19937_64(seq);
                                            }()};
    const uint64_t a = sGenerator();
    const uint64_t b = sGenerator();
    std::array<uint8_t, 16> bytes{};
    for (int i = 0; i < 8; ++i)
    {
        bytes[i] = static_cast<uint8_t>(a >> (8 * i));
        bytes[8 + i] = static_cast<uint8_t>(b >> (8 * i));
    }
    Guid g = GuidFromBytes(bytes);
    g.Data3 = static_cast<uint16_t>((g.Data3 & 0x0FFF) | 0x4000);  // version 4
    g.Data4[0] = static_cast<uint8_t>((g.Data4[0] & 0x3F) | 0x80); // RFC 4122 variant
    return g;
}

std::string Guid::ToString() const
{
    char text[39];
    std::snprintf(text, sizeof(text), "{%08x-%04x-%04x-%02x%02x-%02x%02x%02x%02x%02x%02x}", Data1,
                  Data2, Data3, Data4[0], Data4[1], Data4[2], Data4[3], Data4[4], Data4[5],
                  Data4[6], Data4[7]);
    return std::string(text, 38);
}

std::array<uint8_t, 16> GuidToBytes(const Guid& inGuid) noexcept
{
    std::array<uint8_t, 16> out{};
    for (int i = 0; i < 4; ++i)
        out[i] = static_cast<uint8_t>(inGuid.Data1 >> (8 * i));
    out[4] = static_cast<uint8_t>(inGuid.Data2);
    out[5] = static_cast<uint8_t>(inGuid.Data2 >> 8);
    out[6] = static_cast<uint8_t>(inGuid.Data3);
    out[7] = static_cast<uint8_t>(inGuid.Data3 >> 8);
    for (int i = 0; i < 8; ++i)
        out[8 + i] = inGuid.Data4[i];
    return out;
}

Guid GuidFromBytes(const std::array<uint8_t, 16>& inBytes) noexcept
{
    Guid g;
    g.Data1 = static_cast<uint32_t>(inBytes[0]) | static_cast<uint32_t>(inBytes[1]) << 8 |
              static_cast<uint32_t>(inBytes[2]) << 16 | static_cast<uint32_t>(inBytes[3]) << 24;
    g.Data2 = static_cast<uint16_t>(inBytes[4] | inBytes[5] << 8);
    g.Data3 = static_cast<uint16_t>(inBytes[6] | inBytes[7] << 8);
    for (int i = 0; i < 8; ++i)
        g.Data4[i] = inBytes[8 + i];
    return g;
}

} // namespace mvxcore::utility
