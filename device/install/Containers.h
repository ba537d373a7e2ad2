#pragma once

#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"
#include "platform/Error.h"
#include "platform/Value.h"

namespace device {

constexpr std::string_view containersDirectory = "/var/containers/Bundle/Application";

/// The directories of the apps' files: "<containersDirectory>/<fresh name>/" with "<Name>.app/" in it and the store
/// metadata beside that. A container is filled before a record names it and removed when none does any more; those that
/// no record names are leftovers. Callable from any thread, for one container by one thread at a time.
class Containers {
 public:
  explicit Containers(FileTree& files) : _files(files) {}

  /// A new, empty directory's path. Nothing on failure.
  std::optional<std::string> makeFresh(platform::ErrorRef* error = nullptr);

  /// Fills a fresh container with a placeholder's bundle. `iconPath` is copied as the bundle's icon, and `info` then
  /// names it; an icon that cannot be read is left out. Absent metadata: no metadata file. Nothing is flushed: what a
  /// loss of power takes of a placeholder, the next sync restores. Answers a checksum of the files, nothing on failure.
  /// Metadata that are changed later do not change it.
  std::optional<std::uint64_t> writePlaceholder(const std::string& container, const std::string& bundle,
                                                platform::Value info, const std::optional<std::string>& iconPath,
                                                const platform::Value& metadata, platform::ErrorRef* error = nullptr);
  /// The same checksum of the files as they are now; never 0. If it differs, a loss of power took some of them.
  std::uint64_t placeholderSum(const std::string& container, const std::string& bundle);
  /// A dictionary, written as XML.
  bool writeMetadata(const std::string& container, const platform::Value& metadata,
                     platform::ErrorRef* error = nullptr);
  /// Copies another container's metadata file; if there is none, that counts as done.
  bool copyMetadata(const std::string& from, const std::string& to, platform::ErrorRef* error = nullptr);
  /// Makes the container durable, with all that is in it.
  bool sync(const std::string& container, platform::ErrorRef* error = nullptr);

  /// What cannot be removed now is a leftover.
  void remove(const std::string& container);
  void removeAllBut(const std::set<std::string>& containers);

 private:
  bool writeNew(const std::string& path, platform::BytesView content, platform::ErrorRef* error);

  FileTree& _files;
};

}  // namespace device
