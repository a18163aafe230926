#pragma once

// ImporterHost: the host's importer framework, brought up and down by the
// libraries that read media through it (the video renderer among them).
//
// Counted: the first Initialize opens a session, every Initialize is
// balanced by one Shutdown, and the Shutdown that brings the count back to 0
// closes the session. Any thread; the calls are serialised.

#include "QRT/Result.h"

#include <cstdint>

namespace ImporterHost
{

// Shutdown without a matching Initialize.
inline constexpr QRT::Result kResult_ImporterHostNotInitialized =
    static_cast<QRT::Result>(0xA01C0004u);

// Counts one more user; the first opens a session. Answers 0.
QRT::Result Initialize();

// Balances one Initialize. Answers 0, or kResult_ImporterHostNotInitialized
// (the count stays 0) when there is nothing to balance.
QRT::Result Shutdown();

// The number of Initialize calls not yet balanced.
std::int32_t GetInitializeCount();

// True between the first Initialize and the Shutdown that balances it.
bool IsSessionOpen();

// How many sessions have been opened in this process.
std::uint32_t GetSessionCount();

} // namespace ImporterHost
