#include "tsd/CommandError.h"
#include "tsd/Commands.h"
#include "tsd/DeviceSession.h"
#include "tsd/Output.h"

namespace tsd {
namespace {

struct Setting {
  std::string key;
  std::string value;
};

std::vector<Setting> parse(const std::vector<std::string>& texts) {
  std::vector<Setting> settings;
  for (const auto& text : texts) {
    std::size_t equals = text.find('=');
    if (equals == 0 || equals == std::string::npos) {
      throw CommandError(ExitCode::usage, "'" + text + "': KEY=VALUE is expected");
    }
    settings.push_back({text.substr(0, equals), text.substr(equals + 1)});
  }
  return settings;
}

void apply(device::LocalDevice& device, const std::vector<Setting>& settings) {
  for (const auto& setting : settings) {
    platform::ErrorRef error;
    if (device.set(setting.key, setting.value, &error)) continue;
    bool unknown = error && error->code() == static_cast<std::int64_t>(device::LocalDeviceError::unknownSetting);
    throw CommandError(unknown ? ExitCode::usage : ExitCode::failed, textOf(error));
  }
}

/// Throws when a setting is not known, so that the device gets all of them or none.
void rehearse(const std::vector<Setting>& settings) {
  auto device = device::makeMemoryDevice(device::makeManualEventQueue(), {});
  tsd::apply(*device, settings);
  device->events().drain();
  device->events().stop();
}

}  // namespace

ExitCode runSet(const CommandContext& context, const SetOptions& options) {
  auto settings = parse(options.settings);
  rehearse(settings);
  DeviceSession session(context, {options.device, "com.vantor.tsd", nullptr, nullptr});
  tsd::apply(session.device(), settings);
  auto document = startDocument(context.options.command);
  document.dictionary()->set("result", "done");
  auto values = platform::Value::makeDictionary();
  for (const auto& setting : settings) values.dictionary()->set(setting.key, session.device().setting(setting.key));
  document.dictionary()->set("settings", values);
  if (context.options.json) {
    writeDocument(document);
    return ExitCode::done;
  }
  for (const auto& setting : settings) {
    writeOutput(setting.key + "=" + session.device().setting(setting.key) + "\n");
  }
  return ExitCode::done;
}

}  // namespace tsd
