#pragma once

#include <cstddef>

namespace tests {

/// While it lives, the n-th allocation that the plug-in's library makes on this thread fails, or that and every one
/// after it. What the device and the test allocate is not touched. The program that uses it replaces `operator new`;
/// the library is loaded before. One at a time on a thread.
class FailingMemory {
 public:
  enum class Lasts { once, onwards };

  FailingMemory(std::size_t nth, Lasts lasts);
  ~FailingMemory();
  FailingMemory(const FailingMemory&) = delete;
  FailingMemory& operator=(const FailingMemory&) = delete;

  /// How many allocations of the plug-in there were.
  std::size_t seen() const;
};

}  // namespace tests
