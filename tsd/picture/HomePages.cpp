#include "tsd/picture/HomePages.h"

#include <map>
#include <set>

#include "platform/IconRenderer.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/OBNumbers.h"
#include "platform/Platform.h"
#include "tsd/terminal/Output.h"

namespace tsd {
namespace {

namespace installType = platform::installType;

HomeLook lookOf(const device::AppStatus& app) {
  if (app.state == device::AppState::updating) return HomeLook::updating;
  if (app.state != device::AppState::placeholder) return HomeLook::installed;
  if (app.installType == installType::downgrade || app.installType == installType::intentionalDowngrade)
    return HomeLook::demoted;
  return app.installType == installType::restore ? HomeLook::restoring : HomeLook::waiting;
}

/// The icon as the device draws it; empty when it cannot.
platform::Bytes imageOf(const platform::Platform& services, const device::AppStatus& app) {
  auto proxy = services.workspace.applicationProxyForIdentifier(app.id, app.state == device::AppState::placeholder);
  if (!proxy || !proxy->bundleURL) return {};
  auto url = services.iconRenderer.KBURLCreateWithFileSystemPath(*proxy->bundleURL, true);
  auto bundle = url ? services.iconRenderer.KBBundleCreate(url) : nullptr;
  auto image = bundle ? services.iconRenderer.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(bundle) : nullptr;
  platform::Bytes bytes;
  auto encoder = image ? services.imageEncoder.QGImageDestinationCreateWithData(bytes, "public.png", 1) : nullptr;
  if (!encoder) return {};
  encoder->QGImageDestinationAddImage(image);
  return encoder->QGImageDestinationFinalize() ? bytes : platform::Bytes();
}

HomeIcon iconOf(const device::AppStatus& app) {
  return {app.id, app.name, lookOf(app), app.lastOutcome == device::InstallOutcome::failed, app.progress, {}};
}

}  // namespace

const char* nameOfLook(HomeLook look) {
  switch (look) {
    case HomeLook::installed:
      return "installed";
    case HomeLook::updating:
      return "updating";
    case HomeLook::waiting:
      return "waiting";
    case HomeLook::restoring:
      return "restoring";
    case HomeLook::demoted:
      return "demoted";
  }
  return "";
}

std::string labelOf(const HomeIcon& icon) {
  if (icon.name.find_first_not_of(" \t\r\n") != std::string::npos) return icon.name;
  std::string last = icon.id.substr(icon.id.rfind('.') + 1);
  return last.empty() ? icon.id : last;
}

std::size_t HomePages::countOf(HomeLook look) const {
  std::size_t count = 0;
  for (const auto& page : pages) {
    for (const auto& icon : page) count += icon.look == look;
  }
  return count;
}

std::size_t HomePages::icons() const {
  std::size_t count = 0;
  for (const auto& page : pages) count += page.size();
  return count;
}

HomePages readHomePages(device::LocalDevice& device, const device::DeviceStatus& status, std::size_t pageSize,
                        std::size_t pagesWithImages) {
  HomePages home;
  home.syncing = status.syncing != 0;
  std::map<std::string_view, const device::AppStatus*> apps;
  for (const auto& app : status.apps) {
    if (app.isOnDevice())
      apps.emplace(app.id, &app);
    else if (app.lastOutcome == device::InstallOutcome::failed)
      home.failed.push_back({app.id, reasonForPeople(app.lastReason)});
  }
  std::set<std::string_view> shown;
  bool opensPage = true;
  auto show = [&](const std::string& id) {
    auto app = apps.find(id);
    if (app == apps.end() || !shown.insert(app->first).second) return;
    if (opensPage || home.pages.empty() || home.pages.back().size() >= pageSize) home.pages.emplace_back();
    opensPage = false;
    home.pages.back().push_back(iconOf(*app->second));
    if (home.pages.size() <= pagesWithImages) home.pages.back().back().image = imageOf(device.platform(), *app->second);
  };
  for (const auto& page : status.pages) {
    opensPage = true;
    for (const auto& id : page) show(id);
  }
  // The others fill up the last page.
  opensPage = false;
  for (const auto& id : status.home) show(id);
  return home;
}

}  // namespace tsd
