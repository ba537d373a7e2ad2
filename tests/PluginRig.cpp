#include "tests/PluginRig.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <stdexcept>

#include "device/boundary/Journal.h"
#include "platform/Describe.h"
#include "platform/FileSystem.h"
#include "platform/NotificationCenter.h"
#include "plist/PropertyList.h"

namespace tests {

using device::CallRecord;

bool matches(std::string_view pattern, std::string_view text) {
  auto star = pattern.find('*');
  if (star == pattern.npos) return pattern == text;
  if (text.substr(0, star) != pattern.substr(0, star)) return false;
  std::string_view rest = pattern.substr(star + 1);
  for (std::size_t at = star; at <= text.size(); ++at) {
    if (matches(rest, text.substr(at))) return true;
  }
  return false;
}

Value arrayOf(const std::vector<std::string>& elements) {
  Value value = Value::makeArray();
  for (const auto& element : elements) value.array()->append(element);
  return value;
}

Bytes binaryList(const Value& value) { return plist::writeBinary(value).value(); }

const Bytes& iconImage() {
  static const Bytes image = pngOf(8, 8);
  return image;
}

void DaemonTransfers::prioritizeAsset(const TSAssetRef& asset, std::function<void(ErrorRef)> completion) {
  platform::Mutex::Lock lock(_mutex);
  _prioritized.push_back(asset->identifier());
  _completions.push_back(std::move(completion));
}

void DaemonTransfers::cancelAssetTransferForFailedAsset(const TSAssetRef& asset) {
  platform::Mutex::Lock lock(_mutex);
  _cancelled.push_back(asset->identifier());
}

std::vector<std::string> DaemonTransfers::prioritized() const {
  platform::Mutex::Lock lock(_mutex);
  return _prioritized;
}

bool DaemonTransfers::wasCancelled(const std::string& identifier) const {
  platform::Mutex::Lock lock(_mutex);
  return std::count(_cancelled.begin(), _cancelled.end(), identifier) != 0;
}

void DaemonTransfers::forget() {
  platform::Mutex::Lock lock(_mutex);
  _prioritized.clear();
  _cancelled.clear();
}

bool DaemonTransfers::complete() {
  std::vector<std::function<void(ErrorRef)>> completions;
  {
    platform::Mutex::Lock lock(_mutex);
    completions.swap(_completions);
  }
  for (auto& completion : completions) completion(nullptr);
  return !completions.empty();
}

static bool isTransactionMessage(const CallRecord& record) {
  return record.service == "log" && (*record.arguments.dictionary())["category"].string() == "tsd.appsync";
}

static std::vector<device::InjectionRule> parsedRules(const std::vector<std::string>& rules) {
  std::vector<device::InjectionRule> parsed;
  for (const auto& rule : rules) {
    ErrorRef error;
    auto each = device::InjectionRule::parse(rule, &error);
    if (each) parsed.push_back(*each);
    EXPECT_TRUE(each) << error->describe();
  }
  return parsed;
}

PluginRig::PluginRig(const Options& options) : PluginRig(options, nullptr, nullptr) {}

PluginRig::PluginRig(const Options& options, std::unique_ptr<device::FileTree> files,
                     std::unique_ptr<device::Store> store)
    : _options(options) {
  openJournal();
  _parts.files = std::move(files);
  _parts.store = std::move(store);
  if (!_parts.files) _parts.makeInMemory();
  open();
  EXPECT_TRUE(_device->set("icon-size", "16"));
  load();
}

std::string PluginRig::pluginFile() {
  const char* named = std::getenv("APPSYNC_PLUGIN");
  return named ? named : SHIPPED_PLUGIN;
}

/// In the folder that the environment names, if it does: a name that is no other rig's.
static std::optional<std::string> newFile(const char* variable, const std::string& suffix) {
  static std::atomic<int> number = 0;
  const char* folder = std::getenv(variable);
  if (!folder) return std::nullopt;
  const auto* test = ::testing::UnitTest::GetInstance()->current_test_info();
  std::string name = test ? std::string(test->test_suite_name()) + "." + test->name() : "rig";
  std::replace(name.begin(), name.end(), '/', '-');
  return std::string(folder) + "/" + name + "." + std::to_string(++number) + suffix;
}

/// One file for the life of the rig, for the tests that hold journals against the rules.
void PluginRig::openJournal() {
  if (!_options.journaled) return;
  const auto path = newFile("APPSYNC_JOURNALS", ".jsonl");
  if (!path) return;
  _journal.open(*path);
  EXPECT_TRUE(_journal.is_open()) << *path;
}

void PluginRig::open() {
  device::DeviceOptions chosen;
  chosen.mainBundleIdentifier = _options.process;
  chosen.deviceService = &_transfers;
  chosen.rules = parsedRules(_options.rules);
  if (_options.journaled) {
    _records.reserve(1024);
    chosen.journals.push_back({[this](const CallRecord& record) {
      if (_options.told) _options.told(record);
      if (_journal.is_open()) _journal << device::journalLine(record) << '\n';
      // What the transaction log makes of its records says the same again.
      if (!isTransactionMessage(record)) _records.push_back(record);
    }});
  }
  std::unique_ptr<device::EventQueue> events;
  if (_options.threaded) {
    events = device::makeThreadedEventQueue();
  } else {
    auto manual = device::makeManualEventQueue();
    _manualEvents = manual.get();
    events = std::move(manual);
  }
  _device = device::LocalDevice::open(_parts.lendFiles(), _parts.lendStore(), std::move(events), std::move(chosen));
  if (!_device) throw std::runtime_error("these parts are no device's");
  _transfers.serve(*_device);
}

void PluginRig::reopen() {
  unload();
  _recordings.clear();
  _device = nullptr;
  open();
  load();
}

void PluginRig::beginStep(const std::vector<std::string>& rules) {
  _device->boundary().setRules(parsedRules(rules));
  _records.clear();
  _transfers.forget();
}

PluginRig::~PluginRig() {
  unload();
  _device->events().stop();
}

void PluginRig::load() {
  _client = makeClient(platform());
  _daemon.emplace(*_device, *_client);
}

std::shared_ptr<platform::TSClient> PluginRig::makeClient(const platform::Platform& platform) {
  const auto path = newFile("APPSYNC_RECORDINGS", ".recording");
  if (!path) return _plugin.create(platform);
  ErrorRef error;
  auto sink = record::makeFileSink(*path, &error);
  EXPECT_TRUE(sink) << error->describe();
  if (!sink) return _plugin.create(platform);
  _recordings.push_back(
      record::recordingPlatform(platform, std::move(sink), {.threadName = device::currentThreadName}));
  return _recordings.back()->makeClient([this](const platform::Platform& seen) { return _plugin.create(seen); });
}

void PluginRig::unload() {
  deliver();
  _client = nullptr;
  _device->events().drain();
}

void PluginRig::postStartup() {
  platform().notifications.notify_post(startupNotification);
  deliver();
}

void PluginRig::deliver() {
  do _device->events().drain();
  while (_transfers.complete());
}

void PluginRig::progress(const TSAssetRef& asset, double fraction) {
  asset->setDownloadProgress(static_cast<float>(fraction));
  _daemon->assetTransferUpdatedProgress(asset, fraction);
}

void PluginRig::write(const std::string& path, const Bytes& content) {
  auto& files = _device->files();
  EXPECT_TRUE(files.createDirectory(path.substr(0, path.rfind('/')), true, {})) << path;
  EXPECT_TRUE(files.createFile(path, content, {})) << path;
}

std::optional<Bytes> PluginRig::read(const std::string& path) { return _device->files().readFile(path); }

Value PluginRig::readList(const std::string& path) {
  auto bytes = read(path);
  return bytes ? plist::read(std::move(*bytes)) : Value();
}

bool PluginRig::exists(const std::string& path) { return _device->files().fileExists(path); }

void PluginRig::install(const std::string& identifier, const std::string& version) {
  ErrorRef error;
  std::string path = receivePackage(identifier, packageOf(identifier, version));
  EXPECT_TRUE(_device->installFromPackage(path, &error)) << error->describe();
}

std::string PluginRig::receivePackage(const std::string& identifier, const Bytes& content) {
  std::string path = std::string(packagesDirectory) + "/" + identifier + ".pkg";
  write(path, content);
  return path;
}

std::vector<const CallRecord*> PluginRig::recordsIn(std::string_view operation, std::size_t nth) const {
  std::vector<const CallRecord*> found;
  bool inside = false;
  std::string thread;
  for (const auto& record : _records) {
    if (record.service == "AppsClient" && record.operation == operation) {
      if (inside && record.end && record.thread == thread) return found;
      if (!record.end && --nth == 0) {
        inside = true;
        thread = record.thread;
      }
    } else if (inside && record.thread == thread) {
      found.push_back(&record);
    }
  }
  return found;
}

std::vector<std::string> PluginRig::messagesIn(std::string_view operation, std::size_t nth) const {
  std::vector<std::string> lines;
  for (const auto* record : recordsIn(operation, nth)) {
    if (record->service == "log") lines.push_back(lineOf(*record));
  }
  return lines;
}

std::vector<std::string> PluginRig::traceIn(std::string_view operation, const std::string& app, std::size_t nth) const {
  std::vector<std::string> lines;
  for (const auto* record : recordsIn(operation, nth)) {
    std::string line = lineOf(*record);
    if (record->app == app || line.find(app) != line.npos) lines.push_back(std::move(line));
  }
  return lines;
}

std::vector<std::string> PluginRig::messages() const {
  std::vector<std::string> lines;
  for (const auto& record : _records) {
    if (record.service == "log") lines.push_back(lineOf(record));
  }
  return lines;
}

std::size_t PluginRig::countOf(std::string_view operation, std::string_view app) const {
  return static_cast<std::size_t>(std::count_if(_records.begin(), _records.end(), [&](const CallRecord& record) {
    return !record.end && record.operation == operation && (app.empty() || record.app == app);
  }));
}

static std::string lineOfMessage(const CallRecord& record) {
  constexpr std::string_view prefix = "com.vantor.tsd.appsync|";
  const auto& arguments = *record.arguments.dictionary();
  std::string category = platform::describe(arguments["category"]);
  std::string_view text = arguments["text"].string().value_or("");
  std::string line = record.operation == "error" ? "E " : "";
  if (category != "8") line += "[" + category + "] ";
  if (category != "0") {
    if (text.substr(0, prefix.size()) != prefix) return line + "without the prefix: " + std::string(text);
    text.remove_prefix(prefix.size());
  }
  return line += text;
}

std::string lineOf(const CallRecord& record) {
  if (record.service == "log") return lineOfMessage(record);
  const auto& arguments = *record.arguments.dictionary();
  auto text = [&](std::string_view name) { return platform::describe(arguments[name]); };
  auto outcome = [&] { return arguments["success"].boolValue() ? " y " : " n "; };
  if (record.operation == "logStep") {
    return "step " + text("step") + '/' + text("party") + '/' + text("phase") + outcome() + record.app + ' ' +
           text("description");
  }
  if (record.operation == "logScenario") {
    return "scenario " + text("scenario") + ' ' + text("step") + outcome() + record.app + ' ' + text("description");
  }
  std::string line = record.operation + '(';
  for (const auto& [key, value] : arguments) {
    if (key == "self") continue;
    if (line.back() != '(') line += ", ";
    line += platform::describe(value);
  }
  line += ')';
  if (!record.result.isAbsent()) line += " = " + platform::describe(record.result);
  if (record.error) line += " ! " + record.error->domain() + ' ' + std::to_string(record.error->code());
  return line;
}

}  // namespace tests
