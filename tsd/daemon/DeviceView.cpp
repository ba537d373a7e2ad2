#include "tsd/daemon/DeviceView.h"

#include "tsd/terminal/Output.h"

namespace tsd {

namespace {

RunProgress progressOf(const std::string& device, Console& console) {
  RunProgress progress(device);
  progress.refresh();
  if (progress.isCut()) console.message(device + ": " + notKnownFurther);
  return progress;
}

}  // namespace

std::vector<RunSummary> runsOfDevice(const std::string& folder, const TellProblem& tell) {
  const bool wasBusy = DeviceLock::holderOf(folder).has_value();
  auto runs = keptRuns(folder, tell);
  // It may have begun, or ended, meanwhile.
  const bool isBusy = wasBusy || DeviceLock::holderOf(folder);
  if (!runs.empty()) runs.back().isRunning = isBusy && !runs.back().ended;
  return runs;
}

DeviceView::DeviceView(const CommandContext& context, const std::string& folder)
    : DeviceView(context, folder, progressOf(folder, context.console)) {}

DeviceView::DeviceView(const CommandContext& context, const std::string& folder, const RunProgress& progress)
    : _holder(DeviceLock::holderOf(folder)),
      _session(context, {.folder = folder, .use = DeviceUse::copy}),
      _status(_session.device().status()) {
  progress.addTo(_status);
}

std::string DeviceView::holderText() const {
  return _holder ? wrappedLine("", "Process " + _holder->process + " is working on it: " + _holder->command + ".") : "";
}

void DeviceView::addHolder(platform::Value& document) const {
  if (!_holder) return;
  platform::Value busy = platform::Value::makeDictionary();
  busy.dictionary()->set("process", _holder->process);
  busy.dictionary()->set("command", _holder->command);
  document.dictionary()->set("busy", busy);
}

}  // namespace tsd
