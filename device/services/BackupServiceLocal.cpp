#include "device/services/BackupServiceLocal.h"

#include <charconv>

namespace device {

using platform::ErrorRef;

static ErrorRef errorOfSetting(std::string_view text) {
  if (text.empty()) return nullptr;
  std::int64_t code = 1;
  auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), code);
  if (failure == std::errc()) text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  if (!text.empty() && text[0] == ':') text.remove_prefix(1);
  return platform::makeError("BackupService", code, std::string(text));
}

class BackupServiceLocal::Manager final : public platform::CLManager {
 public:
  explicit Manager(BackupServiceLocal& service) : _service(service) {}

  bool tessaroShouldCreateAppPlaceholdersWithError(ErrorRef* error) override {
    return _service._boundary.call({"CLManager", "tessaroShouldCreateAppPlaceholdersWithError"}, error, {}, [&] {
      ErrorRef reason = errorOfSetting(_service._setting("backup-error"));
      auto answer = _service._setting("backup-placeholders");
      bool wanted = answer.empty() ? reason == nullptr : answer == "wanted";
      platform::setError(error, std::move(reason));
      return wanted;
    });
  }

 private:
  BackupServiceLocal& _service;
};

std::shared_ptr<platform::CLManager> BackupServiceLocal::makeBackupManager() {
  return _boundary.call({"BackupService", "makeBackupManager"}, nullptr, {},
                        [&]() -> std::shared_ptr<platform::CLManager> { return std::make_shared<Manager>(*this); });
}

}  // namespace device
