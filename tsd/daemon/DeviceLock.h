#pragma once

#include <optional>
#include <string>

namespace tsd {

/// The right to change a device folder, for as long as the object lives. One process at a time has it; it ends with the
/// process, however that ends. To look at a device needs none.
class DeviceLock {
 public:
  /// Throws a `CommandError`: "busy" with the holder's process number and command when another process has it,
  /// "failed" when the folder is not there or is none of a device. Changes nothing then.
  explicit DeviceLock(const std::string& folder);
  ~DeviceLock();
  DeviceLock(const DeviceLock&) = delete;
  DeviceLock& operator=(const DeviceLock&) = delete;

  /// Throws a `CommandError` when the folder is not there or is none of a device.
  static void requireDevice(const std::string& folder);
  struct Holder {
    std::string process;  // its number
    std::string command;  // its command line

    bool operator==(const Holder&) const = default;
  };
  /// Who has the right now. Tries no lock: that might stand in the way of a process that is just about to take it.
  static std::optional<Holder> holderOf(const std::string& folder);

 private:
  void noteHolder();

  int _descriptor = -1;
};

}  // namespace tsd
