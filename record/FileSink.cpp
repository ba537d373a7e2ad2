#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "record/Sink.h"

namespace record {

namespace {

class FileSink final : public Sink {
 public:
  explicit FileSink(int file) : _file(file) {}
  ~FileSink() override { ::close(_file); }
  FileSink(const FileSink&) = delete;
  FileSink& operator=(const FileSink&) = delete;

  bool write(platform::BytesView bytes) override {
    while (!bytes.empty()) {
      const ssize_t written = ::write(_file, bytes.data(), bytes.size());
      if (written < 0 && errno == EINTR) continue;
      if (written <= 0) return false;
      bytes.remove_prefix(static_cast<std::size_t>(written));
    }
    return true;
  }

 private:
  const int _file;
};

}  // namespace

std::shared_ptr<Sink> makeFileSink(const std::string& path, platform::ErrorRef* error) {
  platform::setError(error, nullptr);
  // What a recording holds is nobody else's to read.
  const int file = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (file < 0) {
    platform::setError(error, platform::makeError("recording", errno, path + ": " + std::strerror(errno)));
    return nullptr;
  }
  return std::make_shared<FileSink>(file);
}

}  // namespace record
