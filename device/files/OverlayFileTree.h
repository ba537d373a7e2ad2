#pragma once

#include <memory>
#include <set>
#include <string>

#include "device/files/FileTree.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// A file tree that looks like another one and leaves it as it is: what is changed is kept in memory, what is not is
/// read from the tree below when it is asked for. When somebody changes that tree meanwhile, each file is as it is when
/// it is read.
class OverlayFileTree final : public FileTree {
 public:
  explicit OverlayFileTree(std::unique_ptr<FileTree> below) : _below(std::move(below)), _above(makeMemoryFileTree()) {}

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
  /// Whether the tree below shows through there.
  bool showsBelow(std::string_view path, bool* isDirectory = nullptr) const REQUIRES(_guard);
  /// The tree that has what is visible there, or can tell why nothing is.
  FileTree& treeOf(std::string_view path) const REQUIRES(_guard);
  /// Copies the item and the directories it lies in into memory, as far as they exist, but not a directory's contents.
  bool raise(std::string_view path, platform::ErrorRef* error) const REQUIRES(_guard);
  /// The same for the directory that the item is to lie in.
  bool raiseParent(std::string_view path, platform::ErrorRef* error) const REQUIRES(_guard);
  /// For a file that is to be written there: raises its directory, and a directory that is in its way.
  bool makeWay(std::string_view path, platform::ErrorRef* error) const REQUIRES(_guard);
  bool raiseWhole(const std::string& path, platform::ErrorRef* error) const REQUIRES(_guard);
  std::optional<std::vector<Entry>> merged(const std::string& path, platform::ErrorRef* error) const REQUIRES(_guard);

  mutable platform::Mutex _guard;
  const std::unique_ptr<FileTree> _below PT_GUARDED_BY(_guard);
  const std::unique_ptr<FileTree> _above PT_GUARDED_BY(_guard);
  std::set<std::string, std::less<>> _hidden GUARDED_BY(_guard);  // paths below which nothing shows through
};

}  // namespace device
