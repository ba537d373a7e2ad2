#pragma once

#include <memory>
#include <string>

#include "device/files/FileTree.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// A file tree that lasts as long as the process. Attributes are accepted and have no effect; everything is durable at
/// once.
class MemoryFileTree final : public FileTree {
 public:
  MemoryFileTree();

  bool removeItem(std::string_view path, platform::ErrorRef* error) override;
  bool createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value& attributes,
                       platform::ErrorRef* error) override;
  bool moveItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool copyItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool fileExists(std::string_view path, bool* isDirectory) override;
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, platform::ErrorRef* error) override;
  bool createFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes) override;
  std::optional<platform::Bytes> readFile(std::string_view path, platform::ErrorRef* error) override;
  bool writeAtomically(std::string_view path, platform::BytesView contents, platform::ErrorRef* error,
                       platform::Durability durability) override;
  int utimes(std::string_view path, int& errorNumber) override;

  std::optional<std::vector<Entry>> list(std::string_view path, platform::ErrorRef* error) override;
  std::unique_ptr<FileWriter> createNew(std::string_view path, bool executable, platform::ErrorRef* error) override;
  std::unique_ptr<FileReader> openForReading(std::string_view path, platform::ErrorRef* error) override;
  bool syncDirectory(std::string_view path, platform::ErrorRef* error) override;
  bool syncItem(std::string_view path, platform::ErrorRef* error) override;

 private:
  /// One for the whole tree; shared with open files, which may outlive the tree.
  using Guard = std::shared_ptr<platform::Mutex>;
  struct Node;
  struct Place;
  class Writer;
  class Reader;

  // They answer 0 or the error number.
  int find(std::string_view path, bool makeDirectories, Place& place) const REQUIRES(*_guard);
  int findItem(std::string_view path, std::shared_ptr<Node>& node) const REQUIRES(*_guard);
  int findFile(std::string_view path, std::shared_ptr<Node>& node) const REQUIRES(*_guard);
  int makeDirectory(std::string_view path, bool intermediates) const REQUIRES(*_guard);
  int replaceFile(std::string_view path, platform::BytesView contents, bool executable) const REQUIRES(*_guard);
  int move(const Place& from, std::string_view to) const REQUIRES(*_guard);

  const Guard _guard = std::make_shared<platform::Mutex>();
  const std::shared_ptr<Node> _root GUARDED_BY(*_guard);
};

}  // namespace device
