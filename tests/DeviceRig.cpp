#include "tests/DeviceRig.h"

#include <unistd.h>

#include <filesystem>
#include <utility>

#include "plist/PropertyList.h"

namespace tests {

std::string nameOfMedium(const testing::TestParamInfo<Medium>& info) {
  return info.param == Medium::disk ? "disk" : "memory";
}

std::string RecordingObserver::textOf(const Proxies& proxies) {
  std::string text;
  for (const auto& proxy : proxies) {
    text += ' ' + proxy->applicationIdentifier.value_or("?");
    if (const auto& progress = proxy->installProgressSync)
      text += '/' + std::to_string(progress->installState) + std::to_string(progress->installPhase);
  }
  return text;
}

DeviceRig::DeviceRig(Medium medium) : _medium(medium), _parts(std::make_unique<SharedParts>()) {
  ErrorRef error;
  if (_medium == Medium::disk) {
    std::string pattern = testing::TempDir() + "device-rig-XXXXXX";
    _folder = ::mkdtemp(pattern.data());
    EXPECT_TRUE(device::createDevice(_folder, &error)) << error->describe();
    _parts->files = device::openDiskFileTree(_folder + "/fs", &error);
    _parts->store = device::openDatabaseStore(_folder + "/device.db", &error);
  } else {
    _parts->makeInMemory();
  }
  open();
}

DeviceRig::~DeviceRig() {
  _device.reset();
  _parts.reset();
  if (!_folder.empty()) std::filesystem::remove_all(_folder);
}

void DeviceRig::open() {
  auto events = device::makeManualEventQueue();
  _events = events.get();
  device::DeviceOptions options;
  options.changed = [this](const device::AppStatus& app) {
    std::string outcome = device::nameOfOutcome(app.lastOutcome);
    _told.push_back(app.id + ' ' + device::nameOfState(app.state) + (outcome.empty() ? "" : ' ' + outcome));
  };
  ErrorRef error;
  _device = device::LocalDevice::open(_parts->lendFiles(), _parts->lendStore(), std::move(events), std::move(options),
                                      &error);
  ASSERT_TRUE(_device) << (error ? error->describe() : "no reason");
}

void DeviceRig::reopen() {
  _device.reset();
  _told.clear();
  open();
}

void DeviceRig::meanwhile(const char* operation, std::function<void()> what) {
  _parts->watch = [operation, what = std::move(what)](std::string_view happens, std::string_view) mutable {
    if (happens == operation && what) std::exchange(what, nullptr)();
  };
}

void DeviceRig::breakStore(bool broken) { _parts->broken = broken; }

Coordinator DeviceRig::coordinator(Kind kind, const std::string& app, platform::RVClientIdentifier client) {
  ErrorRef error;
  auto result = platform().installCoordination.coordinatorForAppWithBundleID(kind, app, client, true, nullptr, &error);
  EXPECT_TRUE(result) << (error ? error->describe() : "no reason");
  return result;
}

std::shared_ptr<platform::RVPlaceholder> DeviceRig::placeholder(const std::string& app, std::uint64_t type,
                                                                bool configured) {
  auto& service = platform().installCoordination;
  auto result = service.makeAppPlaceholder("Maps", app, type, 3);
  std::string iconPath = "/var/mobile/tmp/" + app + ".png";
  write(iconPath, pngOf(4, 4));
  auto icon = service.makePromisedTransferToPath(app + "-Icon", 3, iconPath, 100);
  icon->setComplete(true);
  EXPECT_TRUE(result->setIconPromise(icon));
  auto attributes = service.makePlaceholderAttributesWithInfoPlistDictionary(
      filledOut(dictionaryOf({{"KBBundleIconFile", "missing"}, {"Genre", "Travel"}}), 40, 1));
  attributes->setBundleVersion("2");
  attributes->setLaunchProhibited(true);
  EXPECT_TRUE(result->setPlaceholderAttributes(attributes));
  EXPECT_TRUE(result->setMetadata(platform().installer.makeStoreMetadata(placeholderMetadata())));
  if (configured) {
    EXPECT_TRUE(result->setConfigurationCompleteWithError());
  }
  return result;
}

std::shared_ptr<platform::RVPromisedTransferToPath> DeviceRig::promise(const Coordinator& coordinator,
                                                                       const std::string& app) {
  auto options = platform().installer.makeInstallOptions();
  options->setObInstallType(4);
  EXPECT_TRUE(coordinator->setInstallOptions(options));
  auto result = platform().installCoordination.makePromisedTransferToPathWithoutPath(app + "-Asset", 3, 0);
  EXPECT_TRUE(coordinator->setAppAssetPromise(result));
  return result;
}

std::shared_ptr<platform::RVPromisedTransferToPath> DeviceRig::begin(Kind kind, const std::string& app) {
  auto handle = coordinator(kind, app);
  auto result = promise(handle, app);
  ErrorRef error;
  EXPECT_TRUE(handle->setPlaceholderPromise(placeholder(app), &error)) << (error ? error->describe() : "");
  return result;
}

void DeviceRig::write(const std::string& path, const Bytes& content) {
  files().createDirectory(path.substr(0, path.rfind('/')), true, {});
  EXPECT_TRUE(files().createFile(path, content, {})) << path;
}

void DeviceRig::install(const std::string& app, const std::string& version) {
  write(packagePath(app), packageOf(app, version));
  ErrorRef error;
  EXPECT_TRUE(device().installFromPackage(packagePath(app), &error)) << (error ? error->describe() : "");
}

Value DeviceRig::list(const std::string& path) {
  auto bytes = files().readFile(path);
  return bytes ? plist::read(std::move(*bytes)) : Value();
}

std::size_t DeviceRig::containerCount() { return files().list(containers).value().size(); }

std::string DeviceRig::stateOf(const std::string& app) {
  auto status = device().app(app);
  if (!status || !status->isOnDevice()) return "";
  return device::nameOfState(status->state) + (' ' + std::to_string(status->installType)) +
         (status->version.empty() ? "" : ' ' + status->version);
}

bool DeviceRig::isShown(const std::string& app) {
  for (const auto& id : device().status().home) {
    if (id == app) return true;
  }
  return false;
}

}  // namespace tests
