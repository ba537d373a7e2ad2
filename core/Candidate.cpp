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
  text("KBBundleIdentifier", bundleIdentifier);
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
  _order.insert(identifier);
  _candidates[std::string(identifier)] = std::move(candidate);
}

CandidateRef Candidates::find(std::string_view identifier) const {
  auto found = _candidates.find(std::string(identifier));
  return found == _candidates.end() ? nullptr : found->second;
}

bool Candidates::erase(std::string_view identifier) {
  _candidates.erase(std::string(identifier));
  return _order.erase(identifier);
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
