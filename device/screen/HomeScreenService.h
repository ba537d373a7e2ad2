#pragma once

#include "device/boundary/Boundary.h"
#include "device/records/AppRecords.h"
#include "platform/HomeScreen.h"

namespace device {

/// The home screen: which icons there are, in which order.
class HomeScreenService final : public platform::HomeScreen {
 public:
  HomeScreenService(AppRecords& records, Boundary& boundary) : _records(records), _boundary(boundary) {}

  Port PNSPanelloBlockableServerPort() override;
  /// The buffer comes from `malloc` and holds a binary property list.
  int PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) override;
  int PNSetIconState(Port port, platform::BytesView layout) override;

 private:
  AppRecords& _records;
  Boundary& _boundary;
};

}  // namespace device
