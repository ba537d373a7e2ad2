#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "record/stream/LargeTexts.h"

namespace record {

/// A large text, or an item as bytes, as a recording tells it: in pieces, most of which the one before it has, too. Its
/// bytes never change. Not synchronised.
class LargeText {
 public:
  /// Where the pieces lie of texts that were told as changes of each other. Only added to.
  struct Store {
    std::deque<std::string> texts{};
    std::size_t size = 0;
    std::string_view add(std::string text);
  };
  /// So many elements of the list before stay, so many go, and so many come.
  struct Edit {
    std::size_t keep;
    std::size_t drop;
    std::size_t insert;
  };

  explicit LargeText(std::string text);

  std::size_t size() const { return _size; }
  void appendTo(std::string& into) const;
  bool operator==(std::string_view text) const;
  /// In one piece, as long as this is there.
  std::string_view flat() const;

  /// Looks whether this is a list as an item, of no more elements than can be told one by one.
  bool splitIntoElements() const;
  std::size_t elementCount() const { return _pieces.size() - 1; }
  std::string_view element(std::size_t number) const { return _pieces[number + 1]; }
  const std::shared_ptr<Store>& store() const { return _store; }

  /// What a reader makes of it and keeps with it.
  class Made {
   public:
    virtual ~Made() = default;
  };
  std::shared_ptr<const Made> made() const { return _made; }
  /// The list that this was told as an edit of, until something was made of it. May be null.
  const LargeText* before() const { return _before.get(); }
  const std::vector<Edit>& edits() const { return _edits; }
  void setMade(std::shared_ptr<const Made> made) const;

 private:
  friend class ListEditing;
  friend class HeardTexts;
  LargeText() = default;
  void gather();

  static constexpr std::size_t farthestBefore = 64;

  std::shared_ptr<Store> _store;
  mutable std::vector<std::string_view> _pieces;  // of a list: its head, then its elements
  std::size_t _size = 0;
  mutable bool _isList = false;
  mutable std::string _flat;
  mutable std::shared_ptr<const Made> _made;
  mutable std::shared_ptr<const LargeText> _before;
  mutable std::vector<Edit> _edits;
  std::size_t _farBefore = 0;
};
using LargeTextRef = std::shared_ptr<const LargeText>;

/// A large text apart from the items that it is one of: there its tag stands with a bit, and its number in the list of
/// these.
struct LargePart {
  std::size_t begin;  // in the items
  std::size_t end;
  LargeTextRef text;
};

/// Makes a list of another one. Throws `RecordingError` for what the other one has not.
class ListEditing {
 public:
  explicit ListEditing(LargeTextRef before);

  void edit(const LargeText::Edit& edit);
  /// One of the elements that come: what it has of the old one's bytes in front and behind, if it comes for one.
  void element(std::size_t begin, std::size_t end, std::string_view between);
  bool comesForAnother() const { return _old < _oldEnd; }
  std::shared_ptr<LargeText> finish();

 private:
  void keep(std::size_t count);
  void add(std::string_view piece);

  const LargeTextRef _before;
  const std::shared_ptr<LargeText> _made;
  std::size_t _old = 0;     // the next element of the old list
  std::size_t _oldEnd = 0;  // the old elements that new ones come for end there
};

/// The large texts that a recording has told last, as who reads it knows them (see LargeTexts).
class HeardTexts {
 public:
  std::size_t count() const { return _slots.size(); }
  const LargeTextRef& at(std::size_t slot) const { return _slots[slot]; }
  const LargeTextRef& use(std::size_t slot);
  const LargeTextRef& keep(LargeTextRef text);
  /// Of the slot's text so many bytes at its beginning and its end, and others between.
  LargeTextRef changed(std::size_t slot, std::size_t begin, std::size_t end, std::string between) const;

 private:
  std::deque<LargeTextRef> _slots;
};

}  // namespace record
