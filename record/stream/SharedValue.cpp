#include "record/stream/SharedValue.h"

#include <algorithm>
#include <bit>
#include <memory>
#include <new>
#include <utility>

#include "record/RecordingError.h"

namespace record {

using platform::Value;
using platform::ValueBuilder;

namespace {

/// The elements that the values of some lists share. Only added to.
struct Elements {
  std::shared_ptr<LargeText::Store> texts;
  ValueBuilder values{platform::Bytes()};
  std::size_t size = 0;  // bytes of the texts that they were made of
};

struct MadeList final : LargeText::Made {
  MadeList(std::shared_ptr<Elements> elements, Value list) : elements(std::move(elements)), list(std::move(list)) {}
  std::shared_ptr<Elements> elements;
  Value list;
};

constexpr std::size_t smallList = std::size_t{64} << 10;

void make(Elements& elements, std::string_view element, Value* place) {
  ItemReader items(element);
  ::new (static_cast<void*>(place)) Value(containedValue(elements.values, items));
  if (!items.atEnd()) throw RecordingError("something follows a value");
  elements.size += element.size();
}

/// What is kept of a list is worth it, and does not outgrow it.
bool canGrow(const MadeList& before, const LargeText& list) {
  return before.elements->texts == list.store() && before.elements->size <= 2 * list.size() + smallList;
}

std::shared_ptr<const MadeList> madeOf(const LargeText& list) {
  auto known = std::dynamic_pointer_cast<const MadeList>(list.made());
  if (known) return known;
  const auto before = list.before() ? std::dynamic_pointer_cast<const MadeList>(list.before()->made())
                                    : std::shared_ptr<const MadeList>();
  const bool grows = before && canGrow(*before, list);
  auto elements = grows ? before->elements : std::make_shared<Elements>();
  if (!grows) elements->texts = list.store();
  ValueBuilder builder{std::shared_ptr<const void>(elements)};
  auto& array = builder.makeArray(list.elementCount());
  Value* places = ValueBuilder::places(array);
  std::size_t at = 0;
  if (grows) {
    const Value* old = before->list.array()->begin();
    for (const auto& edit : list.edits()) {
      ValueBuilder::lend(old, edit.keep, places + at);
      old += edit.keep + edit.drop;
      at += edit.keep;
      for (std::size_t end = at + edit.insert; at < end; ++at) make(*elements, list.element(at), places + at);
    }
    ValueBuilder::lend(old, list.elementCount() - at, places + at);
  } else {
    for (; at < list.elementCount(); ++at) make(*elements, list.element(at), places + at);
  }
  auto made = std::make_shared<const MadeList>(std::move(elements), builder.finish(ValueBuilder::contained(array)));
  list.setMade(made);
  return made;
}

}  // namespace

Value sharedValue(const LargeText& list) {
  const auto made = madeOf(list);
  const auto& elements = *made->list.array();
  ValueBuilder builder{std::shared_ptr<const void>(made->elements)};
  auto& array = builder.makeArray(elements.size());
  ValueBuilder::lend(elements.begin(), elements.size(), ValueBuilder::places(array));
  return builder.finish(ValueBuilder::contained(array));
}

bool sameItems(const Value& one, const Value& other) {
  if (one.kind() != other.kind()) return false;
  switch (one.kind()) {
    case Value::Kind::absent:
      return true;
    case Value::Kind::real:
      return std::bit_cast<std::uint64_t>(*one.real()) == std::bit_cast<std::uint64_t>(*other.real());
    case Value::Kind::date:
      return std::bit_cast<std::uint64_t>(one.date()->seconds) == std::bit_cast<std::uint64_t>(other.date()->seconds);
    case Value::Kind::array:
      // Most elements of a list that is told with a change are the very same.
      return one.array() == other.array() || std::equal(one.array()->begin(), one.array()->end(),
                                                        other.array()->begin(), other.array()->end(), sameItems);
    case Value::Kind::dictionary:
      return one.dictionary() == other.dictionary() ||
             std::equal(one.dictionary()->begin(), one.dictionary()->end(), other.dictionary()->begin(),
                        other.dictionary()->end(), [](const auto& entry, const auto& beside) {
                          return entry.key == beside.key && sameItems(entry.value, beside.value);
                        });
    default:
      return one == other;
  }
}

}  // namespace record
