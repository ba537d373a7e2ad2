#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/Platform.h"
#include "platform/TSClient.h"
#include "record/Sink.h"

namespace record {

/// What an embedder may say about a recording.
struct RecordingOptions {
  /// The calling thread's name, for people. Null: threads are numbered.
  std::function<std::string()> threadName;
};

/// A platform that is recorded, and the plug-in's object on it: everything that goes over between the two is written
/// down, in both directions, in the order in which it happened. Neither side sees a difference, but that one thread at
/// a time is inside the plug-in.
///
///     auto recording = record::recordingPlatform(platform, record::makeFileSink("sync.recording"));
///     auto client = recording->makeClient([&](const platform::Platform& recorded) { return table->create(recorded);
///     });
///
/// The platform that is recorded outlives it and everything that the plug-in handed out, as it would without. From any
/// thread.
class RecordingPlatform {
 public:
  virtual ~RecordingPlatform() = default;

  /// The services as the plug-in is to see them.
  virtual const platform::Platform& platform() const = 0;
  /// The plug-in's object, which `create` makes on the platform that it is given, behind one that records what is asked
  /// of it. Null when `create` answers null.
  virtual std::shared_ptr<platform::TSClient> makeClient(
      const std::function<std::shared_ptr<platform::TSClient>(const platform::Platform& recorded)>& create) = 0;

  /// Ends the recording in order. What happens afterwards is not in it, and works as before. Destroying this does the
  /// same. Without either, when the process is killed, what was written is a recording up to there.
  virtual void finish() = 0;
  /// Whether the sink has refused to take all of it.
  virtual bool failed() const = 0;
};

/// Begins a recording. Throws `std::bad_alloc` alone.
std::unique_ptr<RecordingPlatform> recordingPlatform(const platform::Platform& platform, std::shared_ptr<Sink> sink,
                                                     RecordingOptions options = {});

}  // namespace record
