#pragma once

#include <stdexcept>
#include <string>

namespace record {

/// Why a recording cannot be read on: what is wrong with it, and where. Stays inside this library.
class RecordingError : public std::runtime_error {
 public:
  explicit RecordingError(const std::string& what) : std::runtime_error(what) {}
};

}  // namespace record
