#include "device/services/InstallerService.h"

#include "device/coordination/LocalInstallOptions.h"
#include "device/coordination/LocalStoreMetadata.h"

namespace device {

namespace {
constexpr const char* className = "Installer";
using Lock = AppRecords::Lock;
}  // namespace

platform::Value InstallerService::CorvaneLookupUninstalled() {
  return _boundary.call({{className, "CorvaneLookupUninstalled"}}, nullptr, {}, [&] {
    auto result = platform::Value::makeDictionary();
    Lock lock(_records);
    for (const auto& [app, facts] : _records.state().uninstalled) result.dictionary()->set(app, facts);
    return result;
  });
}

int InstallerService::CorvaneClearUninstalled(const std::vector<std::string>& bundleIdentifiers) {
  return _boundary.call(
      {{className, "CorvaneClearUninstalled"}}, nullptr, {{"bundleIdentifiers", bundleIdentifiers}},
      [&] {
        ChangeSet changes;
        for (const auto& app : bundleIdentifiers) changes.removeUninstalled(app);
        Lock lock(_records);
        return _records.commit(std::move(changes)) ? 0 : -1;
      },
      -1);
}

std::shared_ptr<platform::CVStoreMetadata> InstallerService::makeStoreMetadata(const platform::Value& dictionary) {
  return _boundary.call({{className, "makeStoreMetadata"}}, nullptr, {{"dictionary", dictionary}},
                        [&]() -> std::shared_ptr<platform::CVStoreMetadata> {
                          if (!dictionary.dictionary()) return nullptr;
                          return std::make_shared<LocalStoreMetadata>(dictionary);
                        });
}

std::shared_ptr<platform::CVInstallOptions> InstallerService::makeInstallOptions() {
  return _boundary.call({{className, "makeInstallOptions"}}, nullptr, {},
                        [&]() -> std::shared_ptr<platform::CVInstallOptions> {
                          return std::make_shared<LocalInstallOptions>(_boundary);
                        });
}

}  // namespace device
