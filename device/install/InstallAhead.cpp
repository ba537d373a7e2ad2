#include "device/install/InstallAhead.h"

#include <exception>
#include <utility>

namespace device {

using Lock = platform::Mutex::Lock;

void InstallAhead::unpack(InstallRequest request) {
  {
    Lock lock(_mutex);
    if (_state != State::waits) return;
    _state = State::unpacks;
    ++_unsettled;
  }
  std::optional<Unpacked> unpacked;
  try {
    unpacked.emplace(Unpacked{{}, std::move(request)});
    unpacked->files = PackageInstall(_parts, _coordinator, unpacked->request).unpack();
  } catch (const std::exception&) {
    // It is tried again when its turn comes, and then told.
    unpacked.reset();
    --_unsettled;
  }
  Lock lock(_mutex);
  _unpacked = std::move(unpacked);
  _state = _unpacked ? State::unpacked : State::waits;
  _changed.notifyAll();
}

std::optional<InstallAhead::Unpacked> InstallAhead::take() {
  Lock lock(_mutex);
  _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return _state != State::unpacks; });
  _state = State::taken;
  return std::exchange(_unpacked, std::nullopt);
}

void InstallAhead::remove(const Unpacked& unpacked) {
  if (unpacked.files.app) _parts.containers.remove(unpacked.files.app->container);
  --_unsettled;
}

void InstallAhead::install() {
  auto unpacked = take();
  auto request = requestOf(_parts, _coordinator);
  if (unpacked && (!request || !request->needsTheSame(unpacked->request))) {
    remove(*unpacked);
    unpacked.reset();
  }
  if (!request) return;
  const bool wasAhead = unpacked.has_value();
  PackageInstall install(_parts, _coordinator, std::move(*request));
  install.finish(unpacked ? std::move(unpacked->files) : install.unpack(), nullptr);
  if (wasAhead) --_unsettled;
}

void InstallAhead::discard() {
  if (auto unpacked = take()) remove(*unpacked);
}

}  // namespace device
