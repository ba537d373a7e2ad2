#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <utility>
#include <vector>

#include "device/boundary/Boundary.h"
#include "device/boundary/Injection.h"
#include "device/files/StepWatch.h"

namespace device {

/// Has journals written out before what they tell of can be seen, and carries out the rules about the point "step". The
/// steps of a device are counted together, from 1, beginning with those of its opening.
class DeviceSteps final : public StepWatch {
 public:
  /// Null when no rule is about steps and no journal gathers anything.
  static std::shared_ptr<StepWatch> of(const std::vector<InjectionRule>& rules,
                                       const std::vector<JournalListener>& journals);

  int before(Step& step) override;
  int after(const Step& step) override;

 private:
  using HandOver = std::function<void()>;

  DeviceSteps(std::vector<InjectionRule> rules, std::vector<HandOver> journals)
      : _rules(std::move(rules)), _journals(std::move(journals)) {}
  [[noreturn]] void die() const;

  const std::vector<InjectionRule> _rules;
  const std::vector<HandOver> _journals;
  std::atomic<std::uint64_t> _steps{0};
};

}  // namespace device
