#pragma once

#include <string>

namespace tsd {

/// The right to use a device folder, for as long as the object lives. One process at a time has it; it ends with the
/// process, however that ends.
class DeviceLock {
 public:
  /// Throws a `CommandError`: "busy" with the holder's process number and command when another process has it,
  /// "failed" when the folder is not there or is none of a device. Changes nothing then.
  explicit DeviceLock(const std::string& folder);
  ~DeviceLock();
  DeviceLock(const DeviceLock&) = delete;
  DeviceLock& operator=(const DeviceLock&) = delete;

 private:
  void noteHolder();

  int _descriptor = -1;
};

}  // namespace tsd
