#include "core/AppsClient.h"
#include "core/Say.h"
#include "platform/OBNumbers.h"

namespace appsync {

using namespace platform;

static void forEachPlaceholder(OBApplicationWorkspace& workspace, std::uint64_t type,
                               const std::function<void(const OBApplicationProxy&, bool&)>& block) {
  workspace.enumerateBundlesOfType(type, [&](const OBBundleProxyRef& bundle, bool& stop) {
    auto* proxy = dynamic_cast<const OBApplicationProxy*>(bundle.get());
    if (proxy && proxy->appState.isPlaceholder) block(*proxy, stop);
  });
}

void AppsClient::_enumeratePlaceholdersWithBlock(const PlaceholderBlock& block) {
  forEachPlaceholder(_platform.workspace, bundleType::every, block);
}

StringSet AppsClient::_getSystemAppPlaceholders() {
  StringSet placeholders;
  forEachPlaceholder(_platform.workspace, bundleType::systemBundles, [&](const OBApplicationProxy& proxy, bool&) {
    if (proxy.bundleIdentifier) placeholders.insert(*proxy.bundleIdentifier);
  });
  say(_platform, "SystemAppPlaceholders %{public}@", placeholders);
  return placeholders;
}

}  // namespace appsync
