#include "device/services/BackupServiceLocal.h"

namespace device {

using platform::ErrorRef;

class BackupServiceLocal::Manager final : public platform::CLManager {
 public:
  explicit Manager(BackupServiceLocal& service) : _service(service) {}

  bool tessaroShouldCreateAppPlaceholdersWithError(ErrorRef* error) override {
    return _service._boundary.call({{"CLManager", "tessaroShouldCreateAppPlaceholdersWithError"}}, error, {}, [&] {
      auto settings = _service._settings();
      platform::setError(error, settings.backupFails
                                    ? platform::makeError("BackupService", 1, "the backup service is set to fail")
                                    : nullptr);
      return settings.wantsPlaceholders.value_or(!settings.backupFails);
    });
  }

 private:
  BackupServiceLocal& _service;
};

std::shared_ptr<platform::CLManager> BackupServiceLocal::makeBackupManager() {
  return _boundary.call({{"BackupService", "makeBackupManager"}}, nullptr, {},
                        [&]() -> std::shared_ptr<platform::CLManager> { return std::make_shared<Manager>(*this); });
}

}  // namespace device
