#include "tests/Invariants.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>

#include "platform/Describe.h"
#include "tests/Scenario.h"

namespace tests {

using device::CallRecord;
using platform::describe;

namespace {

/// What is left of the text behind the beginning; nothing when it begins otherwise.
std::optional<std::string_view> behind(std::string_view text, std::string_view beginning) {
  if (text.substr(0, beginning.size()) != beginning) return std::nullopt;
  return text.substr(beginning.size());
}

std::string upTo(std::string_view text, std::string_view end) { return std::string(text.substr(0, text.find(end))); }

/// Which call may give which reason to whom, and set which mark.
struct Allowed {
  std::string_view operation;
  std::string_view reasons;
  std::string_view marks;
};
constexpr Allowed table[] = {
    {"outstandingAssetTransfers", "coordinator TSError 1,placeholder TSError 1,promise TSError 30", "FAILED"},
    {"reconcileRestoreOfType", "coordinator TSError 29,placeholder TSError 29,promise TSError 29", ""},
    {"assetTransferUpdatedProgress", "promise TSError 30", ""},
    // The service makes the reason; what is injected there is passed on.
    {"assetTransferSucceeded",
     "coordinator RVUserPresentableError 1,coordinator none,coordinator Injection 1,promise TSError 30",
     "DOWNLOADED,SENT"},
    {"assetTransferEndedWithSuccess", "coordinator TSError 30", ""},
    {"coordinatorDidCompleteSuccessfully", "", "INSTALLED,FAILED"},
    {"assetInstallSucceeded", "", "INSTALLED"},
    {"assetInstallFailed", "", "FAILED"},
};

bool isAllowed(std::string_view operation, std::string_view Allowed::*list, std::string_view wanted) {
  auto row = std::find_if(std::begin(table), std::end(table), [&](auto& each) { return each.operation == operation; });
  if (row == std::end(table)) return false;
  return (',' + std::string((*row).*list) + ',').find(',' + std::string(wanted) + ',') != std::string::npos;
}

}  // namespace

void Invariants::look(const std::vector<CallRecord>& records) {
  for (const auto& record : records) {
    auto& entry = _entries[record.thread];
    if (record.service == "AppsClient")
      enter(entry, record);
    else if (record.service == "log")
      readMessage(entry, (*record.arguments.dictionary())["text"].string().value_or(""));
    else
      readCall(entry, record);
  }
  for (const auto& [thread, entry] : _entries) EXPECT_EQ(entry.operation, "") << "has not returned on " << thread;
  for (const auto& [step, open] : _steps) EXPECT_EQ(open, 0) << "steps of " << step << " without an end";
}

void Invariants::objectIsGone() {
  EXPECT_TRUE(_awaited.empty()) << "awaited to the last, and not reported: " << *_awaited.begin();
  _awaited.clear();
}

void Invariants::enter(Entry& entry, const CallRecord& record) {
  if (!record.end) {
    EXPECT_EQ(entry.operation, "") << "entered again by " << record.operation;
    entry = {record.operation, record.app, {}};
    return;
  }
  EXPECT_EQ(entry.operation, record.operation);
  entry = {};
}

void Invariants::readCall(Entry& entry, const CallRecord& record) {
  auto& facts = entry.apps[record.app];
  const auto& arguments = *record.arguments.dictionary();
  if (record.operation == "creatorIdentifier") facts.own = record.result.integer() == 3;
  if (record.operation == "setPlaceholderPromise" || record.operation == "hasPlaceholderPromise")
    facts.promised |= record.result.boolValue();
  if (record.operation == "cancelForReason") readCancellation(entry, record);
  if (record.operation == "logStep" && arguments["step"].integer() != 7) {
    auto& open = _steps[describe(arguments["step"]) + " of " + record.app];
    open += arguments["phase"].integer() == 1 ? 1 : -1;
    EXPECT_GE(open, 0) << "a step ended that had not begun";
  }
}

void Invariants::readCancellation(Entry& entry, const CallRecord& record) {
  std::string cancellation = cancellationOf(record);
  auto space = cancellation.find(' ');
  std::string what = cancellation.substr(0, space);
  std::string reason = cancellation.substr(space + 1 + record.app.size());
  EXPECT_TRUE(isAllowed(entry.operation, &Allowed::reasons, what + reason))
      << cancellation << " inside " << entry.operation;
  if (what != "coordinator") return;
  auto& facts = entry.apps[record.app];
  bool asks = entry.operation == "outstandingAssetTransfers" || entry.operation == "assetTransferSucceeded";
  EXPECT_TRUE(facts.own || !asks) << cancellation << ": somebody else's, inside " << entry.operation;
  facts.cancelled = true;
}

void Invariants::readMessage(Entry& entry, std::string_view text) {
  text = behind(text, "com.vantor.tsd.appsync|").value_or(text);
  EXPECT_EQ(text.find("was stopped by an exception"), text.npos) << text;
  if (auto rest = behind(text, "Changing ")) {
    auto arrow = rest->rfind(" to ");
    std::string mark(rest->substr(arrow + 4));
    EXPECT_TRUE(isAllowed(entry.operation, &Allowed::marks, mark)) << text << ", inside " << entry.operation;
    bool isIts = entry.app.empty() || upTo(*rest, " from ") == entry.app;
    EXPECT_TRUE(isIts) << text << ", inside " << entry.operation << " of " << entry.app;
  }
  auto rest = behind(text, "processing app install for bundle ");
  if (rest && rest->find(" finished with status 1 ") != rest->npos) {
    EXPECT_TRUE(entry.apps[upTo(*rest, " ")].promised) << text << ", without a placeholder promise";
  }
  if ((rest = behind(text, "Not requesting app asset for "))) {
    const auto& facts = entry.apps[std::string(*rest)];
    EXPECT_TRUE(facts.cancelled || !facts.own) << text << ", and its coordinator stays";
  }
  readAwaited(text);
}

void Invariants::readAwaited(std::string_view text) {
  auto count = text.substr(text.rfind(' ') + 1);
  auto tells = [&] { EXPECT_EQ(count, std::to_string(_awaited.size())) << text; };
  if (auto app = behind(text, "Shiftwell will wait for RC to install placeholder for ")) {
    EXPECT_TRUE(_awaited.insert(upTo(*app, ",")).second) << text;
    tells();
  }
  for (auto beginning :
       {"RC finished installing placeholder for ", "RC cancelled coordinator for restoring app bundle ",
        "Shiftwell cancelled coordinator for restoring app bundle "}) {
    auto app = behind(text, beginning);
    if (!app) continue;
    EXPECT_EQ(_awaited.erase(upTo(upTo(*app, ","), " ")), 1u) << text;
    tells();
  }
  auto size = std::to_string(_awaited.size());
  if (text.substr(0, 14) == "Will wait for ") {
    EXPECT_EQ(text, "Will wait for " + std::to_string(5 * _awaited.size()) + " seconds for " + size +
                        " placeholders to install");
  }
  if (text.find("pending placeholder install complete notifications") == text.npos) return;
  EXPECT_EQ(static_cast<std::size_t>(std::count(text.begin(), text.end(), ',')) + 1, _awaited.size()) << text;
  for (const auto& app : _awaited) EXPECT_NE(text.find(app), text.npos) << text;
  _awaited.clear();
}

}  // namespace tests
