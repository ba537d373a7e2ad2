#pragma once

#include <type_traits>

namespace platform {
class CLManager;
class CVInstallOptions;
class CVStoreMetadata;
class GYImage;
class KBBundle;
class KBURL;
class LogHandle;
class QGImageDestination;
class RVAppInstallCoordinator;
class RVAppInstallObserver;
class RVAppInstallObserverDelegate;
class RVPlaceholder;
class RVPlaceholderAttributes;
class RVPromise;
class RVPromisedOutOfBandTransfer;
class RVPromisedTransferToPath;
class TSAsset;
class TSMutableAccountInfo;
class OBApplicationWorkspaceObserverProtocol;
struct OBApplicationProxy;
struct OBBundleProxy;
}  // namespace platform

namespace device {

/// What an object is called in the call journal, in front of its number.
constexpr const char* kindOfObject(const platform::CLManager*) { return "manager"; }
constexpr const char* kindOfObject(const platform::CVInstallOptions*) { return "options"; }
constexpr const char* kindOfObject(const platform::CVStoreMetadata*) { return "metadata"; }
constexpr const char* kindOfObject(const platform::GYImage*) { return "image"; }
constexpr const char* kindOfObject(const platform::KBBundle*) { return "bundle"; }
constexpr const char* kindOfObject(const platform::KBURL*) { return "url"; }
constexpr const char* kindOfObject(const platform::LogHandle*) { return "log"; }
constexpr const char* kindOfObject(const platform::QGImageDestination*) { return "destination"; }
constexpr const char* kindOfObject(const platform::RVAppInstallCoordinator*) { return "coordinator"; }
constexpr const char* kindOfObject(const platform::RVAppInstallObserver*) { return "registration"; }
constexpr const char* kindOfObject(const platform::RVAppInstallObserverDelegate*) { return "observer"; }
constexpr const char* kindOfObject(const platform::RVPlaceholder*) { return "placeholder"; }
constexpr const char* kindOfObject(const platform::RVPlaceholderAttributes*) { return "attributes"; }
constexpr const char* kindOfObject(const platform::RVPromise*) { return "promise"; }
constexpr const char* kindOfObject(const platform::RVPromisedOutOfBandTransfer*) { return "promise"; }
constexpr const char* kindOfObject(const platform::RVPromisedTransferToPath*) { return "promise"; }
constexpr const char* kindOfObject(const platform::TSAsset*) { return "asset"; }
constexpr const char* kindOfObject(const platform::TSMutableAccountInfo*) { return "account"; }
constexpr const char* kindOfObject(const platform::OBApplicationWorkspaceObserverProtocol*) { return "observer"; }
constexpr const char* kindOfObject(const platform::OBApplicationProxy*) { return "proxy"; }
constexpr const char* kindOfObject(const platform::OBBundleProxy*) { return "proxy"; }

/// Where the object begins, whichever of its base classes it is seen as: the journal knows objects by this address.
template <class T>
const void* wholeObject(const T* object) {
  if constexpr (std::is_polymorphic_v<T>) {
    return dynamic_cast<const void*>(object);
  } else {
    return object;
  }
}

template <class T>
concept HasObjectKind = requires(const T* object) {
  kindOfObject(object);
};

}  // namespace device
