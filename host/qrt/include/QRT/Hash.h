#pragma once

// QRT::HashValue and QRT::MixHash: the 16-byte content hashes behind node,
// producer, frame, cutlist and request keys.
//
// A HashValue starts at all zeros. MixHash::MixInData(ioHash, data, size)
// mixes one byte run into it:
//
//   1. The running length, the little-endian 32-bit word in bytes 12..15, is
//      increased by size (wrapping modulo 2^32).
//   2. XXH3-128 (seed 0, default secret) is computed over the 16 bytes of the
//      value as updated in step 1, followed by the size bytes of data.
//   3. Bytes 0..7 become the digest's low 64 bits, bytes 8..11 the low 32 bits
//      of its high 64 bits, each little-endian. Bytes 12..15 keep the running
//      length, so the total number of bytes mixed stays readable.
//
// Because every step chains from the previous value, mixing "ab" then "c"
// differs from mixing "abc" although both end with running length 3. All
// words are written little-endian explicitly, so a value is the same on every
// platform and in every run. Mixing an empty run still changes the value.
//
// Strings are mixed without a terminating zero, a Guid as its 16 in-memory
// bytes (GuidToBytes), trivially copyable values as their object bytes.
//
// HashValueToGuid reads the value as four little-endian 32-bit words w0..w3:
// Data1 = w0, Data2 = high 16 bits of w1, Data3 = low 16 bits of w1, Data4 =
// the bytes of w2 then of w3, each most significant byte first.
//
// A HashValue is a plain value; MixHash functions are reentrant.

#include "QRT/Guid.h"
#include "QRT/ImmutableString.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <type_traits>

namespace QRT
{

struct HashValue
{
    std::array<uint8_t, 16> mBytes{};

    // The number of bytes mixed so far, modulo 2^32 (bytes 12..15).
    uint32_t GetRunningLength() const noexcept;
    // The little-endian 32-bit word at index inIndex (0..3).
    uint32_t GetWord(size_t inIndex) const noexcept;
    bool IsZero() const noexcept;

    friend bool operator==(const HashValue&, const HashValue&) = default;
};

class MixHash
{
public:
    // Mixes inSize bytes at inData into ioHash (see the header comment).
    // inData may be null only when inSize is 0 (input contract).
    static void MixInData(HashValue& ioHash, const void* inData, size_t inSize);

    static void MixInString(HashValue& ioHash, std::string_view inText)
    {
        MixInData(ioHash, inText.data(), inText.size());
    }
    static void MixInString(HashValue& ioHash, const ImmutableString& inText)
    {
        MixInData(ioHash, inText.data(), inText.size());
    }
    static void MixInGuid(HashValue& ioHash, const Guid& inGuid);

    // The object bytes of a trivially copyable value, in host byte order.
    template <class T>
    static void MixInValue(HashValue& ioHash, const T& inValue)
    {
        static_assert(std::is_trivially_copyable_v<T>, "only trivially copyable values");
        static_assert(std::has_unique_object_representations_v<T> || std::is_floating_point_v<T>,
                      "padding bytes would make the hash depend on garbage");
        MixInData(ioHash, &inValue, sizeof(T));
    }
};

Guid HashValueToGuid(const HashValue& inHash) noexcept;

} // namespace QRT
