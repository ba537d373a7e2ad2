#pragma once

#include <functional>
#include <list>
#include <memory>
#include <string>
#include <vector>

#include "platform/Error.h"
#include "platform/Value.h"

namespace device {

class StepWatch;

/// One record of what the device's services remember. An absent value removes the record.
struct StoreRecord {
  std::string kind;  // "app", "coordinator", "uninstalled", "setting", …
  std::string key;
  platform::Value value;
};

/// What the services remember across restarts: plain records, written through whenever one changes. A commit is atomic
/// and, on true, durable. Callable from any thread.
class Store {
 public:
  virtual ~Store() = default;
  /// Answers whether it wants the next record too. Does not use the store.
  using Take = std::function<bool(const StoreRecord& record)>;
  /// Hands over every record, in the order of first insertion. None is missing: an unreadable store is an error when it
  /// is opened, and throws when it becomes one later.
  virtual void read(const Take& take) = 0;
  /// Copies of them all.
  std::vector<StoreRecord> load();
  virtual bool commit(const std::vector<StoreRecord>& changes, platform::ErrorRef* error = nullptr) = 0;
  /// The same for changes that a loss of power may take back: atomic, in order with every other change, and kept when
  /// the process dies; durable with the next commit. Without a flush.
  virtual bool write(const std::vector<StoreRecord>& changes, platform::ErrorRef* error = nullptr) {
    return commit(changes, error);
  }
};

/// One SQLite file, made if it is not there. Null with an error when it is not a store of ours or cannot be read. One
/// process at a time: while it is open, nobody else can open it. `watch`, if there is one, is told of every commit and
/// write; each is one step, whole or not at all, so that what the watch answers after it does not count.
std::unique_ptr<Store> openDatabaseStore(const std::string& path, platform::ErrorRef* error = nullptr,
                                         std::shared_ptr<StepWatch> watch = nullptr);
/// A store in memory that begins with what the file holds, as its last commit left it. The file and its
/// companions are only read, even while another process has it open. Null with an error as above.
std::unique_ptr<Store> copyDatabaseStore(const std::string& path, platform::ErrorRef* error = nullptr);
/// Begins with these records, of which no two have the same name, and forgets everything when it is destroyed.
std::unique_ptr<Store> makeMemoryStore(std::list<StoreRecord>&& records = {});

}  // namespace device
