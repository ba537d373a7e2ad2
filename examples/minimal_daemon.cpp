// The smallest host of the plug-in: loads it, and has it sync one app on a device in memory.
//
// usage: minimal_daemon libApplicationSync.so

#include <dlfcn.h>

#include <cstdio>
#include <functional>
#include <memory>

#include "device/LocalDevice.h"
#include "platform/NotificationCenter.h"
#include "platform/Plugin.h"

// Once per process. The library is never unloaded: completion handlers may outlive the plug-in object.
std::shared_ptr<platform::TSClient> loadPlugin(const char* file, const platform::Platform& device) {
  void* library = dlopen(file, RTLD_NOW | RTLD_LOCAL);
  void* symbol = library ? dlsym(library, platform::pluginEntryPointName) : nullptr;
  const auto* table = symbol ? reinterpret_cast<platform::PluginEntryPoint>(symbol)() : nullptr;
  if (!table || table->interfaceVersion != platform::pluginInterfaceVersion) return nullptr;
  return table->create(device);
}

// Gets one package from the host, tells how far it is, and sets the asset's path; an error when it did not arrive.
using Receive = std::function<platform::ErrorRef(platform::TSAsset&, const platform::TSProgressCallback&)>;

// One sync. The host's files lie in the staging directory already.
bool sync(platform::TSClient& plugin, const Receive& receive) {
  const platform::TSProgressCallback unheard = [](double) {};
  const std::string anchor = plugin.currentSyncAnchor();
  bool arrived = plugin.prepareForSyncWithHostAnchor(anchor, unheard);
  const platform::Value deleted = plugin.installedAssets();  // for the host: what the person removed
  if (plugin.reconcileSync(0, anchor, unheard)) {
    for (const auto& asset : plugin.outstandingAssetTransfers()) {
      platform::ErrorRef error = receive(*asset, [&](double fraction) {
        asset->setDownloadProgress(static_cast<float>(fraction));
        plugin.assetTransferUpdatedProgress(asset, fraction);
      });
      plugin.assetTransferSucceeded(asset, !error, error);
      arrived = arrived && !error;
    }
  } else {
    arrived = false;
  }
  plugin.assetTransferEndedWithSuccess(arrived);
  plugin.syncEndedWithSuccess(arrived);
  return arrived;
}

constexpr const char* todoList = R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0"><array><dict>
  <key>identifier</key><string>com.example.maps</string>
  <key>operation</key><string>install</string>
  <key>version</key><string>1.0</string>
  <key>name</key><string>Maps</string>
</dict></array></plist>)";

int main(int count, char** arguments) {
  if (count != 2) {
    std::fputs("usage: minimal_daemon libApplicationSync.so\n", stderr);
    return 2;
  }
  auto device = device::makeMemoryDevice(device::makeThreadedEventQueue(), {});
  const platform::Platform& services = device->platform();
  constexpr const char* staging = "/var/mobile/Media/PublicStaging/ApplicationSync";
  device->files().createDirectory(staging, true, {});
  device->files().writeAtomically(std::string(staging) + "/ApplicationsSync.plist", todoList);

  auto plugin = loadPlugin(arguments[1], services);
  if (!plugin) {
    std::fprintf(stderr, "%s: no plug-in of this interface's version\n", arguments[1]);
    return 1;
  }
  // The daemon has started: from now on the plug-in hears what becomes of its installs.
  services.notifications.notify_post("com.vantor.tsd.TSStartupCompleteNotification");
  device->events().drain();

  int asked = 0;
  bool done = sync(*plugin, [&](platform::TSAsset& asset, const platform::TSProgressCallback& progress) {
    std::printf("asked for %s, shown as \"%s\"\n", asset.identifier().c_str(), asset.prettyName().value_or("").c_str());
    ++asked;
    progress(0.5);
    return platform::makeError("Example", 1, "this host has no packages");
  });
  plugin.reset();
  device->events().drain();  // handlers that are still on their way end before the services do
  device->events().stop();
  return asked == 1 && !done ? 0 : 1;
}
