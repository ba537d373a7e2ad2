#pragma once

#include <stdexcept>
#include <string>

#include "platform/Error.h"
#include "tsd/ExitCode.h"

namespace tsd {

/// Ends a command with one line for people. Thrown inside the program only, caught where commands are run.
class CommandError : public std::runtime_error {
 public:
  CommandError(ExitCode code, const std::string& message) : std::runtime_error(message), _code(code) {}
  explicit CommandError(const std::string& message) : CommandError(ExitCode::failed, message) {}

  ExitCode code() const { return _code; }

 private:
  ExitCode _code;
};

/// The part of an error that people read.
inline std::string textOf(const platform::ErrorRef& error) {
  if (!error) return "unknown reason";
  return error->description().empty() ? error->describe() : error->description();
}

}  // namespace tsd
