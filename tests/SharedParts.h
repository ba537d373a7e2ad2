#pragma once

#include <functional>
#include <memory>
#include <string_view>

#include "device/files/FileTree.h"
#include "device/store/Store.h"

namespace tests {

/// What a device stands on, when it has to outlive the device.
struct SharedParts {
  std::unique_ptr<device::FileTree> files{};
  std::unique_ptr<device::Store> store{};
  bool broken = false;  // the store takes nothing more
  /// Told of a file operation and its path: after a reading that succeeded and a flush, before a
  /// removal, a move and a writing. From any thread. May be null; set while no thread is at work.
  std::function<void(std::string_view operation, std::string_view path)> watch{};

  /// Those of an empty device.
  void makeInMemory();
  /// For a device that is opened on them. One at a time, and gone before they are.
  std::unique_ptr<device::FileTree> lendFiles();
  std::unique_ptr<device::Store> lendStore();
};

}  // namespace tests
