#pragma once

#include <cstdint>
#include <optional>

#include "platform/Error.h"
#include "platform/Value.h"

namespace platform {

enum class PropertyListFormat : std::uint8_t { xml, binary };

/// Reading and writing of property lists. Callable from any thread.
class PropertyListSerialization {
 public:
  virtual ~PropertyListSerialization() = default;

  /// Any format, recognised by its content. Absent when the bytes are not a property list.
  virtual Value propertyListWithData(Bytes bytes, ErrorRef* error = nullptr) = 0;
  /// Nothing when the value cannot be written in that format.
  virtual std::optional<Bytes> dataWithPropertyList(const Value& value, PropertyListFormat format,
                                                    ErrorRef* error = nullptr) = 0;
};

}  // namespace platform
