#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "contract/Host.h"
#include "platform/Condition.h"
#include "platform/InstallCoordination.h"
#include "platform/Mutex.h"
#include "platform/OBApplicationWorkspace.h"

namespace contract {

using platform::Bytes;
using platform::ErrorRef;
using platform::Value;
using Kind = platform::RVCoordinatorKind;
using Lines = std::vector<std::string>;
using CoordinatorRef = std::shared_ptr<platform::RVAppInstallCoordinator>;
using PackageRef = std::shared_ptr<platform::RVPromisedTransferToPath>;

constexpr char maps[] = "com.example.maps";
constexpr char notes[] = "com.example.notes";
constexpr auto anyKind = Kind::RVAppInstallCoordinator;
constexpr auto initiating = Kind::RVInitiatingAppInstallCoordinator;
constexpr auto updating = Kind::RVUpdatingAppInstallCoordinator;

/// That many keys that nobody reads: strings, numbers and containers.
Value dictionaryOf(std::size_t keys);

/// What callbacks wrote down, from whichever thread.
class Notes {
 public:
  void add(std::string line);
  /// So far; and forgets them.
  Lines take();

 private:
  platform::Mutex _mutex;
  Lines _lines APPSYNC_GUARDED_BY(_mutex);
};

/// Marks that this thread is inside a call of a service, where nothing may call back.
class InsideCall {
 public:
  InsideCall();
  ~InsideCall();
  static bool isOpen();
};

class RecordingDelegate final : public platform::RVAppInstallObserverDelegate {
 public:
  void promiseDidBeginFulfillmentWithIdentifier(std::uint64_t) override;
  void coordinatorDidInstallPlaceholder(const CoordinatorRef& coordinator) override;
  void coordinatorDidCompleteSuccessfully(const CoordinatorRef& coordinator) override;
  void coordinatorCanceledWithReason(const CoordinatorRef& coordinator, const ErrorRef& reason,
                                     platform::RVClientIdentifier client) override;

  Notes notes;
  std::function<void(const CoordinatorRef&)> then;  // what it does in its callbacks; set before it is registered

 private:
  void add(const std::string& what, const CoordinatorRef& coordinator);
};

class RecordingObserver final : public platform::OBApplicationWorkspaceObserver {
 public:
  using Proxies = std::vector<platform::OBApplicationProxyRef>;
  void applicationInstallsArePrioritized(const Proxies& prioritized, const Proxies& paused) override;
  void applicationInstallsDidCancel(const Proxies& applications) override;

  Notes notes;  // "runs com.example.maps", "cancelled com.example.maps"
  std::function<void()> then;
};

/// One test on one host.
class Fixture : public testing::TestWithParam<NamedHost> {
 protected:
  Fixture();
  ~Fixture() override;

  Host& host() { return *_host; }
  const platform::Platform& platform() { return _host->platform(); }
  platform::InstallCoordination& coordination() { return platform().installCoordination; }
  platform::OBApplicationWorkspace& registry() { return platform().workspace; }

  CoordinatorRef coordinator(Kind kind, const std::string& app = maps);
  std::shared_ptr<platform::RVPlaceholder> placeholder(const std::string& app = maps);
  /// Install options and the promise of a package.
  PackageRef promise(const CoordinatorRef& coordinator, const std::string& app = maps);
  /// An install as a sync begins one; the promise of its package.
  PackageRef begin(Kind kind, const std::string& app = maps);
  /// Writes the package and fulfils its promise.
  void send(const PackageRef& promise, const Bytes& package, const std::string& app = maps);
  void install(const std::string& app, const std::string& version);
  /// "installed 1", "placeholder", "updating 1"; empty when the registry knows no such app.
  std::string stateOf(const std::string& app = maps);
  Bytes packageOf(const std::string& app, const std::string& version) { return host().packageOf(app, version); }

  /// While a callback runs, which `arrange` has made do `callback` on the next delivery, another thread ends the
  /// observer by `remove`: that must not return before the callback has.
  void expectRemovalToWait(const std::function<void(const std::function<void()>& callback)>& arrange,
                           const std::function<void()>& remove);

 private:
  void makeDirectories();

  std::unique_ptr<Host> _host;
};

std::string nameOfHost(const testing::TestParamInfo<NamedHost>& info);
void PrintTo(const NamedHost& host, std::ostream* out);

}  // namespace contract
