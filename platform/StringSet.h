#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace platform {

/// A set of strings that enumerates in the order of insertion. Membership takes expected constant time.
/// Not synchronised.
class StringSet {
 public:
  StringSet() = default;
  StringSet(std::initializer_list<std::string_view> members) {
    for (auto member : members) insert(member);
  }

  bool contains(std::string_view member) const { return _places.count(std::string(member)) != 0; }
  /// False when the set held it already; its place in the order stays.
  bool insert(std::string_view member);
  /// False when the set did not hold it.
  bool erase(std::string_view member);
  void clear();
  std::size_t size() const { return _places.size(); }
  bool empty() const { return _places.empty(); }

  /// The members in the order of insertion.
  std::vector<std::string> members() const;

 private:
  struct Slot {
    std::string member;
    bool present;
  };
  void compact();

  std::deque<Slot> _slots;  // in insertion order, with holes where members were erased
  std::unordered_map<std::string, std::size_t> _places;
};

}  // namespace platform
