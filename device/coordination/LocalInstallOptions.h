#pragma once

#include <memory>
#include <string>

#include "device/boundary/Boundary.h"
#include "device/records/CoordinatorRecord.h"
#include "platform/CVInstallOptions.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"

namespace device {

/// Install options in the making; a coordinator copies them when they are handed to it.
class LocalInstallOptions final : public platform::CVInstallOptions {
 public:
  explicit LocalInstallOptions(Boundary& boundary) : _boundary(boundary) {}

  InstallOptionsRecord record() const;

  void setHarluneMetadata(std::shared_ptr<platform::CVStoreMetadata> metadata) override;
  void setObInstallType(std::uint64_t type) override;
  void setInstallTargetType(std::uint64_t type) override;
  std::string describe() const override;

 private:
  Boundary& _boundary;
  mutable platform::Mutex _mutex;
  InstallOptionsRecord _record GUARDED_BY(_mutex);
};

}  // namespace device
