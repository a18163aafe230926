#include "ML/Version.h"

namespace ML
{

const char* GetVideoRendererVersion() noexcept
{
    return VR_VERSION_STRING;
}

} // namespace ML
