#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <future>

#include "tests/PluginRig.h"
#include "tests/SampleContent.h"
#include "tests/Scenario.h"
#include "tsd/daemon/TransferQueue.h"
#include "tsd/stopping/StopSignal.h"
#include "tsd/terminal/Progress.h"

namespace tests {
namespace {

namespace fs = std::filesystem;
using Progression = tsd::TransferQueue::Progression;

constexpr std::size_t apps = 40;
constexpr std::size_t inFlight = 2;
constexpr std::size_t ahead = 5;

/// Packages of forty apps on the host, and a device that was asked for them.
class TransferQueues : public testing::Test {
 protected:
  TransferQueues() : _queue({_host, {}, inFlight, ahead}, _progress, _stop) {}
  ~TransferQueues() override {
    fs::remove_all(_host);
    ::signal(SIGINT, SIG_DFL);
    ::signal(SIGTERM, SIG_DFL);
    ::pthread_sigmask(SIG_SETMASK, &_signals, nullptr);
  }

  /// Asks for all the packages, on a device that follows these rules.
  void request(const std::vector<std::string>& rules = {}) {
    _rig = std::make_unique<PluginRig>(
        PluginRig::Options{.rules = rules, .threaded = true, .told = [this](const auto& record) { count(record); }});
    _serving = std::make_unique<tsd::TransferQueue::Serving>(_queue, _rig->device(), _rig->daemon());
    _rig->postStartup();
    Value list = Value::makeArray();
    for (std::size_t i = 0; i < apps; ++i) {
      const std::string id = "app." + std::to_string(i);
      list.array()->append(entryOf({.id = id}, "install"));
      std::ofstream(_host + '/' + id + ".pkg") << packageOf(id, "2.0");
    }
    _rig->write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
    ASSERT_TRUE(_rig->reconcileSync());
    _queue.expect();
    _assets = _rig->daemon().outstandingAssetTransfers();
    ASSERT_EQ(_assets.size(), apps);
  }

  /// Counts the packages that the plug-in was told of and whose outcomes are not marked yet.
  void count(const device::CallRecord& record) {
    if (record.operation == "assetTransferSucceeded" && !record.end)
      _mostUnmarked = std::max(_mostUnmarked, ++_unmarked);
    if (record.operation == "coordinatorDidCompleteSuccessfully" && record.end) --_unmarked;
  }

  /// Keeps the device from installing anything, and from telling anybody, until `_goesOn` is set.
  void block() {
    std::promise<void> begun;
    _rig->device().events().post(device::Lane::coordination, [this, &begun] {
      begun.set_value();
      _goesOn.get_future().wait();
    });
    begun.get_future().wait();
  }

  Progression waitFor(std::chrono::nanoseconds time) {
    return _queue.waitUntil(_rig->device().events().clock().now() + time);
  }
  /// Goes on when all have been sent, or none is sent before something becomes of those that were.
  Progression untilNothingIsSent() {
    Progression now{};
    do now = waitFor(std::chrono::milliseconds(10));
    while (now == Progression::goesOn);
    return now;
  }
  /// Goes on at the end of the last transfer.
  Progression untilTheEnd() { return waitFor(std::chrono::hours(1)); }

  std::size_t arrived() {
    return static_cast<std::size_t>(std::count_if(_assets.begin(), _assets.end(), [&](const auto& asset) {
      return _queue.result(asset->identifier()).end == tsd::TransferQueue::End::arrived;
    }));
  }

  static std::string freshFolder() {
    std::string pattern = testing::TempDir() + "transfer-queue-XXXXXX";
    return ::mkdtemp(pattern.data());
  }
  static sigset_t signalMask() {
    sigset_t mask;
    ::pthread_sigmask(SIG_SETMASK, nullptr, &mask);
    return mask;
  }

  const sigset_t _signals = signalMask();
  const std::string _host = freshFolder();
  tsd::StopSignal _stop;
  tsd::Console _console;
  tsd::Progress _progress{_console, tsd::ProgressMode::none};
  tsd::TransferQueue _queue;
  std::promise<void> _goesOn;
  std::size_t _unmarked = 0;  // under the journal's lock, as the next
  std::size_t _mostUnmarked = 0;
  std::unique_ptr<PluginRig> _rig;
  std::unique_ptr<tsd::TransferQueue::Serving> _serving;
  std::vector<TSAssetRef> _assets;
};

TEST_F(TransferQueues, runAheadOfOutcomesNoFurtherThanToTheBound) {
  request();
  block();
  _queue.start(_assets);
  EXPECT_EQ(untilNothingIsSent(), Progression::waits);
  EXPECT_EQ(arrived(), inFlight + ahead);
  _goesOn.set_value();
  EXPECT_EQ(untilTheEnd(), Progression::ended);
  EXPECT_EQ(arrived(), apps);
  _rig->deliver();
  EXPECT_EQ(_unmarked, 0u);
  EXPECT_EQ(_mostUnmarked, inFlight + ahead);
}

TEST_F(TransferQueues, doNotWaitForOutcomesThatNeverCome) {
  for (const char* rule :
       {"coordinatorDidCompleteSuccessfully=none", "setComplete=none", "assetTransferSucceeded=none"}) {
    SCOPED_TRACE(rule);
    request({rule});
    _queue.start(_assets);
    EXPECT_EQ(untilTheEnd(), Progression::ended);
    EXPECT_EQ(arrived(), apps);
    _serving.reset();
    _rig.reset();
  }
}

TEST_F(TransferQueues, sendTheRestToADeviceThatSaysNothingAnyMore) {
  request();
  block();
  _queue.start(_assets);
  EXPECT_EQ(untilNothingIsSent(), Progression::waits);
  _queue.stopWaitingForOutcomes();
  EXPECT_EQ(untilTheEnd(), Progression::ended);
  EXPECT_EQ(arrived(), apps);
  _goesOn.set_value();
}

TEST_F(TransferQueues, endWhileTheyWaitWhenTheyAreStopped) {
  request();
  block();
  _queue.start(_assets);
  EXPECT_EQ(untilNothingIsSent(), Progression::waits);
  ASSERT_EQ(::kill(::getpid(), SIGINT), 0);
  EXPECT_EQ(untilTheEnd(), Progression::ended);
  EXPECT_EQ(arrived(), inFlight + ahead);
  _goesOn.set_value();
}

}  // namespace
}  // namespace tests
