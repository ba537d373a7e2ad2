#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "tsd/history/AppStory.h"
#include "tsd/history/LineFile.h"

namespace tsd {

/// A timeline of a run in the trace event format: a track for each app, with what became of it as nested slices, and a
/// track for each thread, with the calls that crossed between the plug-in and the device.
///
/// Each event is handed to the system at once. The file of a killed process lacks the bracket at its end and the ends
/// of what was running, which the format allows. One thread at a time.
class TraceFile {
 public:
  /// Replaces an older file. Throws a `CommandError` that names it.
  explicit TraceFile(const std::string& path);
  /// Ends what is still running, and the file.
  ~TraceFile();
  TraceFile(const TraceFile&) = delete;
  TraceFile& operator=(const TraceFile&) = delete;

  void hear(const device::CallRecord& record);
  bool failed() const { return _file.failed(); }

 private:
  enum class Group : std::uint8_t { threads = 1, apps = 2 };  // numbers of the two groups of tracks
  /// One line of the picture.
  struct Track {
    Group group;
    std::size_t number;                // within its group
    std::chrono::microseconds last{};  // the latest end on the track so far
    std::size_t open = 0;              // slices that have begun and not ended
    int stage = 0;                     // of an app: how far it is (see the source)
  };
  using Tracks = std::map<std::string, Track, std::less<>>;

  Track& trackOf(Tracks& tracks, Group group, const std::string& name);
  void hearEvent(const AppEvent& event);
  void hearStep(const device::CallRecord& record);
  void enterStage(Track& track, int stage, std::string_view app, std::chrono::microseconds time,
                  const std::string& facts);
  void endApp(Track& track, const AppEvent& event);

  void begin(Track& track, std::chrono::microseconds time, std::string_view name, const std::string& facts);
  void end(Track& track, std::chrono::microseconds time, const std::string& facts);
  void instant(Track& track, std::chrono::microseconds time, std::string_view name, const std::string& facts);
  void whole(Track& track, const device::CallRecord& record, const std::string& facts);
  /// `rest` follows the fields that every event has; with its comma.
  void write(const Track& track, const char* phase, std::chrono::microseconds time, std::string_view name,
             const std::string& rest);
  void nameTrack(Group group, std::size_t track, const char* what, std::string_view name);

  LineFile _file;
  bool _isFirst = true;
  std::chrono::microseconds _now{};
  AppStory _story;
  Tracks _threads;
  Tracks _apps;
};

}  // namespace tsd
