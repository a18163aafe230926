#pragma once

// Trace lines by category. A category is a dotted name
// ("ML.PluginVideoRenderer.RenderVideoFrame"); a line is written only when its
// category is enabled, as "category: text", to the trace sink (standard error
// unless replaced).
//
// Categories are enabled by patterns: an exact name, or a name ending in '*'
// that enables every category starting with what precedes the '*' ("ML.*"
// enables "ML.Queue" but not "ML"; "*" enables everything). The initial
// patterns come from the environment variable MVX_TRACE, a comma-separated
// list ("ML.*,QRT.Messages"), read on first use; spaces around the entries
// are ignored.
//
// Every function may be called from any thread. IsEnabled costs one atomic
// load while nothing is enabled. Lines from different threads never
// interleave: the sink is called for one whole line at a time. A sink must not
// write trace lines itself (they are dropped) nor replace the sink.
//
//     MVX_TRACE("ML.Queue", "request %u took %d ms", requestID, elapsed);

#include <functional>
#include <string>
#include <string_view>
#include <vector>

namespace mvxcore::trace
{

inline constexpr const char* kTraceEnvironmentVariable = "MVX_TRACE";

// True when inPattern (exact name, or prefix followed by '*') covers inCategory.
bool MatchesPattern(std::string_view inPattern, std::string_view inCategory);

// Adds one pattern (ignored when it is already enabled or empty).
void EnableCategory(std::string_view inPattern);
// Removes one pattern exactly as it was enabled.
void DisableCategory(std::string_view inPattern);
void DisableAll();
// Replaces the enabled patterns by the comma-separated list inList.
void SetEnabledCategories(std::string_view inList);
// Replaces the enabled patterns by the list in MVX_TRACE (none when unset).
void LoadFromEnvironment();
// The enabled patterns, in the order they were enabled.
std::vector<std::string> GetEnabledCategories();

bool IsEnabled(std::string_view inCategory);

// Writes "inCategory: inText" when inCategory is enabled.
void Write(std::string_view inCategory, std::string_view inText);
// printf-style Write.
void WriteFormatted(std::string_view inCategory, const char* inFormat, ...)
    __attribute__((format(printf, 2, 3)));

// Receives each whole line, without a line end.
using Sink = std::function<void(std::string_view inLine)>;
// Replaces the sink (an empty function restores standard error); returns the previous one.
Sink SetSink(Sink inSink);

} // namespace mvxcore::trace

// Formats only when the category is enabled.
#define MVX_TRACE(category, ...)                                                                   \
    do                                                                                             \
    {                                                                                              \
        if (::mvxcore::trace::IsEnabled(category))                                                 \
            ::mvxcore::trace::WriteFormatted(category, __VA_ARGS__);                               \
    } while (false)
