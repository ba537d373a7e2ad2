#pragma once

#include <string>

#include "device/Boundary.h"
#include "platform/Value.h"

namespace device {

/// One line of JSON for a record of the call journal, without a line end.
std::string journalLine(const CallRecord& record);

/// JSON text of a property-list value: data as its count of bytes, dates as ISO 8601; `indent` below 0 for one line.
std::string jsonText(const platform::Value& value, int indent = -1);

}  // namespace device
