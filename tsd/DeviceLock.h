#pragma once

#include <cstdint>
#include <string>

namespace tsd {

/// The right to use a device folder, for as long as the object lives. One process at a time has the right to change it,
/// or several have the one to look at it; it ends with the process, however that ends.
class DeviceLock {
 public:
  /// Throws a `CommandError`: "busy" with the holder's process number and command when another process has it,
  /// "failed" when the folder is not there or is none of a device. Changes nothing then.
  enum class Use : std::uint8_t { change, look };
  /// To look changes nothing in the folder; of one that nobody has used yet nothing is locked then.
  explicit DeviceLock(const std::string& folder, Use use = Use::change);
  ~DeviceLock();
  DeviceLock(const DeviceLock&) = delete;
  DeviceLock& operator=(const DeviceLock&) = delete;

 private:
  void noteHolder();

  const Use _use;
  int _descriptor = -1;
};

}  // namespace tsd
