#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Value.h"

namespace tsd {

/// What became of one app in a sync or a restore. The set is closed: tables, last lines, documents and kept runs use
/// these words and no others.
enum class Outcome : std::uint8_t {
  installed,     // as the host wants it
  removed,       // as the host wants it: no longer on the device
  absent,        // the same, and it was not there before either
  placed,        // of a restore: its placeholder is on the home screen, the rest is the store's
  unrecorded,    // it is installed, but its entry of the todo list does not say so
  sent,          // its package has arrived, but this sync does not install it
  downloaded,    // the same: the restore installs it
  waiting,       // an install of it is open
  notAllowed,    // restricted on the device
  skipped,       // by a rule of the plug-in
  notRequested,  // the plug-in did not ask for its package and did not say why
  refused,       // its identifier, or its entry of the restore list
  unchanged,     // its entry of the todo list asks for nothing
  cancelled,     // by somebody
  failed,
  notReached  // the run ended before its turn
};

/// "INSTALLED", "NOT_ALLOWED", …, as documents have it.
const char* nameOf(Outcome outcome);
/// "installed", "not allowed", …
std::string wordsOf(Outcome outcome);
std::optional<Outcome> outcomeNamed(std::string_view name);
/// Whether the app is as the host wants it.
bool isInOrder(Outcome outcome);

/// What became of one app, with its facts.
struct AppOutcome {
  std::string id;
  std::string name;
  std::string version;
  Outcome outcome = Outcome::notReached;
  std::string reason;  // empty if there is none
};

/// How many apps have each outcome.
class OutcomeCounts {
 public:
  OutcomeCounts() = default;
  explicit OutcomeCounts(const std::vector<AppOutcome>& apps);

  void add(Outcome outcome, std::size_t count = 1) { _counts[outcome] += count; }
  std::size_t total() const;
  std::size_t inOrder() const;
  /// "5 of 8 apps in order, 2 failed, 1 not allowed"; empty without apps.
  std::string text() const;
  /// A dictionary of the outcomes that occur, by name, with their numbers.
  platform::Value document() const;
  static OutcomeCounts ofDocument(const platform::Value& document);

 private:
  std::map<Outcome, std::size_t> _counts;
};

/// The reasons for people, a line each; a reason that several apps share appears once, with their number.
std::string reasonsText(const std::vector<AppOutcome>& apps);

/// An array of dictionaries of "id", "name", "version", "outcome" and "reason".
platform::Value documentOf(const std::vector<AppOutcome>& apps);

}  // namespace tsd
