#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Error.h"
#include "platform/FileSystem.h"
#include "platform/Value.h"

namespace device {

class StepWatch;

/// A file that is being written. It appears under its path at once; `close` makes it durable.
class FileWriter {
 public:
  virtual ~FileWriter() = default;
  virtual bool write(platform::BytesView bytes, platform::ErrorRef* error = nullptr) = 0;
  /// Flushes to disk when `durable`. Without `close` what was written stays, but nobody knows whether it is durable.
  virtual bool close(bool durable, platform::ErrorRef* error = nullptr) = 0;
};

/// A file that is being read, from its beginning unless told otherwise.
class FileReader {
 public:
  virtual ~FileReader() = default;
  /// Up to `count` bytes; empty at the end; nothing on failure.
  virtual std::optional<platform::Bytes> read(std::size_t count, platform::ErrorRef* error = nullptr) = 0;
  /// The next read begins `offset` bytes into the file; beyond its end there is nothing to read.
  virtual bool seek(std::uint64_t offset, platform::ErrorRef* error = nullptr) = 0;
};

/// The device's file system, on a Linux folder or in memory: the same behaviour and the same error codes.
///
/// Paths are the device's absolute ones ("/var/mobile/…"). A resolver walks them component by component below the
/// root, follows no link and refuses "..", empty names and anything that is neither a regular file nor a directory,
/// unopened, with an error that names the path. Errors have the domain "FileSystem" and the system's error number as
/// code. Callable from any thread.
class FileTree : public platform::FileSystem {
 public:
  struct Entry {
    std::string name;
    bool isDirectory;
    std::uint64_t size;
  };

  /// What `createFile` does, with the reason of a failure where it is known.
  virtual bool putFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes,
                       platform::ErrorRef* error) {
    platform::setError(error, nullptr);
    return createFile(path, contents, attributes);
  }
  /// The directory's items, sorted by name; nothing on failure.
  virtual std::optional<std::vector<Entry>> list(std::string_view path, platform::ErrorRef* error = nullptr) = 0;
  /// A new file (something there is a failure); mode is the permission bits, of which only owner execute is kept.
  virtual std::unique_ptr<FileWriter> createNew(std::string_view path, bool executable,
                                                platform::ErrorRef* error = nullptr) = 0;
  virtual std::unique_ptr<FileReader> openForReading(std::string_view path, platform::ErrorRef* error = nullptr) = 0;
  /// Makes the directory's entries durable.
  virtual bool syncDirectory(std::string_view path, platform::ErrorRef* error = nullptr) = 0;
  /// Makes a file's content durable, or all that is in a directory, and its entry in the directory that it is in.
  virtual bool syncItem(std::string_view path, platform::ErrorRef* error = nullptr) = 0;
  /// False once an operation may have left something behind that it should have removed.
  virtual bool isTidy() const { return true; }
};

/// The prefix of the temporary names that `writeAtomically` and the removal of a directory use; leftovers are removed
/// when a device is opened.
constexpr std::string_view temporaryFilePrefix = ".applicationsync-";

/// Below `root`, an existing folder of the host. Null with an error when it cannot be opened. `watch`, if there is one,
/// is told of every step.
std::unique_ptr<FileTree> openDiskFileTree(const std::string& root, platform::ErrorRef* error = nullptr,
                                           std::shared_ptr<StepWatch> watch = nullptr);
std::unique_ptr<FileTree> makeMemoryFileTree();

}  // namespace device
