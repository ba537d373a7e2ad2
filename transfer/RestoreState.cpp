#include <utility>

#include "core/AppsClient.h"
#include "core/PropertyListFile.h"
#include "platform/DevicePaths.h"
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

void AppsClient::cleanRestoreStateForIdentifier(std::optional<std::string_view> identifier) {
  SerialQueue::Block block(_listFilesQueue, _platform.clock);
  auto bytes = _platform.fileSystem.readFile(restoreStatePath);
  if (!bytes) return;
  ErrorRef error;
  Value root = _platform.propertyLists.propertyListWithData(std::move(*bytes), &error);
  Dictionary* records = root.dictionary();
  if (!records) {
    // What does not hold records is somebody else's: there is nothing of this app in it, and it stays. So does what
    // could not be read this time, or not by this reader.
    if (isNoPropertyList(root, error)) _platform.fileSystem.removeItem(restoreStatePath);
    return;
  }
  if (identifier) records->remove(*identifier);
  if (records->empty()) {
    _platform.fileSystem.removeItem(restoreStatePath);
  } else {
    writePropertyListAsXML(_platform, root, restoreStatePath);
  }
}

}  // namespace appsync
