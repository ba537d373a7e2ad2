#pragma once

#include <string>

#include "device/boundary/Boundary.h"
#include "device/files/FileTree.h"
#include "platform/Process.h"

namespace device {

/// The process that hosts the plug-in, with the device's own temporary directory.
class LocalProcess final : public platform::Process {
 public:
  static constexpr std::string_view temporaryDirectoryPath = "/var/mobile/tmp";

  /// Makes the temporary directory if it is not there.
  LocalProcess(Boundary& boundary, FileTree& files, std::string mainBundleIdentifier);

  std::string mainBundleIdentifier() override;
  std::string temporaryDirectory() override;
  std::string textOfErrorNumber(int errorNumber) override;
  /// Buffers of this device's services come from `std::malloc`.
  void deallocateMemory(void* buffer, std::size_t length) override;
  platform::Value infoDictionaryOfBundleAtPath(std::string_view path) override;

 private:
  Boundary& _boundary;
  FileTree& _files;
  const std::string _mainBundleIdentifier;
};

}  // namespace device
