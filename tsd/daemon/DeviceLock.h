#pragma once

#include <optional>
#include <string>

#include "device/files/FileDescriptor.h"

namespace tsd {

/// The right to change a device folder, for as long as the object lives. One process at a time has it; it ends with the
/// process, however that ends. Looking at a device needs no lock.
class DeviceLock {
 public:
  /// Throws a `CommandError`: "busy" with the holder's process number and command when another process has it,
  /// "failed" when the folder is not there or is not a device's. It then changes nothing.
  explicit DeviceLock(const std::string& folder);
  ~DeviceLock();
  DeviceLock(const DeviceLock&) = delete;
  DeviceLock& operator=(const DeviceLock&) = delete;

  /// Throws a `CommandError` when the folder is not there or is not a device's.
  static void requireDevice(const std::string& folder);
  struct Holder {
    std::string process;  // its number
    std::string command;  // its command line

    bool operator==(const Holder&) const = default;
  };
  /// Who has the right now. It does not try the lock, which could get in the way of a process just about to take it.
  static std::optional<Holder> holderOf(const std::string& folder);

 private:
  void noteHolder();

  device::FileDescriptor _file;
};

}  // namespace tsd
