#pragma once

// The module's version, as the build recorded it ("major.minor.patch").

namespace ML
{
const char* GetVideoRendererVersion() noexcept;
} // namespace ML
