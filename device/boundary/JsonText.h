#pragma once

#include <string>
#include <string_view>

#include "platform/Value.h"

namespace device {

// The library that reads JSON (`parseJournalLine`, `valueOfJson`) does not write it: a journal has a line for every
// call, which is appended here without a document of the library's in between, and text that is not UTF-8 must not
// throw.

/// Appends JSON text of a property-list value: data as its count of bytes, dates as ISO 8601, what JSON cannot hold as
/// null; broken UTF-8 becomes U+FFFD. `indent` below 0 for one line; `level` is how deep the value itself lies.
void appendJson(std::string& json, const platform::Value& value, int indent = -1, int level = 0);
/// The text as a JSON string.
void appendJsonString(std::string& json, std::string_view text);

}  // namespace device
