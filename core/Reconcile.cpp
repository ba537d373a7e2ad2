#include "core/AppsClient.h"
#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/NotificationCenter.h"
#include "platform/PropertyListSerialization.h"
#include "platform/TodoOperation.h"

namespace appsync {

using namespace platform;

AppsClient::StagingArea AppsClient::_takeStagingArea(ErrorRef* error) {
  SerialQueue::Block block(_listFilesQueue, _platform.clock);
  _platform.fileSystem.removeItem(workArea);
  if (!_platform.fileSystem.createDirectory(pluginDirectory, true, {}, error)) {
    say(_platform, "can't create work area");
    return StagingArea::failed;
  }
  if (!_platform.fileSystem.fileExists(stagingDirectory)) {
    say(_platform, "Nothing to do");
    return StagingArea::nothingThere;
  }
  if (!_platform.fileSystem.moveItem(stagingDirectory, workArea, error)) {
    say(_platform, "Can't move staging area");
    return StagingArea::failed;
  }
  return StagingArea::taken;
}

/// The identifiers of the todo list's removals, in its order.
static std::vector<std::string> removalsOf(const Platform& platform, const Array& todoList) {
  std::vector<std::string> removals;
  removals.reserve(8);
  for (const Value& element : todoList) {
    const Value& identifier = entryOf(element, "identifier");
    if (!isSafePathComponent(identifier)) continue;
    if (entryOf(element, "operation").string() != todo::remove) continue;
    removals.emplace_back(*identifier.string());
    say(platform, "%{public}@ targeted for termination", removals.back());
  }
  return removals;
}

void AppsClient::_removeUnwantedApps(const Value& todoList, bool removalAllowed) {
  if (!todoList.array()) {
    say(_platform, "Nothing to do from Harlune");
    return;
  }
  if (!removalAllowed) {
    say(_platform, "Not processing deletes because app removal is restricted");
    return;
  }
  auto removals = removalsOf(_platform, *todoList.array());
  if (removals.empty()) return;
  say(_platform, "performing %llu deletions", removals.size());
  for (const auto& identifier : removals) uninstallAppUsingCoordination(identifier);
}

static void sendIconLayout(const Platform& platform) {
  auto layout = platform.fileSystem.readFile(iconLayoutPath);
  if (!layout || layout->empty()) return;
  say(platform, "Sending iconlayout to PN");
  platform.homeScreen.PNSetIconState(platform.homeScreen.PNSPanelloBlockableServerPort(), *layout);
}

bool AppsClient::reconcileSync(std::uint32_t, std::string_view newAnchor, const TSProgressCallback&,
                               ErrorRef* error) try {
  say(_platform, "starting to reconcile sync with new anchor %{public}@", newAnchor);
  const StagingArea staging = _takeStagingArea(error);
  if (staging == StagingArea::taken) {
    const bool removalAllowed = _appRemovalAllowed();
    const Value todoList = _loadPlist(_platform, todoListPath, error);
    _removeUnwantedApps(todoList, removalAllowed);
    _notifyPanello(_platform, true);
    sendIconLayout(_platform);
    if (todoList.array()) writePropertyList(_platform, todoList, PropertyListFormat::binary, todoListDebugPath);
  }
  say(_platform, "finished reconcile sync");
  return staging != StagingArea::failed;
} catch (...) {
  swallowException(_platform, "reconcileSync");
  return false;
}

void AppsClient::_notifyPanello(const Platform& platform, bool starting) {
  int token = 0;
  const std::uint32_t status = platform.notifications.notify_register_check(syncNotificationName, token);
  say(platform, "Notifying PN we are %s syncing", starting ? "starting" : "done");
  platform.homeScreen.PNSPanelloBlockableServerPort();
  if (status != 0) {
    sayError(platform, "Uh Oh...can't send notification to PN:%d", status);
    return;
  }
  platform.notifications.notify_set_state(token, starting ? 1 : 0);
  platform.notifications.notify_post(syncNotificationName);
}

}  // namespace appsync
