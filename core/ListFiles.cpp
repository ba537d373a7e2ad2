#include <cstddef>
#include <utility>

#include "core/AppsClient.h"
#include "core/Candidate.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/DevicePaths.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/Process.h"
#include "platform/PropertyListSerialization.h"

namespace appsync {

using namespace platform;

Value AppsClient::_loadPlist(const Platform& platform, std::string_view path, ErrorRef* error) {
  return readList(platform, path, Value::Kind::array, "couldn't parse todo list", "todo list is not an array", error);
}

static Dictionary* firstEntry(Array& todoList, std::optional<std::string_view> identifier) {
  if (!identifier) return nullptr;
  for (std::size_t i = 0; i < todoList.size(); ++i) {
    const Dictionary* entry = todoList[i].dictionary();
    if (entry && (*entry)["identifier"].string() == identifier) return todoList.dictionary(i);
  }
  return nullptr;
}

void AppsClient::changeAssetID(std::optional<std::string_view> identifier, std::string_view toDo) {
  SerialQueue::Block block(_listFilesQueue, _platform.clock);
  Value todoList = _loadPlist(_platform, todoListPath);
  if (!todoList.array()) return;
  Dictionary* entry = firstEntry(*todoList.array(), identifier);
  if (!entry) return;
  say(_platform, "Changing %{public}@ from %{public}@ to %{public}@", identifier, (*entry)["operation"], toDo);
  entry->set("operation", toDo);
  writePropertyList(_platform, todoList, PropertyListFormat::binary, todoListPath);
}

/// A buffer of the home screen, given back at the end.
struct LentBuffer {
  explicit LentBuffer(const Platform& platform) : platform(platform) {}
  ~LentBuffer() {
    if (bytes) contained(platform, "deallocateMemory", [this] { platform.process.deallocateMemory(bytes, length); });
  }
  LentBuffer(const LentBuffer&) = delete;
  LentBuffer& operator=(const LentBuffer&) = delete;

  const Platform& platform;
  void* bytes = nullptr;
  std::size_t length = 0;
};

/// The home screen's order; absent when it has none. Keeps a copy in the sort-order file.
static Value readIconOrder(const Platform& platform) {
  LentBuffer buffer(platform);
  platform.homeScreen.PNGetFlattenedIconState(platform.homeScreen.PNSPanelloBlockableServerPort(), 1, &buffer.bytes,
                                              &buffer.length);
  if (!buffer.bytes) {
    say(platform, "got no icon sort order from PN");
    return {};
  }
  Bytes data(static_cast<const char*>(buffer.bytes), buffer.length);
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
