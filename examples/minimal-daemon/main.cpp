// A host of the plug-in with a device of its own: loads the plug-in and syncs two apps, one of which never arrives.
//
// usage: minimal-daemon [libApplicationSync.so [RECORDING]]

#include <dlfcn.h>

#include <cstdio>
#include <functional>
#include <memory>

#include "TinyDevice.h"
#include "platform/Plugin.h"
#include "record/RecordingPlatform.h"

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

// One sync. The host's files lie in the staging directory already. `installed` returns when the installs have ended.
bool sync(platform::TSClient& plugin, const Receive& receive, const std::function<void()>& installed) {
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
  installed();
  plugin.syncEndedWithSuccess(arrived);
  return arrived;
}

constexpr const char* todoList = R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0"><array>
  <dict>
    <key>identifier</key><string>com.example.maps</string>
    <key>operation</key><string>install</string>
    <key>version</key><string>1.0</string>
    <key>name</key><string>Maps</string>
    <key>artist</key><string>Example Works</string>
    <key>genre</key><string>Travel</string>
    <key>size</key><integer>262144</integer>
    <key>purchased</key><date>2024-02-29T12:00:00Z</date>
    <key>languages</key><array><string>en</string><string>de</string></array>
    <key>family</key><false/>
  </dict>
  <dict>
    <key>identifier</key><string>com.example.notes</string>
    <key>operation</key><string>install</string>
    <key>version</key><string>1.0</string>
    <key>name</key><string>Notes</string>
  </dict>
</array></plist>)";

constexpr const char* mapsPackage = R"(<plist version="1.0"><dict>
  <key>KBBundleIdentifier</key><string>com.example.maps</string>
  <key>KBBundleVersion</key><string>1.0</string>
</dict></plist>)";

/// The app's package as the host sends it, put where the device finds it; the reason if it does not come.
platform::ErrorRef send(tiny::MemoryFiles& files, platform::TSAsset& asset) {
  if (asset.identifier() != "com.example.maps") return platform::makeError("Example", 1, "no such package");
  const std::string path = "/var/mobile/Media/PublicStaging/Packages/" + asset.identifier() + ".pkg";
  platform::ErrorRef error;
  files.writeAtomically(path, mapsPackage, &error);
  asset.setPath(path);
  return error;
}

void tell(tiny::TinyDevice& device) {
  for (const char* app : {"com.example.maps", "com.example.notes"}) {
    std::printf("%s is %s\n", app, device.registry().applicationIsInstalled(app) ? "installed" : "not installed");
  }
}

int main(int count, char** arguments) {
  tiny::TinyDevice device;
  tiny::MemoryFiles& files = device.files();
  constexpr const char* staging = "/var/mobile/Media/PublicStaging/ApplicationSync";
  files.createDirectory(staging, true, {});
  files.createDirectory("/var/mobile/Media/PublicStaging/Packages", true, {});
  files.writeAtomically(std::string(staging) + "/ApplicationsSync.plist", todoList);

  const char* library = count > 1 ? arguments[1] : PLUGIN;
  std::unique_ptr<record::RecordingPlatform> recording;
  std::shared_ptr<platform::TSClient> plugin;
  if (count > 2) {
    recording = record::recordingPlatform(device.platform(), record::makeFileSink(arguments[2]));
    plugin = recording->makeClient([&](const platform::Platform& recorded) { return loadPlugin(library, recorded); });
  } else {
    plugin = loadPlugin(library, device.platform());
  }
  if (!plugin) {
    std::fprintf(stderr, "%s: no plug-in of this interface's version\n", library);
    return 1;
  }
  // The daemon has started: from now on the plug-in hears what becomes of its installs.
  device.platform().notifications.notify_post("com.vantor.tsd.TSStartupCompleteNotification");
  device.events().deliver();

  bool all = sync(
      *plugin,
      [&](platform::TSAsset& asset, const platform::TSProgressCallback& progress) -> platform::ErrorRef {
        std::printf("asked for %s, shown as \"%s\"\n", asset.identifier().c_str(),
                    asset.prettyName().value_or("").c_str());
        progress(0.5);
        return send(files, asset);
      },
      [&] { device.events().deliver(); });

  tell(device);
  plugin.reset();
  device.events().deliver();  // what is still on its way ends before the services do
  return all ? 0 : 3;
}
