#include <utility>

#include "core/AppsClient.h"
#include "core/Paths.h"
#include "core/PropertyListFile.h"
#include "platform/FileSystem.h"
#include "platform/PropertyListSerialization.h"

namespace appsync {

using namespace platform;

Value AppsClient::_restoreStatePropertyForKey(std::string_view key, std::string_view identifier,
                                              const std::optional<std::string>& version) {
  const Value root = readDictionary(_platform, std::string(restoreStatePath));
  if (!version) return {};
  return entryOf(entryOf(entryOf(root, identifier), *version), key);
}

void AppsClient::cleanRestoreStateForIdentifier(std::string_view identifier) {
  SerialQueue::Block block(_listFilesQueue);
  auto bytes = _platform.fileSystem.readFile(restoreStatePath);
  if (!bytes) return;
  Value root = _platform.propertyLists.propertyListWithData(std::move(*bytes));
  Dictionary* records = root.dictionary();
  // Something else than records is somebody else's: it holds nothing of this app, and stays.
  if (!records && !root.isAbsent()) return;
  if (records) records->remove(identifier);
  if (!records || records->empty()) {
    _platform.fileSystem.removeItem(restoreStatePath);
  } else {
    writePropertyList(_platform, root, PropertyListFormat::xml, restoreStatePath);
  }
}

}  // namespace appsync
