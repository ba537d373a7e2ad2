#include "tsd/host/HostList.h"

#include <utility>

#include "plist/PropertyList.h"
#include "tsd/CommandError.h"
#include "tsd/conduit/HostFile.h"
#include "tsd/conduit/HostFolder.h"
#include "tsd/conduit/WholeFile.h"

namespace tsd {

namespace {

constexpr std::string_view binaryFront = "bplist";

bool isBinaryFile(const std::string& path) {
  auto file = HostFile::open("", path);
  auto front = file ? file->read(binaryFront.size()) : std::nullopt;
  return front && *front == binaryFront;
}

}  // namespace

HostList::HostList(std::string path, platform::Value::Kind kind)
    : _path(std::move(path)), _value(readHostList(_path, kind)), _isNew(_value.isAbsent()) {
  if (!_isNew)
    _isBinary = isBinaryFile(_path);
  else
    _value = kind == platform::Value::Kind::array ? platform::Value::makeArray() : platform::Value::makeDictionary();
}

void HostList::write() const { writeWholeFile(_path, propertyListOf(_value, _isBinary)); }

platform::Bytes propertyListOf(const platform::Value& value, bool binary) {
  platform::ErrorRef error;
  auto bytes = binary ? std::nullopt : plist::writeXML(value);
  if (!bytes) bytes = plist::writeBinary(value, &error);
  if (!bytes) throw CommandError("a property list that cannot be written: " + textOf(error));
  return std::move(*bytes);
}

}  // namespace tsd
