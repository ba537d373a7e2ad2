#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Error.h"
#include "platform/Value.h"

namespace tsd {

/// A regular file of the host, opened for reading in one pass. Nothing else is opened: no link is followed at the last
/// step, no pipe or device is touched.
class HostFile {
 public:
  /// `name` is one component below `folder`, which is no link, or, with an empty folder, a path. Nothing on failure,
  /// with an error of the domain "Host" whose description says what is wrong without naming the file.
  static std::optional<HostFile> open(const std::string& folder, const std::string& name,
                                      platform::ErrorRef* error = nullptr);
  /// Below a directory that is open already.
  static std::optional<HostFile> openAt(int directory, const std::string& name, platform::ErrorRef* error = nullptr);

  HostFile(HostFile&& other) noexcept;
  HostFile& operator=(HostFile&&) = delete;
  ~HostFile();

  /// In bytes, as it was when the file was opened.
  std::uint64_t size() const { return _size; }
  /// The next bytes, as many as the buffer has at most, which they are then in; empty at the end; nothing on failure.
  std::optional<platform::BytesView> readInto(platform::Bytes& buffer, platform::ErrorRef* error = nullptr);
  /// Up to `count` bytes; empty at the end; nothing on failure.
  std::optional<platform::Bytes> read(std::size_t count, platform::ErrorRef* error = nullptr);
  /// The rest of the file; more than `limit` bytes are a failure.
  std::optional<platform::Bytes> readRest(std::size_t limit, platform::ErrorRef* error = nullptr);

 private:
  HostFile(int descriptor, std::uint64_t size) : _descriptor(descriptor), _size(size) {}

  int _descriptor;
  std::uint64_t _size;
};

/// Whether a name can be one component of a path: neither empty nor "." nor "..", without a slash or a zero byte.
bool isFileName(std::string_view name);

/// "a symbolic link", "a named pipe", … for something that is neither a regular file nor a directory.
const char* sortOfFile(unsigned mode);

}  // namespace tsd
