#pragma once

#include <atomic>
#include <cstddef>

#include "device/install/PackageInstall.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// The install of a package that has arrived and waits for its turn on the coordination lane. Its package can be
/// unpacked before that, on a thread beside the lanes, so that one app's files are written while the install of the one
/// before is recorded. Nobody hears of that, and nothing but a container that no record names is there of it until its
/// turn comes.
///
/// `unpack` runs on one thread at most, `install` or `discard` on one, once.
class InstallAhead {
 public:
  /// `unsettled` counts what was unpacked and neither installed nor discarded; it outlives this.
  InstallAhead(const InstallParts& parts, CoordinatorRef coordinator, std::atomic<std::size_t>& unsettled)
      : _parts(parts), _coordinator(std::move(coordinator)), _unsettled(unsettled) {}

  /// Unpacks what the coordinator asks for at the moment. Does nothing once its turn has come.
  void unpack(InstallRequest request) EXCLUDES(_mutex, recordsGuard);
  /// Its turn: installs what was unpacked, or unpacks it now.
  void install() EXCLUDES(_mutex, recordsGuard);
  /// Its turn, and it is not to be installed now.
  void discard() EXCLUDES(_mutex, recordsGuard);

 private:
  enum class State : std::uint8_t { waits, unpacks, unpacked, taken };

  struct Unpacked {
    UnpackedApp files;
    InstallRequest request;
  };

  /// Nothing when it has not been unpacked.
  std::optional<Unpacked> take() EXCLUDES(_mutex);
  void remove(const Unpacked& unpacked);

  const InstallParts& _parts;
  const CoordinatorRef _coordinator;
  std::atomic<std::size_t>& _unsettled;

  platform::Mutex _mutex;
  platform::Condition _changed;
  State _state GUARDED_BY(_mutex) = State::waits;
  std::optional<Unpacked> _unpacked GUARDED_BY(_mutex);
};

}  // namespace device
