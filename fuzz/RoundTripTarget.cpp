// What one form says, both forms say again.

#include <cstdint>

#include "fuzz/Require.h"
#include "fuzz/ValueFacts.h"
#include "fuzz/ValueMutation.h"
#include "plist/PropertyList.h"

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size, std::size_t maximumSize,
                                               unsigned seed) {
  return fuzz::mutateList(data, size, maximumSize, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using fuzz::require;
  platform::Value value = plist::read({reinterpret_cast<const char*>(data), size});
  fuzz::ValueFacts facts = fuzz::factsOf(value);
  if (value.isAbsent() || facts.nodes > fuzz::largeTree(size)) return 0;

  platform::ErrorRef error;
  auto binary = plist::writeBinary(value, &error);
  require(binary.has_value(), "every value has a binary form", error);
  platform::Value fromBinary = plist::read(*binary, &error);
  require(fromBinary == value, "the same through the binary form", error);
  require(plist::writeBinary(fromBinary) == binary, "one value, one binary form");

  auto xml = plist::writeXML(value, &error);
  if (!xml) {
    bool known = error->code() == static_cast<std::int64_t>(plist::ErrorCode::notRepresentable);
    require(known, "nothing but characters keeps a value from an XML form", error);
    return 0;
  }
  platform::Value fromXML = plist::read(*xml, &error);
  require(fromXML == value || facts.hasFractions, "the same through the XML form", error);
  require(plist::writeXML(fromXML) == xml, "one value, one XML form");
  return 0;
}
