#pragma once

#include <string>
#include <utility>

#include "device/records/SharedValue.h"
#include "platform/CVInstallOptions.h"

namespace device {

/// Store metadata of an app: a dictionary that never changes.
class LocalStoreMetadata final : public platform::CVStoreMetadata {
 public:
  explicit LocalStoreMetadata(platform::Value dictionary) : dictionary(std::move(dictionary)) {}

  const SharedValue dictionary;

  std::string describe() const override {
    return "<CVStoreMetadata " + std::to_string(dictionary.dictionary()->size()) + " entries>";
  }
};

}  // namespace device
