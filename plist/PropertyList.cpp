#include "plist/PropertyList.h"

#include <new>
#include <stdexcept>

#include "plist/BinaryReader.h"
#include "plist/BinaryWriter.h"
#include "plist/Failure.h"
#include "plist/XMLReader.h"
#include "plist/XMLWriter.h"

namespace plist {
namespace {

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;
using platform::Value;

/// The first character that is not white space is "<", in any encoding that XML comes in.
bool looksLikeXML(BytesView input) {
  std::size_t at = 0;
  if (input.starts_with("\xef\xbb\xbf")) at = 3;
  if (input.starts_with("\xfe\xff") || input.starts_with("\xff\xfe")) at = 2;
  at = input.find_first_not_of(BytesView(" \t\r\n\0", 5), at);
  return at != BytesView::npos && input[at] == '<';
}

Value readAnyForm(Bytes input, ErrorRef& error) {
  if (input.size() > maximumInput) {
    error = failure(ErrorCode::tooLarge, "a document of more than 4 GiB");
    return {};
  }
  if (input.starts_with("bplist00")) return readBinary(std::move(input), error);
  if (looksLikeXML(input)) return readXML(std::move(input), error);
  if (input.starts_with("bplist")) {
    error = failure(ErrorCode::unsupported, "byte 6: a binary property list of an unknown version");
  } else {
    error = failure(ErrorCode::notAPropertyList,
                    input.empty() ? "an empty document" : "neither an XML nor a binary property list");
  }
  return {};
}

/// Runs the operation and lets nothing it throws out.
template <class Operation>
auto guarded(ErrorRef* error, Operation operation) -> decltype(operation(*error)) {
  ErrorRef failed;
  decltype(operation(*error)) result{};
  try {
    result = operation(failed);
  } catch (const std::bad_alloc&) {
    failed = failure(ErrorCode::outOfMemory, "out of memory");
  } catch (const std::length_error&) {
    failed = failure(ErrorCode::tooLarge, "more than memory can hold");
  }
  platform::setError(error, failed);
  return result;
}

}  // namespace

Value read(Bytes input, ErrorRef* error) {
  return guarded(error, [&](ErrorRef& failed) { return readAnyForm(std::move(input), failed); });
}

std::optional<Bytes> writeBinary(const Value& value, ErrorRef* error) {
  return guarded(error, [&](ErrorRef& failed) { return BinaryWriter(true).write(value, failed); });
}

std::optional<Bytes> writeXML(const Value& value, ErrorRef* error) {
  return guarded(error, [&](ErrorRef& failed) { return XMLWriter().write(value, failed); });
}

}  // namespace plist
