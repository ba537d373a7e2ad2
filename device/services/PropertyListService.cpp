#include "device/services/PropertyListService.h"

#include <utility>

#include "plist/PropertyList.h"

namespace device {

using platform::Bytes;
using platform::ErrorRef;
using platform::PropertyListFormat;
using platform::Value;

Value PropertyListService::propertyListWithData(Bytes bytes, ErrorRef* error) {
  return _boundary.call({"PropertyListSerialization", "propertyListWithData"}, error,
                        {{"bytes", CallArgument::BytesCount{bytes.size()}}},
                        [&] { return plist::read(std::move(bytes), error); });
}

std::optional<Bytes> PropertyListService::dataWithPropertyList(const Value& value, PropertyListFormat format,
                                                               ErrorRef* error) {
  bool isXML = format == PropertyListFormat::xml;
  Crossing crossing{"PropertyListSerialization", "dataWithPropertyList"};
  crossing.answersBytes = true;
  return _boundary.call(crossing, error, {{"value", value}, {"format", isXML ? "xml" : "binary"}},
                        [&] { return isXML ? plist::writeXML(value, error) : plist::writeBinary(value, error); });
}

}  // namespace device
