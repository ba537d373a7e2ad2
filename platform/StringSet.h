#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>
#include <vector>

#include "platform/TextTable.h"

namespace platform {

/// A set of strings that enumerates in the order of insertion. Membership takes expected constant time. An insertion
/// that runs out of memory leaves the set as it was. Not synchronised.
class StringSet {
 public:
  StringSet() = default;
  StringSet(std::initializer_list<std::string_view> members) {
    for (auto member : members) insert(member);
  }

  bool contains(std::string_view member) const { return _places.contains(member); }
  /// False when the set held it already; its place in the order stays.
  bool insert(std::string_view member);
  /// False when the set did not hold it.
  bool erase(std::string_view member) noexcept;
  void clear() noexcept;
  std::size_t size() const { return _places.size(); }
  bool empty() const { return _places.empty(); }

  /// The members in the order of insertion.
  std::vector<std::string> members() const;

 private:
  struct Slot {
    std::string member;
    bool present;
  };
  void compact() noexcept;

  std::deque<Slot> _slots;  // in insertion order, with holes where members were erased
  TextMap<std::size_t> _places;
};

}  // namespace platform
