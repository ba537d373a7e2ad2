#pragma once

#include <archive.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

namespace tsd {

/// Writes an app's package: a zip archive, its entries in the order in which they are added, the same bytes for the
/// same content. Every operation throws a `CommandError` that names the file.
class PackageWriter {
 public:
  enum class Content { stored, deflated };

  /// The file is made, or emptied.
  PackageWriter(const std::string& path, Content content);

  void addFolder(const std::string& name);
  void addFile(const std::string& name, std::string_view content);
  /// A file whose content follows in pieces, `size` bytes in all.
  void beginFile(const std::string& name, std::uint64_t size, bool executable = false);
  void append(std::string_view content);
  void close();

 private:
  void addHeader(const std::string& name, unsigned mode, std::uint64_t size);
  void check(int status);

  const std::string _path;
  const std::unique_ptr<archive, int (*)(archive*)> _archive;
};

}  // namespace tsd
