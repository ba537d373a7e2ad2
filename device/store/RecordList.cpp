#include "device/store/RecordList.h"

#include <iterator>
#include <utility>

namespace device {

namespace {

std::string nameOf(const StoreRecord& record) { return record.kind + '\0' + record.key; }

}  // namespace

void RecordList::read(const Store::Take& take) const {
  for (const auto& record : _records) {
    if (!take(record)) return;
  }
}

void RecordList::apply(const StoreRecord& change) {
  if (!_hasPlaces) {
    for (auto record = _records.begin(); record != _records.end(); ++record) _places.emplace(nameOf(*record), record);
    _hasPlaces = true;
  }
  std::string name = nameOf(change);
  auto found = _places.find(name);
  if (change.value.isAbsent()) {
    if (found == _places.end()) return;
    _records.erase(found->second);
    _places.erase(found);
  } else if (found != _places.end()) {
    found->second->value = change.value;
  } else {
    _records.push_back(change);
    _places.emplace(std::move(name), std::prev(_records.end()));
  }
}

}  // namespace device
