#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "device/LocalDevice.h"
#include "tests/PluginRig.h"

namespace tests {

/// One call that fails once, or whenever it is made.
struct Failure {
  std::string point;          // "Class.operation", as injection rules have it
  std::string app{};          // as the journal has it; empty for none
  std::uint64_t match = 0;    // the n-th such call of the run; 0: every one
  std::string entry{};        // the call into the plug-in inside of which it is made; empty: anywhere
  std::string path{};         // the file it is about, if one
  std::uint64_t ordinal = 0;  // counts calls of this entry, point, app and path; 0: every one

  std::string rule() const;
};

/// One app: what the device has of it, what the host wants with it, what the daemon makes of its package.
struct ScenarioApp {
  enum class Before { absent, installed, placeholder };
  enum class Transfer { arrives, fails, stalls, neverStarts };
  enum class Package { good, damaged, ofAnotherApp, missing };
  enum class Path { absolute, relative, absent, recorded, climbing };
  enum class Person { nothing, cancels, prioritizes, uninstalls };
  enum class Report { none, succeeded, failed };

  std::string id{};
  Before before = Before::absent;
  bool lost = false;  // installed once, then removed by the person
  /// Facts of a placeholder; by default one that an earlier sync left.
  device::StoreInstall store = plainPlaceholder();
  std::string previousMark{};         // its entry in the todo list of the sync before; empty: none
  std::string operation = "install";  // its entry in the todo list; empty: none
  bool inLastSync = false;
  bool hasFolder = true;  // manifest and metadata staged
  bool hasIcon = false;
  ContentShape content{};  // of its entry, its files and its package

  Transfer transfer = Transfer::arrives;
  Package package = Package::good;
  Path path = Path::absolute;
  bool isDownload = true;
  bool isRestore = false;
  std::int64_t parts = 1;
  Person person = Person::nothing;  // between two reports of progress
  Report report = Report::none;

  static device::StoreInstall plainPlaceholder() {
    device::StoreInstall install;
    install.installType = 4;
    install.hasProgress = false;
    install.createsCoordinator = false;
    return install;
  }
};

/// One sync on a device of its own.
struct Scenario {
  std::string name{};
  /// The device is as the sync or restore before left it: what it had before that one is not laid out again.
  bool continues = false;
  std::vector<ScenarioApp> apps{};
  std::vector<std::string> layout{};  // the host's icon layout; empty: it sends none
  bool stages = true;                 // the host pushes files
  std::optional<Bytes> rawTodo{};     // instead of the list of the apps' operations
  std::vector<std::pair<std::string, std::string>> settings{};
  std::vector<std::string> rules{};
  std::vector<Failure> failures{};
  std::string process = "com.vantor.tsd";
  bool phaseSucceeded = true;
  std::optional<bool> syncSucceeded{};  // by default whether reconciliation did
  /// Chooses among the lanes that have something due.
  std::function<std::size_t(std::size_t)> chooser{};
};

/// What came of it, for the host, the device and the services. Two outcomes are compared by their `text`.
struct Outcome {
  bool reconciled = false;
  std::vector<std::string> deleted{};            // sorted
  std::vector<std::string> requested{};          // in order
  std::map<std::string, std::string> marks{};    // by identifier, of the first entry
  std::vector<std::string> cancelled{};          // "coordinator app domain code"; every one by client 3; sorted
  std::vector<std::string> open{};               // "app kind", of coordinators of client 3; sorted
  std::map<std::string, std::string> present{};  // by identifier: "installed", "placeholder", "updating"

  std::string text() const;
};

/// The app's entry in a todo list, with that operation.
Value entryOf(const ScenarioApp& app, const std::string& operation);

/// Plays the daemon, the host and the person.
Outcome run(PluginRig& rig, const Scenario& scenario);
PluginRig::Options optionsOf(const Scenario& scenario);

/// "coordinator app domain code", with " by client N" behind it when it is not by client 3.
std::string cancellationOf(const device::CallRecord& record);
/// The cancellations that the plug-in asked for, sorted.
std::vector<std::string> cancellationsIn(const std::vector<device::CallRecord>& records);
std::vector<std::string> openCoordinators(const device::DeviceStatus& status);
/// A failure for every n-th call that crossed from the plug-in to a service in a run.
std::vector<Failure> failuresOf(const std::vector<device::CallRecord>& records);

/// Every pattern is a line, and they come in that order, other lines between them.
::testing::AssertionResult inOrder(const std::vector<std::string>& lines, const std::vector<std::string>& patterns);
/// The lines are exactly these.
::testing::AssertionResult exactly(const std::vector<std::string>& lines, const std::vector<std::string>& patterns);

}  // namespace tests
