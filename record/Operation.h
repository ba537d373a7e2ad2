#pragma once

#include <cstdint>

namespace record {

/// What a difference in the call would mean to somebody who compares two builds.
enum class OperationClass : std::uint8_t {
  service,  // everything else
  message,  // the log
  step,     // the record of what was done to which app
  wait,     // the clock
};

/// One operation of the boundary, in either direction. Known by its address while the program runs, by its names in a
/// recording.
struct Operation {
  const char* service;
  const char* name;
  const char* parameters;  // as in OperationName
  OperationClass of = OperationClass::service;
};

}  // namespace record
