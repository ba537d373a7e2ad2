#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "device/LocalDevice.h"

namespace tests {

/// What a device and the plug-in object on it carry from one sync or restore to the next.
struct World {
  explicit World(std::string process) : process(std::move(process)) { startAnew(); }

  /// What the device knows about an app.
  struct App {
    bool installed = false;
    bool placeholder = false;
    device::StoreInstall facts = noFacts();
    std::string coordinator{};  // its kind; empty: none
    bool own = false;           // it is client 3's
    bool observed = false;      // by the plug-in object itself
    // What it holds.
    bool options = false;
    bool initialPromises = false;
    bool asset = false;
    bool attached = false;  // its placeholder

    /// "installed", "placeholder", "updating"; empty when nothing is shown of it.
    std::string state() const;
    void leaveCoordinator();
    static device::StoreInstall noFacts() {
      device::StoreInstall facts;
      facts.installType = 0;
      facts.hasProgress = false;
      return facts;
    }
  };

  /// Another plug-in object takes the place of the one before, on the same device or on that device opened again.
  void startAnew();
  void clearSyncData();
  /// Whether the plug-in is told of what becomes of the app's coordinator.
  bool hears(const std::string& id) const;
  bool installed(const std::string& id) const { return apps.count(id) != 0 && apps.at(id).installed; }
  void show(const std::string& id);
  void attach(const std::string& id, std::uint64_t type, bool hasProgress);
  void remove(const std::string& id);
  void endCoordinator(const std::string& id);

  std::string process;
  // The device's.
  std::map<std::string, App> apps{};
  std::vector<std::string> layout{};
  std::vector<std::string> shown{};  // in the order in which they came
  std::set<std::string> uninstalled{};
  bool hasList = false;
  std::map<std::string, std::string> marks{};
  // The plug-in object's.
  std::set<std::string> updating{};
  std::set<std::string> cancelled{};                // by the person, as far as it knows
  std::set<std::string> awaited{};                  // placeholders of a restore
  std::optional<std::set<std::string>> lookedUp{};  // the uninstalled list as it was read
  bool finishedWaiting = false;
};

}  // namespace tests
