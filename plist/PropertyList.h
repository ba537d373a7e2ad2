#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "platform/Error.h"
#include "platform/PropertyListSerialization.h"
#include "platform/Value.h"

/// The property-list codec: both forms of a document, binary ("bplist00") and XML.
///
/// Callable from any thread. Nothing throws; a call that fails has no result but an error of the domain "plist",
/// whose description names what is wrong and where: "byte N" of a binary document, "line N" of an XML one.
///
/// What a document may hold is the same in both forms:
/// - integers from -2^63 to 2^64 - 1 (above 2^63 - 1 a binary document has them in 16 bytes);
/// - reals of any kind, infinities and NaN among them;
/// - dates from 0001-01-01T00:00:00Z to 9999-12-31T23:59:59Z, proleptic Gregorian. An XML document has whole
///   seconds only: writing one drops fractions;
/// - strings of valid Unicode. In XML only of characters that XML can carry: no control characters but tab, line
///   feed and carriage return, and neither U+FFFE nor U+FFFF. They are kept to the letter, white space included;
/// - dictionaries whose keys are strings and differ: a key that appears twice is refused;
/// - containers at most `maximumDepth` deep.
/// UIDs, sets and null, which some documents of the binary form hold, have no value here and are refused.
///
/// A document-type line of an XML document is passed over; one with declarations is refused. A binary document
/// may refer to one object from many places, and each place gets a value of its own. So that a short document cannot
/// become a huge tree, it is refused when its tree has more than `maximumNodes(size)` values, or more than
/// `maximumText(size)` bytes of text and data over all places. XML documents cannot reach either limit.
namespace plist {

inline constexpr const char* errorDomain = platform::propertyListError::domain;

enum class ErrorCode : std::int64_t {
  notAPropertyList = platform::propertyListError::notAPropertyList,  // empty, or neither of the two forms
  malformed = platform::propertyListError::malformed,                // breaks the rules of its form
  unsupported = 3,  // well-formed, but not read here: UID, set, null, declarations, encoding, version
  duplicateKey = 4,
  outOfRange = 5,  // a number or a date
  tooDeep = 6,
  tooLarge = 7,          // bytes, or what they expand to
  notRepresentable = 8,  // writing: no such value in this form
  outOfMemory = 9,
};

inline constexpr std::size_t maximumDepth = 512;
inline constexpr std::size_t maximumInput = (std::size_t{1} << 32) - 1;
constexpr std::size_t maximumNodes(std::size_t inputSize) { return (std::size_t{1} << 17) + inputSize / 4; }
constexpr std::size_t maximumText(std::size_t inputSize) { return (std::size_t{1} << 23) + 4 * inputSize; }

/// The document's value, mutable at every level. Absent on failure. The value keeps the input, and its strings and
/// data lie there, so handing over the bytes with std::move saves a copy.
platform::Value read(platform::Bytes input, platform::ErrorRef* error = nullptr);

/// Equal strings and equal data are written once, unless the document would then be refused for what its places hold
/// together: whatever is written can be read. Sizes of offsets and references are the smallest of 1, 2, 4 and 8 bytes.
std::optional<platform::Bytes> writeBinary(const platform::Value& value, platform::ErrorRef* error = nullptr);
/// UTF-8, indented with tabs up to a depth of 16, without a document-type line.
std::optional<platform::Bytes> writeXML(const platform::Value& value, platform::ErrorRef* error = nullptr);

}  // namespace plist
