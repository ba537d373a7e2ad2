#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <vector>

#include "device/boundary/Injection.h"
#include "device/files/StepWatch.h"

namespace device {

/// Carries out the rules about the point "step". The steps of a device are counted together, from 1, beginning with
/// those of its opening.
class InjectedSteps final : public StepWatch {
 public:
  /// Null when no rule is about steps.
  static std::shared_ptr<StepWatch> of(const std::vector<InjectionRule>& rules);

  explicit InjectedSteps(std::vector<InjectionRule> rules) : _rules(std::move(rules)) {}
  int before(Step& step) override;
  int after(const Step& step) override;

 private:
  const std::vector<InjectionRule> _rules;
  std::atomic<std::uint64_t> _steps{0};
};

}  // namespace device
