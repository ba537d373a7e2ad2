#include "bench/Phone.h"

#include <time.h>

#include <stdexcept>

#include "bench/TodoList.h"
#include "core/AppsClient.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/NotificationCenter.h"
#include "plist/PropertyList.h"

namespace bench {

using platform::Bytes;
using platform::Value;

Phone::Phone() : _device(device::makeMemoryDevice(device::makeThreadedEventQueue(), {})) { start(); }

Phone::Phone(const std::string& folder) {
  platform::ErrorRef error;
  _device = device::openDevice(folder, device::makeThreadedEventQueue(), {}, &error);
  if (!_device) throw std::runtime_error(error->describe());
  start();
}

Phone::~Phone() {
  _plugin = nullptr;
  _device->events().drain();
  _device->events().stop();
}

void Phone::start() {
  _plugin = appsync::AppsClient::init(platform());
  platform().notifications.notify_post(std::string(platform::startupNotificationName));
  _device->events().drain();
}

void Phone::write(const std::string& path, const Bytes& content) {
  auto& files = _device->files();
  files.createDirectory(path.substr(0, path.rfind('/')), true, {});
  if (!files.createFile(path, content, {})) throw std::runtime_error("cannot write " + path);
}

void Phone::stageApps(std::size_t count) {
  const Value list = makeTodoList(count);
  write(std::string(platform::todoListPath), plist::writeBinary(list).value());
  for (const Value& element : *list.array()) {
    const auto& entry = *element.dictionary();
    std::string folder = std::string(platform::workArea) + '/' + std::string(*entry["identifier"].string());
    Value manifest = Value::makeDictionary(), metadata = Value::makeDictionary();
    manifest.dictionary()->set("KBBundleIdentifier", entry["identifier"]);
    manifest.dictionary()->set("KBBundleVersion", entry["version"]);
    manifest.dictionary()->set("KBBundleDisplayName", entry["name"]);
    metadata.dictionary()->set("itemName", entry["name"]);
    write(folder + "/Info.plist", plist::writeBinary(manifest).value());
    write(folder + '/' + std::string(platform::storeMetadataFileName), plist::writeBinary(metadata).value());
  }
}

static double processorSeconds() {
  timespec now{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

double Phone::askForPackages(std::vector<platform::TSAssetRef>& assets) {
  double begin = processorSeconds();
  assets = _plugin->outstandingAssetTransfers();
  _device->events().drain();
  return processorSeconds() - begin;
}

}  // namespace bench
