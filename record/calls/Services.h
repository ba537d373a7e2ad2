#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/Clock.h"
#include "platform/DPProfileConnection.h"
#include "platform/FileSystem.h"
#include "platform/HomeScreen.h"
#include "platform/InstallCoordination.h"
#include "platform/InstallTransactionLog.h"
#include "platform/Installer.h"
#include "platform/NotificationCenter.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/Platform.h"
#include "platform/Process.h"
#include "platform/PropertyListSerialization.h"
#include "platform/TSDeviceService.h"
#include "platform/TSSupport.h"
#include "record/calls/Objects.h"

/// The services, as the plug-in sees them while it is recorded or replayed; see Objects.h.
namespace record {

template <class T, template <class> class Crossing>
class ServiceOf : public T {
 public:
  explicit ServiceOf(Crossing<T> crossing) : _crossing(std::move(crossing)) {}

 protected:
  template <auto method, class... Arguments>
  decltype(auto) call(const Operation& operation, Arguments&&... arguments) const {
    return _crossing.template call<method>(operation, nullptr, std::forward<Arguments>(arguments)...);
  }
  const Crossing<T>& crossing() const { return _crossing; }

 private:
  Crossing<T> _crossing;
};

template <template <class> class Crossing>
class ProcessOf final : public ServiceOf<platform::Process, Crossing> {
  using T = platform::Process;
  static constexpr const char* service = "Process";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::string mainBundleIdentifier() override {
    static constexpr Operation operation{service, "mainBundleIdentifier", ""};
    return this->template call<&T::mainBundleIdentifier>(operation);
  }
  std::string temporaryDirectory() override {
    static constexpr Operation operation{service, "temporaryDirectory", ""};
    return this->template call<&T::temporaryDirectory>(operation);
  }
  std::string textOfErrorNumber(int errorNumber) override {
    static constexpr Operation operation{service, "textOfErrorNumber", "errorNumber"};
    return this->template call<&T::textOfErrorNumber>(operation, errorNumber);
  }
  void deallocateMemory(void* buffer, std::size_t length) override {
    static constexpr Operation operation{service, "deallocateMemory", "buffer length"};
    this->crossing().callWith(
        operation, nullptr, [](T& target, ReturnedBuffer each) { target.deallocateMemory(each.buffer, each.length); },
        ReturnedBuffer{buffer, length});
  }
  platform::Value infoDictionaryOfBundleAtPath(std::string_view path) override {
    static constexpr Operation operation{service, "infoDictionaryOfBundleAtPath", "path"};
    return this->template call<&T::infoDictionaryOfBundleAtPath>(operation, path);
  }
};

template <template <class> class Crossing>
class ClockOf final : public ServiceOf<platform::Clock, Crossing> {
  using T = platform::Clock;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  T::Instant now() override {
    static constexpr Operation operation{"Clock", "now", "", OperationClass::wait};
    return T::Instant(T::Duration(this->crossing().callWith(
        operation, nullptr, [](T& target) -> std::int64_t { return target.now().time_since_epoch().count(); })));
  }
  bool waitUntil(platform::Mutex& mutex, platform::Condition& changed, T::Instant deadline,
                 const std::function<bool()>& satisfied) override APPSYNC_REQUIRES(mutex) {
    static constexpr Operation operation{"Clock", "waitUntil", "deadline", OperationClass::wait};
    return this->crossing().wait(operation, mutex, changed, deadline, satisfied);
  }
};

template <template <class> class Crossing>
class FileSystemOf final : public ServiceOf<platform::FileSystem, Crossing> {
  using T = platform::FileSystem;
  static constexpr const char* service = "FileSystem";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  bool removeItem(std::string_view path, ErrorRef* error) override {
    static constexpr Operation operation{service, "removeItem", "path -> error"};
    return this->template call<&T::removeItem>(operation, path, out(error));
  }
  bool createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value& attributes,
                       ErrorRef* error) override {
    static constexpr Operation operation{service, "createDirectory",
                                         "path withIntermediateDirectories attributes -> error"};
    return this->template call<&T::createDirectory>(operation, path, withIntermediateDirectories, attributes,
                                                    out(error));
  }
  bool moveItem(std::string_view from, std::string_view to, ErrorRef* error) override {
    static constexpr Operation operation{service, "moveItem", "from to -> error"};
    return this->template call<&T::moveItem>(operation, from, to, out(error));
  }
  bool copyItem(std::string_view from, std::string_view to, ErrorRef* error) override {
    static constexpr Operation operation{service, "copyItem", "from to -> error"};
    return this->template call<&T::copyItem>(operation, from, to, out(error));
  }
  bool fileExists(std::string_view path, bool* isDirectory) override {
    static constexpr Operation operation{service, "fileExists", "path -> isDirectory"};
    return this->template call<&T::fileExists>(operation, path, out(isDirectory));
  }
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, ErrorRef* error) override {
    static constexpr Operation operation{service, "attributesOfItem", "path -> error"};
    return this->template call<&T::attributesOfItem>(operation, path, out(error));
  }
  bool createFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes) override {
    static constexpr Operation operation{service, "createFile", "path contents attributes"};
    return this->template call<&T::createFile>(operation, path, BytesArgument{contents}, attributes);
  }
  std::optional<platform::Bytes> readFile(std::string_view path, ErrorRef* error) override {
    static constexpr Operation operation{service, "readFile", "path -> error"};
    return this->template call<&T::readFile>(operation, path, out(error));
  }
  bool writeAtomically(std::string_view path, platform::BytesView contents, ErrorRef* error,
                       platform::Durability durability) override {
    static constexpr Operation operation{service, "writeAtomically", "path contents durability -> error"};
    return this->crossing().callWith(
        operation, nullptr,
        [](T& target, auto to, platform::BytesView bytes, auto lasts, ErrorRef* failed) {
          return target.writeAtomically(to, bytes, failed, lasts);
        },
        path, BytesArgument{contents}, durability, out(error));
  }
  int utimes(std::string_view path, int& errorNumber) override {
    static constexpr Operation operation{service, "utimes", "path -> errorNumber"};
    return this->template call<&T::utimes>(operation, path, out(errorNumber));
  }
};

