#include "core/AppsClient.h"
#include "core/CancellationReason.h"
#include "core/Names.h"
#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/ServiceCall.h"
#include "platform/Installer.h"
#include "platform/OBNumbers.h"
#include "restore/DemotionStatus.h"

namespace appsync {

using namespace platform;

namespace {

std::string displayNameOf(const Dictionary& metadata, std::string_view bundleIdentifier) {
  for (const char* key : {"title", "itemName"}) {
    if (auto name = metadata[key].string()) return std::string(*name);
  }
  return std::string(bundleIdentifier);
}

bool isLaunchProhibited(const Dictionary& metadata) {
  const Value& flag = metadata["OBApplicationLaunchProhibited"];
  return (flag.isAbsent() ? metadata["launchProhibited"] : flag).boolValue();
}

std::uint64_t installTypeFor(std::uint64_t demotionStatus) {
  switch (demotionStatus) {
    case demotedByHand:
      return installType::intentionalDowngrade;
    case demotedAutomatically:
      return installType::downgrade;
    default:
      return installType::restore;
  }
}

bool setAttributes(const Platform& platform, RVPlaceholder& placeholder, const Dictionary& metadata,
                   std::string_view bundleIdentifier) {
  auto attributes = platform.installCoordination.makePlaceholderAttributes();
  if (attributes) {
    attributes->setLaunchProhibited(isLaunchProhibited(metadata));
    attributes->setBundleVersion(stringOf(metadata["bundleVersion"]));
  }
  ErrorRef error;
  return callAndTell(
      platform, bundleIdentifier, error,
      [&](ErrorRef* failed) { return placeholder.setPlaceholderAttributes(attributes, failed); },
      "Error %{public}@ setting placeholder attributes for '%{public}@'",
      "set %{public}@ placeholder attributes for %{public}@", attributes);
}

bool setStoreMetadata(const Platform& platform, RVPlaceholder& placeholder, const Value& metadata,
                      std::string_view bundleIdentifier) {
  ErrorRef error;
  return callAndTell(
      platform, bundleIdentifier, error,
      [&](ErrorRef* failed) { return placeholder.setMetadata(platform.installer.makeStoreMetadata(metadata), failed); },
      "Error %{public}@ setting store metadata for '%{public}@'", "set store metadata on placeholder for %{public}@");
}

bool setSinfData(const Platform& platform, RVPlaceholder& placeholder, std::optional<BytesView> sinfData,
                 std::string_view bundleIdentifier) {
  if (!sinfData) return true;
  ErrorRef error;
  return callAndTell(
      platform, bundleIdentifier, error, [&](ErrorRef* failed) { return placeholder.setSinfData(*sinfData, failed); },
      "Error %{public}@ setting SINF data for '%{public}@'", "set SINF data on placeholder for %{public}@");
}

bool closeConfiguration(const Platform& platform, RVPlaceholder& placeholder, std::string_view bundleIdentifier) {
  ErrorRef error;
  return callAndTell(
      platform, bundleIdentifier, error,
      [&](ErrorRef* failed) { return placeholder.setConfigurationCompleteWithError(failed); },
      "Error %{public}@ setting placeholder configuration as complete for '%{public}@'",
      "set placeholder configuration complete for %{public}@");
}

}  // namespace

PlaceholderRef AppsClient::_placeHolderForBundleIdentifierWithHarluneMetadata(const RestoreInput& input,
                                                                              const Value& metadata,
                                                                              std::uint64_t demotionStatus) {
  const std::string_view identifier = input.bundleIdentifier;
  const Dictionary& entries = *metadata.dictionary();
  const std::string directory = placeholderAppPathForBundleIdentifier(identifier);
  if (!createPlaceHolderPath(directory, identifier, ownerAttributes())) return nullptr;
  const std::string iconPath = joinedPath(directory, iconFileName);
  std::uint64_t iconSize = 0;
  writeIconData(input.iconData, iconPath, &iconSize, identifier, ownerAttributes());

  const ErrorRef reason = cancellationReason(CancellationCode::restorePreparationFailed);
  auto placeholder =
      _placeHolderForBundleIdentifier(identifier, displayNameOf(entries, identifier), installTypeFor(demotionStatus));
  if (!placeholder) return nullptr;
  const bool configured = contained(_platform, "_placeHolderForBundleIdentifierWithHarluneMetadata", [&] {
    const bool hasIcon =
        iconSize == 0 || _createIconPromiseForBundleIdentifier(identifier, iconPath, iconSize, placeholder, false);
    return hasIcon && setAttributes(_platform, *placeholder, entries, identifier) &&
           setStoreMetadata(_platform, *placeholder, metadata, identifier) &&
           setSinfData(_platform, *placeholder, input.sinfData, identifier) &&
           closeConfiguration(_platform, *placeholder, identifier);
  });
  if (configured) return placeholder;
  placeholder->cancelForReason(reason, RVClientSync);
  return nullptr;
}

}  // namespace appsync
