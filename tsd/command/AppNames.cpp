#include "tsd/command/AppNames.h"

#include <functional>

#include "tsd/CommandError.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {

namespace {

constexpr std::size_t mostNamed = 5;

std::string folded(std::string text) {
  for (char& c : text) c = c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  return text;
}

bool endsWith(const std::string& text, const std::string& end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

std::string listed(const std::vector<std::string>& ids) {
  std::string text;
  for (std::size_t i = 0; i < ids.size() && i < mostNamed; ++i) text += (i ? ", " : "") + ids[i];
  return ids.size() > mostNamed ? text + " and " + std::to_string(ids.size() - mostNamed) + " more" : text;
}

}  // namespace

AppNames::AppNames(const device::DeviceStatus& status, const std::vector<RunSummary>& runs) : _runs(runs.size()) {
  for (const auto& run : runs) {
    for (const auto& app : outcomesIn(run)) _names[app.id] = app.name;
  }
  for (const auto& app : status.apps) {
    auto& name = _names[app.id];
    if (!app.name.empty()) name = app.name;
  }
}

std::string AppNames::identifierOf(const std::string& word) const {
  using Fits = std::function<bool(const std::string& id, const std::string& name)>;
  const std::string wanted = folded(word);
  const Fits ways[] = {
      [&](const auto& id, const auto& name) { return name == wanted || id == wanted; },
      [&](const auto& id, const auto&) { return endsWith(id, "." + wanted); },
      [&](const auto& id, const auto& name) {
        return id.find(wanted) != std::string::npos || name.find(wanted) != std::string::npos;
      },
  };
  for (const auto& fits : ways) {
    std::vector<std::string> found;
    for (const auto& [id, name] : _names) {
      if (!wanted.empty() && fits(folded(id), folded(name))) found.push_back(id);
    }
    if (found.size() == 1) return found.front();
    if (!found.empty()) throw CommandError(word + ": this may mean " + listed(found));
  }
  std::vector<std::string> choices;
  for (const auto& [id, name] : _names) {
    choices.push_back(id);
    if (!name.empty()) choices.push_back(name);
  }
  throw CommandError(word + ": the device does not know this app, and " +
                     (_runs == 0   ? "has no kept run"
                      : _runs == 1 ? "the only kept run does not mention it"
                                   : "none of the " + std::to_string(_runs) + " kept runs mentions it") +
                     didYouMean(word, choices));
}

}  // namespace tsd
