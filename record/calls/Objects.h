#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/BackupService.h"
#include "platform/CVInstallOptions.h"
#include "platform/IconRenderer.h"
#include "platform/RVAppInstallCoordinator.h"
#include "platform/RVPlaceholder.h"
#include "platform/RVPromise.h"
#include "platform/SystemLog.h"
#include "platform/TSAccountInfo.h"
#include "record/Operation.h"
#include "record/stream/Codec.h"
#include "record/stream/Names.h"

/// The objects of services, as the plug-in sees them while it is recorded or replayed. Every operation is listed here
/// once; `Crossing` is what it does: it calls the real object and writes what went over, or it answers from a
/// recording.
namespace record {

using platform::ErrorRef;

template <class T, template <class> class Crossing>
class ObjectOf : public T, public Numbered {
 public:
  ObjectOf(ObjectKind kind, std::uint64_t number, bool isNew, Crossing<T> crossing)
      : Numbered(kind, number, isNew), _crossing(std::move(crossing)) {}

  const Crossing<T>& crossing() const { return _crossing; }

 protected:
  Crossing<T>& ownCrossing() { return _crossing; }

  template <auto method, class... Arguments>
  decltype(auto) call(const Operation& operation, Arguments&&... arguments) const {
    return _crossing.template call<method>(operation, this, std::forward<Arguments>(arguments)...);
  }

