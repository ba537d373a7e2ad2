#pragma once

#include <list>
#include <string>
#include <unordered_map>
#include <vector>

#include "device/Store.h"

namespace device {

/// Records by kind and key, in the order of first insertion; one that was removed and comes back is the last. Not
/// synchronised.
class RecordList {
 public:
  RecordList() = default;
  RecordList(const RecordList&) = delete;
  RecordList& operator=(const RecordList&) = delete;

  /// An absent value removes the record, if it is there.
  void apply(const StoreRecord& change);
  std::vector<StoreRecord> all() const { return {_records.begin(), _records.end()}; }

 private:
  using Records = std::list<StoreRecord>;

  Records _records;
  std::unordered_map<std::string, Records::iterator> _places;  // by the kind, a zero and the key
};

}  // namespace device
