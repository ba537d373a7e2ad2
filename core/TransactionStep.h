#pragma once

#include <string_view>

#include "core/Say.h"
#include "platform/InstallTransactionLog.h"

namespace appsync {

/// The steps that the plug-in records in the install transaction log.
enum class TransactionStep : int {
  install = 1,
  restore = 2,
  createCoordinator = 3,
  createPlaceholder = 4,
  copyIcon = 5,
  uninstall = 7,
};

/// Like a message, a record that cannot be written is lost, and nothing else.
inline void beginStep(const Platform& platform, TransactionStep step, std::string_view bundleIdentifier,
                      std::string_view description) noexcept {
  contained(platform, "logStep", [&] {
    platform.transactionLog.logStep(static_cast<int>(step), 1, 1, true, bundleIdentifier, description);
  });
}

inline void endStep(const Platform& platform, TransactionStep step, bool success, std::string_view bundleIdentifier,
                    std::string_view description) noexcept {
  contained(platform, "logStep", [&] {
    platform.transactionLog.logStep(static_cast<int>(step), 1, 2, success, bundleIdentifier, description);
  });
}

/// A step that begins and ends in one scope: left without an end, by an exception, it ends as failed.
class StepScope {
 public:
  /// Begins the step. The texts outlive it.
  StepScope(const Platform& platform, TransactionStep step, std::string_view bundleIdentifier,
            std::string_view beginning, std::string_view ending) noexcept
      : _platform(platform), _step(step), _bundleIdentifier(bundleIdentifier), _ending(ending) {
    beginStep(platform, step, bundleIdentifier, beginning);
  }
  ~StepScope() {
    if (!_ended) end(false);
  }
  StepScope(const StepScope&) = delete;
  StepScope& operator=(const StepScope&) = delete;

  /// Once.
  void end(bool success) noexcept {
    _ended = true;
    endStep(_platform, _step, success, _bundleIdentifier, _ending);
  }

 private:
  const Platform& _platform;
  const TransactionStep _step;
  const std::string_view _bundleIdentifier;
  const std::string_view _ending;
  bool _ended = false;
};

}  // namespace appsync
