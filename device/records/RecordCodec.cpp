#include "device/records/RecordCodec.h"

#include <string_view>

#include "platform/TextTable.h"

namespace device {

namespace {

using platform::Dictionary;
using platform::Value;

/// Writes the fields that it is shown into a dictionary. Absent values, empty bytes, false and 0 are left out, except
/// numbers that are `always` written.
class Writer {
 public:
  template <class Record>
  using Of = const Record;

  Writer() : written(Value::makeDictionary()), entries(*written.dictionary()) {}
  explicit Writer(Dictionary& entries) : entries(entries) {}

  void text(std::string_view key, const std::string& text) { entries.set(key, text); }
  void text(std::string_view key, const std::optional<std::string>& text) {
    if (text) entries.set(key, *text);
  }
  void flag(std::string_view key, bool flag) {
    if (flag) entries.set(key, true);
  }
  void number(std::string_view key, std::uint64_t number) {
    if (number) entries.set(key, number);
  }
  void always(std::string_view key, std::uint64_t number) { entries.set(key, number); }
  void real(std::string_view key, double number) { entries.set(key, number); }
  void value(std::string_view key, const Value& value) { entries.set(key, value); }
  void bytes(std::string_view key, const platform::Bytes& bytes) {
    if (!bytes.empty()) entries.set(key, Value::makeData(bytes));
  }
  template <class Record>
  void record(std::string_view key, const std::optional<Record>& record) {
    if (!record) return;
    entries.set(key, Value::makeDictionary());
    Writer inner(*entries.dictionary(key));
    fields(inner, *record);
  }
  void record(std::string_view key, const PromiseRef& promise) REQUIRES(recordsGuard) {
    if (promise) entries.set(key, valueOf(*promise));
  }
  static Value valueOf(const PromiseRecord& promise) REQUIRES(recordsGuard);

  Value written;  // absent when the entries are somebody else's
  Dictionary& entries;
};

/// Reads the fields that it is shown into a new record; one that is missing, or of another kind, keeps its default.
class Reader {
 public:
  template <class Record>
  using Of = Record;

  explicit Reader(const Dictionary& entries) : entries(entries) {}

  void text(std::string_view key, std::string& text) { text = entries[key].string().value_or(""); }
  void text(std::string_view key, std::optional<std::string>& text) {
    if (auto found = entries[key].string()) text = std::string(*found);
  }
  void flag(std::string_view key, bool& flag) { flag = entries[key].boolean().value_or(false); }
  void number(std::string_view key, std::uint64_t& number) { number = entries[key].unsignedInteger().value_or(0); }
  void always(std::string_view key, std::uint64_t& number) { this->number(key, number); }
  void real(std::string_view key, double& number) { number = entries[key].real().value_or(0); }
  void value(std::string_view key, SharedValue& value) { value = entries[key]; }
  void bytes(std::string_view key, platform::Bytes& bytes) { bytes = entries[key].data().value_or(""); }
  template <class Record>
  void record(std::string_view key, std::optional<Record>& record) {
    if (!entries[key].dictionary()) return;
    Reader inner(*entries[key].dictionary());
    fields(inner, record.emplace());
  }
  void record(std::string_view key, PromiseRef& promise) REQUIRES(recordsGuard) { promise = promiseOf(entries[key]); }
  static PromiseRef promiseOf(const Value& value) REQUIRES(recordsGuard);

