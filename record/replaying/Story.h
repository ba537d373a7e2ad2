#pragma once

#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "record/Replay.h"
#include "record/stream/Event.h"
#include "record/stream/EventReader.h"
#include "record/stream/Item.h"

namespace record {

/// Follows a recording and tells which app each event is about: the one that its arguments name, or that the object is
/// of which is called.
class Story {
 public:
  explicit Story(const EventReader& reader) : _reader(reader) {}

  /// In the recording's order. Empty when no app is meant.
  std::string appOf(const Event& event);

 private:
  struct Found {
    std::string app;
    std::vector<std::uint64_t> objects;
  };
  void look(ItemReader& items, std::string_view name, Found& found);
  void lookInText(std::string_view text, std::string_view name, Found& found);

  const EventReader& _reader;
  std::set<std::string, std::less<>> _apps;
  std::unordered_map<std::uint64_t, std::string> _objects;
  std::unordered_map<std::uint32_t, std::vector<std::string>> _open;  // the apps of the calls that are open, by thread
};

/// Adds to differences which app they are about and what was called before.
void explain(std::string_view recording, std::vector<Difference>& differences);

/// The next of the names with spaces between them; empty at the end.
std::string_view nextName(std::string_view& names);

}  // namespace record
