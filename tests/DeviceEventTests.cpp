#include <gtest/gtest.h>

#include <atomic>
#include <future>
#include <thread>

#include "device/boundary/Boundary.h"
#include "device/events/EventQueue.h"
#include "device/events/ObserverList.h"
#include "device/services/NotificationService.h"
#include "platform/Condition.h"
#include "platform/Mutex.h"

namespace {

using namespace device;
using platform::Value;
using namespace std::chrono_literals;

/// Posts from inside a call across the boundary.
void postInCall(Boundary& boundary, EventQueue& queue, Lane lane, EventQueue::Event event) {
  boundary.call({{"RVPromise", "setComplete"}}, nullptr, {}, [&] { queue.post(lane, std::move(event)); });
}

TEST(ManualEventQueue, letsTimePassOnlyWhenNothingElseHappens) {
  auto queue = makeManualEventQueue();
  auto& clock = queue->clock();
  auto start = clock.now();
  platform::Mutex mutex;
  platform::Condition changed;
  platform::Mutex::Lock lock(mutex);
  int events = 0;
  auto event = [&] {
    platform::Mutex::Lock inside(mutex);  // free while an event runs
    ++events;
  };
  for (int i = 0; i < 3; ++i) queue->post(Lane::registry, event);
  EXPECT_TRUE(clock.waitUntil(mutex, changed, start + 5min, [&] { return events == 2; }));
  EXPECT_EQ(clock.now(), start);
  EXPECT_FALSE(clock.waitUntil(mutex, changed, start, [] { return false; }));
  EXPECT_EQ(events, 2) << "no time, no events";
  EXPECT_FALSE(clock.waitUntil(mutex, changed, start + 5min, [] { return false; }));
  EXPECT_EQ(events, 3);
  EXPECT_EQ(clock.now(), start + 5min);
  lock.unlock();

  // An event that waits keeps its own lane busy and no other.
  std::string order;
  queue->post(Lane::registry, [&] {
    queue->post(Lane::registry, [&] { order += "r"; });
    queue->post(Lane::coordination, [&] { order += "c"; });
    platform::Mutex::Lock inside(mutex);
    EXPECT_FALSE(clock.waitUntil(mutex, changed, clock.now() + 1s, [] { return false; }));
    order += "w";
  });
  queue->deliverAll();
  EXPECT_EQ(order, "cwr");
  EXPECT_EQ(clock.now(), start + 5min + 1s);
}

TEST(HeldEvents, areLetGoByTheNextCallButNotByAMessage) {
  auto queue = makeManualEventQueue();
  Boundary boundary;
  auto post = [&] { postInCall(boundary, *queue, Lane::coordination, [] {}); };
  post();
  EXPECT_EQ(queue->pending(), 0u);
  Crossing message{{"log", "default"}};
  message.isMessage = true;
  boundary.call(message, nullptr, {}, [] {});
  EXPECT_EQ(queue->pending(), 0u);
  std::size_t seenByBody = 0;
  boundary.call({{"FileSystem", "fileExists"}}, nullptr, {}, [&] {
    seenByBody = queue->pending();
    post();  // a call inside a call lets go nothing of the outer one
    post();
  });
  EXPECT_EQ(seenByBody, 1u);
  EXPECT_EQ(queue->pending(), 1u);
  boundary.enter({{"AppsClient", "installedAssets"}}, {}, [&] {
    EXPECT_EQ(queue->pending(), 1u);
    post();
    EXPECT_EQ(queue->pending(), 3u);
  });
  EXPECT_EQ(queue->pending(), 4u);
  queue->post(Lane::registry, [&] {
    post();
    EXPECT_EQ(queue->pending(), 0u);
  });
  EXPECT_EQ(queue->deliverAll(), 6u);
  std::thread(post).join();  // a thread that ends lets go, too
  EXPECT_EQ(queue->pending(), 1u);
  post();
  queue = nullptr;
  EventQueue::release();  // to a queue that has gone
}

TEST(ThreadedEventQueue, holdsBackWhatACallCaused) {
  auto queue = makeThreadedEventQueue();
  Boundary boundary;
  platform::Mutex mutex;
  platform::Condition changed;
  std::string order;
  auto event = [&](const char* text) {
    return [&, text] {
      platform::Mutex::Lock lock(mutex);
      order += text;
      order += currentThreadName()[0];
      changed.notifyAll();
    };
  };
  postInCall(boundary, *queue, Lane::coordination, event("held "));
  std::promise<void> passed;
  std::thread([&] { queue->post(Lane::coordination, [&] { passed.set_value(); }); }).join();
  passed.get_future().wait();
  {
    platform::Mutex::Lock lock(mutex);
    EXPECT_EQ(order, "") << "an event posted later on the same lane went first";
    EXPECT_TRUE(queue->clock().waitUntil(mutex, changed, queue->clock().now() + 1min, [&] { return !order.empty(); }));
  }
  postInCall(boundary, *queue, Lane::registry, event(" then "));
  queue->drain();
  queue->post(Lane::registry, [&] { queue->post(Lane::notification, event(" last ")); });
  queue->drain();
  EXPECT_EQ(order, "held c then r last n");
  queue->stop();
  queue->post(Lane::registry, event("late"));
  queue->drain();
  EXPECT_EQ(order, "held c then r last n");
}

TEST(ThreadedEventQueue, mayBeStoppedByAnEvent) {
  auto queue = makeThreadedEventQueue();
  std::promise<void> stopped;
  queue->post(Lane::registry, [&] {
    queue->stop();
    stopped.set_value();
  });
  stopped.get_future().wait();
  queue->drain();
}

struct Listener {
  std::function<void()> heard;
};

TEST(ObserverList, endsCallbacksWithTheRemoval) {
  ObserverList<Listener> list;
  std::promise<void> inside, removing;
  std::atomic<bool> ended{false}, secondCalled{false};
  auto first = std::make_shared<Listener>();
  auto second = std::make_shared<Listener>();
  first->heard = [&] {
    inside.set_value();
    removing.get_future().wait();
    list.remove(second.get());  // not its turn yet
    for (int i = 0; i < 1000; ++i) std::this_thread::yield();
    ended = true;
  };
  second->heard = [&] { secondCalled = true; };
  list.add(first);
  list.add(second);
  std::thread delivering([&] { list.deliver([](Listener& listener, auto&) { listener.heard(); }); });
  inside.get_future().wait();
  removing.set_value();
  list.remove(first.get());
  EXPECT_TRUE(ended);
  delivering.join();
  EXPECT_FALSE(secondCalled);
  EXPECT_TRUE(list.empty());
}

TEST(ObserverList, letsAnObserverEndItselfFromItsCallback) {
  ObserverList<Listener> list;
  int calls = 0;
  auto self = std::make_shared<Listener>();
  std::weak_ptr<Listener> alive = self;
  self->heard = [&] {
    ++calls;
    list.remove(self.get());
    self = nullptr;
    EXPECT_FALSE(alive.expired()) << "kept alive while it is called";
  };
  auto gone = std::make_shared<Listener>();
  list.add(self);
  list.add(gone);
  gone = nullptr;
  list.add(gone);
  auto hear = [](Listener& listener, auto&) { listener.heard(); };
  EXPECT_EQ(list.deliver(hear), 1u);
  EXPECT_TRUE(alive.expired());
  EXPECT_EQ(list.deliver(hear), 0u);
  EXPECT_EQ(calls, 1);
}

TEST(NotificationService, keepsStatesAndCallsObserversOnItsLane) {
  auto queue = makeManualEventQueue();
  Boundary boundary;
  std::string kept;
  NotificationService center(boundary, *queue,
                             [&](auto& name, auto state) { kept += name + "=" + std::to_string(state) + " "; });
  int token = 0, other = 0;
  EXPECT_EQ(center.notify_register_check("a", token), 0u);
  EXPECT_EQ(center.notify_register_check("a", other), 0u);
  EXPECT_NE(token, other);
  EXPECT_NE(center.notify_register_check("", other), 0u);
  EXPECT_NE(center.notify_set_state(99, 1), 0u);
  EXPECT_NE(center.notify_post(""), 0u);
  EXPECT_EQ(center.notify_set_state(token, UINT64_MAX), 0u);
  EXPECT_EQ(center.state("a"), UINT64_MAX);
  EXPECT_EQ(center.state("b"), 0u);
  EXPECT_EQ(kept, "a=18446744073709551615 ");

  auto heard = std::make_shared<std::string>();
  auto hear = [](platform::NotificationCenter& from, void* observer, std::string_view name, const void*, const Value&) {
    auto& text = *static_cast<std::string*>(observer);
    text += std::string(name) + "@" + currentThreadName() + " ";
    if (name == "b") from.KBNotificationCenterRemoveObserver(observer, name);
  };
  for (const char* name : {"a", "b"}) center.KBNotificationCenterAddObserver(heard, hear, name, nullptr, {});
  for (const char* name : {"a", "b", "b", "c", "a"}) center.notify_post(name);
  queue->drain();
  EXPECT_EQ(*heard, "a@notification b@notification a@notification ");
  center.KBNotificationCenterRemoveObserver(heard.get(), "a");
  center.post("a");
  queue->drain();
  EXPECT_EQ(*heard, "a@notification b@notification a@notification ");
}

TEST(ManualEventQueue, servesSeveralThreads) {
  auto queue = makeManualEventQueue();
  std::atomic<int> ran{0};
  std::atomic<bool> inRegistry{false};
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&, i] {
      platform::Mutex mutex;
      platform::Condition changed;
      for (int n = 0; n < 100; ++n) {
        queue->post(Lane::registry, [&] {
          EXPECT_FALSE(inRegistry.exchange(true)) << "two events of one lane at once";
          ++ran;
          inRegistry = false;
        });
        platform::Mutex::Lock lock(mutex);
        if (i % 2) queue->clock().waitUntil(mutex, changed, queue->clock().now() + 1s, [&] { return n % 3 == 0; });
      }
      queue->drain();
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(ran, 400);
}

}  // namespace
