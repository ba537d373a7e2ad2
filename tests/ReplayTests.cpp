// A recording told to a plug-in that does as then, or differently, or comes to a stop.

#include <gtest/gtest.h>

#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "platform/Error.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Platform.h"
#include "platform/Process.h"
#include "platform/TSClient.h"
#include "record/RecordingPlatform.h"
#include "record/Replay.h"
#include "record/Show.h"
#include "record/Sink.h"
#include "record/calls/Inbound.h"
#include "record/stream/Event.h"
#include "record/stream/EventWriter.h"
#include "record/stream/Item.h"

namespace {

using platform::ErrorRef;
using platform::Platform;
using platform::TSAssetRef;
using platform::Value;
using record::Difference;
using record::EventKind;
using record::ItemWriter;
using record::ObjectKind;
using record::ObjectMention;

/// Does what a test says when it is told to clear its data.
class Plugin final : public platform::TSClient {
 public:
  using Work = std::function<void(const Platform&)>;
  Plugin(const Platform& platform, Work work) : _platform(platform), _work(std::move(work)) {}

  ~Plugin() override { _platform.process.temporaryDirectory(); }
  Plugin(const Plugin&) = delete;
  Plugin& operator=(const Plugin&) = delete;

  void clearSyncData() override { _work(_platform); }

  std::vector<std::string> supportedDataclasses() override { return {}; }
  std::string currentSyncAnchor() override { return {}; }
  bool prepareForSyncWithHostAnchor(std::string_view, const platform::TSProgressCallback&, ErrorRef*) override {
    return false;
  }
  bool reconcileSync(std::uint32_t, std::string_view, const platform::TSProgressCallback&, ErrorRef*) override {
    return false;
  }
  void syncEndedWithSuccess(bool) override {}
  Value installedAssets() override { return {}; }
  std::vector<TSAssetRef> outstandingAssetTransfers() override { return {}; }
  void assetTransferUpdatedProgress(const TSAssetRef&, double) override {}
  void assetTransferSucceeded(const TSAssetRef&, bool, const ErrorRef&) override {}
  void assetInstallSucceeded(const TSAssetRef&) override {}
  void assetInstallFailed(const TSAssetRef&, const ErrorRef&) override {}
  void assetTransferEndedWithSuccess(bool) override {}
  bool reconcileRestoreOfType(std::int32_t, ErrorRef*) override { return false; }
  Value installedAssetMetrics() override { return {}; }
  platform::StringSet vantorIDsForAssets() override { return {}; }
  std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> accountsForAssets() override { return {}; }
  std::optional<platform::StringSet> disabledAssetTypes() override { return std::nullopt; }
  void prepareForBackup() override {}

