#include "device/store/RecordList.h"

#include <iterator>
#include <utility>

namespace device {

void RecordList::apply(const StoreRecord& change) {
  std::string name = change.kind + '\0' + change.key;
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
