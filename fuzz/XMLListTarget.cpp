// An XML property list, in any encoding, or what claims to be one.

#include <cstdint>

#include "fuzz/Require.h"
#include "fuzz/ValueFacts.h"
#include "plist/PropertyList.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using fuzz::require;
  platform::Bytes input(reinterpret_cast<const char*>(data), size);
  if (input.starts_with("bplist")) return -1;
  platform::ErrorRef error;
  platform::Value value = plist::read(std::move(input), &error);
  require(value.isAbsent() == (error != nullptr), "either a value or an error");
  if (error) {
    require(error->domain() == plist::errorDomain && !error->description().empty(), "an error of the codec", error);
    return 0;
  }
  // Nothing in an XML document grows: an element takes six characters at least, a byte of input at most two of text.
  fuzz::ValueFacts facts = fuzz::factsOf(value);
  require(facts.nodes <= size / 6, "nodes that are there");
  require(facts.text <= 2 * size, "text that is there");
  require(facts.depth <= plist::maximumDepth, "the limit of depth");
  auto bytes = plist::writeXML(value, &error);
  require(bytes.has_value(), "what was read can be written", error);
  require(plist::read(std::move(*bytes)) == value, "reads as what was written");
  return 0;
}
