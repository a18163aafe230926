#pragma once

// Status values: signed 32-bit results, negative for failure. Every status
// the system uses is named once, here or in its subsystem's status header,
// and never written as a bare literal elsewhere.

#include <cstdint>

namespace QRT
{

using Result = int32_t;

inline constexpr Result kResult_Success = 0;
// Nothing found, index out of range, or prefetch not complete.
inline constexpr Result kResult_NotFound = static_cast<Result>(0xA00F0001u);
// The object does not implement the requested interface.
inline constexpr Result kResult_NoInterface = static_cast<Result>(0xA00A0001u);
// A registration under an identifier or name that is already taken.
inline constexpr Result kResult_AlreadyExists = static_cast<Result>(0xA00F0002u);

inline constexpr bool Succeeded(Result inResult) noexcept
{
    return inResult >= 0;
}
inline constexpr bool Failed(Result inResult) noexcept
{
    return inResult < 0;
}

} // namespace QRT
