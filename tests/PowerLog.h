#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "device/files/FileTree.h"
#include "device/files/StepWatch.h"
#include "device/store/Store.h"

namespace tests {

/// Writes down every step of a file tree on disk and of a store, and makes in memory what a loss of power after any of
/// them may leave: what was synced, and of the rest whatever the disk happened to write, in whatever order. Only a move
/// is whole or not at all. By one thread at a time; keeps all that was written.
class PowerLog final : public device::StepWatch {
 public:
  /// Of what was not synced.
  enum class Rest {
    lost,      // all of it
    hollow,    // every name is there, with nothing in the files
    zeroed,    // every name is there, the files with zeros in place of what was written
    anything,  // each name, each piece of a file and each write of the store by the dice
  };
  using Dice = std::function<std::size_t(std::size_t below)>;

  int before(device::Step&) override { return 0; }
  int after(const device::Step& step) override;
  /// A store in memory whose changes are steps of this log.
  std::unique_ptr<device::Store> makeStore();

  std::size_t size() const { return _steps.size(); }
  /// The two halves of a device after a loss of power that the first `count` steps came before.
  std::unique_ptr<device::FileTree> filesAfter(std::size_t count, Rest rest, const Dice& dice) const;
  std::unique_ptr<device::Store> storeAfter(std::size_t count, Rest rest, const Dice& dice) const;
  std::string describe(std::size_t step) const;

 private:
  class LoggedStore;
  struct Logged {
    device::Step::Kind kind;
    std::string path, target;
    platform::Bytes bytes;
    std::vector<device::StoreRecord> changes;
  };

  std::vector<Logged> _steps;
};

}  // namespace tests
