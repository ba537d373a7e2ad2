#include "tsd/host/HostCheck.h"

#include <sys/stat.h>

#include <algorithm>
#include <map>
#include <set>
#include <utility>

#include "device/install/AppIdentifier.h"
#include "device/screen/IconImage.h"
#include "device/screen/IconLayout.h"
#include "device/services/ListProblem.h"
#include "platform/TodoOperation.h"
#include "plist/ElementLines.h"
#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/host/HostPackage.h"
#include "tsd/host/TodoProblem.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {

using platform::Value;
using Kind = Value::Kind;
using Weight = Finding::Weight;

namespace {

constexpr const char* passedOver = "it is passed over: leave it out, or write one";
constexpr int iconSize = 120;  // any: whether it can be drawn does not depend on it

/// The number in "line 3: …", which is cut off; 0 without one.
std::size_t takeLine(std::string& text) {
  constexpr std::string_view front = "line ";
  if (text.compare(0, front.size(), front) != 0) return 0;
  std::size_t line = 0, at = front.size();
  for (; at < text.size() && text[at] >= '0' && text[at] <= '9'; ++at)
    line = line * 10 + static_cast<std::size_t>(text[at] - '0');
  if (text.compare(at, 2, ": ") != 0) return 0;
  text.erase(0, at + 2);
  return line;
}

/// A file's bytes; nothing, with the reason, when it cannot be read.
std::optional<platform::Bytes> bytesOf(const std::string& path, std::string& reason) {
  platform::ErrorRef error;
  auto file = HostFile::open("", path, &error);
  auto bytes = file ? file->readRest(std::size_t{1} << 30, &error) : std::nullopt;
  if (!bytes) reason = textOf(error);
  return bytes;
}

bool isDrawable(platform::BytesView image) { return device::IconImage::fromPNG(image, iconSize) != nullptr; }

const char* articleOf(Kind kind) { return kind == Kind::array ? "an array" : "a dictionary"; }

}  // namespace

struct HostCheck::List {
  std::string path;
  Value value;  // absent when it is not there, or nothing can be done with it
  std::vector<std::size_t> lines;

  std::size_t lineOf(std::size_t place) const { return place < lines.size() ? lines[place] : 0; }
};

const char* nameOf(Finding::Weight weight) {
  return weight == Weight::error ? "error" : weight == Weight::problem ? "problem" : "note";
}

HostCheck::List HostCheck::readList(const std::string& path, Kind kind, Weight weight, const std::string& remedy) {
  List list{path, {}, {}};
  try {
    if (!isThere(path)) return list;
  } catch (const CommandError& error) {
    add({weight, path, 0, "", error.what(), remedy});
    return list;
  }
  std::string reason;
  auto bytes = bytesOf(path, reason);
  platform::ErrorRef error;
  if (bytes) {
    list.lines = plist::elementLines(*bytes);
    list.value = plist::read(std::move(*bytes), &error);
    if (list.value.isAbsent()) reason = textOf(error);
  }
  if (!list.value.isAbsent() && list.value.kind() != kind) {
    reason = std::string("it is not ") + articleOf(kind);
    list.value = {};
  }
  if (reason.empty()) return list;
  std::size_t line = takeLine(reason);
  add({weight, path, line, "", reason, remedy});
  return list;
}

const std::vector<Finding>& HostCheck::run() {
  _findings.clear();
  if (!checkFolder()) return _findings;
  checkTodoList();
  checkLayout();
  checkRestoreList();
  checkDemotedList();
  checkStrays();
  checkPushed(_host, 0);
  return _findings;
}

bool HostCheck::checkFolder() {
  try {
    for (const auto& sentence : misspelledFiles(_host)) {
      auto colon = sentence.find(": ");
      add({Weight::error, sentence.substr(0, colon), 0, "", sentence.substr(colon + 2), "give it that name"});
    }
    if (_findings.empty()) requireHostFolder(_host);
  } catch (const CommandError& error) {
    std::string text = error.what(), front = _host + ": ";
    if (text.compare(0, front.size(), front) == 0) text.erase(0, front.size());
    add({Weight::error, _host, 0, "", text, "tsd host new makes a folder for a host"});
    return false;
  }
  return true;
}

void HostCheck::checkTodoList() {
  const List list = readList(_host + "/" + std::string(todoListName), Kind::array, Weight::error,
                             "write it as docs/file-formats.md shows");
  _isTodoListKnown = list.value.array() != nullptr;
  if (!_isTodoListKnown) return;
  for (std::size_t place = 0; place < list.value.array()->size(); ++place) checkTodoEntry(list, place);
}

