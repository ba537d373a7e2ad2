#include "device/boundary/ObjectFacts.h"

#include <optional>
#include <string>

namespace device {

using platform::Value;

namespace {

void setText(platform::Dictionary& facts, const char* name, const std::optional<std::string>& text) {
  if (text) facts.set(name, *text);
}

}  // namespace

Value factsOf(const platform::TSAsset& asset) {
  Value value = Value::makeDictionary();
  auto& facts = *value.dictionary();
  facts.set("identifier", asset.identifier());
  facts.set("dataclass", asset.dataclass());
  setText(facts, "prettyName", asset.prettyName());
  setText(facts, "assetType", asset.assetType());
  setText(facts, "path", asset.path());
  facts.set("isDownload", asset.isDownload());
  facts.set("isRestore", asset.isRestore());
  setText(facts, "icon", asset.icon());
  setText(facts, "infoPlist", asset.infoPlist());
  setText(facts, "storePlist", asset.storePlist());
  facts.set("storePID", asset.storePID());
  if (!asset.variantOptions().isAbsent()) facts.set("variantOptions", asset.variantOptions());
  facts.set("completedAssetParts", asset.completedAssetParts());
  facts.set("downloadProgress", static_cast<double>(asset.downloadProgress()));
  facts.set("installProgress", static_cast<double>(asset.installProgress()));
  return value;
}

Value factsOf(const platform::OBBundleProxy& bundle) {
  Value value = Value::makeDictionary();
  auto& facts = *value.dictionary();
  setText(facts, "bundleIdentifier", bundle.bundleIdentifier);
  setText(facts, "bundleVersion", bundle.bundleVersion);
  setText(facts, "bundleURL", bundle.bundleURL);
  setText(facts, "bundleContainerURL", bundle.bundleContainerURL);
  const auto* app = dynamic_cast<const platform::OBApplicationProxy*>(&bundle);
  if (!app) return value;
  setText(facts, "applicationIdentifier", app->applicationIdentifier);
  setText(facts, "applicationType", app->applicationType);
  facts.set("isInstalled", app->isInstalled);
  facts.set("isPlaceholder", app->isPlaceholder);
  facts.set("appState.isPlaceholder", app->appState.isPlaceholder);
  facts.set("installType", app->installType);
  if (const auto& progress = app->installProgressSync) {
    facts.set("installState", progress->installState);
    facts.set("installPhase", progress->installPhase);
  }
  facts.set("staticUsage", app->diskUsage.staticUsage);
  return value;
}

}  // namespace device