template <template <class> class Crossing>
class PropertyListsOf final : public ServiceOf<platform::PropertyListSerialization, Crossing> {
  using T = platform::PropertyListSerialization;
  static constexpr const char* service = "PropertyListSerialization";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  platform::Value propertyListWithData(platform::Bytes bytes, ErrorRef* error) override {
    static constexpr Operation operation{service, "propertyListWithData", "data -> error"};
    return this->crossing().callWith(
        operation, nullptr,
        [&bytes](T& target, platform::BytesView, ErrorRef* failed) {
          return target.propertyListWithData(std::move(bytes), failed);
        },
        BytesArgument{bytes}, out(error));
  }
  std::optional<platform::Bytes> dataWithPropertyList(const platform::Value& value, platform::PropertyListFormat format,
                                                      ErrorRef* error) override {
    static constexpr Operation operation{service, "dataWithPropertyList", "value format -> error"};
    return this->template call<&T::dataWithPropertyList>(operation, value, format, out(error));
  }
};

template <template <class> class Crossing>
class SystemLogOf final : public ServiceOf<platform::SystemLog, Crossing> {
  using T = platform::SystemLog;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::shared_ptr<platform::LogHandle> createHandle(std::string_view subsystem, std::string_view category) override {
    static constexpr Operation operation{"SystemLog", "createHandle", "subsystem category"};
    return this->template call<&T::createHandle>(operation, subsystem, category);
  }
};

template <template <class> class Crossing>
class SupportOf final : public ServiceOf<platform::TSSupport, Crossing> {
  using T = platform::TSSupport;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  /// The handle lives as long as the daemon: whoever answers keeps it.
  platform::LogHandle& TSGetLogCategory(int category) override {
    static constexpr Operation operation{"TSSupport", "TSGetLogCategory", "category", OperationClass::message};
    return this->crossing().logOf(operation, category);
  }
  std::shared_ptr<platform::TSMutableAccountInfo> makeAccountInfo() override {
    static constexpr Operation operation{"TSSupport", "makeAccountInfo", ""};
    return this->template call<&T::makeAccountInfo>(operation);
  }
};