void HostCheck::checkTodoEntry(const List& list, std::size_t place) {
  const Value& entry = (*list.value.array())[place];
  const std::size_t line = list.lineOf(place);
  const std::string number = "entry " + std::to_string(place + 1);
  if (auto problem = problemOfTodoEntry(entry); !problem.empty()) {
    add({Weight::problem, list.path, line, "", number + " is ignored: " + problem,
         "give it an \"identifier\" and an \"operation\", install or remove"});
    return;
  }
  const auto& fields = *entry.dictionary();
  const std::string app(*fields["identifier"].string()), operation(*fields["operation"].string());
  if (!device::isAppIdentifier(app)) {
    add({Weight::problem, list.path, line, app, number + ": \"" + app + "\" cannot be an app's identifier",
         "use letters, digits, hyphens and full stops, 251 bytes at most"});
    return;
  }
  const bool isFirst = _named.insert(app).second;
  if (!isFirst)
    add({Weight::note, list.path, line, app,
         number + ": a second one of this app; what comes of it is written into the first", "leave one of them"});
  if (operation == platform::todo::remove) {
    if (isFirst) ++_removals;
  } else if (operation != platform::todo::install) {
    add({Weight::problem, list.path, line, app,
         number + ": nothing is done for the operation \"" + operation + '"' +
             didYouMean(operation, {std::string(platform::todo::install), std::string(platform::todo::remove)}),
         "make it install or remove"});
  } else if (_installs.insert(app).second) {
    checkPackage(app, std::string(fields["version"].string().value_or("")), list.path, line);
    checkAppFolder(app);
  }
}

void HostCheck::checkPackage(const std::string& app, const std::string& version, const std::string& list,
                             std::size_t line) {
  const std::string path = _host + "/" + std::string(packagesName) + "/" + app + ".pkg";
  try {
    auto package = readHostPackage(path, path);
    if (package.id != app) {
      add({Weight::problem, path, 0, app, "it holds the app \"" + package.id + "\", not \"" + app + '"',
           "rename it, and name that app in " + std::string(todoListName)});
    } else if (!version.empty() && !package.version.empty() && package.version != version) {
      add({Weight::note, list, line, app,
           "version " + version + " is on offer, and its package has version " + package.version,
           "write the package's version into the list, or: " + addAgain()});
    }
  } catch (const CommandError& error) {
    std::string text = std::string(error.what()).substr(path.size() + 2);
    add({Weight::problem, path, 0, app, "its package cannot be installed: " + text, addAgain()});
  }
}

void HostCheck::checkMetadata(const std::string& app, const std::string& folder) {
  const List metadata = readList(folder + "/" + std::string(platform::storeMetadataFileName), Kind::dictionary,
                                 Weight::note, "leave it out, or write a dictionary");
  const std::string problem = device::problemOfStoreMetadata(metadata.value);
  if (problem.empty()) return;
  std::size_t place = 0, line = 0;
  for (const auto& entry : *metadata.value.dictionary()) {
    if (problem.find('"' + std::string(entry.key) + '"') == 0) line = metadata.lineOf(place);
    ++place;
  }
  add({Weight::note, metadata.path, line, app, problem, passedOver});
}

void HostCheck::checkAppFolder(const std::string& app) {
  const std::string folder = _host + "/" + app;
  struct stat facts {};
  if (::lstat(folder.c_str(), &facts) != 0 || !S_ISDIR(facts.st_mode)) {
    add({Weight::note, folder, 0, app, "no such folder: its placeholder has neither a name nor an icon of its own",
         addAgain()});
    return;
  }
  const std::string manifestPath = folder + "/Info.plist";
  const List manifest = readList(manifestPath, Kind::dictionary, Weight::note, addAgain());
  checkMetadata(app, folder);
  std::string iconName;
  if (const auto* fields = manifest.value.dictionary()) {
    if (auto id = (*fields)["KBBundleIdentifier"].string(); id && *id != app)
      add({Weight::note, manifestPath, 0, app, "it is another app's: \"" + std::string(*id) + '"', addAgain()});
    iconName = std::string((*fields)["KBBundleIconFile"].string().value_or(""));
  } else if (std::none_of(_findings.begin(), _findings.end(), [&](auto& each) { return each.file == manifestPath; })) {
    add({Weight::note, manifestPath, 0, app, "no such file: its placeholder has no name", addAgain()});
  }
  std::string ignored;
  auto draws = [&](const std::string& name) {
    auto bytes = isFileName(name) ? bytesOf(folder + "/" + name, ignored) : std::nullopt;
    return bytes && isDrawable(*bytes);
  };
  if (!draws(iconName) && !draws(std::string(platform::artworkFileName)))
    add({Weight::note, folder, 0, app,
         "no icon: neither the file that \"KBBundleIconFile\" names nor " + std::string(platform::artworkFileName) +
             " is a PNG that can be drawn",
         "put one there, of 4096 pixels a side at most"});
}

