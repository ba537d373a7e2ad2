#pragma once

#include <list>
#include <string>
#include <utility>

#include "device/store/Store.h"
#include "platform/TextTable.h"

namespace device {

/// Records by kind and key, in the order of first insertion; one that was removed and comes back is last. Not
/// synchronised.
class RecordList {
 public:
  RecordList() = default;
  explicit RecordList(std::list<StoreRecord>&& records) : _records(std::move(records)) {}
  RecordList(const RecordList&) = delete;
  RecordList& operator=(const RecordList&) = delete;

  /// An absent value removes the record, if it is there.
  void apply(const StoreRecord& change);
  void read(const Store::Take& take) const;

 private:
  using Records = std::list<StoreRecord>;

  Records _records;
  platform::TextMap<Records::iterator> _places;  // by the kind, a zero and the key; made with the first change
  bool _hasPlaces = false;
};

}  // namespace device
