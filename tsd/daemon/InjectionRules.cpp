#include "tsd/daemon/InjectionRules.h"

#include <utility>

#include "tsd/CommandError.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {
namespace {

/// For a text that is not a rule: the point that was most likely meant, unless the text names a point.
std::string pointMeantBy(const std::string& rule) {
  std::string point = rule.substr(0, rule.find_first_of(":@="));
  if (device::isInjectionPoint(point)) return {};
  return didYouMean(point, device::injectionPoints());
}

}  // namespace

std::vector<device::InjectionRule> parseRules(const std::vector<std::string>& texts) {
  std::vector<device::InjectionRule> rules;
  for (const auto& text : texts) {
    platform::ErrorRef error;
    auto rule = device::InjectionRule::parse(text, &error);
    if (!rule) throw CommandError(ExitCode::usage, "--inject: " + textOf(error) + pointMeantBy(text));
    rules.push_back(std::move(*rule));
  }
  return rules;
}

}  // namespace tsd
