#include "tsd/host/RestoreLists.h"

#include <utility>

namespace tsd {

using platform::Value;

namespace {

constexpr const char* automaticKey = "AutomaticDowngrades";
constexpr const char* byHandKey = "IntentionalDowngrades";

void append(Value& list, const char* key, const std::string& id) {
  auto& lists = *list.dictionary();
  if (!lists.array(key)) lists.set(key, Value::makeArray());
  lists.array(key)->append(id);
}

void takeOut(Value& list, const char* key, const std::string& id) {
  const Value before = std::as_const(*list.dictionary())[key];
  if (!before.array()) return;
  Value others = Value::makeArray();
  for (const auto& each : *before.array()) {
    if (each.string() != id) others.array()->append(each);
  }
  list.dictionary()->set(key, others);
}

}  // namespace

void putRestored(Value& list, const RestoredApp& app) {
  Value entry = Value::makeDictionary();
  entry.dictionary()->set("HarluneMetadata", Value::makeData(app.metadata));
  if (!app.rights.empty()) entry.dictionary()->set("ApplicationSINF", Value::makeData(app.rights));
  if (!app.icon.empty()) entry.dictionary()->set("PlaceholderIcon", Value::makeData(app.icon));
  list.dictionary()->set(app.id, entry);
}

void appendDemoted(Value& list, const std::string& id, const Demotion& demotion) {
  if (demotion.automatically) append(list, automaticKey, id);
  if (demotion.byHand) append(list, byHandKey, id);
}

void putDemoted(Value& list, const std::string& id, const Demotion& demotion) {
  for (const char* key : {automaticKey, byHandKey}) takeOut(list, key, id);
  appendDemoted(list, id, demotion);
}

}  // namespace tsd