  const Dictionary& entries;
};

// The fields of each record, once for both directions.

template <class Codec>
void fields(Codec& codec, typename Codec::template Of<PromiseRecord>& promise) REQUIRES(recordsGuard) {
  codec.text("name", promise.name);
  codec.number("identifier", promise.identifier);
  codec.number("client", promise.client);
  codec.number("diskSpaceNeeded", promise.diskSpaceNeeded);
  codec.text("path", promise.path);
  codec.real("fraction", promise.fraction);
  codec.flag("complete", promise.complete);
}

Value Writer::valueOf(const PromiseRecord& promise) {
  Writer writer;
  fields(writer, promise);
  return std::move(writer.written);
}

PromiseRef Reader::promiseOf(const Value& value) {
  if (!value.dictionary()) return nullptr;
  Reader reader(*value.dictionary());
  auto promise = std::make_shared<PromiseRecord>();
  fields(reader, *promise);
  return promise;
}

template <class Codec>
void fields(Codec& codec, typename Codec::template Of<InstallOptionsRecord>& options) {
  codec.value("metadata", options.metadata);
  codec.number("installType", options.installType);
  codec.number("installTargetType", options.installTargetType);
}

template <class Codec>
void fields(Codec& codec, typename Codec::template Of<PlaceholderRecord>& placeholder) {
  codec.text("name", placeholder.name);
  codec.number("installType", placeholder.installType);
  codec.number("client", placeholder.client);
  codec.flag("configured", placeholder.configured);
  codec.value("manifest", placeholder.manifest);
  codec.text("version", placeholder.version);
  codec.flag("launchProhibited", placeholder.launchProhibited);
  codec.value("metadata", placeholder.metadata);
  codec.bytes("rights", placeholder.rights);
  codec.text("iconPath", placeholder.iconPath);
}

template <class Codec>
void fields(Codec& codec, typename Codec::template Of<InstallProgressRecord>& progress) {
  codec.always("state", progress.state);
  codec.always("phase", progress.phase);
  codec.flag("paused", progress.paused);
  codec.real("fraction", progress.fraction);
}

template <class Codec>
void fields(Codec& codec, typename Codec::template Of<AppRecord>& app) {
  codec.text("name", app.name);
  codec.text("version", app.version);
  codec.text("container", app.container);
  codec.text("bundle", app.bundle);
  codec.text("applicationType", app.applicationType);
  codec.flag("isPlaceholder", app.isPlaceholder);
  codec.flag("systemBundle", app.systemBundle);
  codec.flag("launchProhibited", app.launchProhibited);
  codec.number("installType", app.installType);
  codec.number("staticUsage", app.staticUsage);
  codec.number("placeholderSum", app.filesSum);
  codec.number("homeOrder", app.homeOrder);
  codec.record("progress", app.progress);
}

/// Without its kind and its list of promises.
template <class Codec>
void fields(Codec& codec, typename Codec::template Of<CoordinatorRecord>& coordinator) REQUIRES(recordsGuard) {
  codec.always("creator", coordinator.creator);
  codec.number("responsibleClient", coordinator.responsibleClient);
  codec.record("options", coordinator.options);
  codec.record("placeholder", coordinator.placeholder);
  codec.record("appAsset", coordinator.appAsset);
  codec.record("userData", coordinator.userData);
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
  Writer writer;
  fields(writer, app);
  return std::move(writer.written);
}

std::optional<AppRecord> appOfValue(const std::string& id, const Value& value) {
  if (!value.dictionary()) return std::nullopt;
  AppRecord app;
  app.id = id;
  Reader reader(*value.dictionary());
  fields(reader, app);
  if (app.container.empty()) return std::nullopt;
  return app;
}

Value valueOfCoordinator(const CoordinatorRecord& coordinator) {
  Writer writer;
  writer.always("kind", static_cast<std::uint64_t>(coordinator.kind));
  fields(writer, coordinator);
  if (!coordinator.hasInitialZDRAssetPromises) return std::move(writer.written);
  auto promises = Value::makeArray();
  for (const auto& each : coordinator.initialZDRAssetPromises) promises.array()->append(Writer::valueOf(*each));
  writer.value("initialZDRAssetPromises", promises);
  return std::move(writer.written);
}

std::optional<CoordinatorRecord> coordinatorOfValue(const std::string& app, const Value& value) {
  using Kind = platform::RVCoordinatorKind;
  if (!value.dictionary()) return std::nullopt;
  Reader reader(*value.dictionary());
  std::uint64_t kind = 0;
  reader.number("kind", kind);
  if (kind == 0 || kind > static_cast<std::uint64_t>(Kind::RVRestoringDemotedAppInstallCoordinator))
    return std::nullopt;
  CoordinatorRecord coordinator;
  coordinator.app = app;
  coordinator.kind = static_cast<Kind>(kind);
  fields(reader, coordinator);
  if (coordinator.placeholder) coordinator.placeholder->app = app;
  const auto* promises = reader.entries["initialZDRAssetPromises"].array();
  coordinator.hasInitialZDRAssetPromises = promises;
  for (std::size_t i = 0; promises && i < promises->size(); ++i) {
    if (auto each = Reader::promiseOf((*promises)[i])) coordinator.initialZDRAssetPromises.push_back(std::move(each));
  }
  return coordinator;
}

Value valueOfOutcome(const OutcomeRecord& outcome) {
  Writer writer;
  writer.text("outcome", std::string(nameOfOutcome(outcome.outcome)));
  writer.text("reason", outcome.reason);
  writer.number("homeOrder", outcome.homeOrder);
  return std::move(writer.written);
}

std::optional<OutcomeRecord> outcomeOfValue(const Value& value) {
  if (!value.dictionary()) return std::nullopt;
  Reader reader(*value.dictionary());
  std::string name;
  OutcomeRecord outcome;
  reader.text("outcome", name);
  reader.text("reason", outcome.reason);
  reader.number("homeOrder", outcome.homeOrder);
  auto known = outcomeOfName(name);
  if (!known) return std::nullopt;
  outcome.outcome = *known;
  return outcome;
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
