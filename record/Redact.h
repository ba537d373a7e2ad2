#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "record/Sink.h"

namespace record {

/// What became of a redaction.
struct RedactionFacts {
  std::uint64_t events = 0;
  std::uint64_t replaced = 0;  // different texts and numbers
  bool isWhole = false;        // the recording was ended in order; otherwise it was cut, and so is the redacted one
  std::string problem;         // why it cannot be read on; empty: it can
};

/// Writes the recording anew, with other texts in place of identifiers, names, accounts and all that a person's data
/// may be, and other bytes in place of what is in files. The same text has the same replacement wherever it stands,
/// also inside messages, errors and paths; replacements have as many parts as identifiers had, sort as the texts did,
/// and bytes are as many as they were. What is of the protocol stays: keys, words of messages, places and names of
/// files, versions, dates and sizes.
RedactionFacts redact(std::string_view recording, std::shared_ptr<Sink> sink);

}  // namespace record
