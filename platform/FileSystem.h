#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Error.h"
#include "platform/Value.h"

namespace platform {

constexpr std::string_view FXFileOwnerAccountName = "FXFileOwnerAccountName";
constexpr std::string_view FXFileGroupOwnerAccountName = "FXFileGroupOwnerAccountName";

/// What an item of the file system is.
struct FileAttributes {
  bool isDirectory = false;
  std::uint64_t size = 0;  // bytes; 0 for a directory
};

/// What a loss of power may do to a file that was written.
enum class Durability : std::uint8_t {
  lasting,   // on disk when the operation returns; afterwards the file has the old content or the new
  fleeting,  // the file, or any part of it, may be lost: for what is made anew before it is used again
};

/// File operations. Paths are absolute. Callable from any thread. Each operation is atomic towards the others,
/// and on disk when it returns, only where it says so. Anything but a regular file or a directory is refused unopened.
class FileSystem {
 public:
  virtual ~FileSystem() = default;

  /// With everything in it. An item that is not there is a failure.
  virtual bool removeItem(std::string_view path, ErrorRef* error = nullptr) = 0;
  /// A directory that is there already counts as created when intermediate directories are asked for, and is a failure
  /// otherwise. `attributes` is a dictionary or absent; an implementation applies what it may.
  virtual bool createDirectory(std::string_view path, bool withIntermediateDirectories, const Value& attributes,
                               ErrorRef* error = nullptr) = 0;
  /// Atomic, and on disk when it returns. Something at the destination is a failure.
  virtual bool moveItem(std::string_view from, std::string_view to, ErrorRef* error = nullptr) = 0;
  /// A file; an older file at the destination is replaced.
  virtual bool copyItem(std::string_view from, std::string_view to, ErrorRef* error = nullptr) = 0;
  virtual bool fileExists(std::string_view path, bool* isDirectory = nullptr) = 0;
  virtual std::optional<FileAttributes> attributesOfItem(std::string_view path, ErrorRef* error = nullptr) = 0;
  /// Replaces an older file.
  virtual bool createFile(std::string_view path, BytesView contents, const Value& attributes) = 0;
  /// The whole file, bypassing the cache.
  virtual std::optional<Bytes> readFile(std::string_view path, ErrorRef* error = nullptr) = 0;
  /// A temporary file, then a rename: a reader sees the old content or the new, never a part.
  virtual bool writeAtomically(std::string_view path, BytesView contents, ErrorRef* error = nullptr,
                               Durability durability = Durability::lasting) = 0;
  /// Access and modification times become now. 0, or -1 with the error number stored.
  virtual int utimes(std::string_view path, int& errorNumber) = 0;
};

}  // namespace platform
