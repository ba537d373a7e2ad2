#include "device/coordination/LocalInstallOptions.h"

#include "device/coordination/LocalStoreMetadata.h"

namespace device {

namespace {
constexpr const char* className = "CVInstallOptions";
using Lock = platform::Mutex::Lock;
}  // namespace

InstallOptionsRecord LocalInstallOptions::record() const {
  Lock lock(_mutex);
  return _record;
}

void LocalInstallOptions::setHarluneMetadata(std::shared_ptr<platform::CVStoreMetadata> metadata) {
  _boundary.call({{className, "setHarluneMetadata"}}, nullptr, {{"metadata", metadata}}, [&] {
    auto ours = std::dynamic_pointer_cast<LocalStoreMetadata>(metadata);
    Lock lock(_mutex);
    _record.metadata = ours ? ours->dictionary : SharedValue();
  });
}

void LocalInstallOptions::setObInstallType(std::uint64_t type) {
  _boundary.call({{className, "setObInstallType"}}, nullptr, {{"type", type}}, [&] {
    Lock lock(_mutex);
    _record.installType = type;
  });
}

void LocalInstallOptions::setInstallTargetType(std::uint64_t type) {
  _boundary.call({{className, "setInstallTargetType"}}, nullptr, {{"type", type}}, [&] {
    Lock lock(_mutex);
    _record.installTargetType = type;
  });
}

std::string LocalInstallOptions::describe() const {
  Lock lock(_mutex);
  return "<CVInstallOptions type " + std::to_string(_record.installType) + " target " +
         std::to_string(_record.installTargetType) + '>';
}

}  // namespace device
