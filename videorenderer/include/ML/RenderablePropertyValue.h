#pragma once

// The text form of node property values, as the cutlist factory writes them
// and the nodes' producers read them back:
//   double                      default stream formatting: six significant digits,
//                               fixed or scientific as shorter ("0.5", "1e+06", "1.23457")
//   int32, int64, uint32, uint64 plain decimal
//   bool                        "0" or "1"
//   TickTime                    its tick count in decimal (keys ending in "AsTicks")
//   MF::BinaryData              two lower-case hexadecimal digits per byte
// The text never depends on the process locale. Parsing accepts exactly the
// text that formatting makes (the whole text, no blanks, no sign on unsigned
// values) and answers false for anything else, leaving the output untouched.
//
// Pure functions; safe from any thread.

#include "MF/BinaryData.h"
#include "MF/RenderableNode.h"
#include "mvxmediatypes/TickTime.h"

#include <cstdint>
#include <string_view>

namespace ML
{

MF::RenderablePropertyValue FormatPropertyValue(double inValue);
MF::RenderablePropertyValue FormatPropertyValue(std::int32_t inValue);
MF::RenderablePropertyValue FormatPropertyValue(std::int64_t inValue);
MF::RenderablePropertyValue FormatPropertyValue(std::uint32_t inValue);
MF::RenderablePropertyValue FormatPropertyValue(std::uint64_t inValue);
MF::RenderablePropertyValue FormatPropertyValue(bool inValue);
MF::RenderablePropertyValue FormatPropertyValue(mvxmediatypes::TickTime inValue);
MF::RenderablePropertyValue FormatPropertyValue(const MF::BinaryData& inValue);

bool ParsePropertyValue(std::string_view inText, double& outValue);
bool ParsePropertyValue(std::string_view inText, std::int32_t& outValue);
bool ParsePropertyValue(std::string_view inText, std::int64_t& outValue);
bool ParsePropertyValue(std::string_view inText, std::uint32_t& outValue);
bool ParsePropertyValue(std::string_view inText, std::uint64_t& outValue);
bool ParsePropertyValue(std::string_view inText, bool& outValue);
bool ParsePropertyValue(std::string_view inText, mvxmediatypes::TickTime& outValue);

} // namespace ML
