#include "tsd/sample/SamplePackage.h"

#include <archive.h>
#include <archive_entry.h>

#include <algorithm>
#include <ctime>
#include <memory>

#include "plist/PropertyList.h"
#include "tsd/CommandError.h"

namespace tsd {
namespace {

constexpr std::time_t sampleTime = 1'700'000'000;
constexpr std::uint64_t overhead = 1024;  // of the archive itself, about

class PackageWriter {
 public:
  explicit PackageWriter(const std::string& path) : _path(path), _archive(archive_write_new(), archive_write_free) {
    check(archive_write_set_format_zip(_archive.get()));
    check(archive_write_set_options(_archive.get(), "zip:compression=store"));
    check(archive_write_open_filename(_archive.get(), path.c_str()));
  }

  void addFolder(const std::string& name) { addHeader(name + "/", AE_IFDIR | 0755, 0); }
  void addFile(const std::string& name, std::string_view content) {
    beginFile(name, content.size());
    append(content);
  }
  void beginFile(const std::string& name, std::uint64_t size) { addHeader(name, AE_IFREG | 0644, size); }
  void append(std::string_view content) {
    if (archive_write_data(_archive.get(), content.data(), content.size()) != static_cast<la_ssize_t>(content.size())) {
      check(ARCHIVE_FATAL);
    }
  }
  void close() { check(archive_write_close(_archive.get())); }

 private:
  void addHeader(const std::string& name, unsigned mode, std::uint64_t size) {
    std::unique_ptr<archive_entry, void (*)(archive_entry*)> entry(archive_entry_new(), archive_entry_free);
    archive_entry_set_pathname(entry.get(), name.c_str());
    archive_entry_set_mode(entry.get(), static_cast<mode_t>(mode));
    archive_entry_set_size(entry.get(), static_cast<la_int64_t>(size));
    archive_entry_set_mtime(entry.get(), sampleTime, 0);
    check(archive_write_header(_archive.get(), entry.get()));
  }
  void check(int status) {
    if (status >= ARCHIVE_WARN) return;
    const char* reason = archive_error_string(_archive.get());
    throw CommandError(_path + ": " + (reason ? reason : "cannot be written"));
  }

  std::string _path;
  std::unique_ptr<archive, int (*)(archive*)> _archive;
};

}  // namespace

void writeSamplePackage(const std::string& path, const SampleApp& app, std::uint64_t size, std::uint64_t seed) {
  auto manifest = plist::writeBinary(app.manifest());
  if (!manifest) throw CommandError(path + ": its manifest cannot be written");
  PackageWriter package(path);
  std::string folder = app.name + ".app";
  package.addFolder(folder);
  package.addFile(folder + "/Info.plist", *manifest);
  package.addFile(folder + "/" + sampleIconName, app.icon);
  std::uint64_t used = manifest->size() + app.icon.size() + overhead;
  std::uint64_t left = size > used ? size - used : 0;
  SampleNumbers numbers(seed);
  // What the other files hold, of a few sizes, is half of it at most.
  const std::size_t others = app.files - 3;
  const std::uint64_t share = others ? left / 2 / others : 0;
  for (std::size_t number = 0; number < others; ++number) {
    std::string inner = folder + (number % 20 < 10 ? "/Größen " : "/資料 ") + std::to_string(number / 10);
    if (number % 10 == 0) package.addFolder(inner);
    std::size_t size = share ? numbers.below(static_cast<std::size_t>(share)) : 0;
    package.addFile(inner + "/piece " + std::to_string(number), numbers.bytes(size));
    left -= size;
  }
  package.beginFile(folder + "/content.bin", left);
  while (left > 0) {
    auto some = static_cast<std::size_t>(std::min<std::uint64_t>(left, 1 << 16));
    package.append(numbers.bytes(some));
    left -= some;
  }
  package.close();
}

}  // namespace tsd
