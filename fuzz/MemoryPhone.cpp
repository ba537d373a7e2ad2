#include "fuzz/MemoryPhone.h"

#include <algorithm>
#include <map>
#include <set>

#include "fuzz/Require.h"
#include "plist/PropertyList.h"
#include "tsd/daemon/PluginLoader.h"

namespace fuzz {
namespace {

/// What may lie in the folders above those that belong to the plug-in or to an app.
const std::map<std::string, std::set<std::string>> places = {
    {"/", {"var"}},
    {"/var", {"containers", "mobile"}},
    {"/var/containers", {"Bundle"}},
    {"/var/containers/Bundle", {"Application"}},
    {"/var/mobile", {"Library", "Media", "tmp"}},
    {"/var/mobile/tmp", {"com.vantor.tsd.Apps"}},
    {"/var/mobile/Library", {"ApplicationSync", "Logs", "Preferences"}},
    {"/var/mobile/Library/ApplicationSync",
     {"AssetSortOrder.plist", "HarluneStuff", "Icons", "LastSyncAppState.plist", "RestoreState.plist"}},
    {"/var/mobile/Library/Logs", {"MediaServices"}},
    {"/var/mobile/Library/Logs/MediaServices", {"RestoreApplications.plist"}},
    {"/var/mobile/Library/Preferences", {"com.vantor.Cellarum.DemotedApps.plist"}},
    {"/var/mobile/Media", {"HarluneRestore", "PublicStaging"}},
    {"/var/mobile/Media/HarluneRestore", {"RestoreApplications.plist"}},
    {"/var/mobile/Media/PublicStaging", {"ApplicationSync", "Packages"}},
};

/// The operation's name comes first; what stands further behind may be anybody's text.
bool tellsOfException(std::string_view message) {
  std::size_t space = message.find(' ');
  return space != message.npos && message.substr(space).starts_with(" was stopped by an exception");
}

}  // namespace

MemoryPhone::MemoryPhone(std::string_view process) {
  device::DeviceOptions options;
  options.mainBundleIdentifier = process;
  // Listened to, so that every message is made.
  options.log = [](const device::LogRecord& record) {
    require(record.level != platform::LogLevel::error || !tellsOfException(record.message), record.message.c_str());
  };
  _device = device::makeMemoryDevice(device::makeManualEventQueue(), std::move(options));
  require(_device && _device->set("icon-size", "16"), "a device in memory");
  static const tsd::PluginLoader plugin{SHIPPED_PLUGIN};
  _client = plugin.create(_device->platform());
  _daemon = std::make_unique<tsd::Daemon>(*_device, *_client);
  _daemon->postStartupNotification();
}

MemoryPhone::~MemoryPhone() {
  deliver();
  _daemon = nullptr;
  _client = nullptr;
  deliver();
  _device->events().stop();
}

void MemoryPhone::write(const std::string& path, platform::BytesView content) {
  auto& files = _device->files();
  require(files.createDirectory(path.substr(0, path.rfind('/')), true, {}) && files.createFile(path, content, {}),
          path.c_str());
}

platform::Value MemoryPhone::readList(const std::string& path) {
  auto bytes = _device->files().readFile(path);
  return bytes ? plist::read(std::move(*bytes)) : platform::Value();
}

void MemoryPhone::requireNothingElsewhere() {
  for (const auto& [folder, names] : places) {
    auto entries = _device->files().list(folder);
    if (!entries) continue;
    for (const auto& entry : *entries) require(names.count(entry.name) != 0, (folder + '/' + entry.name).c_str());
  }
}

}  // namespace fuzz
