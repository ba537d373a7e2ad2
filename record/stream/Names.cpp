#include "record/stream/Names.h"

#include <algorithm>

namespace record {

namespace {

bool sameOwner(const std::weak_ptr<const void>& one, const std::weak_ptr<const void>& other) {
  return !one.owner_before(other) && !other.owner_before(one);
}

void putText(ItemWriter& items, const char* name, const std::optional<std::string>& text) {
  items.text(name);
  if (text)
    items.text(*text);
  else
    items.absent();
}

void putNumber(ItemWriter& items, const char* name, std::uint64_t number) {
  items.text(name);
  items.number(number);
}

void putFlag(ItemWriter& items, const char* name, bool flag) {
  items.text(name);
  items.boolean(flag);
}

std::string factsOf(const platform::TSAsset& asset) {
  ItemWriter items;
  items.dictionary(15);
  items.text("identifier");
  items.text(asset.identifier());
  items.text("dataclass");
  items.text(asset.dataclass());
  putText(items, "prettyName", asset.prettyName());
  putText(items, "assetType", asset.assetType());
  putText(items, "path", asset.path());
  putText(items, "icon", asset.icon());
  putText(items, "infoPlist", asset.infoPlist());
  putText(items, "storePlist", asset.storePlist());
  items.text("variantOptions");
  items.value(asset.variantOptions());
  items.text("storePID");
  items.signedNumber(asset.storePID());
  items.text("completedAssetParts");
  items.signedNumber(asset.completedAssetParts());
  items.text("downloadProgress");
  items.real(static_cast<double>(asset.downloadProgress()));
  items.text("installProgress");
  items.real(static_cast<double>(asset.installProgress()));
  putFlag(items, "isDownload", asset.isDownload());
  putFlag(items, "isRestore", asset.isRestore());
  return items.take();
}

void putFacts(ItemWriter& items, const platform::OBBundleProxy& bundle) {
  const auto* app = dynamic_cast<const platform::OBApplicationProxy*>(&bundle);
  const auto& progress = app ? app->installProgressSync : std::nullopt;
  items.dictionary(4 + (app ? 8u : 0u) + (progress ? 2u : 0u));
  putText(items, "bundleIdentifier", bundle.bundleIdentifier);
  putText(items, "bundleVersion", bundle.bundleVersion);
  putText(items, "bundleURL", bundle.bundleURL);
  putText(items, "bundleContainerURL", bundle.bundleContainerURL);
  if (!app) return;
  putText(items, "applicationIdentifier", app->applicationIdentifier);
  putText(items, "applicationType", app->applicationType);
  putFlag(items, "isInstalled", app->isInstalled);
  putFlag(items, "isPlaceholder", app->isPlaceholder);
  putFlag(items, "appState.isInstalled", app->appState.isInstalled);
  putFlag(items, "appState.isPlaceholder", app->appState.isPlaceholder);
  putNumber(items, "installType", app->installType);
  putNumber(items, "staticUsage", app->diskUsage.staticUsage);
  if (!progress) return;
  putNumber(items, "installState", progress->installState);
  putNumber(items, "installPhase", progress->installPhase);
}

}  // namespace

std::pair<Names::Entry*, bool> Names::entryOf(ObjectKind kind, const void* address,
                                              const std::weak_ptr<const void>& owner) {
  if (_entries.size() >= _sweptAt) sweep();
  auto [found, isNew] = _entries.try_emplace({address, kind});
  Entry& entry = found->second;
  if (!isNew && !entry.owner.expired() && sameOwner(entry.owner, owner)) return {&entry, false};
  entry = {newNumber(kind), owner};
  return {&entry, true};
}

ObjectMention Names::mention(ObjectKind kind, const void* address, const std::weak_ptr<const void>& owner) {
  auto [entry, isNew] = entryOf(kind, address, owner);
  return {kind, entry->number, isNew ? ObjectMention::isNew : std::uint8_t{0}};
}

std::optional<std::uint64_t> Names::find(ObjectKind kind, const void* address) const {
  auto found = _entries.find({address, kind});
  return found == _entries.end() ? std::nullopt : std::optional(found->second.number);
}

void Names::set(ObjectKind kind, const void* address, const std::weak_ptr<const void>& owner, std::uint64_t number) {
  _entries[{address, kind}] = {number, owner};
}

/// Forgets objects that have gone. Observers stay: they are taken away when they are going already.
void Names::sweep() {
  std::erase_if(_entries, [](const auto& entry) {
    return entry.first.kind != ObjectKind::observer && entry.second.owner.expired();
  });
  _sweptAt = std::max<std::size_t>(256, 2 * _entries.size());
}

void Names::put(ItemWriter& items, const platform::TSAssetRef& asset) {
  if (!asset) return items.absent();
  auto [entry, isNew] = entryOf(ObjectKind::asset, asset.get(), asset);
  if (isNew) named(entry->number, asset);
  _facts = factsOf(*asset);
  const bool hasFacts = _facts != entry->facts;
  const int flags = (isNew ? ObjectMention::isNew : 0) | (hasFacts ? ObjectMention::hasFacts : 0);
  items.object({ObjectKind::asset, entry->number, static_cast<std::uint8_t>(flags)});
  if (!hasFacts) return;
  items.items(_facts);
  entry->facts = _facts;
}

void Names::setFacts(const platform::TSAssetRef& asset) {
  entryOf(ObjectKind::asset, asset.get(), asset).first->facts = factsOf(*asset);
}

void Names::put(ItemWriter& items, const platform::OBBundleProxyRef& proxy) {
  if (!proxy) return items.absent();
  auto mentioned = mention(ObjectKind::proxy, proxy.get(), proxy);
  const bool isNew = mentioned.flags & ObjectMention::isNew;
  if (isNew) mentioned.flags |= ObjectMention::hasFacts;
  items.object(mentioned);
  if (isNew) putFacts(items, *proxy);
}

}  // namespace record
