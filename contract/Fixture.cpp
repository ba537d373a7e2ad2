#include "contract/Fixture.h"

#include <future>
#include <ostream>
#include <thread>

#include "platform/FileSystem.h"
#include "platform/Installer.h"

namespace contract {

namespace {
thread_local int callsOfThisThread = 0;
}

Value dictionaryOf(std::size_t keys) {
  Value value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  for (std::size_t number = 0; number < keys; ++number) {
    const std::string key = "key " + std::to_string(number);
    if (number % 3 == 0) entries.set(key, "größer");
    if (number % 3 == 1) entries.set(key, number);
    if (number % 3 == 2) entries.set(key, dictionaryOf(number % 12));
  }
  return value;
}

InsideCall::InsideCall() { ++callsOfThisThread; }
InsideCall::~InsideCall() { --callsOfThisThread; }
bool InsideCall::isOpen() { return callsOfThisThread > 0; }

void Notes::add(std::string line) {
  EXPECT_FALSE(InsideCall::isOpen()) << line << ": called back before the call had returned";
  platform::Mutex::Lock lock(_mutex);
  _lines.push_back(std::move(line));
}

Lines Notes::take() {
  platform::Mutex::Lock lock(_mutex);
  return std::exchange(_lines, {});
}

void RecordingDelegate::promiseDidBeginFulfillmentWithIdentifier(std::uint64_t) { notes.add("begins"); }

void RecordingDelegate::coordinatorDidInstallPlaceholder(const CoordinatorRef& coordinator) {
  add("placeholder", coordinator);
}

void RecordingDelegate::coordinatorDidCompleteSuccessfully(const CoordinatorRef& coordinator) {
  add(coordinator->error() ? "fails" : "completes", coordinator);
}

void RecordingDelegate::coordinatorCanceledWithReason(const CoordinatorRef& coordinator, const ErrorRef&,
                                                      platform::RVClientIdentifier client) {
  add("cancelled by " + std::to_string(client), coordinator);
}

void RecordingDelegate::add(const std::string& what, const CoordinatorRef& coordinator) {
  notes.add(what);
  if (then) then(coordinator);
}

static std::string textOf(const RecordingObserver::Proxies& proxies) {
  std::string text;
  for (const auto& proxy : proxies) text += ' ' + proxy->applicationIdentifier.value_or("?");
  return text;
}

void RecordingObserver::applicationInstallsArePrioritized(const Proxies& prioritized, const Proxies& paused) {
  notes.add("runs" + textOf(prioritized) + (paused.empty() ? "" : " paused" + textOf(paused)));
  if (then) then();
}

void RecordingObserver::applicationInstallsDidCancel(const Proxies& applications) {
  notes.add("cancelled" + textOf(applications));
}

Fixture::Fixture() : _host(GetParam().make()) { makeDirectories(); }

Fixture::~Fixture() {
  host().deliver();
  platform().fileSystem.removeItem(host().scratchDirectory());
}

void Fixture::makeDirectories() {
  for (const auto& directory : {host().scratchDirectory(), host().packageDirectory()}) {
    ErrorRef error;
    EXPECT_TRUE(platform().fileSystem.createDirectory(directory, true, {}, &error))
        << (error ? error->describe() : directory);
  }
}

CoordinatorRef Fixture::coordinator(Kind kind, const std::string& app) {
  ErrorRef error;
  auto result = coordination().coordinatorForAppWithBundleID(kind, app, 3, true, nullptr, &error);
  EXPECT_TRUE(result) << (error ? error->describe() : "no reason given");
  return result;
}

std::shared_ptr<platform::RVPlaceholder> Fixture::placeholder(const std::string& app) {
  auto result = coordination().makeAppPlaceholder("Maps", app, 4, 3);
  Value manifest = dictionaryOf(40);
  manifest.dictionary()->set("Genre", "Travel");
  auto attributes = coordination().makePlaceholderAttributesWithInfoPlistDictionary(manifest);
  attributes->setBundleVersion("2");
  EXPECT_TRUE(result->setPlaceholderAttributes(attributes));
  EXPECT_TRUE(result->setMetadata(platform().installer.makeStoreMetadata(dictionaryOf(25))));
  EXPECT_TRUE(result->setConfigurationCompleteWithError());
  return result;
}

PackageRef Fixture::promise(const CoordinatorRef& coordinator, const std::string& app) {
  auto options = platform().installer.makeInstallOptions();
  options->setObInstallType(4);
  EXPECT_TRUE(coordinator->setInstallOptions(options));
  auto result = coordination().makePromisedTransferToPathWithoutPath(app + "-Asset", 3, 0);
  EXPECT_TRUE(coordinator->setAppAssetPromise(result));
  return result;
}

PackageRef Fixture::begin(Kind kind, const std::string& app) {
  auto handle = coordinator(kind, app);
  auto result = promise(handle, app);
  auto shown = placeholder(app);
  ErrorRef error;
  InsideCall inside;
  EXPECT_TRUE(handle->setPlaceholderPromise(shown, &error)) << (error ? error->describe() : "");
  return result;
}

void Fixture::send(const PackageRef& promise, const Bytes& package, const std::string& app) {
  std::string path = host().packageDirectory() + '/' + app + ".pkg";
  EXPECT_TRUE(platform().fileSystem.writeAtomically(path, package));
  promise->setTransferPath(path);
  InsideCall inside;
  promise->setComplete(true);
}

void Fixture::install(const std::string& app, const std::string& version) {
  bool isThere = registry().applicationIsInstalled(app);
  send(begin(isThere ? updating : initiating, app), packageOf(app, version), app);
  host().deliver();
  ASSERT_EQ(stateOf(app), "installed " + version);
}

std::string Fixture::stateOf(const std::string& app) {
  if (auto proxy = registry().applicationProxyForIdentifier(app, true)) {
    EXPECT_TRUE(proxy->isPlaceholder && !proxy->isInstalled);
    return "placeholder";
  }
  auto proxy = registry().applicationProxyForIdentifier(app, false);
  if (!proxy) return "";
  EXPECT_TRUE(proxy->isInstalled && !proxy->isPlaceholder);
  return (proxy->installProgressSync ? "updating " : "installed ") + proxy->bundleVersion.value_or("?");
}

void Fixture::expectRemovalToWait(const std::function<void(const std::function<void()>& callback)>& arrange,
                                  const std::function<void()>& remove) {
  platform::Mutex mutex;
  platform::Condition changed;
  bool entered = false, mayEnd = false;
  std::atomic<bool> ended = false;
  arrange([&] {
    platform::Mutex::Lock lock(mutex);
    entered = true;
    changed.notifyAll();
    changed.wait(mutex, [&] { return mayEnd; });
    // A removal that does not wait returns by now.
    for (int i = 0; i < 1000; ++i) std::this_thread::yield();
    ended = true;
  });
  // A device may hold back what a call caused until the same thread's next call.
  registry().applicationIsInstalled(maps);
  std::thread delivery([&] { host().deliver(); });
  {
    platform::Mutex::Lock lock(mutex);
    changed.wait(mutex, [&] { return entered; });
  }
  std::promise<void> removing;
  std::thread removal([&] {
    removing.set_value();
    remove();
    EXPECT_TRUE(ended) << "the observer was gone while its callback ran";
  });
  removing.get_future().wait();
  {
    platform::Mutex::Lock lock(mutex);
    mayEnd = true;
    changed.notifyAll();
  }
  removal.join();
  delivery.join();
}

std::string nameOfHost(const testing::TestParamInfo<NamedHost>& info) { return info.param.name; }
void PrintTo(const NamedHost& host, std::ostream* out) { *out << host.name; }

}  // namespace contract
