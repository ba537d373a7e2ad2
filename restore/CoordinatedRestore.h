#pragma once

#include <cstdint>
#include <string_view>

#include "core/AppsClient.h"
#include "platform/InstallCoordination.h"

namespace appsync {

/// The preparation of one restored app: made when it starts, gone when it has ended. The two kinds of restore
/// differ in their coordinator, their words and in who delivers the package.
class AppsClient::CoordinatedRestore {
 public:
  CoordinatedRestore(AppsClient& client, const RestoreInput& input, std::uint64_t demotionStatus);

  bool restoreDemotedApp();
  bool restoreApp();

 private:
  /// Metadata and coordinator; false when one of them is not to be had.
  bool acquire(platform::RVCoordinatorKind kind);
  bool addUserDataPromise();
  bool addPlaceholderPromise();
  bool leavePackageToStore();
  bool storeDeliversPackage();
  void cancel();

  AppsClient& _client;
  const Platform& _platform;
  const RestoreInput& _input;
  const std::uint64_t _demotionStatus;
  const std::string_view _bundleIdentifier;

  Value _metadata;  // dictionary
  CoordinatorRef _coordinator;
  PlaceholderRef _unattachedPlaceholder;
  ErrorRef _error;  // of the step that failed
};

}  // namespace appsync
