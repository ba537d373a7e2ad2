#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <map>
#include <optional>
#include <random>
#include <stdexcept>

#include "platform/OBApplicationWorkspace.h"
#include "plist/PropertyList.h"
#include "tests/PluginRig.h"
#include "tests/PowerLog.h"
#include "tsd/conduit/FileConduit.h"

namespace tests {
namespace {

using Content = std::map<std::string, Bytes>;  // by path; a directory has nothing

void addContent(device::FileTree& files, const std::string& directory, const std::string& shown, Content& content) {
  const auto entries = files.list(directory);
  ASSERT_TRUE(entries) << directory;
  for (const auto& entry : *entries) {
    auto path = directory + '/' + entry.name;
    content[shown + '/' + entry.name] = entry.isDirectory ? Bytes() : files.readFile(path).value();
    if (entry.isDirectory) addContent(files, path, shown + '/' + entry.name, content);
  }
}

/// Whether a file of /var/mobile is more than a means to an end that is made again for the next one.
bool isPromised(const std::string& path) {
  const std::string work = "/Library/ApplicationSync/HarluneStuff/";
  if (path.compare(0, work.size(), work) == 0) return path == work + "ApplicationsSync.plist";
  for (const char* means : {"/tmp/", "/Library/ApplicationSync/Icons", "/Library/ApplicationSync/AssetSortOrder.plist",
                            "/Media/PublicStaging/Packages/"})
    if (path.find(means) == 0) return false;
  return true;
}

/// A device as it can be compared with another one: containers go by their app's name.
struct Picture {
  std::map<std::string, std::string> apps;  // by identifier: state, version, install type, last outcome
  std::map<std::string, Content> containers;
  Content files;  // all but those of the containers
  std::string rest;

  explicit Picture(PluginRig& rig) {
    auto status = rig.device().status();
    addContent(rig.device().files(), "/var/mobile", "", files);
    std::erase_if(files, [](const auto& file) { return !isPromised(file.first); });
    std::size_t known = 0;
    for (const auto& app : status.apps) {
      apps[app.id] = device::nameOfState(app.state) + (' ' + app.version) + ' ' + std::to_string(app.installType) +
                     ' ' + device::nameOfOutcome(app.lastOutcome);
      if (!app.isOnDevice()) continue;
      auto proxy =
          rig.platform().workspace.applicationProxyForIdentifier(app.id, app.state == device::AppState::placeholder);
      addContent(rig.device().files(), *proxy->bundleContainerURL, "", containers[app.id]);
      ++known;
    }
    if (rig.device().files().list("/var/containers/Bundle/Application")->size() != known) rest += "stray containers; ";
    for (const auto& app : status.home) rest += app + ' ';
    for (const auto& each : status.coordinators)
      rest += each.app + ' ' + device::shortNameOfKind(each.kind) + std::to_string(each.client) + ' ';
    rest += std::to_string(status.syncing);
  }

  /// What differs, by name; empty when nothing does.
  std::string differences(const Picture& other) const {
    std::string text = rest == other.rest ? "" : rest + " instead of " + other.rest + "; ";
    auto compare = [&](const auto& one, const auto& two, const char* missing) {
      for (const auto& [name, value] : one) {
        auto found = two.find(name);
        if (found == two.end())
          text += name + missing;
        else if (found->second != value)
          text += name + " differs; ";
      }
    };
    compare(apps, other.apps, " is too many; ");
    compare(containers, other.containers, " is too many; ");
    compare(files, other.files, " is too many; ");
    compare(other.apps, apps, " is missing; ");
    compare(other.files, files, " is missing; ");
    return text;
  }
};

/// A life of a device: apps, a sync, and then what is tried, which is recorded step by step and can be done again.
class PowerLoss : public testing::Test {
 public:
  PowerLoss() {
    std::string pattern = testing::TempDir() + "power-loss-XXXXXX";
    _folder = ::mkdtemp(pattern.data());
    makeHost("earlier --apps 1 --seed 7");
    makeHost("host --apps 5 --demo");
    makeHost("restored --apps 5 --seed 3");
    std::filesystem::create_directory(_folder + "/fs");
  }
  ~PowerLoss() override { std::filesystem::remove_all(_folder); }

  void makeHost(const std::string& options) const {
    std::string command = "cd '" + _folder + "' && '" TSD_PROGRAM "' sample --package-size 3000 --files 3 " + options;
    if (std::system((command + " >sample.out").c_str()) != 0) throw std::runtime_error(command);
  }

