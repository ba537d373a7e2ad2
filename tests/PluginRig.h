#pragma once

#include <fstream>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Mutex.h"
#include "platform/TSClient.h"
#include "platform/TSDeviceService.h"
#include "platform/ThreadSafety.h"
#include "record/RecordingPlatform.h"
#include "tests/SampleContent.h"
#include "tests/SharedParts.h"
#include "tsd/daemon/Daemon.h"
#include "tsd/daemon/PluginLoader.h"

namespace tests {

using platform::Bytes;
using platform::ErrorRef;
using platform::TSAssetRef;
using platform::Value;

constexpr char pluginDirectory[] = "/var/mobile/Library/ApplicationSync";
constexpr char workArea[] = "/var/mobile/Library/ApplicationSync/HarluneStuff";
constexpr char todoListPath[] = "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist";
constexpr char lastSyncPath[] = "/var/mobile/Library/ApplicationSync/LastSyncAppState.plist";
constexpr char restoreStatePath[] = "/var/mobile/Library/ApplicationSync/RestoreState.plist";
constexpr char stagingDirectory[] = "/var/mobile/Media/PublicStaging/ApplicationSync";
constexpr char packagesDirectory[] = "/var/mobile/Media/PublicStaging/Packages";
constexpr char restoreListPath[] = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist";
constexpr char restoreLogPath[] = "/var/mobile/Library/Logs/MediaServices/RestoreApplications.plist";
constexpr char demotedAppsPath[] = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist";
constexpr char startupNotification[] = "com.vantor.tsd.TSStartupCompleteNotification";

/// Whether the text is the pattern, in which `*` stands for anything.
bool matches(std::string_view pattern, std::string_view text);

Value arrayOf(const std::vector<std::string>& elements);
Bytes binaryList(const Value& value);
const Bytes& iconImage();

/// The daemon's transfer queue as the device's services see it: remembers what it was asked for; what it can do is one
/// of the device's settings. From any thread.
class DaemonTransfers final : public platform::TSDeviceService {
 public:
  void serve(device::LocalDevice& device) { _device = &device; }

  bool respondsToPrioritizeAsset() const override { return _device->setting("device-service-prioritize") == "yes"; }
  void prioritizeAsset(const TSAssetRef& asset, std::function<void(ErrorRef)> completion) override;
  bool respondsToCancelAssetTransferForFailedAsset() const override {
    return _device->setting("device-service-cancel") == "yes";
  }
  void cancelAssetTransferForFailedAsset(const TSAssetRef& asset) override;

  void forget();
  std::vector<std::string> prioritized() const;
  bool wasCancelled(const std::string& identifier) const;
  /// Runs the completions that are due. True when there was one.
  bool complete();

 private:
  device::LocalDevice* _device = nullptr;
  mutable platform::Mutex _mutex;
  std::vector<std::string> _prioritized GUARDED_BY(_mutex);
  std::vector<std::string> _cancelled GUARDED_BY(_mutex);
  std::vector<std::function<void(ErrorRef)>> _completions GUARDED_BY(_mutex);
};

/// The plug-in, loaded from its library, on a device in memory, with a daemon around it that calls it and writes down
/// all that crosses.
class PluginRig {
 public:
  struct Options {
    std::string process = "com.vantor.tsd";
    std::vector<std::string> rules{};
    bool threaded = false;  // real threads and the real clock instead of delivery by hand
    bool journaled = true;
    std::function<void(const device::CallRecord&)> told{};  // each record as it is written
  };
  explicit PluginRig(const Options& options);
  PluginRig() : PluginRig(Options()) {}
  /// On a device of these parts instead of an empty one.
  PluginRig(const Options& options, std::unique_ptr<device::FileTree> files, std::unique_ptr<device::Store> store);
  ~PluginRig();
  PluginRig(const PluginRig&) = delete;
  PluginRig& operator=(const PluginRig&) = delete;

