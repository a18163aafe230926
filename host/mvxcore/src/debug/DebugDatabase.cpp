#include "mvxcore/debug/DebugDatabase.h"

#include "mvxcore/debug/Contract.h"

#include <cstdlib>
#include <map>
#include <mutex>
#include <shared_mutex>
#include <utility>
#include <vector>

namespace mvxcore::debug
{
namespace
{

// Guards sValues.
std::shared_mutex sValuesMutex;
std::map<std::string, std::string, std::less<>> sValues;
std::once_flag sEnvironmentOnce;

std::string_view Trim(std::string_view inText)
{
    const auto first = inText.find_first_not_of(" \t");
    if (first == std::string_view::npos)
        return {};
    const auto last = inText.find_last_not_of(" \t");
    return inText.substr(first, last - first + 1);
}

using Entries = std::vector<std::pair<std::string, std::string>>;

// Splits "A=x,B=y" into entries; counts the malformed ones in outSkipped.
Entries ParseList(std::string_view inList, size_t& outSkipped)
{
    Entries entries;
    outSkipped = 0;
    while (!inList.empty())
    {
        const auto comma = inList.find(',');
        const std::string_view entry = Trim(inList.substr(0, comma));
        if (!entry.empty())
        {
            const auto equals = entry.find('=');
            const std::string_view name = equals == std::string_view::npos
                                              ? std::string_view()
                                              : Trim(entry.substr(0, equals));
            if (name.empty())
                ++outSkipped;
            else
                entries.emplace_back(name, Trim(entry.substr(equals + 1)));
        }
        if (comma == std::string_view::npos)
            break;
        inList.remove_prefix(comma + 1);
    }
    return entries;
}

Entries ReadEnvironment(size_t& outSkipped)
{
    const char* list = std::getenv(kDebugEnvironmentVariable);
    outSkipped = 0;
    return list ? ParseList(list, outSkipped) : Entries();
}

void EnsureEnvironmentLoaded()
{
    std::call_once(sEnvironmentOnce,
                   []
                   {
                       size_t skipped = 0;
                       Entries entries = ReadEnvironment(skipped);
                       std::unique_lock lock(sValuesMutex);
                       for (auto& [name, value] : entries)
                           sValues.insert_or_assign(std::move(name), std::move(value));
                   });
}

} // namespace

bool DebugDatabase::GetBool(std::string_view inName)
{
    EnsureEnvironmentLoaded();
    std::shared_lock lock(sValuesMutex);
    const auto found = sValues.find(inName);
    return found != sValues.end() && found->second == kDebugTrueText;
}

std::optional<std::string> DebugDatabase::GetValue(std::string_view inName)
{
    EnsureEnvironmentLoaded();
    std::shared_lock lock(sValuesMutex);
    const auto found = sValues.find(inName);
    if (found == sValues.end())
        return std::nullopt;
    return found->second;
}

void DebugDatabase::SetValue(std::string_view inName, std::string_view inText)
{
    MVX_INPUT_CONTRACT(!inName.empty());
    EnsureEnvironmentLoaded();
    std::unique_lock lock(sValuesMutex);
    sValues.insert_or_assign(std::string(inName), std::string(inText));
}

void DebugDatabase::Clear(std::string_view inName)
{
    EnsureEnvironmentLoaded();
    std::unique_lock lock(sValuesMutex);
    const auto found = sValues.find(inName);
    if (found != sValues.end())
        sValues.erase(found);
}

void DebugDatabase::ClearAll()
{
    EnsureEnvironmentLoaded();
    std::unique_lock lock(sValuesMutex);
    sValues.clear();
}

size_t DebugDatabase::LoadFromText(std::string_view inList)
{
    EnsureEnvironmentLoaded();
    size_t skipped = 0;
    Entries entries = ParseList(inList, skipped);
    std::unique_lock lock(sValuesMutex);
    for (auto& [name, value] : entries)
        sValues.insert_or_assign(std::move(name), std::move(value));
    return skipped;
}

size_t DebugDatabase::LoadFromEnvironment()
{
    EnsureEnvironmentLoaded();
    size_t skipped = 0;
    Entries entries = ReadEnvironment(skipped);
    std::unique_lock lock(sValuesMutex);
    sValues.clear();
    for (auto& [name, value] : entries)
        sValues.insert_or_assign(std::move(name), std::move(value));
    return skipped;
}

} // namespace mvxcore::debug
