#include "device/services/TSSupportService.h"

#include <string>

#include "device/services/LocalAccountInfo.h"

namespace device {

platform::LogHandle& TSSupportService::TSGetLogCategory(int category) {
  platform::Mutex::Lock lock(_mutex);
  auto& handle = _categories[category];
  if (!handle) handle = _log.makeHandle(std::to_string(category));
  return *handle;
}

std::shared_ptr<platform::TSMutableAccountInfo> TSSupportService::makeAccountInfo() {
  return _boundary.call({{"TSSupport", "makeAccountInfo"}}, nullptr, {},
                        [&]() -> std::shared_ptr<platform::TSMutableAccountInfo> {
                          return std::make_shared<LocalAccountInfo>(_boundary);
                        });
}

}  // namespace device
