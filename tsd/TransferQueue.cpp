#include "tsd/TransferQueue.h"

#include <algorithm>

#include "tsd/CommandError.h"
#include "tsd/FileConduit.h"

namespace tsd {

using platform::ErrorRef;

namespace {

constexpr std::uint64_t leastChunk = std::uint64_t{16} << 10;
constexpr std::uint64_t largestChunk = std::uint64_t{1} << 20;
constexpr std::uint64_t chunksPerPackage = 32;

ErrorRef transferError(const std::string& description, ErrorRef underlying = nullptr) {
  return platform::makeError("Transfer", 1, description, std::move(underlying));
}

std::string relativePath(const std::string& path) {
  constexpr std::string_view base = "/var/mobile/Media/PublicStaging/";
  return path.substr(base.size());
}

}  // namespace

TransferQueue::TransferQueue(Setup setup, Progress& progress, const StopSignal& stop)
    : _setup(std::move(setup)), _progress(progress), _stop(stop) {}

TransferQueue::~TransferQueue() { finish(); }

void TransferQueue::start(device::LocalDevice& device, Daemon& daemon,
                          const std::vector<platform::TSAssetRef>& assets) {
  ErrorRef error;
  if (!assets.empty() && !device.files().createDirectory(packagesDirectory, true, {}, &error)) {
    throw CommandError("the directory for packages: " + textOf(error));
  }
  _device = &device;
  _daemon = &daemon;
  std::lock_guard lock(_mutex);
  _waiting.clear();
  _transfers.clear();
  for (const auto& asset : assets) {
    auto transfer = std::make_shared<Transfer>();
    transfer->asset = asset;
    _waiting.push_back(transfer);
    _transfers[asset->identifier()] = transfer;
  }
  _working = std::min(_setup.inFlight, assets.size());
  for (std::size_t number = 1; number <= _working; ++number) _threads.emplace_back([this, number] { work(number); });
}

bool TransferQueue::waitUntil(platform::Clock::Instant deadline) {
  if (!_device) return true;
  std::unique_lock lock(_mutex);
  return _device->events().clock().waitUntil(lock, _ended, deadline, [this] { return _working == 0; });
}

void TransferQueue::finish() {
  for (auto& thread : _threads) thread.join();
  _threads.clear();
}

TransferQueue::Result TransferQueue::result(const std::string& identifier) const {
  std::lock_guard lock(_mutex);
  auto place = _transfers.find(identifier);
  return place == _transfers.end() ? Result{} : place->second->result;
}

const AssetReport& TransferQueue::report(const std::string& identifier) const {
  static const AssetReport ordinary;
  auto place = _setup.reports.find(identifier);
  return place == _setup.reports.end() ? ordinary : place->second;
}

void TransferQueue::prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(ErrorRef)> completion) {
  ErrorRef error;
  {
    std::lock_guard lock(_mutex);
    auto place = std::find_if(_waiting.begin(), _waiting.end(), [&](const TransferRef& each) {
      return each->asset->identifier() == asset->identifier();
    });
    if (place != _waiting.end()) {
      TransferRef transfer = *place;
      _waiting.erase(place);
      _waiting.push_front(std::move(transfer));
    } else if (!_transfers.count(asset->identifier())) {
      error = transferError("no transfer of " + asset->identifier() + " is outstanding");
    }
  }
  if (!completion || !_device) return;
  _device->events().post(device::Lane::notification,
                         [completion = std::move(completion), error] { completion(error); });
}

void TransferQueue::cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) {
  std::lock_guard lock(_mutex);
  auto place = _transfers.find(asset->identifier());
  if (place != _transfers.end()) place->second->cancelled = true;
}

void TransferQueue::work(std::size_t number) {
  device::ThreadName name("transfer-" + std::to_string(number));
  while (TransferRef transfer = takeNext()) {
    Result result;
    try {
      result = carry(*transfer);
    } catch (const std::exception& problem) {
      result = fail(*transfer, End::failed, transferError(problem.what()));
    }
    std::lock_guard lock(_mutex);
    transfer->result = std::move(result);
  }
  device::EventQueue::release();
  std::lock_guard lock(_mutex);
  --_working;
  _ended.notify_all();
}

TransferQueue::TransferRef TransferQueue::takeNext() {
  std::lock_guard lock(_mutex);
  if (_waiting.empty() || _stop.requested()) return nullptr;
  TransferRef transfer = _waiting.front();
  _waiting.pop_front();
  return transfer;
}

