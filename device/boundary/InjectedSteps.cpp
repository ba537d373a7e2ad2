#include "device/boundary/InjectedSteps.h"

#include <algorithm>
#include <cerrno>
#include <iterator>

#include "device/boundary/Boundary.h"

namespace device {

namespace {
/// About the step that this thread takes.
constinit thread_local std::uint64_t number = 0;
}  // namespace

std::shared_ptr<StepWatch> InjectedSteps::of(const std::vector<InjectionRule>& rules) {
  std::vector<InjectionRule> aboutSteps;
  std::copy_if(rules.begin(), rules.end(), std::back_inserter(aboutSteps), isAboutSteps);
  return aboutSteps.empty() ? nullptr : std::make_shared<InjectedSteps>(std::move(aboutSteps));
}

int InjectedSteps::before(Step& step) {
  using Action = InjectionRule::Action;
  number = _steps.fetch_add(1) + 1;
  for (const auto& rule : _rules) {
    if (!rule.isDue(number)) continue;
    if (rule.action == Action::kill) Boundary::die();
    if (rule.action == Action::fail) return EIO;
    if (rule.action == Action::value) return static_cast<int>(rule.number);
    if (rule.action == Action::none && step.bytes.size() > 1) step.bytes = step.bytes.substr(0, step.bytes.size() / 2);
  }
  return 0;
}

int InjectedSteps::after(const Step&) {
  using Action = InjectionRule::Action;
  for (const auto& rule : _rules) {
    if (!rule.isDue(number)) continue;
    if (rule.action == Action::killAfter) Boundary::die();
    if (rule.action == Action::error) return EIO;
  }
  return 0;
}

}  // namespace device
