#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Value.h"

namespace record {

/// Texts that are to be replaced, and their replacements: first all of them are added, then they are used.
class Secrets {
 public:
  /// Somebody's text: an identifier, a name. Of a path the parts that are no fixed places. Numbers, versions and what
  /// belongs to the protocol are no secrets.
  void add(std::string_view text);
  /// A number that names somebody.
  void add(std::uint64_t number);
  /// A word of a fixed text, which is no secret from now on, whoever uses it.
  void keep(std::string_view word) { _kept.emplace(word); }

  /// Gives every secret its replacement.
  void number();
  std::size_t size() const { return _replacements.size(); }

  /// The text with all secrets in it replaced that stand for themselves, the longest where several begin.
  std::string replaced(std::string_view text) const;
  std::uint64_t replaced(std::uint64_t number) const;
  /// Other bytes, as many; the same for the same.
  std::string replacedBytes(platform::BytesView bytes);

 private:
  std::string_view longestAt(std::string_view text) const;
  void addPath(std::string_view path);

  std::map<std::string, std::string, std::less<>> _replacements;
  std::set<std::string, std::less<>> _kept;
  std::map<std::pair<std::size_t, std::uint64_t>, std::uint64_t> _contents;  // by length and hash
};

/// Whether a key of a dictionary is no fixed one but a text of its own: an identifier, an address, another script.
bool isTellingKey(std::string_view key);

}  // namespace record
