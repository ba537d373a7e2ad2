#include "device/RecordList.h"

namespace device {

void RecordList::apply(const StoreRecord& change) {
  auto found = _places.find({change.kind, change.key});
  if (change.value.isAbsent()) {
    if (found == _places.end()) return;
    _records.erase(found->second);
    _places.erase(found);
  } else if (found != _places.end()) {
    _records.at(found->second).value = change.value;
  } else {
    _places.emplace(std::pair(change.kind, change.key), ++_lastPlace);
    _records.emplace(_lastPlace, change);
  }
}

std::vector<StoreRecord> RecordList::all() const {
  std::vector<StoreRecord> records;
  records.reserve(_records.size());
  for (const auto& [place, record] : _records) records.push_back(record);
  return records;
}

}  // namespace device
