#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "device/FileTree.h"
#include "tsd/Console.h"
#include "tsd/HostFile.h"

namespace tsd {

constexpr std::string_view stagingDirectory = "/var/mobile/Media/PublicStaging/ApplicationSync";
constexpr std::string_view packagesDirectory = "/var/mobile/Media/PublicStaging/Packages";
constexpr std::string_view todoListName = "ApplicationsSync.plist";

/// Throws a `CommandError` when a host's folder is not there, is none, or cannot be read.
void requireHostFolder(const std::string& folder);

/// The way of the host's files onto the device. Takes regular files only, and no more of them than the device has room
/// for in its books; whatever it refuses it names on the console.
class FileConduit {
 public:
  static constexpr std::size_t maximumFiles = 200'000;
  static constexpr std::size_t maximumDepth = 16;
  static constexpr std::uint64_t maximumBytes = std::uint64_t{16} << 30;

  FileConduit(device::FileTree& files, Console& console) : _files(files), _console(console) {}

  /// Replaces the staging directory by the host's folder, without its packages and its restore lists. A folder without
  /// a todo list leaves no staging directory and answers false. Throws a `CommandError` when the folder or the todo
  /// list cannot be read, or it does not fit, or the device takes no more; then nothing of it is in the staging
  /// directory.
  bool pushStaging(const std::string& hostFolder);

  /// One file to a path of the device, in the place of an older one, durably; directories on the way are made. Throws a
  /// `CommandError` that names the file.
  void pushFile(const std::string& hostFile, std::string_view devicePath);

 private:
  struct Level {
    int directory;
    std::string hostPath;
    std::string devicePath;
    std::size_t depth;
  };

  void pushDirectory(const Level& level);
  void pushItem(const Level& level, const std::string& name);
  /// Absent when all went well, else why no file of the device can have that name. Throws when anything else fails.
  platform::ErrorRef copy(HostFile& file, const std::string& hostPath, std::string_view devicePath, bool durable);
  void refuse(const std::string& hostPath, const std::string& why);

  device::FileTree& _files;
  Console& _console;
  std::size_t _pushedFiles = 0;
  std::uint64_t _pushedBytes = 0;
};

}  // namespace tsd
