#include "device/records/RecordCodec.h"

#include <string_view>

#include "platform/TextTable.h"

namespace device {

namespace {

using platform::Dictionary;
using platform::Value;

void setText(Dictionary& entries, std::string_view key, const std::optional<std::string>& text) {
  if (text) entries.set(key, *text);
}
void setFlag(Dictionary& entries, std::string_view key, bool flag) {
  if (flag) entries.set(key, true);
}
void setNumber(Dictionary& entries, std::string_view key, std::uint64_t number) {
  if (number) entries.set(key, number);
}

std::optional<std::string> optionalText(const Dictionary& entries, std::string_view key) {
  auto text = entries[key].string();
  if (!text) return std::nullopt;
  return std::string(*text);
}
std::string text(const Dictionary& entries, std::string_view key) {
  return std::string(entries[key].string().value_or(""));
}
std::uint64_t number(const Dictionary& entries, std::string_view key) {
  return entries[key].unsignedInteger().value_or(0);
}
bool flag(const Dictionary& entries, std::string_view key) { return entries[key].boolean().value_or(false); }

Value valueOfPromise(const PromiseRecord& promise) REQUIRES(recordsGuard) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("name", promise.name);
  setNumber(entries, "identifier", promise.identifier);
  setNumber(entries, "client", promise.client);
  setNumber(entries, "diskSpaceNeeded", promise.diskSpaceNeeded);
  setText(entries, "path", promise.path);
  entries.set("fraction", promise.fraction);
  setFlag(entries, "complete", promise.complete);
  return value;
}

PromiseRef promiseOfValue(const Value& value) REQUIRES(recordsGuard) {
  const auto* entries = value.dictionary();
  if (!entries) return nullptr;
  auto promise = std::make_shared<PromiseRecord>();
  promise->name = text(*entries, "name");
  promise->identifier = number(*entries, "identifier");
  promise->client = number(*entries, "client");
  promise->diskSpaceNeeded = number(*entries, "diskSpaceNeeded");
  promise->path = optionalText(*entries, "path");
  promise->fraction = (*entries)["fraction"].real().value_or(0);
  promise->complete = flag(*entries, "complete");
  return promise;
}

Value valueOfOptions(const InstallOptionsRecord& options) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("metadata", options.metadata);
  setNumber(entries, "installType", options.installType);
  setNumber(entries, "installTargetType", options.installTargetType);
  return value;
}

std::optional<InstallOptionsRecord> optionsOfValue(const Value& value) {
  const auto* entries = value.dictionary();
  if (!entries) return std::nullopt;
  return InstallOptionsRecord{(*entries)["metadata"], number(*entries, "installType"),
                              number(*entries, "installTargetType")};
}

Value valueOfPlaceholder(const PlaceholderRecord& placeholder) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("name", placeholder.name);
  setNumber(entries, "installType", placeholder.installType);
  setNumber(entries, "client", placeholder.client);
  setFlag(entries, "configured", placeholder.configured);
  entries.set("manifest", placeholder.manifest);
  setText(entries, "version", placeholder.version);
  setFlag(entries, "launchProhibited", placeholder.launchProhibited);
  entries.set("metadata", placeholder.metadata);
  if (!placeholder.rights.empty()) entries.set("rights", Value::makeData(placeholder.rights));
  setText(entries, "iconPath", placeholder.iconPath);
  return value;
}

std::optional<PlaceholderRecord> placeholderOfValue(const std::string& app, const Value& value) {
  const auto* entries = value.dictionary();
  if (!entries) return std::nullopt;
  PlaceholderRecord placeholder;
  placeholder.app = app;
  placeholder.name = text(*entries, "name");
  placeholder.installType = number(*entries, "installType");
  placeholder.client = number(*entries, "client");
  placeholder.configured = flag(*entries, "configured");
  placeholder.manifest = (*entries)["manifest"];
  placeholder.version = optionalText(*entries, "version");
  placeholder.launchProhibited = flag(*entries, "launchProhibited");
  placeholder.metadata = (*entries)["metadata"];
  placeholder.rights = platform::Bytes((*entries)["rights"].data().value_or(""));
  placeholder.iconPath = optionalText(*entries, "iconPath");
  return placeholder;
}

/// Nothing if any element is not an identifier.
std::optional<std::vector<std::string>> identifiers(const platform::Array& array, platform::TextSet& seen) {
  std::vector<std::string> result;
  result.reserve(array.size());
  for (const auto& element : array) {
    auto id = element.string();
    if (!id || id->empty()) return std::nullopt;
    if (seen.emplace(*id).second) result.emplace_back(*id);
  }
  return result;
}

}  // namespace

Value valueOfApp(const AppRecord& app) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("name", app.name);
  setText(entries, "version", app.version);
  entries.set("container", app.container);
  entries.set("bundle", app.bundle);
  entries.set("applicationType", app.applicationType);
  setFlag(entries, "isPlaceholder", app.isPlaceholder);
  setFlag(entries, "systemBundle", app.systemBundle);
  setFlag(entries, "launchProhibited", app.launchProhibited);
  setNumber(entries, "installType", app.installType);
  setNumber(entries, "staticUsage", app.staticUsage);
  setNumber(entries, "placeholderSum", app.filesSum);
  setNumber(entries, "homeOrder", app.homeOrder);
  if (app.progress) {
    auto progress = Value::makeDictionary();
    progress.dictionary()->set("state", app.progress->state);
    progress.dictionary()->set("phase", app.progress->phase);
    setFlag(*progress.dictionary(), "paused", app.progress->paused);
    progress.dictionary()->set("fraction", app.progress->fraction);
    entries.set("progress", progress);
  }
  return value;
}

