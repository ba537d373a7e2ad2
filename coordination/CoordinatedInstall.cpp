#include "coordination/CoordinatedInstall.h"

#include "coordination/CancellationReason.h"
#include "coordination/TransactionStep.h"
#include "core/PathCheck.h"
#include "core/Paths.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "platform/FileSystem.h"
#include "platform/Installer.h"

namespace appsync {

using namespace platform;

constexpr std::uint64_t installTargetType = 1;

bool AppsClient::prepareAppForInstallUsingCoordination(const TSAssetRef& asset, bool existingApp) {
  return CoordinatedInstall(*this, *asset, existingApp).run();
}

AppsClient::CoordinatedInstall::CoordinatedInstall(AppsClient& client, const TSAsset& asset, bool existingApp)
    : _client(client),
      _platform(client._platform),
      _existingApp(existingApp),
      _bundleIdentifier(asset.identifier()),
      _prettyName(asset.prettyName()),
      _version(stringOf(entryOf(asset.variantOptions(), "Version"))),
      _sourceIcon(asset.icon()),
      _manifest(readDictionary(_platform, asset.infoPlist())),
      _store(readDictionary(_platform, asset.storePlist())),
      _launchProhibited(entryOf(_manifest, "OBApplicationLaunchProhibited").boolValue()) {}

void AppsClient::CoordinatedInstall::note(const ErrorRef& error) {
  if (error) _lastError = error;
}

bool AppsClient::CoordinatedInstall::run() {
  say(_platform, LogCategory::summary,
      "processing app install for bundle '%{public}@', title %{public}@ assetplist %{public}@, version %{public}@ with "
      "install coordination",
      _bundleIdentifier, _prettyName, _manifest, _version);
  beginStep(_platform.transactionLog, TransactionStep::install, _bundleIdentifier,
            _existingApp ? "Update app" : "Install App");
  const bool prepared = prepare();
  say(_platform, "processing app install for bundle %{public}@ finished with status %d error %{public}@",
      _bundleIdentifier, prepared, _lastError);
  endStep(_platform.transactionLog, TransactionStep::install, prepared, _bundleIdentifier, "Install app");
  if (!prepared) cancel();
  return prepared;
}

bool AppsClient::CoordinatedInstall::prepare() {
  if (_bundleIdentifier.empty() && _prettyName.value_or("").empty()) return false;
  ErrorRef error;
  _coordinator = _client._initiatingOrUpdatingAppInstallCoordinatorForBundleIdentifier(_bundleIdentifier, _existingApp,
                                                                                       true, &error);
  note(error);
  if (!_coordinator) return false;
  _coordinator->setObserver(_client.weak_from_this());
  if (!setInstallOptions() || !setInitialZDRAssetPromises() || !addAppAssetPromise()) return false;
  if (_coordinator->hasPlaceholderPromise()) {
    say(_platform, "coordinator for %{public}@ has a placeholder promise", _bundleIdentifier);
    return true;
  }
  const std::uint64_t iconSize = stageIcon();
  _placeholder = _client._placeHolderForBundleIdentifier(_bundleIdentifier, _prettyName.value_or(_bundleIdentifier),
                                                         installType::sync);
  configurePlaceholder(iconSize);
  return attachPlaceholder();
}

bool AppsClient::CoordinatedInstall::setInstallOptions() {
  if (_coordinator->hasInstallOptions()) {
    say(_platform, "coordinator for %{public}@ has install options", _bundleIdentifier);
    return true;
  }
  _storeMetadata = _platform.installer.makeStoreMetadata(_store);
  auto options = _platform.installer.makeInstallOptions();
  if (options) {
    options->setHarluneMetadata(_storeMetadata);
    options->setObInstallType(installType::sync);
    options->setInstallTargetType(installTargetType);
  }
  ErrorRef error;
  const bool set = _coordinator->setInstallOptions(options, &error);
  note(error);
  if (!set) {
    sayError(_platform, "Error %{public}@ setting install options on coordinator for '%{public}@'", error,
             _bundleIdentifier);
    return false;
  }
  say(_platform, "set install options on coordinator for %{public}@", _bundleIdentifier);
  return true;
}

bool AppsClient::CoordinatedInstall::setInitialZDRAssetPromises() {
  if (_coordinator->hasInitialZDRAssetPromises()) {
    say(_platform, "coordinator for %{public}@ has an ZDR app asset promise", _bundleIdentifier);
    return true;
  }
  ErrorRef error;
  const bool set = _coordinator->setInitialZDRAssetPromises({}, &error);
  note(error);
  if (!set) {
    sayError(_platform, "Error %{public}@ setting ZDR asset promise for '%{public}@'", error, _bundleIdentifier);
    return false;
  }
  say(_platform, "set ZDR asset promise to install coordinator for %{public}@", _bundleIdentifier);
  return true;
}

bool AppsClient::CoordinatedInstall::addAppAssetPromise() {
  if (_coordinator->hasAppAssetPromise()) {
    say(_platform, "coordinator for %{public}@ has an app asset promise", _bundleIdentifier);
    return true;
  }
  return _client._createAppAssetPromiseForBundleIdentifier(_bundleIdentifier, std::nullopt, _coordinator) != nullptr;
}

std::uint64_t AppsClient::CoordinatedInstall::stageIcon() {
  const std::string directory = _client.placeholderAppPathForBundleIdentifier(_bundleIdentifier);
  if (!_client.createPlaceHolderPath(directory, _bundleIdentifier, ownerAttributes())) return 0;
  _iconPath = joinedPath(directory, iconFileName);
  return _sourceIcon ? copyIcon(*_sourceIcon) : 0;
}

std::uint64_t AppsClient::CoordinatedInstall::copyIcon(const std::string& source) {
  beginStep(_platform.transactionLog, TransactionStep::copyIcon, _bundleIdentifier, "Copying icon");
  std::uint64_t size = 0;
  ErrorRef error;
  const bool copied = _platform.fileSystem.copyItem(source, _iconPath, &error);
  note(error);
  if (copied) {
    ErrorRef attributesError;
    auto attributes = _platform.fileSystem.attributesOfItem(_iconPath, &attributesError);
    note(attributesError);
    if (attributes && !attributesError) size = attributes->size;
    if (attributesError) error = attributesError;  // else what a copy that succeeded reported besides stays told
    say(_platform, "icon for %{public}@ at %{public}@ has a size of %llu", _bundleIdentifier, _iconPath, size);
  }
  say(_platform, "Copied icon from %{public}@ to %{public}@ with error %{public}@ for '%{public}@', sizeOnDisk:%llu",
      source, _iconPath, error, _bundleIdentifier, size);
  // The step tells that copying was tried; its outcome is in the message.
  endStep(_platform.transactionLog, TransactionStep::copyIcon, true, _bundleIdentifier, "Copying icon");
  return size;
}

void AppsClient::CoordinatedInstall::configurePlaceholder(std::uint64_t iconSize) {
  if (!_placeholder) return;
  if (iconSize != 0 &&
      !_client._createIconPromiseForBundleIdentifier(_bundleIdentifier, _iconPath, iconSize, _placeholder, true)) {
    return;
  }
  if (setAttributes() && setMetadata()) closeConfiguration();
}

bool AppsClient::CoordinatedInstall::setAttributes() {
  auto attributes = _platform.installCoordination.makePlaceholderAttributesWithInfoPlistDictionary(_manifest);
  if (attributes) {
    attributes->setLaunchProhibited(_launchProhibited);
    attributes->setBundleVersion(_version);
  }
  ErrorRef error;
  const bool set = _placeholder->setPlaceholderAttributes(attributes, &error);
  note(error);
  if (!set) {
    sayError(_platform, "Error %{public}@ setting attributes on placeholder for '%{public}@'", error,
             _bundleIdentifier);
    return false;
  }
  say(_platform, "set %{public}@ attributes on placeholder for %{public}@", attributes, _bundleIdentifier);
  return true;
}

bool AppsClient::CoordinatedInstall::setMetadata() {
  ErrorRef error;
  const bool set = _placeholder->setMetadata(_storeMetadata, &error);
  note(error);
  if (!set) {
    sayError(_platform, "Error %{public}@ setting store metadata on placeholder for '%{public}@'", error,
             _bundleIdentifier);
    return false;
  }
  say(_platform, "set store metadata on placeholder for %{public}@", _bundleIdentifier);
  return true;
}

void AppsClient::CoordinatedInstall::closeConfiguration() {
  ErrorRef error;
  const bool closed = _placeholder->setConfigurationCompleteWithError(&error);
  note(error);
  if (closed) {
    say(_platform, "set placeholder configuration as complete for %{public}@", _bundleIdentifier);
  } else {
    sayError(_platform, "Error %{public}@ setting placeholder configuration as complete for '%{public}@'", error,
             _bundleIdentifier);
  }
}

bool AppsClient::CoordinatedInstall::attachPlaceholder() {
  ErrorRef error;
  const bool attached = _coordinator->setPlaceholderPromise(_placeholder, &error);
  note(error);
  if (!attached) {
    sayError(_platform, "Error %{public}@ adding placeholder promise to coordinator for '%{public}@'", error,
             _bundleIdentifier);
    _cancelsPlaceholder = true;
    return false;
  }
  say(_platform, "added placeholder promise to coordinator for %{public}@", _bundleIdentifier);
  return true;
}

void AppsClient::CoordinatedInstall::cancel() {
  const ErrorRef reason = cancellationReason(CancellationCode::installPreparationFailed);
  if (_placeholder && _cancelsPlaceholder) {
    say(_platform, "Cancelling placeholder for appBundleIdentifier:%{public}@", _bundleIdentifier);
    _placeholder->cancelForReason(reason, RVClientSync);
  }
  if (_coordinator) {
    say(_platform, "Cancelling coordinator for appBundleIdentifier:%{public}@", _bundleIdentifier);
    _coordinator->cancelForReason(reason, RVClientSync);
  }
}

}  // namespace appsync
