#pragma once

// Interface, class and content identifiers. The type lives in the core
// utilities; the foundation names it QRT::Guid for brevity.

#include "mvxcore/utility/Guid.h"

namespace QRT
{
using Guid = mvxcore::utility::Guid;
using mvxcore::utility::GuidFromBytes;
using mvxcore::utility::GuidToBytes;
} // namespace QRT
