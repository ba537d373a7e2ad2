#include "device/records/Settings.h"
#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceSession.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/terminal/Output.h"
#include "tsd/terminal/Suggestion.h"

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
    throw CommandError(unknown ? ExitCode::usage : ExitCode::failed,
                       textOf(error) + (unknown ? didYouMean(setting.key, device::settingKeys()) : ""));
  }
}

/// Throws when a setting is not known, so that the device gets all the settings or none.
void rehearse(const std::vector<Setting>& settings) {
  auto device = device::makeMemoryDevice(device::makeManualEventQueue(), {});
  tsd::apply(*device, settings);
  device->events().drain();
  device->events().stop();
}

/// `isAsked`: they were not changed, but asked for.
ExitCode show(const CommandContext& context, device::LocalDevice& device, const std::vector<std::string>& keys,
              bool isAsked) {
  auto values = platform::Value::makeDictionary();
  std::string text;
  for (const auto& key : keys) {
    values.dictionary()->set(key, device.setting(key));
    text += key + "=" + device.setting(key) + "\n";
  }
  if (!context.options.json) {
    if (isAsked)
      writeOutput(text);
    else
      context.report(text);
    return ExitCode::done;
  }
  auto document = startDocument(context.options.command);
  document.dictionary()->set("result", "done");
  document.dictionary()->set("settings", values);
  writeDocument(document);
  return ExitCode::done;
}

}  // namespace

ExitCode runSet(const CommandContext& context, const SetOptions& options) {
  if (options.settings.empty()) {
    DeviceView view(context, options.device);
    return show(context, view.device(), device::settingKeys(), true);
  }
  auto settings = parse(options.settings);
  rehearse(settings);
  DeviceSession session(context, {.folder = options.device});
  tsd::apply(session.device(), settings);
  std::vector<std::string> keys;
  for (const auto& setting : settings) keys.push_back(setting.key);
  return show(context, session.device(), keys, false);
}

std::vector<std::string> settingWords() {
  return {"app-installation=allowed",
          "app-installation=forbidden",
          "app-removal=allowed",
          "app-removal=forbidden",
          "icon-size=",
          "backup-placeholders=yes",
          "backup-placeholders=no",
          "backup-error=yes",
          "backup-error=no",
          "device-service-prioritize=yes",
          "device-service-prioritize=no",
          "device-service-cancel=yes",
          "device-service-cancel=no"};
}

}  // namespace tsd
