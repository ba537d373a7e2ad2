#pragma once

#include <cstdint>
#include <optional>

#include "platform/Error.h"
#include "platform/Value.h"

namespace platform {

/// The errors that say that bytes are not a property list for any reader.
namespace propertyListError {
constexpr const char* domain = "plist";
constexpr std::int64_t notAPropertyList = 1;  // empty, or of no known format
constexpr std::int64_t malformed = 2;         // breaks the rules of its format
}  // namespace propertyListError

enum class PropertyListFormat : std::uint8_t { xml, binary };

/// Reading and writing of property lists. Callable from any thread.
class PropertyListSerialization {
 public:
  virtual ~PropertyListSerialization() = default;

  /// Any format, recognised by its content. Absent when the bytes are not a property list: then, and only then, the
  /// error is one of `propertyListError`. Absent, with any other
  /// error, also when this reader refuses what another may take, or when memory runs out.
  virtual Value propertyListWithData(Bytes bytes, ErrorRef* error = nullptr) = 0;
  /// Nothing when the value cannot be written in that format.
  virtual std::optional<Bytes> dataWithPropertyList(const Value& value, PropertyListFormat format,
                                                    ErrorRef* error = nullptr) = 0;
};

/// Whether reading failed because of the bytes themselves.
inline bool isNoPropertyList(const Value& root, const ErrorRef& error) {
  if (!root.isAbsent() || !error || error->domain() != propertyListError::domain) return false;
  return error->code() == propertyListError::notAPropertyList || error->code() == propertyListError::malformed;
}

}  // namespace platform
