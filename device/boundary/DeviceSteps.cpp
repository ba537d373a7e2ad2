#include "device/boundary/DeviceSteps.h"

#include <algorithm>
#include <cerrno>
#include <iterator>

#include "device/boundary/Boundary.h"

namespace device {

namespace {
/// About the step that this thread takes.
constinit thread_local std::uint64_t number = 0;

/// What a file or folder is called and what the store says. New files have names of their own until one of these steps.
bool isSeenAfterDeath(Step::Kind kind) {
  return kind == Step::Kind::move || kind == Step::Kind::storeWrite || kind == Step::Kind::storeCommit;
}
}  // namespace

std::shared_ptr<StepWatch> DeviceSteps::of(const std::vector<InjectionRule>& rules,
                                           const std::vector<JournalListener>& journals) {
  std::vector<InjectionRule> aboutSteps;
  std::copy_if(rules.begin(), rules.end(), std::back_inserter(aboutSteps), isAboutSteps);
  std::vector<HandOver> gathering;
  for (const auto& journal : journals) {
    if (journal.handOver) gathering.push_back(journal.handOver);
  }
  if (aboutSteps.empty() && gathering.empty()) return nullptr;
  return std::shared_ptr<StepWatch>(new DeviceSteps(std::move(aboutSteps), std::move(gathering)));
}

void DeviceSteps::die() const {
  for (const auto& handOver : _journals) handOver();
  Boundary::kill();
}

int DeviceSteps::before(Step& step) {
  using Action = InjectionRule::Action;
  if (isSeenAfterDeath(step.kind)) {
    for (const auto& handOver : _journals) handOver();
  }
  if (_rules.empty()) return 0;
  number = _steps.fetch_add(1) + 1;
  for (const auto& rule : _rules) {
    if (!rule.isDue(number)) continue;
    if (rule.action == Action::kill) die();
    if (rule.action == Action::fail) return EIO;
    if (rule.action == Action::value) return static_cast<int>(rule.number);
    if (rule.action == Action::none && step.bytes.size() > 1) step.bytes = step.bytes.substr(0, step.bytes.size() / 2);
  }
  return 0;
}

int DeviceSteps::after(const Step&) {
  using Action = InjectionRule::Action;
  for (const auto& rule : _rules) {
    if (!rule.isDue(number)) continue;
    if (rule.action == Action::killAfter) die();
    if (rule.action == Action::error) return EIO;
  }
  return 0;
}

}  // namespace device
