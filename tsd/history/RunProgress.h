#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "device/DeviceStatus.h"
#include "platform/TextTable.h"

namespace tsd {

/// How far the packages have come that a device's last sync was sending when it was killed, or is sending now, from the
/// journal that the device keeps of it. The device's store knows that only of a sync that has ended.
class RunProgress {
 public:
  /// `device` is the device's folder.
  explicit RunProgress(const std::string& device) : _runs(device + "/runs") {}

  /// Reads what has come to the journal since the last time. Whether anything has.
  bool refresh();
  /// Puts it where a package is still on its way.
  void addTo(device::DeviceStatus& status) const;
  /// 0…1; nothing when nothing was said of the app's package.
  std::optional<double> fractionOf(std::string_view app) const;

 private:
  void take(std::string_view line);

  const std::string _runs;
  std::string _journal;     // of the run that is looked at; empty: there is none
  std::uint64_t _read = 0;  // bytes of it, up to the end of a line
  platform::TextMap<double> _fractions;
};

}  // namespace tsd
