#pragma once

#include <functional>
#include <string_view>
#include <utility>

#include "device/boundary/Boundary.h"
#include "platform/PropertyListSerialization.h"
#include "plist/ListMemory.h"

namespace device {

/// The property-list codec behind the boundary.
class PropertyListService final : public platform::PropertyListSerialization {
 public:
  /// Told of every file that is not the list it ought to be, as the plug-in passes over some in silence: its path and
  /// the reason; what was being done is "reading the property list", or `readingAnEntry` of one that is used
  /// without it. From any thread. May be null.
  using Unreadable = std::function<void(std::string_view operation, std::string_view path, std::string_view reason)>;
  PropertyListService(Boundary& boundary, Unreadable unreadable)
      : _boundary(boundary), _unreadable(std::move(unreadable)) {}

  platform::Value propertyListWithData(platform::Bytes bytes, platform::ErrorRef* error) override;
  std::optional<platform::Bytes> dataWithPropertyList(const platform::Value& value, platform::PropertyListFormat format,
                                                      platform::ErrorRef* error) override;

 private:
  Boundary& _boundary;
  plist::ListMemory _lists;  // the todo list, above all: read and written whole with every mark
  const Unreadable _unreadable;
};

}  // namespace device
