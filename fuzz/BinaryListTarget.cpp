// Whatever stands behind the header of a binary property list.

#include <cstdint>

#include "fuzz/Require.h"
#include "fuzz/ValueFacts.h"
#include "plist/PropertyList.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using fuzz::require;
  constexpr std::string_view header = "bplist00";
  if (size < header.size()) return -1;
  platform::Bytes input(reinterpret_cast<const char*>(data), size);
  input.replace(0, header.size(), header);

  platform::ErrorRef error;
  platform::Value value = plist::read(std::move(input), &error);
  require(value.isAbsent() == (error != nullptr), "either a value or an error");
  if (error) {
    require(error->domain() == plist::errorDomain && !error->description().empty(), "an error of the codec", error);
    return error->code() == static_cast<std::int64_t>(plist::ErrorCode::tooLarge) ? -1 : 0;
  }
  fuzz::ValueFacts facts = fuzz::factsOf(value);
  require(facts.nodes <= plist::maximumNodes(size), "the budget of nodes");
  require(facts.text <= plist::maximumText(size), "the budget of text");
  require(facts.depth <= plist::maximumDepth, "the limit of depth");
  if (facts.nodes > fuzz::largeTree(size)) return -1;
  const platform::Value copy = value;
  value = {};
  auto bytes = plist::writeBinary(copy, &error);
  require(bytes.has_value(), "what was read can be written", error);
  require(plist::read(std::move(*bytes)) == copy, "reads as what was written");
  return 0;
}
