#include "device/files/TemporaryFiles.h"

#include <string>
#include <vector>

namespace device {

std::size_t removeTemporaryFiles(FileTree& files) {
  std::size_t removed = 0;
  std::vector<std::string> directories{""};
  while (!directories.empty()) {
    std::string directory = std::move(directories.back());
    directories.pop_back();
    auto entries = files.list(directory.empty() ? "/" : directory);
    if (!entries) continue;
    for (const auto& entry : *entries) {
      std::string path = directory + '/' + entry.name;
      if (entry.name.compare(0, temporaryFilePrefix.size(), temporaryFilePrefix) == 0)
        removed += files.removeItem(path);
      else if (entry.isDirectory)
        directories.push_back(std::move(path));
    }
  }
  return removed;
}

}  // namespace device
