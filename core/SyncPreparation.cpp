#include <unordered_map>

#include "core/AppsClient.h"
#include "core/Paths.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/Installer.h"
#include "platform/OBApplicationWorkspace.h"

namespace appsync {

using namespace platform;

std::vector<std::string> AppsClient::supportedDataclasses() try {
  return {std::string(dataclassApplication)};
} catch (...) {
  swallowException(_platform, "supportedDataclasses");
  return {};
}

std::string AppsClient::currentSyncAnchor() try { return std::string(constantSyncAnchor); } catch (...) {
  swallowException(_platform, "currentSyncAnchor");
  return {};
}

bool AppsClient::prepareForSyncWithHostAnchor(std::string_view, const TSProgressCallback&, ErrorRef*) { return true; }

/// What the todo list says about an app that is not on the device.
struct TodoState {
  bool found = false;
  bool installed = false;
  bool failed = false;

  /// The host expects to install the app still.
  bool isPending() const { return found && !installed && !failed; }
};

using TodoStates = std::unordered_map<std::string_view, TodoState>;  // keys borrowed from the todo list

/// What the first entry of each identifier says; the later ones do not count.
static TodoStates todoStatesOf(const Value& todoList) {
  TodoStates states;
  if (!todoList.array()) return states;
  for (const Value& element : *todoList.array()) {
    auto identifier = entryOf(element, "identifier").string();
    auto todo = entryOf(element, "operation").string();
    if (identifier)
      states.emplace(*identifier, TodoState{true, todo == operation::installed, todo == operation::failed});
  }
  return states;
}

/// The apps of the last sync that are not installed any more.
static void addMissingApps(const Platform& platform, const Value& lastSyncList, StringSet& candidates) {
  if (!lastSyncList.array()) return;
  for (const Value& element : *lastSyncList.array()) {
    auto identifier = element.string();
    if (identifier && !platform.workspace.applicationIsInstalled(*identifier)) candidates.insert(*identifier);
  }
}

Value AppsClient::installedAssets() try {
  say(_platform, "getting installed assets");
  Value deletions = Value::makeArray();
  const Value todoList = _loadPlist(_platform, todoListPath);
  const Value lastSyncList = _loadPlist(_platform, lastSyncListPath);

  StringSet candidates;
  const Value uninstalled = _platform.installer.CorvaneLookupUninstalled();
  if (uninstalled.dictionary()) {
    for (const auto& entry : *uninstalled.dictionary()) candidates.insert(entry.key);
    Mutex::Lock lock(_transferStateGuard);
    _uninstalledApps = candidates.members();
  } else {
    sayError(_platform, "CorvaneLookupUninstalled returned NULL");
  }
  addMissingApps(_platform, lastSyncList, candidates);

  const TodoStates states = todoStatesOf(todoList);
  for (const auto& candidate : candidates.members()) {
    auto known = states.find(candidate);
    const TodoState todo = known == states.end() ? TodoState() : known->second;
    if (todo.isPending()) {
      say(_platform, "%{public}@ not installed, but is in our todo list. Not marking deleted", candidate);
      continue;
    }
    say(_platform, "%{public}@ not installed, and no todo (found=%d pi=%d failed=%d) Marking as deleted", candidate,
        todo.found, todo.installed, todo.failed);
    deletions.array()->appendDictionary().set("KBBundleIdentifier", candidate);
  }
  Value result = Value::makeDictionary();
  result.dictionary()->set("_Deleted", deletions);

  std::optional<std::vector<std::string>> uninstalledApps;
  {
    Mutex::Lock lock(_transferStateGuard);
    uninstalledApps = _uninstalledApps;
  }
  say(_platform, LogCategory::summary,
      "finished getting installed assets toDoList:%{public}@, uninstalled apps %{public}@, last synced apps%{public}@",
      todoList, uninstalledApps, lastSyncList);
  return result;
} catch (...) {
  swallowException(_platform, "installedAssets");
  return {};
}

}  // namespace appsync
