#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "device/LocalDevice.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/IconRenderer.h"
#include "platform/InstallCoordination.h"
#include "platform/Installer.h"
#include "platform/NotificationCenter.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Process.h"
#include "tests/SampleContent.h"
#include "tests/SharedParts.h"

namespace tests {

using platform::Bytes;
using platform::ErrorRef;
using platform::Value;
using Kind = platform::RVCoordinatorKind;
using Lines = std::vector<std::string>;
using Coordinator = std::shared_ptr<platform::RVAppInstallCoordinator>;

constexpr char packages[] = "/var/mobile/Media/PublicStaging/Packages";
constexpr char containers[] = "/var/containers/Bundle/Application";
constexpr char maps[] = "com.example.maps";
constexpr char notes[] = "com.example.notes";

enum class Medium { disk, memory };
std::string nameOfMedium(const testing::TestParamInfo<Medium>& info);

/// Writes down what it is told, one line a callback.
struct RecordingDelegate final : platform::RVAppInstallObserverDelegate {
  void promiseDidBeginFulfillmentWithIdentifier(std::uint64_t) override { lines.push_back("begins"); }
  void coordinatorDidInstallPlaceholder(const Coordinator& coordinator) override { add("placeholder", coordinator); }
  void coordinatorDidCompleteSuccessfully(const Coordinator& coordinator) override {
    add(coordinator->error() ? "fails" : "completes", coordinator);
  }
  void coordinatorShouldPrioritize(const Coordinator& coordinator) override { add("prioritize", coordinator); }
  void coordinatorCanceledWithReason(const Coordinator& coordinator, const ErrorRef&,
                                     platform::RVClientIdentifier client) override {
    add("cancelled by " + std::to_string(client), coordinator);
  }
  void add(const std::string& what, const Coordinator& coordinator) {
    lines.push_back(what);
    if (then) then(coordinator);
  }

  Lines lines;
  std::function<void(const Coordinator&)> then;  // what the observer does in its callbacks
};

struct RecordingObserver final : platform::OBApplicationWorkspaceObserver {
  using Proxies = std::vector<platform::OBApplicationProxyRef>;
  void applicationInstallsArePrioritized(const Proxies& prioritized, const Proxies& paused) override {
    lines.push_back("runs" + textOf(prioritized) + (paused.empty() ? "" : " paused" + textOf(paused)));
    if (then) then();
  }
  void applicationInstallsDidCancel(const Proxies& applications) override {
    lines.push_back("cancelled" + textOf(applications));
  }
  static std::string textOf(const Proxies& proxies);

  Lines lines;
  std::function<void()> then;
};

/// A device on disk or in memory that can be opened again, with events delivered by hand.
class DeviceRig {
 public:
  explicit DeviceRig(Medium medium);
  ~DeviceRig();
  DeviceRig(const DeviceRig&) = delete;
  DeviceRig& operator=(const DeviceRig&) = delete;

  device::LocalDevice& device() { return *_device; }
  const platform::Platform& platform() { return _device->platform(); }
  device::FileTree& files() { return _device->files(); }
  void deliver() { _events->deliverAll(); }
  device::ManualEventQueue& events() { return *_events; }
  /// As a process that ends and another that comes. What was not delivered is lost.
  void reopen();
  /// The same of one that has no time left to note that it is closed.
  void endSuddenly() {
    device().putOffInstalls();
    reopen();
  }
  /// Somebody else does `what` in the middle of the next such file operation.
  void meanwhile(const char* operation, std::function<void()> what);
  /// From now on the store takes nothing.
  void breakStore(bool broken);
  /// What the owner was told, as "app state outcome".
  const Lines& told() const { return _told; }

  Coordinator coordinator(Kind kind, const std::string& app = maps, platform::RVClientIdentifier client = 3);
  static Value placeholderMetadata() { return filledOut(dictionaryOf({{"vantorId", "placeholder"}}), 25, 1); }
  /// A configured placeholder with an icon, version "2" and metadata, the manifest one of 40 keys.
  std::shared_ptr<platform::RVPlaceholder> placeholder(const std::string& app = maps, std::uint64_t type = 4,
                                                       bool configured = true);
  /// Options of type 4 and an app asset promise for the package of that app.
  std::shared_ptr<platform::RVPromisedTransferToPath> promise(const Coordinator& coordinator,
                                                              const std::string& app = maps);
  /// An install as a sync begins one; the promise of its package.
  std::shared_ptr<platform::RVPromisedTransferToPath> begin(Kind kind, const std::string& app = maps);

  static std::string packagePath(const std::string& app) { return std::string(packages) + '/' + app + ".pkg"; }
  void write(const std::string& path, const Bytes& content);
  void install(const std::string& app, const std::string& version);
  Value list(const std::string& path);
  std::size_t containerCount();
  /// "placeholder 4", "updating 4 1" (with the version where there is one), "" when the app is not there.
  std::string stateOf(const std::string& app = maps);
  bool isShown(const std::string& app = maps);

 private:
  void open();

  const Medium _medium;
  std::string _folder;
  std::unique_ptr<SharedParts> _parts;
  device::ManualEventQueue* _events = nullptr;
  std::unique_ptr<device::LocalDevice> _device;
  Lines _told;
};

}  // namespace tests
