#pragma once

#include <string>
#include <string_view>

#include "platform/Error.h"
#include "plist/PropertyList.h"

namespace plist {

platform::ErrorRef failure(ErrorCode code, std::string description);

/// Writing: containers deeper than maximumDepth.
platform::ErrorRef tooDeep();

/// The text in quotation marks for an error's description: one line, and not longer than a line should be.
std::string quoted(std::string_view text);

}  // namespace plist
