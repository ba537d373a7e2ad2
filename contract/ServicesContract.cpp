#include <algorithm>
#include <thread>

#include "contract/Fixture.h"
#include "platform/BackupService.h"
#include "platform/Clock.h"
#include "platform/DPProfileConnection.h"
#include "platform/HomeScreen.h"
#include "platform/IconRenderer.h"
#include "platform/Installer.h"
#include "platform/NotificationCenter.h"
#include "platform/Process.h"
#include "platform/PropertyListSerialization.h"
#include "platform/SystemLog.h"
#include "platform/TSSupport.h"

namespace contract {
namespace {

using platform::PropertyListFormat;

/// The services that stand for themselves.
class ServicesContract : public Fixture {
 protected:
  Bytes propertyList(const Value& value, PropertyListFormat format = PropertyListFormat::xml) {
    return platform().propertyLists.dataWithPropertyList(value, format).value_or("");
  }
  Lines homeOrder() {
    auto& home = platform().homeScreen;
    void* buffer = &home;
    std::size_t length = 0;
    EXPECT_EQ(home.PNGetFlattenedIconState(home.PNSPanelloBlockableServerPort(), 1, &buffer, &length), 0);
    Lines ids;
    if (!buffer) return ids;
    const Value order = platform().propertyLists.propertyListWithData(Bytes(static_cast<char*>(buffer), length));
    platform().process.deallocateMemory(buffer, length);
    EXPECT_TRUE(order.array());
    if (order.array()) {
      for (const auto& id : *order.array()) ids.emplace_back(id.string().value_or("?"));
    }
    return ids;
  }
};
INSTANTIATE_TEST_SUITE_P(Contract, ServicesContract, testing::ValuesIn(hosts()), nameOfHost);

Value arrayOf(std::initializer_list<Value> values) {
  auto array = Value::makeArray();
  for (const auto& each : values) array.array()->append(each);
  return array;
}

TEST_P(ServicesContract, PropertyListsComeBackAsTheyWent) {
  auto inner = Value::makeDictionary();
  inner.dictionary()->set("empty", Value::makeDictionary());
  inner.dictionary()->set("<&>\"'", arrayOf({"caf\xc3\xa9", ""}));
  const Value value = arrayOf({true, false, 0, INT64_MIN, UINT64_MAX, 0.5, platform::Date{86400}, "text",
                               Value::makeData(Bytes("\0\xff", 2)), inner, Value::makeArray(), dictionaryOf(8),
                               dictionaryOf(9), dictionaryOf(64), dictionaryOf(1000)});
  auto& service = platform().propertyLists;
  for (auto format : {PropertyListFormat::xml, PropertyListFormat::binary}) {
    ErrorRef error = platform::makeError("Stale", 1);
    auto bytes = service.dataWithPropertyList(value, format, &error);
    ASSERT_TRUE(bytes && !error) << (error ? error->describe() : "");
    error = platform::makeError("Stale", 1);
    EXPECT_EQ(service.propertyListWithData(*bytes, &error), value);
    EXPECT_FALSE(error);
    EXPECT_TRUE(service.propertyListWithData(bytes->substr(0, bytes->size() / 2), &error).isAbsent());
    EXPECT_TRUE(error);
  }
  for (const char* junk : {"", "no property list", "bplist00", "<plist><array>"}) {
    ErrorRef error;
    EXPECT_TRUE(platform::isNoPropertyList(service.propertyListWithData(junk, &error), error)) << junk;
  }
}

TEST_P(ServicesContract, TheHomeScreenTakesALayoutWholeOrNotAtAll) {
  auto& home = platform().homeScreen;
  auto port = home.PNSPanelloBlockableServerPort();
  EXPECT_EQ(homeOrder(), Lines{}) << "no order: no buffer, and no failure";
  EXPECT_EQ(home.PNSetIconState(port, propertyList(arrayOf({arrayOf({"c"}), Value::makeArray(), arrayOf({"b"})}))), 0);
  EXPECT_EQ(homeOrder(), (Lines{"c", "b"}));
  EXPECT_EQ(home.PNSetIconState(port, propertyList(arrayOf({"b", "a"}), PropertyListFormat::binary)), 0);
  for (const Bytes& refused : {Bytes(), Bytes("no property list"), propertyList(Value::makeDictionary())}) {
    EXPECT_NE(home.PNSetIconState(port, refused), 0) << refused;
  }
  EXPECT_EQ(homeOrder(), (Lines{"b", "a"}));
}

struct NotificationObserver {
  Notes notes;
  std::function<void(platform::NotificationCenter&)> then;
};

void note(platform::NotificationCenter& center, void* observer, std::string_view name, const void*, const Value&) {
  auto* self = static_cast<NotificationObserver*>(observer);
  self->notes.add(std::string(name));
  if (self->then) self->then(center);
}

TEST_P(ServicesContract, NotificationsReachWhoIsRegisteredForTheName) {
  auto& center = platform().notifications;
  auto add = [&](const std::shared_ptr<NotificationObserver>& observer, const char* name) {
    center.KBNotificationCenterAddObserver(observer, note, name, nullptr,
                                           platform::KBNotificationSuspensionBehavior::drop);
  };
  auto post = [&](const char* name) {
    InsideCall inside;
    EXPECT_EQ(center.notify_post(name), 0u);
  };
  auto observer = std::make_shared<NotificationObserver>();
  add(observer, "one");
  add(observer, "two");
  post("one");
  post("two");
  post("three");
  host().deliver();
  EXPECT_EQ(observer->notes.take(), (Lines{"one", "two"}));
  center.KBNotificationCenterRemoveObserver(observer.get(), "one");
  post("one");
  post("two");
  host().deliver();
  EXPECT_EQ(observer->notes.take(), Lines{"two"});
  observer->then = [&](platform::NotificationCenter& from) {
    from.KBNotificationCenterRemoveObserver(observer.get(), "two");
  };
  post("two");
  host().deliver();
  post("two");
  host().deliver();
  EXPECT_EQ(observer->notes.take(), Lines{"two"}) << "it may end itself in its callback";
  add(observer, "two");
  std::weak_ptr<NotificationObserver> alive = observer;
  observer->then = nullptr;
  observer.reset();
  EXPECT_TRUE(alive.expired()) << "nobody keeps an observer alive";
  post("two");
  host().deliver();
  int token = -1;
  ASSERT_EQ(center.notify_register_check("one", token), 0u);
  EXPECT_EQ(center.notify_set_state(token, 1), 0u);
}

TEST_P(ServicesContract, TheRemovalOfANotificationObserverWaitsForItsCallback) {
  auto& center = platform().notifications;
  auto observer = std::make_shared<NotificationObserver>();
  expectRemovalToWait(
      [&](const std::function<void()>& callback) {
        observer->then = [callback](platform::NotificationCenter&) { callback(); };
        center.KBNotificationCenterAddObserver(observer, note, "one", nullptr,
                                               platform::KBNotificationSuspensionBehavior::drop);
        center.notify_post("one");
      },
      [&] { center.KBNotificationCenterRemoveObserver(observer.get(), "one"); });
}

TEST_P(ServicesContract, TheClockWaitsForTheConditionOrTheDeadline) {
  auto& clock = platform().clock;
  platform::Mutex mutex;
  platform::Condition changed;
  platform::Mutex::Lock lock(mutex);
  auto begin = clock.now();
  EXPECT_TRUE(clock.waitUntil(mutex, changed, begin, [] { return true; })) << "true already, deadline or not";
  auto deadline = clock.now() + std::chrono::milliseconds(20);
  EXPECT_FALSE(clock.waitUntil(mutex, changed, deadline, [] { return false; }));
  EXPECT_GE(clock.now(), deadline);
  // What is delivered meanwhile may make it true.
  auto observer = std::make_shared<RecordingObserver>();
  bool reported = false;
  observer->then = [&] {
    platform::Mutex::Lock inside(mutex);
    reported = true;
    changed.notifyAll();
  };
  lock.unlock();
  registry().addObserver(observer);
  lock.lock();
  EXPECT_TRUE(clock.waitUntil(mutex, changed, clock.now() + std::chrono::seconds(10), [&] { return reported; }));
  lock.unlock();
  registry().removeObserver(observer.get());
}

TEST_P(ServicesContract, TheClockWaitsWithoutADeadlineForAnotherThread) {
  auto& clock = platform().clock;
  platform::Mutex mutex;
  platform::Condition changed;
  bool waits = false, done = false;
  const auto begin = clock.now();
  std::thread other([&] {
    platform::Mutex::Lock lock(mutex);
    changed.wait(mutex, [&] { return waits; });
    done = true;
    changed.notifyAll();
  });
  {
    platform::Mutex::Lock lock(mutex);
    waits = true;
    changed.notifyAll();
    EXPECT_TRUE(clock.waitUntil(mutex, changed, platform::Clock::noDeadline, [&] { return done; }));
    EXPECT_TRUE(done);
  }
  other.join();
  EXPECT_LT(clock.now() - begin, std::chrono::hours(24)) << "a virtual clock has jumped to the end of time";
}

TEST_P(ServicesContract, WhatIsNotThereIsAbsent) {
  auto& process = platform().process;
  EXPECT_FALSE(process.mainBundleIdentifier().empty());
  std::string temporary = process.temporaryDirectory();
  EXPECT_TRUE(temporary.size() > 1 && temporary.front() == '/' && temporary.back() != '/') << temporary;
  EXPECT_TRUE(process.infoDictionaryOfBundleAtPath(host().scratchDirectory() + "/None.app").isAbsent());
  EXPECT_FALSE(platform().installer.makeStoreMetadata({})) << "store metadata of no dictionary";
  EXPECT_TRUE(platform().installer.makeInstallOptions());
  auto log = platform().systemLog.createHandle("subsystem", "category");
  ASSERT_TRUE(log);
  log->write(platform::LogLevel::standard, "a message of the contract suite");
  EXPECT_EQ(&platform().support.TSGetLogCategory(8), &platform().support.TSGetLogCategory(8));
  auto& icons = platform().iconRenderer;
  auto url = icons.KBURLCreateWithFileSystemPath(host().scratchDirectory() + "/None.app", true);
  auto bundle = url ? icons.KBBundleCreate(url) : nullptr;
  EXPECT_FALSE(bundle && icons.GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(bundle));
  Bytes data;
  EXPECT_FALSE(platform().imageEncoder.QGImageDestinationCreateWithData(data, "no.such.type", 1));
  platform().restrictions.effectiveBoolValueForSetting("NoSuchSetting");
  ErrorRef shown = coordination().RVCreateUserPresentableError(1, 0, platform::makeError("Contract", 5));
  ASSERT_TRUE(shown);
  EXPECT_EQ(shown->underlying() ? shown->underlying()->code() : 0, 5);
}

TEST_P(ServicesContract, OperationsMayComeFromAnyThreadAtOnce) {
  auto work = [&](int worker) {
    for (int i = 0; i < 20; ++i) {
      std::string app = "com.example.app" + std::to_string((worker + i) % 3);
      auto coordinator = coordination().coordinatorForAppWithBundleID(initiating, app, 3, true);
      if (!coordinator) continue;
      coordinator->setPlaceholderPromise(placeholder(app));
      registry().enumerateBundlesOfType(0, [&](const auto& bundle, bool&) {
        if (i % 4 == worker) registry().uninstallApplication(*bundle->bundleIdentifier);
      });
      if (i % 2 == 0) coordinator->cancelForReason(nullptr, 3);
      platform().notifications.notify_post("one");
    }
  };
  auto observer = std::make_shared<platform::OBApplicationWorkspaceObserver>();
  registry().addObserver(observer);
  std::vector<std::thread> workers;
  for (int worker = 0; worker < 3; ++worker) workers.emplace_back(work, worker);
  host().deliver();
  for (auto& worker : workers) worker.join();
  host().deliver();
  for (int i = 0; i < 3; ++i) {
    std::string app = "com.example.app" + std::to_string(i);
    auto open = coordination().coordinatorForAppWithBundleID(anyKind, app, 3, false);
    EXPECT_EQ(stateOf(app) == "placeholder", open && open->hasPlaceholderPromise()) << app;
  }
  registry().removeObserver(observer.get());
}

}  // namespace
}  // namespace contract
