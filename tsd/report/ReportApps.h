#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "device/boundary/Boundary.h"
#include "platform/Value.h"
#include "tsd/history/AppStory.h"
#include "tsd/history/Outcome.h"

namespace tsd {

/// What became of each app, for the report's page, from the records of a journal in their order.
class ReportApps {
 public:
  ReportApps();

  void hear(const device::CallRecord& record) { _story.hear(record); }
  /// What somebody knows who has seen more than the journal.
  void know(const AppOutcome& told);

  OutcomeCounts counts() const;
  platform::Value document(const std::function<std::string(const std::string& app)>& nameOf) const;

 private:
  struct App {
    std::vector<AppEvent> events;
    Outcome outcome = Outcome::notReached;
    std::string rule;
  };
  void take(const AppEvent& event);

  std::map<std::string, App> _apps;
  AppStory _story;
};

/// Two values as a list.
platform::Value pairOf(std::string_view one, const platform::Value& other);
/// The words of all outcomes, each with what it means: as wanted, wrong, not at its end, or none of these.
platform::Value toneOfOutcomes();

}  // namespace tsd
