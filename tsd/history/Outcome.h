#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Value.h"

namespace tsd {

/// What came of one app in a sync or a restore. The set is closed: these words stand in tables, last lines, documents
/// and kept runs, and nowhere else is an outcome told by other words.
enum class Outcome : std::uint8_t {
  installed,     // as the host wants it
  removed,       // … not on the device any more
  absent,        // … nor was it before
  placed,        // of a restore: its placeholder is on the home screen, the rest is the store's
  unrecorded,    // it is installed, and its entry of the todo list does not say so
  sent,          // its package has arrived, and is not to be installed by this sync
  downloaded,    // … and is the restore's to install
  waiting,       // an install of it is open
  notAllowed,    // restricted on the device
  skipped,       // a rule of the plug-in passes over it
  notRequested,  // the plug-in did not ask for its package, and did not say why
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

/// What came of one app, with its facts.
struct AppOutcome {
  std::string id;
  std::string name;
  std::string version;
  Outcome outcome = Outcome::notReached;
  std::string reason;  // empty where there is none to give
};

/// How many apps there are of each outcome.
class OutcomeCounts {
 public:
  OutcomeCounts() = default;
  explicit OutcomeCounts(const std::vector<AppOutcome>& apps);

  void add(Outcome outcome, std::size_t count = 1) { _counts[outcome] += count; }
  std::size_t total() const;
  std::size_t inOrder() const;
  /// "5 of 8 apps in order, 2 failed, 1 not allowed"; empty without apps.
  std::string text() const;
  /// A dictionary of names and numbers, of outcomes that there are.
  platform::Value document() const;
  static OutcomeCounts ofDocument(const platform::Value& document);

 private:
  std::map<Outcome, std::size_t> _counts;
};

/// The reasons for people, a line each; one that several apps have is told once, with their number.
std::string reasonsText(const std::vector<AppOutcome>& apps);

/// An array of dictionaries of "id", "name", "version", "outcome" and "reason".
platform::Value documentOf(const std::vector<AppOutcome>& apps);

}  // namespace tsd