template <template <class> class Crossing>
class DeviceServiceOf final : public ServiceOf<platform::TSDeviceService, Crossing> {
  using T = platform::TSDeviceService;
  static constexpr const char* service = "TSDeviceService";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  bool respondsToPrioritizeAsset() const override {
    static constexpr Operation operation{service, "respondsToPrioritizeAsset", ""};
    return this->template call<&T::respondsToPrioritizeAsset>(operation);
  }
  void prioritizeAsset(const platform::TSAssetRef& asset, std::function<void(ErrorRef)> completion) override {
    static constexpr Operation operation{service, "prioritizeAsset", "asset completion"};
    this->template call<&T::prioritizeAsset>(operation, asset, callback(std::move(completion)));
  }
  bool respondsToCancelAssetTransferForFailedAsset() const override {
    static constexpr Operation operation{service, "respondsToCancelAssetTransferForFailedAsset", ""};
    return this->template call<&T::respondsToCancelAssetTransferForFailedAsset>(operation);
  }
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef& asset) override {
    static constexpr Operation operation{service, "cancelAssetTransferForFailedAsset", "asset"};
    this->template call<&T::cancelAssetTransferForFailedAsset>(operation, asset);
  }
};

template <template <class> class Crossing>
class CoordinationOf final : public ServiceOf<platform::InstallCoordination, Crossing> {
  using T = platform::InstallCoordination;
  using Client = platform::RVClientIdentifier;
  static constexpr const char* service = "InstallCoordination";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::shared_ptr<platform::RVAppInstallCoordinator> coordinatorForAppWithBundleID(
      platform::RVCoordinatorKind kind, std::string_view bundleID, Client clientID, bool createIfNotExisting,
      bool* created, ErrorRef* error) override {
    static constexpr Operation operation{service, "coordinatorForAppWithBundleID",
                                         "kind bundleID clientID createIfNotExisting -> created error"};
    return this->template call<&T::coordinatorForAppWithBundleID>(operation, kind, bundleID, clientID,
                                                                  createIfNotExisting, out(created), out(error));
  }
  void uninstallAppWithBundleID(std::string_view bundleID, bool requestUserConfirmation,
                                std::function<void(ErrorRef)> completion) override {
    static constexpr Operation operation{service, "uninstallAppWithBundleID",
                                         "bundleID requestUserConfirmation completion"};
    this->template call<&T::uninstallAppWithBundleID>(operation, bundleID, requestUserConfirmation,
                                                      callback(std::move(completion)));
  }
  std::shared_ptr<platform::RVPromisedTransferToPath> makePromisedTransferToPath(
      std::string_view name, Client client, std::string_view transferPath, std::uint64_t diskSpaceNeeded) override {
    static constexpr Operation operation{service, "makePromisedTransferToPath",
                                         "name client transferPath diskSpaceNeeded"};
    return this->template call<&T::makePromisedTransferToPath>(operation, name, client, transferPath, diskSpaceNeeded);
  }
  std::shared_ptr<platform::RVPromisedTransferToPath> makePromisedTransferToPathWithoutPath(
      std::string_view name, Client client, std::uint64_t diskSpaceNeeded) override {
    static constexpr Operation operation{service, "makePromisedTransferToPathWithoutPath",
                                         "name client diskSpaceNeeded"};
    return this->template call<&T::makePromisedTransferToPathWithoutPath>(operation, name, client, diskSpaceNeeded);
  }
  std::shared_ptr<platform::RVPromisedOutOfBandTransfer> makePromisedOutOfBandTransfer(
      std::string_view name, Client client, std::uint64_t diskSpaceNeeded) override {
    static constexpr Operation operation{service, "makePromisedOutOfBandTransfer", "name client diskSpaceNeeded"};
    return this->template call<&T::makePromisedOutOfBandTransfer>(operation, name, client, diskSpaceNeeded);
  }
  std::shared_ptr<platform::RVPlaceholder> makeAppPlaceholder(std::string_view bundleName, std::string_view bundleID,
                                                              std::uint64_t installType, Client client) override {
    static constexpr Operation operation{service, "makeAppPlaceholder", "bundleName bundleID installType client"};
    return this->template call<&T::makeAppPlaceholder>(operation, bundleName, bundleID, installType, client);
  }
  std::shared_ptr<platform::RVPlaceholderAttributes> makePlaceholderAttributes() override {
    static constexpr Operation operation{service, "makePlaceholderAttributes", ""};
    return this->template call<&T::makePlaceholderAttributes>(operation);
  }
  std::shared_ptr<platform::RVPlaceholderAttributes> makePlaceholderAttributesWithInfoPlistDictionary(
      const platform::Value& manifest) override {
    static constexpr Operation operation{service, "makePlaceholderAttributesWithInfoPlistDictionary", "manifest"};
    return this->template call<&T::makePlaceholderAttributesWithInfoPlistDictionary>(operation, manifest);
  }
  std::unique_ptr<platform::RVAppInstallObserver> makeAppInstallObserver(
      std::string_view machServiceName, const std::vector<Client>& clients,
      std::weak_ptr<platform::RVAppInstallObserverDelegate> delegate) override {
    static constexpr Operation operation{service, "makeAppInstallObserver", "machServiceName clients delegate"};
    return this->template call<&T::makeAppInstallObserver>(operation, machServiceName, clients, delegate);
  }
  ErrorRef RVCreateUserPresentableError(std::int64_t code, std::int64_t second, const ErrorRef& underlying) override {
    static constexpr Operation operation{service, "RVCreateUserPresentableError", "code second underlying"};
    return this->template call<&T::RVCreateUserPresentableError>(operation, code, second, underlying);
  }
};

