#include "mvxcore/debug/Trace.h"

#include <algorithm>
#include <atomic>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <shared_mutex>

namespace mvxcore::trace
{
namespace
{

// Guards sPatterns; sPatternCount mirrors its size for the cheap test.
std::shared_mutex sPatternMutex;
std::vector<std::string> sPatterns;
std::atomic<size_t> sPatternCount{0};
std::once_flag sEnvironmentOnce;

// Guards sSink and serialises the lines.
std::mutex sSinkMutex;
Sink sSink;
// Set while the calling thread is inside the sink.
thread_local bool tInSink = false;

std::string_view Trim(std::string_view inText)
{
    const auto first = inText.find_first_not_of(" \t");
    if (first == std::string_view::npos)
        return {};
    const auto last = inText.find_last_not_of(" \t");
    return inText.substr(first, last - first + 1);
}

std::vector<std::string> ParseList(std::string_view inList)
{
    std::vector<std::string> patterns;
    while (!inList.empty())
    {
        const auto comma = inList.find(',');
        const std::string_view entry = Trim(inList.substr(0, comma));
        if (!entry.empty() && std::find(patterns.begin(), patterns.end(), entry) == patterns.end())
            patterns.emplace_back(entry);
        if (comma == std::string_view::npos)
            break;
        inList.remove_prefix(comma + 1);
    }
    return patterns;
}

// Called with sPatternMutex held exclusively.
void ReplacePatternsLocked(std::vector<std::string> inPatterns)
{
    sPatterns = std::move(inPatterns);
    sPatternCount.store(sPatterns.size(), std::memory_order_release);
}

std::vector<std::string> ReadEnvironmentList()
{
    const char* list = std::getenv(kTraceEnvironmentVariable);
    return list ? ParseList(list) : std::vector<std::string>();
}

void EnsureEnvironmentLoaded()
{
    std::call_once(sEnvironmentOnce,
                   []
                   {
                       std::vector<std::string> patterns = ReadEnvironmentList();
                       std::unique_lock lock(sPatternMutex);
                       ReplacePatternsLocked(std::move(patterns));
                   });
}

void Emit(std::string_view inCategory, std::string_view inText)
{
    if (tInSink)
        return;
    std::string line;
    line.reserve(inCategory.size() + 2 + inText.size());
    line.append(inCategory).append(": ").append(inText);

    std::lock_guard lock(sSinkMutex);
    tInSink = true;
    try
    {
        if (sSink)
        {
            sSink(line);
        }
        else
        {
            line.push_back('\n');
            std::fwrite(line.data(), 1, line.size(), stderr);
        }
    }
    catch (...)
    {
        // A failing sink loses the line, never the caller's work.
    }
    tInSink = false;
}

} // namespace

bool MatchesPattern(std::string_view inPattern, std::string_view inCategory)
{
    if (!inPattern.empty() && inPattern.back() == '*')
        return inCategory.starts_with(inPattern.substr(0, inPattern.size() - 1));
    return inPattern == inCategory;
}

void EnableCategory(std::string_view inPattern)
{
    EnsureEnvironmentLoaded();
    inPattern = Trim(inPattern);
    if (inPattern.empty())
        return;
    std::unique_lock lock(sPatternMutex);
    if (std::find(sPatterns.begin(), sPatterns.end(), inPattern) != sPatterns.end())
        return;
    std::vector<std::string> patterns = sPatterns;
    patterns.emplace_back(inPattern);
    ReplacePatternsLocked(std::move(patterns));
}

void DisableCategory(std::string_view inPattern)
{
    EnsureEnvironmentLoaded();
    inPattern = Trim(inPattern);
    std::unique_lock lock(sPatternMutex);
    std::vector<std::string> patterns = sPatterns;
    std::erase(patterns, inPattern);
    ReplacePatternsLocked(std::move(patterns));
}

void DisableAll()
{
    SetEnabledCategories({});
}

void SetEnabledCategories(std::string_view inList)
{
    EnsureEnvironmentLoaded();
    std::vector<std::string> patterns = ParseList(inList);
    std::unique_lock lock(sPatternMutex);
    ReplacePatternsLocked(std::move(patterns));
}

void LoadFromEnvironment()
{
    EnsureEnvironmentLoaded();
    std::vector<std::string> patterns = ReadEnvironmentList();
    std::unique_lock lock(sPatternMutex);
    ReplacePatternsLocked(std::move(patterns));
}

std::vector<std::string> GetEnabledCategories()
{
    EnsureEnvironmentLoaded();
    std::shared_lock lock(sPatternMutex);
    return sPatterns;
}

bool IsEnabled(std::string_view inCategory)
{
    EnsureEnvironmentLoaded();
    if (sPatternCount.load(std::memory_order_acquire) == 0)
        return false;
    std::shared_lock lock(sPatternMutex);
    return std::any_of(sPatterns.begin(), sPatterns.end(),
                       [inCategory](const std::string& p)
                       { return MatchesPattern(p, inCategory); });
}

void Write(std::string_view inCategory, std::string_view inText)
{
    if (IsEnabled(inCategory))
        Emit(inCategory, inText);
}

void WriteFormatted(std::string_view inCategory, const char* inFormat, ...)
{
    if (!inFormat || !IsEnabled(inCategory))
        return;
    va_list arguments;
    va_start(arguments, inFormat);
    va_list measure;
    va_copy(measure, arguments);
    const int length = std::vsnprintf(nullptr, 0, inFormat, measure);
    va_end(measure);
    std::string text;
    if (length > 0)
    {
        text.resize(static_cast<size_t>(length) + 1);
        std::vsnprintf(text.data(), text.size(), inFormat, arguments);
        text.resize(static_cast<size_t>(length));
    }
    va_end(arguments);
    Emit(inCategory, text);
}

Sink SetSink(Sink inSink)
{
    std::lock_guard lock(sSinkMutex);
    std::swap(sSink, inSink);
    return inSink;
}

} // namespace mvxcore::trace