  using Play = void (PowerLoss::*)(PluginRig&);

  void push(PluginRig& rig, const std::string& file, const std::string& path) {
    tsd::FileConduit(rig.device().files(), _console).pushFile(_folder + '/' + file, path);
  }
  /// As a transfer does: nothing of the package is flushed.
  void send(PluginRig& rig, const std::string& file, const std::string& path) {
    std::ifstream package(_folder + '/' + file, std::ios::binary);
    auto& files = rig.device().files();
    if (files.fileExists(path)) files.removeItem(path);
    auto target = files.createNew(path, false);
    ASSERT_TRUE(package && target) << file;
    target->write(platform::Bytes(std::istreambuf_iterator<char>(package), {}));
    ASSERT_TRUE(target->close(false));
  }
  static std::string packagePath(const std::string& app) { return std::string(packagesDirectory) + '/' + app + ".pkg"; }

  void sync(PluginRig& rig, const std::string& host) {
    rig.postStartup();
    tsd::FileConduit(rig.device().files(), _console).pushStaging(_folder + '/' + host);
    rig.daemon().installedAssets();
    ASSERT_TRUE(rig.reconcileSync());
    rig.deliver();
    for (const auto& asset : rig.daemon().outstandingAssetTransfers()) {
      const auto& app = asset->identifier();
      rig.deliver();
      send(rig, host + "/Packages/" + app + ".pkg", packagePath(app));
      asset->setIsDownload(true);
      asset->setCompletedAssetParts(1);
      asset->setPath(packagePath(app));
      rig.progress(asset, 1);
      rig.transferEnded(asset, true);
      rig.deliver();
    }
    rig.daemon().assetTransferEndedWithSuccess(true);
    rig.deliver();
    rig.daemon().syncEndedWithSuccess(true);
    rig.deliver();
  }
  void sync(PluginRig& rig) { sync(rig, "host"); }

  void restore(PluginRig& rig) {
    rig.postStartup();
    push(rig, "restored/Restore/com.vantor.Cellarum.DemotedApps.plist", demotedAppsPath);
    push(rig, "restored/Restore/RestoreApplications.plist", restoreListPath);
    rig.reconcileRestore(2);
    rig.deliver();
  }

  void installByStore(PluginRig& rig) {
    for (const std::string app : {"com.example.bought", "com.example.tarnwell"}) {
      rig.device().beginStoreInstall(app, {});
      EXPECT_TRUE(rig.device().finishStoreInstall(app, "")) << app;
    }
    rig.deliver();
  }

  void record(Play play) {
    ErrorRef error;
    auto files = device::openDiskFileTree(_folder + "/fs", &error, _log);
    auto store = _log->makeStore();
    ASSERT_TRUE(files && device::makeDeviceParts(*files, *store, &error)) << error->describe();
    PluginRig::Options options;
    options.told = [this](const device::CallRecord& record) { note(record); };
    PluginRig rig(options, std::move(files), std::move(store));
    _rig = &rig;
    for (const auto& each : std::filesystem::directory_iterator(_folder + "/host/Packages/older")) {
      std::string app = each.path().stem();
      push(rig, "host/Packages/older/" + app + ".pkg", packagePath(app));
      ASSERT_TRUE(rig.device().installFromPackage(packagePath(app), &error)) << error->describe();
    }
    sync(rig, "earlier");
    _begin = _log->size();
    _before.emplace(rig);
    (this->*play)(rig);
    _after.emplace(rig);
    _rig = nullptr;
  }

  /// Writes down which todo lists were written, and from when on a reader may rely on them.
  void note(const device::CallRecord& record) {
    const auto* arguments = record.arguments.dictionary();
    if (record.operation == "reconcileSync") (record.end ? _reconciled : _reconciles) = _log->size();
    bool wroteList = record.operation == "writeAtomically" && (*arguments)["path"].string() == todoListPath;
    if (!wroteList && !(record.operation == "reconcileSync" && record.end)) return;
    _lists.push_back({_log->size(), _rig->read(todoListPath).value()});
  }

