#pragma once

#include <string>
#include <vector>

#include "platform/Installer.h"
#include "platform/Mutex.h"

namespace tiny {

/// Remembers which apps were uninstalled. What it makes for installs is taken and has no effect on this device.
class InstallerService final : public platform::Installer {
 public:
  void note(const std::string& app) {
    platform::Mutex::Lock lock(_mutex);
    _uninstalled.dictionary()->set(app, platform::Value::makeDictionary());
  }
  void forget(const std::string& app) { CorvaneClearUninstalled({app}); }

  platform::Value CorvaneLookupUninstalled() override {
    platform::Mutex::Lock lock(_mutex);
    return _uninstalled;
  }
  int CorvaneClearUninstalled(const std::vector<std::string>& bundleIdentifiers) override {
    platform::Mutex::Lock lock(_mutex);
    for (const auto& app : bundleIdentifiers) _uninstalled.dictionary()->remove(app);
    return 0;
  }
  std::shared_ptr<platform::CVStoreMetadata> makeStoreMetadata(const platform::Value& dictionary) override {
    return dictionary.dictionary() ? std::make_shared<Metadata>() : nullptr;
  }
  std::shared_ptr<platform::CVInstallOptions> makeInstallOptions() override { return std::make_shared<Options>(); }

 private:
  class Metadata final : public platform::CVStoreMetadata {
    std::string describe() const override { return "<store metadata>"; }
  };
  class Options final : public platform::CVInstallOptions {
    void setHarluneMetadata(std::shared_ptr<platform::CVStoreMetadata>) override {}
    void setObInstallType(std::uint64_t) override {}
    void setInstallTargetType(std::uint64_t) override {}
    std::string describe() const override { return "<install options>"; }
  };

  platform::Mutex _mutex;
  platform::Value _uninstalled = platform::Value::makeDictionary();  // guarded by _mutex
};

}  // namespace tiny
