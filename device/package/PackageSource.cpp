#include "device/package/PackageSource.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <new>
#include <optional>

namespace device {

namespace {
constexpr std::size_t chunkBytes = 256 * 1024;
}

PackageSource::~PackageSource() {
  if (_archive) archive_read_free(_archive);
}

bool PackageSource::open(std::string_view path, platform::ErrorRef* error) {
  auto attributes = _files.attributesOfItem(path, error);
  if (!attributes) return false;
  _size = attributes->size;
  _reader = _files.openForReading(path, error);
  if (!_reader) return false;
  _archive = archive_read_new();
  bool opened = _archive && archive_read_support_format_zip_seekable(_archive) == ARCHIVE_OK &&
                archive_read_set_callback_data(_archive, this) == ARCHIVE_OK &&
                archive_read_set_read_callback(_archive, &PackageSource::read) == ARCHIVE_OK &&
                archive_read_set_skip_callback(_archive, &PackageSource::skip) == ARCHIVE_OK &&
                archive_read_set_seek_callback(_archive, &PackageSource::seek) == ARCHIVE_OK &&
                archive_read_open1(_archive) == ARCHIVE_OK;
  if (!opened) platform::setError(error, platform::makeError("Package", 1, "not a zip archive: " + reason()));
  return opened;
}

std::string PackageSource::reason() const {
  if (_error) return _error->description();
  const char* text = _archive ? archive_error_string(_archive) : nullptr;
  return text ? text : "no reason given";
}

int PackageSource::next(struct archive_entry** entry) {
  int status = archive_read_next_header(_archive, entry);
  if (status == ARCHIVE_OK) _tableLeft.reset();
  return status;
}

la_ssize_t PackageSource::read(struct archive* archive, void* data, const void** buffer) {
  auto& self = *static_cast<PackageSource*>(data);
  std::optional<platform::Bytes> chunk;
  try {
    // No more than there is: the memory for it is allocated and cleared each time.
    chunk = self._reader->read(std::min<std::uint64_t>(chunkBytes, self._size - self._position), &self._error);
  } catch (const std::bad_alloc&) {
    // Nothing may be thrown through libarchive.
  }
  if (!chunk) {
    archive_set_error(archive, EIO, "the package cannot be read");
    return ARCHIVE_FATAL;
  }
  if (self._tableLeft && chunk->size() > *self._tableLeft) {
    archive_set_error(archive, EFBIG, "its table of entries is too long");
    return ARCHIVE_FATAL;
  }
  if (self._tableLeft) *self._tableLeft -= chunk->size();
  self._chunk = std::move(*chunk);
  self._position += self._chunk.size();
  *buffer = self._chunk.data();
  return static_cast<la_ssize_t>(self._chunk.size());
}

la_int64_t PackageSource::skip(struct archive* archive, void* data, la_int64_t count) {
  auto& self = *static_cast<PackageSource*>(data);
  auto step = std::min<std::uint64_t>(static_cast<std::uint64_t>(std::max<la_int64_t>(count, 0)),
                                      self._size - std::min(self._size, self._position));
  auto before = self._position;
  return seek(archive, data, static_cast<la_int64_t>(before + step), SEEK_SET) < 0 ? 0 : static_cast<la_int64_t>(step);
}

la_int64_t PackageSource::seek(struct archive*, void* data, la_int64_t offset, int whence) {
  auto& self = *static_cast<PackageSource*>(data);
  la_int64_t base = whence == SEEK_SET   ? 0
                    : whence == SEEK_CUR ? static_cast<la_int64_t>(self._position)
                                         : static_cast<la_int64_t>(self._size);
  la_int64_t target = base + offset;
  if (target < 0 || static_cast<std::uint64_t>(target) > self._size) return ARCHIVE_FATAL;
  if (!self._reader->seek(static_cast<std::uint64_t>(target), &self._error)) return ARCHIVE_FATAL;
  self._position = static_cast<std::uint64_t>(target);
  return target;
}

}  // namespace device
