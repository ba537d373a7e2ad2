#include "core/Candidate.h"

#include <utility>

#include "platform/Describe.h"
#include "platform/Value.h"

namespace appsync {

using platform::Value;

std::string Candidate::describe() const {
  Value entry = Value::makeDictionary();
  auto& fields = *entry.dictionary();
  auto text = [&](const char* key, const std::optional<std::string>& value) {
    if (value) fields.set(key, *value);
  };
  fields.set("KBBundleIdentifier", bundleIdentifier);
  text("KBBundleVersion", bundleVersion);
  text("Container", container);
  text("Path", path);
  text("NameFromHarlune", nameFromHarlune);
  fields.set("IsRestore", isRestore);
  fields.set("intentional_demoted_app", intentionallyDemoted);
  fields.set("auto_demoted_app", autoDemoted);
  fields.set("system_app", isSystemApp);
  return platform::describe(entry);
}

void Candidates::set(std::string_view identifier, CandidateRef candidate) {
  _candidates.insert_or_assign(std::string(identifier), std::move(candidate));
  _order.insert(identifier);
}

CandidateRef Candidates::find(std::string_view identifier) const {
  auto found = _candidates.find(identifier);
  return found == _candidates.end() ? nullptr : found->second;
}

void Candidates::erase(std::string_view identifier) {
  auto found = _candidates.find(identifier);
  if (found == _candidates.end()) return;
  _candidates.erase(found);
  _order.erase(identifier);
}

std::string Candidates::describe() const {
  std::string text = "{";
  for (const auto& identifier : _order.members()) {
    if (text.size() > 1) text += "; ";
    text += identifier + " = " + _candidates.at(identifier)->describe();
  }
  return text + "}";
}

}  // namespace appsync
