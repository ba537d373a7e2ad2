#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/Condition.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/picture/HomePages.h"
#include "tsd/stopping/StopSignal.h"
#include "tsd/terminal/Output.h"
#include "tsd/terminal/ProgressDrawing.h"

namespace tsd {

using platform::Value;
using Clock = std::chrono::steady_clock;
using Phase = ProgressLine::Phase;

namespace {

constexpr std::chrono::milliseconds leastPause{250};
/// Pauses last this many times as long as a look at the device takes, so that a watch slows a sync little.
constexpr int pauseShare = 5;
constexpr int percentStep = 10;  // of a package, between two of its lines where lines are not redrawn

ProgressLine lineOf(const HomeIcon& icon) {
  ProgressLine line;
  line.id = icon.id;
  line.name = icon.name.empty() ? icon.id : icon.name;
  line.percent = static_cast<int>(std::floor(icon.progress * 100));
  bool isOnItsWay = icon.look == HomeLook::waiting || icon.look == HomeLook::updating;
  line.phase = !isOnItsWay          ? Phase::ended
               : icon.progress >= 1 ? Phase::installing
               : line.percent > 0   ? Phase::sending
                                    : Phase::placeholder;
  line.good = line.phase == Phase::ended && !icon.failed;
  if (line.phase == Phase::ended) line.outcome = icon.failed ? "its last install failed" : nameOfLook(icon.look);
  if (icon.look == HomeLook::installed) line.percent = 100;
  return line;
}

/// What a line says without its name and its bar.
std::string whatOf(const ProgressLine& line) {
  switch (line.phase) {
    case Phase::sending:
      return std::to_string(line.percent / percentStep * percentStep) + " %";
    case Phase::installing:
      return "installing";
    case Phase::ended:
      return line.outcome + (line.reason.empty() ? "" : ": " + line.reason);
    default:
      return "waiting";
  }
}

/// The facts of a device's store's files that tell whether anything was written.
using StoreMark = std::array<long long, 6>;
StoreMark markOf(const std::string& device) {
  StoreMark mark{};
  std::size_t at = 0;
  for (const char* file : {"/device.db", "/device.db-wal"}) {
    struct stat facts {};
    if (::stat((device + file).c_str(), &facts) == 0) {
      mark[at] = facts.st_size;
      mark[at + 1] = facts.st_mtim.tv_sec;
      mark[at + 2] = facts.st_mtim.tv_nsec;
    }
    at += 3;
  }
  return mark;
}

/// Waits that end early when the person wants to stop.
class Pause {
 public:
  explicit Pause(StopSignal& stop) : _told(stop, [this] { end(); }) {}
  /// Whether to go on.
  bool wait(Clock::duration time) {
    platform::Mutex::Lock lock(_mutex);
    return !_changed.waitUntil(_mutex, Clock::now() + time, [this]() REQUIRES(_mutex) { return _over; });
  }

 private:
  void end() {
    platform::Mutex::Lock lock(_mutex);
    _over = true;
    _changed.notifyAll();
  }

  platform::Mutex _mutex;
  platform::Condition _changed;
  bool _over GUARDED_BY(_mutex) = false;
  StopSignal::Subscription _told;
};

/// The home screen's apps as they were at the last look.
class Watch {
 public:
  Watch(const CommandContext& context, const WatchOptions& options)
      : _context(context),
        _options(options),
        _progress(options.device),
        _redraws(!context.options.json && ::isatty(STDOUT_FILENO) && Console::isTerminal()) {}

  void look();
  /// Takes the lines that are redrawn in place away from the console, and tells the sum.
  void finish();
  bool isIdle() const { return !_holder; }

 private:
  void read();
  void print();
  std::string headline() const;
  std::string sum() const;
  Value document() const;