template <template <class> class Crossing>
class WorkspaceOf final : public ServiceOf<platform::OBApplicationWorkspace, Crossing> {
  using T = platform::OBApplicationWorkspace;
  using Block = void(const platform::OBBundleProxyRef& bundle, bool& stop);
  static constexpr const char* service = "OBApplicationWorkspace";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  void addObserver(std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol> observer) override {
    static constexpr Operation operation{service, "addObserver", "observer"};
    this->template call<&T::addObserver>(operation, observer);
  }
  void removeObserver(const platform::OBApplicationWorkspaceObserverProtocol* observer) override {
    static constexpr Operation operation{service, "removeObserver", "observer"};
    this->template call<&T::removeObserver>(operation, observer);
  }
  bool applicationIsInstalled(std::string_view bundleIdentifier) override {
    static constexpr Operation operation{service, "applicationIsInstalled", "bundleIdentifier"};
    return this->template call<&T::applicationIsInstalled>(operation, bundleIdentifier);
  }
  void enumerateBundlesOfType(std::uint64_t type, const std::function<Block>& block) override {
    static constexpr Operation operation{service, "enumerateBundlesOfType", "type block"};
    this->template call<&T::enumerateBundlesOfType>(operation, type, callback<Block>(block));
  }
  bool uninstallApplication(std::string_view bundleIdentifier) override {
    static constexpr Operation operation{service, "uninstallApplication", "bundleIdentifier"};
    return this->template call<&T::uninstallApplication>(operation, bundleIdentifier);
  }
  platform::OBApplicationProxyRef applicationProxyForIdentifier(std::string_view bundleIdentifier,
                                                                bool placeholder) override {
    static constexpr Operation operation{service, "applicationProxyForIdentifier", "bundleIdentifier placeholder"};
    return this->template call<&T::applicationProxyForIdentifier>(operation, bundleIdentifier, placeholder);
  }
};

template <template <class> class Crossing>
class InstallerOf final : public ServiceOf<platform::Installer, Crossing> {
  using T = platform::Installer;
  static constexpr const char* service = "Installer";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  platform::Value CorvaneLookupUninstalled() override {
    static constexpr Operation operation{service, "CorvaneLookupUninstalled", ""};
    return this->template call<&T::CorvaneLookupUninstalled>(operation);
  }
  int CorvaneClearUninstalled(const std::vector<std::string>& bundleIdentifiers) override {
    static constexpr Operation operation{service, "CorvaneClearUninstalled", "bundleIdentifiers"};
    return this->template call<&T::CorvaneClearUninstalled>(operation, bundleIdentifiers);
  }
  std::shared_ptr<platform::CVStoreMetadata> makeStoreMetadata(const platform::Value& dictionary) override {
    static constexpr Operation operation{service, "makeStoreMetadata", "dictionary"};
    return this->template call<&T::makeStoreMetadata>(operation, dictionary);
  }
  std::shared_ptr<platform::CVInstallOptions> makeInstallOptions() override {
    static constexpr Operation operation{service, "makeInstallOptions", ""};
    return this->template call<&T::makeInstallOptions>(operation);
  }
};

template <template <class> class Crossing>
class BackupOf final : public ServiceOf<platform::BackupService, Crossing> {
  using T = platform::BackupService;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::shared_ptr<platform::CLManager> makeBackupManager() override {
    static constexpr Operation operation{"BackupService", "makeBackupManager", ""};
    return this->template call<&T::makeBackupManager>(operation);
  }
};

