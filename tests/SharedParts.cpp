#include "tests/SharedParts.h"

#include <gtest/gtest.h>

#include "device/LocalDevice.h"

namespace tests {

using platform::Bytes;
using platform::ErrorRef;
using platform::Value;

namespace {

/// Parts that outlive the device they are given to.
class SharedStore final : public device::Store {
 public:
  SharedStore(device::Store& store, const bool& broken) : _store(store), _broken(broken) {}
  void read(const Take& take) override { _store.read(take); }
  bool commit(const std::vector<device::StoreRecord>& changes, ErrorRef* error) override {
    return _broken ? refuse(error) : _store.commit(changes, error);
  }
  bool write(const std::vector<device::StoreRecord>& changes, ErrorRef* error) override {
    return _broken ? refuse(error) : _store.write(changes, error);
  }

 private:
  static bool refuse(ErrorRef* error) {
    platform::setError(error, platform::makeError("Store", 28, "no space left"));
    return false;
  }

  device::Store& _store;
  const bool& _broken;
};

class SharedTree final : public device::FileTree {
 public:
  explicit SharedTree(const SharedParts& parts) : _parts(parts), _tree(*parts.files) {}
  bool removeItem(std::string_view path, ErrorRef* error) override {
    tell("removeItem", path);
    return _tree.removeItem(path, error);
  }
  bool createDirectory(std::string_view path, bool intermediates, const Value& attributes, ErrorRef* error) override {
    return _tree.createDirectory(path, intermediates, attributes, error);
  }
  bool moveItem(std::string_view from, std::string_view to, ErrorRef* error) override {
    tell("moveItem", to);
    return _tree.moveItem(from, to, error);
  }
  bool copyItem(std::string_view from, std::string_view to, ErrorRef* error) override {
    return _tree.copyItem(from, to, error);
  }
  bool fileExists(std::string_view path, bool* isDirectory) override { return _tree.fileExists(path, isDirectory); }
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, ErrorRef* error) override {
    return _tree.attributesOfItem(path, error);
  }
  bool createFile(std::string_view path, platform::BytesView contents, const Value& attributes) override {
    return _tree.createFile(path, contents, attributes);
  }
  std::optional<Bytes> readFile(std::string_view path, ErrorRef* error) override {
    auto bytes = _tree.readFile(path, error);
    if (bytes) tell("readFile", path);
    return bytes;
  }
  bool writeAtomically(std::string_view path, platform::BytesView contents, ErrorRef* error,
                       platform::Durability durability) override {
    tell("writeAtomically", path);
    return _tree.writeAtomically(path, contents, error, durability);
  }
  int utimes(std::string_view path, int& number) override { return _tree.utimes(path, number); }
  std::optional<std::vector<Entry>> list(std::string_view path, ErrorRef* error) override {
    return _tree.list(path, error);
  }
  std::unique_ptr<device::FileWriter> createNew(std::string_view path, bool executable, ErrorRef* error) override {
    tell("createNew", path);
    return _tree.createNew(path, executable, error);
  }
  std::unique_ptr<device::FileReader> openForReading(std::string_view path, ErrorRef* error) override {
    return _tree.openForReading(path, error);
  }
  bool syncDirectory(std::string_view path, ErrorRef* error) override { return _tree.syncDirectory(path, error); }
  bool syncItem(std::string_view path, ErrorRef* error) override {
    bool done = _tree.syncItem(path, error);
    tell("syncItem", path);
    return done;
  }

 private:
  void tell(std::string_view operation, std::string_view path) const {
    if (_parts.watch) _parts.watch(operation, path);
  }

  const SharedParts& _parts;
  device::FileTree& _tree;
};

}  // namespace

void SharedParts::makeInMemory() {
  files = device::makeMemoryFileTree();
  store = device::makeMemoryStore();
  EXPECT_TRUE(device::makeDeviceParts(*files, *store));
}

std::unique_ptr<device::FileTree> SharedParts::lendFiles() { return std::make_unique<SharedTree>(*this); }
std::unique_ptr<device::Store> SharedParts::lendStore() { return std::make_unique<SharedStore>(*store, broken); }

}  // namespace tests
