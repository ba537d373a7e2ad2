#pragma once

#include <string>

#include "platform/HomeScreen.h"
#include "platform/Mutex.h"

namespace tiny {

/// Keeps the layout it is given and answers it as one list.
class HomeScreen final : public platform::HomeScreen {
 public:
  Port PNSPanelloBlockableServerPort() override { return 1; }
  int PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) override;
  int PNSetIconState(Port port, platform::BytesView layout) override;

 private:
  platform::Mutex _mutex;
  platform::Value _order = platform::Value::makeArray();  // identifiers; guarded by _mutex
};

}  // namespace tiny
