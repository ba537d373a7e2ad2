#include "tsd/daemon/TodoList.h"

#include "platform/DevicePaths.h"
#include "platform/TodoOperation.h"
#include "plist/PropertyList.h"
#include "tsd/CommandError.h"

namespace tsd {

using platform::Value;

namespace {

Value readFile(platform::FileSystem& files, std::string_view path, platform::ErrorRef* error = nullptr) {
  auto bytes = files.readFile(path, error);
  return bytes ? plist::read(std::move(*bytes), error) : Value();
}

/// The dictionary under the key, which is made if it is missing.
platform::Dictionary& level(platform::Dictionary& parent, std::string_view key) {
  if (!parent.dictionary(key)) parent.set(key, Value::makeDictionary());
  return *parent.dictionary(key);
}

}  // namespace

std::vector<TodoEntry> readTodoList(platform::FileSystem& files, std::string* problem) {
  platform::ErrorRef error;
  Value list = readFile(files, platform::todoListPath, &error);
  const auto* items = list.array();
  if (problem && (items || !files.fileExists(platform::todoListPath)))
    problem->clear();
  else if (problem)
    *problem = list.isAbsent() ? textOf(error) : "it is not an array";
  return todoEntriesOf(list);
}

std::vector<TodoEntry> todoEntriesOf(const Value& list) {
  std::vector<TodoEntry> entries;
  const auto* items = list.array();
  if (!items) return entries;
  entries.reserve(items->size());
  for (const auto& item : *items) {
    const auto* fields = item.dictionary();
    if (!fields) continue;
    auto text = [&](std::string_view key) { return std::string((*fields)[key].string().value_or("")); };
    entries.push_back({text("identifier"), text("operation"), text("name"), text("version")});
  }
  return entries;
}

std::map<std::string, TodoWish> wishesOf(const std::vector<TodoEntry>& entries) {
  std::map<std::string, TodoWish> wishes;
  for (const auto& entry : entries) {
    auto [wish, isFirst] = wishes.try_emplace(entry.identifier, TodoWish::other);
    if (entry.operation == platform::todo::install) wish->second = TodoWish::install;
    if (entry.operation == platform::todo::remove && wish->second == TodoWish::other) wish->second = TodoWish::removal;
  }
  return wishes;
}

bool recordPackagePath(platform::FileSystem& files, const std::string& identifier, const std::string& version,
                       const std::string& path, platform::ErrorRef* error) {
  Value state = readFile(files, platform::restoreStatePath);
  if (!state.dictionary()) state = Value::makeDictionary();
  level(level(*state.dictionary(), identifier), version).set("path", path);
  auto bytes = plist::writeXML(state, error);
  std::string parent(platform::restoreStatePath.substr(0, platform::restoreStatePath.rfind('/')));
  return bytes && files.createDirectory(parent, true, {}, error) &&
         files.writeAtomically(platform::restoreStatePath, *bytes, error);
}

}  // namespace tsd
