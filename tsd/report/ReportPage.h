#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// One HTML file that shows the document in any browser and needs nothing else. Nothing in the document can act as
/// markup or script.
std::string reportPage(const platform::Value& document);

}  // namespace tsd
