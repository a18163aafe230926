#include "BrambleSupport/BrambleSupport.h"

#include <map>
#include <mutex>
#include <string>
#include <utility>

namespace BrambleSupport
{
namespace
{

struct SuiteEntry
{
    const void* mTable = nullptr;
    std::uint32_t mAcquired = 0;
};

using SuiteKey = std::pair<std::string, std::int32_t>;

// The library's state: one per process, created on first use.
struct Registry
{
    // Guards mInitializeCount and mSuites.
    std::mutex mMutex;
    std::int32_t mInitializeCount = 0;
    std::map<SuiteKey, SuiteEntry> mSuites;
};

Registry& GetRegistry()
{
    static Registry sRegistry;
    return sRegistry;
}

bool IsValidName(const char* inName)
{
    return inName != nullptr && inName[0] != '\0';
}

bool IsValidSuite(const char* inName, std::int32_t inVersion)
{
    return IsValidName(inName) && inVersion >= 1;
}

} // namespace

QRT::Result Initialize()
{
    Registry& registry = GetRegistry();
    std::lock_guard lock(registry.mMutex);
    ++registry.mInitializeCount;
    return QRT::kResult_Success;
}

QRT::Result Shutdown()
{
    Registry& registry = GetRegistry();
    // The withdrawn entries hold nothing that needs releasing outside the
    // lock: tables belong to whoever registered them.
    std::lock_guard lock(registry.mMutex);
    if (registry.mInitializeCount == 0)
        return kResult_SuiteSupportNotInitialized;
    if (--registry.mInitializeCount == 0)
        registry.mSuites.clear();
    return QRT::kResult_Success;
}

std::int32_t GetInitializeCount()
{
    Registry& registry = GetRegistry();
    std::lock_guard lock(registry.mMutex);
    return registry.mInitializeCount;
}

QRT::Result RegisterSuite(const char* inName, std::int32_t inVersion, const void* inTable)
{
    if (!IsValidSuite(inName, inVersion) || inTable == nullptr)
        return kResult_BadSuiteArgument;
    SuiteKey key(inName, inVersion);
    Registry& registry = GetRegistry();
    std::lock_guard lock(registry.mMutex);
    if (registry.mInitializeCount == 0)
        return kResult_SuiteSupportNotInitialized;
    const bool inserted =
        registry.mSuites.try_emplace(std::move(key), SuiteEntry{inTable, 0}).second;
    return inserted ? QRT::kResult_Success : kResult_SuiteAlreadyRegistered;
}

std::size_t GetSuiteCount()
{
    Registry& registry = GetRegistry();
    std::lock_guard lock(registry.mMutex);
    return registry.mSuites.size();
}

std::uint32_t GetSuiteAcquireCount(const char* inName, std::int32_t inVersion)
{
    if (!IsValidSuite(inName, inVersion))
        return 0;
    const SuiteKey key(inName, inVersion);
    Registry& registry = GetRegistry();
    std::lock_guard lock(registry.mMutex);
    const auto found = registry.mSuites.find(key);
    return found == registry.mSuites.end() ? 0 : found->second.mAcquired;
}

} // namespace BrambleSupport

extern "C" const void* BrambleSupport_AcquireSuite(const char* inName, int32_t inVersion)
{
    using namespace BrambleSupport;
    // Called from plug-in code: nothing may escape as an exception.
    try
    {
        if (!IsValidSuite(inName, inVersion))
            return nullptr;
        const SuiteKey key(inName, inVersion);
        Registry& registry = GetRegistry();
        std::lock_guard lock(registry.mMutex);
        const auto found = registry.mSuites.find(key);
        if (found == registry.mSuites.end())
            return nullptr;
        ++found->second.mAcquired;
        return found->second.mTable;
    }
    catch (...)
    {
        return nullptr;
    }
}

extern "C" int32_t BrambleSupport_ReleaseSuite(const char* inName, int32_t inVersion)
{
    using namespace BrambleSupport;
    try
    {
        if (!IsValidSuite(inName, inVersion))
            return kResult_BadSuiteArgument;
        const SuiteKey key(inName, inVersion);
        Registry& registry = GetRegistry();
        std::lock_guard lock(registry.mMutex);
        const auto found = registry.mSuites.find(key);
        if (found == registry.mSuites.end() || found->second.mAcquired == 0)
            return kResult_SuiteNotAcquired;
        --found->second.mAcquired;
        return QRT::kResult_Success;
    }
    catch (...)
    {
        // Only the key's string can fail to be made: the suite was not found.
        return kResult_SuiteNotAcquired;
    }
}

extern "C" const BrambleBasicSuite* BrambleSupport_GetBasicSuite(void)
{
    static const BrambleBasicSuite sBasicSuite = {&BrambleSupport_AcquireSuite,
                                                  &BrambleSupport_ReleaseSuite};
    return &sBasicSuite;
}
