#pragma once

// The debug database: named switches that change the host's behaviour for
// debugging ("CompareMediaNodeRenderers", "DisableNewMediaNodeRenderer").
// Values are texts; a switch is on only when its text is exactly "true" and
// off when absent or any other text.
//
// Initial values come from the environment variable MVX_DEBUG, a
// comma-separated list of name=value entries, read on first use:
//
//     MVX_DEBUG="CompareMediaNodeRenderers=true,DisableNewMediaNodeRenderer=false"
//
// Spaces around names and values are ignored; entries without '=' or without
// a name are skipped. Every function may be called from any thread.

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace mvxcore::debug
{

inline constexpr const char* kDebugEnvironmentVariable = "MVX_DEBUG";
inline constexpr std::string_view kDebugTrueText = "true";

class DebugDatabase
{
public:
    DebugDatabase() = delete;

    // True only when inName holds exactly "true".
    static bool GetBool(std::string_view inName);
    // The text stored under inName, or nothing when absent.
    static std::optional<std::string> GetValue(std::string_view inName);
    // Input contract: "!inName.empty()".
    static void SetValue(std::string_view inName, std::string_view inText);
    // Removes inName (nothing happens when it is absent).
    static void Clear(std::string_view inName);
    static void ClearAll();

    // Stores the entries of a "Name1=value,Name2=value" list over the current
    // values. Answers how many entries were malformed and skipped.
    static size_t LoadFromText(std::string_view inList);
    // Replaces every value by the entries of MVX_DEBUG (none when unset).
    // Answers how many entries were malformed and skipped.
    static size_t LoadFromEnvironment();
};

} // namespace mvxcore::debug
