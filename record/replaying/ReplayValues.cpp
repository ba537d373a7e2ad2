#include <algorithm>
#include <cstring>
#include <utility>

#include "record/replaying/ReplayCrossing.h"

namespace record {

using platform::Value;

namespace {

std::optional<std::string> textOf(const Value& facts, const char* name) {
  auto text = (*facts.dictionary())[name].string();
  return text ? std::optional<std::string>(*text) : std::nullopt;
}

std::uint64_t numberOf(const Value& facts, const char* name) {
  return (*facts.dictionary())[name].unsignedInteger().value_or(0);
}

std::int64_t signedOf(const Value& facts, const char* name) {
  return (*facts.dictionary())[name].integer().value_or(0);
}

float fractionOf(const Value& facts, const char* name) {
  return static_cast<float>((*facts.dictionary())[name].real().value_or(0));
}

bool flagOf(const Value& facts, const char* name) { return (*facts.dictionary())[name].boolValue(); }

void setFacts(platform::TSAsset& asset, const Value& facts) {
  asset.setAssetType(textOf(facts, "assetType"));
  asset.setPath(textOf(facts, "path"));
  asset.setIcon(textOf(facts, "icon"));
  asset.setInfoPlist(textOf(facts, "infoPlist"));
  asset.setStorePlist(textOf(facts, "storePlist"));
  asset.setVariantOptions((*facts.dictionary())["variantOptions"]);
  asset.setStorePID(signedOf(facts, "storePID"));
  asset.setCompletedAssetParts(signedOf(facts, "completedAssetParts"));
  asset.setDownloadProgress(fractionOf(facts, "downloadProgress"));
  asset.setInstallProgress(fractionOf(facts, "installProgress"));
  asset.setIsDownload(flagOf(facts, "isDownload"));
  asset.setIsRestore(flagOf(facts, "isRestore"));
}

void setFacts(platform::OBBundleProxy& bundle, const Value& facts) {
  bundle.bundleIdentifier = textOf(facts, "bundleIdentifier");
  bundle.bundleVersion = textOf(facts, "bundleVersion");
  bundle.bundleURL = textOf(facts, "bundleURL");
  bundle.bundleContainerURL = textOf(facts, "bundleContainerURL");
}

void setFacts(platform::OBApplicationProxy& app, const Value& facts) {
  setFacts(static_cast<platform::OBBundleProxy&>(app), facts);
  app.applicationIdentifier = textOf(facts, "applicationIdentifier");
  app.applicationType = textOf(facts, "applicationType");
  app.isInstalled = flagOf(facts, "isInstalled");
  app.isPlaceholder = flagOf(facts, "isPlaceholder");
  app.appState = {flagOf(facts, "appState.isInstalled"), flagOf(facts, "appState.isPlaceholder")};
  app.installType = numberOf(facts, "installType");
  app.diskUsage.staticUsage = numberOf(facts, "staticUsage");
  if (facts.dictionary()->contains("installState"))
    app.installProgressSync = {numberOf(facts, "installState"), numberOf(facts, "installPhase")};
}

Value factsOf(ItemReader& items, const ObjectMention& mention) {
  if (!(mention.flags & ObjectMention::hasFacts)) return {};
  Value facts = items.value();
  if (!facts.dictionary()) throw RecordingError("an object has facts without names");
  return facts;
}

void putObserver(ItemWriter& items, std::uint64_t number, bool isNew) {
  items.object({ObjectKind::observer, number, isNew ? ObjectMention::isNew : std::uint8_t{0}});
}

template <class T>
std::optional<std::uint64_t> putObserver(Replayer& replayer, ItemWriter& items, const std::weak_ptr<T>& observer) {
  const auto alive = observer.lock();
  if (!alive) {
    items.absent();
    return std::nullopt;
  }
  const auto mention = replayer.mention(ObjectKind::observer, alive.get(), alive);
  items.object(mention);
  return mention.number;
}

template <class Signature>
bool putCallback(Replayer& replayer, ItemWriter& items, Callback<Signature>& callback) {
  if (!callback.function) {
    items.absent();
    return false;
  }
  callback.number = replayer.newNumber(ObjectKind::callback);
  items.object({ObjectKind::callback, callback.number, ObjectMention::isNew});
  return true;
}

}  // namespace

void putGiven(Replayer& replayer, ItemWriter& items,
              const std::weak_ptr<platform::RVAppInstallObserverDelegate>& observer) {
  if (auto number = putObserver(replayer, items, observer)) replayer.observed(*number).delegate = observer;
}

void putGiven(Replayer& replayer, ItemWriter& items,
              const std::weak_ptr<platform::OBApplicationWorkspaceObserverProtocol>& observer) {
  if (auto number = putObserver(replayer, items, observer)) replayer.observed(*number).workspace = observer;
}

void putGiven(Replayer& replayer, ItemWriter& items, const platform::OBApplicationWorkspaceObserverProtocol* observer) {
  if (auto number = replayer.find(ObjectKind::observer, observer))
    putObserver(items, *number, false);
  else
    items.absent();
}

void putGiven(Replayer& replayer, ItemWriter& items, Callback<void(ErrorRef)>& callback) {
  if (putCallback(replayer, items, callback)) replayer.completions()[callback.number] = std::move(callback.function);
}

void putGiven(Replayer& replayer, ItemWriter& items,
              Callback<void(const platform::OBBundleProxyRef&, bool&)>& callback) {
  // It is there as long as the call that it is handed to.
  if (putCallback(replayer, items, callback)) replayer.blocks()[callback.number] = &callback.function;
}

void putGiven(Replayer& replayer, ItemWriter& items, const ReturnedBuffer& returned) {
  auto& buffers = replayer.buffers();
  auto found = std::find_if(buffers.begin(), buffers.end(),
                            [&](const auto& entry) { return entry.second->data() == returned.buffer; });
  if (found == buffers.end()) {
    items.absent();
  } else {
    items.object({ObjectKind::buffer, found->first, 0});
    buffers.erase(found);
  }
  items.number(returned.length);
}

void getOut(Replayer& replayer, ItemReader& items, const LentBuffer& lent) {
  *lent.buffer = nullptr;
  if (items.takeAbsent()) return;
  const auto mention = items.object();
  if (!(mention.flags & ObjectMention::hasFacts)) throw RecordingError("a buffer has no content");
  auto& buffer = replayer.buffers()[mention.number];
  buffer = std::make_unique<std::string>(items.data());
  *lent.buffer = buffer->data();
  *lent.length = buffer->size();
}

ErrorRef Read<ErrorRef>::from(Replayer& replayer, ItemReader& items) {
  if (items.takeAbsent()) return nullptr;
  items.error();
  std::string domain(items.text());
  const std::int64_t code = items.signedNumber();
  std::string description(items.text());
  auto underlying = from(replayer, items);
  return platform::makeError(std::move(domain), code, std::move(description), std::move(underlying));
}

platform::FileAttributes Read<platform::FileAttributes>::from(Replayer&, ItemReader& items) {
  const Value facts = items.value();
  if (!facts.dictionary()) throw RecordingError("a file's attributes are none");
  return {flagOf(facts, "isDirectory"), numberOf(facts, "size")};
}

platform::TSAssetRef Read<platform::TSAssetRef>::from(Replayer& replayer, ItemReader& items) {
  if (items.takeAbsent()) return nullptr;
  const auto mention = items.object();
  const Value facts = factsOf(items, mention);
  auto& known = replayer.known(mention.number);
  if (!known.object) {
    if (!facts.dictionary()) throw RecordingError("an asset is not known");
    auto made = platform::TSAsset::downloadAssetWithIdentifier(
        textOf(facts, "identifier").value_or(""), textOf(facts, "dataclass").value_or(""), textOf(facts, "prettyName"));
    replayer.set(ObjectKind::asset, made.get(), made, mention.number);
    known = {typeid(platform::TSAsset), made};
  }
  if (known.type != typeid(platform::TSAsset)) throw RecordingError("an object changes what it is");
  auto asset = std::static_pointer_cast<platform::TSAsset>(known.object);
  if (facts.dictionary()) setFacts(*asset, facts);
  // Also of one that has just become known to the other side.
  if (facts.dictionary()) replayer.setFacts(asset);
  return asset;
}

namespace {

/// Null when none comes.
const Replayer::Known* proxyIn(Replayer& replayer, ItemReader& items) {
  if (items.takeAbsent()) return nullptr;
  const auto mention = items.object();
  auto& known = replayer.known(mention.number);
  if (!(mention.flags & ObjectMention::hasFacts)) {
    if (!known.object) throw RecordingError("a proxy is not known");
    return &known;
  }
  const Value facts = factsOf(items, mention);
  if (known.object) return &known;
  if (facts.dictionary()->contains("isInstalled")) {
    auto app = std::make_shared<platform::OBApplicationProxy>();
    setFacts(*app, facts);
    known = {typeid(platform::OBApplicationProxy), app};
  } else {
    auto bundle = std::make_shared<platform::OBBundleProxy>();
    setFacts(*bundle, facts);
    known = {typeid(platform::OBBundleProxy), bundle};
  }
  replayer.set(ObjectKind::proxy, known.object.get(), known.object, mention.number);
  return &known;
}

}  // namespace

platform::OBBundleProxyRef Read<platform::OBBundleProxyRef>::from(Replayer& replayer, ItemReader& items) {
  const auto* known = proxyIn(replayer, items);
  if (!known) return nullptr;
  if (known->type == typeid(platform::OBApplicationProxy))
    return std::static_pointer_cast<const platform::OBApplicationProxy>(known->object);
  if (known->type != typeid(platform::OBBundleProxy)) throw RecordingError("an object changes what it is");
  return std::static_pointer_cast<const platform::OBBundleProxy>(known->object);
}

platform::OBApplicationProxyRef Read<platform::OBApplicationProxyRef>::from(Replayer& replayer, ItemReader& items) {
  const auto* known = proxyIn(replayer, items);
  if (!known) return nullptr;
  if (known->type == typeid(platform::OBBundleProxy)) throw RecordingError("a proxy is not an app's");
  if (known->type != typeid(platform::OBApplicationProxy)) throw RecordingError("an object changes what it is");
  return std::static_pointer_cast<const platform::OBApplicationProxy>(known->object);
}

namespace {

struct MadeProxies final : LargeText::Made {
  Proxies proxies;
};

platform::OBApplicationProxyRef proxyOf(Replayer& replayer, std::string_view element) {
  ItemReader items(element);
  return get<platform::OBApplicationProxyRef>(replayer, items);
}

/// What was made of the list before becomes what is made of this one; nobody but the list before may have it.
void edit(Replayer& replayer, Proxies& proxies, const LargeText& list) {
  auto at = proxies.begin();
  for (const auto& each : list.edits()) {
    at += static_cast<std::ptrdiff_t>(each.keep);
    const std::size_t replaced = std::min(each.drop, each.insert);
    std::size_t number = static_cast<std::size_t>(at - proxies.begin());
    for (std::size_t left = replaced; left > 0; --left) *at++ = proxyOf(replayer, list.element(number++));
    at = proxies.erase(at, at + static_cast<std::ptrdiff_t>(each.drop - replaced));
    for (std::size_t left = each.insert - replaced; left > 0; --left)
      at = proxies.insert(at, proxyOf(replayer, list.element(number++))) + 1;
  }
}

std::shared_ptr<const MadeProxies> madeProxies(Replayer& replayer, const LargeText& list) {
  if (auto known = std::dynamic_pointer_cast<const MadeProxies>(list.made())) return known;
  auto made = std::make_shared<MadeProxies>();
  const auto* before = list.before();
  auto old = before ? std::dynamic_pointer_cast<const MadeProxies>(before->made()) : nullptr;
  if (old) {
    before->setMade(nullptr);
    if (old.use_count() == 1)
      made = std::const_pointer_cast<MadeProxies>(std::move(old));
    else
      made->proxies = old->proxies;
    edit(replayer, made->proxies, list);
  } else {
    for (std::size_t at = 0; at < list.elementCount(); ++at)
      made->proxies.push_back(proxyOf(replayer, list.element(at)));
  }
  list.setMade(made);
  return made;
}

}  // namespace

std::shared_ptr<const Proxies> proxiesOf(Replayer& replayer, ItemReader& items) {
  const auto* list = items.nextLarge();
  if (list && list->splitIntoElements()) {
    items.skip();
    auto made = madeProxies(replayer, *list);
    return {made, &made->proxies};
  }
  ItemReader inside{{}};
  ItemReader& reader = items.unpacked(inside);
  auto proxies = std::make_shared<Proxies>();
  for (std::size_t count = reader.list(); count > 0; --count)
    proxies->push_back(get<platform::OBApplicationProxyRef>(replayer, reader));
  return proxies;
}

platform::TSProgressCallback Read<platform::TSProgressCallback>::from(Replayer& replayer, ItemReader& items) {
  if (items.takeAbsent()) return nullptr;
  const auto mention = items.object();
  return [&replayer, mention](double fraction) {
    platform::Mutex::Lock lock(replayer.mutex);
    ItemWriter arguments;
    arguments.object({ObjectKind::callback, mention.number, 0});
    arguments.real(fraction);
    replayer.tell(inbound::progress, arguments);
  };
}

template <>
void ReplayCrossing<platform::NotificationCenter>::addObserver(
    const Operation& operation, const std::weak_ptr<void>& observer, platform::KBNotificationCallback callback,
    std::string_view name, const void*, platform::KBNotificationSuspensionBehavior suspension) const {
  platform::Mutex::Lock lock(_replayer.mutex);
  ItemWriter items;
  if (auto number = putObserver(_replayer, items, observer)) {
    auto& observed = _replayer.observed(*number);
    observed.notified = observer;
    observed.callback = callback;
  }
  put(items, _replayer, name);
  put(items, _replayer, suspension);
  _replayer.tell(operation, items);
}

template <>
void ReplayCrossing<platform::NotificationCenter>::removeObserver(const Operation& operation, const void* observer,
                                                                  std::string_view name) const {
  platform::Mutex::Lock lock(_replayer.mutex);
  ItemWriter items;
  if (auto number = _replayer.find(ObjectKind::observer, observer))
    putObserver(items, *number, false);
  else
    items.absent();
  put(items, _replayer, name);
  _replayer.tell(operation, items);
}

}  // namespace record
