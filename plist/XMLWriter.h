#pragma once

#include <optional>
#include <string_view>

#include "platform/Error.h"
#include "platform/Value.h"

namespace plist {

/// Writes one XML document. The same walk runs twice: first it counts the characters and finds whatever XML cannot
/// carry, then it writes them into a block of that size.
class XMLWriter {
 public:
  /// Nothing, with the error set, when the value has no XML form.
  std::optional<platform::Bytes> write(const platform::Value& value, platform::ErrorRef& error);

 private:
  class Counter;
  class Text;

  template <class Sink>
  bool document(Sink& sink, const platform::Value& value);
  template <class Sink>
  bool write(Sink& sink, const platform::Value& value, std::size_t depth);
  template <class Sink>
  bool writeArray(Sink& sink, const platform::Array& array, std::size_t depth);
  template <class Sink>
  bool writeDictionary(Sink& sink, const platform::Dictionary& dictionary, std::size_t depth);
  bool fail(platform::ErrorRef error);

  platform::ErrorRef _error;
};

}  // namespace plist
