#pragma once

// BrambleSupport: the suite support library. The host publishes suites
// (tables of plain functions, each under a name and a version number) and
// plug-ins acquire them through the plain-C calls of
// "BrambleSupport/BrambleSuites.h".
//
// The library is counted: every Initialize is balanced by one Shutdown, and
// suites can be registered only while the count is above 0. The Shutdown that
// brings the count back to 0 withdraws every suite, so that the next
// Initialize starts with an empty registry. Tables are not owned: whoever
// registers a table keeps it alive until the library's last Shutdown.
//
// Every function may be called from any thread; one mutex guards the count
// and the registry, and no function calls out while holding it.

#include "BrambleSupport/BrambleSuites.h"
#include "QRT/Result.h"

#include <cstddef>
#include <cstdint>

namespace BrambleSupport
{

// A null or empty name, a version below 1, or a null table.
inline constexpr QRT::Result kResult_BadSuiteArgument = BRAMBLE_SUITE_BAD_ARGUMENT;
// Release of a suite that is unknown or not acquired.
inline constexpr QRT::Result kResult_SuiteNotAcquired = BRAMBLE_SUITE_NOT_ACQUIRED;
// RegisterSuite or Shutdown while the library is not initialised.
inline constexpr QRT::Result kResult_SuiteSupportNotInitialized =
    static_cast<QRT::Result>(0xA01C0003u);
// A second registration of the same (name, version).
inline constexpr QRT::Result kResult_SuiteAlreadyRegistered = QRT::kResult_AlreadyExists;

// Counts one more user. Answers 0.
QRT::Result Initialize();

// Balances one Initialize; the call that brings the count to 0 withdraws
// every suite. Answers 0, or kResult_SuiteSupportNotInitialized (the count
// stays 0) when there is nothing to balance.
QRT::Result Shutdown();

// The number of Initialize calls not yet balanced.
std::int32_t GetInitializeCount();

// Publishes inTable under (inName, inVersion). Answers 0,
// kResult_BadSuiteArgument, kResult_SuiteAlreadyRegistered (the first table
// stays), or kResult_SuiteSupportNotInitialized.
QRT::Result RegisterSuite(const char* inName, std::int32_t inVersion, const void* inTable);

// The number of registered (name, version) pairs.
std::size_t GetSuiteCount();

// The acquisitions of (inName, inVersion) not yet released; 0 for an unknown
// suite.
std::uint32_t GetSuiteAcquireCount(const char* inName, std::int32_t inVersion);

} // namespace BrambleSupport
