#pragma once

#include <memory>
#include <utility>

#include "platform/Value.h"

namespace device {

/// A value that never changes, shared by the records that hold it: copying a record copies no list. Absent when made
/// without one.
class SharedValue {
 public:
  SharedValue() = default;
  SharedValue(platform::Value value)
      : _value(value.isAbsent() ? nullptr : std::make_shared<const platform::Value>(std::move(value))) {}

  operator const platform::Value&() const { return value(); }
  const platform::Value& value() const {
    static const platform::Value absent{};
    return _value ? *_value : absent;
  }
  bool isAbsent() const { return !_value; }
  /// Whether it is the very same value, not one that is equal.
  bool isSame(const SharedValue& other) const { return _value == other._value; }
  const platform::Dictionary* dictionary() const { return value().dictionary(); }

 private:
  std::shared_ptr<const platform::Value> _value;
};

}  // namespace device
