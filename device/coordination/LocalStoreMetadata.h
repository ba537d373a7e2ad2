#pragma once

#include <string>
#include <utility>

#include "platform/CVInstallOptions.h"
#include "platform/Value.h"

namespace device {

/// Store metadata of an app: a dictionary that never changes.
class LocalStoreMetadata final : public platform::CVStoreMetadata {
 public:
  explicit LocalStoreMetadata(platform::Value dictionary) : dictionary(std::move(dictionary)) {}

  const platform::Value dictionary;

  std::string describe() const override {
    return "<CVStoreMetadata " + std::to_string(dictionary.dictionary()->size()) + " entries>";
  }
};

}  // namespace device
