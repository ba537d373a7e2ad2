#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/Value.h"

namespace platform {

/// The process that hosts the plug-in. Callable from any thread.
class Process {
 public:
  virtual ~Process() = default;

  virtual std::string mainBundleIdentifier() = 0;
  /// Absolute, without a trailing slash.
  virtual std::string temporaryDirectory() = 0;
  virtual std::string textOfErrorNumber(int errorNumber) = 0;
  /// Gives back a buffer that a service handed out.
  virtual void deallocateMemory(void* buffer, std::size_t length) = 0;
  /// The info dictionary of the bundle whose directory is given; absent when there is no such bundle.
  virtual Value infoDictionaryOfBundleAtPath(std::string_view path) = 0;
};

}  // namespace platform
