#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "device/DeviceStatus.h"
#include "platform/TextTable.h"

namespace tsd {

/// What is said of a journal that is cut.
constexpr const char* notKnownFurther =
    "packages may have come further than is shown, as the journal of the sync has come to its size limit";

/// How far the packages have come that a device's last sync is sending now, or was sending when it was killed, from the
/// journal that the device keeps of it. The device's store knows this only of a sync that has ended.
class RunProgress {
 public:
  /// `device` is the device's folder.
  explicit RunProgress(const std::string& device) : _device(device) {}

  /// Reads what was added to the journal since the last time. Answers whether anything was.
  bool refresh();
  /// Puts the progress into the status of apps whose package is still on its way.
  void addTo(device::DeviceStatus& status) const;
  /// Whether the journal has come to its size limit, so that the packages may have come further than is known.
  bool isCut() const { return _isCut; }
  /// 0…1; nothing if the journal does not mention the app's package.
  std::optional<double> fractionOf(std::string_view app) const;

 private:
  void take(std::string_view line);

  const std::string _device;
  std::string _journal;     // of the run that is looked at; empty: there is none
  std::uint64_t _read = 0;  // bytes of it, up to the end of a line
  bool _isCut = false;
  platform::TextMap<double> _fractions;
};

}  // namespace tsd
