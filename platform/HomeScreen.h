#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/Value.h"

namespace platform {

/// The home screen. Callable from any thread.
class HomeScreen {
 public:
  using Port = std::uint32_t;

  virtual ~HomeScreen() = default;

  virtual Port PNSPanelloBlockableServerPort() = 0;
  /// The current icon order as a property list in a buffer that the caller gives back with
  /// `Process::deallocateMemory`. 0 on success; the buffer stays null when there is no order. `form` is 1.
  virtual int PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) = 0;
  /// Replaces the icon layout. 0 on success; otherwise nothing has changed.
  virtual int PNSetIconState(Port port, BytesView layout) = 0;
};

}  // namespace platform
