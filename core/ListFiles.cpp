#include <cstddef>
#include <memory>
#include <utility>

#include "core/AppsClient.h"
#include "core/Candidate.h"
#include "core/Paths.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/Process.h"
#include "platform/PropertyListSerialization.h"

namespace appsync {

using namespace platform;

Value AppsClient::_loadPlist(const Platform& platform, std::string_view path, ErrorRef* error) {
  auto bytes = platform.fileSystem.readFile(path, error);
  if (!bytes || bytes->empty()) return {};
  Value root = platform.propertyLists.propertyListWithData(std::move(*bytes), error);
  if (root.isAbsent()) {
    sayError(platform, "couldn't parse todo list");
    return {};
  }
  if (!root.array()) {
    sayError(platform, "todo list is not an array");
    return {};
  }
  return root;
}

static Dictionary* firstEntry(Array& todoList, std::string_view identifier) {
  for (std::size_t i = 0; i < todoList.size(); ++i) {
    Dictionary* entry = todoList.dictionary(i);
    if (entry && (*entry)["identifier"].string() == identifier) return entry;
  }
  return nullptr;
}

void AppsClient::changeAssetID(std::string_view identifier, std::string_view toDo) {
  SerialQueue::Block block(_listFilesQueue);
  Value todoList = _loadPlist(_platform, todoListPath);
  if (!todoList.array()) return;
  Dictionary* entry = firstEntry(*todoList.array(), identifier);
  if (!entry) return;
  say(_platform, "Changing %{public}@ from %{public}@ to %{public}@", identifier, (*entry)["operation"], toDo);
  entry->set("operation", toDo);
  writePropertyList(_platform, todoList, PropertyListFormat::binary, todoListPath);
}

/// The home screen's order; absent when it has none. Keeps a copy in the sort-order file.
static Value readIconOrder(const Platform& platform) {
  void* buffer = nullptr;
  std::size_t length = 0;
  platform.homeScreen.PNGetFlattenedIconState(platform.homeScreen.PNSPanelloBlockableServerPort(), 1, &buffer, &length);
  if (!buffer) {
    say(platform, "got no icon sort order from PN");
    return {};
  }
  auto giveBack = [&](void* held) { platform.process.deallocateMemory(held, length); };
  const std::unique_ptr<void, decltype(giveBack)> held(buffer, giveBack);
  Bytes data(static_cast<const char*>(buffer), length);
  say(platform, "saved icon sort order");
  platform.fileSystem.writeAtomically(sortOrderPath, data);
  return platform.propertyLists.propertyListWithData(std::move(data));
}

std::vector<CandidateRef> AppsClient::_orderTheItems(const Platform& platform, Candidates& items) {
  std::vector<CandidateRef> ordered;
  ordered.reserve(items.size());
  const Value order = readIconOrder(platform);
  if (order.array()) {
    for (const Value& element : *order.array()) {
      auto identifier = element.string();
      CandidateRef item = identifier ? items.find(*identifier) : nullptr;
      if (!item) continue;
      say(platform, "prioritize %{public}@", *identifier);
      ordered.push_back(std::move(item));
      items.erase(*identifier);
    }
  }
  for (const auto& identifier : items.identifiers()) {
    say(platform, "lastly %{public}@", identifier);
    ordered.push_back(items.find(identifier));
  }
  return ordered;
}

}  // namespace appsync
