#include <utility>

#include "device/store/RecordList.h"
#include "device/store/Store.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

std::vector<StoreRecord> Store::load() {
  std::vector<StoreRecord> records;
  read([&](const StoreRecord& record) {
    records.push_back(record);
    return true;
  });
  return records;
}

namespace {

class MemoryStore final : public Store {
 public:
  explicit MemoryStore(std::list<StoreRecord>&& records) : _records(std::move(records)) {}
  void read(const Take& take) override {
    platform::Mutex::Lock lock(_mutex);
    _records.read(take);
  }
  bool commit(const std::vector<StoreRecord>& changes, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    platform::Mutex::Lock lock(_mutex);
    for (const auto& change : changes) _records.apply(change);
    return true;
  }

 private:
  platform::Mutex _mutex;
  RecordList _records GUARDED_BY(_mutex);
};

}  // namespace

std::unique_ptr<Store> makeMemoryStore(std::list<StoreRecord>&& records) {
  return std::make_unique<MemoryStore>(std::move(records));
}

}  // namespace device
