#include "tests/World.h"

#include <algorithm>

namespace tests {

void World::startAnew() {
  updating.clear();
  cancelled.clear();
  awaited.clear();
  lookedUp.reset();
  finishedWaiting = process == "com.vantor.tsd";
  for (auto& [id, app] : apps) app.observed = false;
}

void World::clearSyncData() {
  hasList = false;
  marks.clear();
  std::vector<std::string> placeholders;
  for (const auto& [id, app] : apps) {
    if (app.placeholder) placeholders.push_back(id);
  }
  for (const auto& id : placeholders) {
    if (hears(id)) cancelled.insert(id);
    if (hears(id)) awaited.erase(id);
    remove(id);
  }
  uninstalled.clear();
}

bool World::hears(const std::string& id) const {
  auto app = apps.find(id);
  if (app == apps.end() || !app->second.own || app->second.coordinator.empty()) return false;
  return app->second.observed || process == "com.vantor.tsd";
}

void World::show(const std::string& id) {
  if (std::find(shown.begin(), shown.end(), id) == shown.end()) shown.push_back(id);
}

void World::attach(const std::string& id, std::uint64_t type, bool hasProgress) {
  auto& app = apps[id];
  app.attached = true;
  app.facts.installState = 1;
  app.facts.installPhase = 0;
  app.facts.paused = false;
  app.facts.hasProgress = hasProgress;
  if (app.installed) return;
  app.placeholder = true;
  app.facts.installType = type;
  show(id);
}

void World::remove(const std::string& id) {
  // The home screen keeps the place of an app that has never been there.
  if (!apps[id].state().empty()) layout.erase(std::remove(layout.begin(), layout.end(), id), layout.end());
  apps.erase(id);
  shown.erase(std::remove(shown.begin(), shown.end(), id), shown.end());
}

void World::endCoordinator(const std::string& id) {
  auto& app = apps[id];
  bool shows = app.installed || (app.placeholder && !app.attached);
  if (!shows) return remove(id);
  if (app.attached) app.facts.hasProgress = false;
  app.leaveCoordinator();
}

void World::App::leaveCoordinator() {
  coordinator.clear();
  own = observed = options = initialPromises = asset = attached = false;
}

std::string World::App::state() const {
  if (installed) return facts.hasProgress ? "updating" : "installed";
  return placeholder ? "placeholder" : "";
}

}  // namespace tests
