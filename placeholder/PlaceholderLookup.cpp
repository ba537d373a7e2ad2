#include "core/AppsClient.h"
#include "core/Say.h"

namespace appsync {

using namespace platform;

constexpr std::uint64_t everyBundle = 0;
constexpr std::uint64_t systemBundles = 7;

static void forEachPlaceholder(OBApplicationWorkspace& workspace, std::uint64_t bundleType,
                               const std::function<void(const OBApplicationProxy&, bool&)>& block) {
  workspace.enumerateBundlesOfType(bundleType, [&](const OBBundleProxyRef& bundle, bool& stop) {
    auto* proxy = dynamic_cast<const OBApplicationProxy*>(bundle.get());
    if (proxy && proxy->appState.isPlaceholder) block(*proxy, stop);
  });
}

void AppsClient::_enumeratePlaceholdersWithBlock(const PlaceholderBlock& block) {
  forEachPlaceholder(_platform.workspace, everyBundle, block);
}

StringSet AppsClient::_getSystemAppPlaceholders() {
  StringSet placeholders;
  forEachPlaceholder(_platform.workspace, systemBundles, [&](const OBApplicationProxy& proxy, bool&) {
    if (proxy.bundleIdentifier) placeholders.insert(*proxy.bundleIdentifier);
  });
  say(_platform, "SystemAppPlaceholders %{public}@", placeholders);
  return placeholders;
}

}  // namespace appsync
