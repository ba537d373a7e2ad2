#include "device/services/PropertyListService.h"

#include <string>
#include <utility>

#include "device/services/LastRead.h"
#include "device/services/ListProblem.h"
#include "plist/PropertyList.h"

namespace device {

using platform::Bytes;
using platform::ErrorRef;
using platform::PropertyListFormat;
using platform::Value;

Value PropertyListService::propertyListWithData(Bytes bytes, ErrorRef* error) {
  const std::size_t size = bytes.size();
  // The reason is wanted here also when the caller does not want it.
  ErrorRef reason;
  Value value = _boundary.call({{"PropertyListSerialization", "propertyListWithData"}}, &reason,
                               {{"bytes", CallArgument::BytesCount{size}}},
                               [&] { return _lists.read(std::move(bytes), &reason); });
  LastRead& file = LastRead::ofThisThread();
  if (file.isWhole(size) && _unreadable && !Boundary::isDeclined(reason)) {
    const std::string problem = !value.isAbsent() ? problemOfList(file.path(), value)
                                : reason          ? reason->description()
                                                  : "no reason given";
    if (!problem.empty()) _unreadable("reading the property list", file.path(), problem);
    const std::string passedOver = problem.empty() ? problemOfEntry(file.path(), value) : "";
    if (!passedOver.empty()) _unreadable(readingAnEntry, file.path(), passedOver);
  }
  platform::setError(error, std::move(reason));
  return value;
}

std::optional<Bytes> PropertyListService::dataWithPropertyList(const Value& value, PropertyListFormat format,
                                                               ErrorRef* error) {
  bool isXML = format == PropertyListFormat::xml;
  Crossing crossing{{"PropertyListSerialization", "dataWithPropertyList"}};
  crossing.answersBytes = true;
  return _boundary.call(crossing, error, {{"value", value}, {"format", isXML ? "xml" : "binary"}},
                        [&] { return isXML ? plist::writeXML(value, error) : _lists.writeBinary(value, error); });
}

}  // namespace device
