#include "device/boundary/Injection.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <utility>

namespace device {

using platform::ErrorRef;

namespace {

struct Point {
  std::string_view operation;
  std::string_view service;

  friend bool operator<(const Point& one, const Point& other) {
    return std::pair(one.operation, one.service) < std::pair(other.operation, other.service);
  }
};

// Sorted by operation, then by service.
constexpr Point points[] = {
    {"CorvaneClearUninstalled", "Installer"},
    {"CorvaneLookupUninstalled", "Installer"},
    {"GYCreateDeviceAppropriateHomeScreenIconImageFromBundle", "IconRenderer"},
    {"KBBundleCreate", "IconRenderer"},
    {"KBNotificationCallback", "AppsClient"},
    {"KBNotificationCenterAddObserver", "NotificationCenter"},
    {"KBNotificationCenterRemoveObserver", "NotificationCenter"},
    {"KBURLCreateWithFileSystemPath", "IconRenderer"},
    {"PNGetFlattenedIconState", "HomeScreen"},
    {"PNSPanelloBlockableServerPort", "HomeScreen"},
    {"PNSetIconState", "HomeScreen"},
    {"QGImageDestinationAddImage", "QGImageDestination"},
    {"QGImageDestinationCreateWithData", "ImageEncoder"},
    {"QGImageDestinationFinalize", "QGImageDestination"},
    {"RVCreateUserPresentableError", "InstallCoordination"},
    {"_handleTSDStartupCompletedNotification", "AppsClient"},
    {"accountsForAssets", "AppsClient"},
    {"addObserver", "OBApplicationWorkspace"},
    {"appAssetPromiseResponsibleClientWithError", "RVAppInstallCoordinator"},
    {"appAssetPromiseWithError", "RVAppInstallCoordinator"},
    {"applicationInstallsArePrioritized", "AppsClient"},
    {"applicationInstallsDidCancel", "AppsClient"},
    {"applicationIsInstalled", "OBApplicationWorkspace"},
    {"applicationProxyForIdentifier", "OBApplicationWorkspace"},
    {"assetInstallFailed", "AppsClient"},
    {"assetInstallSucceeded", "AppsClient"},
    {"assetTransferEndedWithSuccess", "AppsClient"},
    {"assetTransferSucceeded", "AppsClient"},
    {"assetTransferUpdatedProgress", "AppsClient"},
    {"attributesOfItem", "FileSystem"},
    {"bundleID", "RVAppInstallCoordinator"},
    {"cancelAssetTransferForFailedAsset", "TSDeviceService"},
    {"cancelForReason", "RVAppInstallCoordinator"},
    {"cancelForReason", "RVPlaceholder"},
    {"cancelForReason", "RVPromise"},
    {"clearSyncData", "AppsClient"},
    {"coordinatorCanceledWithReason", "AppsClient"},
    {"coordinatorDidCompleteSuccessfully", "AppsClient"},
    {"coordinatorDidInstallPlaceholder", "AppsClient"},
    {"coordinatorForAppWithBundleID", "InstallCoordination"},
    {"coordinatorShouldPrioritize", "AppsClient"},
    {"copyItem", "FileSystem"},
    {"createDirectory", "FileSystem"},
    {"createFile", "FileSystem"},
    {"createHandle", "SystemLog"},
    {"creatorIdentifier", "RVAppInstallCoordinator"},
    {"currentSyncAnchor", "AppsClient"},
    {"dataWithPropertyList", "PropertyListSerialization"},
    {"deallocateMemory", "Process"},
    {"default", "log"},
    {"disabledAssetTypes", "AppsClient"},
    {"effectiveBoolValueForSetting", "DPProfileConnection"},
    {"enumerateBundlesOfType", "OBApplicationWorkspace"},
    {"error", "RVAppInstallCoordinator"},
    {"error", "log"},
    {"fileExists", "FileSystem"},
    {"hasAppAssetPromise", "RVAppInstallCoordinator"},
    {"hasInitialZDRAssetPromises", "RVAppInstallCoordinator"},
    {"hasInstallOptions", "RVAppInstallCoordinator"},
    {"hasPlaceholderPromise", "RVAppInstallCoordinator"},
    {"hasUserDataPromise", "RVAppInstallCoordinator"},
    {"infoDictionaryOfBundleAtPath", "Process"},
    {"initializeWithLog", "InstallTransactionLog"},
    {"installedAssetMetrics", "AppsClient"},
    {"installedAssets", "AppsClient"},
    {"isComplete", "RVPromise"},
    {"logScenario", "InstallTransactionLog"},
    {"logStep", "InstallTransactionLog"},
    {"mainBundleIdentifier", "Process"},
    {"makeAccountInfo", "TSSupport"},
    {"makeAppInstallObserver", "InstallCoordination"},
    {"makeAppPlaceholder", "InstallCoordination"},
    {"makeBackupManager", "BackupService"},
    {"makeInstallOptions", "Installer"},
    {"makePlaceholderAttributes", "InstallCoordination"},
    {"makePlaceholderAttributesWithInfoPlistDictionary", "InstallCoordination"},
    {"makePromisedOutOfBandTransfer", "InstallCoordination"},
    {"makePromisedTransferToPath", "InstallCoordination"},
    {"makePromisedTransferToPathWithoutPath", "InstallCoordination"},
    {"makeStoreMetadata", "Installer"},
    {"moveItem", "FileSystem"},
    {"notify_post", "NotificationCenter"},
    {"notify_register_check", "NotificationCenter"},
    {"notify_set_state", "NotificationCenter"},
    {"outstandingAssetTransfers", "AppsClient"},
    {"prepareForBackup", "AppsClient"},
    {"prepareForSyncWithHostAnchor", "AppsClient"},
    {"prioritizeAsset", "TSDeviceService"},
    {"prioritizeCompletion", "AppsClient"},
    {"promiseDidBeginFulfillmentWithIdentifier", "AppsClient"},
    {"propertyListWithData", "PropertyListSerialization"},
    {"readFile", "FileSystem"},
    {"reconcileRestoreOfType", "AppsClient"},
    {"reconcileSync", "AppsClient"},
    {"releaseAppInstallObserver", "InstallCoordination"},
    {"removeItem", "FileSystem"},
    {"removeObserver", "OBApplicationWorkspace"},
    {"respondsToCancelAssetTransferForFailedAsset", "TSDeviceService"},
    {"respondsToPrioritizeAsset", "TSDeviceService"},
    {"setAltDSID", "TSMutableAccountInfo"},
    {"setAppAssetPromise", "RVAppInstallCoordinator"},
    {"setAppAssetPromiseResponsibleClient", "RVAppInstallCoordinator"},
    {"setBundleVersion", "RVPlaceholderAttributes"},
    {"setComplete", "RVPromise"},
    {"setConfigurationCompleteWithError", "RVPlaceholder"},
    {"setDSID", "TSMutableAccountInfo"},
    {"setHarluneMetadata", "CVInstallOptions"},
    {"setIconPromise", "RVPlaceholder"},
    {"setInitialZDRAssetPromises", "RVAppInstallCoordinator"},
    {"setInstallOptions", "RVAppInstallCoordinator"},
    {"setInstallTargetType", "CVInstallOptions"},
    {"setLaunchProhibited", "RVPlaceholderAttributes"},
    {"setMetadata", "RVPlaceholder"},
    {"setObInstallType", "CVInstallOptions"},
    {"setObserver", "RVAppInstallCoordinator"},
    {"setPercentComplete", "RVPromise"},
    {"setPlaceholderAttributes", "RVPlaceholder"},
    {"setPlaceholderPromise", "RVAppInstallCoordinator"},
    {"setSinfData", "RVPlaceholder"},
    {"setTransferPath", "RVPromise"},
    {"setUserDataPromise", "RVAppInstallCoordinator"},
    {"setVantorID", "TSMutableAccountInfo"},
    {"step", ""},
    {"supportedDataclasses", "AppsClient"},
    {"syncEndedWithSuccess", "AppsClient"},
    {"temporaryDirectory", "Process"},
    {"tessaroShouldCreateAppPlaceholdersWithError", "CLManager"},
    {"textOfErrorNumber", "Process"},
    {"transfer", ""},
    {"uninstallAppWithBundleID", "InstallCoordination"},
    {"uninstallApplication", "OBApplicationWorkspace"},
    {"uninstallCompletion", "AppsClient"},
    {"utimes", "FileSystem"},
    {"vantorIDsForAssets", "AppsClient"},
    {"writeAtomically", "FileSystem"},
};
static_assert([] {
  for (std::size_t i = 1; i < std::size(points); ++i) {
    if (points[i].operation < points[i - 1].operation) return false;
    if (points[i].operation == points[i - 1].operation && points[i].service <= points[i - 1].service) return false;
  }
  return true;
}());

/// The classes of promises share their operations; a rule may name any of them.
std::string_view declaringClass(std::string_view service) {
  bool isPromise = service == "RVPromisedTransferToPath" || service == "RVPromisedOutOfBandTransfer";
  return isPromise ? "RVPromise" : service;
}

struct KnownAction {
  std::string_view name;
  InjectionRule::Action action;
  enum class Takes { nothing, number, app } takes;
};
constexpr KnownAction actions[] = {
    {"fail", InjectionRule::Action::fail, KnownAction::Takes::nothing},
    {"error", InjectionRule::Action::error, KnownAction::Takes::nothing},
    {"none", InjectionRule::Action::none, KnownAction::Takes::nothing},
    {"value", InjectionRule::Action::value, KnownAction::Takes::number},
    {"kill", InjectionRule::Action::kill, KnownAction::Takes::nothing},
    {"kill-after", InjectionRule::Action::killAfter, KnownAction::Takes::nothing},
    {"cancel", InjectionRule::Action::cancel, KnownAction::Takes::app},
    {"prioritize", InjectionRule::Action::prioritize, KnownAction::Takes::app},
    {"uninstall", InjectionRule::Action::uninstall, KnownAction::Takes::app},
    {"store", InjectionRule::Action::store, KnownAction::Takes::app},
};

template <class Number>
bool parseNumber(std::string_view text, Number& number) {
  auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), number);
  return failure == std::errc() && end == text.data() + text.size();
}

