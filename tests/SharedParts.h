#pragma once

#include <memory>

#include "device/FileTree.h"
#include "device/Store.h"

namespace tests {

/// What a device stands on, when it has to outlive the device.
struct SharedParts {
  std::unique_ptr<device::FileTree> files{};
  std::unique_ptr<device::Store> store{};
  bool broken = false;  // the store takes nothing more

  /// Those of an empty device.
  void makeInMemory();
  /// For a device that is opened on them. One at a time, and gone before they are.
  std::unique_ptr<device::FileTree> lendFiles();
  std::unique_ptr<device::Store> lendStore();
};

}  // namespace tests
