#include "record/replaying/Story.h"

#include <algorithm>
#include <deque>
#include <map>

#include "record/RecordingError.h"
#include "record/stream/CallText.h"

namespace record {

namespace {

constexpr std::size_t longestSearched = 4096;
constexpr std::size_t callsBefore = 12;
constexpr std::size_t mostExplained = 100;

bool isPartOfIdentifier(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' || c == '-' || c == '_';
}

bool namesApp(std::string_view name) {
  return name == "bundleID" || name == "bundleIdentifier" || name == "applicationIdentifier" || name == "identifier";
}

}  // namespace

void Story::lookInText(std::string_view text, std::string_view name, Found& found) {
  if (!found.app.empty() || text.size() > longestSearched) return;
  if (namesApp(name) && text.find('.') != std::string_view::npos) {
    found.app = text;
    _apps.emplace(text);
    return;
  }
  for (std::size_t at = 0; at < text.size();) {
    std::size_t end = at;
    while (end < text.size() && isPartOfIdentifier(text[end])) ++end;
    for (auto token = text.substr(at, end - at); !token.empty() && found.app.empty();) {
      if (_apps.contains(token)) found.app = token;
      // What something is named after its app, and a full stop behind it.
      const auto cut = token.find_last_of("-.");
      token = cut == std::string_view::npos ? std::string_view() : token.substr(0, cut);
    }
    if (!found.app.empty()) return;
    at = end + 1;
  }
}

void Story::look(ItemReader& items, std::string_view name, Found& found) {
  switch (items.peek()) {
    case Tag::text:
      return lookInText(items.text(), name, found);
    case Tag::object: {
      const auto mention = items.object();
      found.objects.push_back(mention.number);
      auto known = _objects.find(mention.number);
      if (known != _objects.end() && found.app.empty()) found.app = known->second;
      if (!(mention.flags & ObjectMention::hasFacts)) return;
      if (items.peek() != Tag::dictionary) return void(items.skip());
      Found inside;
      for (std::size_t count = items.dictionary(); count > 0; --count) {
        const auto fact = items.text();
        look(items, fact, inside);
      }
      if (!inside.app.empty()) _objects[mention.number] = inside.app;
      if (found.app.empty()) found.app = inside.app;
      return;
    }
    default:
      items.skip();
  }
}

std::string Story::appOf(const Event& event) {
  const auto& operation = _reader.operations()[event.operation];
  Found found;
  try {
    std::string_view names(operation.parameters);
    for (ItemReader items(event.payload); !items.atEnd();)
      look(items, opens(event.kind) ? nextName(names) : std::string_view(), found);
  } catch (const RecordingError&) {
    found.objects.clear();
  }
  auto& open = _open[event.thread];
  if (opens(event.kind)) {
    // What is called for an app's sake, when it does not say so itself.
    const bool isAbout = found.app.empty() && !open.empty() && operation.service != "LogHandle";
    open.push_back(isAbout ? open.back() : found.app);
    return open.back();
  }
  std::string app = open.empty() ? std::string() : open.back();
  if (!open.empty()) open.pop_back();
  if (!app.empty() && event.kind == EventKind::answer && found.objects.size() == 1)
    _objects.try_emplace(found.objects.front(), app);
  return app;
}

std::string_view nextName(std::string_view& names) {
  names.remove_prefix(std::min(names.find_first_not_of(' '), names.size()));
  const auto name = names.substr(0, names.find(' '));
  names.remove_prefix(name.size());
  return name;
}

void explain(std::string_view recording, std::vector<Difference>& differences) {
  if (differences.empty()) return;
  EventReader reader(recording);
  Story story(reader);
  std::map<std::string, std::deque<std::string>> before;
  Event event;
  auto next = differences.begin();
  const auto last = differences.begin() + static_cast<std::ptrdiff_t>(std::min(differences.size(), mostExplained));
  while (next != last && reader.next(event)) {
    std::string app = story.appOf(event);
    const auto& thread = reader.threads()[event.thread];
    for (; next != last && next->event <= event.number; ++next) {
      if (next->event < event.number) continue;
      next->app = app;
      const auto& calls = before[app.empty() ? "thread " + thread : app];
      next->before.assign(calls.begin(), calls.end());
    }
    const auto& name = reader.operations()[event.operation];
    if (!opens(event.kind) || name.name == "isEnabled" || name.name == "TSGetLogCategory") continue;
    for (const auto& of : {app, "thread " + thread}) {
      if (of.empty()) continue;
      auto& calls = before[of];
      calls.push_back(callLine(name, event.payload));
      if (calls.size() > callsBefore) calls.pop_front();
    }
  }
}

}  // namespace record