std::string quoted(std::string_view text) { return '"' + std::string(text) + '"'; }

/// A step belongs to no app. It is taken under guards for which a bystander would have to wait.
std::string checkStep(const InjectionRule& rule) {
  if (!isAboutSteps(rule)) return {};
  if (!rule.app.empty()) return "a step belongs to no app";
  if (!rule.target.empty()) return "nobody else can act at a step";
  bool isErrorNumber = rule.number > 0 && rule.number < 4096;
  if (rule.action == InjectionRule::Action::value && !isErrorNumber)
    return "the value of a step is the number of an error";
  return {};
}

/// Empty when all is well, otherwise what is wrong.
std::string parsePlace(std::string_view place, InjectionRule& rule) {
  if (auto at = place.rfind('@'); at != place.npos) {
    auto match = place.substr(at + 1);
    rule.onwards = match.size() > 1 && match.back() == '+';
    if (rule.onwards) match.remove_suffix(1);
    if (!parseNumber(match, rule.match) || rule.match == 0)
      return quoted(match) + " after @ is not a number from 1 upwards";
    place = place.substr(0, at);
  }
  if (auto colon = place.find(':'); colon != place.npos) {
    rule.app = place.substr(colon + 1);
    if (rule.app.empty()) return "there is no app after the colon";
    place = place.substr(0, colon);
  }
  rule.point = place;
  if (place.empty()) return "there is no point before the action";
  return isInjectionPoint(place) ? std::string() : "there is no point " + quoted(place);
}

