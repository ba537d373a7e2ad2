#pragma once

#include <string_view>
#include <type_traits>

#include "core/AppsClient.h"
#include "core/ServiceCall.h"

namespace appsync {

/// The preparation of one restored app: made when it starts, gone when it has ended. Whether the app was demoted
/// decides its coordinator, the words, and who delivers the package: nobody, or the store.
class AppsClient::CoordinatedRestore {
 public:
  CoordinatedRestore(AppsClient& client, const RestoreInput& input, std::uint64_t demotionStatus);

  /// Prepares the coordinator, or cancels what was set up. An exception on the way is a failure like any other.
  bool run();

 private:
  void sayBeginning() const;
  void sayEnd(bool prepared) const;
  bool prepare();
  /// Metadata and coordinator; false when either cannot be had.
  bool acquire();
  bool storeDeliversPackage();
  bool addUserDataPromise();
  bool addPlaceholderPromise();
  bool leavePackageToStore();
  void cancel();

  /// `callAndTell` about this app; keeps the error of a failure.
  template <class Call>
  bool step(Call&& call, platform::MessageFormat<ErrorRef, std::string_view> failed,
            platform::MessageFormat<std::string_view> done) {
    ErrorRef error;
    const bool succeeded = callAndTell(_platform, _bundleIdentifier, error, call, failed, done);
    if (!succeeded) _error = error;
    return succeeded;
  }

  AppsClient& _client;
  const Platform& _platform;
  const RestoreInput& _input;
  const std::uint64_t _demotionStatus;
  const bool _demoted;
  const std::string_view _bundleIdentifier;
  const ErrorRef _cancellationReason;  // made beforehand: what fails for want of memory is to be cancelled too

  Value _metadata;  // dictionary
  CoordinatorRef _coordinator;
  PlaceholderRef _unattachedPlaceholder;
  bool _isStores = false;  // an earlier run of this restore handed the app over already
  ErrorRef _error;         // of the step that failed
};

}  // namespace appsync
