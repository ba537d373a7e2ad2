#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "device/LocalDevice.h"
#include "platform/DeviceNames.h"
#include "platform/Mutex.h"
#include "platform/Platform.h"
#include "platform/TSClient.h"
#include "platform/ThreadSafety.h"
#include "record/RecordingPlatform.h"
#include "tsd/daemon/CommandContext.h"
#include "tsd/daemon/DeviceLock.h"
#include "tsd/daemon/PluginLoader.h"
#include "tsd/history/LineFile.h"
#include "tsd/history/TraceFile.h"
#include "tsd/stopping/CountdownClock.h"
#include "tsd/stopping/EarlyEnd.h"

namespace tsd {

/// How a command uses a device: `plain`; `kept`, in a run that the device keeps; or `copy`, a copy in memory, whose
/// events run on the caller's thread when it waits, and whose waits take no time. The copy has what the store holds
/// now, without disturbing whoever is using the device; if nobody is, it is what the next process to open it will
/// find.
enum class DeviceUse : std::uint8_t { plain, kept, copy };

/// A device folder in use by this process: locked unless it is a copy, opened, with the log and the journal that the
/// common options ask for, and on demand with a plug-in object on it. At the end the plug-in is destroyed first, then
/// everything that was posted runs, then the device is closed.
class DeviceSession {
 public:
  struct Setup {
    std::string folder;
    std::string mainBundleIdentifier{platform::daemonBundleIdentifier};
    platform::TSDeviceService* deviceService = nullptr;
    std::function<void(const device::AppStatus&)> changed{};
    DeviceUse use = DeviceUse::plain;
    const EarlyEnd* earlyEnd = nullptr;  // tells what the device declines; outlives the session
  };

  /// Throws a `CommandError` when any of it fails.
  DeviceSession(const CommandContext& context, const Setup& setup);
  ~DeviceSession();
  DeviceSession(const DeviceSession&) = delete;
  DeviceSession& operator=(const DeviceSession&) = delete;

  device::LocalDevice& device() { return *_device; }
  device::FileTree& files() { return _device->files(); }

  /// Loads the plug-in and makes its object. At most once.
  platform::TSClient& loadPlugin();
  /// The same; the plug-in's waits end when a stop is requested, and `tick` is told of them (see `CountdownClock`).
  platform::TSClient& loadPlugin(const StopSignal& stop, CountdownClock::Tick tick = nullptr);
  /// Destroys the plug-in's object, and lets everything run that was posted for it.
  void unloadPlugin();
  /// Lets everything that was posted run, and stores what the device has in memory only. Throws a `CommandError` when
  /// the store refuses, or when a file operation has failed, which the plug-in may have ignored silently.
  void settle();

 private:
  platform::TSClient& makeClient(const platform::Platform& platform);
  void openRecording();
  device::DeviceOptions deviceOptions(const Setup& setup);
  /// A file operation of the plug-in has failed. One of a kind is told at once, and how many there were at the end;
  /// what costs an icon alone is only counted. From any thread.
  void complain(std::string_view operation, std::string_view path, std::string_view reason);
  void tellRepeatedFailures();

  const CommandContext& _context;
  std::optional<PluginLoader> _loader;
  std::optional<DeviceLock> _lock;  // a copy has none
  std::optional<LineFile> _log;
  std::optional<LineFile> _calls;
  std::optional<TraceFile> _trace;
  std::shared_ptr<record::Sink> _sink;  // of the recording, if there is one
  platform::Mutex _mutex;
  struct Failures {
    std::string first;
    std::size_t count = 0;
  };
  std::map<std::string, Failures> _failures GUARDED_BY(_mutex);  // by what they have in common
  std::string _complaint
      GUARDED_BY(_mutex);  // the first one. Outlives the device, which may still complain while it is destroyed
  std::unique_ptr<device::LocalDevice> _device;
  std::optional<CountdownClock> _clock;
  std::optional<platform::Platform> _platform;  // the device's with that clock
  std::unique_ptr<record::RecordingPlatform> _recording;
  std::shared_ptr<platform::TSClient> _client;
};

}  // namespace tsd
