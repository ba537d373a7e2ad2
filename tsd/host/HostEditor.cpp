#include "tsd/host/HostEditor.h"

#include <algorithm>
#include <filesystem>
#include <memory>
#include <set>
#include <utility>

#include "platform/TodoOperation.h"
#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/host/HostList.h"
#include "tsd/host/NewItem.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {

namespace fs = std::filesystem;
using platform::Value;
using Kind = Value::Kind;

namespace {

std::string pathIn(const std::string& folder, std::string_view name) { return folder + "/" + std::string(name); }

std::string restoreFolder(const std::string& host) { return pathIn(host, restoreName); }

std::string packageOf(const std::string& host, const std::string& app) {
  return pathIn(pathIn(host, packagesName), app) + ".pkg";
}

/// Whether it was not there before.
bool makeFolder(const std::string& path) {
  std::error_code problem;
  bool made = fs::create_directory(path, problem);
  if (problem) throw CommandError(path + ": " + problem.message());
  return made;
}

void copyFile(const std::string& from, const std::string& to) {
  platform::ErrorRef error;
  if (!HostFile::open("", from, &error)) throw CommandError(from + ": " + textOf(error));
  std::error_code problem;
  fs::copy_file(from, to, fs::copy_options::overwrite_existing, problem);
  if (problem) throw CommandError(from + ": " + problem.message());
}

bool isOf(const Value& entry, const std::string& app) {
  return entry.dictionary() && (*entry.dictionary())["identifier"].string() == app;
}

/// The todo list with what one entry of an app says, the first, in the place of all that it has; absent for none.
void putTodo(Value& list, const std::string& app, const Value& entry) {
  Value changed = Value::makeArray();
  bool isPut = false;
  for (const auto& each : *std::as_const(list).array()) {
    if (!isOf(each, app)) {
      changed.array()->append(each);
      continue;
    }
    if (isPut || entry.isAbsent()) continue;
    Value merged = each;
    for (const auto& field : *entry.dictionary()) merged.dictionary()->set(field.key, field.value);
    changed.array()->append(merged);
    isPut = true;
  }
  if (!isPut) changed.array()->append(entry);
  list = std::move(changed);
}

Value todoEntryOf(const HostPackage& app) {
  Value entry = Value::makeDictionary();
  entry.dictionary()->set("identifier", app.id);
  entry.dictionary()->set("operation", platform::todo::install);
  entry.dictionary()->set("version", app.version);
  entry.dictionary()->set("name", app.name);
  return entry;
}

/// The package's own, or the least that a placeholder needs.
platform::Bytes metadataFor(const HostPackage& app) {
  if (!app.metadata.empty()) return app.metadata;
  Value metadata = Value::makeDictionary();
  metadata.dictionary()->set("title", app.name);
  metadata.dictionary()->set("bundleVersion", app.version);
  return propertyListOf(metadata, false);
}

/// An app on its way into the host.
struct Arrival {
  HostPackage app;
  std::unique_ptr<NewItem> package;
  std::unique_ptr<NewItem> folder;
};

/// The package in the host's folder, under a name of its own yet, and what it is.
Arrival arrivalOf(const std::string& host, const std::string& source, bool replaces) {
  std::error_code problem;
  // Its name is known when its manifest has been read.
  NewItem unnamed(pathIn(pathIn(host, packagesName), "new.pkg"), NewItem::Kind::file, true);
  Arrival arrival;
  if (fs::is_directory(source, problem)) {
    arrival.app = packFolder(source, unnamed.temporary(), true);
  } else {
    copyFile(source, unnamed.temporary());
    arrival.app = readHostPackage(unnamed.temporary(), source);
  }
  const auto& app = arrival.app;
  const std::string path = packageOf(host, app.id);
  for (const auto& there : {path, pathIn(host, app.id)}) {
    if (!replaces && isThere(there)) throw CommandError(there + ": there is something already; --replace replaces it");
  }
  arrival.package = std::make_unique<NewItem>(path, NewItem::Kind::file, replaces);
  fs::rename(unnamed.temporary(), arrival.package->temporary(), problem);
  if (problem) throw CommandError(path + ": " + problem.message());
  arrival.folder = std::make_unique<NewItem>(pathIn(host, app.id), NewItem::Kind::folder, replaces);
  auto put = [&](std::string_view name, const platform::Bytes& content) {
    if (!content.empty()) writeWholeFile(pathIn(arrival.folder->temporary(), name), content);
  };
  put("Info.plist", app.manifest);
  put(platform::storeMetadataFileName, app.metadata);
  put(platform::artworkFileName, app.artwork.empty() ? app.icon : app.artwork);
  put(app.iconName, app.icon);
  return arrival;
}

bool hasEntry(const Value& todo, const std::string& app) {
  return std::any_of(todo.array()->begin(), todo.array()->end(), [&](const Value& each) { return isOf(each, app); });
}

/// The layout without the app: an array of identifiers, or of pages of them.
Value layoutWithout(const Value& layout, const std::set<std::string, std::less<>>& apps) {
  Value changed = Value::makeArray();
  for (const auto& each : *layout.array()) {
    if (each.array())
      changed.array()->append(layoutWithout(each, apps));
    else if (!each.string() || !apps.count(*each.string()))
      changed.array()->append(each);
  }
  return changed;
}

/// What a host has apps in.
struct HostLists {
  explicit HostLists(const std::string& host)
      : todo(pathIn(host, todoListName), Kind::array),
        layout(pathIn(host, iconLayoutName), Kind::array),
        restored(pathIn(restoreFolder(host), restoreListName), Kind::dictionary),
        demoted(pathIn(restoreFolder(host), demotedListName), Kind::dictionary) {}

