#pragma once

// BE::ColorProfile: the colour profile that travels with every frame request:
// a name ("sRGB", "BT.601", "BT.709", or a client's own) and, optionally, the
// profile's bytes shared by reference. A value type; copies share the bytes,
// which are never written, so a profile may be read from any thread.

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace BE
{

struct ColorProfile
{
    std::string mName;
    // Null when the profile is known by name only.
    std::shared_ptr<const std::vector<std::uint8_t>> mData;

    friend bool operator==(const ColorProfile& inLeft, const ColorProfile& inRight)
    {
        if (inLeft.mName != inRight.mName)
            return false;
        if (inLeft.mData == inRight.mData)
            return true;
        if (!inLeft.mData || !inRight.mData)
            return false;
        return *inLeft.mData == *inRight.mData;
    }
};

} // namespace BE
