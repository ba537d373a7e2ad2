#include "tsd/host/PackageWriter.h"

#include <archive_entry.h>

#include <ctime>

#include "tsd/CommandError.h"

namespace tsd {

namespace {

// Of every entry, so that the same content makes the same package.
constexpr std::time_t entryTime = 1'700'000'000;

}  // namespace

PackageWriter::PackageWriter(const std::string& path, Content content)
    : _path(path), _archive(archive_write_new(), archive_write_free) {
  check(archive_write_set_format_zip(_archive.get()));
  check(archive_write_set_options(_archive.get(),
                                  content == Content::stored ? "zip:compression=store" : "zip:compression=deflate"));
  check(archive_write_open_filename(_archive.get(), path.c_str()));
}

void PackageWriter::addFolder(const std::string& name) { addHeader(name + "/", AE_IFDIR | 0755, 0); }

void PackageWriter::addFile(const std::string& name, std::string_view content) {
  beginFile(name, content.size());
  append(content);
}

void PackageWriter::beginFile(const std::string& name, std::uint64_t size, bool executable) {
  addHeader(name, AE_IFREG | (executable ? 0755u : 0644u), size);
}

void PackageWriter::append(std::string_view content) {
  if (archive_write_data(_archive.get(), content.data(), content.size()) != static_cast<la_ssize_t>(content.size())) {
    check(ARCHIVE_FATAL);
  }
}

void PackageWriter::close() { check(archive_write_close(_archive.get())); }

void PackageWriter::addHeader(const std::string& name, unsigned mode, std::uint64_t size) {
  std::unique_ptr<archive_entry, void (*)(archive_entry*)> entry(archive_entry_new(), archive_entry_free);
  archive_entry_set_pathname(entry.get(), name.c_str());
  archive_entry_set_mode(entry.get(), static_cast<mode_t>(mode));
  archive_entry_set_size(entry.get(), static_cast<la_int64_t>(size));
  archive_entry_set_mtime(entry.get(), entryTime, 0);
  check(archive_write_header(_archive.get(), entry.get()));
}

void PackageWriter::check(int status) {
  if (status >= ARCHIVE_WARN) return;
  const char* reason = archive_error_string(_archive.get());
  throw CommandError(_path + ": " + (reason ? reason : "cannot be written"));
}

}  // namespace tsd
