#pragma once

// Module-wide helpers of the library frame that other subsystems of the
// module and the module's tests use: the registration of one suite family
// with the suite support library, and views of the frame's counters.

#include "QRT/Result.h"

#include <cstdint>
#include <initializer_list>

namespace ML::ModuleInternals
{

// Registers inTable under inName once per version, in the order given, and
// answers the result of the last registration (earlier results are not
// looked at: a family stands or falls with its newest version).
QRT::Result RegisterSuiteVersions(const char* inName,
                                  std::initializer_list<std::int32_t> inVersions,
                                  const void* inTable);

// One start-up step of the suite table: RegisterSuiteVersions, whose result
// must be 0 (output contract "result == 0").
void RegisterSuiteFamily(const char* inName, std::initializer_list<std::int32_t> inVersions,
                         const void* inTable);

// The initialisation count (calls of VideoRenderer::Initialize not yet
// balanced). Takes the module lock.
std::int32_t GetInitializationCount();

// Sets the last request identifier handed out, so that the next
// GetNextRequestID answers the value after it (skipping 0).
void SetLastRequestID(std::uint32_t inLastID);

} // namespace ML::ModuleInternals
