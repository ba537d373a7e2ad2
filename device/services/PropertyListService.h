#pragma once

#include "device/boundary/Boundary.h"
#include "platform/PropertyListSerialization.h"

namespace device {

/// The property-list codec behind the boundary.
class PropertyListService final : public platform::PropertyListSerialization {
 public:
  explicit PropertyListService(Boundary& boundary) : _boundary(boundary) {}

  platform::Value propertyListWithData(platform::Bytes bytes, platform::ErrorRef* error) override;
  std::optional<platform::Bytes> dataWithPropertyList(const platform::Value& value, platform::PropertyListFormat format,
                                                      platform::ErrorRef* error) override;

 private:
  Boundary& _boundary;
};

}  // namespace device
