#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "device/files/FileDescriptor.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The folders used last, held open by their paths, for a tree that nobody else changes: what is done in one of them
/// need not find it again. Callable from any thread.
class KeptFolders {
 public:
  using Handle = std::shared_ptr<const FileDescriptor>;

  /// Null for a folder that is not kept.
  Handle find(std::string_view path);
  /// To be asked before a folder is looked for: what was found is kept only if no folder has gone meanwhile.
  std::uint64_t changes();
  void keep(std::string_view path, Handle folder, std::uint64_t changesBefore);
  /// The item has been moved or removed, if only in part: neither it nor anything below it is where it was.
  void forget(std::string_view path);
  /// Gives all handles back.
  void clear();

 private:
  static constexpr std::size_t most = 16;
  struct Folder {
    std::string path;
    Handle handle;
  };

  platform::Mutex _mutex;
  std::vector<Folder> _folders GUARDED_BY(_mutex);  // the one used last at the end
  std::uint64_t _changes GUARDED_BY(_mutex) = 0;
};

}  // namespace device