  HostList todo;
  HostList layout;
  HostList restored;
  HostList demoted;
};

/// Every app that the todo list or the restore list names.
std::vector<std::string> appsIn(const HostLists& lists) {
  std::vector<std::string> apps;
  for (const auto& entry : *lists.todo.value().array()) {
    if (const auto* fields = entry.dictionary(); fields && (*fields)["identifier"].string())
      apps.emplace_back(*(*fields)["identifier"].string());
  }
  for (const auto& entry : *lists.restored.value().dictionary()) apps.emplace_back(entry.key);
  return apps;
}

}  // namespace

void makeHost(const std::string& host) {
  std::error_code problem;
  // An empty folder may have been made for it.
  bool isEmptyFolder =
      isThere(host) && fs::is_directory(fs::symlink_status(host, problem)) && fs::is_empty(host, problem) && !problem;
  std::string path = host;
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  NewItem folder(path, NewItem::Kind::folder, isEmptyFolder);
  makeFolder(pathIn(folder.temporary(), packagesName));
  writeWholeFile(pathIn(folder.temporary(), todoListName), propertyListOf(Value::makeArray(), false));
  folder.putInPlace();
}

std::vector<HostPackage> addToHost(const std::string& host, const std::vector<std::string>& sources,
                                   const HostAddition& addition) {
  requireHostFolder(host);
  HostLists lists(host);
  bool madePackages = makeFolder(pathIn(host, packagesName));
  std::vector<Arrival> arrivals;
  try {
    std::set<std::string> seen;
    for (const auto& source : sources) {
      arrivals.push_back(arrivalOf(host, source, addition.replaces));
      const auto& app = arrivals.back().app;
      if (!seen.insert(app.id).second) throw CommandError(source + ": another one of the app " + app.id);
      if (!addition.replaces && hasEntry(lists.todo.value(), app.id))
        throw CommandError(lists.todo.path() + ": has an entry of " + app.id + " already; --replace replaces it");
    }
  } catch (...) {
    arrivals.clear();
    std::error_code ignored;
    if (madePackages) fs::remove(pathIn(host, packagesName), ignored);
    throw;
  }
  std::vector<HostPackage> added;
  for (auto& arrival : arrivals) {
    arrival.package->putInPlace();
    arrival.folder->putInPlace();
    putTodo(lists.todo.value(), arrival.app.id, todoEntryOf(arrival.app));
    if (addition.restores)
      putRestored(lists.restored.value(), {arrival.app.id, metadataFor(arrival.app), {}, arrival.app.icon});
    if (addition.demotion.isAny()) putDemoted(lists.demoted.value(), arrival.app.id, addition.demotion);
    added.push_back(std::move(arrival.app));
  }
  if (addition.restores) {
    makeFolder(restoreFolder(host));
    lists.restored.write();
    if (addition.demotion.isAny()) lists.demoted.write();
  }
  lists.todo.write();
  return added;
}

void removeFromHost(const std::string& host, const std::vector<std::string>& apps, bool uninstall) {
  requireHostFolder(host);
  HostLists lists(host);
  for (const auto& app : apps) {
    if (!isFileName(app)) throw CommandError("\"" + app + "\" cannot be an app's identifier");
    bool isKnown = hasEntry(lists.todo.value(), app) || lists.restored.value().dictionary()->contains(app) ||
                   isThere(pathIn(host, app) + "/Info.plist") || isThere(packageOf(host, app));
    if (!isKnown) throw CommandError(host + ": nothing is there of the app " + app + didYouMean(app, appsIn(lists)));
  }
  for (const auto& app : apps) {
    Value entry;
    if (uninstall) {
      entry = Value::makeDictionary();
      entry.dictionary()->set("identifier", app);
      entry.dictionary()->set("operation", platform::todo::remove);
    }
    putTodo(lists.todo.value(), app, entry);
    lists.restored.value().dictionary()->remove(app);
    putDemoted(lists.demoted.value(), app, {});
  }
  lists.layout.value() = layoutWithout(lists.layout.value(), {apps.begin(), apps.end()});
  for (const auto* list : {&lists.todo, &lists.layout, &lists.restored, &lists.demoted}) {
    if (!list->isNew() || list == &lists.todo) list->write();
  }
  for (const auto& app : apps) {
    for (const auto& path : {pathIn(host, app), packageOf(host, app)}) {
      std::error_code problem;
      fs::remove_all(path, problem);
      if (problem) throw CommandError(path + ": " + problem.message());
    }
  }
}

}  // namespace tsd
