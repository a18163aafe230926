#include "QRT/Hash.h"

#include "mvxcore/debug/Contract.h"

#include <cstring>

// The stack-allocated streaming state needs the state's definition, which
// matches the installed library's version.
#define XXH_STATIC_LINKING_ONLY
#include <xxhash.h>

namespace QRT
{
namespace
{

// Runs up to this size are hashed in one call over a stack copy of
// (value || data); longer ones go through the streaming state, which gives
// the same digest.
constexpr size_t kOneShotLimit = 2048;

uint32_t ReadLE32(const uint8_t* inBytes) noexcept
{
    return static_cast<uint32_t>(inBytes[0]) | (static_cast<uint32_t>(inBytes[1]) << 8) |
           (static_cast<uint32_t>(inBytes[2]) << 16) | (static_cast<uint32_t>(inBytes[3]) << 24);
}

void WriteLE32(uint8_t* outBytes, uint32_t inValue) noexcept
{
    for (int i = 0; i < 4; ++i)
        outBytes[i] = static_cast<uint8_t>(inValue >> (8 * i));
}

void WriteLE64(uint8_t* outBytes, uint64_t inValue) noexcept
{
    for (int i = 0; i < 8; ++i)
        outBytes[i] = static_cast<uint8_t>(inValue >> (8 * i));
}

} // namespace

uint32_t HashValue::GetRunningLength() const noexcept
{
    return ReadLE32(&mBytes[12]);
}

uint32_t HashValue::GetWord(size_t inIndex) const noexcept
{
    return inIndex < 4 ? ReadLE32(&mBytes[inIndex * 4]) : 0;
}

bool HashValue::IsZero() const noexcept
{
    for (uint8_t byte : mBytes)
    {
        if (byte != 0)
            return false;
    }
    return true;
}

void MixHash::MixInData(HashValue& ioHash, const void* inData, size_t inSize)
{
    MVX_INPUT_CONTRACT(inData != nullptr || inSize == 0);

    const uint32_t length = ioHash.GetRunningLength() + static_cast<uint32_t>(inSize);
    WriteLE32(&ioHash.mBytes[12], length);

    XXH128_hash_t digest;
    if (inSize <= kOneShotLimit)
    {
        uint8_t buffer[16 + kOneShotLimit];
        std::memcpy(buffer, ioHash.mBytes.data(), 16);
        if (inSize != 0)
            std::memcpy(buffer + 16, inData, inSize);
        digest = XXH3_128bits(buffer, 16 + inSize);
    }
    else
    {
        XXH3_state_t state;
        XXH3_INITSTATE(&state);
        XXH3_128bits_reset(&state);
        XXH3_128bits_update(&state, ioHash.mBytes.data(), 16);
        XXH3_128bits_update(&state, inData, inSize);
        digest = XXH3_128bits_digest(&state);
    }

    WriteLE64(&ioHash.mBytes[0], digest.low64);
    WriteLE32(&ioHash.mBytes[8], static_cast<uint32_t>(digest.high64));
}

void MixHash::MixInGuid(HashValue& ioHash, const Guid& inGuid)
{
    const std::array<uint8_t, 16> bytes = GuidToBytes(inGuid);
    MixInData(ioHash, bytes.data(), bytes.size());
}

Guid HashValueToGuid(const HashValue& inHash) noexcept
{
    const uint32_t w1 = inHash.GetWord(1);
    const uint32_t w2 = inHash.GetWord(2);
    const uint32_t w3 = inHash.GetWord(3);
    Guid guid;
    guid.Data1 = inHash.GetWord(0);
    guid.Data2 = static_cast<uint16_t>(w1 >> 16);
    guid.Data3 = static_cast<uint16_t>(w1 & 0xFFFF);
    for (int i = 0; i < 4; ++i)
    {
        guid.Data4[i] = static_cast<uint8_t>(w2 >> (24 - 8 * i));
        guid.Data4[4 + i] = static_cast<uint8_t>(w3 >> (24 - 8 * i));
    }
    return guid;
}

} // namespace QRT
