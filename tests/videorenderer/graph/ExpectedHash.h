#pragma once

// Independent re-computation of hashes from their byte runs, so the tests
// check the exact order and length of every run mixed, not merely that a
// hash changed.

#include "QRT/Guid.h"
#include "QRT/Hash.h"

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

namespace graphtest
{

using ByteRuns = std::vector<std::string>;

inline std::string BytesOf(std::int64_t inValue)
{
    std::string bytes(sizeof(inValue), '\0');
    std::memcpy(bytes.data(), &inValue, sizeof(inValue));
    return bytes;
}

inline std::string BytesOf(const QRT::Guid& inGuid)
{
    const auto bytes = QRT::GuidToBytes(inGuid);
    return std::string(reinterpret_cast<const char*>(bytes.data()), bytes.size());
}

inline QRT::Guid HashOfRuns(const ByteRuns& inRuns)
{
    QRT::HashValue hash;
    for (const std::string& run : inRuns)
        QRT::MixHash::MixInData(hash, run.data(), run.size());
    return QRT::HashValueToGuid(hash);
}

} // namespace graphtest
