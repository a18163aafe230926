#include "ImporterHost/ImporterHost.h"

#include <mutex>

namespace ImporterHost
{
namespace
{

// Guards sInitializeCount and sSessionCount.
std::mutex sMutex;
std::int32_t sInitializeCount = 0;
std::uint32_t sSessionCount = 0;

} // namespace

QRT::Result Initialize()
{
    std::lock_guard lock(sMutex);
    if (sInitializeCount++ == 0)
        ++sSessionCount;
    return QRT::kResult_Success;
}

QRT::Result Shutdown()
{
    std::lock_guard lock(sMutex);
    if (sInitializeCount == 0)
        return kResult_ImporterHostNotInitialized;
    --sInitializeCount;
    return QRT::kResult_Success;
}

std::int32_t GetInitializeCount()
{
    std::lock_guard lock(sMutex);
    return sInitializeCount;
}

bool IsSessionOpen()
{
    std::lock_guard lock(sMutex);
    return sInitializeCount > 0;
}

std::uint32_t GetSessionCount()
{
    std::lock_guard lock(sMutex);
    return sSessionCount;
}

} // namespace ImporterHost