std::optional<AppRecord> appOfValue(const std::string& id, const Value& value) {
  const auto* entries = value.dictionary();
  if (!entries || text(*entries, "container").empty()) return std::nullopt;
  AppRecord app;
  app.id = id;
  app.name = text(*entries, "name");
  app.version = optionalText(*entries, "version");
  app.container = text(*entries, "container");
  app.bundle = text(*entries, "bundle");
  app.applicationType = text(*entries, "applicationType");
  app.isPlaceholder = flag(*entries, "isPlaceholder");
  app.systemBundle = flag(*entries, "systemBundle");
  app.launchProhibited = flag(*entries, "launchProhibited");
  app.installType = number(*entries, "installType");
  app.staticUsage = number(*entries, "staticUsage");
  app.filesSum = number(*entries, "placeholderSum");
  app.homeOrder = number(*entries, "homeOrder");
  if (const auto* progress = (*entries)["progress"].dictionary()) {
    app.progress = InstallProgressRecord{number(*progress, "state"), number(*progress, "phase"),
                                         flag(*progress, "paused"), (*progress)["fraction"].real().value_or(0)};
  }
  return app;
}

Value valueOfCoordinator(const CoordinatorRecord& coordinator) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("kind", static_cast<std::uint64_t>(coordinator.kind));
  entries.set("creator", coordinator.creator);
  setNumber(entries, "responsibleClient", coordinator.responsibleClient);
  if (coordinator.options) entries.set("options", valueOfOptions(*coordinator.options));
  if (coordinator.placeholder) entries.set("placeholder", valueOfPlaceholder(*coordinator.placeholder));
  if (coordinator.appAsset) entries.set("appAsset", valueOfPromise(*coordinator.appAsset));
  if (coordinator.userData) entries.set("userData", valueOfPromise(*coordinator.userData));
  if (coordinator.hasInitialZDRAssetPromises) {
    auto promises = Value::makeArray();
    for (const auto& promise : coordinator.initialZDRAssetPromises) promises.array()->append(valueOfPromise(*promise));
    entries.set("initialZDRAssetPromises", promises);
  }
  return value;
}

std::optional<CoordinatorRecord> coordinatorOfValue(const std::string& app, const Value& value) {
  using Kind = platform::RVCoordinatorKind;
  const auto* entries = value.dictionary();
  if (!entries) return std::nullopt;
  auto kind = number(*entries, "kind");
  if (kind == 0 || kind > static_cast<std::uint64_t>(Kind::RVRestoringDemotedAppInstallCoordinator))
    return std::nullopt;
  CoordinatorRecord coordinator;
  coordinator.app = app;
  coordinator.kind = static_cast<Kind>(kind);
  coordinator.creator = number(*entries, "creator");
  coordinator.responsibleClient = number(*entries, "responsibleClient");
  coordinator.options = optionsOfValue((*entries)["options"]);
  coordinator.placeholder = placeholderOfValue(app, (*entries)["placeholder"]);
  coordinator.appAsset = promiseOfValue((*entries)["appAsset"]);
  coordinator.userData = promiseOfValue((*entries)["userData"]);
  if (const auto* promises = (*entries)["initialZDRAssetPromises"].array()) {
    coordinator.hasInitialZDRAssetPromises = true;
    for (const auto& each : *promises) {
      if (auto promise = promiseOfValue(each)) coordinator.initialZDRAssetPromises.push_back(std::move(promise));
    }
  }
  return coordinator;
}

Value valueOfOutcome(const OutcomeRecord& outcome) {
  auto value = Value::makeDictionary();
  value.dictionary()->set("outcome", nameOfOutcome(outcome.outcome));
  value.dictionary()->set("reason", outcome.reason);
  setNumber(*value.dictionary(), "homeOrder", outcome.homeOrder);
  return value;
}

std::optional<OutcomeRecord> outcomeOfValue(const Value& value) {
  const auto* entries = value.dictionary();
  if (!entries) return std::nullopt;
  auto outcome = outcomeOfName(text(*entries, "outcome"));
  if (!outcome) return std::nullopt;
  return OutcomeRecord{*outcome, text(*entries, "reason"), number(*entries, "homeOrder")};
}

Value valueOfLayout(const HomeLayout& layout) {
  auto value = Value::makeArray();
  for (const auto& page : layout.pages) {
    auto identifiers = Value::makeArray();
    auto& target = layout.isPaged ? identifiers : value;
    for (const auto& id : page) target.array()->append(id);
    if (layout.isPaged) value.array()->append(identifiers);
  }
  return value;
}

std::optional<HomeLayout> layoutOfValue(const Value& value) {
  const auto* elements = value.array();
  if (!elements) return std::nullopt;
  HomeLayout layout;
  platform::TextSet seen;
  layout.isPaged = !elements->empty() && (*elements)[0].array();
  if (!layout.isPaged) {
    auto page = identifiers(*elements, seen);
    if (!page) return std::nullopt;
    layout.pages.push_back(std::move(*page));
    return layout;
  }
  for (const auto& element : *elements) {
    if (!element.array()) return std::nullopt;
    auto page = identifiers(*element.array(), seen);
    if (!page) return std::nullopt;
    layout.pages.push_back(std::move(*page));
  }
  return layout;
}

}  // namespace device
