#include "tsd/daemon/TransferQueue.h"

#include <algorithm>
#include <new>
#include <utility>

#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"
#include "tsd/StartThread.h"

namespace tsd {

using platform::ErrorRef;
using Lock = platform::Mutex::Lock;

TransferQueue::TransferQueue(Setup setup, Progress& progress, StopSignal& stop)
    : _setup(std::move(setup)), _progress(progress), _stop(stop), _stopped(stop, [this] {
        Lock lock(_mutex);
        _changed.notifyAll();
      }) {
  try {
    _threads.reserve(_setup.inFlight);
    for (std::size_t number = 1; number <= _setup.inFlight; ++number) {
      _threads.push_back(startThread([this, number] { work(number); }));
    }
  } catch (...) {
    endThreads();
    throw;
  }
}

TransferQueue::~TransferQueue() { endThreads(); }

void TransferQueue::endThreads() {
  {
    Lock lock(_mutex);
    _over = true;
    _changed.notifyAll();
  }
  for (auto& thread : _threads) thread.join();
}

TransferQueue::Serving::Serving(TransferQueue& queue, device::LocalDevice& device, Daemon& daemon) : _queue(queue) {
  Lock lock(_queue._mutex);
  _queue._device = &device;
  _queue._daemon = &daemon;
}

TransferQueue::Serving::~Serving() {
  _queue.finish();
  Lock lock(_queue._mutex);
  _queue._device = nullptr;
  _queue._daemon = nullptr;
}

void TransferQueue::expect() {
  Lock lock(_mutex);
  _expects = true;
  _unwanted.clear();
  _transfers.clear();
  _results.clear();
}

void TransferQueue::start(const std::vector<platform::TSAssetRef>& assets) {
  Lock lock(_mutex);
  device::LocalDevice& device = *_device;
  lock.unlock();
  ErrorRef error;
  if (!assets.empty() && !device.files().createDirectory(platform::packagesDirectory, true, {}, &error)) {
    throw CommandError("the directory for packages: " + textOf(error));
  }
  lock.lock();
  for (const auto& asset : assets) {
    auto transfer = std::make_shared<PackageTransfer>(asset, report(asset->identifier()));
    if (_unwanted.contains(asset->identifier())) transfer->cancel();
    _results[asset->identifier()] = {};  // so that its thread finds a place for the result
    _waiting.push_back(transfer);
    _transfers[asset->identifier()] = std::move(transfer);
  }
  for (const auto& wish : std::exchange(_wishes, {})) answer(wish, moveToFront(wish.identifier), device);
  _expects = false;
  _working = _taking = std::min(_setup.inFlight, assets.size());
  _runsAhead = false;
  ++_round;
  _changed.notifyAll();
}

TransferQueue::Progression TransferQueue::waitUntil(platform::Clock::Instant deadline) {
  Lock lock(_mutex);
  if (!_device) return Progression::ended;
  _device->events().clock().waitUntil(_mutex, _changed, deadline, [this]() REQUIRES(_mutex) { return _working == 0; });
  if (_working == 0) return Progression::ended;
  return _blocked == _working && !hasRoom() ? Progression::waits : Progression::goesOn;
}

void TransferQueue::stopWaitingForOutcomes() {
  Lock lock(_mutex);
  _runsAhead = true;
  _changed.notifyAll();
}

void TransferQueue::finish() {
  Lock lock(_mutex);
  _waiting.clear();
  _changed.notifyAll();
  _expects = false;
  for (const auto& wish : std::exchange(_wishes, {})) answer(wish, false, *_device);
  _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return _working == 0; });
  _transfers.clear();
}

TransferQueue::Result TransferQueue::result(const std::string& identifier) const {
  Lock lock(_mutex);
  auto place = _results.find(identifier);
  return place == _results.end() ? Result{} : place->second;
}

const AssetReport& TransferQueue::report(const std::string& identifier) const {
  static const AssetReport ordinary;
  auto place = _setup.reports.find(identifier);
  return place == _setup.reports.end() ? ordinary : place->second;
}

bool TransferQueue::moveToFront(const std::string& identifier) {
  auto place = std::find_if(_waiting.begin(), _waiting.end(),
                            [&](const TransferRef& each) { return each->identifier() == identifier; });
  if (place == _waiting.end()) return _transfers.count(identifier) != 0;
  std::rotate(_waiting.begin(), place, place + 1);
  return true;
}

void TransferQueue::answer(const Wish& wish, bool outstanding, device::LocalDevice& device) const {
  if (!wish.completion) return;
  ErrorRef error;
  if (!outstanding) {
    error = platform::makeError("Transfer", 1, "no transfer of " + wish.identifier + " is outstanding");
  }
  device.events().post(device::Lane::notification, [completion = wish.completion, error] { completion(error); });
}

void TransferQueue::prioritizeAsset(const platform::TSAssetRef& asset, Completion completion) {
  Wish wish{asset->identifier(), std::move(completion)};
  Lock lock(_mutex);
  if (!_device) return;
  if (_expects)
    _wishes.push_back(std::move(wish));
  else
    answer(wish, moveToFront(wish.identifier), *_device);
}

void TransferQueue::cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) {
  Lock lock(_mutex);
  if (_expects) _unwanted.insert(asset->identifier());
  auto place = _transfers.find(asset->identifier());
  if (place != _transfers.end()) place->second->cancel();
}

void TransferQueue::work(std::size_t number) {
  device::ThreadName name("transfer-" + std::to_string(number));
  std::uint64_t round = 0;
  Lock lock(_mutex);
  while (true) {
    _changed.wait(_mutex, [&]() REQUIRES(_mutex) { return _over || (_round != round && number <= _taking); });
    if (_over) return;
    round = _round;
    const PackageTransfer::Way way{
        .packagesFolder = _setup.packagesFolder,
        .device = *_device,
        .daemon = *_daemon,
        .progress = _progress,
        .stop = _stop,
    };
    lock.unlock();
    while (TransferRef transfer = takeNext()) {
      Result result = transfer->carry(way);
      Lock resultLock(_mutex);
      _results[transfer->identifier()] = std::move(result);
      resultLock.unlock();
      settleLater(way.device.events());
    }
    device::EventQueue::release();
    lock.lock();
    --_working;
    _changed.notifyAll();
  }
}

TransferQueue::TransferRef TransferQueue::takeNext() {
  Lock lock(_mutex);
  ++_blocked;
  _changed.wait(_mutex, [this]() REQUIRES(_mutex) { return hasRoom() || _waiting.empty() || _stop.requested(); });
  --_blocked;
  if (_waiting.empty() || _stop.requested()) return nullptr;
  TransferRef transfer = std::move(_waiting.front());
  _waiting.pop_front();
  ++_unsettled;
  return transfer;
}

/// A package that has arrived is installed by an event that is posted by now, and the plug-in is told of the outcome by
/// one which that posts: both have run, or never will, when an event that was posted behind each has.
void TransferQueue::settleLater(device::EventQueue& events) {
  device::EventQueue::release();
  try {
    events.post(device::Lane::coordination, [this, &events] {
      try {
        events.post(device::Lane::coordination, [this] { settle(); });
      } catch (const std::bad_alloc&) {
        settle();
      }
    });
  } catch (const std::bad_alloc&) {
    settle();
  }
}

void TransferQueue::settle() {
  Lock lock(_mutex);
  --_unsettled;
  _changed.notifyAll();
}

}  // namespace tsd
