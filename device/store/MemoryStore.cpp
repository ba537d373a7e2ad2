#include "device/store/RecordList.h"
#include "device/store/Store.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

namespace {

class MemoryStore final : public Store {
 public:
  std::vector<StoreRecord> load() override {
    platform::Mutex::Lock lock(_mutex);
    return _records.all();
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

std::unique_ptr<Store> makeMemoryStore() { return std::make_unique<MemoryStore>(); }

}  // namespace device
