#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// One HTML file that shows the document in any browser, and asks for nothing else. Nothing in the document is taken
/// for markup or for a script.
std::string reportPage(const platform::Value& document);

}  // namespace tsd
