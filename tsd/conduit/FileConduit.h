#pragma once

#include <dirent.h>

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "device/files/FileTree.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/terminal/Console.h"

namespace tsd {

/// Brings the host's files onto the device: regular files only, and no more than a limit on their number and bytes.
/// Names the first files that it refuses on the console, and counts the others.
class FileConduit {
 public:
  static constexpr std::size_t maximumEntries = 200'000;  // files, folders, and what is refused
  static constexpr std::size_t maximumRefusalsTold = 20;
  static constexpr std::size_t maximumDepth = 16;
  static constexpr std::uint64_t maximumBytes = std::uint64_t{16} << 30;

  struct Limits {
    std::size_t entries = maximumEntries;
    std::uint64_t fileBytes = maximumBytes;  // a larger file is refused
  };
  /// `isStopped`, if there is one, tells whether to end: asked before each piece of a file.
  FileConduit(device::FileTree& files, Console& console, std::function<bool()> isStopped = nullptr)
      : FileConduit(files, console, Limits(), std::move(isStopped)) {}
  FileConduit(device::FileTree& files, Console& console, Limits limits, std::function<bool()> isStopped = nullptr)
      : _files(files), _console(console), _limits(limits), _isStopped(std::move(isStopped)) {}

  /// Replaces the staging directory by the host's folder, without its packages and its restore lists. A folder without
  /// a todo list leaves no staging directory and answers false. Throws a `CommandError` when the folder or the todo
  /// list cannot be read, when there is too much, when the device takes no more, or when it is stopped; then nothing of
  /// it is left in the staging directory.
  bool pushStaging(const std::string& hostFolder);

  /// Copies one file to a path of the device durably, over an older one; missing directories are made. Throws a
  /// `CommandError` that names the file.
  void pushFile(const std::string& hostFile, std::string_view devicePath);

 private:
  struct Level {
    DIR* directory;  // nothing of it has been read
    std::string hostPath;
    std::string devicePath;
    std::size_t depth;
  };

  void pushTree(const Level& level);
  void pushDirectory(const Level& level);
  void pushItem(const Level& level, const std::string& name);
  void checkStopped() const;
  /// Absent when all went well, otherwise why no file of the device can have that name. Throws when anything else
  /// fails.
  platform::ErrorRef copy(HostFile& file, const std::string& hostPath, std::string_view devicePath, bool durable);
  void refuse(const std::string& hostPath, const std::string& why);

  device::FileTree& _files;
  Console& _console;
  const Limits _limits;
  const std::function<bool()> _isStopped;
  std::size_t _entries = 0;
  std::size_t _refused = 0;
  std::uint64_t _pushedBytes = 0;
};

}  // namespace tsd
