#pragma once

#include <memory>
#include <string>

#include "device/boundary/Boundary.h"
#include "device/install/InstallEngine.h"
#include "device/records/CoordinatorRecord.h"
#include "device/reports/Coordinator.h"
#include "platform/Mutex.h"
#include "platform/RVPlaceholder.h"
#include "platform/ThreadSafety.h"

namespace device {

class LocalTransferPromise;

/// A placeholder in the making. A coordinator copies it when it is attached.
class LocalPlaceholder final : public platform::RVPlaceholder {
 public:
  LocalPlaceholder(InstallEngine& engine, Boundary& boundary, PlaceholderRecord record);

  /// Makes the placeholder as it is now the coordinator's. Succeeds once; failed attempts may be repeated.
  bool attachTo(Coordinator& coordinator, platform::ErrorRef* error);

  bool setIconPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise,
                      platform::ErrorRef* error) override;
  bool setMetadata(const std::shared_ptr<platform::CVStoreMetadata>& metadata, platform::ErrorRef* error) override;
  bool setPlaceholderAttributes(const std::shared_ptr<platform::RVPlaceholderAttributes>& attributes,
                                platform::ErrorRef* error) override;
  bool setSinfData(platform::BytesView data, platform::ErrorRef* error) override;
  bool setConfigurationCompleteWithError(platform::ErrorRef* error) override;
  bool cancelForReason(const platform::ErrorRef& reason, platform::RVClientIdentifier client,
                       platform::ErrorRef* error) override;
  std::string describe() const override;

 private:
  bool take(Coordinator& coordinator, PlaceholderRecord& record, std::shared_ptr<LocalTransferPromise>& icon,
            platform::ErrorRef* error) EXCLUDES(_mutex);
  /// Runs `edit` on the record, unless it may no longer be changed.
  template <class Edit>
  bool change(platform::ErrorRef* error, Edit&& edit) EXCLUDES(_mutex);

  InstallEngine& _engine;
  Boundary& _boundary;
  const std::string _app;
  const std::string _describe;
  platform::Mutex _mutex;
  PlaceholderRecord _record GUARDED_BY(_mutex);
  std::shared_ptr<LocalTransferPromise> _icon GUARDED_BY(_mutex);
  bool _cancelled GUARDED_BY(_mutex) = false;
  std::weak_ptr<Coordinator> _coordinator GUARDED_BY(_mutex);
};

}  // namespace device
