#include "core/AppsClient.h"
#include "core/Names.h"
#include "core/PathCheck.h"
#include "core/Say.h"
#include "platform/FileSystem.h"
#include "platform/InstallTransactionLog.h"
#include "platform/Process.h"

namespace appsync {

using namespace platform;

Value AppsClient::ownerAttributes() {
  Value attributes = Value::makeDictionary();
  attributes.dictionary()->set(FXFileOwnerAccountName, "mobile");
  attributes.dictionary()->set(FXFileGroupOwnerAccountName, "mobile");
  return attributes;
}

std::string AppsClient::placeholderAppPathForBundleIdentifier(std::string_view bundleIdentifier) const {
  return joinedPath(joinedPath(_platform.process.temporaryDirectory(), placeholderDirectoryName), bundleIdentifier) +
         ".app";
}

bool AppsClient::createPlaceHolderPath(std::string_view path, std::string_view forBundleIdentifier,
                                       const Value& withAttributes) {
  ErrorRef error;
  const bool created = _platform.fileSystem.createDirectory(path, true, withAttributes, &error);
  if (!created || error) {
    _platform.transactionLog.logScenario("Harlune App Restore", 0, false, forBundleIdentifier,
                                         "Failed to create app directory");
  }
  say(_platform, "Created app directory for '%{public}@' at %{public}@ with err=%{public}@", forBundleIdentifier, path,
      error);
  return created;
}

bool AppsClient::writeIconData(std::optional<BytesView> iconData, std::string_view atPath,
                               std::uint64_t* returningFileSize, std::string_view forBundleIdentifier,
                               const Value& withAttributes) {
  if (!iconData) {
    sayError(_platform, "no icon data for '%{public}@'", forBundleIdentifier);
    return false;
  }
  const bool created = _platform.fileSystem.createFile(atPath, *iconData, withAttributes);
  std::uint64_t size = 0;
  ErrorRef error;
  if (created) {
    auto attributes = _platform.fileSystem.attributesOfItem(atPath, &error);
    if (attributes && !error) {
      size = attributes->size;
      if (returningFileSize) *returningFileSize = size;
    }
  }
  say(_platform, "icon data for '%{public}@' was writen to %{public}@ with status:%d fileSize:%llu",
      forBundleIdentifier, atPath, created, size);
  return created;
}

}  // namespace appsync