 private:
  const Platform& _platform;
  const Work _work;
};

class Memory final : public record::Sink {
 public:
  bool write(platform::BytesView bytes) override {
    content += bytes;
    return true;
  }
  std::string content;
};

/// A recording in which the plug-in asked for the manifests of these paths when it was told to clear its data.
std::string recordingOf(const std::vector<std::string>& paths, std::size_t threads = 1) {
  const auto sink = std::make_shared<Memory>();
  record::EventWriter writer(sink);
  const auto add = [&](const record::Operation& operation) {
    return writer.addOperation({operation.service, operation.name, operation.parameters});
  };
  const auto create = add(record::inbound::create), clear = add(record::inbound::client::clearSyncData);
  const auto asked = writer.addOperation({"Process", "infoDictionaryOfBundleAtPath", "path"});
  for (std::size_t thread = 0; thread < threads; ++thread) writer.addThread("thread-" + std::to_string(thread));
  ItemWriter client;
  client.object({ObjectKind::client, 1, ObjectMention::isNew});
  writer.write(EventKind::enter, 0, create, 0, {});
  writer.write(EventKind::leave, 0, create, 0, client.bytes());
  client.clear();
  client.object({ObjectKind::client, 1, 0});
  for (std::uint32_t thread = 0; thread < threads; ++thread) {
    writer.write(EventKind::enter, thread, clear, 0, client.bytes());
    for (const auto& path : paths) {
      ItemWriter given, answer;
      given.text(path);
      Value manifest = Value::makeDictionary();
      manifest.dictionary()->set("name", path);
      answer.value(manifest);
      writer.write(EventKind::call, thread, asked, 0, given.bytes());
      writer.write(EventKind::answer, thread, asked, 0, answer.bytes());
    }
    writer.write(EventKind::leave, thread, clear, 0, {});
  }
  writer.finish();
  return sink->content;
}

Plugin::Work asking(std::vector<std::string> paths) {
  return [paths = std::move(paths)](const Platform& platform) {
    for (const auto& path : paths) platform.process.infoDictionaryOfBundleAtPath(path);
  };
}

record::ReplayResult replayed(const std::string& recording, const Plugin::Work& work, bool goOn = false) {
  return record::replay(recording, [&](const Platform& platform) { return std::make_shared<Plugin>(platform, work); },
                        {.goOn = goOn});
}

std::vector<Difference::Kind> kindsOf(const record::ReplayResult& result) {
  std::vector<Difference::Kind> kinds;
  for (const auto& difference : result.differences) kinds.push_back(difference.kind);
  return kinds;
}

TEST(Replay, WhatIsAskedIsAnswered) {
  const std::string recording = recordingOf({"/one", "/two"}, 3);
  std::vector<std::string> names;
  const auto result = replayed(recording, [&](const Platform& platform) {
    for (const char* path : {"/one", "/two"}) {
      const Value manifest = platform.process.infoDictionaryOfBundleAtPath(path);
      names.emplace_back((*manifest.dictionary())["name"].string().value_or("none"));
    }
  });
  EXPECT_TRUE(result.isWhole);
  EXPECT_EQ(result.events, 2u + 3 * (2 + 2 * 2));
  EXPECT_EQ(kindsOf(result), (std::vector<Difference::Kind>{}));
  EXPECT_EQ(names, (std::vector<std::string>{"/one", "/two", "/one", "/two", "/one", "/two"}));
}

TEST(Replay, WhatIsDoneDifferentlyIsToldUpToTheEnd) {
  using Kind = Difference::Kind;
  const std::string recording = recordingOf({"/one", "/two", "/three", "/four"}, 2);
  struct Case {
    std::vector<std::string> asked;
    Kind first;
    std::vector<Kind> all;  // of both threads
  };
  const std::vector<Case> cases{
      {{"/other", "/two", "/three", "/four"}, Kind::otherArguments, {Kind::otherArguments, Kind::otherArguments}},
      {{"/one", "/two", "/three"}, Kind::missing, {Kind::missing, Kind::missing}},
      {{"/one", "/four"}, Kind::missing, {Kind::missing, Kind::missing, Kind::missing, Kind::missing}},
      {{}, Kind::missing, std::vector<Kind>(8, Kind::missing)},
      {{"/one", "/two", "/three", "/four", "/five"}, Kind::additional, {Kind::additional, Kind::additional}},
  };
  for (const auto& each : cases) {
    const auto work = asking(each.asked);
    const auto first = replayed(recording, work);
    ASSERT_EQ(first.differences.size(), 1u) << each.asked.size();
    EXPECT_EQ(first.differences.front().kind, each.first) << each.asked.size();
    EXPECT_FALSE(first.isWhole);
    const auto all = replayed(recording, work, true);
    EXPECT_EQ(kindsOf(all), each.all) << each.asked.size();
    EXPECT_TRUE(all.isWhole) << each.asked.size();
  }
}

TEST(Replay, WhoWaitsInsideThePlugInForEverIsNamed) {
  std::promise<void> letGo;
  std::future<void> ended;
  {
    const auto waiting = letGo.get_future().share();
    const auto over = std::make_shared<std::promise<void>>();
    ended = over->get_future();
    const auto result = replayed(recordingOf({"/one"}, 2), [waiting, over](const Platform& platform) {
      platform.process.infoDictionaryOfBundleAtPath("/one");
      waiting.wait();
      over->set_value();
    });
    EXPECT_TRUE(result.isStuck);
    ASSERT_EQ(kindsOf(result), std::vector<Difference::Kind>{Difference::Kind::standing});
    const auto& difference = result.differences.front();
    EXPECT_EQ(difference.came, "nothing: it waits inside the plug-in");
    EXPECT_EQ(difference.standing, std::vector<std::string>{"thread-0: in TSClient.clearSyncData"});
  }
  letGo.set_value();
  ended.wait();
}

TEST(Replay, APlugInThatThrowsIsADifference) {
  const std::string recording = recordingOf({"/one", "/two"});
  const auto throwing = [](const Platform& platform) {
    platform.process.infoDictionaryOfBundleAtPath("/one");
    throw std::runtime_error("a plug-in that throws");
  };
  for (bool goOn : {false, true}) {
    const auto result = replayed(recording, throwing, goOn);
    EXPECT_EQ(result.problem, "");
    ASSERT_EQ(kindsOf(result), std::vector{Difference::Kind::otherResult}) << goOn;
    const auto& difference = result.differences.front();
    EXPECT_NE(difference.came.find("clearSyncData throws \"a plug-in that throws\""), std::string::npos)
        << difference.came;
    EXPECT_NE(difference.expected.find("/two"), std::string::npos) << difference.expected;
    EXPECT_NE(difference.inside.find("clearSyncData"), std::string::npos) << difference.inside;
  }
}

// ---- What is thrown ----

struct OwnException {};
constexpr const char* ownPath = "/own";

/// A call to a service, or into the plug-in, on the one thread of a recording.
class Script {
 public:
  explicit Script(const std::shared_ptr<Memory>& sink) : _writer(sink) {
    _writer.addThread("thread-1");
    begin(EventKind::enter, record::inbound::create, [](ItemWriter&) {});
    end(EventKind::leave, [](ItemWriter& items) { items.object({ObjectKind::client, 1, ObjectMention::isNew}); });
    begin(EventKind::enter, record::inbound::client::clearSyncData, [](ItemWriter& items) {
      items.object({ObjectKind::client, 1, 0});
    });
  }
  template <class Put>
  void begin(EventKind kind, const record::Operation& operation, const Put& put) {
    const auto number = _writer.addOperation({operation.service, operation.name, operation.parameters});
    _writer.write(kind, 0, number, 0, items(put));
  }
  template <class Put>
  void end(EventKind kind, const Put& put) {
    _writer.write(kind, 0, 0, 0, items(put));
  }
  void finish() { _writer.finish(); }

