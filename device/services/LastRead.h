#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <string_view>
#include <utility>

namespace device {

/// The file that this thread read last for the plug-in: what it then hands to the property-list codec came from there.
/// In a fixed place, as a thread that has no memory left for an object with an end ends the process.
class LastRead {
 public:
  static LastRead& ofThisThread() {
    static constinit thread_local LastRead last;
    return last;
  }

  /// A longer path than any file system takes is cut.
  void set(std::string_view path, std::size_t size) {
    _length = std::min(path.size(), _path.size());
    std::copy_n(path.begin(), _length, _path.begin());
    _size = size;
  }
  std::string_view path() const { return {_path.data(), _length}; }
  /// Whether bytes of this size are the file's content; asked once, before they are read as a list.
  bool isWhole(std::size_t size) { return std::exchange(_size, unknown) == size; }

 private:
  static constexpr std::size_t unknown = ~std::size_t{0};

  std::array<char, 4096> _path{};
  std::size_t _length = 0;
  std::size_t _size = unknown;
};

}  // namespace device
