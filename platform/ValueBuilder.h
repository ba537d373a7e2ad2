#pragma once

#include <cstddef>
#include <memory>
#include <optional>

#include "platform/Arena.h"
#include "platform/Value.h"

namespace platform {

/// Builds the values of one document that is being read. For readers of property lists only.
///
/// The document's bytes are kept with the values, so that strings, data and keys can point into them. Values made
/// here are contained values: they own nothing, and putting one into its place is a copy of its bits. They go
/// with the builder unless finish() hands them out. Byte counts must be below 4 GiB.
class ValueBuilder {
 public:
  explicit ValueBuilder(Bytes input) : _arena(std::make_unique<Arena>(std::move(input))) {}

  /// What is made here may hold values that lie in what `lent` keeps. Nobody may change those; who is handed the
  /// document and changes a container of them changes a copy of his own.
  explicit ValueBuilder(std::shared_ptr<const void> lent) : _arena(std::make_unique<Arena>(std::move(lent))) {}

  BytesView input() const noexcept { return _arena->input(); }
  /// Room for text that is not in the input as it is; any number of values may point to it.
  char* allocateText(std::size_t size) { return _arena->allocateShared(size); }
  /// The last so many bytes of the room that was asked for last are not needed after all.
  void giveBackText(std::size_t size) noexcept { _arena->giveBackShared(size); }

  /// `kept` lies in the input or in allocated text.
  static Value string(std::string_view kept) noexcept { return Value(Value::Kind::string, kept); }
  static Value data(BytesView kept) noexcept { return Value(Value::Kind::data, kept); }
  static Value contained(Array& array) noexcept { return Value(&array); }
  static Value contained(Dictionary& dictionary) noexcept { return Value(&dictionary); }

  /// A container of exactly so many places. Each of them must be constructed before the array is read.
  Array& makeArray(std::size_t count);
  Dictionary& makeDictionary(std::size_t count);
  static Value* places(Array& array) noexcept { return array._values; }
  /// Puts values of one container into the places of another, as they are.
  static void lend(const Value* from, std::size_t count, Value* places) noexcept;
  static Dictionary::Entry* places(Dictionary& dictionary) noexcept { return dictionary._entries; }

  /// Completes a dictionary whose entries are in their places. Answers the number of an entry whose key an
  /// earlier one has; such a dictionary must not be handed out.
  static std::optional<std::size_t> seal(Dictionary& dictionary);
  /// The same for keys that are known to differ.
  static void sealUnlike(Dictionary& dictionary);

  /// The document's outermost value. The builder is used up.
  Value finish(const Value& root);

 private:
  std::unique_ptr<Arena> _arena;
};

}  // namespace platform