void HostCheck::checkLayout() {
  const List list = readList(_host + "/" + std::string(iconLayoutName), Kind::array, Weight::note,
                             "leave it out, or write an array of pages of identifiers");
  if (!list.value.array()) return;
  if (auto problem = device::problemOfLayout(list.value); !problem.text.empty()) {
    add({Weight::note, list.path, list.lineOf(problem.place), "",
         "the home screen does not take this layout: " + problem.text,
         "write an array of identifiers, or of pages of them"});
    return;
  }
  std::set<std::string, std::less<>> seen;
  auto look = [&](const Value& each, std::size_t line) {
    if (!seen.emplace(*each.string()).second)
      add({Weight::note, list.path, line, std::string(*each.string()), "it is there twice", "leave one of them"});
  };
  for (std::size_t place = 0; place < list.value.array()->size(); ++place) {
    const Value& each = (*list.value.array())[place];
    if (!each.array()) {
      look(each, list.lineOf(place));
      continue;
    }
    for (const auto& inner : *each.array()) look(inner, list.lineOf(place));
  }
}

void HostCheck::checkRestoreList() {
  const List list = readList(_host + "/" + std::string(restoreName) + "/" + std::string(restoreListName),
                             Kind::dictionary, Weight::error, "write it as docs/file-formats.md shows");
  if (!list.value.dictionary()) return;
  std::size_t place = 0;
  for (const auto& [key, entry] : *list.value.dictionary()) {
    const std::string app(key);
    const std::size_t line = list.lineOf(place++);
    _restored.insert(app);
    auto tell = [&](Weight weight, const std::string& text, const std::string& remedy) {
      add({weight, list.path, line, app, text, remedy});
    };
    const auto* fields = entry.dictionary();
    auto metadata = fields ? (*fields)["HarluneMetadata"].data() : std::nullopt;
    if (!device::isAppIdentifier(app)) {
      tell(Weight::problem, "this cannot be an app's identifier", "use letters, digits, hyphens and full stops");
    } else if (!metadata) {
      tell(Weight::problem, "it is passed over: it has no \"HarluneMetadata\" with data", addToRestore());
    } else if (const Value read = plist::read(platform::Bytes(*metadata)); !read.dictionary()) {
      tell(Weight::problem, "its \"HarluneMetadata\" is no dictionary", addToRestore());
    } else if (auto problem = device::problemOfStoreMetadata(read); !problem.empty()) {
      tell(Weight::note, "its \"HarluneMetadata\": " + problem, passedOver);
    } else if (!(*read.dictionary())["title"].string() && !(*read.dictionary())["itemName"].string()) {
      tell(Weight::note, "its metadata have neither a \"title\" nor an \"itemName\": its placeholder has no name",
           "write one of them");
    }
    if (auto icon = fields ? (*fields)["PlaceholderIcon"].data() : std::nullopt; icon && !isDrawable(*icon))
      tell(Weight::note, "its \"PlaceholderIcon\" is no PNG that can be drawn", "leave it out, or write a PNG");
  }
}

void HostCheck::checkDemotedList() {
  const List list = readList(_host + "/" + std::string(restoreName) + "/" + std::string(demotedListName),
                             Kind::dictionary, Weight::note, "write it as docs/file-formats.md shows");
  if (!list.value.dictionary()) return;
  const std::vector<std::string> keys{"AutomaticDowngrades", "IntentionalDowngrades"};
  std::size_t place = 0;
  for (const auto& [key, value] : *list.value.dictionary()) {
    const std::size_t line = list.lineOf(place++);
    if (std::find(keys.begin(), keys.end(), key) == keys.end()) {
      add({Weight::note, list.path, line, "", "nobody reads \"" + std::string(key) + '"' + didYouMean(key, keys),
           "leave it out"});
      continue;
    }
    if (!value.array())
      add({Weight::note, list.path, line, "", '"' + std::string(key) + "\" is not an array",
           "write an array of identifiers"});
    for (std::size_t at = 0; value.array() && at < value.array()->size(); ++at) {
      auto app = (*value.array())[at].string();
      if (!app)
        add({Weight::note, list.path, line, "", '"' + std::string(key) + "\" has something in it that is no text",
             "leave it out"});
      else if (!_restored.count(std::string(*app)))
        add({Weight::note, list.path, line, std::string(*app),
             "it is demoted, and not in the restore list" + didYouMean(*app, {_restored.begin(), _restored.end()}),
             addToRestore()});
    }
  }
}

}  // namespace tsd
