#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace record {

/// The large texts that a recording has told last, as who writes it knows them: slot 0 is the one used last. A reader
/// keeps the same (see HeardTexts).
class LargeTexts {
 public:
  static constexpr std::size_t from = 2048;
  /// Lists that are not packed are told like this from fewer bytes on: they are those that come again with a change.
  static constexpr std::size_t listFrom = 256;
  static constexpr std::size_t slots = 8;
  static constexpr std::size_t largestKept = std::size_t{16} << 20;
  /// A list of more elements is treated as bytes.
  static constexpr std::size_t mostElements = std::size_t{1} << 17;

  static bool isKept(std::size_t size) { return size >= from && size <= largestKept; }

  /// How a text is told by another one: so many bytes are the same at the beginning and at the end.
  struct Likeness {
    std::size_t slot;
    std::size_t begin;
    std::size_t end;
  };
  /// The slot that the text is most like; nothing when none has half of it.
  std::optional<Likeness> like(std::string_view text) const;

  /// One element behind those that went or stay in place of which it comes: what it has of the old one's bytes.
  struct NewElement {
    std::size_t begin = 0;
    std::size_t end = 0;
    std::string_view between{};
  };
  /// So many elements stay, so many of the old ones go, and new ones come.
  struct Edit {
    std::size_t keep = 0;
    std::size_t drop = 0;
    std::vector<NewElement> insert{};
  };
  struct ListLikeness {
    std::size_t slot = 0;
    std::vector<Edit> edits{};
    std::vector<std::uint32_t> places{};  // of the elements, for `keep`
  };
  /// The same for an item that is a list, element by element.
  std::optional<ListLikeness> likeList(std::string_view list) const;

  /// How many bytes the slot has.
  std::size_t sizeOf(std::size_t slot) const { return _slots[slot].text.size(); }
  void use(std::size_t slot);
  void keep(std::string_view text, std::vector<std::uint32_t> places = {});

 private:
  struct Slot {
    std::string text;
    std::vector<std::uint32_t> places;  // where each element of a list begins, and the end; empty: it is none
  };
  using ListHead = std::pair<std::size_t, std::size_t>;  // its bytes, and how many elements follow
  std::optional<ListLikeness> likeList(const Likeness& candidate, std::string_view list, const ListHead& head) const;

  std::deque<Slot> _slots;
};

/// Where each element of a list begins, and where the last one ends; empty when the bytes are no such list, or have too
/// many elements to be told one by one.
std::vector<std::uint32_t> elementPlaces(std::string_view list);

/// How many bytes are the same from the beginning, from the end.
std::size_t sameBegin(std::string_view one, std::string_view other);
std::size_t sameEnd(std::string_view one, std::string_view other, std::size_t most);

}  // namespace record