  device::LocalDevice& device() { return *_device; }
  SharedParts& parts() { return _parts; }
  const platform::Platform& platform() { return _device->platform(); }
  device::ManualEventQueue& events() { return *_manualEvents; }
  DaemonTransfers& transfers() { return _transfers; }
  const std::shared_ptr<platform::TSClient>& client() { return _client; }

  /// Makes the plug-in object, as the daemon does at its start. Done already by the constructor.
  void load();
  /// An object on a platform that stands before the device. It is recorded, like that of `load`, where
  /// APPSYNC_RECORDINGS names a folder.
  std::shared_ptr<platform::TSClient> makeClient(const platform::Platform& platform);
  /// Lets the plug-in object go, after everything under way has been delivered.
  void unload();
  /// Lets it go at once, whoever may be calling back.
  void forget() { _client = nullptr; }
  /// Ends the process and begins it anew, on the same device. Not with real threads.
  void reopen();
  /// In place of the rules there are, while nothing is under way. What has been written down is forgotten.
  void beginStep(const std::vector<std::string>& rules);
  void postStartup();
  /// Delivers everything that is due, also what follows from it.
  void deliver();

  /// The daemon's calls, and short forms of some of them.
  tsd::Daemon& daemon() { return *_daemon; }
  bool reconcileSync(ErrorRef* error = nullptr) { return _daemon->reconcileSync(1, "anchor", error); }
  bool reconcileRestore(std::int32_t type) { return _daemon->reconcileRestoreOfType(type, nullptr); }
  void progress(const TSAssetRef& asset, double fraction);
  void transferEnded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error = nullptr) {
    _daemon->assetTransferSucceeded(asset, succeeded, error);
  }

  // The device's files, below the boundary. Missing directories are made.
  void write(const std::string& path, const Bytes& content);
  std::optional<Bytes> read(const std::string& path);
  Value readList(const std::string& path);
  bool exists(const std::string& path);

  /// Stands for the app being there before: installed from a package.
  void install(const std::string& identifier, const std::string& version);
  /// Puts a package where the daemon receives it; the path.
  std::string receivePackage(const std::string& identifier, const Bytes& content);

  // What crossed, in order.
  const std::vector<device::CallRecord>& records() const { return _records; }
  /// The lines (see `lineOf`) that the daemon's thread caused inside the `nth` call of the operation, that one's own
  /// records left out. Messages alone, or calls and messages about one app.
  std::vector<std::string> messagesIn(std::string_view operation, std::size_t nth = 1) const;
  std::vector<std::string> traceIn(std::string_view operation, const std::string& app, std::size_t nth = 1) const;
  /// Every message, from whatever thread.
  std::vector<std::string> messages() const;
  std::size_t countOf(std::string_view operation, std::string_view app = {}) const;

 private:
  /// The one of the build, unless APPSYNC_PLUGIN names another.
  static std::string pluginFile();
  void open();
  void openJournal();
  std::vector<const device::CallRecord*> recordsIn(std::string_view operation, std::size_t nth) const;

  const Options _options;
  const tsd::PluginLoader _plugin{pluginFile()};
  SharedParts _parts;
  DaemonTransfers _transfers;
  std::vector<device::CallRecord> _records;  // written under the journal's lock
  std::ofstream _journal;                    // as well, where APPSYNC_JOURNALS names a folder
  device::ManualEventQueue* _manualEvents = nullptr;
  std::unique_ptr<device::LocalDevice> _device;
  std::vector<std::unique_ptr<record::RecordingPlatform>> _recordings;  // of all objects on the device
  std::shared_ptr<platform::TSClient> _client;
  std::optional<tsd::Daemon> _daemon;
};

/// A record of the journal as one line. A message: its text without the plug-in's prefix; "E " in front of it at error
/// level, "[15] " in front in another category than 8. A step of the transaction log: "step 1/1/2 y app text". Any
/// other call: "operation(arguments) = result ! error".
std::string lineOf(const device::CallRecord& record);

}  // namespace tests