  /// The list in a tree after `count` steps: one that was written, none older than the last that was acknowledged.
  bool mayBeList(const std::optional<Bytes>& list, std::size_t count) const {
    bool reconciling = count >= _reconciles && count <= _reconciled;
    if (!list) return reconciling;
    std::size_t first = 0;
    while (first + 1 < _lists.size() && _lists[first + 1].acknowledged <= count) ++first;
    for (std::size_t i = first; i < _lists.size() && i <= first + 1; ++i) {
      if (*list == _lists[i].content) return true;
    }
    return false;
  }

  void expectWholeApps(PluginRig& rig, const std::optional<Bytes>& list) {
    Picture now(rig);
    EXPECT_EQ(now.rest.find("stray"), now.rest.npos);
    auto isNew = [&](const std::string& app) {
      return now.containers.count(app) && now.containers[app] == _after->containers[app];
    };
    for (const auto& [app, state] : now.apps) {
      if (state.compare(0, 9, "installed") != 0 && state.compare(0, 8, "updating") != 0) continue;
      bool isOld = _before->containers.count(app) && now.containers[app] == _before->containers[app];
      EXPECT_TRUE(isOld || isNew(app)) << app << " is neither what it was nor what it should become";
    }
    for (const auto& [app, content] : _before->containers) {
      EXPECT_TRUE(now.containers.count(app) || !_after->containers.count(app)) << app << " is gone";
    }
    Value entries = list ? plist::read(*list) : Value();
    for (std::size_t i = 0; entries.array() && i < entries.array()->size(); ++i) {
      const auto& entry = *entries.array()->dictionary(i);
      if (entry["operation"].string() != "INSTALLED") continue;
      EXPECT_TRUE(isNew(std::string(*entry["identifier"].string()))) << "an acknowledged outcome is not true";
    }
  }

  void lose(std::size_t count, PowerLog::Rest rest, std::uint64_t seed, Play again) {
    std::mt19937_64 numbers(seed);
    auto dice = [&numbers](std::size_t below) { return static_cast<std::size_t>(numbers() % below); };
    auto files = _log->filesAfter(count, rest, dice);
    auto list = files->readFile(todoListPath);
    EXPECT_TRUE(mayBeList(list, count)) << (list ? "the todo list is damaged or old" : "the todo list is gone");
    PluginRig::Options options;
    options.journaled = false;
    PluginRig rig(options, std::move(files), _log->storeAfter(count, rest, dice));
    expectWholeApps(rig, list);
    (this->*again)(rig);
    EXPECT_EQ(Picture(rig).differences(*_after), "");
  }

  /// Every seventeenth step, or all of them when the environment says so.
  void loseEverywhere(Play play) {
    using Rest = PowerLog::Rest;
    record(play);
    if (HasFatalFailure()) return;
    const char* chosen = std::getenv("APPSYNC_POWER_LOSS");
    const bool all = chosen && std::string(chosen) == "all";
    std::size_t states = 0;
    const std::size_t end = _log->size();
    for (std::size_t count = _begin; count <= end; count += all ? 1 : 17) {
      for (std::uint64_t seed = 0; seed < (all ? 8 : 4); ++seed, ++states) {
        SCOPED_TRACE("lost before step " + std::to_string(count) + " of " + std::to_string(end) + ", seed " +
                     std::to_string(seed) + ", after: " + _log->describe(count - 1));
        lose(count, seed < 3 ? static_cast<Rest>(seed) : Rest::anything, 1000 * count + seed, play);
        if (HasFailure() && !std::getenv("APPSYNC_POWER_LOSS_ALL_FAILURES")) return;
      }
    }
    std::cout << end - _begin << " steps, " << states << " losses of power\n";
  }

 private:
  struct List {
    std::size_t acknowledged;  // step of the log
    Bytes content;
  };

  std::string _folder;
  tsd::Console _console;
  const std::shared_ptr<PowerLog> _log = std::make_shared<PowerLog>();
  PluginRig* _rig = nullptr;
  std::size_t _begin = 0, _reconciles = 0, _reconciled = 0;
  std::vector<List> _lists;
  std::optional<Picture> _before, _after;
};

TEST_F(PowerLoss, DuringASyncLosesNothing) { loseEverywhere(&PowerLoss::sync); }

TEST_F(PowerLoss, DuringARestoreLosesNothing) { loseEverywhere(&PowerLoss::restore); }

TEST_F(PowerLoss, DuringAnInstallByTheStoreLosesNothing) { loseEverywhere(&PowerLoss::installByStore); }

}  // namespace
}  // namespace tests
