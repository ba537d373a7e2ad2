#pragma once

#include <functional>
#include <string>
#include <utility>

#include "device/boundary/Boundary.h"
#include "device/records/AppRecords.h"
#include "platform/HomeScreen.h"

namespace device {

/// The home screen: which icons there are, in which order.
class HomeScreenService final : public platform::HomeScreen {
 public:
  /// Told why a layout was not taken, since the plug-in ignores that silently. May be null.
  using Refused = std::function<void(const std::string& reason)>;

  HomeScreenService(AppRecords& records, Boundary& boundary, Refused refused)
      : _records(records), _boundary(boundary), _refused(std::move(refused)) {}

  Port PNSPanelloBlockableServerPort() override;
  /// The buffer comes from `malloc` and holds a binary property list.
  int PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) override;
  int PNSetIconState(Port port, platform::BytesView layout) override;

 private:
  AppRecords& _records;
  Boundary& _boundary;
  const Refused _refused;
};

}  // namespace device
