#include "tsd/daemon/DeviceSession.h"

#include "device/boundary/Journal.h"
#include "device/services/ListProblem.h"
#include "tsd/CommandError.h"
#include "tsd/StartThread.h"
#include "tsd/history/LogLine.h"

namespace tsd {

DeviceSession::DeviceSession(const CommandContext& context, const Setup& setup) : _context(context) {
  if (setup.use == DeviceUse::copy)
    DeviceLock::requireDevice(setup.folder);
  else
    _lock.emplace(setup.folder);
  if (setup.use == DeviceUse::kept && !context.kept)
    context.kept.emplace(setup.folder, context.options, context.console);
  if (!context.options.log.empty()) _log.emplace(context.options.log);
  if (!context.options.calls.empty()) _calls.emplace(context.options.calls);
  if (!context.options.trace.empty()) _trace.emplace(context.options.trace);
  openRecording();
  platform::ErrorRef error;
  _device = setup.use == DeviceUse::copy
                ? device::openDeviceCopy(setup.folder, device::makeManualEventQueue(), deviceOptions(setup), &error)
                : device::openDevice(setup.folder, startThreads(device::makeThreadedEventQueue), deviceOptions(setup),
                                     &error);
  if (!_device) throw CommandError(setup.folder + ": " + textOf(error));
}

DeviceSession::~DeviceSession() {
  unloadPlugin();
  _device->events().stop();
  tellRepeatedFailures();
  for (const auto& rule : _device->boundary().idleRules())
    _context.console.message("--inject " + rule.text + ": its turn never came");
  if (_log && _log->failed()) _context.console.message(_context.options.log + ": not every line could be written");
  if (_calls && _calls->failed())
    _context.console.message(_context.options.calls + ": not every line could be written");
  if (_trace && _trace->failed())
    _context.console.message(_context.options.trace + ": not every line could be written");
  if (!_recording) return;
  _recording->finish();
  if (_recording->failed()) _context.console.message(_context.options.record + ": not everything could be recorded");
}

void DeviceSession::unloadPlugin() {
  _client.reset();
  _device->events().drain();
}

void DeviceSession::settle() {
  _device->events().drain();
  platform::ErrorRef error;
  if (!_device->flush(&error)) throw CommandError("not everything could be stored: " + textOf(error));
  platform::Mutex::Lock lock(_mutex);
  if (!_complaint.empty()) throw CommandError("not everything could be done: " + _complaint);
}

void DeviceSession::complain(std::string_view operation, std::string_view path, std::string_view reason) {
  const std::string text = std::string(path) + ": " + std::string(operation) + " failed: " + std::string(reason);
  platform::Mutex::Lock lock(_mutex);
  // The plug-in copies icons alone, and installs an app without one all the same.
  const bool isIcon = operation == "copyItem";
  auto [failures, isFirst] = _failures.try_emplace(isIcon ? std::string(operation)
                                                          : std::string(operation) + " failed: " + std::string(reason));
  if (isFirst) failures->second.first = text;
  ++failures->second.count;
  if (isIcon) return;
  if (isFirst) _context.console.message(text);
  // What the list has else is used.
  if (_complaint.empty() && operation != device::readingAnEntry) _complaint = text;
}

void DeviceSession::tellRepeatedFailures() {
  platform::Mutex::Lock lock(_mutex);
  for (const auto& [what, failures] : _failures) {
    if (what == "copyItem") {
      _context.console.message(std::to_string(failures.count) +
                               (failures.count == 1 ? " icon could not be copied, and its placeholder has none: "
                                                    : " icons could not be copied, and their placeholders have none; "
                                                      "the first: ") +
                               failures.first);
    } else if (failures.count > 1) {
      _context.console.message(what + ": " + std::to_string(failures.count) + " times in all");
    }
  }
}

device::DeviceOptions DeviceSession::deviceOptions(const Setup& setup) {
  device::DeviceOptions options;
  options.mainBundleIdentifier = setup.mainBundleIdentifier;
  options.deviceService = setup.deviceService;
  options.changed = setup.changed;
  options.rules = _context.options.rules;
  if (setup.earlyEnd) {
    options.declines = [earlyEnd = setup.earlyEnd](std::string_view service, std::string_view operation) {
      return earlyEnd->declines(service, operation);
    };
  }
  options.fileFailed = [this](std::string_view operation, std::string_view path, std::string_view reason) {
    complain(operation, path, reason);
  };
  options.recovers = setup.use != DeviceUse::copy || !DeviceLock::holderOf(setup.folder);
  KeptRun* kept = setup.use == DeviceUse::kept ? &*_context.kept : nullptr;
  if (_log || kept) {
    options.log = [this, kept](const device::LogRecord& record) {
      if (_log) _log->write(logLine(record));
      if (kept) kept->hear(record);
    };
  } else if (_sink) {
    // The plug-in makes its messages when somebody listens.
    options.log = [](const device::LogRecord&) {};
  }
  if (kept) {
    options.journals.push_back({[kept](const device::CallRecord& record) { kept->hear(record); },
                                device::JournalDetail::brief, [kept] { kept->handOver(); }});
  }
  if (_calls) {
    options.journals.push_back(
        {[this](const device::CallRecord& record) { _calls->write(device::journalLine(record)); }});
  }
  if (_trace) {
    options.journals.push_back(
        {[this](const device::CallRecord& record) { _trace->hear(record); }, device::JournalDetail::brief});
  }
  return options;
}

platform::TSClient& DeviceSession::loadPlugin() { return makeClient(_device->platform()); }

platform::TSClient& DeviceSession::loadPlugin(const StopSignal& stop, CountdownClock::Tick tick) {
  const auto& services = _device->platform();
  _clock.emplace(services.clock, stop, std::move(tick));
  _platform.emplace(platform::Platform{
      .process = services.process,
      .clock = *_clock,
      .fileSystem = services.fileSystem,
      .propertyLists = services.propertyLists,
      .systemLog = services.systemLog,
      .support = services.support,
      .deviceService = services.deviceService,
      .installCoordination = services.installCoordination,
      .workspace = services.workspace,
      .installer = services.installer,
      .backup = services.backup,
      .restrictions = services.restrictions,
      .homeScreen = services.homeScreen,
      .iconRenderer = services.iconRenderer,
      .imageEncoder = services.imageEncoder,
      .transactionLog = services.transactionLog,
      .notifications = services.notifications,
  });
  return makeClient(*_platform);
}

/// What a run begins with may be long gone when it is recorded, so the file is made before anything is done.
void DeviceSession::openRecording() {
  const std::string& file = _context.options.record;
  if (file.empty()) return;
  platform::ErrorRef error;
  _sink = record::makeFileSink(file, &error);
  if (!_sink) throw CommandError(textOf(error));
}

platform::TSClient& DeviceSession::makeClient(const platform::Platform& platform) {
  _device->flush();  // if the store refuses, the first change tells
  if (!_loader) {
    const std::string& chosen = _context.options.plugin;
    _loader.emplace(chosen.empty() ? PluginLoader::defaultFile() : chosen);
  }
  if (!_sink) {
    _client = _loader->create(platform);
    return *_client;
  }
  _recording = record::recordingPlatform(platform, _sink, {.threadName = device::currentThreadName});
  _client = _recording->makeClient([this](const platform::Platform& recorded) { return _loader->create(recorded); });
  return *_client;
}

}  // namespace tsd
