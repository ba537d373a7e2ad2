#pragma once

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "device/files/DiskPlace.h"
#include "device/files/FileTree.h"
#include "device/files/StepWatch.h"

namespace device {

/// A file tree on a folder of the host. New files and directories have the process's default mode; an owner in the
/// attributes is applied where the process may change owners and the host knows the name.
class DiskFileTree final : public FileTree {
 public:
  /// Whether somebody else may move or remove its folders while it is there. Nobody else does so in a folder that this
  /// process has locked, and then those used last are kept open.
  enum class Use { shared, alone };

  /// `watch`, which may be null, is told of every step.
  DiskFileTree(FileDescriptor root, std::shared_ptr<StepWatch> watch, Use use = Use::shared);

  bool removeItem(std::string_view path, platform::ErrorRef* error) override;
  bool createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value& attributes,
                       platform::ErrorRef* error) override;
  bool moveItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool copyItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool fileExists(std::string_view path, bool* isDirectory) override;
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, platform::ErrorRef* error) override;
  bool createFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes) override {
    return putFile(path, contents, attributes, nullptr);
  }
  bool putFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes,
               platform::ErrorRef* error) override;
  std::optional<platform::Bytes> readFile(std::string_view path, platform::ErrorRef* error) override;
  bool writeAtomically(std::string_view path, platform::BytesView contents, platform::ErrorRef* error,
                       platform::Durability durability) override;
  int utimes(std::string_view path, int& errorNumber) override;

  std::optional<std::vector<Entry>> list(std::string_view path, platform::ErrorRef* error) override;
  std::unique_ptr<FileWriter> createNew(std::string_view path, bool executable, platform::ErrorRef* error) override;
  std::unique_ptr<FileReader> openForReading(std::string_view path, platform::ErrorRef* error) override;
  bool syncDirectory(std::string_view path, platform::ErrorRef* error) override;
  bool syncItem(std::string_view path, platform::ErrorRef* error) override;
  bool isTidy() const override { return _isTidy; }

 private:
  /// The answer of a change that cleans up after itself, or removes something: whether that worked is not known when it
  /// failed.
  bool answerChange(int failure, std::string_view path, platform::ErrorRef* error);
  /// A directory may not be where it was any more.
  void forget(std::string_view path) const {
    if (_kept) _kept->forget(path);
  }
  int find(std::string_view path, DiskPlace& place) const { return find(path, false, place); }
  int find(std::string_view path, bool makeDirectories, DiskPlace& place) const {
    return DiskPlace::find(_root, path, makeDirectories, _watch.get(), _kept.get(), place);
  }
  int makeDirectory(std::string_view path, bool intermediates, const platform::Value& attributes) const;
  int openFile(std::string_view path, FileDescriptor& file, struct stat& status) const;
  int flushDirectory(std::string_view path) const;
  int flushFile(std::string_view path) const;
  int flushTree(std::string_view path) const;

  const FileDescriptor _root;
  const FileDescriptor _flushable;  // the root again, if its file system can be flushed as a whole
  const std::shared_ptr<StepWatch> _watch;
  const std::unique_ptr<KeptFolders> _kept;  // null when it is shared
  std::atomic<bool> _isTidy{true};
};

}  // namespace device
