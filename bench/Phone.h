#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/TSClient.h"

namespace bench {

/// A plug-in on a device in memory, or on the folder of one, that the daemon has just been started on. Nobody listens
/// to the log and nothing is journaled; the device's own threads run.
class Phone {
 public:
  Phone();
  explicit Phone(const std::string& folder);
  ~Phone();
  Phone(const Phone&) = delete;
  Phone& operator=(const Phone&) = delete;

  device::LocalDevice& device() { return *_device; }
  const platform::Platform& platform() { return _device->platform(); }
  platform::TSClient& plugin() { return *_plugin; }

  void write(const std::string& path, const platform::Bytes& content);
  /// A todo list where the plug-in looks for it, and what the host knows of each app; without icons.
  void stageApps(std::size_t count);
  /// The processor time of all threads that it takes to ask which packages are outstanding, until everything that
  /// follows from it has happened. The answer is left in `assets`.
  double askForPackages(std::vector<platform::TSAssetRef>& assets);

 private:
  void start();

  std::unique_ptr<device::LocalDevice> _device;
  std::shared_ptr<platform::TSClient> _plugin;
};

}  // namespace bench