  const CommandContext& _context;
  const WatchOptions& _options;
  RunProgress _progress;
  const bool _redraws;
  bool _looked = false;
  bool _isCutTold = false;
  StoreMark _mark{};
  std::optional<DeviceLock::Holder> _holder;
  std::vector<ProgressLine> _lines;
  std::map<std::string, std::string> _printed;  // app: what its last line said
};

void Watch::read() {
  // Taken first: what is written while the store is being read shows at the next look.
  _mark = markOf(_options.device);
  DeviceView view(_context, _options.device, _progress);
  HomePages home = readHomePages(view.device(), view.status(), view.status().apps.size() + 1, 0);
  _holder = view.holder();
  _lines.clear();
  for (const auto& page : home.pages) {
    for (const auto& icon : page) _lines.push_back(lineOf(icon));
  }
  for (const auto& app : home.failed) {
    ProgressLine line;
    line.id = line.name = app.id;
    line.phase = Phase::ended;
    line.outcome = "failed";
    line.reason = app.reason;
    _lines.push_back(std::move(line));
  }
}

void Watch::look() {
  bool moved = _progress.refresh();
  auto holder = DeviceLock::holderOf(_options.device);
  bool changed = !_looked || moved || holder != _holder || markOf(_options.device) != _mark;
  if (changed) read();
  if (_redraws)
    _context.console.setRegion(
        drawProgress(headline(), _lines, percentOf(_lines), Console::size(), Console::wantsColours()));
  else if (changed && !_context.options.json)
    print();
  if (!_redraws && _progress.isCut() && !std::exchange(_isCutTold, true))
    _context.console.message(_options.device + ": " + notKnownFurther);
  _looked = true;
}

std::string Watch::headline() const {
  return _options.device + ": " +
         (_holder ? "process " + _holder->process + " is working on it: " + _holder->command
                  : "nobody is changing it") +
         (_redraws && _progress.isCut() ? std::string("; ") + notKnownFurther : "");
}

std::string Watch::sum() const {
  std::map<std::string, std::size_t> counts;
  for (const auto& line : _lines) ++counts[line.phase == Phase::ended ? line.outcome : "on the way"];
  std::string text =
      _lines.empty() ? "no apps" : std::to_string(_lines.size()) + (_lines.size() == 1 ? " app" : " apps");
  const char* between = ": ";
  for (const auto& [what, count] : counts) {
    text += between + std::to_string(count) + " " + what;
    between = ", ";
  }
  return text;
}

/// A line for each app that has changed; at the first look, for those that are on their way.
void Watch::print() {
  std::string text;
  if (!_looked) text = wrappedLine("", headline() + "; " + sum() + ".");
  std::set<std::string> seen;
  for (const auto& line : _lines) {
    seen.insert(line.id);
    std::string what = whatOf(line);
    auto [place, isNew] = _printed.try_emplace(line.id);
    if (place->second == what) continue;
    place->second = what;
    bool isOld = !_looked && (line.phase == Phase::ended || line.phase == Phase::placeholder);
    if (!isOld) text += printable(line.id) + ": " + printable(what) + "\n";
  }
  for (auto each = _printed.begin(); each != _printed.end();) {
    if (seen.count(each->first)) {
      ++each;
    } else {
      text += printable(each->first) + ": gone\n";
      each = _printed.erase(each);
    }
  }
  if (!text.empty()) writeOutput(text);
}

Value Watch::document() const {
  Value document = startDocument(_context.options.command);
  document.dictionary()->set("result", "done");
  Value apps = Value::makeArray();
  for (const auto& line : _lines) {
    auto& item = apps.array()->appendDictionary();
    item.set("id", line.id);
    item.set("what", whatOf(line));
    item.set("percent", line.percent);
  }
  document.dictionary()->set("apps", apps);
  return document;
}

void Watch::finish() {
  _context.console.setRegion({});
  if (_context.options.json)
    writeDocument(document());
  else
    writeOutput(wrappedLine("", _options.device + ": " + sum() + "."));
}

}  // namespace

ExitCode runWatch(const CommandContext& context, const WatchOptions& options) {
  StopSignal stop;
  Pause pause(stop);
  Watch watch(context, options);
  Clock::duration cost{};
  do {
    auto begin = Clock::now();
    watch.look();
    cost = Clock::now() - begin;
  } while (!(options.untilIdle && watch.isIdle()) &&
           pause.wait(std::max<Clock::duration>(leastPause, pauseShare * cost)));
  watch.finish();
  return ExitCode::done;
}

}  // namespace tsd
