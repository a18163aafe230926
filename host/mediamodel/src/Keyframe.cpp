#include "MF/Keyframe.h"

namespace MF
{

static_assert(std::variant_size_v<KeyframeValue> == 16, "one alternative per kind 0 and 2..16");
static_assert(std::is_same_v<std::variant_alternative_t<14, KeyframeValue>, BinaryData>,
              "alternative 14 is kind 15");

KeyframeValueKind GetKeyframeValueKind(const KeyframeValue& inValue) noexcept
{
    const std::size_t index = inValue.index();
    if (index == 0 || index == std::variant_npos)
        return kKeyframeValueKind_None;
    return static_cast<KeyframeValueKind>(index + 1);
}

} // namespace MF