 private:
  template <class Put>
  static std::string items(const Put& put) {
    ItemWriter items;
    put(items);
    return items.take();
  }
  record::EventWriter _writer;
};

/// A block that throws through its service.
void writeBlocks(Script& script) {
  const auto thrown = [](ItemWriter& items) {
    items.boolean(false);
    items.boolean(true);
  };
  script.begin(EventKind::call, {"OBApplicationWorkspace", "enumerateBundlesOfType", "type block"}, [](auto& items) {
    items.number(1);
    items.object({ObjectKind::callback, 2, ObjectMention::isNew});
  });
  for (int again = 0; again < 2; ++again) {
    script.begin(EventKind::enter, record::inbound::block, [](auto& items) {
      items.object({ObjectKind::callback, 2, 0});
      items.absent();
    });
    script.end(EventKind::thrown, thrown);
  }
  script.end(EventKind::threw, [](auto& items) { items.boolean(true); });
}

/// That, services that throw after they have put out an error and a buffer, and the plug-in that throws out of what it
/// was told.
std::string recordingOfThrows() {
  const auto sink = std::make_shared<Memory>();
  Script script(sink);
  writeBlocks(script);
  script.begin(EventKind::call, {"FileSystem", "removeItem", "path -> error"}, [](auto& items) {
    items.text(ownPath);
    items.boolean(true);
  });
  script.end(EventKind::threw, [](auto& items) {
    items.text("a service that throws");
    items.error();
    items.text("domain");
    items.signedNumber(7);
    items.text("put out before");
    items.absent();
  });
  script.begin(EventKind::call, {"HomeScreen", "PNGetFlattenedIconState", "port form -> buffer"}, [](auto& items) {
    items.number(5);
    items.signedNumber(1);
    items.boolean(true);
  });
  script.end(EventKind::threw, [](auto& items) {
    items.absent();
    items.object({ObjectKind::buffer, 3, ObjectMention::isNew | ObjectMention::hasFacts});
    items.data("lent");
  });
  script.end(EventKind::thrown, [](auto& items) { items.text("a plug-in that throws"); });
  script.finish();
  return sink->content;
}

/// What the plug-in of `recordingOfThrows` does; `heard` is what it saw.
void throwAndHear(const Platform& platform, std::vector<std::string>& heard) {
  try {
    platform.workspace.enumerateBundlesOfType(1, [](const platform::OBBundleProxyRef&, bool& stop) {
      stop = true;
      throw OwnException();
    });
  } catch (const OwnException&) {
    heard.emplace_back("its own exception");
  }
  ErrorRef error;
  try {
    platform.fileSystem.removeItem(ownPath, &error);
  } catch (const std::runtime_error& exception) {
    heard.push_back(exception.what() + (error ? ", " + error->describe() : std::string()));
  }
  void* buffer = nullptr;
  std::size_t length = 0;
  try {
    platform.homeScreen.PNGetFlattenedIconState(5, 1, &buffer, &length);
  } catch (const std::bad_alloc&) {
    heard.emplace_back(static_cast<const char*>(buffer), length);
  }
  throw std::runtime_error("a plug-in that throws");
}

std::vector<std::string> linesOf(const std::string& recording) {
  std::vector<std::string> lines;
  const auto facts = record::show(recording, [&](std::string_view line) { lines.emplace_back(line); });
  EXPECT_EQ(facts.problem, "");
  EXPECT_TRUE(facts.isWhole);
  return lines;
}

TEST(Replay, WhatIsThrownIsThrownAgainWhereItWas) {
  std::vector<std::string> heard;
  const auto result = replayed(recordingOfThrows(), [&](const Platform& platform) { throwAndHear(platform, heard); });
  EXPECT_EQ(result.problem, "");
  EXPECT_EQ(kindsOf(result), std::vector<Difference::Kind>{});
  EXPECT_TRUE(result.isWhole);
  EXPECT_EQ(result.events, 14u);
  const auto error = platform::makeError("domain", 7, "put out before")->describe();
  EXPECT_EQ(heard, (std::vector<std::string>{"its own exception", "a service that throws, " + error, "lent"}));
}

/// Services of a replay throw as they should: so a plug-in that is recorded on them has the same recording.
TEST(Replay, WhatIsThrownIsRecordedWithItsEnd) {
  const std::string recording = recordingOfThrows();
  const auto sink = std::make_shared<Memory>();
  std::unique_ptr<record::RecordingPlatform> recorder;
  std::vector<std::string> heard;
  record::replay(recording, [&](const Platform& platform) {
    recorder = record::recordingPlatform(platform, sink);
    return recorder->makeClient([&](const Platform& recorded) {
      return std::make_shared<Plugin>(recorded, [&](const Platform& seen) { throwAndHear(seen, heard); });
    });
  });
  recorder = nullptr;
  EXPECT_EQ(heard.size(), 3u);
  const auto expected = linesOf(recording);
  auto lines = linesOf(sink->content);
  // Then the plug-in's object goes.
  ASSERT_GT(lines.size(), expected.size());
  lines.resize(expected.size());
  EXPECT_EQ(lines, expected);
}

TEST(Replay, WhatIsThrownDifferentlyIsTold) {
  const std::string recording = recordingOfThrows();
  const auto cameOf = [&](const Plugin::Work& work) {
    const auto result = replayed(recording, work);
    EXPECT_EQ(kindsOf(result), std::vector{Difference::Kind::otherResult});
    return result.differences.empty() ? "" : result.differences.front().came + " / " + result.differences[0].expected;
  };
  std::vector<std::string> heard;
  const std::string expected = "TSClient.clearSyncData throws \"a plug-in that throws\"";
  const auto other = [&](const Platform& platform) {
    try {
      throwAndHear(platform, heard);
    } catch (const std::runtime_error&) {
      throw OwnException();
    }
  };
  EXPECT_EQ(cameOf(other), "TSClient.clearSyncData throws no exception of the standard library / " + expected);
  const auto none = [&](const Platform& platform) {
    try {
      throwAndHear(platform, heard);
    } catch (const std::runtime_error&) {
      return;
    }
  };
  EXPECT_EQ(cameOf(none), "TSClient.clearSyncData returns  / " + expected);
  const auto inBlock = [](const Platform& platform) {
    platform.workspace.enumerateBundlesOfType(1,
                                              [](const platform::OBBundleProxyRef&, bool&) { throw OwnException(); });
  };
  EXPECT_EQ(cameOf(inBlock),
            "OBApplicationWorkspace.block throws no exception of the standard library, false / "
            "OBApplicationWorkspace.block throws no exception of the standard library, true");
}

TEST(Replay, WhatNoPlugInIsToldIsRefused) {
  const auto sink = std::make_shared<Memory>();
  record::EventWriter writer(sink);
  writer.addThread("main");
  writer.addOperation({"TSClient", "makeCoffee", ""});
  writer.write(EventKind::enter, 0, 0, 0, {});
  writer.finish();
  EXPECT_EQ(replayed(sink->content, asking({})).problem, "event 1: TSClient.makeCoffee is no call into a plug-in");
}

TEST(Replay, TwoObjectsHaveNotOneNumber) {
  const auto sink = std::make_shared<Memory>();
  record::EventWriter writer(sink);
  writer.addThread("main");
  const auto& create = record::inbound::create;
  writer.addOperation({create.service, create.name, create.parameters});
  ItemWriter client;
  client.object({ObjectKind::client, 1, ObjectMention::isNew});
  for (int again = 0; again < 2; ++again) {
    writer.write(EventKind::enter, 0, 0, 0, {});
    writer.write(EventKind::leave, 0, 0, 0, client.bytes());
  }
  writer.finish();
  EXPECT_EQ(replayed(sink->content, asking({})).problem, "event 4: an object gets the number of another one");
}

}  // namespace
