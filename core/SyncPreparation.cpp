
#include "core/AppsClient.h"
#include "core/Names.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/Installer.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/TextTable.h"
#include "platform/TodoOperation.h"

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

  /// The host still expects to install the app.
  bool isPending() const { return found && !installed && !failed; }
};

using TodoStates = platform::BorrowedTextMap<TodoState>;  // keys borrowed from the todo list

/// What the first entry of each identifier says; the later ones do not count.
static TodoStates todoStatesOf(const Value& todoList) {
  TodoStates states;
  if (!todoList.array()) return states;
  for (const Value& element : *todoList.array()) {
    auto identifier = entryOf(element, "identifier").string();
    auto todo = entryOf(element, "operation").string();
    if (identifier) states.emplace(*identifier, TodoState{true, todo == todo::installed, todo == todo::failed});
  }
  return states;
}

/// The apps of the last sync that are no longer installed.
static void addMissingApps(const Platform& platform, const Value& lastSyncList, StringSet& candidates) {
  if (!lastSyncList.array()) return;
  for (const Value& element : *lastSyncList.array()) {
    auto identifier = element.string();
    if (identifier && !platform.workspace.applicationIsInstalled(*identifier)) candidates.insert(*identifier);
  }
}

static Value answerWith(const Value& deletions) {
  Value answer = Value::makeDictionary();
  answer.dictionary()->set("_Deleted", deletions);
  return answer;
}

Value AppsClient::installedAssets() {
  Value answer;
  contained(_platform, "installedAssets", [&] { answer = answerWith(Value::makeArray()); });
  const bool complete = contained(_platform, "installedAssets", [&] { answer = answerWith(_deletions()); });
  // What was not reported must not be forgotten at the end of this sync.
  Mutex::Lock lock(_transferStateGuard);
  if (!complete) _uninstalledApps.reset();
  _deletionsReported = complete;
  return answer;
}

Value AppsClient::_deletions() {
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

  std::optional<std::vector<std::string>> uninstalledApps;
  {
    Mutex::Lock lock(_transferStateGuard);
    uninstalledApps = _uninstalledApps;
  }
  say(_platform, LogCategory::summary,
      "finished getting installed assets toDoList:%{public}@, uninstalled apps %{public}@, last synced apps%{public}@",
      todoList, uninstalledApps, lastSyncList);
  return deletions;
}

}  // namespace appsync
