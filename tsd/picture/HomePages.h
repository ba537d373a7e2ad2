#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/Value.h"

namespace tsd {

/// How an icon looks to the person.
enum class HomeLook : std::uint8_t {
  installed,
  updating,   // installed, and a newer version is on its way
  waiting,    // a placeholder whose package is on its way
  restoring,  // a placeholder that the store is to deliver
  demoted,    // a placeholder until the person wants the app
};
constexpr std::size_t homeLooks = 5;
/// "installed", "updating", …
const char* nameOfLook(HomeLook look);

struct HomeIcon {
  std::string id;
  std::string name;  // empty for a placeholder without one
  HomeLook look = HomeLook::installed;
  bool failed = false;    // its last install did
  double progress = 0;    // 0…1, of an app that is updating or waiting
  platform::Bytes image;  // PNG; empty if the app has none that can be drawn, or none was asked for
};

/// The text under the icon: the name or, when that is blank, the last part of the identifier.
std::string labelOf(const HomeIcon& icon);

/// An app that is not on the home screen because its install failed.
struct FailedApp {
  std::string id;
  std::string reason;
};

/// The home screen as the device's services describe it.
struct HomePages {
  std::vector<std::vector<HomeIcon>> pages;  // none of them empty
  std::vector<FailedApp> failed;
  bool syncing = false;

  std::size_t countOf(HomeLook look) const;
  std::size_t icons() const;
};

/// The apps in the order of the host's layout, then those that it does not name; a page of the layout with more than
/// `pageSize` apps continues on another one. `status` is the device's. Images are those of the first `pagesWithImages`
/// pages.
HomePages readHomePages(device::LocalDevice& device, const device::DeviceStatus& status, std::size_t pageSize,
                        std::size_t pagesWithImages);

}  // namespace tsd
