#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "device/LocalDevice.h"
#include "platform/TSClient.h"
#include "platform/Value.h"
#include "tsd/daemon/Daemon.h"

namespace fuzz {

/// The plug-in, loaded from its library, on a device in memory, events delivered by hand. The process ends when a call
/// into the plug-in was stopped by an exception, or something lies where nobody puts anything.
class MemoryPhone {
 public:
  explicit MemoryPhone(std::string_view process);
  ~MemoryPhone();
  MemoryPhone(const MemoryPhone&) = delete;
  MemoryPhone& operator=(const MemoryPhone&) = delete;

  device::LocalDevice& device() { return *_device; }
  tsd::Daemon& daemon() { return *_daemon; }

  void write(const std::string& path, platform::BytesView content);
  /// Absent when it is no property list.
  platform::Value readList(const std::string& path);
  /// Delivers everything that is due, also what follows from it.
  void deliver() { _device->events().drain(); }
  /// Ends the process when there is anything outside the folders that are the plug-in's and the device's.
  void requireNothingElsewhere();

 private:
  std::unique_ptr<device::LocalDevice> _device;
  std::shared_ptr<platform::TSClient> _client;
  std::unique_ptr<tsd::Daemon> _daemon;
};

}  // namespace fuzz
