#include "coordination/CoordinatedInstall.h"

#include "core/CancellationReason.h"
#include "core/Names.h"
#include "core/PathCheck.h"
#include "core/PropertyListFile.h"
#include "core/Say.h"
#include "core/TransactionStep.h"
#include "platform/FileSystem.h"
#include "platform/Installer.h"
#include "platform/OBNumbers.h"

namespace appsync {

using namespace platform;

constexpr std::uint64_t installTargetType = 1;

bool AppsClient::prepareAppForInstallUsingCoordination(const TSAssetRef& asset, bool existingApp) {
  return contained(_platform, "prepareAppForInstallUsingCoordination",
                   [&] { return CoordinatedInstall(*this, *asset, existingApp).run(); });
}

AppsClient::CoordinatedInstall::CoordinatedInstall(AppsClient& client, const TSAsset& asset, bool existingApp)
    : _client(client),
      _platform(client._platform),
      _existingApp(existingApp),
      _cancellationReason(cancellationReason(CancellationCode::installPreparationFailed)),
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
  StepScope transaction(_platform, TransactionStep::install, _bundleIdentifier,
                        _existingApp ? "Update app" : "Install App", "Install app");
  const bool prepared = contained(_platform, "prepareAppForInstallUsingCoordination", [this] { return prepare(); });
  say(_platform, "processing app install for bundle %{public}@ finished with status %d error %{public}@",
      _bundleIdentifier, prepared, _lastError);
  transaction.end(prepared);
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
  return step([&](ErrorRef* failed) { return _coordinator->setPlaceholderPromise(_placeholder, failed); },
              "Error %{public}@ adding placeholder promise to coordinator for '%{public}@'",
              "added placeholder promise to coordinator for %{public}@");
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
  return step([&](ErrorRef* error) { return _coordinator->setInstallOptions(options, error); },
              "Error %{public}@ setting install options on coordinator for '%{public}@'",
              "set install options on coordinator for %{public}@");
}

bool AppsClient::CoordinatedInstall::setInitialZDRAssetPromises() {
  if (_coordinator->hasInitialZDRAssetPromises()) {
    say(_platform, "coordinator for %{public}@ has an ZDR app asset promise", _bundleIdentifier);
    return true;
  }
  return step([&](ErrorRef* error) { return _coordinator->setInitialZDRAssetPromises({}, error); },
              "Error %{public}@ setting ZDR asset promise for '%{public}@'",
              "set ZDR asset promise to install coordinator for %{public}@");
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
  StepScope transaction(_platform, TransactionStep::copyIcon, _bundleIdentifier, "Copying icon", "Copying icon");
  std::uint64_t size = 0;
  ErrorRef error;
  const bool copied = _platform.fileSystem.copyItem(source, _iconPath, &error);
  note(error);
  if (copied) {
    ErrorRef attributesError;
    auto attributes = _platform.fileSystem.attributesOfItem(_iconPath, &attributesError);
    note(attributesError);
    if (attributes && !attributesError) size = attributes->size;
    if (attributesError) error = attributesError;  // otherwise what a copy that succeeded reported stays the error
    say(_platform, "icon for %{public}@ at %{public}@ has a size of %llu", _bundleIdentifier, _iconPath, size);
  }
  say(_platform, "Copied icon from %{public}@ to %{public}@ with error %{public}@ for '%{public}@', sizeOnDisk:%llu",
      source, _iconPath, error, _bundleIdentifier, size);
  // The step tells that copying was tried; its outcome is in the message.
  transaction.end(true);
  return size;
}

void AppsClient::CoordinatedInstall::configurePlaceholder(std::uint64_t iconSize) {
  if (!_placeholder) return;
  if (iconSize != 0 &&
      !_client._createIconPromiseForBundleIdentifier(_bundleIdentifier, _iconPath, iconSize, _placeholder, true)) {
    return;
  }
  if (!setAttributes()) return;
  if (!step([&](ErrorRef* error) { return _placeholder->setMetadata(_storeMetadata, error); },
            "Error %{public}@ setting store metadata on placeholder for '%{public}@'",
            "set store metadata on placeholder for %{public}@")) {
    return;
  }
  step([&](ErrorRef* error) { return _placeholder->setConfigurationCompleteWithError(error); },
       "Error %{public}@ setting placeholder configuration as complete for '%{public}@'",
       "set placeholder configuration as complete for %{public}@");
}

bool AppsClient::CoordinatedInstall::setAttributes() {
  auto attributes = _platform.installCoordination.makePlaceholderAttributesWithInfoPlistDictionary(_manifest);
  if (attributes) {
    attributes->setLaunchProhibited(_launchProhibited);
    attributes->setBundleVersion(_version);
  }
  return step([&](ErrorRef* error) { return _placeholder->setPlaceholderAttributes(attributes, error); },
              "Error %{public}@ setting attributes on placeholder for '%{public}@'",
              "set %{public}@ attributes on placeholder for %{public}@", attributes);
}

void AppsClient::CoordinatedInstall::cancel() {
  // A placeholder of a preparation that failed was not attached; the coordinator's end would not reach it.
  if (_placeholder) {
    say(_platform, "Cancelling placeholder for appBundleIdentifier:%{public}@", _bundleIdentifier);
    contained(_platform, "cancelForReason", [&] { _placeholder->cancelForReason(_cancellationReason, RVClientSync); });
  }
  if (_coordinator) {
    say(_platform, "Cancelling coordinator for appBundleIdentifier:%{public}@", _bundleIdentifier);
    contained(_platform, "cancelForReason", [&] { _coordinator->cancelForReason(_cancellationReason, RVClientSync); });
  }
}

}  // namespace appsync
