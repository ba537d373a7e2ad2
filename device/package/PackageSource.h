#pragma once

#include <archive.h>

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "device/files/FileTree.h"

namespace device {

/// A zip archive on the device's file system, as libarchive reads it: through the table at the archive's end, which
/// alone tells links from files.
class PackageSource {
 public:
  explicit PackageSource(FileTree& files) : _files(files) {}
  /// How much libarchive may read before it tells of the first entry: it takes the whole table at the archive's end
  /// into memory, whatever its length.
  static constexpr std::uint64_t longestTable = std::uint64_t{24} << 20;
  ~PackageSource();
  PackageSource(const PackageSource&) = delete;
  PackageSource& operator=(const PackageSource&) = delete;

  bool open(std::string_view path, platform::ErrorRef* error = nullptr);

  struct archive* archive() {
    return _archive;
  }
  /// The next entry, as libarchive's function answers.
  int next(struct archive_entry** entry);
  /// What libarchive or the file system said last.
  std::string reason() const;

 private:
  static la_ssize_t read(struct archive*, void* self, const void** buffer);
  static la_int64_t skip(struct archive*, void* self, la_int64_t count);
  static la_int64_t seek(struct archive*, void* self, la_int64_t offset, int whence);

  FileTree& _files;
  struct archive* _archive = nullptr;
  std::unique_ptr<FileReader> _reader;
  platform::Bytes _chunk;  // what libarchive looks at until its next read
  std::uint64_t _size = 0;
  std::uint64_t _position = 0;
  std::optional<std::uint64_t> _tableLeft = longestTable;  // until the first entry was met
  platform::ErrorRef _error;
};

}  // namespace device