template <template <class> class Crossing>
class RestrictionsOf final : public ServiceOf<platform::DPProfileConnection, Crossing> {
  using T = platform::DPProfileConnection;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  int effectiveBoolValueForSetting(std::string_view setting) override {
    static constexpr Operation operation{"DPProfileConnection", "effectiveBoolValueForSetting", "setting"};
    return this->template call<&T::effectiveBoolValueForSetting>(operation, setting);
  }
};

template <template <class> class Crossing>
class HomeScreenOf final : public ServiceOf<platform::HomeScreen, Crossing> {
  using T = platform::HomeScreen;
  static constexpr const char* service = "HomeScreen";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  T::Port PNSPanelloBlockableServerPort() override {
    static constexpr Operation operation{service, "PNSPanelloBlockableServerPort", ""};
    return this->template call<&T::PNSPanelloBlockableServerPort>(operation);
  }
  int PNGetFlattenedIconState(T::Port port, int form, void** buffer, std::size_t* length) override {
    static constexpr Operation operation{service, "PNGetFlattenedIconState", "port form -> buffer"};
    return this->crossing().callWith(
        operation, nullptr,
        [](T& target, T::Port to, int as, LentBuffer lent) {
          return target.PNGetFlattenedIconState(to, as, lent.buffer, lent.length);
        },
        port, form, LentBuffer{buffer, length});
  }
  int PNSetIconState(T::Port port, platform::BytesView layout) override {
    static constexpr Operation operation{service, "PNSetIconState", "port layout"};
    return this->template call<&T::PNSetIconState>(operation, port, BytesArgument{layout});
  }
};

template <template <class> class Crossing>
class IconRendererOf final : public ServiceOf<platform::IconRenderer, Crossing> {
  using T = platform::IconRenderer;
  static constexpr const char* service = "IconRenderer";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::shared_ptr<const platform::KBURL> KBURLCreateWithFileSystemPath(std::string_view path,
                                                                       bool isDirectory) override {
    static constexpr Operation operation{service, "KBURLCreateWithFileSystemPath", "path isDirectory"};
    return this->template call<&T::KBURLCreateWithFileSystemPath>(operation, path, isDirectory);
  }
  std::shared_ptr<const platform::KBBundle> KBBundleCreate(const std::shared_ptr<const platform::KBURL>& url) override {
    static constexpr Operation operation{service, "KBBundleCreate", "url"};
    return this->template call<&T::KBBundleCreate>(operation, url);
  }
  std::shared_ptr<const platform::GYImage> GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(
      const std::shared_ptr<const platform::KBBundle>& bundle) override {
    static constexpr Operation operation{service, "GYCreateDeviceAppropriateHomeScreenIconImageFromBundle", "bundle"};
    return this->template call<&T::GYCreateDeviceAppropriateHomeScreenIconImageFromBundle>(operation, bundle);
  }
};

template <template <class> class Crossing>
class ImageEncoderOf final : public ServiceOf<platform::ImageEncoder, Crossing> {
  using T = platform::ImageEncoder;

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::unique_ptr<platform::QGImageDestination> QGImageDestinationCreateWithData(platform::Bytes& data,
                                                                                 std::string_view type,
                                                                                 std::size_t count) override {
    static constexpr Operation operation{"ImageEncoder", "QGImageDestinationCreateWithData", "type count -> data"};
    auto destination = this->crossing().callWith(
        operation, nullptr,
        [](T& target, auto as, std::size_t images, platform::Bytes& into) {
          return target.QGImageDestinationCreateWithData(into, as, images);
        },
        type, count, out(data));
    using Destination = ObjectOfKind<platform::QGImageDestination, Crossing>;
    if (destination) static_cast<Destination&>(*destination).setData(data);
    return destination;
  }
};

template <template <class> class Crossing>
class TransactionLogOf final : public ServiceOf<platform::InstallTransactionLog, Crossing> {
  using T = platform::InstallTransactionLog;
  static constexpr const char* service = "InstallTransactionLog";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  void initializeWithLog(std::shared_ptr<platform::LogHandle> log) override {
    static constexpr Operation operation{service, "initializeWithLog", "log"};
    this->template call<&T::initializeWithLog>(operation, log);
  }
  void logStep(int step, int party, int phase, bool success, std::string_view bundleID,
               std::string_view description) override {
    static constexpr Operation operation{service, "logStep", "step party phase success bundleID description",
                                         OperationClass::step};
    this->template call<&T::logStep>(operation, step, party, phase, success, bundleID, description);
  }
  void logScenario(std::string_view scenario, int step, bool success, std::string_view bundleID,
                   std::string_view description) override {
    static constexpr Operation operation{service, "logScenario", "scenario step success bundleID description",
                                         OperationClass::step};
    this->template call<&T::logScenario>(operation, scenario, step, success, bundleID, description);
  }
};

