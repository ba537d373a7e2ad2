#pragma once

#include <string>
#include <utility>

#include "device/install/Containers.h"

namespace device {

/// The container that no record names once a change has ended, one way or the other: removed at the end of the scope.
/// Made before the records' guard is taken, so that it goes after the guard is released: removing takes time, and must
/// not come before the commit that makes the container superfluous.
class AbandonedContainer {
 public:
  /// `path` is abandoned if nothing comes of the change; empty for nothing.
  explicit AbandonedContainer(Containers& containers, std::string path = {})
      : _containers(containers), _path(std::move(path)) {}
  ~AbandonedContainer() {
    if (!_path.empty()) _containers.remove(_path);
  }
  AbandonedContainer(const AbandonedContainer&) = delete;
  AbandonedContainer& operator=(const AbandonedContainer&) = delete;

  /// The change is committed: it abandons this container (empty: none), and no longer the one given at first.
  void become(std::string path) { _path = std::move(path); }

 private:
  Containers& _containers;
  std::string _path;
};

}  // namespace device
