#include "device/boundary/Injection.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <utility>

namespace device {

using platform::ErrorRef;

namespace {

using Point = InjectionPoint::Name;
constexpr const auto& points = InjectionPoint::table;

struct KnownAction {
  std::string_view name;
  InjectionRule::Action action;
  enum class Takes { nothing, number, app } takes;
};
constexpr KnownAction actions[] = {
    {"fail", InjectionRule::Action::fail, KnownAction::Takes::nothing},
    {"error", InjectionRule::Action::error, KnownAction::Takes::nothing},
    {"none", InjectionRule::Action::none, KnownAction::Takes::nothing},
    {"value", InjectionRule::Action::value, KnownAction::Takes::number},
    {"kill", InjectionRule::Action::kill, KnownAction::Takes::nothing},
    {"kill-after", InjectionRule::Action::killAfter, KnownAction::Takes::nothing},
    {"cancel", InjectionRule::Action::cancel, KnownAction::Takes::app},
    {"prioritize", InjectionRule::Action::prioritize, KnownAction::Takes::app},
    {"uninstall", InjectionRule::Action::uninstall, KnownAction::Takes::app},
    {"store", InjectionRule::Action::store, KnownAction::Takes::app},
};

template <class Number>
bool parseNumber(std::string_view text, Number& number) {
  auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), number);
  return failure == std::errc() && end == text.data() + text.size();
}

std::string quoted(std::string_view text) { return '"' + std::string(text) + '"'; }

/// A step belongs to no app. It is taken under guards for which a bystander would have to wait.
std::string checkStep(const InjectionRule& rule) {
  if (!isAboutSteps(rule)) return {};
  if (!rule.app.empty()) return "a step belongs to no app";
  if (!rule.target.empty()) return "nobody else can act at a step";
  bool isErrorNumber = rule.number > 0 && rule.number < 4096;
  if (rule.action == InjectionRule::Action::value && !isErrorNumber)
    return "the value of a step is the number of an error";
  return {};
}

/// Empty when all is well, otherwise what is wrong.
std::string parsePlace(std::string_view place, InjectionRule& rule) {
  if (auto at = place.rfind('@'); at != place.npos) {
    auto match = place.substr(at + 1);
    rule.onwards = match.size() > 1 && match.back() == '+';
    if (rule.onwards) match.remove_suffix(1);
    if (!parseNumber(match, rule.match) || rule.match == 0)
      return quoted(match) + " after @ is not a number from 1 upwards";
    place = place.substr(0, at);
  }
  if (auto colon = place.find(':'); colon != place.npos) {
    rule.app = place.substr(colon + 1);
    if (rule.app.empty()) return "there is no app after the colon";
    place = place.substr(0, colon);
  }
  rule.place = place;
  if (place.empty()) return "there is no point before the action";
  return isInjectionPoint(place) ? std::string() : "there is no point " + quoted(place);
}

std::string parseAction(std::string_view text, InjectionRule& rule) {
  auto equals = text.find('=');
  auto name = text.substr(0, equals);
  auto known = std::find_if(std::begin(actions), std::end(actions), [&](auto& action) { return action.name == name; });
  if (known == std::end(actions)) return "there is no action " + quoted(name);
  rule.action = known->action;
  auto parameter = equals == text.npos ? std::string_view() : text.substr(equals + 1);
  switch (known->takes) {
    case KnownAction::Takes::nothing:
      return equals == text.npos ? std::string() : "the action " + quoted(name) + " takes nothing after it";
    case KnownAction::Takes::number:
      if (parseNumber(parameter, rule.number)) return {};
      return "the action " + quoted(name) + " takes a number, not " + quoted(parameter);
    case KnownAction::Takes::app:
      rule.target = parameter;
      return parameter.empty() ? "the action " + quoted(name) + " takes an app" : std::string();
  }
  return {};
}

}  // namespace

std::vector<std::string> injectionPoints() {
  std::vector<std::string> names;
  for (std::size_t i = 0; i < std::size(points); ++i) {
    bool isShared = (i > 0 && points[i - 1].operation == points[i].operation) ||
                    (i + 1 < std::size(points) && points[i + 1].operation == points[i].operation);
    std::string front = isShared && !points[i].service.empty() ? std::string(points[i].service) + '.' : "";
    names.push_back(front + std::string(points[i].operation));
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::vector<std::string> injectionActions() {
  std::vector<std::string> names;
  for (const auto& action : actions)
    names.push_back(std::string(action.name) + (action.takes == KnownAction::Takes::nothing ? "" : "="));
  return names;
}

bool isInjectionPoint(std::string_view point) {
  auto dot = point.find('.');
  std::string_view operation = dot == point.npos ? point : point.substr(dot + 1);
  auto first = std::lower_bound(std::begin(points), std::end(points), Point{operation, {}});
  if (first == std::end(points) || first->operation != operation) return false;
  if (dot == point.npos) return true;
  std::string_view service = InjectionPoint::declaringClass(point.substr(0, dot));
  return !service.empty() && std::binary_search(first, std::end(points), Point{operation, service});
}

bool isAboutSteps(const InjectionRule& rule) { return rule.place == InjectionPoint("", "step").operation(); }

bool InjectionRule::matches(const InjectionPoint& point, std::string_view ofApp) const {
  if (!app.empty() && app != ofApp) return false;
  std::string_view service = point.service();
  std::string_view operation = point.operation();
  std::string_view rest = place;
  if (rest.size() < operation.size() || rest.substr(rest.size() - operation.size()) != operation) return false;
  rest.remove_suffix(operation.size());
  // The level of a message is not an operation: the accessor `error` does not stand for every error message.
  if (rest.empty()) return service != "log";
  if (rest.back() != '.') return false;
  rest.remove_suffix(1);
  return rest == service || rest == InjectionPoint::declaringClass(service);
}

std::optional<InjectionRule> InjectionRule::parse(std::string_view text, ErrorRef* error) {
  platform::setError(error, nullptr);
  InjectionRule rule;
  rule.text = text;
  std::string problem;
  auto equals = text.find('=');
  if (equals == text.npos)
    problem = "expected POINT[:APP][@N[+]]=ACTION";
  else if (problem = parsePlace(text.substr(0, equals), rule); problem.empty())
    problem = parseAction(text.substr(equals + 1), rule);
  if (problem.empty()) problem = checkStep(rule);
  if (problem.empty()) return rule;
  platform::setError(error, platform::makeError("Injection", 2, "injection rule " + quoted(text) + ": " + problem));
  return std::nullopt;
}

}  // namespace device
