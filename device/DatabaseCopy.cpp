#include <cstdlib>
#include <filesystem>
#include <string>
#include <system_error>

#include "device/Store.h"

namespace device {

namespace fs = std::filesystem;
using platform::ErrorRef;

namespace {

/// A folder of its own below the system's for temporary files, for the life of the object.
class TemporaryFolder {
 public:
  TemporaryFolder() {
    std::string name = (fs::temp_directory_path(_failure) / "applicationsync-XXXXXX").string();
    if (!_failure && ::mkdtemp(name.data())) _path = name;
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    if (!_path.empty()) fs::remove_all(_path, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  /// Empty when there is none.
  const std::string& path() const { return _path; }

 private:
  std::error_code _failure;
  std::string _path;
};

}  // namespace

std::unique_ptr<Store> copyDatabaseStore(const std::string& path, ErrorRef* error) {
  platform::setError(error, nullptr);
  TemporaryFolder folder;
  std::string copy = folder.path() + "/copy.db";
  std::error_code failure;
  auto refuse = [&](const std::string& why) {
    platform::setError(error, platform::makeError("Store", 1, path + ": " + why));
    return nullptr;
  };
  if (folder.path().empty()) return refuse("there is no folder to copy it to");
  // The second holds what is not in the first yet, where a process died. Opened, a database changes both.
  for (const char* part : {"", "-wal"}) {
    if (*part && !fs::exists(path + part, failure)) continue;
    if (!fs::copy_file(path + part, copy + part, failure)) return refuse("not copied: " + failure.message());
  }
  auto store = openDatabaseStore(copy, error);
  auto result = store ? makeMemoryStore() : nullptr;
  return result && result->commit(store->load(), error) ? std::move(result) : nullptr;
}

}  // namespace device
