#include "record/RecordingPlatform.h"

#include <utility>

#include "record/calls/Services.h"
#include "record/recording/RecordingCrossing.h"

namespace record {

using platform::Platform;
using platform::StringSet;
using platform::TSAssetRef;
using platform::TSClient;
using platform::TSProgressCallback;
using platform::Value;

namespace {

/// The plug-in's object as its host sees it.
class RecordedClient final : public TSClient {
  auto receiver() const {
    return [number = _number](ItemWriter& items) { items.object({ObjectKind::client, number, 0}); };
  }
  template <class T>
  static const T& given(const T& argument) {
    return argument;
  }
  template <class T>
  static T* given(const Out<T>& argument) {
    return argument.place;
  }
  static const TSProgressCallback& given(const Callback<void(double)>& callback) { return callback.function; }

  template <auto method, class... Arguments>
  auto call(const Operation& operation, const Arguments&... arguments) {
    return callPlugin(
        *_recorder, operation, receiver(),
        [this](const auto&... seen) { return (_target.get()->*method)(given(seen)...); }, arguments...);
  }

 public:
  RecordedClient(std::shared_ptr<Recorder> recorder, std::shared_ptr<TSClient> target, std::uint64_t number)
      : _recorder(std::move(recorder)), _target(std::move(target)), _number(number) {}
  ~RecordedClient() override {
    try {
      callPlugin(*_recorder, inbound::client::release, receiver(), [this] { _target.reset(); });
    } catch (...) {
      return;  // for want of memory: the object goes all the same
    }
  }
  RecordedClient(const RecordedClient&) = delete;
  RecordedClient& operator=(const RecordedClient&) = delete;

  std::vector<std::string> supportedDataclasses() override {
    return call<&TSClient::supportedDataclasses>(inbound::client::supportedDataclasses);
  }
  std::string currentSyncAnchor() override {
    return call<&TSClient::currentSyncAnchor>(inbound::client::currentSyncAnchor);
  }
  bool prepareForSyncWithHostAnchor(std::string_view hostAnchor, const TSProgressCallback& progressCallback,
                                    ErrorRef* error) override {
    return call<&TSClient::prepareForSyncWithHostAnchor>(inbound::client::prepareForSyncWithHostAnchor, hostAnchor,
                                                         progressCallback, out(error));
  }
  bool reconcileSync(std::uint32_t syncType, std::string_view newAnchor, const TSProgressCallback& progressCallback,
                     ErrorRef* error) override {
    return call<&TSClient::reconcileSync>(inbound::client::reconcileSync, syncType, newAnchor, progressCallback,
                                          out(error));
  }
  void syncEndedWithSuccess(bool success) override {
    call<&TSClient::syncEndedWithSuccess>(inbound::client::syncEndedWithSuccess, success);
  }
  Value installedAssets() override { return call<&TSClient::installedAssets>(inbound::client::installedAssets); }
  std::vector<TSAssetRef> outstandingAssetTransfers() override {
    return call<&TSClient::outstandingAssetTransfers>(inbound::client::outstandingAssetTransfers);
  }
  void assetTransferUpdatedProgress(const TSAssetRef& asset, double progress) override {
    call<&TSClient::assetTransferUpdatedProgress>(inbound::client::assetTransferUpdatedProgress, asset, progress);
  }
  void assetTransferSucceeded(const TSAssetRef& asset, bool succeeded, const ErrorRef& error) override {
    call<&TSClient::assetTransferSucceeded>(inbound::client::assetTransferSucceeded, asset, succeeded, error);
  }
  void assetInstallSucceeded(const TSAssetRef& asset) override {
    call<&TSClient::assetInstallSucceeded>(inbound::client::assetInstallSucceeded, asset);
  }
  void assetInstallFailed(const TSAssetRef& asset, const ErrorRef& error) override {
    call<&TSClient::assetInstallFailed>(inbound::client::assetInstallFailed, asset, error);
  }
  void assetTransferEndedWithSuccess(bool success) override {
    call<&TSClient::assetTransferEndedWithSuccess>(inbound::client::assetTransferEndedWithSuccess, success);
  }
  void clearSyncData() override { call<&TSClient::clearSyncData>(inbound::client::clearSyncData); }
  bool reconcileRestoreOfType(std::int32_t type, ErrorRef* error) override {
    return call<&TSClient::reconcileRestoreOfType>(inbound::client::reconcileRestoreOfType, type, out(error));
  }
  Value installedAssetMetrics() override {
    return call<&TSClient::installedAssetMetrics>(inbound::client::installedAssetMetrics);
  }
  StringSet vantorIDsForAssets() override {
    return call<&TSClient::vantorIDsForAssets>(inbound::client::vantorIDsForAssets);
  }
  std::vector<std::shared_ptr<platform::TSMutableAccountInfo>> accountsForAssets() override {
    return toWorld(*_recorder, call<&TSClient::accountsForAssets>(inbound::client::accountsForAssets));
  }
  std::optional<StringSet> disabledAssetTypes() override {
    return call<&TSClient::disabledAssetTypes>(inbound::client::disabledAssetTypes);
  }
  void prepareForBackup() override { call<&TSClient::prepareForBackup>(inbound::client::prepareForBackup); }

