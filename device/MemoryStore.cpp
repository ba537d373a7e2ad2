#include <mutex>

#include "device/RecordList.h"
#include "device/Store.h"

namespace device {

namespace {

class MemoryStore final : public Store {
 public:
  std::vector<StoreRecord> load() override {
    std::lock_guard lock(_mutex);
    return _records.all();
  }
  bool commit(const std::vector<StoreRecord>& changes, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    std::lock_guard lock(_mutex);
    for (const auto& change : changes) _records.apply(change);
    return true;
  }

 private:
  std::mutex _mutex;
  RecordList _records;  // guarded by _mutex
};

}  // namespace

std::unique_ptr<Store> makeMemoryStore() { return std::make_unique<MemoryStore>(); }

}  // namespace device
