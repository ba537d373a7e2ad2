#include "tsd/daemon/PackageTransfer.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "platform/DevicePaths.h"
#include "tsd/CommandError.h"

namespace tsd {

using platform::ErrorRef;

namespace {

constexpr std::uint64_t leastChunk = std::uint64_t{16} << 10;
constexpr std::uint64_t largestChunk = std::uint64_t{1} << 20;
constexpr std::uint64_t chunksPerPackage = 32;

ErrorRef transferError(const std::string& description, ErrorRef underlying = nullptr) {
  return platform::makeError("Transfer", 1, description, std::move(underlying));
}

ErrorRef cancelledError() { return transferError("cancelled on the device"); }

std::string relativePath(const std::string& path) { return path.substr(platform::publicStagingDirectory.size() + 1); }

}  // namespace

PackageTransfer::Result PackageTransfer::carry(const Way& way) {
  try {
    return carryInOrder(way);
  } catch (const std::exception& problem) {
    try {
      auto error = transferError(problem.what());
      return _completed ? Result{End::failed, error, 0} : fail(way, End::failed, error);
    } catch (const std::exception&) {
      return {End::failed, nullptr, 0};
    }
  }
}

PackageTransfer::Result PackageTransfer::carryInOrder(const Way& way) {
  const std::string& id = identifier();
  if (_reported.isDownload) _asset->setIsDownload(*_reported.isDownload);
  if (_reported.isRestore) _asset->setIsRestore(*_reported.isRestore);
  _asset->setCompletedAssetParts(_reported.completedAssetParts.value_or(platform::kTSAssetPartApplication));
  if (_cancelled) return fail(way, End::cancelled, cancelledError());
  if (!isFileName(id)) {
    return fail(way, End::failed, transferError("the identifier cannot be a package's name"));
  }
  ErrorRef error;
  std::string file = id + ".pkg";
  auto package = HostFile::open(way.packagesFolder, file, &error);
  if (!package) {
    return fail(way, End::failed, transferError(way.packagesFolder + "/" + file + ": " + textOf(error), error));
  }
  return send(way, *package, std::string(platform::packagesDirectory) + "/" + file);
}

PackageTransfer::Result PackageTransfer::send(const Way& way, HostFile& package, const std::string& path) {
  auto& files = way.device.files();
  ErrorRef error;
  if (files.fileExists(path)) files.removeItem(path);
  auto target = files.createNew(path, false, &error);
  if (!target) return fail(way, End::failed, transferError(path + ": " + textOf(error), error));
  Result sent = sendChunks(way, package, *target);
  // Not flushed: the package is unpacked and removed at once, and after a loss of power in between the host sends it
  // again.
  if (sent.end == End::arrived && !target->close(false, &error)) {
    sent = {End::failed, transferError(path + ": " + textOf(error), error), sent.bytes};
  }
  target.reset();
  switch (sent.end) {
    case End::arrived:
      return complete(way, path, sent.bytes);
    case End::failed:
    case End::cancelled:
      files.removeItem(path);
      return fail(way, sent.end, sent.error);
    default:
      return sent;
  }
}

/// Moves the bytes; reports nothing but progress.
PackageTransfer::Result PackageTransfer::sendChunks(const Way& way, HostFile& package, device::FileWriter& target) {
  using Action = device::InjectionRule::Action;
  const std::string& id = identifier();
  std::uint64_t size = package.size();
  platform::Bytes chunk(std::clamp(size / chunksPerPackage, leastChunk, largestChunk), '\0');
  Result result{End::arrived, nullptr, 0};
  ErrorRef error;
  while (true) {
    if (way.stop.requested()) return {End::interrupted, nullptr, result.bytes};
    auto ordered = way.device.boundary().atTransfer(id);
    if (_cancelled) return {End::cancelled, cancelledError(), result.bytes};
    if (ordered && ordered->action == Action::fail) {
      return {End::failed, transferError("injected at transfer"), result.bytes};
    }
    if (ordered && ordered->action == Action::none) return {End::stalled, nullptr, result.bytes};
    auto bytes = package.readInto(chunk, &error);
    if (!bytes || !target.write(*bytes, &error))
      return {End::failed, transferError(textOf(error), error), result.bytes};
    if (ordered && ordered->action == Action::killAfter) way.device.boundary().die();
    result.bytes += bytes->size();
    double fraction = size == 0 ? 1 : std::min(1.0, static_cast<double>(result.bytes) / static_cast<double>(size));
    if (!bytes->empty() || size == 0) {
      _asset->setDownloadProgress(static_cast<float>(fraction));
      way.daemon.assetTransferUpdatedProgress(_asset, fraction);
      way.progress.sending(id, fraction);
    }
    if (ordered && ordered->action == Action::error) {
      return {End::failed, transferError("injected at transfer"), result.bytes};
    }
    if (_reported.stall && fraction >= 0.5) return {End::stalled, nullptr, result.bytes};
    if (bytes->empty() || result.bytes >= size) return result;
  }
}

PackageTransfer::Result PackageTransfer::complete(const Way& way, const std::string& path, std::uint64_t bytes) {
  using Path = AssetReport::Path;
  switch (_reported.path) {
    case Path::absolute:
      _asset->setPath(path);
      break;
    case Path::relative:
      _asset->setPath(relativePath(path));
      break;
    case Path::text:
      _asset->setPath(_reported.pathText);
      break;
    case Path::none:
    case Path::recorded:
      _asset->setPath(std::nullopt);
      break;
  }
  way.progress.installing(identifier());
  _completed = true;
  way.daemon.assetTransferSucceeded(_asset, true, nullptr);
  return {End::arrived, nullptr, bytes};
}

PackageTransfer::Result PackageTransfer::fail(const Way& way, End end, const ErrorRef& error) {
  _completed = true;
  way.daemon.assetTransferSucceeded(_asset, false, error);
  return {end, error, 0};
}

}  // namespace tsd
