#pragma once

#include <string>

#include "platform/Mutex.h"
#include "platform/RVPlaceholder.h"

namespace tiny {

class Attributes final : public platform::RVPlaceholderAttributes {
 public:
  void setBundleVersion(std::optional<std::string> version) override { _version = std::move(version); }
  void setLaunchProhibited(bool) override {}  // no app of this device can be launched
  std::string describe() const override { return "<attributes>"; }
  const std::optional<std::string>& version() const { return _version; }

 private:
  std::optional<std::string> _version;
};

/// An app before its package is there. This device shows its name and version only, so what else is told about it is
/// taken and not kept.
class Placeholder final : public platform::RVPlaceholder {
 public:
  Placeholder(std::string name, std::string app, std::uint64_t installType)
      : name(std::move(name)), app(std::move(app)), installType(installType) {}

  const std::string name;
  const std::string app;
  const std::uint64_t installType;

  std::optional<std::string> version() {
    platform::Mutex::Lock lock(_mutex);
    return _version;
  }
  bool isCancelled() {
    platform::Mutex::Lock lock(_mutex);
    return _cancelled;
  }

  bool setIconPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>&, platform::ErrorRef* error) override {
    return change(error);
  }
  bool setMetadata(const std::shared_ptr<platform::CVStoreMetadata>&, platform::ErrorRef* error) override {
    return change(error);
  }
  bool setPlaceholderAttributes(const std::shared_ptr<platform::RVPlaceholderAttributes>& attributes,
                                platform::ErrorRef* error) override {
    if (!change(error)) return false;
    platform::Mutex::Lock lock(_mutex);
    if (auto ours = std::dynamic_pointer_cast<Attributes>(attributes)) _version = ours->version();
    return true;
  }
  bool setSinfData(platform::BytesView, platform::ErrorRef* error) override { return change(error); }
  bool setConfigurationCompleteWithError(platform::ErrorRef* error) override {
    if (!change(error)) return false;
    platform::Mutex::Lock lock(_mutex);
    _closed = true;
    return true;
  }
  bool cancelForReason(const platform::ErrorRef&, platform::RVClientIdentifier, platform::ErrorRef* error) override {
    platform::setError(error, nullptr);
    platform::Mutex::Lock lock(_mutex);
    _cancelled = true;
    return true;
  }
  std::string describe() const override { return "<placeholder " + app + '>'; }

 private:
  bool change(platform::ErrorRef* error) {
    platform::Mutex::Lock lock(_mutex);
    bool possible = !_closed && !_cancelled;
    platform::setError(error, possible ? nullptr : platform::makeError("TinyInstalls", 1, app + ": it is complete"));
    return possible;
  }

  platform::Mutex _mutex;
  // Guarded by _mutex.
  std::optional<std::string> _version;
  bool _closed = false;
  bool _cancelled = false;
};

}  // namespace tiny
