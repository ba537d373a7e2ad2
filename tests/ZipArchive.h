#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tests {

/// A zip archive written by hand, so that it can say of itself what no decent writer would.
class ZipArchive {
 public:
  struct Entry {
    std::string name;
    std::string content{};
    std::uint32_t mode = 0100644;   // 0: the archive does not know
    std::uint16_t flags = 0;        // 1: encrypted
    std::int64_t claimedSize = -1;  // of the content; below 0: the truth
    bool wrongChecksum = false;
  };

  static std::string of(const std::vector<Entry>& entries);
};

}  // namespace tests
