#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace device {

/// The file that this thread read last for the plug-in: what it then hands to the property-list codec came from there.
struct LastRead {
  std::string path;
  std::size_t size = 0;

  static LastRead& ofThisThread() {
    static thread_local LastRead last;
    return last;
  }
};

}  // namespace device