template <template <class> class Crossing>
class NotificationsOf final : public ServiceOf<platform::NotificationCenter, Crossing> {
  using T = platform::NotificationCenter;
  static constexpr const char* service = "NotificationCenter";

 public:
  using ServiceOf<T, Crossing>::ServiceOf;

  std::uint32_t notify_register_check(std::string_view name, int& token) override {
    static constexpr Operation operation{service, "notify_register_check", "name -> token"};
    return this->template call<&T::notify_register_check>(operation, name, out(token));
  }
  std::uint32_t notify_set_state(int token, std::uint64_t state) override {
    static constexpr Operation operation{service, "notify_set_state", "token state"};
    return this->template call<&T::notify_set_state>(operation, token, state);
  }
  std::uint32_t notify_post(std::string_view name) override {
    static constexpr Operation operation{service, "notify_post", "name"};
    return this->template call<&T::notify_post>(operation, name);
  }
  void KBNotificationCenterAddObserver(std::weak_ptr<void> observer, platform::KBNotificationCallback callback,
                                       std::string_view name, const void* object,
                                       platform::KBNotificationSuspensionBehavior suspension) override {
    static constexpr Operation operation{service, "KBNotificationCenterAddObserver", "observer name suspension"};
    this->crossing().addObserver(operation, std::move(observer), callback, name, object, suspension);
  }
  void KBNotificationCenterRemoveObserver(const void* observer, std::string_view name) override {
    static constexpr Operation operation{service, "KBNotificationCenterRemoveObserver", "observer name"};
    this->crossing().removeObserver(operation, observer, name);
  }
};

/// All services over one crossing, as the plug-in gets them. `make<T>()` answers the crossing to a service.
template <template <class> class Crossing>
struct ServicesOf {
  template <class Make>
  explicit ServicesOf(const Make& make)
      : process(make.template operator()<platform::Process>()),
        clock(make.template operator()<platform::Clock>()),
        fileSystem(make.template operator()<platform::FileSystem>()),
        propertyLists(make.template operator()<platform::PropertyListSerialization>()),
        systemLog(make.template operator()<platform::SystemLog>()),
        support(make.template operator()<platform::TSSupport>()),
        deviceService(make.template operator()<platform::TSDeviceService>()),
        installCoordination(make.template operator()<platform::InstallCoordination>()),
        workspace(make.template operator()<platform::OBApplicationWorkspace>()),
        installer(make.template operator()<platform::Installer>()),
        backup(make.template operator()<platform::BackupService>()),
        restrictions(make.template operator()<platform::DPProfileConnection>()),
        homeScreen(make.template operator()<platform::HomeScreen>()),
        iconRenderer(make.template operator()<platform::IconRenderer>()),
        imageEncoder(make.template operator()<platform::ImageEncoder>()),
        transactionLog(make.template operator()<platform::InstallTransactionLog>()),
        notifications(make.template operator()<platform::NotificationCenter>()) {}

  ProcessOf<Crossing> process;
  ClockOf<Crossing> clock;
  FileSystemOf<Crossing> fileSystem;
  PropertyListsOf<Crossing> propertyLists;
  SystemLogOf<Crossing> systemLog;
  SupportOf<Crossing> support;
  DeviceServiceOf<Crossing> deviceService;
  CoordinationOf<Crossing> installCoordination;
  WorkspaceOf<Crossing> workspace;
  InstallerOf<Crossing> installer;
  BackupOf<Crossing> backup;
  RestrictionsOf<Crossing> restrictions;
  HomeScreenOf<Crossing> homeScreen;
  IconRendererOf<Crossing> iconRenderer;
  ImageEncoderOf<Crossing> imageEncoder;
  TransactionLogOf<Crossing> transactionLog;
  NotificationsOf<Crossing> notifications;

  const platform::Platform platform{process,        clock,         fileSystem,          propertyLists, systemLog,
                                    support,        deviceService, installCoordination, workspace,     installer,
                                    backup,         restrictions,  homeScreen,          iconRenderer,  imageEncoder,
                                    transactionLog, notifications};
};

}  // namespace record
