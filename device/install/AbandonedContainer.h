#pragma once

#include <string>
#include <utility>

#include "device/install/Containers.h"

namespace device {

/// The container that no record names when a change has come to its end, one way or the other: removed with the scope.
/// Made before the records' guard is taken, so that it goes after the guard is let go: removing takes its time, and
/// must not come before the commit that makes the container superfluous.
class AbandonedContainer {
 public:
  /// `path` is what is abandoned should nothing come of the change; empty for nothing.
  explicit AbandonedContainer(Containers& containers, std::string path = {})
      : _containers(containers), _path(std::move(path)) {}
  ~AbandonedContainer() {
    if (!_path.empty()) _containers.remove(_path);
  }
  AbandonedContainer(const AbandonedContainer&) = delete;
  AbandonedContainer& operator=(const AbandonedContainer&) = delete;

  /// The change is committed: what it abandons is this (empty: nothing), and no longer what would have been.
  void become(std::string path) { _path = std::move(path); }

 private:
  Containers& _containers;
  std::string _path;
};

}  // namespace device