 private:
  Crossing<T> _crossing;
};

template <class T, template <class> class Crossing>
class ObjectOfKind;

template <template <class> class Crossing>
class ObjectOfKind<platform::RVAppInstallCoordinator, Crossing> final
    : public ObjectOf<platform::RVAppInstallCoordinator, Crossing> {
  using T = platform::RVAppInstallCoordinator;
  template <class P>
  using Ref = const std::shared_ptr<P>&;
  static constexpr const char* service = "RVAppInstallCoordinator";

 public:
  static constexpr ObjectKind kind = ObjectKind::coordinator;
  using ObjectOf<T, Crossing>::ObjectOf;

  std::optional<std::string> bundleID() override {
    static constexpr Operation operation{service, "bundleID", "coordinator"};
    return this->template call<&T::bundleID>(operation);
  }
  platform::RVClientIdentifier creatorIdentifier() override {
    static constexpr Operation operation{service, "creatorIdentifier", "coordinator"};
    return this->template call<&T::creatorIdentifier>(operation);
  }
  ErrorRef error() override {
    static constexpr Operation operation{service, "error", "coordinator"};
    return this->template call<&T::error>(operation);
  }
  void setObserver(std::weak_ptr<platform::RVAppInstallObserverDelegate> observer) override {
    static constexpr Operation operation{service, "setObserver", "coordinator observer"};
    this->template call<&T::setObserver>(operation, observer);
  }
  bool hasAppAssetPromise() override {
    static constexpr Operation operation{service, "hasAppAssetPromise", "coordinator"};
    return this->template call<&T::hasAppAssetPromise>(operation);
  }
  bool hasInitialZDRAssetPromises() override {
    static constexpr Operation operation{service, "hasInitialZDRAssetPromises", "coordinator"};
    return this->template call<&T::hasInitialZDRAssetPromises>(operation);
  }
  bool hasInstallOptions() override {
    static constexpr Operation operation{service, "hasInstallOptions", "coordinator"};
    return this->template call<&T::hasInstallOptions>(operation);
  }
  bool hasPlaceholderPromise() override {
    static constexpr Operation operation{service, "hasPlaceholderPromise", "coordinator"};
    return this->template call<&T::hasPlaceholderPromise>(operation);
  }
  bool hasUserDataPromise() override {
    static constexpr Operation operation{service, "hasUserDataPromise", "coordinator"};
    return this->template call<&T::hasUserDataPromise>(operation);
  }
  std::shared_ptr<platform::RVPromisedTransferToPath> appAssetPromiseWithError(ErrorRef* error) override {
    static constexpr Operation operation{service, "appAssetPromiseWithError", "coordinator -> error"};
    return this->template call<&T::appAssetPromiseWithError>(operation, out(error));
  }
  bool setAppAssetPromise(Ref<platform::RVPromisedTransferToPath> promise, ErrorRef* error) override {
    static constexpr Operation operation{service, "setAppAssetPromise", "coordinator promise -> error"};
    return this->template call<&T::setAppAssetPromise>(operation, promise, out(error));
  }
  bool setPlaceholderPromise(Ref<platform::RVPlaceholder> placeholder, ErrorRef* error) override {
    static constexpr Operation operation{service, "setPlaceholderPromise", "coordinator placeholder -> error"};
    return this->template call<&T::setPlaceholderPromise>(operation, placeholder, out(error));
  }
  bool setUserDataPromise(Ref<platform::RVPromisedOutOfBandTransfer> promise, ErrorRef* error) override {
    static constexpr Operation operation{service, "setUserDataPromise", "coordinator promise -> error"};
    return this->template call<&T::setUserDataPromise>(operation, promise, out(error));
  }
  bool setInitialZDRAssetPromises(const std::vector<std::shared_ptr<platform::RVPromise>>& promises,
                                  ErrorRef* error) override {
    static constexpr Operation operation{service, "setInitialZDRAssetPromises", "coordinator promises -> error"};
    return this->template call<&T::setInitialZDRAssetPromises>(operation, promises, out(error));
  }
  bool setInstallOptions(Ref<platform::CVInstallOptions> options, ErrorRef* error) override {
    static constexpr Operation operation{service, "setInstallOptions", "coordinator options -> error"};
    return this->template call<&T::setInstallOptions>(operation, options, out(error));
  }
  platform::RVClientIdentifier appAssetPromiseResponsibleClientWithError(ErrorRef* error) override {
    static constexpr Operation operation{service, "appAssetPromiseResponsibleClientWithError", "coordinator -> error"};
    return this->template call<&T::appAssetPromiseResponsibleClientWithError>(operation, out(error));
  }
  bool setAppAssetPromiseResponsibleClient(platform::RVClientIdentifier client, ErrorRef* error) override {
    static constexpr Operation operation{service, "setAppAssetPromiseResponsibleClient", "coordinator client -> error"};
    return this->template call<&T::setAppAssetPromiseResponsibleClient>(operation, client, out(error));
  }
  bool cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) override {
    static constexpr Operation operation{service, "cancelForReason", "coordinator reason client -> error"};
    return this->template call<&T::cancelForReason>(operation, reason, client, out(error));
  }
  std::string describe() const override {
    static constexpr Operation operation{service, "describe", "coordinator", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

/// What every promise has.
template <class T, template <class> class Crossing>
class PromiseOf : public ObjectOf<T, Crossing> {
 public:
  static constexpr ObjectKind kind = ObjectKind::promise;
  using ObjectOf<T, Crossing>::ObjectOf;

  void setPercentComplete(double fraction) final {
    static constexpr Operation operation{"RVPromise", "setPercentComplete", "promise fraction"};
    this->template call<&T::setPercentComplete>(operation, fraction);
  }
  void setComplete(bool complete) final {
    static constexpr Operation operation{"RVPromise", "setComplete", "promise complete"};
    this->template call<&T::setComplete>(operation, complete);
  }
  bool isComplete() final {
    static constexpr Operation operation{"RVPromise", "isComplete", "promise"};
    return this->template call<&T::isComplete>(operation);
  }
  bool cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) final {
    static constexpr Operation operation{"RVPromise", "cancelForReason", "promise reason client -> error"};
    return this->template call<&T::cancelForReason>(operation, reason, client, out(error));
  }
  std::string describe() const final {
    static constexpr Operation operation{"RVPromise", "describe", "promise", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::RVPromisedTransferToPath, Crossing> final
    : public PromiseOf<platform::RVPromisedTransferToPath, Crossing> {
  using T = platform::RVPromisedTransferToPath;

 public:
  using PromiseOf<T, Crossing>::PromiseOf;
  void setTransferPath(std::string_view path) override {
    static constexpr Operation operation{"RVPromisedTransferToPath", "setTransferPath", "promise path"};
    this->template call<&T::setTransferPath>(operation, path);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::RVPromisedOutOfBandTransfer, Crossing> final
    : public PromiseOf<platform::RVPromisedOutOfBandTransfer, Crossing> {
 public:
  using PromiseOf<platform::RVPromisedOutOfBandTransfer, Crossing>::PromiseOf;
};

template <template <class> class Crossing>
class ObjectOfKind<platform::RVPlaceholder, Crossing> final : public ObjectOf<platform::RVPlaceholder, Crossing> {
  using T = platform::RVPlaceholder;
  static constexpr const char* service = "RVPlaceholder";

 public:
  static constexpr ObjectKind kind = ObjectKind::placeholder;
  using ObjectOf<T, Crossing>::ObjectOf;

  bool setIconPromise(const std::shared_ptr<platform::RVPromisedTransferToPath>& promise, ErrorRef* error) override {
    static constexpr Operation operation{service, "setIconPromise", "placeholder promise -> error"};
    return this->template call<&T::setIconPromise>(operation, promise, out(error));
  }
  bool setMetadata(const std::shared_ptr<platform::CVStoreMetadata>& metadata, ErrorRef* error) override {
    static constexpr Operation operation{service, "setMetadata", "placeholder metadata -> error"};
    return this->template call<&T::setMetadata>(operation, metadata, out(error));
  }
  bool setPlaceholderAttributes(const std::shared_ptr<platform::RVPlaceholderAttributes>& attributes,
                                ErrorRef* error) override {
    static constexpr Operation operation{service, "setPlaceholderAttributes", "placeholder attributes -> error"};
    return this->template call<&T::setPlaceholderAttributes>(operation, attributes, out(error));
  }
  bool setSinfData(platform::BytesView data, ErrorRef* error) override {
    static constexpr Operation operation{service, "setSinfData", "placeholder data -> error"};
    return this->template call<&T::setSinfData>(operation, BytesArgument{data}, out(error));
  }
  bool setConfigurationCompleteWithError(ErrorRef* error) override {
    static constexpr Operation operation{service, "setConfigurationCompleteWithError", "placeholder -> error"};
    return this->template call<&T::setConfigurationCompleteWithError>(operation, out(error));
  }
  bool cancelForReason(const ErrorRef& reason, platform::RVClientIdentifier client, ErrorRef* error) override {
    static constexpr Operation operation{service, "cancelForReason", "placeholder reason client -> error"};
    return this->template call<&T::cancelForReason>(operation, reason, client, out(error));
  }
  std::string describe() const override {
    static constexpr Operation operation{service, "describe", "placeholder", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::RVPlaceholderAttributes, Crossing> final
    : public ObjectOf<platform::RVPlaceholderAttributes, Crossing> {
  using T = platform::RVPlaceholderAttributes;
  static constexpr const char* service = "RVPlaceholderAttributes";

 public:
  static constexpr ObjectKind kind = ObjectKind::attributes;
  using ObjectOf<T, Crossing>::ObjectOf;

  void setBundleVersion(std::optional<std::string> version) override {
    static constexpr Operation operation{service, "setBundleVersion", "attributes version"};
    this->template call<&T::setBundleVersion>(operation, version);
  }
  void setLaunchProhibited(bool prohibited) override {
    static constexpr Operation operation{service, "setLaunchProhibited", "attributes prohibited"};
    this->template call<&T::setLaunchProhibited>(operation, prohibited);
  }
  std::string describe() const override {
    static constexpr Operation operation{service, "describe", "attributes", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::CVStoreMetadata, Crossing> final : public ObjectOf<platform::CVStoreMetadata, Crossing> {
  using T = platform::CVStoreMetadata;

 public:
  static constexpr ObjectKind kind = ObjectKind::metadata;
  using ObjectOf<T, Crossing>::ObjectOf;

  std::string describe() const override {
    static constexpr Operation operation{"CVStoreMetadata", "describe", "metadata", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::CVInstallOptions, Crossing> final : public ObjectOf<platform::CVInstallOptions, Crossing> {
  using T = platform::CVInstallOptions;
  static constexpr const char* service = "CVInstallOptions";

 public:
  static constexpr ObjectKind kind = ObjectKind::options;
  using ObjectOf<T, Crossing>::ObjectOf;

  void setHarluneMetadata(std::shared_ptr<platform::CVStoreMetadata> metadata) override {
    static constexpr Operation operation{service, "setHarluneMetadata", "options metadata"};
    this->template call<&T::setHarluneMetadata>(operation, metadata);
  }
  void setObInstallType(std::uint64_t type) override {
    static constexpr Operation operation{service, "setObInstallType", "options type"};
    this->template call<&T::setObInstallType>(operation, type);
  }
  void setInstallTargetType(std::uint64_t type) override {
    static constexpr Operation operation{service, "setInstallTargetType", "options type"};
    this->template call<&T::setInstallTargetType>(operation, type);
  }
  std::string describe() const override {
    static constexpr Operation operation{service, "describe", "options", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::TSMutableAccountInfo, Crossing> final
    : public ObjectOf<platform::TSMutableAccountInfo, Crossing> {
  using T = platform::TSMutableAccountInfo;
  static constexpr const char* service = "TSMutableAccountInfo";

 public:
  static constexpr ObjectKind kind = ObjectKind::account;
  using ObjectOf<T, Crossing>::ObjectOf;

  void setVantorID(std::optional<std::string> identifier) override {
    static constexpr Operation operation{service, "setVantorID", "account identifier"};
    this->template call<&T::setVantorID>(operation, identifier);
  }
  void setDSID(platform::Value number) override {
    static constexpr Operation operation{service, "setDSID", "account number"};
    this->template call<&T::setDSID>(operation, number);
  }
  void setAltDSID(std::optional<std::string> identifier) override {
    static constexpr Operation operation{service, "setAltDSID", "account identifier"};
    this->template call<&T::setAltDSID>(operation, identifier);
  }
  std::string describe() const override {
    static constexpr Operation operation{service, "describe", "account", OperationClass::message};
    return this->template call<&T::describe>(operation);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::LogHandle, Crossing> final : public ObjectOf<platform::LogHandle, Crossing> {
  using T = platform::LogHandle;

 public:
  static constexpr ObjectKind kind = ObjectKind::log;
  using ObjectOf<T, Crossing>::ObjectOf;

  bool isEnabled(platform::LogLevel level) const override {
    static constexpr Operation operation{"LogHandle", "isEnabled", "log level", OperationClass::message};
    return this->template call<&T::isEnabled>(operation, level);
  }
  void write(platform::LogLevel level, std::string_view message) override {
    static constexpr Operation operation{"LogHandle", "write", "log level message", OperationClass::message};
    this->template call<&T::write>(operation, level, message);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::CLManager, Crossing> final : public ObjectOf<platform::CLManager, Crossing> {
  using T = platform::CLManager;

 public:
  static constexpr ObjectKind kind = ObjectKind::manager;
  using ObjectOf<T, Crossing>::ObjectOf;

  bool tessaroShouldCreateAppPlaceholdersWithError(ErrorRef* error) override {
    static constexpr Operation operation{"CLManager", "tessaroShouldCreateAppPlaceholdersWithError",
                                         "manager -> error"};
    return this->template call<&T::tessaroShouldCreateAppPlaceholdersWithError>(operation, out(error));
  }
};

/// Taking a standing registration back is a call: it may wait for a callback.
template <template <class> class Crossing>
class ObjectOfKind<platform::RVAppInstallObserver, Crossing> final
    : public ObjectOf<platform::RVAppInstallObserver, Crossing> {
 public:
  static constexpr ObjectKind kind = ObjectKind::registration;
  using ObjectOf<platform::RVAppInstallObserver, Crossing>::ObjectOf;
  ~ObjectOfKind() override {
    static constexpr Operation operation{"RVAppInstallObserver", "release", "registration"};
    this->ownCrossing().release(operation, this);
  }
};

template <template <class> class Crossing>
class ObjectOfKind<platform::QGImageDestination, Crossing> final
    : public ObjectOf<platform::QGImageDestination, Crossing> {
  using T = platform::QGImageDestination;
  static constexpr const char* service = "QGImageDestination";

 public:
  static constexpr ObjectKind kind = ObjectKind::destination;
  using ObjectOf<T, Crossing>::ObjectOf;
  /// The buffer that the plug-in gave for the image; said once, before anything is called.
  void setData(platform::Bytes& data) { _data = &data; }

  void QGImageDestinationAddImage(const std::shared_ptr<const platform::GYImage>& image) override {
    static constexpr Operation operation{service, "QGImageDestinationAddImage", "destination image -> data"};
    this->crossing().callWith(
        operation, this,
        [](T& target, const auto& added, platform::Bytes&) { target.QGImageDestinationAddImage(added); }, image,
        out(*_data));
  }
  bool QGImageDestinationFinalize() override {
    static constexpr Operation operation{service, "QGImageDestinationFinalize", "destination -> data"};
    return this->crossing().callWith(
        operation, this, [](T& target, platform::Bytes&) { return target.QGImageDestinationFinalize(); }, out(*_data));
  }

 private:
  platform::Bytes* _data = nullptr;
};

}  // namespace record