std::string parseAction(std::string_view text, InjectionRule& rule) {
  auto equals = text.find('=');
  auto name = text.substr(0, equals);
  auto known = std::find_if(std::begin(actions), std::end(actions), [&](auto& action) { return action.name == name; });
  if (known == std::end(actions)) return "there is no action " + quoted(name);
  rule.action = known->action;
  auto parameter = equals == text.npos ? std::string_view() : text.substr(equals + 1);
  switch (known->takes) {
    case KnownAction::Takes::nothing:
      return equals == text.npos ? std::string() : "the action " + quoted(name) + " takes nothing after it";
    case KnownAction::Takes::number:
      if (parseNumber(parameter, rule.number)) return {};
      return "the action " + quoted(name) + " takes a number, not " + quoted(parameter);
    case KnownAction::Takes::app:
      rule.target = parameter;
      return parameter.empty() ? "the action " + quoted(name) + " takes an app" : std::string();
  }
  return {};
}

}  // namespace

std::vector<std::string> injectionPoints() {
  std::vector<std::string> names;
  for (std::size_t i = 0; i < std::size(points); ++i) {
    bool isShared = (i > 0 && points[i - 1].operation == points[i].operation) ||
                    (i + 1 < std::size(points) && points[i + 1].operation == points[i].operation);
    std::string front = isShared && !points[i].service.empty() ? std::string(points[i].service) + '.' : "";
    names.push_back(front + std::string(points[i].operation));
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<std::string> injectionActions() {
  std::vector<std::string> names;
  for (const auto& action : actions)
    names.push_back(std::string(action.name) + (action.takes == KnownAction::Takes::nothing ? "" : "="));
  return names;
}

bool isInjectionPoint(std::string_view point) {
  auto dot = point.find('.');
  std::string_view operation = dot == point.npos ? point : point.substr(dot + 1);
  auto first = std::lower_bound(std::begin(points), std::end(points), Point{operation, {}});
  if (first == std::end(points) || first->operation != operation) return false;
  if (dot == point.npos) return true;
  std::string_view service = declaringClass(point.substr(0, dot));
  return !service.empty() && std::binary_search(first, std::end(points), Point{operation, service});
}

bool isAboutSteps(const InjectionRule& rule) { return rule.point == "step"; }

bool InjectionRule::matches(std::string_view service, std::string_view operation, std::string_view ofApp) const {
  if (!app.empty() && app != ofApp) return false;
  std::string_view rest = point;
  if (rest.size() < operation.size() || rest.substr(rest.size() - operation.size()) != operation) return false;
  rest.remove_suffix(operation.size());
  // The level of a message is not an operation: the accessor `error` does not stand for every error message.
  if (rest.empty()) return service != "log";
  if (rest.back() != '.') return false;
  rest.remove_suffix(1);
  if (rest == "RVPromise") return declaringClass(service) == rest;
  return rest == service;
}

std::optional<InjectionRule> InjectionRule::parse(std::string_view text, ErrorRef* error) {
  platform::setError(error, nullptr);
  InjectionRule rule;
  rule.text = text;
  std::string problem;
  auto equals = text.find('=');
  if (equals == text.npos)
    problem = "expected POINT[:APP][@N[+]]=ACTION";
  else if (problem = parsePlace(text.substr(0, equals), rule); problem.empty())
    problem = parseAction(text.substr(equals + 1), rule);
  if (problem.empty()) problem = checkStep(rule);
  if (problem.empty()) return rule;
  platform::setError(error, platform::makeError("Injection", 2, "injection rule " + quoted(text) + ": " + problem));
  return std::nullopt;
}

}  // namespace device
