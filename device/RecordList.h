#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "device/Store.h"

namespace device {

/// Records by kind and key, in the order of first insertion; one that was removed and comes back is the last. Not
/// synchronised.
class RecordList {
 public:
  /// An absent value removes the record, if it is there.
  void apply(const StoreRecord& change);
  std::vector<StoreRecord> all() const;

 private:
  std::map<std::pair<std::string, std::string>, std::uint64_t> _places;
  std::map<std::uint64_t, StoreRecord> _records;  // by place
  std::uint64_t _lastPlace = 0;
};

}  // namespace device