TransferQueue::Result TransferQueue::carry(Transfer& transfer) {
  const std::string& id = transfer.asset->identifier();
  const AssetReport& reported = report(id);
  if (reported.isDownload) transfer.asset->setIsDownload(*reported.isDownload);
  if (reported.isRestore) transfer.asset->setIsRestore(*reported.isRestore);
  transfer.asset->setCompletedAssetParts(reported.completedAssetParts.value_or(platform::kTSAssetPartApplication));
  if (!isFileName(id)) {
    return fail(transfer, End::failed, transferError("the identifier cannot be a package's name"));
  }
  ErrorRef error;
  std::string file = id + ".pkg";
  auto package = HostFile::open(_setup.packagesFolder, file, &error);
  if (!package) {
    return fail(transfer, End::failed, transferError(_setup.packagesFolder + "/" + file + ": " + textOf(error), error));
  }
  return send(transfer, *package, std::string(packagesDirectory) + "/" + file);
}

TransferQueue::Result TransferQueue::send(Transfer& transfer, HostFile& package, const std::string& path) {
  auto& files = _device->files();
  ErrorRef error;
  if (files.fileExists(path)) files.removeItem(path);
  auto target = files.createNew(path, false, &error);
  if (!target) return fail(transfer, End::failed, transferError(path + ": " + textOf(error), error));
  Result sent = sendChunks(transfer, package, *target);
  if (sent.end == End::arrived && (!target->close(false, &error) || !files.syncItem(path, &error))) {
    sent = {End::failed, transferError(path + ": " + textOf(error), error), sent.bytes};
  }
  target.reset();
  switch (sent.end) {
    case End::arrived:
      return complete(transfer, path, sent.bytes);
    case End::failed:
    case End::cancelled:
      files.removeItem(path);
      return fail(transfer, sent.end, sent.error);
    default:
      return sent;
  }
}

/// What became of the bytes alone; nothing but progress is reported here.
TransferQueue::Result TransferQueue::sendChunks(Transfer& transfer, HostFile& package, device::FileWriter& target) {
  using Action = device::InjectionRule::Action;
  const std::string& id = transfer.asset->identifier();
  std::uint64_t size = package.size();
  std::uint64_t chunk = std::clamp(size / chunksPerPackage, leastChunk, largestChunk);
  Result result{End::arrived, nullptr, 0};
  ErrorRef error;
  while (true) {
    if (_stop.requested()) return {End::interrupted, nullptr, result.bytes};
    auto ordered = _device->boundary().atTransfer(id);
    if (transfer.cancelled) return {End::cancelled, transferError("cancelled on the device"), result.bytes};
    if (ordered && ordered->action == Action::fail) {
      return {End::failed, transferError("injected at transfer"), result.bytes};
    }
    if (ordered && ordered->action == Action::none) return {End::stalled, nullptr, result.bytes};
    auto bytes = package.read(static_cast<std::size_t>(chunk), &error);
    if (!bytes || !target.write(*bytes, &error))
      return {End::failed, transferError(textOf(error), error), result.bytes};
    if (ordered && ordered->action == Action::killAfter) device::Boundary::die();
    result.bytes += bytes->size();
    double fraction = size == 0 ? 1 : std::min(1.0, static_cast<double>(result.bytes) / static_cast<double>(size));
    if (!bytes->empty() || size == 0) {
      transfer.asset->setDownloadProgress(static_cast<float>(fraction));
      _daemon->assetTransferUpdatedProgress(transfer.asset, fraction);
      _progress.sending(id, fraction);
    }
    if (ordered && ordered->action == Action::error) {
      return {End::failed, transferError("injected at transfer"), result.bytes};
    }
    if (report(id).stall && fraction >= 0.5) return {End::stalled, nullptr, result.bytes};
    if (bytes->empty() || result.bytes >= size) return result;
  }
}

TransferQueue::Result TransferQueue::complete(Transfer& transfer, const std::string& path, std::uint64_t bytes) {
  using Path = AssetReport::Path;
  const AssetReport& reported = report(transfer.asset->identifier());
  switch (reported.path) {
    case Path::absolute:
      transfer.asset->setPath(path);
      break;
    case Path::relative:
      transfer.asset->setPath(relativePath(path));
      break;
    case Path::text:
      transfer.asset->setPath(reported.pathText);
      break;
    case Path::none:
    case Path::recorded:
      transfer.asset->setPath(std::nullopt);
      break;
  }
  _progress.installing(transfer.asset->identifier());
  _daemon->assetTransferSucceeded(transfer.asset, true, nullptr);
  return {End::arrived, nullptr, bytes};
}

TransferQueue::Result TransferQueue::fail(Transfer& transfer, End end, const ErrorRef& error) {
  _daemon->assetTransferSucceeded(transfer.asset, false, error);
  return {end, error, 0};
}

}  // namespace tsd