 private:
  const std::shared_ptr<Recorder> _recorder;
  std::shared_ptr<TSClient> _target;
  const std::uint64_t _number;
};

/// A service is there as long as the platform is: nobody owns it.
template <class T>
std::shared_ptr<T> borrowed(T& service) {
  return {std::shared_ptr<void>(), &service};
}

template <class T>
T& serviceOf(const Platform& platform) {
  if constexpr (std::is_same_v<T, platform::Process>) return platform.process;
  if constexpr (std::is_same_v<T, platform::Clock>) return platform.clock;
  if constexpr (std::is_same_v<T, platform::FileSystem>) return platform.fileSystem;
  if constexpr (std::is_same_v<T, platform::PropertyListSerialization>) return platform.propertyLists;
  if constexpr (std::is_same_v<T, platform::SystemLog>) return platform.systemLog;
  if constexpr (std::is_same_v<T, platform::TSSupport>) return platform.support;
  if constexpr (std::is_same_v<T, platform::TSDeviceService>) return platform.deviceService;
  if constexpr (std::is_same_v<T, platform::InstallCoordination>) return platform.installCoordination;
  if constexpr (std::is_same_v<T, platform::OBApplicationWorkspace>) return platform.workspace;
  if constexpr (std::is_same_v<T, platform::Installer>) return platform.installer;
  if constexpr (std::is_same_v<T, platform::BackupService>) return platform.backup;
  if constexpr (std::is_same_v<T, platform::DPProfileConnection>) return platform.restrictions;
  if constexpr (std::is_same_v<T, platform::HomeScreen>) return platform.homeScreen;
  if constexpr (std::is_same_v<T, platform::IconRenderer>) return platform.iconRenderer;
  if constexpr (std::is_same_v<T, platform::ImageEncoder>) return platform.imageEncoder;
  if constexpr (std::is_same_v<T, platform::InstallTransactionLog>) return platform.transactionLog;
  if constexpr (std::is_same_v<T, platform::NotificationCenter>) return platform.notifications;
}

class Recording final : public RecordingPlatform {
 public:
  Recording(const Platform& platform, std::shared_ptr<Sink> sink, RecordingOptions options)
      : _recorder(std::make_shared<Recorder>(std::move(sink), std::move(options.threadName))),
        _services([&]<class T>() { return RecordingCrossing<T>(_recorder, borrowed(serviceOf<T>(platform))); }) {
    _recorder->setNotifications(_services.notifications);
  }
  ~Recording() override {
    _recorder->finish();
    _recorder->release();
  }

  const Platform& platform() const override { return _services.platform; }

  std::shared_ptr<TSClient> makeClient(
      const std::function<std::shared_ptr<TSClient>(const Platform&)>& create) override {
    std::uint64_t number = 0;
    std::shared_ptr<TSClient> target;
    callPlugin(
        *_recorder, inbound::create, [](ItemWriter&) {},
        [&] {
          target = create(_services.platform);
          if (target) number = _recorder->newNumber(ObjectKind::client);
          return NewClient{number};
        });
    return target ? std::make_shared<RecordedClient>(_recorder, std::move(target), number) : nullptr;
  }

  void finish() override { _recorder->finish(); }
  bool failed() const override { return _recorder->failed(); }

 private:
  const std::shared_ptr<Recorder> _recorder;
  ServicesOf<RecordingCrossing> _services;
};

}  // namespace

std::unique_ptr<RecordingPlatform> recordingPlatform(const Platform& platform, std::shared_ptr<Sink> sink,
                                                     RecordingOptions options) {
  return std::make_unique<Recording>(platform, std::move(sink), std::move(options));
}

}  // namespace record
