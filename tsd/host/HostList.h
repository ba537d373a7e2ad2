#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

/// One of a host's lists, to be changed: read whole, and written whole in the form that it had, XML where it is new.
class HostList {
 public:
  /// Empty when there is no such file. Throws a `CommandError` that names the file, and the place in it, when it cannot
  /// be read, or is not of that kind.
  HostList(std::string path, platform::Value::Kind kind);

  /// Of that kind.
  platform::Value& value() { return _value; }
  const platform::Value& value() const { return _value; }
  const std::string& path() const { return _path; }
  bool isNew() const { return _isNew; }
  /// Throws a `CommandError` that names the file; the old list is there then.
  void write() const;

 private:
  const std::string _path;
  platform::Value _value;
  bool _isNew = false;
  bool _isBinary = false;
};

/// A property list's bytes: XML where `binary` does not say otherwise and XML has characters for all of it. Throws a
/// `CommandError` when it is in neither form.
platform::Bytes propertyListOf(const platform::Value& value, bool binary);

}  // namespace tsd
