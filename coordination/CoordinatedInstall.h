#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

#include "core/AppsClient.h"
#include "core/ServiceCall.h"

namespace appsync {

/// The preparation of one app's install: made when it starts, gone when it has ended.
class AppsClient::CoordinatedInstall {
 public:
  CoordinatedInstall(AppsClient& client, const platform::TSAsset& asset, bool existingApp);

  /// Prepares the coordinator, or cancels what was set up. An exception on the way is a failure like any other.
  bool run();

 private:
  /// Up to the placeholder promise; false ends the preparation as failed.
  bool prepare();
  bool setInstallOptions();
  bool setInitialZDRAssetPromises();
  bool addAppAssetPromise();
  /// The size of the icon copied into the placeholder's directory; 0 when there is none.
  std::uint64_t stageIcon();
  std::uint64_t copyIcon(const std::string& source);
  /// A failure in here leaves the placeholder as it is at that moment; it is attached all the same.
  void configurePlaceholder(std::uint64_t iconSize);
  bool setAttributes();
  void cancel();

  /// `callAndTell` about this app; the error is noted.
  template <class Call, class... Shown>
  bool step(Call&& call, platform::MessageFormat<ErrorRef, std::string_view> failed,
            platform::MessageFormat<std::type_identity_t<Shown>..., std::string_view> done, const Shown&... shown) {
    ErrorRef error;
    const bool succeeded = callAndTell(_platform, _bundleIdentifier, error, call, failed, done, shown...);
    note(error);
    return succeeded;
  }
  /// Keeps the error that a call answered, if any, as the last one of this preparation.
  void note(const ErrorRef& error);

  AppsClient& _client;
  const Platform& _platform;
  const bool _existingApp;
  const ErrorRef _cancellationReason;  // made beforehand: what fails for want of memory is to be cancelled too

  const std::string _bundleIdentifier;
  const std::optional<std::string> _prettyName;
  const std::optional<std::string> _version;
  const std::optional<std::string> _sourceIcon;
  const Value _manifest;  // dictionary, or absent
  const Value _store;     // dictionary, or absent
  const bool _launchProhibited;
  std::string _iconPath;  // in the placeholder's directory

  CoordinatorRef _coordinator;
  PlaceholderRef _placeholder;
  std::shared_ptr<platform::CVStoreMetadata> _storeMetadata;
  ErrorRef _lastError;
};

}  // namespace appsync
