#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "platform/Value.h"

namespace device {

/// Appends one line of JSON for a record of the call journal, without a line end.
void appendJournalLine(std::string& line, const CallRecord& record);
std::string journalLine(const CallRecord& record);

/// The record that a line of the journal holds; nothing when the text is not such a line. The record has no argument
/// names, and no time at which the call began.
std::optional<CallRecord> parseJournalLine(std::string_view line);

/// JSON text of a property-list value: data as its count of bytes, dates as ISO 8601; `indent` below 0 for one line.
std::string jsonText(const platform::Value& value, int indent = -1);
/// The depth of arrays and objects that JSON text may have: more than any value of a document has.
constexpr std::size_t deepestJson = 1024;
/// A property-list value of JSON text, null as absent; absent also for text that is not JSON or is nested too deeply.
platform::Value valueOfJson(std::string_view text);

}  // namespace device
