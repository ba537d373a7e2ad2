#pragma once

#include <stdlib.h>

#include <filesystem>
#include <stdexcept>
#include <string>

namespace bench {

/// A folder that goes with this object.
class TemporaryFolder {
 public:
  TemporaryFolder() {
    _path = std::filesystem::temp_directory_path() / "appsync-bench-XXXXXX";
    if (!mkdtemp(_path.data())) throw std::runtime_error("cannot make " + _path);
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(_path, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  const std::string& path() const { return _path; }

 private:
  std::string _path;
};

}  // namespace bench
